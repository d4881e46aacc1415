#pragma once

#include <cstddef>

#include "display/TextDisplay.h"

namespace receiver {

/// The status line: what the receiver does at this moment, in at most `width` columns.
std::string StatusLine(const Snapshot& snapshot, std::size_t width);

/// Text for people in front of a terminal: the lines of `TextDisplay` above one status line that is drawn
/// over and over.
class TerminalDisplay final : public TextDisplay {
 public:
    /// `descriptor` is the terminal behind `messages`; its width is asked for at each drawing.
    TerminalDisplay(std::ostream& messages, std::ostream& results, int descriptor)
        : TextDisplay(messages, results), descriptor_(descriptor) {}

    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 protected:
    void Line(const std::string& text) override;

 private:
    void Draw(const std::string& text);

    const int descriptor_;
    std::string line_;
};

}  // namespace receiver
