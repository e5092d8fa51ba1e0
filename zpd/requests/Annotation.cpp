// The annotation that each form of a reply carries.

#include "zpd/Transaction.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/ReplyForm.h"

using platform::Dictionary;

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
