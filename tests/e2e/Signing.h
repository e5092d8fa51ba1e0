#pragma once

#include <string>
#include <vector>

#include "tests/e2e/DaemonTest.h"

namespace e2e {

// Keys of a test, made and used with the tool. Kept in a folder of the home.
class Signer {
public:
    // Makes a key; the daemon of the home trusts it if `trusted`.
    explicit Signer(const Home& home, const std::string& name = "key", bool trusted = true);

    // Signs a bundle or an executable, by default for a manager of plug-ins.
    void sign(const std::string& path, const Item& entitlements = manager()) const;

    // The public key's place in the trust folder.
    [[nodiscard]] const std::string& trustedKey() const { return trustedKey_; }

    [[nodiscard]] static Item manager();

private:
    std::string folder_;
    std::string trustedKey_;
};

// A probe (Probe.cpp, LibraryProbe.cpp) that runs and is talked to.
class Talk {
public:
    Talk(const Home& home, const std::vector<std::string>& command,
         std::optional<uid_t> user = std::nullopt);
    Talk(const Talk&) = delete;
    Talk& operator=(const Talk&) = delete;
    ~Talk();

    void tell(const std::string& line) const;
    // The next line of what it says; "" at the end.
    [[nodiscard]] std::string hear();
    [[nodiscard]] std::string ask(const std::string& line = "ask");
    // It gets no further line; what it says until it ends.
    [[nodiscard]] std::vector<std::string> rest();

    [[nodiscard]] Program& program() { return program_; }

private:
    struct Pipes {
        int commands[2];
        int answers[2];
    };

    [[nodiscard]] static Pipes makePipes();
    void endInput();

    Pipes pipes_;
    Program program_;
    std::string heard_;
};

// A copy of a program of this build, which a test may sign.
std::string addProgram(const std::string& path, const char* name = "e2e_probe");

// Beside the daemon a probe that is signed for a manager of plug-ins.
class ManagerTest : public DaemonTest {
protected:
    ManagerTest() { key.sign(manager); }

    using Words = std::vector<std::string>;

    [[nodiscard]] Words command(const std::string& program, const Words& steps) const;

    // What the probe says first.
    [[nodiscard]] std::string answerTo(const std::string& program,
                                       const Words& steps = {"hello", "ask"}) const {
        return Talk(home, command(program, steps)).hear();
    }

    // By the program that may.
    [[nodiscard]] std::string remove(const Words& paths) const;

    const Signer key{home};
    const std::string manager = addProgram(home / "tools/probe");
};

inline const std::string granted = "granted";
inline const std::string refused = "11 unauthorized discovery flag (ZPDiscoverAll)";

} // namespace e2e
