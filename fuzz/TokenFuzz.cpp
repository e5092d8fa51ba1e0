// Bytes as a token, and as what a token says before its authentication.

#include "fuzz/Target.h"
#include "platform/sandbox/HmacSandbox.h"

using namespace platform;

void fuzz::run(std::string_view input) {
    static HmacSandbox sandbox;
    require(!sandbox.verify(input), "nobody else knows the secret");
    if (const auto grant = SandboxGrant::parse(input))
        require(grant->text() == input, "there is one text for a grant");
    const auto token = sandbox.issueServiceExtension(input, "x", 0);
    const auto grant = token ? sandbox.verify(*token) : std::nullopt;
    require(!grant || grant->extensionClass == input, "what was issued is what counts");
    const auto file = sandbox.issueFileExtension("x", input, 0);
    const auto permitted = file ? sandbox.verify(*file) : std::nullopt;
    require(!permitted || permitted->target == input, "what was issued is what counts");
}
