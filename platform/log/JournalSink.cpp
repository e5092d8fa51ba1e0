#include "platform/log/Sink.h"

#ifdef HAVE_LIBSYSTEMD

#include <cerrno>
#include <cstring>
#include <string>
#include <sys/uio.h>
#include <syslog.h>

#define SD_JOURNAL_SUPPRESS_LOCATION
#include <systemd/sd-journal.h>

namespace platform::log {

namespace {

int priorityOf(Level level) {
    switch (level) {
    case Level::debug:
        return LOG_DEBUG;
    case Level::info:
        return LOG_INFO;
    case Level::standard:
        return LOG_NOTICE;
    case Level::error:
        return LOG_ERR;
    }
    return LOG_NOTICE;
}

class JournalSink final : public Sink {
public:
    void add(const Line& line) override {
        message_.assign("MESSAGE=").append(line.text);
        priority_.assign("PRIORITY=").append(std::to_string(priorityOf(line.level)));
        category_.assign("ZEPHRIN_CATEGORY=").append(line.category);
        const struct ::iovec fields[] = {field(message_), field(priority_), field(category_),
                                         field(subsystem_), field(identifier_)};
        // A journal that is gone loses the line: there is nowhere else to tell.
        ::sd_journal_sendv(fields, std::size(fields));
    }

    void finish() override {}

private:
    static struct ::iovec field(std::string& text) { return {text.data(), text.size()}; }

    std::string message_;
    std::string priority_;
    std::string category_;
    std::string subsystem_ = "ZEPHRIN_SUBSYSTEM=com.tovana.Zephrin";
    std::string identifier_ = std::string("SYSLOG_IDENTIFIER=") + program_invocation_short_name;
};

} // namespace

std::unique_ptr<Sink> makeJournalSink() {
    return std::make_unique<JournalSink>();
}

} // namespace platform::log

#else

namespace platform::log {

std::unique_ptr<Sink> makeJournalSink() {
    return nullptr;
}

} // namespace platform::log

#endif
