#include "platform/log/Log.h"

#include <array>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <unistd.h>

#include <gmock/gmock.h>

#include "platform/log/Render.h"
#include "platform/log/Sink.h"
#include "platform/log/Writer.h"
#include "tests/support/Gate.h"

using namespace platform;
using namespace platform::log;
using testing::ContainsRegex;
using testing::HasSubstr;
using testing::MatchesRegex;

namespace {

template <class... A>
std::string shown(bool showPrivate, const char* format, const A&... args) {
    const std::array<Argument, sizeof...(A)> list{Argument(args)...};
    return renderLine(format, list, showPrivate);
}

struct Counted {
    mutable int asked = 0;
};

std::string describe(const Counted& counted) {
    ++counted.asked;
    return "counted";
}

// Standard error as a pipe, for as long as it lives.
class CapturedError {
public:
    CapturedError() : before_(::dup(STDERR_FILENO)) {
        log::flush();
        if (::pipe2(ends_.data(), O_CLOEXEC) != 0)
            std::abort();
        ::dup2(ends_[1], STDERR_FILENO);
        ::close(ends_[1]);
        ::fcntl(ends_[0], F_SETFL, O_NONBLOCK);
    }

    ~CapturedError() {
        drain();
        log::flush();
        ::dup2(before_, STDERR_FILENO);
        ::close(before_);
        ::close(ends_[0]);
    }

    // What is in the pipe now.
    std::string drain() {
        std::string text;
        std::array<char, 65536> room;
        for (ssize_t got; (got = ::read(ends_[0], room.data(), room.size())) > 0;)
            text.append(room.data(), static_cast<std::size_t>(got));
        return text;
    }

    // What comes until everything logged so far is out.
    std::string all() {
        log::flush();
        return drain();
    }

private:
    int before_;
    std::array<int, 2> ends_{};
};

// The log's settings for one test.
class Settings {
public:
    Settings(const char* level, const char* showPrivate) {
        ::setenv("ZEPHRIN_LOG", level, 1);
        ::setenv("ZEPHRIN_LOG_PRIVATE", showPrivate, 1);
        configureFromEnvironment();
    }

    ~Settings() {
        ::unsetenv("ZEPHRIN_LOG");
        ::unsetenv("ZEPHRIN_LOG_PRIVATE");
        configureFromEnvironment();
    }
};

const Category ops("ops");

} // namespace

TEST(LogRender, ShowsEachDirective) {
    const Uuid uuid = *Uuid::parse("00112233-4455-6677-8899-AABBCCDDEEFF");
    const std::string_view raw(reinterpret_cast<const char*>(uuid.bytes.data()), 16);
    EXPECT_EQ(shown(true, "a %@ b %s c", "one", std::string("two")), "a one b two c");
    EXPECT_EQ(shown(true, "%d %u %ld %lu %lx %llu", -1, 2u, -3L, 4UL, 255UL, ~0ULL),
              "-1 2 -3 4 ff 18446744073709551615");
    EXPECT_EQ(shown(true, "%@ %s %d", 7, Value(Array{1, "x"}), "text"), "7 [1, \"x\"] text");
    EXPECT_EQ(shown(true, "%p", reinterpret_cast<const void*>(0xabcUL)), "0xabc");
    EXPECT_EQ(shown(true, "100%%"), "100%");
    EXPECT_EQ(shown(true, "%{errno}d", ENOENT), "2 No such file or directory");
    EXPECT_EQ(shown(false, "%{uuid_t}.16P|%{uuid_t}.16P|%{public}@", raw, uuid, uuid),
              uuid.text() + "|" + uuid.text() + "|" + uuid.text());
    EXPECT_EQ(shown(true, "%@", Error{&posixErrorDomain, 5, "broken"}), "POSIX error 5: broken");
    EXPECT_EQ(shown(true, "%s", static_cast<const char*>(nullptr)), "(null)");
}

TEST(LogRender, HidesPrivateArgumentsWithoutAskingThem) {
    EXPECT_EQ(shown(false, "%@ %s %d %u %lx", "a", "b", 1, 2u, 3UL),
              "<private> <private> <private> <private> <private>");
    EXPECT_EQ(shown(false, "%{public}@ %{public}s %{private}@ %{errno}d", "a", "b", "c", EPERM),
              "a b <private> 1 Operation not permitted");
    const Counted counted;
    EXPECT_EQ(shown(false, "%@", counted), "<private>");
    EXPECT_EQ(counted.asked, 0);
    EXPECT_EQ(shown(false, "%{public}@", counted), "counted");
}

