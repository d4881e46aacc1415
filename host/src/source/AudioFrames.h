#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

#include "source/Libav.h"

namespace receiver {

/// Bytes of the audio frame that begins with `frame`, its header included, as that tells: of AAC with ADTS
/// headers, MPEG audio (layers I to III), AC-3 and E-AC-3. Nothing where there is no such header.
std::optional<std::size_t> AudioFrameSize(AVCodecID codec, std::span<const std::uint8_t> frame);
/// True when the packet is such a frame, or several that belong together, no byte more or less.
bool IsWholeAudioFrame(AVCodecID codec, const AVPacket& packet);

}  // namespace receiver
