#include "zpd/Daemon.h"

#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <unistd.h>
#include <utility>

#include "AppRegistry/ARFollower.h"
#include "AppRegistry/ARRegistry.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPPlugInCore.h"
#include "platform/consent/FileConsent.h"
#include "platform/container/FolderContainers.h"
#include "platform/file/File.h"
#include "platform/file/PathWatch.h"
#include "platform/ipc/Loop.h"
#include "platform/jobs/JobManager.h"
#include "platform/jobs/JobServer.h"
#include "platform/jobs/LauncherProcess.h"
#include "platform/locale/SystemLocale.h"
#include "platform/notify/FileNotifications.h"
#include "platform/paths/Places.h"
#include "platform/preferences/FilePreferences.h"
#include "platform/process/ProcProcesses.h"
#include "platform/sandbox/HmacSandbox.h"
#include "platform/sandbox/SandboxBroker.h"
#include "platform/sandbox/SandboxExtensions.h"
#include "platform/signing/SignedPrograms.h"
#include "platform/types/DeclaredTypes.h"
#include "zpd/Platform.h"
#include "zpd/ZPDExtensionPoints.h"
#include "zpd/ZPDServer.h"

using platform::UniqueFd;

namespace {

// So that no file or socket ever gets a number that somebody writes to as standard error.
void openStandardDescriptors() {
    int fd = -1;
    do {
        fd = ::open("/dev/null", O_RDWR);
    } while (fd >= 0 && fd <= STDERR_FILENO);
    if (fd >= 0)
        ::close(fd);
}

void logCannotServe(const std::string& service, const platform::Error& why) {
    ZPDLogOps().error("cannot serve %{public}@: %{public}@", service, why);
}

// Whether a canonical path is a registered bundle or lies in one. Any thread.
bool isInRegisteredBundle(ARApplicationWorkspace& registry, std::string path) {
    for (; path.size() > 1; path = platform::folderOf(path)) {
        const auto application = registry.applicationProxyForBundlePath(path);
        if ((application && !application->isPlaceholder()) || registry.zephrinProxyForPath(path))
            return true;
    }
    return false;
}

} // namespace

// In the order in which they are made; what comes later uses what came before.
struct Daemon::Parts {
    explicit Parts(platform::Places where);
    [[nodiscard]] std::unique_ptr<platform::ipc::Watch> watch(int descriptor,
                                                              std::function<void()> handler);
    void watchFiles();
    [[nodiscard]] bool openRegistry();
    [[nodiscard]] bool makeServer(const ZPDOptions& options);
    void makeBroker();
    void makeJobServer();
    void resume();
    void stop() const;
    [[noreturn]] void terminate();

    const platform::Places places;
    platform::ipc::Loop mainLoop{"main"};
    platform::ProcProcesses processes;
    platform::SignedPrograms signing;
    platform::HmacSandbox sandbox;
    platform::DeclaredTypes types;
    platform::FilePreferences preferences;
    platform::FileNotifications notifications;
    platform::FileConsent consent;
    platform::FolderContainers containers;
    platform::SystemLocale locale;
    platform::ipc::Loop jobsLoop{"jobs"};
    platform::LauncherProcess launcher{jobsLoop};
    platform::JobManager jobs{jobsLoop, launcher};
    platform::PathWatch trust; // noticing what changes there from here on
    std::unique_ptr<ARRegistry> registry;
    std::unique_ptr<platform::SandboxBroker> broker;
    std::unique_ptr<platform::JobServer> jobServer;
    std::unique_ptr<ZPDServer> server;
    std::unique_ptr<platform::ipc::Watch> localeWatch;
    std::unique_ptr<platform::ipc::Watch> trustWatch;
    std::unique_ptr<ARFollower> follower;
};

Daemon::Parts::Parts(platform::Places where)
    : places(std::move(where)),
      signing(places.trust),
      types(places.types),
      preferences(places.preferences),
      notifications(places.notify),
      consent(places.consent),
      containers(places.containers),
      locale(places.locale),
      trust(places.trust) {}

std::unique_ptr<platform::ipc::Watch> Daemon::Parts::watch(int descriptor,
                                                           std::function<void()> handler) {
    UniqueFd own(::fcntl(descriptor, F_DUPFD_CLOEXEC, 0));
    return own ? mainLoop.watchDescriptor(std::move(own), std::move(handler)) : nullptr;
}

