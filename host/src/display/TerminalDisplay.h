#pragma once

#include <cstddef>
#include <functional>
#include <utility>

#include "display/TextDisplay.h"

namespace receiver {

/// The status line: what the receiver does at this moment, in at most `width` columns.
std::string StatusLine(const Snapshot& snapshot, std::size_t width);

/// Text for people in front of a terminal: the lines of `TextDisplay` above one status line that is drawn
/// over and over.
class TerminalDisplay final : public TextDisplay {
 public:
    /// `descriptor` is the terminal behind `messages`; its width is asked for at each drawing. While `busy`
    /// says that something waits for the terminal, the status line is left as it is.
    TerminalDisplay(std::ostream& messages, std::ostream& results, int descriptor,
                    std::function<bool()> busy = {})
        : TextDisplay(messages, results), descriptor_(descriptor), busy_(std::move(busy)) {}

    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 protected:
    void Line(const std::string& text) override;

 private:
    void Draw(const std::string& text);

    const int descriptor_;
    const std::function<bool()> busy_;
    std::string line_;
};

/// The line in the place of `count` messages that nobody has read, above the status line.
std::string TerminalRemark(std::uint64_t count);

}  // namespace receiver
