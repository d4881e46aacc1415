#include "source/FirstStamp.h"

#include <algorithm>
#include <optional>
#include <vector>

#include "source/CodedUnits.h"
#include "timing/Saturating.h"

namespace receiver {
namespace {

/// Pictures whose stamps tell where the first one should stand.
constexpr std::size_t kWitnesses = 4;
/// What senders put into one unit of sound at the most, in ticks: as much may be missing between two packets.
constexpr std::int64_t kSoundUnit = 45000;
/// So many pictures back it may be one that is sent before those that are shown before it.
constexpr std::int64_t kLongestReorder = kMostReorderFrames;

/// The pictures at the beginning, as many as tell where the first one should stand, or none.
std::vector<AVPacket*> Witnesses(const Packets& packets, const AVStream& video) {
    std::vector<AVPacket*> pictures;
    for (const auto& packet : packets) {
        if (packet->stream_index == video.index && pictures.size() <= kWitnesses) {
            pictures.push_back(packet.get());
        }
    }
    const bool told = std::all_of(pictures.begin(), pictures.end(), [](const AVPacket* picture) {
        return picture->pts != AV_NOPTS_VALUE && (picture->flags & AV_PKT_FLAG_CORRUPT) == 0;
    });
    return told && pictures.size() > kWitnesses ? pictures : std::vector<AVPacket*>();
}

/// The distance of the pictures behind the first one, nothing where these do not agree.
std::optional<std::int64_t> PeriodOf(const std::vector<AVPacket*>& pictures) {
    const std::int64_t span = SaturatingSubtract(pictures[kWitnesses]->pts, pictures[1]->pts);
    const std::int64_t period = span / static_cast<std::int64_t>(kWitnesses - 1);
    if (period <= 0) {
        return std::nullopt;
    }
    for (std::size_t at = 1; at < kWitnesses; ++at) {
        const std::int64_t step = SaturatingSubtract(pictures[at + 1]->pts, pictures[at]->pts);
        if (Distance(step, period) > static_cast<std::uint64_t>(period / 2)) {
            return std::nullopt;
        }
    }
    return period;
}

/// How far the sound goes on up to what is read right behind `picture`, in ticks of 90000. Nothing where
/// there is none. The first picture of a transport stream is read when the second one begins, and what was
/// sent between the two comes before both.
std::optional<std::int64_t> SoundUntil(const Packets& packets, const AVStream& audio,
                                       const AVPacket& picture) {
    std::optional<std::int64_t> first;
    bool behind = false;
    for (const auto& packet : packets) {
        behind |= packet.get() == &picture;
        if (packet->stream_index != audio.index || packet->pts == AV_NOPTS_VALUE) {
            continue;
        }
        const std::int64_t stamp = av_rescale_q(packet->pts, audio.time_base, kTicks);
        first = first.value_or(stamp);
        if (behind) {
            return SaturatingSubtract(stamp, *first);
        }
    }
    return std::nullopt;
}

}  // namespace

void MendFirstStamp(const Packets& packets, const AVStream& video, const AVStream* audio) {
    const std::vector<AVPacket*> pictures = Witnesses(packets, video);
    const auto period = pictures.empty() ? std::nullopt : PeriodOf(pictures);
    if (!period) {
        return;
    }
    const std::int64_t step = SaturatingSubtract(pictures[1]->pts, pictures[0]->pts);
    if (Distance(step, *period) <= static_cast<std::uint64_t>(*period)) {
        return;
    }
    if (step <= 0 && -(step / kLongestReorder) < *period) {
        return;
    }
    if (step > 0) {
        const auto sound = audio != nullptr ? SoundUntil(packets, *audio, *pictures[1]) : std::nullopt;
        const std::int64_t missing = av_rescale_q(step - *period, video.time_base, kTicks);
        if (!sound || missing <= SaturatingAdd(*sound, kSoundUnit)) {
            return;
        }
    }
    pictures[0]->pts = pictures[1]->pts - *period;
    pictures[0]->dts = AV_NOPTS_VALUE;
}

}  // namespace receiver
