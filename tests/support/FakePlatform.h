#pragma once

#include <atomic>
#include <functional>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "platform/consent/Consent.h"
#include "platform/container/Containers.h"
#include "platform/jobs/Jobs.h"
#include "platform/locale/Locale.h"
#include "platform/notify/Notifications.h"
#include "platform/preferences/Preferences.h"
#include "platform/process/Processes.h"
#include "platform/queue/SerialQueue.h"
#include "platform/sandbox/Sandbox.h"
#include "platform/signing/CodeSigning.h"
#include "platform/types/Types.h"
#include "tests/support/FakeWorkspace.h"
#include "zpd/Platform.h"

// The services of the operating system as a test wants them. Each remembers what it was asked and
// fails on demand.

struct FakeProcesses final : platform::Processes {
    std::map<pid_t, std::string> paths;

    std::expected<std::string, int> executablePath(const platform::ipc::Peer& peer,
                                                   std::size_t room) override {
        const auto found = paths.find(peer.pid);
        if (found == paths.end())
            return std::unexpected(ESRCH);
        if (found->second.size() >= room)
            return std::unexpected(ENOMEM);
        return found->second;
    }
};

struct FakeSigning final : platform::CodeSigning {
    using Done = platform::SigningTask::Done;

    platform::Dictionary clientEntitlements; // every client's
    std::atomic<bool> later = false;         // whether it takes time to know them
    std::atomic<unsigned> rechecked = 0;
    std::map<std::string, platform::Dictionary> granted; // by content of the signature file
    std::string key = "the key";                         // whose grants count
    int verified = 0;                                    // signatures that took calculation
    std::vector<platform::SignedBundle> seen;            // the same, but for their signatures

    struct Task final : platform::SigningTask {
        explicit Task(FakeSigning& its) : signing(its), entitlements(its.clientEntitlements) {}

        void prepare(Done done) override {
            if (!signing.later)
                return done();
            const std::lock_guard lock(signing.mutex_);
            signing.waiting_.push_back(std::move(done));
        }

        void recheck() override { ++signing.rechecked; }

        std::expected<std::optional<platform::Value>, platform::Error>
        entitlement(std::string_view key) override {
            const platform::Value* const found = entitlements.find(key);
            return found ? std::optional(*found) : std::nullopt;
        }

        FakeSigning& signing;
        platform::Dictionary entitlements;
    };

    // How many requests wait until it is known what their client may do.
    [[nodiscard]] std::size_t waiting() {
        const std::lock_guard lock(mutex_);
        return waiting_.size();
    }

    // Now it is known.
    void answer() {
        std::vector<Done> answered;
        {
            const std::lock_guard lock(mutex_);
            answered.swap(waiting_);
        }
        for (Done& done : answered)
            done();
    }

    std::unique_ptr<platform::SigningTask>
    taskFor(std::shared_ptr<const platform::ipc::Peer>) override {
        return std::make_unique<Task>(*this);
    }

    std::expected<platform::SignatureGrant, std::string>
    verifyBundle(const platform::SignedBundle& bundle) override {
        ++verified;
        seen.push_back(bundle);
        const auto found = granted.find(std::string(bundle.signature));
        if (found == granted.end())
            return std::unexpected("nobody granted this");
        return platform::SignatureGrant{key, found->second};
    }

    bool isTrusted(std::string_view asked) override { return asked == key; }

private:
    std::mutex mutex_;
    std::vector<Done> waiting_;
};

struct FakeSandbox final : platform::Sandbox {
    int failure = 0; // an errno value
    bool confined = false;
    std::vector<std::string> issued;

    bool isSandboxed(const platform::ipc::Peer&) override { return confined; }

    std::expected<std::string, int> issueFileExtension(std::string_view extensionClass,
                                                       std::string_view path,
                                                       std::uint32_t flags) override {
        return issue(extensionClass, path, flags);
    }

    std::expected<std::string, int> issueServiceExtension(std::string_view extensionClass,
                                                          std::string_view service,
                                                          std::uint32_t flags) override {
        return issue(extensionClass, service, flags);
    }

private:
    std::expected<std::string, int> issue(std::string_view what, std::string_view name,
                                          std::uint32_t flags) {
        if (failure)
            return std::unexpected(failure);
        issued.push_back(std::string(what) + " " + std::string(name) + " " + std::to_string(flags));
        return "token for " + std::string(name);
    }
};

struct FakeTypes final : platform::Types {
    std::set<std::pair<std::string, std::string>> conformances; // type, target

    bool conforms(std::string_view type, std::string_view target) override {
        return type == target || conformances.contains({std::string(type), std::string(target)});
    }

    bool evaluateActivationRule(const platform::Value&, const platform::Dictionary&) override {
        return false;
    }
};

