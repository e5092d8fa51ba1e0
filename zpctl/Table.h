#pragma once

#include <iosfwd>
#include <string>
#include <string_view>
#include <vector>

namespace zpctl {

enum class Tone { plain, strong, faint };

// Wraps text in the terminal's codes for a tone, or not at all.
class Paint {
public:
    explicit Paint(bool inColour) : inColour_(inColour) {}

    [[nodiscard]] std::string operator()(Tone tone, std::string_view text) const;

private:
    bool inColour_;
};

// Rows of cells that are written as columns, two blanks apart, each as wide as its widest cell.
// Cells are made printable when they are added. A plain value.
class Table {
public:
    struct Column {
        std::string title; // a table whose titles are all empty has no line of titles
        Tone tone = Tone::plain;
    };

    explicit Table(std::vector<Column> columns) : columns_(std::move(columns)) {}

    // As many cells as there are columns.
    void add(const std::vector<std::string>& cells);

    [[nodiscard]] bool empty() const noexcept { return rows_.empty(); }

    // The rows without their titles, one text each, for callers that set something before each.
    [[nodiscard]] std::vector<std::string> lines(const Paint& paint) const;
    void write(std::ostream& out, const Paint& paint) const;

private:
    using Row = std::vector<std::string>;

    [[nodiscard]] std::vector<std::size_t> widths(bool withTitles) const;
    [[nodiscard]] std::string line(const Row& row, const std::vector<std::size_t>& widths,
                                   const Paint& paint, bool isTitle) const;

    std::vector<Column> columns_;
    std::vector<Row> rows_;
};

} // namespace zpctl
