#include <algorithm>
#include <array>
#include <climits>
#include <unistd.h>

#include "AppRegistry/ARFolder.h"
#include "AppRegistry/ARWatches.h"

// The way to a path: every folder that has to be passed, through every symbolic link.

namespace {

constexpr int mostLinks = 40; // the kernel follows no more either

// What a link holds; empty when it is none.
std::string linkAt(const std::string& path) {
    std::array<char, PATH_MAX> room;
    const ssize_t length = ::readlink(path.c_str(), room.data(), room.size());
    return length > 0 ? std::string(room.data(), static_cast<std::size_t>(length)) : std::string();
}

// Takes the first name off a path.
std::string takeName(std::string& path) {
    path.erase(0, path.find_first_not_of('/'));
    const std::string name = path.substr(0, path.find('/'));
    path.erase(0, name.size());
    return name;
}

} // namespace

// From the top down: a folder is watched for a name before it is looked what the name leads to. So
// whatever changes on the way later is noticed.
void ARWatches::walk(Interest interest, const std::string& path, std::uint32_t lastEvents) {
    std::string folder = "/";
    std::string rest = path;
    for (int links = 0; links <= mostLinks;) {
        interest.name = takeName(rest);
        if (interest.name.empty())
            return;
        if (interest.name == ".")
            continue;
        if (interest.name == "..") {
            folder = ARFolderOf(folder);
            continue;
        }
        const bool last = rest.find_first_not_of('/') == std::string::npos;
        add(folder, last ? lastEvents : nameEvents, interest);
        const std::string next = ARPathIn(folder, interest.name);
        const std::string target = linkAt(next);
        if (target.empty()) {
            folder = next;
        } else {
            ++links;
            rest = target + "/" + rest;
            folder = target.starts_with('/') ? "/" : folder;
        }
    }
}
