#include "platform/jobs/LauncherProtocol.h"

#include <limits>
#include <string_view>
#include <utility>

namespace platform::launcher {

namespace {

// The names of messages.
constexpr std::string_view launchName = "launch";
constexpr std::string_view endName = "end";
constexpr std::string_view madeName = "made";
constexpr std::string_view startedName = "started";
constexpr std::string_view failedName = "failed";
constexpr std::string_view goneName = "gone";

constexpr std::string_view pathKey = "path";
constexpr std::string_view environmentKey = "environment";
constexpr std::string_view profileKey = "profile";
constexpr std::string_view bundleKey = "bundle";
constexpr std::string_view containerKey = "container";
constexpr std::string_view userKey = "user";
constexpr std::string_view pidKey = "pid";
constexpr std::string_view confinementKey = "confinement";
constexpr std::string_view errorKey = "errno";
constexpr std::string_view descriptionKey = "description";
constexpr std::string_view statusKey = "status";

// Reads the values of one message; after the first that is not there or of another type, `good`
// stays false.
class Reader {
public:
    explicit Reader(const Dictionary& message) : message_(message) {}

    [[nodiscard]] bool good() const { return good_; }

    [[nodiscard]] bool has(std::string_view key) const { return message_.contains(key); }

    std::uint64_t number(std::string_view key) {
        const Value* value = message_.find(key);
        return kept(value ? value->unsignedInteger() : std::nullopt);
    }

    template <class T>
    T number(std::string_view key) {
        const std::uint64_t wide = number(key);
        good_ = good_ && wide <= static_cast<std::uint64_t>(std::numeric_limits<T>::max());
        return good_ ? static_cast<T>(wide) : T();
    }

    // Without NUL: all of them end up in calls that stop there.
    std::string text(std::string_view key) {
        const Value* value = message_.find(key);
        const auto text = kept(value ? value->string() : std::nullopt);
        good_ = good_ && text.find('\0') == std::string_view::npos;
        return std::string(text);
    }

    std::optional<std::string> optionalText(std::string_view key) {
        return has(key) ? std::optional(text(key)) : std::nullopt;
    }

    Dictionary dictionary(std::string_view key) {
        const Dictionary* found = message_.findDictionary(key);
        return kept(found ? std::optional(*found) : std::nullopt);
    }

    void require(bool condition) { good_ = good_ && condition; }

private:
    template <class T>
    T kept(const std::optional<T>& value) {
        good_ = good_ && value;
        return value.value_or(T());
    }

    const Dictionary& message_;
    bool good_ = true;
};

template <class Message>
std::optional<Message> checked(const Reader& reader, Message message) {
    return reader.good() ? std::optional(std::move(message)) : std::nullopt;
}

// No process may be given root's number, nor the one that the kernel takes for "leave it as it is".
bool isUser(uid_t user) {
    return user != 0 && user != std::numeric_limits<uid_t>::max();
}

ConfinementPlan planOf(Reader& reader) {
    ConfinementPlan plan{reader.text(profileKey), reader.text(bundleKey),
                         reader.optionalText(containerKey), std::nullopt};
    if (reader.has(userKey)) {
        plan.user = reader.number<uid_t>(userKey);
        reader.require(isUser(*plan.user));
    }
    return plan;
}

std::optional<Order> launchOf(Reader& reader) {
    Launch launch{reader.number(launchName), reader.text(pathKey),
                  reader.dictionary(environmentKey), planOf(reader)};
    reader.require(isEnvironment(launch.environment));
    return checked<Order>(reader, std::move(launch));
}

std::optional<News> madeOf(Reader& reader) {
    const Made made{reader.number(madeName), reader.number<pid_t>(pidKey)};
    reader.require(made.pid > 1);
    return checked<News>(reader, made);
}

} // namespace

Dictionary encode(const Launch& launch) {
    const ConfinementPlan& plan = launch.confinement;
    Dictionary message{{launchName, launch.id},
                       {pathKey, launch.path},
                       {profileKey, plan.profile},
                       {environmentKey, launch.environment},
                       {bundleKey, plan.bundle}};
    if (plan.container)
        message.set(containerKey, *plan.container);
    if (plan.user)
        message.set(userKey, *plan.user);
    return message;
}

Dictionary encode(const End& end) {
    return {{endName, end.id}};
}

Dictionary encode(const Made& made) {
    return {{madeName, made.id}, {pidKey, made.pid}};
}

Dictionary encode(const Started& started) {
    return {{startedName, started.id}, {confinementKey, started.confinement}};
}

Dictionary encode(const Failed& failed) {
    return {
        {failedName, failed.id}, {errorKey, failed.error}, {descriptionKey, failed.description}};
}

Dictionary encode(const Gone& gone) {
    return {{goneName, gone.id}, {statusKey, gone.status}};
}

std::optional<Order> decodeOrder(const Dictionary& message) {
    Reader reader(message);
    if (reader.has(launchName))
        return launchOf(reader);
    return checked<Order>(reader, End{reader.number(endName)});
}

std::optional<News> decodeNews(const Dictionary& message) {
    Reader reader(message);
    if (reader.has(madeName))
        return madeOf(reader);
    if (reader.has(startedName))
        return checked<News>(
            reader, Started{reader.number(startedName), reader.dictionary(confinementKey)});
    if (reader.has(failedName))
        return checked<News>(reader, Failed{reader.number(failedName), reader.number<int>(errorKey),
                                            reader.text(descriptionKey)});
    return checked<News>(reader, Gone{reader.number(goneName), reader.number<int>(statusKey)});
}

bool isEnvironment(const Dictionary& environment) {
    for (const auto& [key, value] : environment) {
        const std::string_view name = key.view();
        if (name.empty() ||
            name.find_first_of(std::string_view("=\0", 2)) != std::string_view::npos)
            return false;
        const auto text = value.string();
        if (!text || text->find('\0') != std::string_view::npos)
            return false;
    }
    return true;
}

} // namespace platform::launcher
