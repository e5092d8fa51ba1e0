// A host application in little: asks the daemon which plug-ins it may use and prints them.
//
//   Cinema                                 all of them
//   Cinema com.example.artwork             those of one extension point
//   Cinema com.example.artwork Sunrise     says "Sunrise" to the first of them, and prints what it
//                                          answers
//
// As the program of an application bundle it shows one thing more: where its own application
// contains a plug-in, the host sees that one and no other of the same identifier, however new.

#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include "examples/host/PlugInList.h"
#include "examples/host/Talk.h"

namespace {

int complain(const std::string& what) {
    std::cerr << what << '\n';
    return EXIT_FAILURE;
}

void print(const std::vector<ZPPlugInCore::Ptr>& plugIns) {
    for (const auto& plugIn : plugIns)
        std::cout << plugIn->identifier() << ' ' << plugIn->exportedVersion() << "  "
                  << plugIn->localizedName().value_or(plugIn->identifier()) << "  "
                  << plugIn->path() << '\n';
    std::cout << plugIns.size() << (plugIns.size() == 1 ? " plug-in\n" : " plug-ins\n");
}

int talk(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn,
         const std::vector<std::string>& lines) {
    const auto answers = example::talkWith(daemon, plugIn, lines);
    if (!answers)
        return complain(answers.error());
    for (const std::string& answer : *answers)
        std::cout << plugIn.identifier() << ": " << answer << '\n';
    const auto size = example::sizeByToken(daemon, plugIn, "Info.plist");
    if (!size)
        return complain(size.error());
    std::cout << "its Info.plist has " << *size << " bytes, as read by token\n";
    return EXIT_SUCCESS;
}

} // namespace

int main(int argc, char** argv) {
    ZPDaemonClient daemon;
    const auto plugIns = example::plugInsAt(daemon, argc > 1 ? argv[1] : "");
    if (!plugIns)
        return complain(plugIns.error());
    if (argc <= 2)
        print(*plugIns);
    else if (plugIns->empty())
        return complain("no plug-in to talk to");
    else
        return talk(daemon, *plugIns->front(), std::vector<std::string>(argv + 2, argv + argc));
}
