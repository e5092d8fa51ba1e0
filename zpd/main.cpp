// The process entry of zpd: parses, constructs and runs.

#include <cstdio>

#include "Zephrin/ZPDLog.h"
#include "zpd/Daemon.h"
#include "zpd/ZPDOptions.h"

namespace {

constexpr int constructionFailed = 1;
constexpr int wrongUsage = 2;

} // namespace

int main(int argc, char* argv[]) {
    Daemon::prepareProcess();
    ZPDLogOps().info("zpd is launching");
    const auto options = ZPDOptions::parse(argc, argv);
    if (!options) {
        std::fputs(ZPDOptions::usage, stderr);
        return wrongUsage;
    }
    const auto daemon = Daemon::create(*options);
    if (!daemon) {
        ZPDLogOps().error("unable to construct server");
        return constructionFailed;
    }
    daemon->run();
}
