#include "tests/e2e/Replies.h"

#include <algorithm>

namespace e2e {

namespace {

std::string joined(std::vector<std::string> words, const char* between) {
    std::sort(words.begin(), words.end());
    std::string result;
    for (const std::string& word : words)
        result += (result.empty() ? "" : between) + word;
    return result;
}

} // namespace

std::string errorOf(const Item& reply) {
    if (!reply.has("errorcode") && !reply.has("error"))
        return "";
    return std::to_string(reply["errorcode"].number()) + " " + reply["error"].text();
}

std::vector<Item> formsOf(const Item& reply) {
    return reply["matches"].embedded().items();
}

Item formOf(const Item& reply) {
    return reply["matches"].embedded();
}

std::vector<Item> match(WireClient& client, const Item& rules, std::uint64_t flags) {
    Item body = envelope("match");
    if (!rules.isNull())
        body.set("rules", rules);
    if (flags != 0)
        body.set("flags", flags);
    return formsOf(client.request(body));
}

std::string matched(WireClient& client, const Item& rules, std::uint64_t flags) {
    std::vector<std::string> words;
    for (const Item& form : match(client, rules, flags))
        words.push_back(form["identifier"].text());
    return joined(std::move(words), " ");
}

std::string versions(WireClient& client, const Item& rules, std::uint64_t flags) {
    std::vector<std::string> words;
    for (const Item& form : match(client, rules, flags))
        words.push_back(form["identifier"].text() + " " + form["version"].text());
    return joined(std::move(words), ", ");
}

Item findAt(WireClient& client, const std::string& path) {
    return formOf(client.request(findRequest(Item::map({{"paths", "file://" + path}}))));
}

Item pathsRequest(const char* type, const std::vector<std::string>& paths) {
    Item list = Item::array({});
    for (const std::string& path : paths)
        list.append(path);
    return envelope(type, Item::map({{"paths", list}}));
}

Item findRequest(const Item& more) {
    return envelope("find", more);
}

} // namespace e2e
