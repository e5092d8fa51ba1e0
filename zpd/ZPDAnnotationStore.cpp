#include "zpd/ZPDAnnotationStore.h"

#include <algorithm>
#include <cerrno>
#include <unistd.h>

#include "Zephrin/FileURL.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/container/Containers.h"
#include "platform/file/File.h"
#include "platform/plist/PropertyList.h"
#include "platform/probe/Probes.h"
#include "zpd/ZPDPlugIn.h"

using platform::Dictionary;
using platform::DictionaryEntry;
using platform::Error;
using platform::Value;

namespace {

constexpr std::int64_t storeVersion = 16;
constexpr const char* versionKey = "version";
constexpr const char* dataKey = "data";

constexpr const char* unableToLoad =
    "unable to load annotation database:%{public}@ error:%{public}@ (resetting)";

constexpr const char* globalStore = "/var/db/Zephrin-Annotations";
constexpr const char* storeFile = "/Zephrin-Annotations";
constexpr const char* olderContainer = "com.tovana.zpd";
constexpr unsigned globalFolderMode = 0755;

// What was accepted is read again, whatever it was.
constexpr std::size_t largestStore =
    ZPDAnnotationStore::mostTogether * platform::plist::mostXmlPerByte;
// An annotation stands two levels down.
constexpr std::size_t deepestStore = ZPDAnnotationStore::deepestAnnotation + 2;

std::expected<Dictionary, Error> readStore(const std::string& path) {
    auto content = platform::readRegularFile(path, largestStore);
    if (!content)
        return std::unexpected(content.error());
    auto root = platform::plist::parse(content->bytes, deepestStore);
    if (!root)
        return std::unexpected(root.error());
    const Dictionary* const entries = root->dictionary();
    const Value* const version = entries ? entries->find(versionKey) : nullptr;
    const std::int64_t found = version ? version->integerValue().value_or(0) : 0;
    if (found != storeVersion) {
        return std::unexpected(ZPDErrorMakeFormat(ZPDErrorCode::version,
                                                  "found database version %d needed version %d",
                                                  found, storeVersion));
    }
    const Dictionary* const data = entries->findDictionary(dataKey);
    if (!data) {
        return std::unexpected(Error{&platform::formatErrorDomain, platform::formatErrorCorrupt,
                                     "the data of the annotation database is not a dictionary"});
    }
    return *data;
}

// Fires the probe with what went wrong, at each of the two places that are tried.
std::optional<Error> probed(const std::string& path, std::optional<Error> failure) {
    if (failure)
        platform::probe::dbLoad(path.c_str(), static_cast<std::uint64_t>(failure->code));
    return failure;
}

bool isMissingFile(const Error& error) {
    return error.domain == &platform::fileErrorDomain &&
           error.code == platform::fileErrorNoSuchFile;
}

std::size_t encodedSize(const Dictionary& annotation) {
    return platform::ipc::encode(annotation).size();
}

std::size_t valuesIn(const Value& value) {
    std::size_t count = 1;
    if (const platform::Array* const array = value.array()) {
        for (const Value& item : *array)
            count += valuesIn(item);
    } else if (const Dictionary* const dictionary = value.dictionary()) {
        for (const DictionaryEntry& entry : *dictionary)
            count += valuesIn(entry.value);
    }
    return count;
}

bool isAtMostSoDeep(const Value& value, std::size_t levels) {
    if (!value.array() && !value.dictionary())
        return true;
    if (levels == 0)
        return false;
    if (const platform::Array* const array = value.array()) {
        return std::ranges::all_of(
            *array, [&](const Value& item) { return isAtMostSoDeep(item, levels - 1); });
    }
    return std::ranges::all_of(*value.dictionary(), [&](const DictionaryEntry& entry) {
        return isAtMostSoDeep(entry.value, levels - 1);
    });
}

// Equal in every kind, too: 1, 1.0 and true are equal numbers, but each is stored as it came.
bool isSame(const Value& a, const Value& b) {
    if (a.kind() != b.kind())
        return false;
    if (const platform::Array* const array = a.array()) {
        return array->begin() == b.array()->begin() ||
               std::ranges::equal(*array, *b.array(), isSame);
    }
    if (const Dictionary* const dictionary = a.dictionary()) {
        return dictionary->sameObject(*b.dictionary()) ||
               std::ranges::equal(*dictionary, *b.dictionary(),
                                  [](const DictionaryEntry& x, const DictionaryEntry& y) {
                                      return x.key == y.key && isSame(x.value, y.value);
                                  });
    }
    return a == b;
}

bool holds(const Dictionary& stored, const Dictionary& changes) {
    return std::ranges::all_of(changes, [&](const DictionaryEntry& change) {
        const Value* const there = stored.find(change.key.view());
        return there && isSame(*there, change.value);
    });
}

template <class Keep>
Dictionary entriesThat(const Dictionary& annotations, Keep&& keep) {
    std::vector<DictionaryEntry> kept;
    for (const DictionaryEntry& entry : annotations) {
        if (keep(entry.value))
            kept.push_back(entry);
    }
    return Dictionary(std::move(kept));
}

std::expected<std::string, Error> storeText(const Dictionary& annotations) {
    return platform::plist::writeXml(
        Dictionary{{versionKey, storeVersion}, {dataKey, annotations}});
}

} // namespace

