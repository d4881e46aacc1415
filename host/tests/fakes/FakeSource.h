#pragma once

#include <atomic>
#include <cstring>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "source/SourceInterface.h"

namespace receiver {

inline std::shared_ptr<unsigned char> SharedBytes(const std::vector<unsigned char>& bytes) {
    std::shared_ptr<unsigned char> data(new unsigned char[bytes.size()],
                                        std::default_delete<unsigned char[]>());
    std::memcpy(data.get(), bytes.data(), bytes.size());
    return data;
}

inline SourceUnit MakeSourceUnit(Medium medium, std::int64_t time, const std::vector<unsigned char>& bytes) {
    SourceUnit unit;
    unit.medium = medium;
    unit.time = time;
    unit.data = SharedBytes(bytes);
    unit.size = bytes.size();
    return unit;
}

/// An IDR frame with both parameter sets (baseline profile, level 3.0, both identifiers 0) or a frame that
/// refers to it; `number` stands in the last bytes, so that no two frames are alike.
inline SourceUnit MakeFrame(std::int64_t time, bool keyFrame, std::uint32_t number) {
    std::vector<unsigned char> bytes;
    if (keyFrame) {
        bytes = {0, 0, 0, 1, 0x67, 0x42, 0xC0, 0x1E, 0x95, 0xA0,  // sequence parameter set
                 0, 0, 0, 1, 0x68, 0xCE, 0x3C, 0x80,              // picture parameter set
                 0, 0, 0, 1, 0x65, 0x88, 0x84, 0x21};             // IDR slice, first_mb_in_slice 0
    } else {
        bytes = {0, 0, 0, 1, 0x41, 0x9A, 0x21, 0x55};
    }
    for (int shift = 24; shift >= 0; shift -= 8) {
        bytes.push_back(static_cast<unsigned char>(0x80 | (number >> shift & 0x7F)));
    }
    SourceUnit unit = MakeSourceUnit(Medium::kVideo, time, bytes);
    unit.keyFrame = keyFrame;
    return unit;
}

/// An AAC LC frame at 48 kHz, stereo, with its ADTS header (ISO/IEC 14496-3 1.A.2), 9 bytes long.
inline SourceUnit MakeAudio(std::int64_t time) {
    return MakeSourceUnit(Medium::kAudio, time, {0xFF, 0xF1, 0x4C, 0x80, 0x01, 0x3F, 0xFC, 0x21, 0x10});
}

/// Twenty-five frames a second with an IDR frame in each second, and audio; KLV where a test adds it.
class FakeSource final : public SourceInterface {
 public:
    static constexpr std::int64_t kFrame = 3600;
    static constexpr std::int64_t kGroup = 25;

    explicit FakeSource(std::int64_t frames) {
        description_.frameRate = ParseFrameRate("25").value();
        description_.width = 320;
        description_.height = 180;
        description_.bitrate = 500;
        description_.summary = "a source of the tests";
        std::int64_t audio = 0;
        for (std::int64_t frame = 0; frame < frames; ++frame) {
            units_.push_back(
                MakeFrame(frame * kFrame, frame % kGroup == 0, static_cast<std::uint32_t>(frame)));
            for (; audio * kVideoClock < (frame + 1) * kFrame * kAudioClock; audio += 1024) {
                units_.push_back(MakeAudio(audio));
            }
        }
    }

    const SourceDescription& Description() const override { return description_; }
    Result Read(SourceUnit& unit) override {
        if (stopped_) {
            return Result::kStopped;
        }
        if (before_) {
            before_(read_);
        }
        if (change_ && change_->first == read_) {
            description_ = std::exchange(change_, {})->second;
            return Result::kChanged;
        }
        if (units_.empty()) {
            return endless_ ? Result::kIdle : Result::kEnd;
        }
        unit = std::move(units_.front());
        units_.pop_front();
        ++read_;
        return Result::kUnit;
    }
    SourceCounts Counts() const override { return counts_; }
    void Stop() override { stopped_ = true; }

    std::deque<SourceUnit>& Units() { return units_; }
    SourceDescription& ChangeDescription() { return description_; }
    /// Called before each unit with the number of units read so far.
    void Before(std::function<void(std::size_t)> hook) { before_ = std::move(hook); }
    /// The source is another one behind `read` units.
    void ChangeBehind(std::size_t read, const SourceDescription& description) {
        change_.emplace(read, description);
    }
    /// Idle at the end instead of over.
    void MakeEndless() { endless_ = true; }
    SourceCounts& ChangeCounts() { return counts_; }

 private:
    SourceDescription description_;
    SourceCounts counts_;
    std::deque<SourceUnit> units_;
    std::function<void(std::size_t)> before_;
    std::optional<std::pair<std::size_t, SourceDescription>> change_;
    std::size_t read_ = 0;
    bool endless_ = false;
    std::atomic<bool> stopped_{false};
};

}  // namespace receiver
