#include "source/AudioRuns.h"

#include <algorithm>
#include <utility>

#include "source/AudioFrames.h"
#include "timing/Timeline.h"

namespace receiver {
namespace {

/// A unit of a transport stream that ends somewhere: 64 KiB of the shortest frames there are would be more.
constexpr std::size_t kLongestRun = 256;
/// The sound that waits for a stamp, in ticks of 90000. Senders put 0.1 to 0.35 s into a unit.
constexpr std::int64_t kLongestHold = 36000;
/// How far pictures may be ahead of the sound that waits: further than senders' buffers make of it, less than
/// what waits for both media is waited for.
constexpr std::int64_t kLongestPause = 90000;

bool IsMarked(const AVPacket& packet) {
    return (packet.flags & AV_PKT_FLAG_CORRUPT) != 0;
}

}  // namespace

Packets AudioRuns::Put(libav::Owner<AVPacket> packet, AVCodecID codec, AVRational base) {
    codec_ = codec;
    base_ = base;
    Packets passing;
    tellsLengths_ = tellsLengths_ || IsWholeAudioFrame(codec, *packet);
    if (!tellsLengths_) {
        if (IsMarked(*packet)) {
            ++damaged_;
        } else {
            passing.push_back(std::move(packet));
        }
        return passing;
    }
    const bool stamped = HasStamp(*packet);
    position_ = stamped ? packet->pos : position_;
    if (!run_.empty() && (stamped || run_.size() >= kLongestRun || Held() >= kLongestHold)) {
        passing = Close(stamped ? std::optional(packet->pts) : std::nullopt);
    }
    const bool held = stamped || !run_.empty() || IsMarked(*packet);
    (held ? run_ : passing).push_back(std::move(packet));
    return passing;
}

Packets AudioRuns::Expire(std::int64_t stamp, AVRational base) {
    if (run_.empty() || run_.back()->pts == AV_NOPTS_VALUE) {
        return {};
    }
    const std::int64_t end = av_rescale_q(run_.back()->pts, base_, kTicks);
    const bool waits = av_rescale_q(stamp, base, kTicks) - end <= kLongestPause;
    return waits ? Packets{} : Close(std::nullopt);
}

Packets AudioRuns::Finish() {
    return Close(std::nullopt);
}

std::int64_t AudioRuns::Held() const {
    std::int64_t length = 0;
    for (const auto& packet : run_) {
        length += packet->duration;
    }
    return av_rescale_q(length, base_, kTicks);
}

bool AudioRuns::HasStamp(const AVPacket& packet) const {
    // What was lost may make one unit of two, which then has one position and is given out in parts.
    return packet.pos >= 0 && packet.pos != position_ && packet.pts != AV_NOPTS_VALUE;
}

Packets AudioRuns::Close(std::optional<std::int64_t> next) {
    Packets run = std::exchange(run_, {});
    const bool marked =
        std::any_of(run.begin(), run.end(), [](const auto& packet) { return IsMarked(*packet); });
    const bool frames = !run.empty() && std::all_of(run.begin(), run.end(), [this](const auto& packet) {
        return IsWholeAudioFrame(codec_, *packet);
    });
    const Length length = next && !run.empty() ? Measure(run, *next) : Length::kUnknown;
    // A mark may be for what was lost in front of the run, and frames may be missing behind it: where the
    // loss is inside, bytes are left over that are no frame, and may take the first frames of the next run
    // with them.
    const bool behind = std::exchange(behindDamage_, marked || !frames);
    const bool whole =
        marked ? frames && length == Length::kFull : length != Length::kShort || (frames && !behind);
    if (!whole) {
        damaged_ += run.size();
        run.clear();
    }
    return run;
}

AudioRuns::Length AudioRuns::Measure(const Packets& run, std::int64_t next) const {
    std::int64_t length = 0;
    for (const auto& packet : run) {
        if (packet->duration <= 0) {
            return Length::kUnknown;
        }
        length += packet->duration;
    }
    const std::int64_t distance = next - run.front()->pts;
    const std::int64_t missing = distance - length;
    const std::int64_t tolerance = run.front()->duration / 2;
    // A clock that is set tells nothing of what is missing.
    if (distance <= 0 || av_rescale_q(missing, base_, kTicks) > Timeline::kLongestGap) {
        return Length::kUnknown;
    }
    if (missing > tolerance) {
        return Length::kShort;
    }
    return missing >= -tolerance ? Length::kFull : Length::kUnknown;
}

}  // namespace receiver
