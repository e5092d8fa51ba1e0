#pragma once

#include <optional>
#include <string>
#include <vector>

namespace bench {

// The bound that a ratio should keep: at most this, or at least this.
struct Goal {
    double bound = 0;
    bool atLeast = false;
    std::string unit = "x"; // of bound and ratio
};

// One line of the table: what was measured against what.
struct Row {
    std::string name;
    std::string cores;
    double measured = 0;
    double against = 0;
    std::string unit;            // of measured and against
    std::optional<double> ratio; // measured / against, unless it says otherwise
    std::optional<Goal> goal;
    std::string note;
};

// Prints rows as they come, aligned, and remembers how many goals were missed.
class Table {
public:
    Table();
    void add(const Row& row);
    void summary() const;

private:
    int kept_ = 0;
    int missed_ = 0;
};

} // namespace bench
