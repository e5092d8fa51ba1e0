#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "AppRegistry/ARBundleRow.h"
#include "platform/value/Value.h"

// What an info dictionary says that its bundle is.

// The info dictionary as the registry reports it: of a plug-in, with the extension point's
// identifier at the top level too, copied from "HXExtension" unless it is there.
[[nodiscard]] platform::Dictionary ARReportedInfo(ARKind kind, platform::Dictionary info);

// Fills in what `info` (as reported) tells of the row: identifiers, version, executable, point
// keys. `path` names an extension point. On failure the reason.
[[nodiscard]] std::optional<std::string> ARIdentify(ARBundleRow& row, std::string_view path,
                                                    const platform::Dictionary& info);
