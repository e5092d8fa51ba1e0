// The annotation that each form of a reply carries.

#include "zpd/Transaction.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/ReplyForm.h"

using platform::Dictionary;

void Transaction::addAnnotationForPlugIn(const ZPDPlugIn& plugIn, ReplyForm& form) const {
    if (auto stored = server().annotationForPlugIn(plugIn))
        form.annotations = std::move(*stored);
    else if (pluginShouldBeAutoEnabled(plugIn))
        form.annotations = Dictionary{{"election", 1}};
    else
        form.annotations = {};
}

// Never: a plug-in without stored annotation is not elected.
bool Transaction::pluginShouldBeAutoEnabled(const ZPDPlugIn&) const {
    return false;
}
