#include "platform/consent/ConsentFile.h"

#include <fcntl.h>

#include "platform/consent/Consent.h"
#include "platform/file/File.h"
#include "platform/file/FolderLock.h"
#include "platform/file/OwnershipTest.h"
#include "platform/plist/DictionaryFile.h"
#include "platform/plist/PropertyList.h"
#include "platform/value/Value.h"

namespace platform {

namespace {

constexpr const char* lockName = ".Consent.lock";
constexpr unsigned folderMode = 0755;

std::expected<Dictionary, std::string> contentOf(const std::string& path) {
    if (!stampOf(path))
        return Dictionary();
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(describe(posixError(canonical.error(), path)));
    OwnershipTest ownership;
    auto content = readTrustedDictionary(*canonical, ConsentFile::largest, ownership);
    if (!content)
        return std::unexpected(path + ": " + content.error());
    return content;
}

std::optional<std::string_view> serviceOf(const Value& record) {
    const Dictionary* const dictionary = record.dictionary();
    const Value* const service = dictionary ? dictionary->find(kConsentInfoService) : nullptr;
    return service ? service->string() : std::nullopt;
}

bool isGranted(const Value& record) {
    const Value* const granted = record.dictionary()->find(kConsentInfoGranted);
    return granted && granted->equalsTrue();
}

// A service that stands there several times is told so everywhere: one record that grants counts.
Array changed(const Array& records, const ConsentFile::Record& change) {
    Array result;
    bool isThere = false;
    for (const Value& record : records) {
        const bool same = serviceOf(record) == change.service;
        isThere = isThere || same;
        Dictionary now = same ? *record.dictionary() : Dictionary();
        now.set(kConsentInfoGranted, change.granted);
        result.append(same ? Value(now) : record);
    }
    if (!isThere) {
        result.append(Dictionary{{kConsentInfoService, change.service},
                                 {kConsentInfoGranted, change.granted}});
    }
    return result;
}

} // namespace

std::expected<std::vector<ConsentFile::Record>, std::string> ConsentFile::records() const {
    const auto content = contentOf(path_);
    if (!content)
        return std::unexpected(content.error());
    std::vector<Record> found;
    for (const DictionaryEntry& application : *content) {
        const Array* const records = application.value.array();
        for (const Value& record : records ? *records : Array()) {
            if (const auto service = serviceOf(record)) {
                found.push_back({std::string(application.key.view()), std::string(*service),
                                 isGranted(record)});
            }
        }
    }
    return found;
}

std::optional<std::string> ConsentFile::record(const Record& record) const {
    const std::string folder = folderOf(path_);
    if (const auto failure = makeFolders(folder, folderMode))
        return failure->description.value_or(folder);
    const UniqueFd opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    const auto lock = lockInFolder(opened.get(), lockName, folder);
    return lock ? recordLocked(record) : lock.error();
}

std::optional<std::string> ConsentFile::recordLocked(const Record& record) const {
    auto content = contentOf(path_);
    if (!content)
        return content.error();
    const Array* const before = content->findArray(record.application);
    content->set(record.application, changed(before ? *before : Array(), record));
    const auto text = plist::writeXml(*content);
    if (!text)
        return describe(text.error());
    if (text->size() > largest)
        return path_ + " would become too large";
    const auto failure = writeFileAtomically(path_, *text);
    return failure ? std::optional(describe(*failure)) : std::nullopt;
}

} // namespace platform
