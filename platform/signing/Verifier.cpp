#include "platform/signing/Verifier.h"

#include <cerrno>
#include <system_error>

#include "platform/bundle/Bundle.h"
#include "platform/file/OwnershipTest.h"
#include "platform/signing/OwnedFile.h"

namespace platform {

namespace {

constexpr const char* executableIsOwned = "Nobody else can change the executable";
constexpr const char* infoIsOwned = "Nobody else can change Info.plist";
constexpr const char* signatureIsOwned = "There is a signature file that nobody else can change";
constexpr const char* isRunningFile = "The executable is the file that runs";

std::optional<std::string> differenceFrom(int running, const OwnedFile& executable) {
    struct ::stat status = {};
    if (::fstat(running, &status) != 0)
        return "the running file: " + std::generic_category().message(errno);
    const bool same =
        status.st_dev == executable.status.st_dev && status.st_ino == executable.status.st_ino;
    return same ? std::nullopt : std::optional(executable.path + " is not the file that runs");
}

} // namespace

// One look at files. Lives for one call.
class Verifier::Look {
public:
    explicit Look(Verifier& verifier) : verifier_(verifier) {}

    void program(const std::string& path, std::optional<int> running) {
        const auto executable = open(path, executableIsOwned);
        if (executable &&
            (!running || result.check(isRunningFile, differenceFrom(*running, *executable), path)))
            all(SignedFiles::ofProgram(path), executable);
    }

    void bundle(const SignedFiles& files) {
        std::optional<OwnedFile> executable;
        if (files.executable)
            executable = open(*files.executable, executableIsOwned);
        if (executable || !files.executable)
            all(files, executable);
        if (executable && !result.refusal())
            belonging(files);
    }

    Verification result;

private:
    // The executable is open already.
    void all(const SignedFiles& files, const std::optional<OwnedFile>& executable) {
        std::optional<OwnedFile> info;
        if (files.bundle && !(info = open(*files.info(), infoIsOwned)))
            return;
        if (!signature(files.signature()) ||
            !result.checkKind(executable.has_value(), info.has_value()))
            return;
        if (executable && !content(*executable))
            return;
        if (info)
            result.checkInfo(hash(*info, BundleReader::largestInfo));
    }

    // A bundle may name an executable that lies elsewhere, behind a link.
    void belonging(const SignedFiles& files) {
        const bool same = SignedFiles::ofProgram(*files.executable).bundle == files.bundle;
        result.check("A program that runs from the executable belongs to the bundle",
                     same ? std::nullopt
                          : std::optional(*files.executable + " does not belong to the bundle"),
                     *files.bundle);
    }

    [[nodiscard]] bool signature(const std::string& path) {
        if (!stampOf(path))
            return result.check(signatureIsOwned, "not signed: there is no " + path, {});
        const auto opened = open(path, signatureIsOwned);
        if (!opened)
            return false;
        const auto file = readOpenFile(opened->file.get(), path, SignatureFile::largest);
        if (!file) {
            return result.check("The signature file can be read",
                                file.error().description.value_or(path), {});
        }
        return result.checkSignature(file->bytes, *verifier_.trust().keys());
    }

    [[nodiscard]] bool content(const OwnedFile& executable) {
        return result.checkExecutableSize(static_cast<std::uint64_t>(executable.status.st_size)) &&
               result.checkExecutable(hash(executable, Verification::largestExecutable));
    }

    [[nodiscard]] std::optional<OwnedFile> open(const std::string& path, const char* claim) {
        auto opened = OwnedFile::open(path, ownership_);
        if (!result.check(claim, opened ? std::nullopt : std::optional(opened.error()), path))
            return std::nullopt;
        const FileStamp stamp = FileStamp::of(opened->status);
        result.restsOn({path, stamp, stamp.settled()});
        return std::move(*opened);
    }

    [[nodiscard]] std::expected<Sha256Digest, std::string> hash(const OwnedFile& file,
                                                                std::uint64_t largest) {
        return verifier_.hashes_.of(file.file.get(), largest);
    }

    Verifier& verifier_;
    OwnershipTest ownership_;
};

Verification Verifier::program(const std::string& path, std::optional<int> running) {
    Look look(*this);
    look.program(path, running);
    return std::move(look.result);
}

Verification Verifier::bundle(const SignedFiles& files) {
    Look look(*this);
    look.bundle(files);
    return std::move(look.result);
}

Verification Verifier::bundle(const SignedBundle& bundle) {
    Verification result;
    const auto& executable = bundle.executable;
    const bool sound = result.checkSignature(bundle.signature, *trust_.keys()) &&
                       result.checkKind(executable.has_value(), true) &&
                       (!executable || (result.checkExecutableSize(executable->size) &&
                                        result.checkExecutable(executable->digest)));
    if (sound)
        result.checkInfo(bundle.info);
    return result;
}

} // namespace platform
