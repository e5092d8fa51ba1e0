#pragma once

#include <memory>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARRegisteredApplication.h"
#include "AppRegistry/ARRegisteredPlugIn.h"
#include "AppRegistry/ARShardedIndex.h"

// Everything that readers can see at one moment. The registry makes the next one from a copy of
// the last (which shares what does not change) and publishes it; from then on it never changes and
// any thread may read it.
class ARSnapshot {
public:
    using PlugIns = std::vector<ARPlugInPtr>; // in order of registration

    [[nodiscard]] const PlugIns& plugIns() const { return *all_; }

    [[nodiscard]] ARPlugInPtr plugIn(const platform::Uuid& uuid) const;
    [[nodiscard]] ARPlugInPtr plugInAt(std::string_view path) const;
    [[nodiscard]] ARApplicationPtr application(std::string_view path) const;
    [[nodiscard]] std::span<const ARPlugInPtr> plugInsWithin(std::string_view application) const;
    // Those that stand under any of the keys of the extension point index.
    [[nodiscard]] PlugIns plugInsWithPoints(std::span<const platform::SharedBytes> keys) const;
    [[nodiscard]] ARRowPtr extensionPoint(std::string_view identifier) const;

    [[nodiscard]] const ARKnowledge& knowledge() const { return knowledge_; }

    // Changes, on a copy that nobody else sees yet.
    void add(const ARPlugInPtr& plugIn);
    void remove(const ARRegisteredPlugIn& plugIn);
    // Puts a proxy in the place of the one with the same UUID.
    void replace(const ARPlugInPtr& plugIn);
    void putApplication(ARApplicationPtr application);
    void removeApplication(std::string_view path);
    void putExtensionPoint(const ARRowPtr& row);
    void removeExtensionPoint(const ARBundleRow& row);

    void setKnowledge(const ARKnowledge& knowledge) { knowledge_ = knowledge; }

private:
    struct Group {
        platform::SharedBytes key;
        std::shared_ptr<PlugIns> members;
    };

    struct UuidOf {
        const platform::Uuid& operator()(const ARPlugInPtr& p) const { return p->plugInUUID(); }
    };

    struct PathOf {
        std::string_view operator()(const auto& p) const { return p->path(); }
    };

    struct KeyOf {
        std::string_view operator()(const Group& group) const { return group.key.view(); }
    };

    using Groups = ARShardedIndex<Group, KeyOf>;

    template <class Change>
    void changeGroups(const ARRegisteredPlugIn& plugIn, Change&& change);
    template <class Change>
    static void changeGroup(Groups& groups, const platform::SharedBytes& key, Change&& change);

    std::shared_ptr<PlugIns> all_ = std::make_shared<PlugIns>();
    ARShardedIndex<ARPlugInPtr, UuidOf> byUuid_;
    ARShardedIndex<ARPlugInPtr, PathOf> byPath_;
    ARShardedIndex<ARApplicationPtr, PathOf> applications_;
    Groups byPoint_;
    Groups byApplication_;
    std::shared_ptr<std::vector<ARRowPtr>> extensionPoints_ =
        std::make_shared<std::vector<ARRowPtr>>(); // by identifier, then path
    ARKnowledge knowledge_;
};
