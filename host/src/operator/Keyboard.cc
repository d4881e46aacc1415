#include "operator/Keyboard.h"

#include <poll.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>

namespace receiver {
namespace {

/// What `RestoreTerminal` needs, apart from the object, for exits that know of no object.
struct Saved {
    std::atomic<int> descriptor{-1};
    termios settings{};
};
Saved saved;

/// Faults that end a process. The handler puts the terminal right and lets the fault take its course.
constexpr std::array<int, 5> kFaults{SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGABRT};
std::array<struct sigaction, kFaults.size()> previousActions;

void OnFault(int number) {
    Keyboard::RestoreTerminal();
    for (std::size_t i = 0; i < kFaults.size(); ++i) {
        if (kFaults[i] == number) {
            sigaction(number, &previousActions[i], nullptr);
        }
    }
    // Comes again when the handler returns: the fault by itself, an abort by this.
    if (number == SIGABRT) {
        raise(number);
    }
}

void WatchFaults() {
    for (std::size_t i = 0; i < kFaults.size(); ++i) {
        struct sigaction action {};
        action.sa_handler = OnFault;
        sigemptyset(&action.sa_mask);
        sigaction(kFaults[i], &action, &previousActions[i]);
    }
}

void LeaveFaults() {
    for (std::size_t i = 0; i < kFaults.size(); ++i) {
        sigaction(kFaults[i], &previousActions[i], nullptr);
    }
}

}  // namespace

Keyboard::Keyboard(int descriptor) : descriptor_(descriptor) {
    termios settings{};
    isTerminal_ = isatty(descriptor_) == 1 && tcgetattr(descriptor_, &settings) == 0 && InForeground();
    if (!isTerminal_) {
        return;
    }
    saved.settings = settings;
    saved.descriptor = descriptor_;
    WatchFaults();
    settings.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
    settings.c_cc[VMIN] = 0;
    settings.c_cc[VTIME] = 0;
    settings.c_cc[VSUSP] = _POSIX_VDISABLE;
    tcsetattr(descriptor_, TCSANOW, &settings);
}

Keyboard::~Keyboard() {
    if (isTerminal_) {
        RestoreTerminal();
        LeaveFaults();
    }
}

std::optional<char> Keyboard::Take() {
    if (!isTerminal_ || !InForeground()) {
        return std::nullopt;
    }
    pollfd ready{descriptor_, POLLIN, 0};
    char key = 0;
    if (poll(&ready, 1, 0) != 1 || read(descriptor_, &key, 1) != 1) {
        return std::nullopt;
    }
    return key;
}

void Keyboard::Abandon() {
    if (isTerminal_) {
        isTerminal_ = false;
        saved.descriptor = -1;
        LeaveFaults();
    }
}

void Keyboard::RestoreTerminal() {
    const int descriptor = saved.descriptor.exchange(-1);
    if (descriptor >= 0) {
        tcsetattr(descriptor, TCSANOW, &saved.settings);
    }
}

bool Keyboard::InForeground() const {
    return tcgetpgrp(descriptor_) == getpgrp();
}

}  // namespace receiver