void Daemon::Parts::watchFiles() {
    localeWatch = watch(locale.watchDescriptor(), [this] { locale.handleEvents(); });
    trustWatch = watch(trust.descriptor(), [this] {
        if (trust.handleEvents())
            server->trustChanged();
    });
}

bool Daemon::Parts::openRegistry() {
    auto opened = ARRegistry::open(places, locale, containers, types, signing);
    if (!opened) {
        ZPDLogOps().error("cannot open the registry: %{public}@", opened.error());
        return false;
    }
    registry = std::move(*opened);
    return true;
}

bool Daemon::Parts::makeServer(const ZPDOptions& options) {
    if (options.serviceName.empty() || options.serviceName.find('/') != std::string::npos) {
        ZPDLogOps().error("cannot serve %{public}@: no name for a socket", options.serviceName);
        return false;
    }
    const Platform platform{.processes = processes,
                            .signing = signing,
                            .sandbox = sandbox,
                            .types = types,
                            .preferences = preferences,
                            .notifications = notifications,
                            .containers = containers,
                            .locale = locale,
                            .jobs = jobs,
                            .assertions = jobs,
                            .consent = consent,
                            .workspace = *registry};
    auto made = ZPDServer::create(platform, {.socketPath = places.socketPath(options.serviceName),
                                             .databasePath = options.databasePath});
    if (!made) {
        logCannotServe(options.serviceName, made.error());
        return false;
    }
    server = std::move(*made);
    return true;
}

// Of several daemons on one home the first has it; the others serve without.
void Daemon::Parts::makeBroker() {
    const auto isInBundle = [registry = registry.get()](const std::string& path) {
        return isInRegisteredBundle(*registry, path);
    };
    const auto isShutOut = [this](const platform::ipc::Peer& peer) { return jobs.isShutOut(peer); };
    auto made = platform::SandboxBroker::create(
        places.socketPath(platform::sandboxServiceName), sandbox,
        {.isInRegisteredBundle = isInBundle, .isShutOut = isShutOut});
    if (made)
        broker = std::move(*made);
    else
        logCannotServe(platform::sandboxServiceName, made.error());
}

// Likewise: what is made ready by a daemon without cannot be started.
void Daemon::Parts::makeJobServer() {
    auto made =
        platform::JobServer::create(jobsLoop, jobs, places.socketPath(platform::jobServiceName));
    if (made)
        jobServer = std::move(*made);
    else
        logCannotServe(platform::jobServiceName, made.error());
}

void Daemon::Parts::resume() {
    if (broker)
        broker->resume();
    if (jobServer)
        jobServer->resume();
    jobsLoop.start();
    server->resume();
    follower->start();
}

void Daemon::Parts::stop() const {
    if (jobServer)
        jobServer->stop();
    if (broker)
        broker->stop();
    server->stop();
}

void Daemon::Parts::terminate() {
    stop();
    platform::log::flush();
    ::_exit(EXIT_SUCCESS); // as other threads may be at work
}

void Daemon::prepareProcess() {
    openStandardDescriptors();
    platform::log::configureFromEnvironment();
    platform::ipc::raiseDescriptorLimit();
    std::signal(SIGPIPE, SIG_IGN);
}

std::unique_ptr<Daemon> Daemon::create(const ZPDOptions& options) {
    if (::geteuid() != 0)
        ZPDLogOps().standard("not running as root: only this user's programs can be recognized");
    auto parts = std::make_unique<Parts>(platform::Places::forThisProcess());
    if (!parts->openRegistry() || !parts->makeServer(options))
        return nullptr;
    parts->makeBroker();
    parts->makeJobServer();
    parts->watchFiles();
    ZPPlugInCore::setExtensionPoints(std::make_shared<ZPDExtensionPoints>(*parts->registry));
    parts->server->setVerbose(options.verbose);
    parts->server->setCacheLimit(options.cacheLimit);
    parts->follower = std::make_unique<ARFollower>(parts->mainLoop, *parts->registry);
    return std::unique_ptr<Daemon>(new Daemon(std::move(parts)));
}

Daemon::Daemon(std::unique_ptr<Parts> parts) : parts_(std::move(parts)) {}

Daemon::~Daemon() = default;

void Daemon::run() {
    parts_->mainLoop.onSignal(SIGTERM, [parts = parts_.get()] { parts->terminate(); });
    parts_->resume();
    parts_->mainLoop.run();
    parts_->terminate();
}
