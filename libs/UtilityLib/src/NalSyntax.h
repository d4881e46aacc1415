#pragma once

#include <cstdint>
#include <optional>

#include "AnnexBReader.h"

namespace nal_access {

/// nal_unit_type of ISO/IEC 14496-10 table 7-1, as far as the converters tell them apart.
enum class NalType : unsigned char {
    kIdrSlice = 5,
    kSequenceParameterSet = 7,
    kPictureParameterSet = 8,
    kAccessUnitDelimiter = 9,
    kEndOfSequence = 10,
    kEndOfStream = 11,
    kFillerData = 12,
};

/// `nal` must not be empty.
NalType TypeOf(Bytes nal);

struct PictureParameterSetIds {
    std::uint32_t pictureParameterSet;
    std::uint32_t sequenceParameterSet;
};

struct SliceHeader {
    std::uint32_t firstMacroblock;
    std::uint32_t type;
    std::uint32_t pictureParameterSet;
};

/// Each reads the first syntax elements of a NAL unit of its type, header byte included. Nothing when the
/// unit ends before, or an identifier is above its limit (31 for sequence, 255 for picture parameter sets).
std::optional<std::uint32_t> ReadSequenceParameterSetId(Bytes nal);
std::optional<PictureParameterSetIds> ReadPictureParameterSetIds(Bytes nal);
std::optional<SliceHeader> ReadSliceHeader(Bytes nal);

}  // namespace nal_access
