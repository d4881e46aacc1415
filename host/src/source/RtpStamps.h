#pragma once

#include <cstddef>
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

/// Pictures of `video` among `packets` come in another order than they are shown in. `step` is their usual
/// distance.
bool ComeReordered(const AVStream& video, std::int64_t step,
                   const std::deque<libav::Owner<AVPacket>>& packets);

/// Of pictures that come so nobody knows where those in front of a leap belong: takes away all packets up to
/// it. Returns how many pictures these were.
std::size_t DropBeforeLeap(const AVStream& video, std::int64_t step,
                           std::deque<libav::Owner<AVPacket>>& packets);

/// The libraries lose the stamp of the first picture. Where that is one that decoding can begin with it is
/// shown in front of all that follow.
void MendFirstReordered(const AVStream& video, std::int64_t step,
                        const std::deque<libav::Owner<AVPacket>>& packets);

}  // namespace receiver
