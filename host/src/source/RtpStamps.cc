#include "source/RtpStamps.h"

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <vector>

#include "source/CodedUnits.h"

namespace receiver {
namespace {

/// Steps that may be missing between two packets and still be a loss.
constexpr std::int64_t kLongestLoss = 50;

/// The distance that the stamps of two packets tell where whole steps lie between them, else the usual one.
std::int64_t DistanceOf(std::int64_t from, std::int64_t to, std::int64_t step, std::int64_t most) {
    if (from == AV_NOPTS_VALUE || to == AV_NOPTS_VALUE || step <= 0) {
        return step;
    }
    const std::int64_t told = to - from;
    const std::int64_t steps = (told + step / 2) / step;
    return steps >= 1 && steps <= most && std::abs(told - steps * step) <= step / 4 ? told : step;
}

/// Steps back that no clock which is set takes.
constexpr int kStepsOfReordered = 3;

std::vector<AVPacket*> PacketsOf(const AVStream& stream, const std::deque<libav::Owner<AVPacket>>& packets) {
    std::vector<AVPacket*> own;
    for (const auto& packet : packets) {
        if (packet->stream_index == stream.index) {
            own.push_back(packet.get());
        }
    }
    return own;
}

}  // namespace

bool IsTied(const AVPacket& packet) {
    return av_packet_get_side_data(&packet, AV_PKT_DATA_PRFT, nullptr) != nullptr;
}

void MendStamps(const AVStream& stream, std::int64_t step,
                const std::deque<libav::Owner<AVPacket>>& packets) {
    std::vector<AVPacket*> own = PacketsOf(stream, packets);
    while (!own.empty() && own.back()->pts == AV_NOPTS_VALUE) {
        own.pop_back();
    }
    std::vector<std::int64_t> told;
    std::transform(own.begin(), own.end(), std::back_inserter(told),
                   [](const AVPacket* packet) { return packet->pts; });
    for (std::size_t at = own.size(); at-- > 1;) {
        // Between two clocks a whole number of steps is nothing but chance. A parser may hand the tie of a
        // packet to the picture in front of it.
        const bool tied = IsTied(*own[at]);
        const bool oneClock = tied == IsTied(*own[at - 1]) && (at < 2 || tied == IsTied(*own[at - 2]));
        own[at - 1]->pts =
            own[at]->pts - DistanceOf(told[at - 1], told[at], step, oneClock ? kLongestLoss : 1);
    }
}

bool ComeReordered(const AVStream& video, std::int64_t step,
                   const std::deque<libav::Owner<AVPacket>>& packets) {
    const std::vector<AVPacket*> own = PacketsOf(video, packets);
    int back = 0;
    for (std::size_t at = 1; at < own.size(); ++at) {
        const AVPacket& before = *own[at - 1];
        const AVPacket& picture = *own[at];
        const bool told = before.pts != AV_NOPTS_VALUE && picture.pts != AV_NOPTS_VALUE;
        if (told && picture.pts < before.pts &&
            before.pts - picture.pts <= step * std::int64_t{kMostReorderFrames}) {
            ++back;
        }
    }
    return back >= kStepsOfReordered;
}

std::size_t DropBeforeLeap(const AVStream& video, std::int64_t step,
                           std::deque<libav::Owner<AVPacket>>& packets) {
    if (!ComeReordered(video, step, packets)) {
        return 0;
    }
    const std::vector<AVPacket*> own = PacketsOf(video, packets);
    std::size_t leap = own.size();
    while (leap > 1 && IsTied(*own[leap - 1]) == IsTied(*own.back())) {
        --leap;
    }
    if (leap <= 1) {
        return 0;
    }
    // A parser may hand the tie of a packet to the picture in front of it.
    const std::size_t dropped = std::min(leap + 1, own.size());
    const auto last = std::find_if(packets.begin(), packets.end(),
                                   [&](const auto& packet) { return packet.get() == own[dropped - 1]; });
    packets.erase(packets.begin(), last + 1);
    return dropped;
}

void MendFirstReordered(const AVStream& video, std::int64_t step,
                        const std::deque<libav::Owner<AVPacket>>& packets) {
    const std::vector<AVPacket*> own = PacketsOf(video, packets);
    const auto isKey = [](const AVPacket* picture) { return (picture->flags & AV_PKT_FLAG_KEY) != 0; };
    if (own.size() < 2 || own[0]->pts != AV_NOPTS_VALUE || !isKey(own[0])) {
        return;
    }
    const auto group = std::find_if(own.begin() + 1, own.end(), isKey);
    const auto shown = std::min_element(own.begin() + 1, group, [](const AVPacket* a, const AVPacket* b) {
        return a->pts != AV_NOPTS_VALUE && (b->pts == AV_NOPTS_VALUE || a->pts < b->pts);
    });
    if (shown != group && (*shown)->pts != AV_NOPTS_VALUE) {
        own[0]->pts = (*shown)->pts - step;
    }
}

}  // namespace receiver
