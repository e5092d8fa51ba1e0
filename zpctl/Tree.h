#pragma once

#include <iosfwd>
#include <string>
#include <vector>

#include <nlohmann/json_fwd.hpp>

#include "platform/value/Value.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Table.h"

namespace zpctl {

// Plug-ins by the application that contains them, in the order of the applications' paths, those
// outside any application last; within, by identifier and version. A plain value.
class Tree {
public:
    explicit Tree(const std::vector<platform::Dictionary>& forms);

    // Lines are drawn with box characters, or with ASCII.
    void write(std::ostream& out, const Paint& paint, bool inUtf8) const;

    // [{"path", "name", "plugIns": [form...]}...]; null for path and name outside applications.
    [[nodiscard]] nlohmann::ordered_json json() const;

private:
    struct Leaf {
        PlugIn plugIn;
        platform::Dictionary form;
    };

    struct Branch {
        std::string path; // empty: outside applications
        std::string name;
        std::vector<Leaf> leaves;
    };

    [[nodiscard]] std::string summary() const;

    std::vector<Branch> branches_;
};

} // namespace zpctl