// ---- Places

std::string ZPDAnnotationStore::globalPath() {
    return globalStore;
}

std::string ZPDAnnotationStore::defaultDatabasePath() {
    return globalPath();
}

std::expected<std::string, Error> ZPDAnnotationStore::containerPath() const {
    auto container = containers_.dataContainer(olderContainer, std::nullopt);
    if (container)
        return *container + storeFile;
    const auto code = static_cast<std::uint64_t>(container.error().code);
    ZPDLogOps().error("failed to get storage container: error=%llu", code);
    return std::unexpected(ZPDErrorMakeFormat(container.error().code,
                                              "unable to locate user container: error %llu", code));
}

std::expected<std::string, Error> ZPDAnnotationStore::confstrPath(int name) {
    constexpr std::size_t room = 1024; // bytes, the closing NUL included
    char text[room];
    errno = 0;
    const std::size_t size = ::confstr(name, text, room);
    if (size != 0 && size <= room)
        return std::string(text, size - 1);
    const int number = errno;
    ZPDLogOps().error("failed to obtain user directory: errno=%d", number);
    return std::unexpected(
        ZPDErrorMakeFormat(number, "unable to locate user directory: errno %d", number));
}

// ---- Loading

ZPDAnnotationStore::ZPDAnnotationStore(const std::optional<std::string>& databasePath,
                                       platform::Containers& containers)
    : containers_(containers), path_(databasePath.value_or(defaultDatabasePath())) {
    prepareFolder(!databasePath);
    platform::removeUnfinishedFiles(path_);
    const auto failure = probed(path_, loadDb(path_));
    if (!failure)
        return;
    if (!isMissingFile(*failure)) {
        ZPDLogOps().error(unableToLoad, fileURLFromPath(path_), *failure);
    }
    migrate();
}

// Only where nothing could be loaded: a good store is never overwritten by an older one. Without
// a container to look into there is nothing older, and the daemon goes on.
void ZPDAnnotationStore::migrate() {
    const auto older = containerPath();
    if (!older || probed(*older, loadDb(*older)))
        return;
    ZPDLogOps().info("migrating shared annotations");
    if (const auto failure = saveDb(path_, annotations_)) {
        ZPDLogOps().error("unable to save migrated annotations to %{public}@ error:%{public}@",
                          fileURLFromPath(path_), *failure);
    }
}

std::optional<Error> ZPDAnnotationStore::loadDb(const std::string& path) {
    const auto loaded = readStore(path);
    if (!loaded)
        return loaded.error();
    annotations_ = entriesThat(*loaded, [](const Value& entry) { return entry.dictionary(); });
    extent_ = {};
    for (const DictionaryEntry& entry : annotations_)
        extent_ += extentOf(entry.key.view(), *entry.value.dictionary());
    ++changes_;
    return std::nullopt;
}

