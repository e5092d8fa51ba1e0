#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {

// A home with some plug-ins, its daemon, and a client that asks for their annotations.
struct AnnotatedHome {
    // The plug-ins are called by their identifiers.
    explicit AnnotatedHome(const std::vector<std::string>& identifiers);

    // Kills the daemon that runs and starts another, with a client of its own.
    void restart(const Daemon::Options& options = {});

    [[nodiscard]] std::string pathOf(const std::string& identifier) const;
    // What each plug-in's form says.
    [[nodiscard]] std::map<std::string, Item> annotations();
    // A request that annotates one plug-in.
    [[nodiscard]] Item annotating(const std::string& identifier, const Item& annotation) const;
    // How often the change of annotations was made known.
    [[nodiscard]] std::uint64_t notifications() const;

    Home home;
    std::unique_ptr<Daemon> daemon;
    std::unique_ptr<WireClient> client;
    std::map<std::string, std::string> uuids; // by identifier
};

} // namespace e2e
