#pragma once

#include <map>
#include <string>

#include "tests/e2e/DaemonTest.h"

namespace e2e {

// A daemon with four plug-ins, "a" to "d", that the tests annotate.
class AnnotationTest : public DaemonTest {
protected:
    AnnotationTest();

    [[nodiscard]] Item uuid(const std::string& identifier) const {
        return Item::uuid(uuids.at(identifier));
    }

    [[nodiscard]] std::string pathOf(const std::string& identifier) const;
    // What each plug-in's form says.
    [[nodiscard]] std::map<std::string, Item> annotations();
    // A request that annotates one plug-in.
    [[nodiscard]] Item annotating(const std::string& identifier, const Item& annotation) const;
    // How often the change of annotations was made known.
    [[nodiscard]] std::uint64_t notifications() const;

    std::map<std::string, std::string> uuids; // by identifier
};

} // namespace e2e
