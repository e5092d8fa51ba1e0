#pragma once

#include <atomic>
#include <mutex>
#include <string>
#include <vector>

#include "platform/plist/PropertyListFile.h"
#include "platform/types/TypeGraph.h"
#include "platform/types/Types.h"

namespace platform {

// Types as declared in Types.plist, read again when it changed and someone said so, and by bundles
// and extension points, which the registry hands over. The file holds declarations as TypeGraph
// reads them, or such under "TypeDeclarations". Owned by the platform; any thread.
class DeclaredTypes final : public Types {
public:
    explicit DeclaredTypes(std::string path) : file_(std::move(path)) {}

    void setBundleDeclarations(std::vector<Value> declarations) override;

    void mayHaveChanged() override { lookDue_ = true; }

    [[nodiscard]] bool conforms(std::string_view type, std::string_view target) override;
    [[nodiscard]] bool evaluateActivationRule(const Value& rule, const Dictionary& offer) override;

private:
    // All REQUIRE: mutex held
    void refresh();
    void rebuild();
    [[nodiscard]] bool accepts(const Dictionary& rule, const DictionaryEntry& offered);

    std::atomic<bool> lookDue_ = true;
    std::mutex mutex_;
    PropertyListFile file_;
    std::vector<Value> bundleDeclarations_;
    TypeGraph graph_;
};

} // namespace platform
