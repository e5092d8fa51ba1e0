#pragma once

#include <cstdint>
#include <expected>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/types.h>

#include "AppRegistry/ARZephrinProxy.h"
#include "Zephrin/ZPPlugInCore.h"
#include "zpd/ZPDPlugInContext.h"

namespace platform {
struct ExternalService;
}

class ZPDEntitlementHolder;
class ZPDIpcClient;
class ZPDPlugInInfo;

// The daemon's record of one plug-in: the shared record and what only the registry knows of it,
// with an information dictionary that follows the registry. One that exists has a bundle path and
// passed `diagnose`.
//
// Made by the database on its queue, owned by its cache and by whoever holds it in a result. The
// context that it was made with outlives it. Used on the service queue; the refresh and the kept
// form are guarded by the record's own re-entrant lock, so that any thread may use it.
class ZPDPlugIn final : public ZPPlugInCore {
public:
    using Ptr = std::shared_ptr<ZPDPlugIn>;

    // The record of what the registry holds; empty when that makes no acceptable plug-in.
    [[nodiscard]] static Ptr create(const ARZephrinProxy::Ptr& proxy,
                                    const ZPDPlugInContext& context);

    // Hash of the identifier, for who looks at many records.
    [[nodiscard]] std::size_t identifierHash() const { return identifierHash_; }

    // ---- What the registry knows

    // A fresh view of the plug-in, by UUID, else by path; empty when it has gone.
    [[nodiscard]] ARZephrinProxy::Ptr getProxy() const;

    [[nodiscard]] bool isStillValid() const { return true; }

    // The registry's knowledge when the information dictionary was last fetched.
    [[nodiscard]] std::optional<platform::Uuid> arKnowledgeUUID() const;

    // The information dictionary as it was last fetched.
    [[nodiscard]] std::optional<platform::Dictionary> infoPlist() const;

    [[nodiscard]] std::optional<std::string> dataContainerPath() const override {
        return dataContainerPath_;
    }

    // Declared for later use; never set.
    [[nodiscard]] std::optional<std::int64_t> containerAgeRestriction() const { return {}; }

    [[nodiscard]] bool ageRestricted() const { return false; }

    [[nodiscard]] std::optional<std::uint64_t> vNode() const { return {}; }

    // ---- Dictionaries that follow the registry

    [[nodiscard]] std::optional<platform::Dictionary> bundleInfoDictionary() const override;
    [[nodiscard]] std::optional<platform::Value> infoKey(std::string_view key) const override;
    [[nodiscard]] std::optional<platform::Value> pluginKey(std::string_view key) const override;
    [[nodiscard]] std::optional<platform::Value> attribute(std::string_view key) const override;
    [[nodiscard]] std::optional<std::string> version() const override;
    [[nodiscard]] bool isDedicated() const override;
    // What the registry has now, for several questions in a row; empty when the bundle has gone.
    [[nodiscard]] std::shared_ptr<const ZPDPlugInInfo> currentInfo() const;
    // Every entry but those with keys that begin with "DT".
    [[nodiscard]] static platform::Dictionary
    prunedInfoDictionaryFor(const std::optional<platform::Dictionary>& info);

    // ---- Entitlements

    [[nodiscard]] std::optional<platform::Value> valueForEntitlement(std::string_view key) const;
    // True when there is a value and it does not equal false.
    [[nodiscard]] bool hasEntitlement(std::string_view key) const;
    // The key of the plug-in's annotation: what it replaces, else its identifier.
    [[nodiscard]] std::string_view annotationKey() const;

    [[nodiscard]] std::optional<platform::Error> diagnose() const override;

    // ---- Forms

    // An error when the bundle's information dictionary has gone.
    [[nodiscard]] std::expected<platform::Dictionary, platform::Error> exportForm() const override;
    // Adds what lets the client read the plug-in's shared files and look its service up. Answers
    // whether everything was granted.
    bool augmentForm(platform::Dictionary& form) const;
    // Tokens for the shared resources (a string, or an array of which strings count), by resource.
    [[nodiscard]] platform::Dictionary
    issueResourceExtensions(const platform::Value& resources) const;

    // The whole form that a reply carries: exported, with this annotation, augmented.
    [[nodiscard]] std::expected<platform::Dictionary, platform::Error>
    replyForm(const platform::Dictionary& annotation) const;
    // The same in its wire encoding, one complete item. Kept until the annotation, a name or the
    // registry's entry changes. `annotations` is the state of the annotations in which this one
    // was looked up, as a number.
    [[nodiscard]] std::expected<platform::SharedBytes, platform::Error>
    encodedReplyForm(const platform::Dictionary& annotation, std::uint64_t annotations) const;

    // The current information, and the form that was kept, when it was made or confirmed in this
    // state of the annotations: there is no need to look the annotation up again. Else no form.
    struct Current {
        std::shared_ptr<const ZPDPlugInInfo> info;
        platform::SharedBytes replyForm;
    };

    [[nodiscard]] Current current(std::uint64_t annotations) const;

