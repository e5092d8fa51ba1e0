#include "platform/value/TextPool.h"

namespace platform {

SharedBytes TextPool::shared(std::string_view text) {
    const auto known = texts_.find(text);
    if (known != texts_.end())
        return *known;
    if (texts_.size() >= mostTexts || text.size() > longestText)
        return SharedBytes(text);
    return *texts_.emplace(text).first;
}

} // namespace platform
