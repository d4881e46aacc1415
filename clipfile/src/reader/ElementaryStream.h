#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "reader/InputFile.h"

namespace clipfile {

/// What `esds` tells of a stream (ISO/IEC 14496-1 7.2.6).
struct ElementaryStream {
    std::uint8_t objectTypeIndication = 0;
    std::uint8_t streamType = 0;
    std::uint32_t bufferSizeDB = 0;
    /// Bits per second.
    std::uint32_t maxBitrate = 0;
    std::uint32_t avgBitrate = 0;
    std::vector<unsigned char> decoderSpecificInfo;
};

/// Reads the descriptors behind the version and flags of `esds`. Nothing where there is no decoder
/// configuration.
std::optional<ElementaryStream> ParseElementaryStream(Bytes descriptors);

}  // namespace clipfile