    void setLocalizedName(std::optional<std::string> name) override;
    void setLocalizedShortName(std::optional<std::string> name) override;
    void setLocalizedContainingName(std::optional<std::string> name) override;

    // ---- Rules (ZPDPlugInMatching.cpp)

    // True when every rule holds; without rules they do. `info` is the current information, for
    // one who has it at hand.
    [[nodiscard]] bool match(const std::optional<platform::Dictionary>& rules) const;
    [[nodiscard]] bool match(const platform::Dictionary& rules, const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool matchKey(std::string_view key, const platform::Value& pattern) const;
    // One pattern or any of several.
    [[nodiscard]] bool matchValue(const platform::Value& value,
                                  const platform::Value& patterns) const;
    [[nodiscard]] bool matchValue(std::string_view value, std::string_view pattern) const;
    [[nodiscard]] bool matchDictionary(const platform::Value& value,
                                       const platform::Dictionary& pattern) const;

    // ---- Authorization (ZPDPlugInAuthorization.cpp)

    // Nothing when the client may see and use the plug-in, else the reason why not.
    [[nodiscard]] std::optional<std::string> allowForClient(ZPDEntitlementHolder& client) const;
    [[nodiscard]] std::optional<std::string> allowForClient(ZPDEntitlementHolder& client,
                                                            const ZPDPlugInInfo* info) const;
    // What the user granted to the application that contains it; reads the application's bundle.
    [[nodiscard]] std::set<std::string> allowedConsentServices() const;

    // ---- Launching (ZPDPlugInLaunch.cpp)

    // Lets the client's process start the plug-in, in its sandbox. `environment` is the client's
    // own wish, which the plug-in's container and bundle have their say after.
    [[nodiscard]] std::optional<platform::Error>
    enableForClient(const ZPDIpcClient& client, const platform::Dictionary& environment) const;
    // Names one instance that runs, if any does.
    [[nodiscard]] std::optional<platform::Dictionary> checkBusy() const;
    // A token that lets its holder read the bundle, or an errno value.
    [[nodiscard]] std::expected<std::string, int> issueBundleExtension() const;

private:
    // What is kept of an encoded form, and what it was made of.
    struct KeptForm {
        platform::SharedBytes encoded;
        platform::Dictionary annotation;
        std::uint64_t annotations; // the state in which that was looked up
    };

    explicit ZPDPlugIn(const ZPDPlugInContext& context) : context_(context) {}

    [[nodiscard]] bool setupWithProxy(const ARZephrinProxy::Ptr& proxy);

    // REQUIRES: the record's lock is held
    void follow() const;
    void refresh(const std::optional<platform::Uuid>& knowledge) const;
    void takeInfo(const ARZephrinProxy::Ptr& proxy) const;
    void setInfo(const std::optional<platform::Dictionary>& info) const;
    void forgetForm() const;

    [[nodiscard]] std::optional<platform::Value> sharedResources() const;
    // Each answers whether everything was granted.
    bool addResourceExtensions(platform::Dictionary& form) const;
    bool addServiceExtension(platform::Dictionary& form) const;
    void issueInto(platform::Dictionary& tokens, const platform::Value& resource) const;
    [[nodiscard]] std::expected<std::string, int> issueFileExtension(const std::string& file) const;
    [[nodiscard]] std::expected<std::string, int>
    issueServiceExtension(const std::string& bundleIdentifier) const;

    [[nodiscard]] platform::Dictionary launchOverlay(const ZPDPlugInInfo* info,
                                                     const platform::Dictionary& environment) const;
    [[nodiscard]] platform::ExternalService externalService(const std::string& executable) const;
    [[nodiscard]] static std::string shownVersion(const ZPDPlugInInfo* info);
    [[nodiscard]] platform::Dictionary containerVariables(const ZPDPlugInInfo* info) const;
    [[nodiscard]] platform::Dictionary serviceOf(const ZPDPlugInInfo* info) const;
    [[nodiscard]] std::string_view sandboxProfile(const ZPDPlugInInfo* info) const;
    [[nodiscard]] std::string_view keyboardProfile(const ZPDPlugInInfo& info) const;

    [[nodiscard]] bool matchKey(std::string_view key, const platform::Value& pattern,
                                const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool matchPattern(const platform::Value* value,
                                    const platform::Value& pattern) const;
    [[nodiscard]] std::optional<std::string> textProperty(std::string_view key) const;
    [[nodiscard]] std::string electionText() const;

    const ZPDPlugInContext& context_;
    std::optional<std::string> dataContainerPath_;
    std::optional<uid_t> userIdentifier_; // as which its processes run
    std::size_t identifierHash_ = 0;

    // Guarded by the record's lock; refreshed behind const readers.
    mutable std::weak_ptr<const ARZephrinProxy> known_; // whose data this is
    mutable std::optional<platform::Uuid> arKnowledgeUUID_;
    mutable std::uint64_t knowledgeSequence_ = 0; // of that, as far as it was looked at
    mutable std::shared_ptr<const ZPDPlugInInfo> info_;
    mutable std::optional<KeptForm> keptForm_;
};
