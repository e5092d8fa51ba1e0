#pragma once

#include <memory>

#include "zpd/ZPDOptions.h"

// The whole daemon, put together: the main loop, the platform's services, the registry and the
// server. Owned by main() and used on the main thread only; one per process.
class Daemon {
public:
    // What a process must have before anything else: its log settings, the three standard
    // descriptors (open, if only on nothing), as many others as it may have, and no death by a
    // peer that stopped reading.
    static void prepareProcess();

    // Everything in working order, the registry's first pass done and the service's socket bound;
    // empty, with a log line, when the server cannot be made.
    [[nodiscard]] static std::unique_ptr<Daemon> create(const ZPDOptions& options);
    Daemon(const Daemon&) = delete;
    Daemon& operator=(const Daemon&) = delete;
    ~Daemon();

    // Serves until SIGTERM, which ends the process with status 0.
    [[noreturn]] void run();

private:
    struct Parts;
    explicit Daemon(std::unique_ptr<Parts> parts);

    const std::unique_ptr<Parts> parts_;
};
