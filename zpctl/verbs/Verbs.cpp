#include "zpctl/verbs/Verbs.h"

namespace zpctl {

std::span<const Verb> verbs() {
    static constexpr Verb table[] = {
        {"match", "List the plug-ins that this client may use and that satisfy rules",
         declareMatch},
        {"find", "Show one plug-in, by its UUID or by its path", declareFind},
        {"tree", "Show applications and the plug-ins in them", declareTree},
        {"elect", "Elect a plug-in, or not, or leave it undecided", declareElect},
        {"annotate", "Set what is kept for a plug-in: the election and further settings",
         declareAnnotate},
        {"monitor", "Tell of each change of annotations as it comes", declareMonitor},
        {"run", "Start a plug-in and talk to it", declareRun},
        {"ps", "List the plug-ins that run", declarePs},
        {"ready", "Make plug-ins ready, or tell why not", declareReady},
        {"access", "Write tokens to read plug-ins' bundles", declareAccess},
        {"hold", "Keep plug-ins from being used, while a command runs or until interrupted",
         declareHold, true},
        {"release", "End a hold by its token", declareRelease},
        {"add", "Register plug-ins by path", declareAdd},
        {"remove", "Unregister plug-ins by path", declareRemove},
        {"install", "Put an application into the application folder, safely", declareInstall},
        {"uninstall", "Take an application out of the application folder", declareUninstall},
        {"consent", "Write down, or show, what the user agreed to", declareConsent},
        {"keygen", "Make a key to sign with", declareKeygen},
        {"sign", "Sign a bundle or an executable, with entitlements", declareSign},
        {"verify", "Tell what the signature of a bundle or an executable grants, and why",
         declareVerify},
    };
    return table;
}

} // namespace zpctl
