#pragma once

#include "zpctl/Verb.h"

// The `declare` of each verb, each in a source named after it.
namespace zpctl {

Action declareMatch(CLI::App& command);
Action declareFind(CLI::App& command);
Action declareTree(CLI::App& command);
Action declareElect(CLI::App& command);
Action declareAnnotate(CLI::App& command);
Action declareMonitor(CLI::App& command);
Action declareRun(CLI::App& command);
Action declarePs(CLI::App& command);
Action declareReady(CLI::App& command);
Action declareAccess(CLI::App& command);
Action declareHold(CLI::App& command);
Action declareRelease(CLI::App& command);
Action declareAdd(CLI::App& command);
Action declareRemove(CLI::App& command);
Action declareInstall(CLI::App& command);
Action declareUninstall(CLI::App& command);
Action declareConsent(CLI::App& command);
Action declareKeygen(CLI::App& command);
Action declareSign(CLI::App& command);
Action declareVerify(CLI::App& command);

} // namespace zpctl
