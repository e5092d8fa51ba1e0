#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

// When an attempt of a plug-in succeeds once it is confined.
enum class Allowed { never, always, withNetwork };

// Who must be able to do it without confinement, as otherwise its failure would tell nothing:
// nobody (the system may refuse it anyway), the daemon's user, or the plug-in's.
enum class Control { nobody, daemon, plugIn };

struct Attempt {
    std::string line; // for the probe: what, and on what
    Allowed allowed = Allowed::never;
    Control control = Control::daemon;
};

// What there is around a plug-in: other people's files, sockets to connect to, a process to signal.
// All of it belongs to the user who makes it, and only the confinement keeps a plug-in of that user
// away. Lasts as long as the object.
class ConfinementScene {
public:
    struct Places {
        std::string folder; // for what it makes
        std::string bundle; // with a copy of the probe, "probe", and "suid", set-user-id root if so
        std::string container;
        std::string otherContainer;
        std::string library;              // of the system; none when empty
        std::vector<std::string> sockets; // to which others listen
        std::vector<std::string> files;   // that only others may read
        bool hasSuid = false;
    };

    explicit ConfinementScene(Places places);
    ConfinementScene(const ConfinementScene&) = delete;
    ConfinementScene& operator=(const ConfinementScene&) = delete;
    ~ConfinementScene();

    // Repeatable: what they make is taken away before each use, by `tidy`.
    [[nodiscard]] std::vector<Attempt> attempts() const;
    void tidy() const;

private:
    void listen();

    const Places places_;
    const std::string home_;
    const std::string abstract_;
    std::string tcpPort_;
    std::string udpPort_;
    std::vector<int> sockets_;
    pid_t victim_ = -1;
};

// A talk with a probe over its socket, which it closes when it goes.
class ProbeTalk {
public:
    explicit ProbeTalk(int socket) : socket_(socket) {}

    ProbeTalk(const ProbeTalk&) = delete;
    ProbeTalk& operator=(const ProbeTalk&) = delete;
    ~ProbeTalk();

    // 0 when it could; an errno value; -1 when the probe does not answer.
    [[nodiscard]] int outcome(std::string_view line) const;

private:
    const int socket_;
};

// Nothing when the outcome of an attempt is what it must be, else what is wrong.
[[nodiscard]] std::optional<std::string> objection(const Attempt& attempt, int outcome,
                                                   bool confined, bool network);
