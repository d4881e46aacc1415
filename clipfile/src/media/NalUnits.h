#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "reader/InputFile.h"

namespace clipfile {

/// Bytes of the length in front of each NAL unit of a sample.
inline constexpr std::size_t kNalLengthSize = 4;

/// What the first bytes of a NAL unit tell (ISO/IEC 14496-10 7.3.1, 7.3.3).
struct NalHead {
    std::uint8_t type = 0;

    bool IsSlice() const { return type == 1 || type == 2 || type == 5; }
    bool IsIdr() const { return type == 5; }
    /// A slice that begins with the picture's first macroblock.
    bool startsPicture = false;
    /// Such a one of slice_type 1 or 6: a B slice (7.4.3).
    bool startsBPicture = false;
    /// Stands in front of the slices of a picture, never between them (7.4.1.2.3).
    bool IsInFront() const { return (type >= 6 && type <= 9) || (type >= 14 && type <= 18); }
};

/// Bytes of a NAL unit that `ReadNalHead` wants.
inline constexpr std::size_t kNalHeadSize = 2;

/// The head of a NAL unit, or nothing for bytes that no encoder writes at this place of a recording.
std::optional<NalHead> ReadNalHead(Bytes bytes);

/// Whether the bytes are NAL units behind their lengths, from the first to the last.
bool IsWholePicture(Bytes sample);

/// Whether a picture of the sample begins with a B slice.
bool HasBPicture(Bytes sample);

/// The sample as a byte stream with start codes (ISO/IEC 14496-10 Annex B).
std::vector<unsigned char> ToByteStream(Bytes sample);

}  // namespace clipfile
