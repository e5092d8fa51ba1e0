#include "platform/ipc/Listener.h"

#include <algorithm>
#include <atomic>
#include <cassert>
#include <cerrno>
#include <mutex>
#include <optional>
#include <sys/resource.h>
#include <sys/socket.h>
#include <utility>

#include "platform/ipc/Connection.h"
#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/IpcLog.h"
#include "platform/ipc/Loop.h"
#include "platform/ipc/PeerCredentials.h"
#include "platform/ipc/ServiceSocket.h"
#include "platform/ipc/SocketWatch.h"
#include "platform/ipc/UserAccount.h"

namespace platform::ipc {

namespace {

constexpr int acceptsPerTurn = 16;
// Of a connection: its socket, the process twice, the file that it runs.
constexpr std::size_t descriptorsEach = 4;
constexpr std::chrono::milliseconds pauseWithoutDescriptors{100};

std::size_t descriptorLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0)
        return 0;
    return static_cast<std::size_t>(limit.rlim_cur);
}

bool isShortage(int error) {
    return error == EMFILE || error == ENFILE || error == ENOBUFS || error == ENOMEM;
}

} // namespace

// Shared by the listener and the wait for new connections.
struct Listener::Impl final : SocketWatch::Target, std::enable_shared_from_this<Impl> {
    Impl(Loop& itsLoop, std::string itsPath, ServiceSocket itsSocket, Handler itsHandler,
         const Limits& itsLimits)
        : loop(itsLoop),
          path(std::move(itsPath)),
          service(std::move(itsSocket)),
          handler(std::move(itsHandler)),
          limits(itsLimits),
          mostUserConnections(
              std::min(limits.userConnections, descriptorLimit() / 4 / descriptorsEach)),
          highestDescriptor(descriptorLimit() - descriptorLimit() / 8),
          accounts(limits.userWaitingBytes) {}

    // On the loop.
    void begin(UniqueFd listening);
    void readable() override;
    [[nodiscard]] bool acceptOne();
    void admit(UniqueFd accepted);
    void pause(int error);
    void stopAccepting();
    void tell(ListenerEvent event);

    Loop& loop;
    const std::string path;
    std::mutex mutex;
    std::optional<ServiceSocket> service; // guarded; none once cancelled
    Handler handler;                      // on the loop once resumed
    std::atomic<bool> resumed = false;

    // On the loop.
    const Limits limits;
    const std::size_t mostUserConnections;
    const std::size_t highestDescriptor; // above are those that the daemon's own work needs
    UserAccounts accounts;
    std::unique_ptr<SocketWatch> socket;
    std::unique_ptr<Timer> timer;
    bool shortage = false; // of descriptors, as the log was told
};

void Listener::Impl::begin(UniqueFd listening) {
    socket = std::make_unique<SocketWatch>(loop, std::move(listening));
    socket->waitReadable(shared_from_this());
}

void Listener::Impl::readable() {
    for (int i = 0; socket && i < acceptsPerTurn && acceptOne(); ++i) {}
    if (socket && !timer)
        socket->waitReadable(shared_from_this());
}

// Accepts one connection if there is one; answers whether to go on.
bool Listener::Impl::acceptOne() {
    UniqueFd accepted(
        ::accept4(socket->descriptor(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
    if (!accepted) {
        const int error = errno;
        if (isShortage(error))
            pause(error);
        return error == EINTR || error == ECONNABORTED;
    }
    if (static_cast<std::size_t>(accepted.get()) >= highestDescriptor) {
        pause(EMFILE);
        return false;
    }
    shortage = false;
    admit(std::move(accepted));
    return true;
}

void Listener::Impl::admit(UniqueFd accepted) {
    auto peer = peerOf(accepted.get());
    if (!peer)
        return;
    const auto account = accounts.of(peer->uid);
    if (!account->open(mostUserConnections)) {
        ipcLog().error(
            "user %{public}u has too many connections; one of process %{public}d is closed",
            peer->uid, peer->pid);
        return;
    }
    if (limits.room > 0)
        (void)::setsockopt(accepted.get(), SOL_SOCKET, SO_SNDBUF, &limits.room, sizeof limits.room);
    const auto connection = std::make_shared<Connection>(std::make_unique<Connection::Impl>(
        loop, std::move(accepted), std::move(*peer), account, limits));
    connection->impl().greet();
    tell(connection);
}

// Waiting for descriptors costs nothing; asking for one again and again would.
void Listener::Impl::pause(int error) {
    if (!std::exchange(shortage, true))
        ipcLog().error("cannot accept connections for now: %{errno}d", error);
    timer = loop.makeTimer();
    timer->start(pauseWithoutDescriptors, [weak = weak_from_this()] {
        const auto self = weak.lock();
        if (!self)
            return;
        self->timer.reset();
        if (self->socket)
            self->socket->waitReadable(self);
    });
}

void Listener::Impl::stopAccepting() {
    socket.reset();
    timer.reset();
    tell(ConnectionError::invalid);
    handler = nullptr;
}

void Listener::Impl::tell(ListenerEvent event) {
    if (handler)
        handler(std::move(event));
}

std::expected<std::unique_ptr<Listener>, Error>
Listener::create(Loop& loop, const std::string& path, Handler handler, const Limits& limits) {
    auto service = ServiceSocket::bind(path);
    if (!service)
        return std::unexpected(std::move(service).error());
    return std::unique_ptr<Listener>(new Listener(
        std::make_shared<Impl>(loop, path, std::move(*service), std::move(handler), limits)));
}

Listener::Listener(std::shared_ptr<Impl> impl) : impl_(std::move(impl)) {}

Listener::~Listener() {
    cancel();
}

void Listener::setEventHandler(Handler handler) {
    assert(!impl_->resumed);
    impl_->handler = std::move(handler);
}

void Listener::resume() {
    const std::lock_guard lock(impl_->mutex);
    if (!impl_->service || impl_->resumed.exchange(true))
        return;
    UniqueFd socket = impl_->service->takeSocket();
    impl_->loop.post(
        [impl = impl_, socket = std::move(socket)]() mutable { impl->begin(std::move(socket)); });
}

void Listener::cancel() {
    {
        const std::lock_guard lock(impl_->mutex);
        if (!impl_->service)
            return;
        impl_->service.reset();
    }
    impl_->loop.post([impl = impl_] { impl->stopAccepting(); });
}

const std::string& Listener::path() const noexcept {
    return impl_->path;
}

} // namespace platform::ipc
