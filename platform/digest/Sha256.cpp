#include "platform/digest/Sha256.h"

#include <cerrno>
#include <limits>
#include <system_error>
#include <unistd.h>
#include <vector>

#include <openssl/evp.h>

#include "platform/file/File.h"

namespace platform {

namespace {

constexpr std::size_t bufferSize = 256UL * 1024;

struct FreeContext {
    void operator()(EVP_MD_CTX* context) const { EVP_MD_CTX_free(context); }
};

struct FreeAlgorithm {
    void operator()(EVP_MD* algorithm) const { EVP_MD_free(algorithm); }
};

} // namespace

struct Sha256::Impl {
    std::unique_ptr<EVP_MD, FreeAlgorithm> algorithm{EVP_MD_fetch(nullptr, "SHA256", nullptr)};
    std::unique_ptr<EVP_MD_CTX, FreeContext> context{EVP_MD_CTX_new()};
    std::vector<char> buffer;

    void begin() { EVP_DigestInit_ex2(context.get(), algorithm.get(), nullptr); }

    void add(std::string_view bytes) {
        EVP_DigestUpdate(context.get(), bytes.data(), bytes.size());
    }

    Sha256Digest finish() {
        Sha256Digest digest{};
        EVP_DigestFinal_ex(context.get(), digest.data(), nullptr);
        return digest;
    }
};

Sha256::Sha256() : impl_(std::make_unique<Impl>()) {}

Sha256::~Sha256() = default;

Sha256Digest Sha256::of(std::string_view bytes) {
    impl_->begin();
    impl_->add(bytes);
    return impl_->finish();
}

std::expected<Sha256Digest, std::string> Sha256::ofFile(const std::string& path) {
    const auto file = openRegularFile(path);
    if (!file)
        return std::unexpected(describe(file.error()));
    auto digest = ofOpenFile(file->get(), std::numeric_limits<std::uint64_t>::max());
    if (!digest)
        return std::unexpected(path + ": " + digest.error());
    return digest;
}

std::expected<Sha256Digest, std::string> Sha256::ofOpenFile(int file, std::uint64_t largest) {
    impl_->buffer.resize(bufferSize);
    impl_->begin();
    std::uint64_t offset = 0;
    for (;;) {
        const ssize_t got =
            ::pread(file, impl_->buffer.data(), bufferSize, static_cast<off_t>(offset));
        if (got < 0 && errno == EINTR)
            continue;
        if (got < 0)
            return std::unexpected(std::generic_category().message(errno));
        if (got == 0)
            return impl_->finish();
        offset += static_cast<std::uint64_t>(got);
        if (offset > largest)
            return std::unexpected("it is larger than " + std::to_string(largest) + " bytes");
        impl_->add({impl_->buffer.data(), static_cast<std::size_t>(got)});
    }
}

} // namespace platform
