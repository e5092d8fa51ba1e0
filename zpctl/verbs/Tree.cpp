// "tree": applications and all versions of the plug-ins in them, as far as this client may use
// them.

#include "zpctl/Tree.h"

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* explanation =
    R"(Shows every version of a plug-in, also those that "match" leaves out for a newer one; of each
its name, version, extension point, the user's election if there is one, and its UUID.

With --json: an array of {"path", "name", "plugIns"}, one for each application, the plug-ins as
their forms; "path" and "name" are null for plug-ins outside applications.)";

Status showTree(Session& session) {
    const auto forms = session.daemon().match({}, ZPDaemonClient::ZPDiscoverAllVersions |
                                                      ZPDaemonClient::ZPDiscoverAllDuplicates);
    if (!forms)
        return session.fail(forms.error());
    const Tree tree(*forms);
    return session.report(tree.json(),
                          [&] { tree.write(session.out(), session.paint(), session.inUtf8()); });
}

} // namespace

Action declareTree(CLI::App& command) {
    command.footer(explanation);
    return showTree;
}

} // namespace zpctl