struct FakePreferences final : platform::Preferences {
    std::map<std::string, platform::Value> values; // "domain key"

    void synchronize(std::string_view) override {}

    std::optional<platform::Value> value(std::string_view domain, std::string_view key) override {
        const auto found = values.find(std::string(domain) + " " + std::string(key));
        return found == values.end() ? std::nullopt : std::optional(found->second);
    }
};

struct FakeNotifications final : platform::Notifications {
    std::vector<std::string> posted; // read when nobody posts

    void post(std::string_view name) override {
        const std::lock_guard lock(mutex_);
        posted.emplace_back(name);
    }

private:
    std::mutex mutex_;
};

struct FakeContainers final : platform::Containers {
    std::string folder; // where containers are
    std::optional<platform::Error> failure;
    std::vector<std::string> asked;

    std::expected<std::string, platform::Error>
    dataContainer(std::string_view identifier, std::optional<uid_t> /*owner*/) override {
        asked.emplace_back(identifier);
        if (failure)
            return std::unexpected(*failure);
        return folder + "/" + std::string(identifier);
    }

    std::vector<std::pair<std::string, uid_t>> owners() override { return {}; }
};

struct FakeLocale final : platform::Locale {
    std::string language;
    ChangeHandler changed;

    std::string current() override { return language; }

    void observeChanges(ChangeHandler handler) override { changed = std::move(handler); }
};

struct FakeJobs final : platform::Jobs {
    struct Added {
        pid_t host;
        platform::ExternalService service;
        platform::Dictionary overlay;
    };

    int addCode = 0;                  // what adding is answered with
    std::map<std::string, int> codes; // and removing, by identifier; else nothingOnRecord
    bool answers = true;              // whether removals are answered at once
    bool shutOut = false;             // everybody
    std::vector<Added> added;         // read when nobody adds
    std::vector<std::string> removed; // "identifier version"

    int addExternalService(const std::shared_ptr<const platform::ipc::Peer>& host,
                           const platform::ExternalService& service,
                           const platform::Dictionary& overlay) override {
        added.push_back({host->pid, service, overlay});
        return addCode;
    }

    void removeExternalService(std::string_view identifier, std::string_view version,
                               std::shared_ptr<platform::SerialQueue> queue,
                               Answer answer) override {
        const std::lock_guard lock(mutex_);
        removed.push_back(std::string(identifier) + " " + std::string(version));
        const auto found = codes.find(std::string(identifier));
        const int code = found == codes.end() ? nothingOnRecord : found->second;
        auto block = [answer = std::move(answer), code]() mutable { answer(code); };
        if (answers)
            queue->async(std::move(block));
        else
            due_.emplace(identifier, Due{std::move(queue), std::move(block)});
    }

    // How many removals wait to be answered.
    [[nodiscard]] std::size_t waiting() {
        const std::lock_guard lock(mutex_);
        return due_.size();
    }

    void answer(const std::string& identifier) {
        const std::lock_guard lock(mutex_);
        auto one = due_.extract(due_.find(identifier));
        one.mapped().queue->async(std::move(one.mapped().block));
    }

    bool isShutOut(const platform::ipc::Peer&) override { return shutOut; }

private:
    struct Due {
        std::shared_ptr<platform::SerialQueue> queue;
        platform::SerialQueue::Block block;
    };

    std::mutex mutex_;
    std::multimap<std::string, Due> due_; // by identifier
};

struct FakeAssertions final : platform::Assertions {
    std::vector<platform::Dictionary> busy; // records, whoever is asked for
    std::vector<std::set<std::string>> asked;

    std::vector<platform::Dictionary>
    busyInstances(const std::set<std::string>& bundleIdentifiers) override {
        asked.push_back(bundleIdentifiers);
        return busy;
    }
};

struct FakeConsent final : platform::Consent {
    std::optional<platform::Array> records; // of every application
    std::atomic<int> asked = 0;

    std::optional<platform::Array>
    consentAccessCopyInformationForBundle(const platform::BundleReader&) override {
        ++asked;
        return records;
    }
};

// All of them, and the struct in which they are handed to the server. Outlives what it is given to.
struct FakePlatform {
    FakeProcesses processes;
    FakeSigning signing;
    FakeSandbox sandbox;
    FakeTypes types;
    FakePreferences preferences;
    FakeNotifications notifications;
    FakeContainers containers;
    FakeLocale locale;
    FakeJobs jobs;
    FakeAssertions assertions;
    FakeConsent consent;
    FakeWorkspace workspace;

    [[nodiscard]] Platform services() {
        return {processes,  signing, sandbox, types,      preferences, notifications,
                containers, locale,  jobs,    assertions, consent,     workspace};
    }
};
