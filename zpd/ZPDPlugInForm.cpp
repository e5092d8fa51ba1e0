// The forms of a daemon record as replies carry them, with the sandbox grants of Sandbox.h, and
// the encoded form that is kept between requests.

#include <algorithm>
#include <system_error>

#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Cbor.h"
#include "platform/sandbox/Sandbox.h"
#include "zpd/ZPDPlugIn.h"

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::Sandbox;
using platform::SharedBytes;
using platform::Value;

namespace {

constexpr std::string_view wholeBundle = ".";
constexpr std::string_view serviceClass = "com.tovana.zephrin.plugin-service";
constexpr std::uint32_t noFlags = 0;

std::string systemText(int number) {
    return std::generic_category().message(number);
}

bool isNothing(const std::optional<Value>& resources) {
    if (!resources)
        return true;
    return resources->array() ? resources->array()->empty() : !resources->string();
}

Array asArray(const Value& resources) {
    if (resources.array())
        return *resources.array();
    return resources.string() ? Array{resources} : Array();
}

} // namespace

// ---- Export

// A record whose dictionaries went with its bundle has nothing to export.
std::expected<Dictionary, Error> ZPDPlugIn::exportForm() const {
    const auto info = bundleInfoDictionary();
    const auto plugInInfo = plugInDictionary();
    if (!info || info->empty() || !plugInInfo || !originalIdentifier()) {
        return std::unexpected(ZPDErrorMakeFormat(
            ZPDErrorCode::badPlugIn, "no information dictionary for plug-in at %@", path()));
    }
    return formOf(*info, *plugInInfo);
}

std::expected<Dictionary, Error> ZPDPlugIn::replyForm(const Dictionary& annotation) const {
    auto form = exportForm();
    if (form) {
        form->set(FormKey::annotations, annotation);
        augmentForm(*form);
    }
    return form;
}

// A form that lacks a grant is not kept: the next request asks for the grant again.
std::expected<SharedBytes, Error> ZPDPlugIn::encodedReplyForm(const Dictionary& annotation,
                                                              std::uint64_t annotations) const {
    const auto lock = locked();
    follow(); // forgets the kept form when the registry's entry moved
    if (keptForm_ && keptForm_->annotation.sameObject(annotation)) {
        keptForm_->annotations = annotations;
        return keptForm_->encoded;
    }
    auto exported = exportForm();
    if (!exported)
        return std::unexpected(exported.error());
    exported->set(FormKey::annotations, annotation);
    const bool complete = augmentForm(*exported);
    SharedBytes encoded = platform::ipc::encodeShared(*exported);
    keptForm_.reset();
    if (complete)
        keptForm_ = KeptForm{encoded, annotation, annotations};
    return encoded;
}

ZPDPlugIn::Current ZPDPlugIn::current(std::uint64_t annotations) const {
    const auto lock = locked();
    follow();
    const bool holds = keptForm_ && keptForm_->annotations == annotations;
    return {info_, holds ? keptForm_->encoded : SharedBytes()};
}

void ZPDPlugIn::forgetForm() const {
    keptForm_.reset();
}

void ZPDPlugIn::setLocalizedName(std::optional<std::string> name) {
    const auto lock = locked();
    ZPPlugInCore::setLocalizedName(std::move(name));
    forgetForm();
}

void ZPDPlugIn::setLocalizedShortName(std::optional<std::string> name) {
    const auto lock = locked();
    ZPPlugInCore::setLocalizedShortName(std::move(name));
    forgetForm();
}

void ZPDPlugIn::setLocalizedContainingName(std::optional<std::string> name) {
    const auto lock = locked();
    ZPPlugInCore::setLocalizedContainingName(std::move(name));
    forgetForm();
}

// ---- Grants

bool ZPDPlugIn::augmentForm(Dictionary& form) const {
    const bool resources = addResourceExtensions(form);
    const bool service = isData() || addServiceExtension(form);
    return resources && service;
}

std::optional<Value> ZPDPlugIn::sharedResources() const {
    if (isAppExtension())
        return Value(Array{wholeBundle});
    return pluginKey(InfoKey::shared);
}

bool ZPDPlugIn::addResourceExtensions(Dictionary& form) const {
    const auto resources = sharedResources();
    if (isNothing(resources))
        return true;
    const Dictionary tokens = issueResourceExtensions(*resources);
    form.set(FormKey::extensions, tokens);
    const Array wanted = asArray(*resources);
    return std::all_of(wanted.begin(), wanted.end(), [&](const Value& resource) {
        return !resource.string() || tokens.contains(*resource.string());
    });
}

Dictionary ZPDPlugIn::issueResourceExtensions(const Value& resources) const {
    Dictionary tokens;
    for (const Value& resource : asArray(resources))
        issueInto(tokens, resource);
    return tokens;
}

void ZPDPlugIn::issueInto(Dictionary& tokens, const Value& resource) const {
    const auto name = resource.string();
    if (!name)
        return;
    const std::string file = *name == wholeBundle ? path() : path() + "/" + std::string(*name);
    const auto token = issueFileExtension(file);
    if (token)
        return tokens.set(*name, *token);
    ZPDLogSandbox().info("failed to make extension for %@ in plug-in at %@: %{public}s", file,
                         path(), systemText(token.error()));
}

bool ZPDPlugIn::addServiceExtension(Dictionary& form) const {
    const auto value = infoKey(InfoKey::bundleIdentifier);
    const auto text = value ? value->string() : std::nullopt;
    const std::string identifier(text.value_or("(null)"));
    const auto token = text ? issueServiceExtension(identifier) : std::unexpected(EINVAL);
    if (token) {
        form.set(FormKey::serviceExtension, *token);
        return true;
    }
    ZPDLogAr().info("failed to make mach extension for %@ in plug-in at %@: %{public}s", identifier,
                    path(), systemText(token.error()));
    return !text; // without a name there is nothing to ask for again
}

std::expected<std::string, int> ZPDPlugIn::issueFileExtension(const std::string& file) const {
    auto token = context_.sandbox.issueFileExtension(Sandbox::readOnlyClass, file,
                                                     Sandbox::canonicalPathFlag);
    if (token)
        ZPDLogSandbox().debug("issued file extension for %s -> %s", file, *token);
    return token;
}

std::expected<std::string, int> ZPDPlugIn::issueBundleExtension() const {
    return issueFileExtension(path());
}

std::expected<std::string, int>
ZPDPlugIn::issueServiceExtension(const std::string& bundleIdentifier) const {
    auto token = context_.sandbox.issueServiceExtension(serviceClass, bundleIdentifier, noFlags);
    if (token)
        ZPDLogSandbox().debug("issued mach extension for %s -> %s", bundleIdentifier, *token);
    return token;
}
