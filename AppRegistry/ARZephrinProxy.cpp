#include "AppRegistry/ARZephrinProxy.h"

std::string describe(const ARZephrinProxy& proxy) {
    return "<ARZephrinProxy " + proxy.plugInIdentifier().value_or("(no identifier)") + " " +
           proxy.plugInUUID().text() + " " + proxy.bundlePath().value_or("(no path)") + ">";
}

std::string describeAll(const std::vector<ARZephrinProxy::Ptr>& proxies) {
    std::string text = "(";
    for (const auto& proxy : proxies) {
        text += text.size() > 1 ? ", " : "";
        text += describe(*proxy);
    }
    return text + ")";
}
