#pragma once

#include <cstdint>
#include <deque>

#include "source/Libav.h"

namespace receiver {

/// True when the packet's stamp is tied to the sender's clock. The media of RTP each have a clock of their
/// own until the first report of their sender comes (RFC 3550 6.4.1).
bool IsTied(const AVPacket& packet);

/// Stamps leap when they are tied, and libraries lose or infer those of the first pictures: brings the stamps
/// of `stream` among `packets` that stand before a leap in line with those behind it. `step` is the usual
/// distance, in the stream's time base. Whole steps that are missing stay.
void MendStamps(const AVStream& stream, std::int64_t step, const std::deque<libav::Owner<AVPacket>>& packets);

}  // namespace receiver
