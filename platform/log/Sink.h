#pragma once

#include <cstdint>
#include <memory>
#include <string_view>
#include <sys/stat.h>

#include "platform/log/Log.h"

namespace platform::log {

// One finished line on its way out. Refers to the batch that it lies in.
struct Line {
    Level level;
    const char* category;
    std::int64_t time; // nanoseconds since the Unix epoch
    std::string_view text;
};

// Where lines go. Owned by the writer; its thread alone calls it, and may wait in it.
class Sink {
public:
    virtual ~Sink() = default;
    virtual void add(const Line& line) = 0;
    // Called after the last line of a batch: everything that was added is out afterwards.
    virtual void finish() = 0;
};

[[nodiscard]] const char* levelName(Level level);

// Text to standard error, "time zpd[pid] category level: text"; the time is UTC, ISO 8601 with
// milliseconds.
[[nodiscard]] std::unique_ptr<Sink> makeStandardErrorSink();
// Entries with fields to the journal; empty when this build has no journal.
[[nodiscard]] std::unique_ptr<Sink> makeJournalSink();
// The journal when standard error is the journal's stream, else text.
[[nodiscard]] std::unique_ptr<Sink> makeSinkForThisProcess();

// True when `journalStream` ("device:inode", as JOURNAL_STREAM tells) names the stream of `status`.
[[nodiscard]] bool namesStream(std::string_view journalStream, const struct ::stat& status);

} // namespace platform::log
