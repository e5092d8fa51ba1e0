#include "zpctl/Table.h"

#include <algorithm>
#include <cassert>
#include <cstddef>
#include <ostream>

#include "zpctl/Printable.h"

namespace zpctl {

namespace {

// Select graphic rendition (ECMA-48, 8.3.117).
constexpr std::string_view strongCode = "\x1b[1m";
constexpr std::string_view faintCode = "\x1b[2m";
constexpr std::string_view resetCode = "\x1b[0m";
constexpr std::size_t gap = 2;

} // namespace

std::string Paint::operator()(Tone tone, std::string_view text) const {
    if (!inColour_ || tone == Tone::plain || text.empty())
        return std::string(text);
    std::string painted(tone == Tone::strong ? strongCode : faintCode);
    painted += text;
    painted += resetCode;
    return painted;
}

void Table::add(const std::vector<std::string>& cells) {
    assert(cells.size() == columns_.size());
    Row row;
    row.reserve(cells.size());
    for (const std::string& cell : cells)
        row.push_back(printable(cell));
    rows_.push_back(std::move(row));
}

std::vector<std::string> Table::lines(const Paint& paint) const {
    const auto width = widths(false);
    std::vector<std::string> lines;
    lines.reserve(rows_.size());
    for (const Row& row : rows_)
        lines.push_back(line(row, width, paint, false));
    return lines;
}

void Table::write(std::ostream& out, const Paint& paint) const {
    const auto width = widths(true);
    Row titles;
    for (const Column& column : columns_)
        titles.push_back(column.title);
    if (std::ranges::any_of(titles, [](const auto& title) { return !title.empty(); }))
        out << line(titles, width, paint, true) << '\n';
    for (const Row& row : rows_)
        out << line(row, width, paint, false) << '\n';
}

std::vector<std::size_t> Table::widths(bool withTitles) const {
    std::vector<std::size_t> widths(columns_.size(), 0);
    for (std::size_t i = 0; i < columns_.size(); ++i) {
        if (withTitles)
            widths[i] = columnsOf(columns_[i].title);
        for (const Row& row : rows_)
            widths[i] = std::max(widths[i], columnsOf(row[i]));
    }
    return widths;
}

std::string Table::line(const Row& row, const std::vector<std::size_t>& widths, const Paint& paint,
                        bool isTitle) const {
    std::string text;
    std::size_t owed = 0; // blanks that only a later cell makes necessary
    for (std::size_t i = 0; i < row.size(); ++i) {
        if (widths[i] == 0)
            continue; // nothing stands in this column
        if (!row[i].empty()) {
            text.append(owed, ' ');
            text += paint(isTitle ? Tone::faint : columns_[i].tone, row[i]);
            owed = 0;
        }
        owed += widths[i] - columnsOf(row[i]) + gap;
    }
    return text;
}

} // namespace zpctl
