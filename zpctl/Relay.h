#pragma once

#include <string>

namespace zpctl {

// Carries bytes between a socket and this process's input and output, both ways at once, with a
// limited store for each. The end of the input half-closes the socket; what the socket still says
// is written. A local variable; one thread. The descriptors outlive it and stay as they are.
class Relay {
public:
    enum class End {
        hungUp,      // the other side; all that it said is written
        interrupted, // `ending` became readable
        unread,      // nobody takes the output any more
        unwritable,  // writing it failed: `writeError`
    };

    struct Ends {
        int input;
        int output;
        int socket;
        int ending; // -1 for none
    };

    explicit Relay(const Ends& ends) : ends_(ends) {}

    // Until one of these. Never waits for one of the ends alone.
    [[nodiscard]] End run();

    // The errno of the write that failed.
    [[nodiscard]] int writeError() const { return writeError_; }

private:
    [[nodiscard]] bool carry(short input, short output, short socket);
    void readInput();
    void writeSocket();
    void readSocket();
    [[nodiscard]] bool writeOutput();
    void endInput();

    const Ends ends_;
    std::string toSocket_;
    std::string toOutput_;
    bool inputOpen_ = true;    // more may come from it
    bool socketTakes_ = true;  // it was not half-closed yet
    bool socketSpeaks_ = true; // more may come from it
    int writeError_ = 0;
};

} // namespace zpctl
