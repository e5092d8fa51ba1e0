#include "Zephrin/ZPSandboxExtension.h"

#include <cerrno>
#include <utility>

#include "Zephrin/ZPDLog.h"
#include "platform/paths/Places.h"
#include "platform/sandbox/BrokerClient.h"

namespace {

std::shared_ptr<platform::SandboxExtensions> usualSandbox() {
    return std::make_shared<platform::BrokerClient>(
        platform::Places::forThisProcess().socketPath(platform::sandboxServiceName));
}

} // namespace

ZPSandboxExtension::ZPSandboxExtension(std::string token)
    : ZPSandboxExtension(std::move(token), usualSandbox()) {}

ZPSandboxExtension::ZPSandboxExtension(std::string token,
                                       std::shared_ptr<platform::SandboxExtensions> sandbox)
    : sandbox_(std::move(sandbox)), token_(std::move(token)) {}

ZPSandboxExtension::~ZPSandboxExtension() {
    expel();
}

std::string ZPSandboxExtension::token() const {
    const std::lock_guard lock(mutex_);
    return token_;
}

void ZPSandboxExtension::setToken(std::string token) {
    const std::lock_guard lock(mutex_);
    token_ = std::move(token);
}

std::int64_t ZPSandboxExtension::handle() const {
    const std::lock_guard lock(mutex_);
    return handle_;
}

void ZPSandboxExtension::setHandle(std::int64_t handle) {
    const std::lock_guard lock(mutex_);
    handle_ = handle;
}

void ZPSandboxExtension::consume() {
    if (handle() != notConsumed)
        return;
    const std::string text = token();
    const auto consumed = sandbox_->consume(text);
    setHandle(consumed.value_or(notConsumed));
    if (consumed)
        ZPDLogSandbox().debug("consuming extension %s -> %ld", text, *consumed);
    else
        ZPDLogSandbox().standard("failed to consume extension %s - errno=%d", text,
                                 consumed.error());
}

void ZPSandboxExtension::expel() {
    const std::int64_t released = handle();
    if (released == notConsumed)
        return;
    if (const int error = sandbox_->release(released))
        ZPDLogSandbox().standard("failed to release extension %ld - errno=%d", released, error);
    else
        ZPDLogSandbox().debug("releasing extension %ld", released);
    setHandle(notConsumed);
}

std::expected<platform::UniqueFd, int> ZPSandboxExtension::open(std::string_view path) const {
    if (handle() == notConsumed)
        return std::unexpected(EBADF);
    return sandbox_->open(token(), path);
}

bool ZPSandboxExtension::isEqual(const ZPSandboxExtension& other) const {
    return &other == this || token() == other.token();
}
