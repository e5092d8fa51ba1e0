#pragma once

#include <optional>
#include <string>

namespace platform {

// The files that one signature speaks of: those of a bundle, or a lone executable. Paths are
// canonical. A plain value; making one looks at the files.
struct SignedFiles {
    std::optional<std::string> bundle; // its folder
    std::optional<std::string> executable;

    // Of the program that runs from this path: it belongs to the nearest enclosing bundle that
    // names it, as far as nobody else could have put that there.
    [[nodiscard]] static SignedFiles ofProgram(const std::string& path);
    // The same, whoever could have put the bundle there.
    [[nodiscard]] static SignedFiles ofAnyProgram(const std::string& path);
    // Nothing when there is no bundle in the folder.
    [[nodiscard]] static std::optional<SignedFiles> ofBundle(const std::string& folder);

    // Where the signature file is: `Signature` in the bundle, or NAME.signature beside NAME.
    [[nodiscard]] std::string signature() const;
    [[nodiscard]] std::optional<std::string> info() const;
};

} // namespace platform
