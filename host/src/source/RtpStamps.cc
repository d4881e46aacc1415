#include "source/RtpStamps.h"

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <vector>

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

}  // namespace

bool IsTied(const AVPacket& packet) {
    return av_packet_get_side_data(&packet, AV_PKT_DATA_PRFT, nullptr) != nullptr;
}

void MendStamps(const AVStream& stream, std::int64_t step,
                const std::deque<libav::Owner<AVPacket>>& packets) {
    std::vector<AVPacket*> own;
    for (const auto& packet : packets) {
        if (packet->stream_index == stream.index) {
            own.push_back(packet.get());
        }
    }
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

}  // namespace receiver
