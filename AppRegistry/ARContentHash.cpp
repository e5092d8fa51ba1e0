#include "AppRegistry/ARContentHash.h"

#include <cerrno>
#include <system_error>
#include <unistd.h>
#include <vector>

#include <openssl/evp.h>

#include "platform/file/File.h"

namespace {

constexpr std::size_t bufferSize = 256 * 1024;

struct FreeContext {
    void operator()(EVP_MD_CTX* context) const { EVP_MD_CTX_free(context); }
};

struct FreeAlgorithm {
    void operator()(EVP_MD* algorithm) const { EVP_MD_free(algorithm); }
};

} // namespace

struct ARContentHash::Impl {
    std::unique_ptr<EVP_MD, FreeAlgorithm> algorithm{EVP_MD_fetch(nullptr, "SHA256", nullptr)};
    std::unique_ptr<EVP_MD_CTX, FreeContext> context{EVP_MD_CTX_new()};
    std::vector<char> buffer;

    void begin() { EVP_DigestInit_ex2(context.get(), algorithm.get(), nullptr); }

    void add(std::string_view bytes) {
        EVP_DigestUpdate(context.get(), bytes.data(), bytes.size());
    }

    ARDigest finish() {
        ARDigest digest{};
        EVP_DigestFinal_ex(context.get(), digest.data(), nullptr);
        return digest;
    }
};

ARContentHash::ARContentHash() : impl_(std::make_unique<Impl>()) {}

ARContentHash::~ARContentHash() = default;

ARDigest ARContentHash::of(std::string_view bytes) {
    impl_->begin();
    impl_->add(bytes);
    return impl_->finish();
}

std::expected<ARDigest, std::string> ARContentHash::ofFile(const std::string& path) {
    const auto file = platform::openRegularFile(path);
    if (!file)
        return std::unexpected(describe(file.error()));
    impl_->buffer.resize(bufferSize);
    impl_->begin();
    for (;;) {
        const ssize_t got = ::read(file->get(), impl_->buffer.data(), bufferSize);
        if (got < 0 && errno == EINTR)
            continue;
        if (got < 0)
            return std::unexpected(path + ": " + std::generic_category().message(errno));
        if (got == 0)
            return impl_->finish();
        impl_->add({impl_->buffer.data(), static_cast<std::size_t>(got)});
    }
}
