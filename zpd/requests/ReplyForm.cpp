#include "zpd/requests/ReplyForm.h"

#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Cbor.h"

using platform::Error;
using platform::SharedBytes;

namespace {

std::expected<SharedBytes, Error> encodeMarked(const ReplyForm& form) {
    auto marked = form.plugIn.replyForm(form.annotations);
    if (!marked)
        return std::unexpected(std::move(marked.error()));
    if (form.overrider)
        marked->set(FormKey::overrider, *form.overrider);
    if (form.overriding)
        marked->set(FormKey::overriding, *form.overriding);
    return platform::ipc::encodeShared(*marked);
}

} // namespace

std::optional<SharedBytes> ReplyForm::encode() const {
    const bool isMarked = overrider || overriding;
    auto encoded =
        isMarked ? encodeMarked(*this) : plugIn.encodedReplyForm(annotations, annotationState);
    if (encoded)
        return std::move(*encoded);
    ZPDLogOps().error("failed to export matching plug-in %{public}@: %{public}@", plugIn.uuid(),
                      encoded.error());
    return std::nullopt;
}
