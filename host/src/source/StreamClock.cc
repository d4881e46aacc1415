#include "source/StreamClock.h"

#include <algorithm>
#include <string>
#include <utility>

#include "timing/Saturating.h"

namespace receiver {
namespace {

using Clock = std::chrono::steady_clock;

/// How far behind the expected time reordered pictures may stand.
constexpr std::int64_t kBackReordered = 90000;
/// And what comes in the order of time, whose stamps merely jitter: this, or three units.
constexpr std::int64_t kBack = 13500;

/// Stamps that are compared with: that of the picture before, and as many audio frames as are mostly sent
/// together, of which the first one alone is stamped by the sender.
constexpr std::size_t kRecentPictures = 1;
constexpr std::size_t kRecentSounds = 16;

/// How far behind the expected time a unit of `usual` ticks may stand.
std::int64_t Back(std::int64_t usual) {
    return std::max(3 * usual, kBack);
}

bool Near(std::int64_t a, std::int64_t b) {
    return Distance(a, b) <= static_cast<std::uint64_t>(Timeline::kLongestGap);
}

}  // namespace

StreamClock::StreamClock(const AVStream& video, const AVStream* audio, bool recorded, bool reordered)
    : recorded_(recorded), video_{&video} {
    video_.reordered = reordered;
    if (audio != nullptr) {
        audio_ = Track{audio};
    }
}

void StreamClock::Begin(std::int64_t begin, NoticeSink tell) {
    begin_ = begin;
    tell_ = std::move(tell);
}

void StreamClock::Anchor(std::int64_t stamp, std::int64_t delay) {
    line_.Anchor(stamp, begin_);
    video_.expected = begin_ - delay;
    if (audio_) {
        audio_->expected = begin_;
    }
}

std::optional<std::int64_t> StreamClock::StampOf(Track& track, const AVPacket& packet) {
    const std::int64_t raw = packet.pts != AV_NOPTS_VALUE && !track.reordered ? packet.pts : packet.dts;
    if (raw == AV_NOPTS_VALUE) {
        return std::nullopt;
    }
    const AVRational base = track.stream->time_base;
    if (!track.last) {
        track.last = reference_ ? av_rescale_q(*reference_, kTicks, base) : raw;
    }
    track.last = UnwrapNear(raw, track.stream->pts_wrap_bits, *track.last);
    const std::int64_t stamp = av_rescale_q(*track.last, base, kTicks);
    reference_ = stamp;
    return stamp;
}

std::optional<std::int64_t> StreamClock::VideoStamp(const AVPacket& packet) {
    return NewStampOf(video_, packet, kRecentPictures);
}

std::optional<std::int64_t> StreamClock::AudioStamp(const AVPacket& packet) {
    return NewStampOf(*audio_, packet, kRecentSounds);
}

std::optional<std::int64_t> StreamClock::NewStampOf(Track& track, const AVPacket& packet, std::size_t kept) {
    const auto stamp = StampOf(track, packet);
    const auto& recent = track.recent;
    if (!stamp) {
        return std::nullopt;
    }
    // Two units with one stamp are what a damaged packet leaves.
    const bool twice = !recent.empty() && recent.back() == *stamp && !track.stands;
    track.stands = std::find(recent.begin(), recent.end(), *stamp) != recent.end();
    if (track.stands) {
        return twice ? stamp : std::nullopt;
    }
    track.recent.push_back(*stamp);
    if (track.recent.size() > kept) {
        track.recent.pop_front();
    }
    return stamp;
}

std::int64_t StreamClock::Elapsed(Track& track, std::int64_t usual) const {
    const auto now = Clock::now();
    const auto since = std::exchange(track.arrived, now);
    if (recorded_ || since == Clock::time_point()) {
        return 0;
    }
    const auto ticks = std::chrono::duration_cast<std::chrono::microseconds>(now - since).count() * 9 / 100;
    return std::max<std::int64_t>(0, ticks - usual);
}

std::optional<StreamClock::Offset> StreamClock::OffsetOf(StepWatch::Medium medium, const AVPacket& packet) {
    Track& track = TrackOf(medium);
    const bool joined = medium == StepWatch::Medium::kVideo || joined_;
    const auto stamp = joined ? StampOf(track, packet) : std::nullopt;
    if (!stamp) {
        return std::nullopt;
    }
    return Offset{track.expected, SaturatingSubtract(line_.Nearest(*stamp, track.expected), track.expected)};
}

bool StreamClock::HasPaused(StepWatch::Medium medium, std::int64_t ticks) const {
    const auto arrived = (medium == StepWatch::Medium::kVideo ? video_ : *audio_).arrived;
    return arrived != Clock::time_point() &&
           Clock::now() - arrived > std::chrono::microseconds(ticks * 100 / 9) * 3 / 4;
}

void StreamClock::StepForward(std::int64_t ticks) {
    line_.Step(ticks, std::max(video_.expected, audio_->expected));
    TellJump(ticks);
}

void StreamClock::TellJump(std::int64_t ticks) const {
    tell_("the source's clock jumped by " + std::to_string(ticks / 90) +
          " ms; the recording goes on without the jump");
}

void StreamClock::FindStep(Track& track, std::int64_t stamp) {
    if (!audio_) {
        return;
    }
    const bool video = &track == &video_;
    const std::int64_t distance = SaturatingSubtract(line_.Nearest(stamp, track.expected), track.expected);
    const auto step =
        steps_.Look(video ? StepWatch::Medium::kVideo : StepWatch::Medium::kAudio, track.expected, distance);
    if (!step) {
        return;
    }
    // The other medium has followed the step and returns to where it had been expected.
    Track& other = video ? *audio_ : video_;
    other.expected = SaturatingSubtract(other.expected, *step);
    line_.Step(*step, track.expected);
    TellJump(*step);
}

std::int64_t StreamClock::TimeOf(Track& track, std::int64_t stamp, std::int64_t usual, std::int64_t back) {
    const Timeline::Place place = line_.TimeOf(stamp, track.expected, Elapsed(track, usual), back);
    if (place.jump != 0) {
        TellJump(place.jump);
    }
    track.expected = place.time + usual;
    return place.time;
}

std::int64_t StreamClock::VideoTime(std::optional<std::int64_t> stamp, std::int64_t usual, bool reordered) {
    if (!stamp) {
        return std::exchange(video_.expected, video_.expected + usual);
    }
    if (!reordered) {
        FindStep(video_, *stamp);
    }
    return TimeOf(video_, *stamp, usual, reordered ? kBackReordered : Back(usual));
}

std::int64_t StreamClock::VideoTime(std::optional<std::int64_t> stamp, const FrameGrid& grid) {
    const std::int64_t period = grid.Period();
    const std::int64_t expected = video_.expected;
    const std::int64_t time = VideoTime(stamp, period, false);
    if (time - expected < period / 2) {
        return time;
    }
    const std::int64_t place = grid.PlaceOf(time - period / 2);
    const std::int64_t off = time - place;
    if (off < period / 4 || off > period * 3 / 4) {
        return time;
    }
    line_.Step(off, place);
    video_.expected -= off;
    // Audio that has passed the gap before.
    if (audio_ && audio_->expected > expected + (time - expected) / 2) {
        audio_->expected -= off;
    }
    return place;
}

std::int64_t StreamClock::AudioTime(std::optional<std::int64_t> stamp, std::int64_t usual, bool waited) {
    // Of several frames behind one stamp each further one begins where the one before ends.
    if (!stamp) {
        return std::exchange(audio_->expected, audio_->expected + usual);
    }
    if (!joined_) {
        return JoinAudio(*stamp, usual, waited);
    }
    FindStep(*audio_, *stamp);
    return TimeOf(*audio_, *stamp, usual, Back(usual));
}

std::int64_t StreamClock::JoinAudio(std::int64_t stamp, std::int64_t usual, bool waited) {
    const std::int64_t time = line_.Nearest(stamp, begin_);
    // The sound of pictures in front of the first IDR frame, however many these were. On another clock than
    // that of the IDR frame it belongs to pictures before it as well.
    const bool before = time < begin_ - usual / 2;
    if (waited ? before || !Near(time, begin_) : before && Near(time, begin_)) {
        audio_->expected = std::min(time + usual, begin_);
        return std::min(time, begin_ - usual);
    }
    joined_ = true;
    // Audio may begin at any time of the pictures.
    if (Near(time, video_.expected)) {
        audio_->expected = time;
    }
    return TimeOf(*audio_, stamp, usual, Back(usual));
}

std::optional<std::int64_t> StreamClock::TimeNear(std::int64_t stamp, std::int64_t time) const {
    const std::int64_t found = line_.Nearest(stamp, time);
    return Near(found, time) ? std::optional(found) : std::nullopt;
}

}  // namespace receiver
