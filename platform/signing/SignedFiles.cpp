#include "platform/signing/SignedFiles.h"

#include "platform/bundle/Bundle.h"
#include "platform/file/File.h"

namespace platform {

namespace {

using Property = BundleReader::Property;

constexpr const char* inBundle = "/Signature";
constexpr const char* besideExecutable = ".signature";

} // namespace

SignedFiles SignedFiles::ofProgram(const std::string& path) {
    return {BundleReader::forTrustedExecutable(path).stringProperty(Property::bundlePath), path};
}

SignedFiles SignedFiles::ofAnyProgram(const std::string& path) {
    return {BundleReader::forExecutable(path).stringProperty(Property::bundlePath), path};
}

std::optional<SignedFiles> SignedFiles::ofBundle(const std::string& folder) {
    const BundleReader bundle = BundleReader::atPath(folder);
    if (!bundle.infoDictionary())
        return std::nullopt;
    SignedFiles files{bundle.stringProperty(Property::bundlePath), std::nullopt};
    if (const auto named = bundle.stringProperty(Property::executablePath))
        files.executable = canonicalPath(*named).value_or(*named);
    return files;
}

std::string SignedFiles::signature() const {
    return bundle ? *bundle + inBundle : executable.value_or("") + besideExecutable;
}

std::optional<std::string> SignedFiles::info() const {
    return bundle ? std::optional(*bundle + "/Info.plist") : std::nullopt;
}

} // namespace platform
