#pragma once

#include <atomic>
#include <mutex>
#include <thread>
#include <vector>

#include <csignal>

#include "operator/CommandQueue.h"

namespace receiver {

/// What the operator has sent since the last look.
struct SignalCommands {
    /// In their order.
    std::vector<RecordCommand> record;
    bool quit = false;
    bool hangup = false;
};

/// Receives the signals of the process on a thread of its own, so that no code of ours runs in a handler and
/// nothing that hangs elsewhere keeps them waiting. SIGUSR1 starts a recording, SIGUSR2 stops it, SIGRTMIN
/// splits it, SIGINT and SIGTERM end the program in order; the second of these ends it at once, with 128 and
/// the signal's number as exit code. SIGHUP says that the terminal is gone, which is no reason to lose a
/// recording. SIGPIPE, SIGTTIN and SIGTTOU have no effect.
///
/// The system tells nothing of the order of signals that wait for the thread at the same time. A start and a
/// stop that do are taken for a stop with a start behind it: recording too much does less harm.
///
/// Made before any other thread is started, since threads inherit the mask; one at a time in a process.
class Signals {
 public:
    /// `beforeExit` runs on the signal thread when the program is ended at once.
    explicit Signals(void (*beforeExit)());
    ~Signals();
    Signals(const Signals&) = delete;
    Signals& operator=(const Signals&) = delete;

    SignalCommands Take();
    /// SIGINT or SIGTERM has come. From any thread.
    bool QuitRequested() const { return quits_.load() > 0; }

 private:
    void Receive();
    void Add(RecordCommand command);

    void (*const beforeExit_)();
    sigset_t received_;
    sigset_t previous_;
    std::mutex mutex_;
    /// Guarded by mutex_.
    std::vector<RecordCommand> commands_;
    std::atomic<bool> hangup_{false};
    std::atomic<int> quits_{0};
    std::atomic<bool> ended_{false};
    std::thread thread_;
};

}  // namespace receiver