// Makes the usual folder where it is missing, and says now, rather than at the first change, when
// nothing can be written.
void ZPDAnnotationStore::prepareFolder(bool usualPlace) const {
    const std::string folder = platform::folderOf(path_);
    std::optional<Error> failure;
    if (usualPlace)
        failure = platform::makeFolders(folder, globalFolderMode);
    if (!failure && ::access(folder.c_str(), W_OK | X_OK) != 0)
        failure = platform::posixError(errno, folder);
    if (failure) {
        ZPDLogOps().error("annotation database %{public}@ cannot be written: %{public}@", path_,
                          *failure);
    }
}

// ---- Saving

// One annotation that a property list cannot hold must not keep all the others from the disk: it
// alone is left out, and reported.
std::optional<Error> ZPDAnnotationStore::saveDb(const std::string& path,
                                                const Dictionary& annotations) {
    std::optional<Error> failure;
    auto text = storeText(annotations);
    if (!text) {
        failure = text.error();
        text = storeText(entriesThat(annotations, [](const Value& entry) {
            return !platform::plist::objectionToXml(entry);
        }));
        if (!text)
            return text.error();
    }
    if (auto unwritten = platform::writeFileAtomically(path, *text))
        return unwritten;
    return failure;
}

ZPDAnnotationStore::Snapshot ZPDAnnotationStore::snapshot() {
    handedOut_ = annotations_;
    return {annotations_, changes_};
}

// ---- Annotations

std::optional<Dictionary> ZPDAnnotationStore::annotationForIdentifier(std::string_view key) const {
    const Value* const found = annotations_.find(key);
    return found ? std::optional(*found->dictionary()) : std::nullopt;
}

std::optional<Dictionary> ZPDAnnotationStore::annotationForPlugIn(const ZPDPlugIn& plugIn) const {
    return annotationForIdentifier(plugIn.annotationKey());
}

std::optional<Error> ZPDAnnotationStore::setAnnotation(const std::optional<Dictionary>& annotation,
                                                       const ZPDPlugIn& plugIn) {
    if (annotation)
        return add(plugIn.annotationKey(), *annotation);
    remove(plugIn.annotationKey());
    return std::nullopt;
}

// An annotation that does not change stays the same object, so that forms made with it stand.
std::optional<Error> ZPDAnnotationStore::add(std::string_view key, const Dictionary& changes) {
    const auto stored = annotationForIdentifier(key);
    if (stored && holds(*stored, changes))
        return std::nullopt;
    Dictionary merged = stored.value_or(Dictionary());
    for (const DictionaryEntry& change : changes)
        merged.set(change.key, change.value);
    if (encodedSize(merged) > largestAnnotation)
        return ZPDErrorMake(ZPDErrorCode::badAnnotation, "the annotation would be too large");
    Extent together = extent_;
    if (stored)
        together -= extentOf(key, *stored);
    together += extentOf(key, merged);
    const bool tooLarge = together.bytes > mostTogether && together.bytes > extent_.bytes;
    const bool tooMany = together.values > mostValues && together.values > extent_.values;
    if (tooLarge || tooMany)
        return ZPDErrorMake(ZPDErrorCode::badAnnotation, "all annotations would be too large");
    annotations_.set(key, std::move(merged));
    extent_ = together;
    ++changes_;
    return std::nullopt;
}

void ZPDAnnotationStore::remove(std::string_view key) {
    const auto stored = annotationForIdentifier(key);
    if (!stored)
        return;
    annotations_.remove(key);
    extent_ -= extentOf(key, *stored);
    ++changes_;
}

ZPDAnnotationStore::Extent ZPDAnnotationStore::extentOf(std::string_view key,
                                                        const Dictionary& annotation) {
    return {key.size() + encodedSize(annotation), valuesIn(annotation)};
}

bool ZPDAnnotationStore::canHold(const Dictionary& annotation) {
    return encodedSize(annotation) <= largestAnnotation &&
           isAtMostSoDeep(annotation, deepestAnnotation) &&
           !platform::plist::objectionToXml(annotation);
}
