#include "zpd/ZPDPlugInSignature.h"

#include <utility>

#include <openssl/sha.h>

#include "platform/value/Uuid.h"

namespace {

// Of the text of a UUID that nobody had before.
ZPDPlugInSignature::CdHash freshHash() {
    static_assert(std::tuple_size_v<ZPDPlugInSignature::CdHash> == SHA_DIGEST_LENGTH);
    const std::string text = platform::Uuid::random().text();
    ZPDPlugInSignature::CdHash hash{};
    SHA1(reinterpret_cast<const unsigned char*>(text.data()), text.size(), hash.data());
    return hash;
}

} // namespace

ZPDPlugInSignature::ZPDPlugInSignature(const platform::Url&)
    : cdhash_(freshHash()), requirement_("dummy requirement") {}

ZPDPlugInSignature::CdHash ZPDPlugInSignature::cdhash() const {
    const std::lock_guard lock(mutex_);
    return cdhash_;
}

void ZPDPlugInSignature::setCdhash(const CdHash& hash) {
    const std::lock_guard lock(mutex_);
    cdhash_ = hash;
}

std::string ZPDPlugInSignature::requirement() const {
    const std::lock_guard lock(mutex_);
    return requirement_;
}

void ZPDPlugInSignature::setRequirement(std::string requirement) {
    const std::lock_guard lock(mutex_);
    requirement_ = std::move(requirement);
}
