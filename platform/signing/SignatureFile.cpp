#include "platform/signing/SignatureFile.h"

#include <algorithm>
#include <span>

#include "platform/plist/PropertyList.h"

namespace platform {

namespace {

constexpr std::uint64_t formatVersion = 1;
constexpr std::size_t signatureSize = 64;
constexpr std::size_t keyIdentifierSize = 64;
constexpr std::string_view signedPrefix = "com.tovana.zephrin.signature.1\n";

namespace FileKey {
constexpr const char* version = "version";
constexpr const char* keyIdentifier = "keyIdentifier";
constexpr const char* signature = "signature";
constexpr const char* statement = "statement";
} // namespace FileKey

namespace StatementKey {
constexpr const char* identifier = "identifier";
constexpr const char* executable = "executable";
constexpr const char* size = "size";
constexpr const char* digest = "sha256";
constexpr const char* info = "info";
constexpr const char* entitlements = "entitlements";
} // namespace StatementKey

std::string reasonOf(const Error& error) {
    return error.description.value_or("not a property list");
}

Value dataOf(std::string_view bytes) {
    return Data{SharedBytes(bytes)};
}

Value dataOf(const Sha256Digest& digest) {
    return Data{SharedBytes(std::as_bytes(std::span(digest)))};
}

std::optional<std::string_view> dataIn(const Value* value) {
    const Data* const data = value ? value->data() : nullptr;
    return data ? std::optional(data->bytes.view()) : std::nullopt;
}

std::optional<Sha256Digest> digestIn(const Value* value) {
    const auto bytes = dataIn(value);
    Sha256Digest digest;
    if (!bytes || bytes->size() != digest.size())
        return std::nullopt;
    std::ranges::copy(*bytes, digest.begin());
    return digest;
}

std::unexpected<std::string> wrong(std::string_view key) {
    return std::unexpected("\"" + std::string(key) + "\" is missing or not what it should be");
}

// The dictionary that `bytes` hold. A key that this version does not know may say what this version
// would have to heed, and so spoils the whole.
std::expected<Dictionary, std::string> readDictionary(std::string_view bytes,
                                                      std::initializer_list<const char*> keys) {
    auto value = plist::parse(bytes);
    if (!value)
        return std::unexpected(reasonOf(value.error()));
    if (!value->dictionary())
        return std::unexpected("not a dictionary");
    for (const auto& [key, held] : *value->dictionary()) {
        const auto isKey = [name = key.view()](const char* known) { return name == known; };
        if (std::ranges::none_of(keys, isKey))
            return std::unexpected("unknown key \"" + std::string(key.view()) + "\"");
    }
    return *value->dictionary();
}

bool isKeyIdentifier(std::string_view text) {
    const auto isDigit = [](char c) { return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f'); };
    return text.size() == keyIdentifierSize && std::ranges::all_of(text, isDigit);
}

std::expected<SignedStatement::Executable, std::string> executableIn(const Value& value) {
    const Dictionary* const parts = value.dictionary();
    const Value* const size = parts ? parts->find(StatementKey::size) : nullptr;
    const auto number = size ? size->unsignedInteger() : std::nullopt;
    const auto digest = parts ? digestIn(parts->find(StatementKey::digest)) : std::nullopt;
    if (!number || !digest || parts->size() != 2)
        return wrong(StatementKey::executable);
    return SignedStatement::Executable{*number, *digest};
}

} // namespace

std::expected<std::string, std::string> SignedStatement::encoded() const {
    Dictionary dictionary{{StatementKey::identifier, identifier},
                          {StatementKey::entitlements, entitlements}};
    if (executable) {
        dictionary.set(StatementKey::executable,
                       Dictionary{{StatementKey::size, executable->size},
                                  {StatementKey::digest, dataOf(executable->digest)}});
    }
    if (info)
        dictionary.set(StatementKey::info, dataOf(*info));
    auto bytes = plist::writeXml(dictionary);
    if (!bytes)
        return std::unexpected(reasonOf(bytes.error()));
    // What a reader would refuse, such as entitlements that are nested too deeply, is not written.
    if (const auto read = decoded(*bytes); !read)
        return std::unexpected(read.error());
    return std::move(*bytes);
}

std::expected<SignedStatement, std::string> SignedStatement::decoded(std::string_view bytes) {
    const auto dictionary =
        readDictionary(bytes, {StatementKey::identifier, StatementKey::executable,
                               StatementKey::info, StatementKey::entitlements});
    if (!dictionary)
        return std::unexpected(dictionary.error());
    SignedStatement statement;
    const Value* const identifier = dictionary->find(StatementKey::identifier);
    if (!identifier || !identifier->string())
        return wrong(StatementKey::identifier);
    statement.identifier = *identifier->string();
    const Value* const entitlements = dictionary->find(StatementKey::entitlements);
    if (!entitlements || !entitlements->dictionary())
        return wrong(StatementKey::entitlements);
    statement.entitlements = *entitlements->dictionary();
    if (const Value* const executable = dictionary->find(StatementKey::executable)) {
        const auto read = executableIn(*executable);
        if (!read)
            return std::unexpected(read.error());
        statement.executable = *read;
    }
    if (const Value* const info = dictionary->find(StatementKey::info)) {
        statement.info = digestIn(info);
        if (!statement.info)
            return wrong(StatementKey::info);
    }
    return statement;
}

std::expected<std::string, std::string> SignatureFile::encoded() const {
    auto bytes = plist::writeXml(Dictionary{{FileKey::version, formatVersion},
                                            {FileKey::keyIdentifier, keyIdentifier},
                                            {FileKey::signature, dataOf(signature)},
                                            {FileKey::statement, dataOf(statement)}});
    if (!bytes)
        return std::unexpected(reasonOf(bytes.error()));
    if (bytes->size() > largest)
        return std::unexpected("larger than " + std::to_string(largest) + " bytes");
    return std::move(*bytes);
}

std::expected<SignatureFile, std::string> SignatureFile::decoded(std::string_view bytes) {
    if (bytes.size() > largest)
        return std::unexpected("larger than " + std::to_string(largest) + " bytes");
    const auto dictionary = readDictionary(
        bytes, {FileKey::version, FileKey::keyIdentifier, FileKey::signature, FileKey::statement});
    if (!dictionary)
        return std::unexpected(dictionary.error());
    const Value* const version = dictionary->find(FileKey::version);
    if (!version || version->unsignedInteger() != formatVersion)
        return std::unexpected("not of version " + std::to_string(formatVersion));
    const Value* const key = dictionary->find(FileKey::keyIdentifier);
    const auto keyIdentifier = key ? key->string() : std::nullopt;
    if (!keyIdentifier || !isKeyIdentifier(*keyIdentifier))
        return wrong(FileKey::keyIdentifier);
    const auto signature = dataIn(dictionary->find(FileKey::signature));
    if (!signature || signature->size() != signatureSize)
        return wrong(FileKey::signature);
    const auto statement = dataIn(dictionary->find(FileKey::statement));
    if (!statement)
        return wrong(FileKey::statement);
    SignatureFile file{std::string(*keyIdentifier), std::string(*signature),
                       std::string(*statement)};
    if (file.encoded() != bytes)
        return std::unexpected("not as a signer writes it");
    return file;
}

std::string SignatureFile::signedBytes(std::string_view statement) {
    return std::string(signedPrefix) + std::string(statement);
}

} // namespace platform
