#pragma once

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "AppRegistry/ARBundleRow.h"
#include "AppRegistry/ARDirt.h"
#include "platform/file/File.h"

// How much a pass watches: at start only the folders at the top, as there is a second pass when the
// service is up.
enum class ARDepth { roots, everything };

// Follows the registry's folders with inotify: which watch belongs to which item, and which items
// have to be looked at again. An item is what is compared as one: an application with its plug-ins,
// a plug-in or an extension point that lies by itself; it goes by its canonical path. Watches that
// belong to no single item (those of the folders at the top, and of symbolic links) go by
// `everything`.
//
// A pass sets each watch before it reads what the watch tells of, and again with every look; a look
// ends with letting go of those that it did not set. So the watches are those of what is there,
// however it was renamed meanwhile.
//
// Owned by the registry. Passes use it on the registry's queue, whoever waits for events on any
// thread: the lock is held for one watch, or for reading what is there.
class ARWatches {
public:
    static constexpr const char* everything = "";

    ARWatches();
    ~ARWatches();

    // Non-blocking; -1 while this box has none to spare. A pass over everything may get one.
    [[nodiscard]] int descriptor() const;

    // ---- Events

    // Takes up what happened. Tells whether anything has to be looked at.
    bool readEvents();
    [[nodiscard]] bool isDirty() const;
    [[nodiscard]] bool isDue(ARDirt::Clock::time_point now) const;
    [[nodiscard]] ARDirt::Due takeDue(ARDirt::Clock::time_point now);
    void markEverything();

    // True while some folder could not be watched: changes there are only seen by looking.
    [[nodiscard]] bool isIncomplete() const;

    // ---- Passes; on the registry's queue

    void beginPass(ARDepth depth);
    // A pass over everything: what is dirty is so no more, and all watches are set anew.
    void beginFullPass(ARDepth depth);
    void endFullPass();

    // The look at one item. Before its end watches that were not set since `beginPass` go.
    void beginLook(const std::string& item);
    void endLook(const std::string& item);
    // The look came to nothing: what it set counts as not set.
    void discardLook(const std::string& item);
    // Whether the item, or a folder above it, came or went since its look began; whether anything
    // at all happened to it.
    [[nodiscard]] bool hasMoved(const std::string& item);
    [[nodiscard]] bool hasChanged(const std::string& item);

    // A folder in which items of this kind lie; canonical.
    void watchRoot(ARKind kind, const std::string& folder);
    [[nodiscard]] bool isRoot(ARKind kind, std::string_view folder) const;
    // A bundle's own folder, or one that holds an application's plug-ins.
    void watchBundle(const std::string& item, std::string_view folder);
    void watchPlugIns(const std::string& item, const std::string& folder);
    // All folders and links on the way to a path, which need not be there.
    void watchWay(const std::string& item, const std::string& path);
    // The same for a file that is reached by a link; what is written to it counts too.
    void watchFile(const std::string& item, const std::string& path);
    // What lies in an item leads elsewhere by a link: when it changes, everything is looked at.
    void leadsAway(const std::string& item);
    // Something could not be read for want of something: it is looked at again before long.
    void lookAgainLater();

private:
    enum class What : std::uint8_t { root, bundle, plugIns, way };

    // What hangs on the watches of one item.
    struct Scope {
        std::vector<int> numbers;   // of its watches, some perhaps gone
        std::uint64_t awayPass = 0; // the pass that met a link in it last
    };

    using Scopes = std::unordered_map<std::string, Scope>;

    // Why there is a watch; one watch may have several reasons.
    struct Interest {
        Scopes::value_type* scope;
        What what;
        ARKind kind;        // of what lies in a root
        std::uint64_t pass; // that set it last
        std::string name;   // of the one name that matters (way), or the path (root)

        [[nodiscard]] bool isFor(const Interest& other) const {
            return scope == other.scope && what == other.what && kind == other.kind &&
                   name == other.name;
        }
    };

    // What the kernel tells; one without a name concerns the folder itself.
    struct Event {
        int number; // of the watch
        std::uint32_t what;
        std::string_view name;
    };

    // Each REQUIRES: the lock is held.
    void add(const std::string& folder, std::uint32_t events, Interest interest);
    void cannotWatch(const std::string& folder, int number);
    void walk(Interest interest, const std::string& path, std::uint32_t lastEvents);
    void drain();
    void take(const Event& event);
    void concern(const Interest& interest, const Event& event);
    void mark(const std::string& item, bool moved);
    [[nodiscard]] Scopes::value_type& scopeOf(const std::string& item);
    [[nodiscard]] bool hasInterest(int number, const Scopes::value_type& scope) const;
    template <class Stale>
    void letGo(int number, Stale&& stale);
    void forgetIfUnused(Scopes::iterator scope);

    // What tells of other names in a folder, of other owners and permissions, and of its own end
    // ...
    static const std::uint32_t nameEvents;
    static const std::uint32_t contentEvents; // ... and of what its files hold

    mutable std::mutex lock_;
    platform::UniqueFd inotify_;
    Scopes scopes_;
    std::unordered_multimap<int, Interest> interests_; // by number of the watch
    ARDirt dirt_;
    std::uint64_t pass_ = 0;
    ARDepth depth_ = ARDepth::roots; // of this pass; on the queue alone, without the lock
    bool incomplete_ = false;
    bool missing_ = false; // something could not be watched in this pass over everything
};
