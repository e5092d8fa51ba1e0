// A host application in little: asks the daemon which plug-ins it may use and prints them.
//
//   Cinema                        all of them
//   Cinema com.example.artwork    those of one extension point
//
// As the program of an application bundle it shows one thing more: where its own application
// contains a plug-in, the host sees that one and no other of the same identifier, however new.

#include <cstdlib>
#include <iostream>
#include <string>

#include "examples/host/PlugInList.h"

int main(int argc, char** argv) {
    const auto plugIns = example::plugInsAt(argc > 1 ? argv[1] : "");
    if (!plugIns) {
        std::cerr << argv[0] << ": " << plugIns.error() << '\n';
        return EXIT_FAILURE;
    }
    for (const auto& plugIn : *plugIns)
        std::cout << plugIn->identifier() << ' ' << plugIn->exportedVersion() << "  "
                  << plugIn->localizedName().value_or(plugIn->identifier()) << "  "
                  << plugIn->path() << '\n';
    std::cout << plugIns->size() << (plugIns->size() == 1 ? " plug-in\n" : " plug-ins\n");
}
