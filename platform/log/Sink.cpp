#include "platform/log/Sink.h"

#include <cstdlib>
#include <string>
#include <unistd.h>

namespace platform::log {

const char* levelName(Level level) {
    switch (level) {
    case Level::debug:
        return "debug";
    case Level::info:
        return "info";
    case Level::standard:
        return "default";
    case Level::error:
        return "error";
    }
    return "default";
}

bool namesStream(std::string_view journalStream, const struct ::stat& status) {
    return journalStream == std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

std::unique_ptr<Sink> makeSinkForThisProcess() {
    const char* stream = std::getenv("JOURNAL_STREAM");
    struct ::stat status = {};
    if (stream && ::fstat(STDERR_FILENO, &status) == 0 && namesStream(stream, status)) {
        if (auto journal = makeJournalSink())
            return journal;
    }
    return makeStandardErrorSink();
}

} // namespace platform::log
