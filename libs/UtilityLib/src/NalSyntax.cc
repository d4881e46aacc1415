#include "NalSyntax.h"

#include <cstddef>

namespace nal_access {

namespace {

/// Reads the bits of a NAL unit's payload behind the header byte, emulation prevention bytes taken out
/// (ISO/IEC 14496-10 7.3.1).
class RbspReader {
 public:
    explicit RbspReader(Bytes nal) : nal_(nal) {}

    /// u(1)
    std::optional<std::uint32_t> ReadBit() {
        if (bitsLeft_ == 0 && !LoadByte()) {
            return std::nullopt;
        }
        --bitsLeft_;
        return (current_ >> bitsLeft_) & 1U;
    }

    bool SkipBytes(unsigned int count) {
        for (unsigned int bit = 0; bit < 8 * count; ++bit) {
            if (!ReadBit()) {
                return false;
            }
        }
        return true;
    }

    /// ue(v), ISO/IEC 14496-10 9.1. Codes of more than 31 leading zero bits stand for no value.
    std::optional<std::uint32_t> ReadUe() {
        unsigned int zeros = 0;
        for (;;) {
            const auto bit = ReadBit();
            if (!bit || zeros > 31) {
                return std::nullopt;
            }
            if (*bit == 1) {
                break;
            }
            ++zeros;
        }
        std::uint64_t code = 1;
        for (unsigned int i = 0; i < zeros; ++i) {
            const auto bit = ReadBit();
            if (!bit) {
                return std::nullopt;
            }
            code = code << 1 | *bit;
        }
        return static_cast<std::uint32_t>(code - 1);
    }

 private:
    bool LoadByte() {
        if (next_ < nal_.size() && zeroBytes_ >= 2 && nal_[next_] == 3) {
            ++next_;  // emulation_prevention_three_byte
            zeroBytes_ = 0;
        }
        if (next_ >= nal_.size()) {
            return false;
        }
        current_ = nal_[next_++];
        zeroBytes_ = current_ == 0 ? zeroBytes_ + 1 : 0;
        bitsLeft_ = 8;
        return true;
    }

    Bytes nal_;
    std::size_t next_ = 1;
    std::uint32_t current_ = 0;
    unsigned int bitsLeft_ = 0;
    unsigned int zeroBytes_ = 0;
};

constexpr std::uint32_t kMaxSequenceParameterSetId = 31;
constexpr std::uint32_t kMaxPictureParameterSetId = 255;

}  // namespace

NalType TypeOf(Bytes nal) {
    return static_cast<NalType>(nal[0] & 0x1F);
}

std::optional<std::uint32_t> ReadSequenceParameterSetId(Bytes nal) {
    // ISO/IEC 14496-10 7.3.2.1.1
    RbspReader reader(nal);
    if (!reader.SkipBytes(3)) {  // profile_idc, constraint flags, level_idc
        return std::nullopt;
    }
    const auto id = reader.ReadUe();  // seq_parameter_set_id
    return id && *id <= kMaxSequenceParameterSetId ? id : std::nullopt;
}

std::optional<PictureParameterSetIds> ReadPictureParameterSetIds(Bytes nal) {
    // ISO/IEC 14496-10 7.3.2.2
    RbspReader reader(nal);
    const auto picture = reader.ReadUe();                            // pic_parameter_set_id
    const auto sequence = picture ? reader.ReadUe() : std::nullopt;  // seq_parameter_set_id
    if (!sequence || *picture > kMaxPictureParameterSetId || *sequence > kMaxSequenceParameterSetId) {
        return std::nullopt;
    }
    return PictureParameterSetIds{*picture, *sequence};
}

std::optional<SliceHeader> ReadSliceHeader(Bytes nal) {
    // ISO/IEC 14496-10 7.3.3
    RbspReader reader(nal);
    const auto first = reader.ReadUe();                          // first_mb_in_slice
    const auto type = first ? reader.ReadUe() : std::nullopt;    // slice_type
    const auto picture = type ? reader.ReadUe() : std::nullopt;  // pic_parameter_set_id
    if (!picture || *picture > kMaxPictureParameterSetId) {
        return std::nullopt;
    }
    return SliceHeader{*first, *type, *picture};
}

}  // namespace nal_access
