#include "AppRegistry/ARBundleReader.h"

#include "AppRegistry/ARIdentity.h"
#include "platform/bundle/Bundle.h"
#include "platform/file/File.h"
#include "platform/plist/DictionaryFile.h"

using platform::BundleReader;
using platform::Dictionary;

namespace {

constexpr ARDigest notHashed{};

std::expected<platform::FileContent, std::string> readFile(const std::string& path,
                                                           std::size_t largest) {
    auto content = platform::readRegularFile(path, largest);
    if (!content)
        return std::unexpected(describe(content.error()));
    return std::move(*content);
}

} // namespace

bool ARIsSameFile(const ARStamp& known, const ARStamp& now) {
    return known == now && (!now.present() || now.changed != 0);
}

bool ARHasSameContent(const ARKnownFiles& known, const ARKnownFiles& now) {
    for (std::size_t file = 0; file < countingFiles; ++file) {
        if (ARIsSameFile(known.stamps[file], now.stamps[file]))
            continue;
        if (!known.stamps[file].present() || !now.stamps[file].present())
            return false;
        if (now.digests[file] == notHashed || now.digests[file] != known.digests[file])
            return false;
    }
    return true;
}

std::expected<ARBundleContent, std::string> ARBundleReader::read(const ARCandidate& candidate,
                                                                 const ARKnownFiles& known) {
    ARBundleContent content;
    content.row.kind = candidate.kind;
    content.row.path = platform::SharedBytes(candidate.path);
    auto info = readInfo(content, candidate, ARCountingFileNames(candidate, {})[infoFile]);
    if (!info)
        return std::unexpected(std::move(info.error()));
    content.info = ARReportedInfo(candidate.kind, std::move(*info));
    if (auto reason = ARIdentify(content.row, candidate.path, content.info))
        return std::unexpected(std::move(*reason));
    const Names names = ARCountingFileNames(candidate, content.row.executable.view());
    for (const auto file : {executableFile, signatureFile}) {
        if (auto done = readOther(content, candidate, names, file, known); !done)
            return std::unexpected(std::move(done.error()));
    }
    return content;
}

std::expected<Dictionary, std::string> ARBundleReader::readInfo(ARBundleContent& content,
                                                                const ARCandidate& candidate,
                                                                const std::string& name) {
    const auto stamp = files_.stamp(candidate, name);
    if (!stamp)
        return std::unexpected(stamp.error());
    if (!stamp->present())
        return std::unexpected("it has no Info.plist");
    const auto file = readFile(candidate.folder.pathOf(name), BundleReader::largestInfo);
    if (!file)
        return std::unexpected(file.error());
    content.row.stamps[infoFile] = *stamp;
    content.digests[infoFile] = hash_.of(file->bytes);
    return platform::parseDictionary(file->bytes);
}

std::expected<void, std::string> ARBundleReader::readOther(ARBundleContent& content,
                                                           const ARCandidate& candidate,
                                                           const Names& names, ARCountingFile file,
                                                           const ARKnownFiles& known) {
    const auto stamp = files_.stamp(candidate, names[file]);
    if (!stamp)
        return std::unexpected(stamp.error());
    content.row.stamps[file] = *stamp;
    if (!stamp->present() || stamp->size > ARLargestHashed)
        return {};
    const std::string path = candidate.folder.pathOf(names[file]);
    if (file == signatureFile && stamp->size <= largestSignature)
        return readSignature(content, path);
    if (ARIsSameFile(known.stamps[file], *stamp)) {
        content.digests[file] = known.digests[file];
        return {};
    }
    auto digest = hash_.ofFile(path);
    if (!digest)
        return std::unexpected(std::move(digest.error()));
    content.digests[file] = *digest;
    return {};
}

std::expected<void, std::string> ARBundleReader::readSignature(ARBundleContent& content,
                                                               const std::string& path) {
    auto file = readFile(path, largestSignature);
    if (!file)
        return std::unexpected(std::move(file.error()));
    content.digests[signatureFile] = hash_.of(file->bytes);
    content.signature = std::move(file->bytes);
    return {};
}

std::optional<Dictionary> ARReadReportedInfo(const ARBundleRow& row) {
    std::string path(row.path.view());
    if (row.kind != ARKind::extensionPoint)
        path += "/Info.plist";
    const auto file = readFile(path, BundleReader::largestInfo);
    if (!file)
        return std::nullopt;
    auto info = platform::parseDictionary(file->bytes);
    if (!info)
        return std::nullopt;
    return ARReportedInfo(row.kind, std::move(*info));
}
