#pragma once

#include <optional>
#include <vector>

#include "common/Timecode.h"

namespace receiver {

/// The payload of one timed metadata unit: packets, each a byte 01 and a packet of SMPTE ST 336. First comes
/// the record set with the record flag and, where there is one, the timecode; `packets` follow in their
/// order, each from its universal label on, as a source carries it, unchanged.
std::vector<unsigned char> BuildMetadata(bool record, const std::optional<Timecode>& timecode,
                                         const std::vector<std::vector<unsigned char>>& packets);

}  // namespace receiver
