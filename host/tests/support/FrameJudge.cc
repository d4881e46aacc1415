#include "support/FrameJudge.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <optional>
#include <string_view>

#include "support/CodedMedia.h"

namespace endtoend {
namespace {

/// The length of an audio frame in seconds.
constexpr double kFrame = 1024.0 / 48000;

std::uint64_t hashOf(const Bytes& bytes) {
    return std::hash<std::string_view>{}({reinterpret_cast<const char*>(bytes.data()), bytes.size()});
}

std::uint64_t hashOf(const CodedPicture& picture) {
    std::uint64_t hash = 0;
    for (const Bytes& unit : picture.nalUnits) {
        hash = hash * 31 + hashOf(unit);
    }
    return hash;
}

/// Numbers of what was sent of which a file holds some.
struct Run {
    std::optional<std::size_t> first;
    std::size_t last = 0;
    std::size_t found = 0;

    void Add(std::size_t number) {
        first = first.value_or(number);
        last = number;
        ++found;
    }
    std::size_t Missing() const { return first ? last - *first + 1 - found : 0; }
};

/// Where a picture stands in a file, and by how much that is later than in what was sent, if it was sent.
struct Shown {
    double time = 0;
    std::optional<double> shift;
};

/// How far an audio frame that stands at `time` is out of step: with the picture that is shown with it or,
/// where a file closes up over a gap, with the one on the other side of the edge. A picture that is not known
/// hides on which side of an edge it stands, so that its neighbours count.
double distanceFrom(const std::vector<Shown>& pictures, double time, double shift) {
    const auto before = [](double at, const Shown& picture) { return at < picture.time; };
    auto first = std::upper_bound(pictures.begin(), pictures.end(), time - kFrame / 2, before);
    auto last = std::upper_bound(first, pictures.end(), time + kFrame * 3 / 2, before);
    first -= first != pictures.begin() ? 1 : 0;
    last += first == last ? 1 : 0;
    while (first != pictures.begin() && !first->shift) {
        --first;
    }
    if (first == last || !first->shift) {
        // In front of the first picture that is known.
        return 0;
    }
    while (last != pictures.end() && !std::prev(last)->shift) {
        ++last;
    }
    double nearest = std::numeric_limits<double>::infinity();
    for (auto picture = first; picture != last; ++picture) {
        nearest = picture->shift ? std::min(nearest, std::abs(shift - *picture->shift)) : nearest;
    }
    return nearest;
}

}  // namespace

FrameJudge::Verdict& FrameJudge::Verdict::operator+=(const Verdict& other) {
    pictures += other.pictures;
    sounds += other.sounds;
    unknownPictures += other.unknownPictures;
    unknownSounds += other.unknownSounds;
    missingPictures += other.missingPictures;
    missingSounds += other.missingSounds;
    outOfStep = std::max(outOfStep, other.outOfStep);
    return *this;
}

void FrameJudge::Medium::Add(std::uint64_t hash, double time) {
    numbers[hash].push_back(times.size());
    times.push_back(time);
}

bool FrameJudge::Medium::Find(std::uint64_t hash, std::size_t& number) {
    const auto found = numbers.find(hash);
    if (found == numbers.end()) {
        return false;
    }
    const auto at = std::lower_bound(found->second.begin(), found->second.end(), next);
    if (at == found->second.end()) {
        return false;
    }
    number = *at;
    next = number + 1;
    return true;
}

void FrameJudge::AddSent(const std::filesystem::path& file) {
    const CodedMedia media = ReadCodedMedia(file);
    for (std::size_t at = 0; at < media.video.size(); ++at) {
        pictures_.Add(hashOf(media.video[at]), media.videoTimes[at]);
    }
    for (std::size_t at = 0; at < media.audio.size(); ++at) {
        sounds_.Add(hashOf(media.audio[at]), media.audioTimes[at]);
    }
}

FrameJudge::Verdict FrameJudge::Judge(const std::filesystem::path& recording) {
    const CodedMedia media = ReadCodedMedia(recording);
    Verdict verdict;
    verdict.pictures = media.video.size();
    verdict.sounds = media.audio.size();
    std::vector<Shown> shown;
    std::size_t number = 0;
    Run run;
    for (std::size_t at = 0; at < media.video.size(); ++at) {
        const double time = media.videoTimes[at];
        shown.push_back({time, std::nullopt});
        if (pictures_.Find(hashOf(media.video[at]), number)) {
            run.Add(number);
            shown.back().shift = time - pictures_.times[number];
        } else {
            ++verdict.unknownPictures;
        }
    }
    // They come in the order of decoding.
    std::sort(shown.begin(), shown.end(), [](const Shown& a, const Shown& b) { return a.time < b.time; });
    const bool comparable = run.found > 0;
    verdict.missingPictures = run.Missing();
    run = {};
    for (std::size_t at = 0; at < media.audio.size(); ++at) {
        if (!sounds_.Find(hashOf(media.audio[at]), number)) {
            ++verdict.unknownSounds;
            continue;
        }
        run.Add(number);
        if (comparable) {
            const double time = media.audioTimes[at];
            verdict.outOfStep =
                std::max(verdict.outOfStep, distanceFrom(shown, time, time - sounds_.times[number]));
        }
    }
    verdict.missingSounds = run.Missing();
    return verdict;
}

}  // namespace endtoend
