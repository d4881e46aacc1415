#include "display/TerminalDisplay.h"

#include <sys/ioctl.h>

#include <array>
#include <cstdio>

#include "display/StatusWords.h"

namespace receiver {
namespace {

constexpr std::size_t kDefaultWidth = 80;
/// Back to the first column, and clear the line.
constexpr const char* kClear = "\r\033[K";

std::string Rates(const Snapshot& snapshot) {
    std::array<char, 96> text{};
    std::snprintf(text.data(), text.size(), "%.2f fps %.1f Mb/s + %.0f kb/s", snapshot.framesPerSecond,
                  snapshot.videoKilobits / 1000, snapshot.audioKilobits);
    return text.data();
}

/// The last two parts of a path tell it from others; the folders before them are the same for all.
std::string Shortened(const std::string& path) {
    const std::size_t last = path.rfind('/');
    const std::size_t before = last == std::string::npos || last == 0 ? last : path.rfind('/', last - 1);
    return before == std::string::npos ? path : path.substr(before + 1);
}

std::size_t WidthOf(int descriptor) {
    winsize size{};
    return ioctl(descriptor, TIOCGWINSZ, &size) == 0 && size.ws_col > 0 ? size.ws_col : kDefaultWidth;
}

}  // namespace

std::string StatusLine(const Snapshot& snapshot, std::size_t width) {
    std::string line = snapshot.recording ? "REC " : snapshot.waiting ? "WAIT" : "    ";
    line += " " + (snapshot.timecode ? ToString(*snapshot.timecode) : "--:--:--:--");
    line += " | " + StatusWords(snapshot.status);
    if (snapshot.lost != 0) {
        line += " | LOST " + std::to_string(snapshot.lost);
    }
    line += " | " + (snapshot.file.empty() ? "no file" : Shortened(snapshot.file));
    line += " | " + Rates(snapshot);
    if (snapshot.klvPackets != 0) {
        line += " | KLV " + std::to_string(snapshot.klvPackets);
    }
    if (snapshot.freeBytes) {
        line += " | " + FormatBytes(*snapshot.freeBytes) + " free";
    }
    if (snapshot.syncTime) {
        line += " | sync " + std::to_string(snapshot.syncTime->count()) + " ms";
    }
    if (line.size() > width) {
        line.resize(width);
    }
    return line;
}

std::string TerminalRemark(std::uint64_t count) {
    return kClear + TextRemark(count);
}

void TerminalDisplay::Draw(const std::string& text) {
    Messages() << kClear << text << std::flush;
}

void TerminalDisplay::Line(const std::string& text) {
    Messages() << kClear << text << '\n' << line_ << std::flush;
}

void TerminalDisplay::Show(const Snapshot& snapshot) {
    TextDisplay::Show(snapshot);
    if (busy_ && busy_()) {
        return;
    }
    // The last column stays free: a terminal would begin a new line there.
    const std::string line = StatusLine(snapshot, WidthOf(descriptor_) - 1);
    if (line != line_) {
        line_ = line;
        Draw(line_);
    }
}

void TerminalDisplay::Finish(const Summary& summary) {
    line_.clear();
    Draw(line_);
    TextDisplay::Finish(summary);
}

}  // namespace receiver
