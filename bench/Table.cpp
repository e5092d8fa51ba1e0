#include "bench/Table.h"

#include <cstdio>

namespace bench {

namespace {

constexpr const char* lineFormat = "%-44s %-5s %12s %12s %9s %9s  %-6s %s\n";

std::string number(double value, const std::string& unit) {
    char text[48];
    const int digits = value < 10 ? 2 : value < 1000 ? 1 : 0;
    std::snprintf(text, sizeof text, "%.*f%s%s", digits, value, unit.empty() ? "" : " ",
                  unit.c_str());
    return text;
}

std::string ratioText(double value, const std::string& unit) {
    char text[32];
    std::snprintf(text, sizeof text, "%.2f %s", value, unit.c_str());
    return text;
}

bool keeps(double ratio, const Goal& goal) {
    return goal.atLeast ? ratio >= goal.bound : ratio <= goal.bound;
}

} // namespace

Table::Table() {
    std::printf(lineFormat, "measured", "cores", "zpd", "against", "ratio", "goal", "", "");
}

void Table::add(const Row& row) {
    const double ratio = row.ratio.value_or(row.against > 0 ? row.measured / row.against : 0);
    std::string goal;
    std::string verdict;
    if (row.goal) {
        const bool kept = keeps(ratio, *row.goal);
        goal = (row.goal->atLeast ? ">= " : "<= ") + ratioText(row.goal->bound, "");
        verdict = kept ? "ok" : "missed";
        ++(kept ? kept_ : missed_);
    }
    const std::string unit = row.goal ? row.goal->unit : "x";
    const std::string against = row.against > 0 ? number(row.against, row.unit) : "-";
    std::printf(lineFormat, row.name.c_str(), row.cores.c_str(),
                number(row.measured, row.unit).c_str(), against.c_str(),
                ratioText(ratio, unit).c_str(), goal.c_str(), verdict.c_str(), row.note.c_str());
    std::fflush(stdout);
}

void Table::summary() const {
    std::printf("%d goals kept, %d missed\n", kept_, missed_);
}

} // namespace bench
