#pragma once

#include <chrono>
#include <functional>
#include <iosfwd>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <nlohmann/json_fwd.hpp>

#include "zpctl/Daemon.h"
#include "zpctl/Jobs.h"
#include "zpctl/Table.h"
#include "zpctl/Verb.h"

namespace zpctl {

// The options that stand before the verb.
struct Options {
    static constexpr double usualTimeout = 10; // seconds

    std::optional<std::string> service;
    bool json = false;
    double timeout = usualTimeout;
    std::vector<std::string> command; // what stands after "--", for the verbs that run something
};

// Where a run of the tool writes, and what that place can show.
struct Terminal {
    std::ostream& out;
    std::ostream& err;
    bool inColour = false; // of `out`
    bool inUtf8 = false;
    int descriptor = -1; // of `out`, where it has one

    // Whether nobody can read any more what is written to `out`.
    [[nodiscard]] bool readerIsGone() const;
};

// One run of the tool: what a verb gets to work with. Made by the command line; the terminal's
// streams must outlive it; one thread.
class Session {
public:
    Session(Options options, const Terminal& terminal)
        : options_(std::move(options)), terminal_(terminal), paint_(terminal.inColour) {}

    // Made with the first call, so that verbs which need no daemon never look for one.
    [[nodiscard]] Daemon& daemon();
    [[nodiscard]] Jobs& jobs();

    [[nodiscard]] std::ostream& out() const { return terminal_.out; }

    // To wait for its reader to go; -1 when there is none.
    [[nodiscard]] int outDescriptor() const { return terminal_.descriptor; }

    [[nodiscard]] const std::vector<std::string>& command() const { return options_.command; }

    [[nodiscard]] bool inJson() const { return options_.json; }

    [[nodiscard]] const Paint& paint() const { return paint_; }

    [[nodiscard]] bool inUtf8() const { return terminal_.inUtf8; }

    // The result, in the one form that was asked for: as JSON, or as `write` puts it for people.
    Status report(const nlohmann::ordered_json& json, const std::function<void()>& write) const;
    // What a person should know although it worked, on standard error.
    void note(const std::string& text) const;
    // What went wrong, on standard error; the result is the failure's status.
    Status fail(const Failure& failure) const;

private:
    [[nodiscard]] std::chrono::milliseconds timeout() const;

    const Options options_;
    const Terminal terminal_;
    const Paint paint_;
    std::unique_ptr<Daemon> daemon_;
    std::unique_ptr<Jobs> jobs_;
};

} // namespace zpctl