TEST(LogRender, LeavesWhatItDoesNotKnow) {
    const std::pair<const char*, const char*> cases[] = {
        {"%q %@", "%q first"},
        {"%", "%"},
        {"%{public", "%{public"},
        {"%@ %@ %@", "first second %@"},
        {"%.3@ %@", "%.3@ first"},
        {"%.16P %@", "%.16P first"},
        {"%l", "%l"},
        {"%{uuid_t}.16P", "first"},
    };

    for (const auto& [format, text] : cases)
        EXPECT_EQ(shown(true, format, "first", "second"), text);
}

TEST(LogRender, EscapesControlCharactersInArguments) {
    EXPECT_EQ(shown(true, "%@\n", "a\nb\r\t\x1b[31m\x7f"), "a\\nb\\r\\t\\x1b[31m\\x7f\n");
    EXPECT_EQ(shown(true, "%@", std::string_view("\0", 1)), "\\x00");
    EXPECT_EQ(shown(true, "%@", "\xc2\x9b \xc2\xa0 \xc3\x9b"), "\\xc2\\x9b \xc2\xa0 \xc3\x9b");
}

TEST(Log, WritesALinePerCall) {
    const Settings settings("info", "0");
    CapturedError captured;
    ops.error("refused %@ %{public}@", "secret", "shown");
    ops.standard("plain");
    ops.info("told");
    ops.debug("not told");
    const std::string text = captured.all();
    const std::string time = "[0-9]{4}-[0-9]{2}-[0-9]{2}T[0-9:]{8}\\.[0-9]{3}Z ";
    const std::string source = "test_platform\\[" + std::to_string(::getpid()) + "\\] ops ";
    EXPECT_THAT(text, MatchesRegex(time + source + "error: refused <private> shown\n" + //
                                   time + source + "default: plain\n" +                 //
                                   time + source + "info: told\n"));
}

TEST(Log, ObeysItsSettings) {
    const std::pair<const char*, Level> cases[] = {{"debug", Level::debug},
                                                   {"info", Level::info},
                                                   {"default", Level::standard},
                                                   {"error", Level::error},
                                                   {"nonsense", Level::standard}};

    for (const auto& [name, least] : cases) {
        const Settings settings(name, "1");
        for (const Level level : {Level::debug, Level::info, Level::standard, Level::error})
            EXPECT_EQ(ops.enabled(level), level >= least) << name;
        CapturedError captured;
        ops.error("%@", "visible");
        EXPECT_THAT(captured.all(), HasSubstr("error: visible"));
    }
}

TEST(Log, KeepsTheOrderOfEachThread) {
    const Settings settings("debug", "1");
    CapturedError captured;
    inThreads(4, [](int t) {
        for (int i = 0; i < 100; ++i)
            ops.debug("t%d line %d.", t, i);
    });
    const std::string text = captured.all();
    for (int t = 0; t < 4; ++t) {
        std::size_t at = 0;
        for (int i = 0; i < 100; ++i) {
            at = text.find("t" + std::to_string(t) + " line " + std::to_string(i) + ".", at);
            ASSERT_NE(at, std::string::npos) << t << " " << i;
        }
    }
}

TEST(Log, NeverWaitsForAReaderAndCountsWhatItDropped) {
    const Settings settings("debug", "1");
    CapturedError captured;
    const std::string filler(1000, 'x');
    // Five times what buffer and pipe hold; who waited here would wait for ever.
    for (int i = 0; i < 5000; ++i)
        ops.debug("filler %@", filler);
    ops.standard("important");

    std::string text;
    for (int i = 0; i < 200 && text.find("default: important\n") == std::string::npos; ++i) {
        text += captured.drain();
        ::usleep(10'000);
    }
    text += captured.all();
    EXPECT_THAT(text, HasSubstr("default: important\n"));
    EXPECT_THAT(text, ContainsRegex("default error: log buffer full: [0-9]+ lines dropped\n"));
}

TEST(Log, CutsAnEndlessLine) {
    const Settings settings("default", "1");
    CapturedError captured;
    ::fcntl(STDERR_FILENO, F_SETPIPE_SZ, 1024 * 1024);
    std::string endless;
    while (endless.size() < 2 * Writer::longestLine)
        endless += "\xc3\xa9"; // two bytes each
    ops.standard("%@", endless);
    const std::string text = captured.all();
    EXPECT_LT(text.size(), Writer::longestLine + 200);
    EXPECT_THAT(text, HasSubstr("\xc3\xa9 [cut]\n")) << "at a character's end";
}

TEST(LogSink, KnowsTheJournalsStream) {
    struct ::stat status = {};
    status.st_dev = 8;
    status.st_ino = 12345;
    EXPECT_TRUE(namesStream("8:12345", status));
    for (const char* other : {"", "8", "8:1234", "8:123456", "9:12345", ":", "8:12345 "})
        EXPECT_FALSE(namesStream(other, status)) << other;
}
