#include "damaged/Intact.h"

#include <algorithm>
#include <map>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <utility>

#include "support/Process.h"

namespace endtoend {
namespace {

/// Pictures that fill half a second.
constexpr std::size_t kLongestGap = 12;

/// What one PES packet carries (ISO/IEC 13818-1 2.4.3.6).
struct Unit {
    bool video = false;
    Bytes payload;
};

/// Puts the units of a transport stream together, and leaves out those that are not whole.
class Demultiplexer {
 public:
    explicit Demultiplexer(const Pieces& pieces) {
        for (const Bytes& packet : pieces) {
            if (packet.size() == kPacketSize && packet[0] == 0x47 && PayloadOf(packet) < packet.size()) {
                take(packet, streams_[PidOf(packet)]);
            }
        }
        for (auto& [pid, stream] : streams_) {
            finish(stream);
        }
    }
    const std::vector<Unit>& Units() const { return units_; }

 private:
    struct Stream {
        std::optional<int> counter;
        /// A unit has begun, and all of it has come so far.
        bool whole = false;
        Unit unit;
    };

    void take(const Bytes& packet, Stream& stream) {
        const int counter = packet[3] & 0x0F;
        const bool goesOn = !stream.counter || counter == ((*stream.counter + 1) & 0x0F);
        const bool erroneous = (packet[1] & 0x80) != 0;
        stream.counter = counter;
        stream.whole = stream.whole && goesOn && !erroneous;
        std::size_t at = PayloadOf(packet);
        if (BeginsUnit(packet)) {
            finish(stream);
            const std::size_t header = at + 9;
            const bool media = header <= packet.size() && packet[at] == 0 && packet[at + 1] == 0 &&
                               packet[at + 2] == 1 && packet[at + 3] >= 0xC0 && packet[at + 3] <= 0xEF;
            stream.whole = media && !erroneous;
            stream.unit = {media && packet[at + 3] >= 0xE0, {}};
            at = media ? std::min(header + packet[header - 1], packet.size()) : packet.size();
        }
        stream.unit.payload.insert(stream.unit.payload.end(),
                                   packet.begin() + static_cast<std::ptrdiff_t>(at), packet.end());
    }
    void finish(Stream& stream) {
        if (std::exchange(stream.whole, false) && !stream.unit.payload.empty()) {
            units_.push_back(std::move(stream.unit));
        }
    }

    std::map<int, Stream> streams_;
    std::vector<Unit> units_;
};

/// The AAC frames of a unit by their ADTS headers (ISO/IEC 13818-7 6.2), up to what is none.
std::vector<Bytes> splitSounds(const Bytes& payload) {
    std::vector<Bytes> frames;
    for (std::size_t at = 0;
         at + 7 <= payload.size() && payload[at] == 0xFF && (payload[at + 1] & 0xF6) == 0xF0;) {
        const std::size_t length = static_cast<std::size_t>(payload[at + 3] & 3) << 11 |
                                   static_cast<std::size_t>(payload[at + 4]) << 3 | payload[at + 5] >> 5;
        if (length < 7 || length > payload.size() - at) {
            break;
        }
        frames.emplace_back(payload.begin() + static_cast<std::ptrdiff_t>(at),
                            payload.begin() + static_cast<std::ptrdiff_t>(at + length));
        at += length;
    }
    return frames;
}

/// The pictures, or the audio frames, of a transport stream.
std::vector<Bytes> framesOf(const Demultiplexer& stream, bool video) {
    std::vector<Bytes> frames;
    for (const Unit& unit : stream.Units()) {
        if (unit.video != video) {
            continue;
        }
        for (Bytes& frame : video ? std::vector<Bytes>{unit.payload} : splitSounds(unit.payload)) {
            frames.push_back(std::move(frame));
        }
    }
    return frames;
}

std::set<std::size_t> found(const std::vector<Bytes>& sent, const std::vector<Bytes>& damaged) {
    std::map<Bytes, std::size_t> numbers;
    for (std::size_t number = 0; number < sent.size(); ++number) {
        numbers.emplace(sent[number], number);
    }
    std::set<std::size_t> intact;
    for (const Bytes& frame : damaged) {
        if (const auto at = numbers.find(frame); at != numbers.end()) {
            intact.insert(at->second);
        }
    }
    return intact;
}

}  // namespace

Intact IntactOf(const Pieces& sent, const Pieces& damaged) {
    const Demultiplexer before(sent);
    const Demultiplexer after(damaged);
    return {found(framesOf(before, true), framesOf(after, true)),
            found(framesOf(before, false), framesOf(after, false))};
}

Intact IntactOf(const std::filesystem::path& file, const Bytes& sent, const Bytes& damaged) {
    // The place of each byte that is another one or missing.
    std::set<std::size_t> touched;
    for (std::size_t at = 0; at < sent.size(); ++at) {
        if (at >= damaged.size() || sent[at] != damaged[at]) {
            touched.insert(at);
        }
    }
    // A packet stands there with its header in front, if there is one.
    constexpr std::size_t kHeader = 20;
    const Outcome outcome = RunProgram({"ffprobe", "-v", "error", "-show_entries",
                                        "packet=codec_type,size,pos", "-of", "csv=p=0", file.string()});
    Intact intact;
    std::size_t pictures = 0;
    std::size_t sounds = 0;
    std::istringstream lines(outcome.output);
    for (std::string line; std::getline(lines, line);) {
        std::istringstream fields(line);
        std::string medium;
        std::size_t size = 0;
        std::size_t place = 0;
        char comma = 0;
        if (!std::getline(fields, medium, ',') || !(fields >> size >> comma >> place)) {
            continue;
        }
        const bool video = medium == "video";
        const std::size_t number = video ? pictures++ : sounds++;
        const auto next = touched.lower_bound(place);
        if (next == touched.end() || *next >= place + size + kHeader) {
            (video ? intact.pictures : intact.sounds).insert(number);
        }
    }
    if (pictures == 0) {
        throw std::runtime_error("ffprobe: " + outcome.errors);
    }
    return intact;
}

Owed OwedOf(const Intact& intact, const CodedMedia& sent) {
    Owed owed;
    std::vector<std::pair<double, double>> spans;
    std::optional<std::size_t> last;
    for (const std::size_t number : intact.pictures) {
        const bool goesOn = last && number - *last - 1 <= kLongestGap;
        if (!goesOn && !sent.video.at(number).idr) {
            continue;
        }
        const double begin = sent.videoTimes.at(number);
        if (last && number == *last + 1) {
            spans.back().second = begin + kPicture;
        } else {
            spans.emplace_back(begin, begin + kPicture);
        }
        last = number;
        ++owed.pictures;
    }
    for (const std::size_t number : intact.sounds) {
        const double begin = sent.audioTimes.at(number);
        owed.sounds += std::any_of(spans.begin(), spans.end(), [begin](const auto& span) {
            return begin >= span.first + kSound && begin + kSound <= span.second - kSound;
        });
    }
    return owed;
}

}  // namespace endtoend
