#pragma once

#include <termios.h>

#include <optional>

namespace receiver {

/// Single keys from the terminal that `descriptor` is, without Return and without echo. Has no effect when
/// that is no terminal.
///
/// The terminal gets its settings back with this object, by `RestoreTerminal` before an exit that passes
/// destructors by, and when a fault ends the process. Ctrl-C stays a signal; Ctrl-Z does nothing, since a
/// recorder must not be suspended by a slip. While the program is in the background the terminal is left
/// alone. One at a time in a process.
class Keyboard {
 public:
    explicit Keyboard(int descriptor);
    ~Keyboard();
    Keyboard(const Keyboard&) = delete;
    Keyboard& operator=(const Keyboard&) = delete;

    /// Somebody may press keys.
    bool IsThere() const { return isTerminal_; }
    /// The next key that was pressed, without waiting. Nothing when there is none.
    std::optional<char> Take();
    /// The terminal is gone: it is neither read nor restored any more.
    void Abandon();

    /// Gives the terminal its settings back, as the destructor does. Safe in a signal handler.
    static void RestoreTerminal();

 private:
    bool InForeground() const;

    const int descriptor_;
    bool isTerminal_ = false;
};

}  // namespace receiver
