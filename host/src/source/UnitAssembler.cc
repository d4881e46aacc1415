#include "source/UnitAssembler.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "source/AudioEncoder.h"

namespace receiver {
namespace {

/// How far audio may lag behind the pictures before silence stands in for it, in ticks of 90000. More than
/// multiplexers make of it, less than the recorder's caches hold.
constexpr std::int64_t kLongestLag = std::int64_t{3} * 90000;
/// Units that may wait for a picture.
constexpr std::size_t kLongestHold = 2000;
/// Frames of silence at the end of a stream that are no gap: half a second.
constexpr std::uint64_t kLongestSilentEnd = 24;
/// Losses are told not more often than this, in ticks.
constexpr std::int64_t kReportEvery = std::int64_t{10} * 90000;

constexpr std::int64_t ToAudio(std::int64_t ticks) {
    return ticks * 8 / 15;
}
constexpr std::int64_t FromAudio(std::int64_t samples) {
    return samples * 15 / 8;
}

std::string Count(std::uint64_t count, const char* what) {
    return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

}  // namespace

UnitAssembler::UnitAssembler(const FrameRate& rate) : rate_(rate), grid_(rate), silence_(SilentFrame()) {}

void UnitAssembler::Begin(bool audio) {
    audio_ = audio;
    resumed_ = true;
    audioBegun_ = false;
    audioGrid_.Rejoin();
    // What still waits was sent for pictures that do not come any more.
    heldAudio_.clear();
    heldKlv_.clear();
}

std::int64_t UnitAssembler::Resume(const FrameRate& rate, std::int64_t time) {
    const std::int64_t begin = grid_.PlaceOf(time);
    if (rate == rate_) {
        return begin;
    }
    const std::int64_t end = grid_.End();
    if (begin > end) {
        audioGrid_.AddVideoGap(ToAudio(end), ToAudio(begin) - ToAudio(end));
    }
    rate_ = rate;
    grid_ = FrameGrid(rate, begin);
    // An address counts frames of the rate before.
    addressedFrame_.reset();
    return begin;
}

void UnitAssembler::SetArrival(std::int64_t time, SourceUnit::Clock::time_point arrived) {
    origin_ = arrived - std::chrono::microseconds(time * 100 / 9);
}

std::optional<SourceUnit::Clock::time_point> UnitAssembler::ArrivalOf(std::int64_t time) const {
    return origin_ ? std::optional(*origin_ + std::chrono::microseconds(time * 100 / 9)) : std::nullopt;
}

void UnitAssembler::SetTimecode(const Timecode& timecode) {
    nextTimecode_ = timecode;
}

std::optional<Timecode> UnitAssembler::TimecodeOfFrame(std::int64_t index, const CodedPicture& picture) {
    const std::optional<Timecode> told = picture.timecode ? picture.timecode : nextTimecode_;
    nextTimecode_.reset();
    if (told) {
        Timecode address = *told;
        // Drop frame is a rule of 30 and 60 frames a second.
        address.dropFrame = address.dropFrame && rate_.timecodeFrames % 30 == 0;
        if (IsValid(address, rate_.timecodeFrames)) {
            addressedFrame_ = index;
            address_ = FrameNumberOf(address, rate_.timecodeFrames);
            dropFrame_ = address.dropFrame;
        }
    }
    if (!addressedFrame_) {
        return std::nullopt;
    }
    return TimecodeOf(address_ + index - *addressedFrame_, rate_.timecodeFrames, dropFrame_);
}

void UnitAssembler::AddPicture(const CodedPicture& picture) {
    const std::int64_t expected = grid_.End();
    const FrameGrid::Place place = grid_.Next(picture.time);
    if (place.lost > 0) {
        audioGrid_.AddVideoGap(ToAudio(expected), ToAudio(place.time) - ToAudio(expected),
                               place.time - lastPicture_ > kLongestStep);
        if (!resumed_) {
            lostFrames_ += static_cast<std::uint64_t>(place.lost);
            tally_.lost += static_cast<std::uint64_t>(place.lost);
        }
    }
    resumed_ = false;
    lastPicture_ = place.time;
    Release(place.time);
    MakeSilence(place.time);
    batch_.emplace_back(SourceUnit{Medium::kVideo, place.time, picture.data, picture.size, picture.keyFrame,
                                   TimecodeOfFrame(place.index, picture), ArrivalOf(place.time)});
    // A picture is shown in the place of another one.
    std::get<SourceUnit>(batch_.back()).later =
        grid_.TimeOf(place.index + grid_.FramesIn(picture.later)) - place.time;
    Report();
}

void UnitAssembler::Release(std::int64_t time) {
    while (!heldAudio_.empty() && FromAudio(heldAudio_.front().time) <= time) {
        PlaceAudio(heldAudio_.front());
        heldAudio_.pop_front();
    }
    while (!heldKlv_.empty() && heldKlv_.front().time <= time) {
        EmitKlv(heldKlv_.front());
        heldKlv_.pop_front();
    }
}

void UnitAssembler::AddAudio(const CodedAudio& audio) {
    // Whether video is missing at the time of a frame is known once the pictures have got there.
    if (heldAudio_.empty() && FromAudio(audio.time) <= lastPicture_) {
        PlaceAudio(audio);
        return;
    }
    heldAudio_.push_back(audio);
    if (heldAudio_.size() > kLongestHold) {
        heldAudio_.pop_front();
    }
}

void UnitAssembler::PlaceAudio(const CodedAudio& audio) {
    if (audio.time < AudioGrid::kEarliest) {
        return;
    }
    for (;;) {
        const AudioGrid::Place place = audioGrid_.Next(audio.time);
        switch (place.action) {
            case AudioGrid::Action::kFill:
                EmitSilence(place.time);
                // That audio begins behind the picture is no gap.
                if (audioBegun_) {
                    CountSilence();
                }
                continue;
            case AudioGrid::Action::kAccept:
                audioBegun_ = true;
                if (audio.filled) {
                    CountSilence();
                }
                EmitAudio(place.time, audio);
                return;
            case AudioGrid::Action::kOverlap:
                ++tally_.overlapping;
                return;
            case AudioGrid::Action::kVideoMissing:
                ++tally_.leftOut;
                return;
        }
    }
}

void UnitAssembler::EmitAudio(std::int64_t time, const CodedAudio& audio) {
    SourceUnit unit{Medium::kAudio, time, audio.data, audio.size, false, std::nullopt};
    unit.passed = audioGrid_.TakePassed();
    batch_.emplace_back(std::move(unit));
}

void UnitAssembler::EmitSilence(std::int64_t time) {
    EmitAudio(time, silence_);
}

void UnitAssembler::CountSilence() {
    ++tally_.filled;
    ++silentFrames_;
}

void UnitAssembler::MakeSilence(std::int64_t time) {
    const std::int64_t limit = ToAudio(audio_ ? time - kLongestLag : time);
    while (heldAudio_.empty() && audioGrid_.End() <= limit) {
        EmitSilence(audioGrid_.Append());
        if (audio_) {
            CountSilence();
        }
    }
}

void UnitAssembler::AddKlv(const std::string& packet, std::optional<std::int64_t> time) {
    const Klv klv{packet, std::max<std::int64_t>(0, time.value_or(lastPicture_))};
    if (heldKlv_.empty() && klv.time <= lastPicture_) {
        EmitKlv(klv);
        return;
    }
    heldKlv_.push_back(klv);
    if (heldKlv_.size() > kLongestHold) {
        EmitKlv(heldKlv_.front());
        heldKlv_.pop_front();
    }
}

void UnitAssembler::EmitKlv(const Klv& klv) {
    lastKlv_ = std::max(lastKlv_, klv.time);
    const std::shared_ptr<unsigned char> data(new unsigned char[klv.packet.size()],
                                              std::default_delete<unsigned char[]>());
    std::memcpy(data.get(), klv.packet.data(), klv.packet.size());
    batch_.emplace_back(SourceUnit{Medium::kKlv, lastKlv_, data, klv.packet.size(), false, std::nullopt});
}

void UnitAssembler::Finish() {
    // A last frame of audio may begin with the end of the pictures: they may all lie half a frame later.
    const std::int64_t end = grid_.End();
    Release(end);
    // A picture whose audio is missing would not be recorded.
    std::uint64_t silent = 0;
    for (; lastPicture_ >= 0 && audioGrid_.End() <= ToAudio(end); ++silent) {
        EmitSilence(audioGrid_.Append());
    }
    // The last sound of a stream often ends a little before its last picture.
    if (audioBegun_ && silent > kLongestSilentEnd) {
        tally_.filled += silent;
        silentFrames_ += silent;
    }
    CountMissingEnd(end);
    TellGaps();
}

void UnitAssembler::CountMissingEnd(std::int64_t end) {
    const std::int64_t left = heldAudio_.empty() ? 0 : FromAudio(heldAudio_.back().time) - end;
    if (lastPicture_ < 0 || left < kLongestLag) {
        return;
    }
    const auto frames = static_cast<std::uint64_t>(grid_.FramesIn(left));
    lostFrames_ += frames;
    AddNotice("the pictures ended " + std::to_string((left + kVideoClock / 2) / kVideoClock) +
              " s before the sound, which is left out: " + Count(frames, "video frame") + " lost");
}

void UnitAssembler::Report() {
    if (!lastReport_ || lastPicture_ - *lastReport_ >= kReportEvery) {
        TellGaps();
    }
}

void UnitAssembler::TellGaps() {
    if (tally_.lost + tally_.filled + tally_.overlapping + tally_.leftOut == 0) {
        return;
    }
    std::string sentence;
    const auto add = [&sentence](std::uint64_t count, const char* what, const char* end) {
        if (count > 0) {
            sentence += (sentence.empty() ? "" : ", ") + Count(count, what) + end;
        }
    };
    add(tally_.lost, "video frame", " lost");
    add(tally_.leftOut, "audio frame", " left out with them");
    add(tally_.filled, "audio frame", " missing and filled with silence");
    add(tally_.overlapping, "audio frame", " left out that overlapped");
    AddNotice("the source has gaps: " + sentence);
    tally_ = {};
    lastReport_ = lastPicture_;
}

Batch UnitAssembler::Take() {
    return std::exchange(batch_, {});
}

}  // namespace receiver
