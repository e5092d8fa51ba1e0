#include "zpctl/Tree.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <ostream>
#include <tuple>
#include <utility>

#include <nlohmann/json.hpp>

#include "platform/value/NumericOrder.h"
#include "zpctl/Json.h"
#include "zpctl/Printable.h"

namespace zpctl {

namespace {

bool comesBefore(const PlugIn& a, const PlugIn& b) {
    if (a.identifier != b.identifier)
        return a.identifier < b.identifier;
    const auto order = platform::compareNumerically(a.version, b.version);
    return order != 0 ? order < 0 : a.uuid < b.uuid;
}

} // namespace

Tree::Tree(const std::vector<platform::Dictionary>& forms) {
    std::map<std::pair<bool, std::string>, Branch> byPath; // false comes first
    for (const auto& form : forms) {
        const PlugIn plugIn = PlugIn::of(form);
        const std::string path = plugIn.applicationPath.value_or("");
        Branch& branch = byPath[{path.empty(), path}];
        branch.path = path;
        branch.name = plugIn.applicationName.value_or("");
        branch.leaves.push_back({plugIn, form});
    }
    for (auto& [key, branch] : byPath) {
        std::ranges::sort(branch.leaves, comesBefore, &Leaf::plugIn);
        branches_.push_back(std::move(branch));
    }
}

void Tree::write(std::ostream& out, const Paint& paint, bool inUtf8) const {
    // One table for all, so that the columns stand below each other.
    Table table({{"", Tone::strong}, {""}, {""}, {""}, {"", Tone::faint}});
    for (const Branch& branch : branches_) {
        for (const auto& [plugIn, form] : branch.leaves)
            table.add(
                {plugIn.name, plugIn.version, plugIn.extensionPoint, plugIn.election, plugIn.uuid});
    }
    const auto lines = table.lines(paint);
    auto line = lines.begin();
    for (const Branch& branch : branches_) {
        if (branch.path.empty())
            out << paint(Tone::strong, "Outside applications") << '\n';
        else
            out << paint(Tone::strong, printable(branch.name)) << "  "
                << paint(Tone::faint, printable(branch.path)) << '\n';
        for (std::size_t left = branch.leaves.size(); left > 0; --left) {
            const bool last = left == 1;
            out << (inUtf8 ? (last ? "└── " : "├── ") : (last ? "`-- " : "|-- ")) << *line++
                << '\n';
        }
    }
    out << summary() << '\n';
}

nlohmann::ordered_json Tree::json() const {
    auto json = nlohmann::ordered_json::array();
    for (const Branch& branch : branches_) {
        nlohmann::ordered_json node{{"path", nullptr}, {"name", nullptr}};
        if (!branch.path.empty())
            node = {{"path", branch.path}, {"name", branch.name}};
        node["plugIns"] = nlohmann::ordered_json::array();
        for (const auto& [plugIn, form] : branch.leaves)
            node["plugIns"].push_back(toJson(form));
        json.push_back(std::move(node));
    }
    return json;
}

std::string Tree::summary() const {
    std::size_t plugIns = 0;
    std::size_t applications = 0;
    for (const Branch& branch : branches_) {
        plugIns += branch.leaves.size();
        applications += branch.path.empty() ? 0 : 1;
    }
    return counted(plugIns, "plug-in") + " in " + counted(applications, "application");
}

} // namespace zpctl
