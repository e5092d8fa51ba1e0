#include "platform/jobs/JobService.h"

#include <cerrno>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <utility>

#include "platform/jobs/JobError.h"
#include "platform/jobs/JobLog.h"
#include "platform/log/Render.h"

namespace platform {

namespace {

struct Executable {
    UniqueFd file;
    FileStamp stamp;
};

std::expected<Executable, int> openExecutable(const std::string& path) {
    UniqueFd file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat status{};
    if (!file || ::fstat(file.get(), &status) != 0)
        return std::unexpected(errno);
    if (!S_ISREG(status.st_mode) || !(status.st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)))
        return std::unexpected(EACCES);
    return Executable{std::move(file), FileStamp::of(status)};
}

bool isPath(const std::string& path) {
    return path.starts_with('/') && path.find('\0') == std::string::npos;
}

bool isSound(const ExternalService& service) {
    return !service.identifier.empty() && isPath(service.executable) && isPath(service.bundle) &&
           (!service.container || isPath(*service.container));
}

bool isVariable(std::string_view name, const Value& value) {
    const auto text = value.string();
    return text && !name.empty() && name.find_first_of(std::string_view("=\0", 2)) == name.npos &&
           text->find('\0') == text->npos;
}

void readEnvironment(JobService& service, const Dictionary* variables) {
    if (!variables)
        return;
    for (const auto& [key, value] : *variables) {
        const std::string_view name = key.view();
        if (!isVariable(name, value)) {
            jobLog().info("left out of the environment of %{public}@: %@", service.what.identifier,
                          name);
            continue;
        }
        service.environment.set(key, value);
        service.environmentSize += name.size() + value.string()->size();
    }
}

} // namespace

std::expected<std::shared_ptr<const JobService>, int>
JobService::create(const ExternalService& service, const Dictionary& overlay) {
    const Dictionary* const entry = overlay.findDictionary("IPCService");
    const Value* const profile = entry ? entry->find("_SandboxProfile") : nullptr;
    const auto profileName = profile ? profile->string() : std::nullopt;
    if (!isSound(service) || !profileName || profileName->empty())
        return std::unexpected(EINVAL);
    const auto executable = openExecutable(service.executable);
    if (!executable)
        return std::unexpected(executable.error());
    auto made = std::make_shared<JobService>();
    made->what = service;
    made->profile = *profileName;
    made->stamp = executable->stamp;
    readEnvironment(*made, entry->findDictionary("EnvironmentVariables"));
    if (made->environmentSize > largestEnvironment)
        return std::unexpected(E2BIG);
    return made;
}

std::expected<UniqueFd, Error> JobService::open() const {
    auto executable = openExecutable(what.executable);
    if (!executable) {
        return std::unexpected(
            jobError(jobErrorRefused, log::renderText("cannot open the executable of plug-in %@: "
                                                      "%{errno}d",
                                                      what.identifier, executable.error())));
    }
    if (executable->stamp != stamp) {
        return std::unexpected(jobError(
            jobErrorRefused,
            log::renderText("the executable of plug-in %@ has changed since it was made ready",
                            what.identifier)));
    }
    return std::move(executable->file);
}

} // namespace platform
