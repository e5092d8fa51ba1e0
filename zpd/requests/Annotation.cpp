// "annotate" and "bulk-annotate": what users chose for plug-ins, and what else hosts note down. And
// the annotation that each form of a reply carries.

#include <cmath>
#include <string>
#include <unordered_set>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "zpd/AnnotationKeys.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/ReplyForm.h"

using platform::Dictionary;
using platform::DictionaryEntry;
using platform::Uuid;
using platform::Value;

namespace {

constexpr const char* badElection = "invalid request format (annotation election)";
constexpr const char* badExtension = "invalid request format (annotation extension)";
constexpr const char* badBulkValue = "annotations values must be dictionaries";

// Any number, a boolean too, that a property list can hold.
bool isElection(const Value& value) {
    return value.isNumber() && std::isfinite(value.real().value_or(0));
}

Dictionary extending(const Value& extension) {
    return {{AnnotationKey::extension, extension}};
}

} // namespace

const Dictionary* Transaction::requestedAnnotations() {
    const Dictionary* const annotations = request().findDictionary("annotations");
    if (!annotations) {
        fail(ZPDErrorCode::invalidRequest, "invalid request format (bad annotations dictionary)");
    }
    return annotations;
}

// ---- "annotate": one change for a list of plug-ins

void Transaction::annotatePlugIns() {
    const Dictionary* const requested = requestedAnnotations();
    if (!requested)
        return;
    const auto change = annotationChange(*requested);
    if (!change)
        return;
    if (change->empty())
        return done();
    followListedPaths([this, change = *change] { annotateListed(change); });
}

// One annotation is compared with the change, which may take long, only once however often its
// plug-ins are listed.
void Transaction::annotateListed(const Dictionary& change) {
    std::unordered_set<std::string> changed; // annotation keys
    const auto block = [&](const ZPDPlugIn::Ptr& plugIn) {
        const bool isFirst = changed.emplace(plugIn->annotationKey()).second;
        return annotate(*plugIn, change, isFirst);
    };
    if (!processUuidList(block))
        return;
    server().notifyAnnotationChange();
    done();
}

// Only what clients may set; other keys are dropped.
std::optional<Dictionary> Transaction::annotationChange(const Dictionary& requested) {
    Dictionary change;
    const Value* const election = requested.find(AnnotationKey::election);
    if (election && !isElection(*election)) {
        fail(ZPDErrorCode::invalidRequest, badElection);
        return std::nullopt;
    }
    if (election)
        change.set(AnnotationKey::election, *election);
    const Value* const extension = requested.find(AnnotationKey::extension);
    if (extension)
        change.set(AnnotationKey::extension, *extension);
    if ((extension && !extension->dictionary()) || !ZPDAnnotationStore::canHold(change)) {
        fail(ZPDErrorCode::invalidRequest, badExtension);
        return std::nullopt;
    }
    return change;
}

bool Transaction::annotate(const ZPDPlugIn& plugIn, const Dictionary& change, bool isFirst) {
    ZPDLogOps().debug("client %d plug-in %{public}@(%{public}@) annotation change: %@",
                      client().pid(), plugIn.identifier(), plugIn.uuid(), change);
    if (const Value* const election = change.find(AnnotationKey::election)) {
        ZPDLogOps().info("client %d plug-in %{public}@(%{public}@) election := %@", client().pid(),
                         plugIn.identifier(), plugIn.uuid(), *election);
    }
    if (!isFirst || store(plugIn, change))
        return true;
    fail(ZPDErrorCode::invalidRequest, badExtension);
    return false;
}

// ---- "bulk-annotate": an extension for each of many plug-ins

void Transaction::bulkAnnotatePlugIns() {
    const Dictionary* const extensions = requestedAnnotations();
    if (!extensions)
        return;
    ZPDLogOps().debug("bulk change requested for %u plug-ins", extensions->size());
    if (!mayAllBeStored(*extensions))
        return;
    for (const DictionaryEntry& entry : *extensions) {
        if (!bulkAnnotate(entry.key.view(), entry.value))
            return;
    }
    server().notifyAnnotationChange();
    done();
}

// Looks at the dictionaries alone: other values end the walk only when it comes to them.
bool Transaction::mayAllBeStored(const Dictionary& extensions) {
    for (const DictionaryEntry& entry : extensions) {
        if (entry.value.dictionary() && !ZPDAnnotationStore::canHold(extending(entry.value))) {
            fail(ZPDErrorCode::badAnnotation, badBulkValue);
            return false;
        }
    }
    return true;
}

bool Transaction::bulkAnnotate(std::string_view uuidText, const Value& extension) {
    if (!extension.dictionary()) {
        fail(ZPDErrorCode::badAnnotation, badBulkValue);
        return false;
    }
    const auto uuid = Uuid::parse(uuidText);
    if (!uuid) {
        fail(ZPDErrorCode::badAnnotation, "invalid plug-in UUID value");
        return false;
    }
    const ZPDPlugIn::Ptr plugIn = server().findPlugIn(*uuid);
    if (!plugIn) {
        fail(ZPDErrorCode::registration, "no plug-in with the requested uuid");
        return false;
    }
    ZPDLogOps().debug("client %d bulk plug-in %{public}@(%public}@) annotation change: %@",
                      client().pid(), plugIn->identifier(), plugIn->uuid(), extension);
    if (store(*plugIn, extending(extension)))
        return true;
    fail(ZPDErrorCode::badAnnotation, badBulkValue);
    return false;
}

bool Transaction::store(const ZPDPlugIn& plugIn, const Dictionary& annotation) {
    annotates_ = true;
    return !server().setAnnotation(annotation, plugIn);
}

// ---- Annotations of forms

void Transaction::addAnnotationForPlugIn(const ZPDPlugIn& plugIn, ReplyForm& form) const {
    form.annotationState = server().annotationChanges(); // before, so that a change is not missed
    if (auto stored = server().annotationForPlugIn(plugIn))
        form.annotations = std::move(*stored);
    else if (pluginShouldBeAutoEnabled(plugIn))
        form.annotations = Dictionary{{"election", 1}};
    else
        form.annotations = {};
}

std::optional<platform::SharedBytes> Transaction::encodedForm(const ZPDPlugIn& plugIn,
                                                              platform::SharedBytes kept) const {
    if (kept.size() != 0)
        return kept;
    ReplyForm form{.plugIn = plugIn};
    addAnnotationForPlugIn(plugIn, form);
    return form.encode();
}

// Never: a plug-in without stored annotation is not elected.
bool Transaction::pluginShouldBeAutoEnabled(const ZPDPlugIn&) const {
    return false;
}
