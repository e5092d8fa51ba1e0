#include "platform/confine/FileRules.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <string>
#include <unistd.h>
#include <vector>

namespace platform {

namespace {

using landlock::Rights;

constexpr Rights mayReadFile = landlock::readFile;
constexpr Rights mayRead = landlock::readFile | landlock::readFolder;
constexpr Rights mayRun = mayRead | landlock::execute;
constexpr Rights mayUseDevice = landlock::readFile | landlock::writeFile;
// No sockets, as nobody may connect to one, no devices, and nothing to run: what runs was
// installed.
constexpr Rights mayKeep = mayRead | landlock::writeFile | landlock::truncate | landlock::refer |
                           landlock::makeFile | landlock::makeFolder | landlock::makeLink |
                           landlock::makeFifo | landlock::removeFile | landlock::removeFolder;

struct SystemPath {
    const char* path;
    Rights rights;
    bool forNetwork = false;
};

// In /etc and below, files are replaced by others of the same name: what counts is the one that is
// there when the plug-in starts.
constexpr SystemPath systemPaths[] = {
    {"/usr", mayRun},
    {"/bin", mayRun},
    {"/lib", mayRun},
    {"/lib32", mayRun},
    {"/lib64", mayRun},
    {"/etc/ld.so.cache", mayReadFile},
    {"/etc/localtime", mayReadFile},
    {"/sys/devices/system/cpu", mayRead},
    {"/dev/null", mayUseDevice},
    {"/dev/zero", mayUseDevice},
    {"/dev/full", mayUseDevice},
    {"/dev/random", mayUseDevice},
    {"/dev/urandom", mayUseDevice},
    {"/etc/resolv.conf", mayReadFile, true},
    {"/etc/hosts", mayReadFile, true},
    {"/etc/host.conf", mayReadFile, true},
    {"/etc/nsswitch.conf", mayReadFile, true},
    {"/etc/gai.conf", mayReadFile, true},
    {"/etc/services", mayReadFile, true},
    {"/etc/protocols", mayReadFile, true},
    {"/etc/ssl/openssl.cnf", mayReadFile, true},
    {"/etc/ssl/certs", mayRead, true},
    {"/etc/ca-certificates", mayRead, true},
    {"/run/systemd/resolve", mayRead, true}, // where resolv.conf may be a link to
    {"/run/resolvconf", mayRead, true},
    {"/run/connman", mayRead, true},
};

bool leadsToUsr(const SystemPath& system) {
    std::error_code failed;
    const std::string target = std::filesystem::read_symlink(system.path, failed).string();
    return target.starts_with("usr/") || target.starts_with("/usr/");
}

// Without the folders that are links into /usr: each path takes time at each launch.
std::vector<SystemPath> distinctPaths() {
    std::vector<SystemPath> paths;
    for (const SystemPath& system : systemPaths) {
        if (system.rights != mayRun || !leadsToUsr(system))
            paths.push_back(system);
    }
    return paths;
}

class Adder {
public:
    Adder(int ruleset, const KernelFeatures& features)
        : ruleset_(ruleset), known_(landlock::rightsToFiles(features)) {}

    // 0, or an errno value.
    [[nodiscard]] int add(const std::string& path, Rights rights, int flags = 0) const {
        const UniqueFd open(::open(path.c_str(), O_PATH | O_CLOEXEC | flags));
        if (!open)
            return errno;
        const int failed = landlock::allowBelow(ruleset_, open.get(), rights & known_);
        if (failed != EINVAL)
            return failed;
        // No folder, then, and of those rights it can only have some.
        return landlock::allowBelow(ruleset_, open.get(), rights & known_ & landlock::ofFile);
    }

    // The same for a folder of our own, which no link leads to.
    [[nodiscard]] std::optional<Error> addFolder(const std::string& path, Rights rights) const {
        if (const int number = add(path, rights, O_DIRECTORY | O_NOFOLLOW))
            return posixError(number, path);
        return std::nullopt;
    }

private:
    const int ruleset_;
    const Rights known_;
};

// Where the library of this system may lie; nowhere when it is in /usr.
std::vector<std::string> placesOfOwnLibrary() {
    std::error_code failed;
    const auto program = std::filesystem::read_symlink("/proc/self/exe", failed);
    if (failed || program.string().starts_with("/usr/"))
        return {};
    const auto above = program.parent_path().parent_path();
    return {above / ZEPHRIN_LIBRARY_FOLDER / ZEPHRIN_LIBRARY_NAME,
            above / "lib" / ZEPHRIN_LIBRARY_NAME};
}

// Where the system lies elsewhere than in /usr: plug-ins use its library, as they do there.
void addOwnLibrary(const Adder& adder) {
    static const std::vector<std::string> places = placesOfOwnLibrary();
    for (const std::string& place : places)
        (void)adder.add(place, mayRead);
}

} // namespace

std::optional<Error> addFileRules(int ruleset, const ConfinementPlan& plan, const Profile& profile,
                                  const KernelFeatures& features) {
    const Adder adder(ruleset, features);
    static const std::vector<SystemPath> paths = distinctPaths();
    for (const SystemPath& system : paths) {
        if (profile.network || !system.forNetwork)
            (void)adder.add(system.path, system.rights);
    }
    addOwnLibrary(adder);
    if (auto error = adder.addFolder(plan.bundle, mayRun))
        return error;
    return plan.container ? adder.addFolder(*plan.container, mayKeep) : std::nullopt;
}

void addOwnProcess(int ruleset) noexcept {
    const int self = ::open("/proc/self", O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (self < 0)
        return;
    (void)landlock::allowBelow(ruleset, self, mayRead);
    ::close(self);
}

} // namespace platform
