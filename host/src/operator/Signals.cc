#include "operator/Signals.h"

#include <pthread.h>
#include <unistd.h>

#include <array>
#include <utility>

namespace receiver {
namespace {

/// Wakes the signal thread when the object goes.
constexpr int kWake = SIGURG;
constexpr int kExitBySignal = 128;
/// A recorder in the background that looks at its terminal shall not be stopped for it, and one whose output
/// nobody reads any more goes on.
constexpr std::array<int, 3> kIgnored{SIGPIPE, SIGTTIN, SIGTTOU};

/// Takes a signal that waits for the process, without waiting for one.
bool TakeWaiting(int number) {
    sigset_t wanted;
    sigemptyset(&wanted);
    sigaddset(&wanted, number);
    const timespec now{};
    return sigtimedwait(&wanted, nullptr, &now) == number;
}

}  // namespace

Signals::Signals(void (*beforeExit)()) : beforeExit_(beforeExit) {
    sigemptyset(&received_);
    for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGUSR1, SIGUSR2, SIGRTMIN, kWake}) {
        sigaddset(&received_, number);
    }
    sigset_t blocked = received_;
    for (const int number : kIgnored) {
        sigaddset(&blocked, number);
    }
    pthread_sigmask(SIG_BLOCK, &blocked, &previous_);
    thread_ = std::thread(&Signals::Receive, this);
}

Signals::~Signals() {
    ended_ = true;
    pthread_kill(thread_.native_handle(), kWake);
    thread_.join();
    // What had no effect has none afterwards either.
    sigset_t ignored;
    sigemptyset(&ignored);
    for (const int number : kIgnored) {
        sigaddset(&ignored, number);
    }
    const timespec now{};
    while (sigtimedwait(&ignored, nullptr, &now) > 0) {
    }
    // Another signal that came meanwhile and was left over is delivered here, as if nobody had listened.
    pthread_sigmask(SIG_SETMASK, &previous_, nullptr);
}

SignalCommands Signals::Take() {
    const std::lock_guard lock(mutex_);
    return {std::exchange(commands_, {}), QuitRequested(), hangup_.exchange(false)};
}

void Signals::Add(RecordCommand command) {
    const std::lock_guard lock(mutex_);
    commands_.push_back(command);
}

void Signals::Receive() {
    while (!ended_) {
        int number = 0;
        if (sigwait(&received_, &number) != 0) {
            continue;
        }
        switch (number) {
            case SIGUSR1:
                if (TakeWaiting(SIGUSR2)) {
                    Add(RecordCommand::kStop);
                }
                Add(RecordCommand::kStart);
                break;
            case SIGUSR2:
                Add(RecordCommand::kStop);
                break;
            case SIGHUP:
                hangup_ = true;
                break;
            case SIGINT:
            case SIGTERM:
                if (++quits_ > 1) {
                    beforeExit_();
                    _exit(kExitBySignal + number);
                }
                break;
            default:
                // No constant.
                if (number == SIGRTMIN) {
                    Add(RecordCommand::kSplit);
                }
                break;
        }
    }
}

}  // namespace receiver
