// library_probe SERVICE: for each line on standard input asks for all plug-ins, through the client
// library, and writes "granted" or the code and text of the refusal.

#include <future>
#include <iostream>
#include <string>

#include "Zephrin/ZPDaemonClient.h"

int main(int count, char** arguments) {
    if (count != 2)
        return 2;
    ZPDaemonClient client(arguments[1]);
    for (std::string line; std::getline(std::cin, line);) {
        std::promise<std::string> answer;
        client.matchPlugIns({}, ZPDaemonClient::ZPDiscoverAll,
                            [&](const ZPDaemonClient::Reply& reply) {
                                const auto error = ZPDaemonClient::errorInReply(reply);
                                answer.set_value(error ? std::to_string(error->code) + " " +
                                                             error->description.value_or("")
                                                       : "granted");
                            });
        std::cout << answer.get_future().get() << std::endl;
    }
    return 0;
}
