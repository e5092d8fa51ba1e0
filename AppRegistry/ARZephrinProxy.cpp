#include "AppRegistry/ARZephrinProxy.h"

std::string describe(const ARZephrinProxy& proxy) {
    return "<ARZephrinProxy " + proxy.plugInIdentifier().value_or("(no identifier)") + " " +
           proxy.plugInUUID().text() + " " + proxy.bundlePath().value_or("(no path)") + ">";
}
