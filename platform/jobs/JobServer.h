#pragma once

#include <expected>
#include <memory>
#include <string>

#include "platform/value/Error.h"

namespace platform {

class JobManager;

namespace ipc {
class Loop;
}

// The name under which hosts find it.
inline constexpr const char* jobServiceName = "com.tovana.jobd";

// The job manager's own service: a host process starts what was made ready for it, and anybody may
// see what runs. docs/jobs.md has the requests.
//
// Owned by the daemon. Everything happens on the job manager's loop, which outlives it, and so does
// the job manager.
class JobServer {
public:
    // Binds the socket, but accepts nobody yet. Fails as a listener does.
    [[nodiscard]] static std::expected<std::unique_ptr<JobServer>, Error>
    create(ipc::Loop& loop, JobManager& jobs, const std::string& socketPath);
    JobServer(const JobServer&) = delete;
    JobServer& operator=(const JobServer&) = delete;
    ~JobServer();

    void resume();
    // Takes no more connections, and the socket away.
    void stop();

private:
    struct Impl;
    explicit JobServer(std::unique_ptr<Impl> impl);

    const std::unique_ptr<Impl> impl_;
};

} // namespace platform
