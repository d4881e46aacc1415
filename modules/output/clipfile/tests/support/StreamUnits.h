#pragma once

// Units of a live stream as a host pushes them, made by hand: H.264 access units, AAC frames and metadata
// packets. Each carries a number in its payload ("#V0000000042"), so that a loss can be told.

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "StreamAnalyzer.h"
#include "StreamData.h"

namespace stream_units {

using Bytes = std::vector<unsigned char>;

inline void Append(Bytes& bytes, const Bytes& more) {
    bytes.insert(bytes.end(), more.begin(), more.end());
}

/// Bits, most significant first, with the Exp-Golomb codes of ITU-T H.264 9.1.
class BitWriter {
 public:
    BitWriter& U(unsigned count, std::uint32_t value) {
        for (unsigned i = count; i-- > 0;) {
            if (used_ == 0) {
                bytes_.push_back(0);
            }
            bytes_.back() = static_cast<unsigned char>(bytes_.back() | (((value >> i) & 1U) << (7 - used_)));
            used_ = (used_ + 1) % 8;
        }
        return *this;
    }
    BitWriter& Ue(std::uint32_t value) {
        unsigned length = 0;
        while (((value + 1) >> (length + 1)) != 0) {
            ++length;
        }
        return U(length, 0).U(length + 1, value + 1);
    }
    /// rbsp_trailing_bits: a one, then zeros up to the byte.
    Bytes Finish() {
        U(1, 1);
        return bytes_;
    }

 private:
    Bytes bytes_;
    unsigned used_ = 0;
};

/// A sequence parameter set, header byte included: Baseline profile (66), level 3.0, 64 x 48 pixels. None of
/// its bytes needs emulation prevention. ITU-T H.264 7.3.2.1.1.
inline Bytes Sps(std::uint32_t id = 0, unsigned char level = 30) {
    BitWriter bits;
    bits.U(8, 0x67).U(8, 66).U(8, 0xC0).U(8, level).Ue(id);
    bits.Ue(0);                            // log2_max_frame_num_minus4
    bits.Ue(2);                            // pic_order_cnt_type: output order is decoding order
    bits.Ue(1);                            // max_num_ref_frames
    bits.U(1, 0);                          // gaps_in_frame_num_value_allowed_flag
    bits.Ue(3).Ue(2);                      // picture size in macroblocks, less one
    bits.U(1, 1).U(1, 1).U(1, 0).U(1, 0);  // frame_mbs_only, direct_8x8_inference, cropping, vui
    return bits.Finish();
}

/// A picture parameter set of that sequence, header byte included. ITU-T H.264 7.3.2.2.
inline Bytes Pps(std::uint32_t id = 0, std::uint32_t spsId = 0) {
    BitWriter bits;
    bits.U(8, 0x68).Ue(id).Ue(spsId);
    bits.U(1, 0).U(1, 0).Ue(0);    // entropy_coding_mode, bottom_field_pic_order, num_slice_groups_minus1
    bits.Ue(0).Ue(0);              // num_ref_idx_default_active_minus1
    bits.U(1, 0).U(2, 0);          // weighted_pred_flag, weighted_bipred_idc
    bits.Ue(0).Ue(0).Ue(0);        // pic_init_qp, pic_init_qs, chroma_qp_index_offset
    bits.U(1, 0).U(1, 0).U(1, 0);  // deblocking_filter_control, constrained_intra_pred, redundant_pic_cnt
    return bits.Finish();
}

/// The mark that a payload carries: '#', the medium's letter and ten digits.
inline std::string Mark(char medium, std::uint64_t number) {
    std::string mark = {'#', medium, '0', '0', '0', '0', '0', '0', '0', '0', '0', '0'};
    for (std::size_t at = mark.size(); at-- > 2; number /= 10) {
        mark[at] = static_cast<char>('0' + number % 10);
    }
    return mark;
}

/// A coded slice with header byte, numbered. The bytes behind the slice header are no picture.
inline Bytes Slice(bool idr, std::uint64_t number, std::uint32_t ppsId = 0, std::uint32_t firstMb = 0) {
    BitWriter bits;
    bits.U(8, idr ? 0x65 : 0x41).Ue(firstMb).Ue(idr ? 7 : 5).Ue(ppsId);
    bits.U(4, static_cast<std::uint32_t>(number % 16));  // frame_num
    Bytes nal = bits.Finish();
    const std::string mark = Mark('V', number);
    nal.insert(nal.end(), mark.begin(), mark.end());
    return nal;
}

/// Wraps a payload into a unit.
inline std::shared_ptr<StreamData> MakeUnit(const Bytes& payload, std::uint64_t rtp, std::uint64_t milliSec) {
    auto unit = std::make_shared<StreamData>();
    unit->rtp_timestamp = rtp;
    unit->timestamp = milliSec;
    unit->data = std::shared_ptr<unsigned char>(new unsigned char[payload.size() + 1],
                                                std::default_delete<unsigned char[]>());
    std::memcpy(unit->data.get(), payload.data(), payload.size());
    unit->size = payload.size();
    unit->payload = unit->data.get();
    return unit;
}

/// Which NAL units an access unit has before its slice.
struct VideoParts {
    bool idr = false;
    bool sps = false;
    bool pps = false;
    unsigned char level = 30;
};

inline constexpr VideoParts kIdr{true, true, true};
inline constexpr VideoParts kPicture{};

/// An access unit as Annex B byte stream (ITU-T H.264 annex B), with an access unit delimiter in front.
inline Bytes VideoPayload(std::uint64_t number, const VideoParts& parts) {
    Bytes payload = {0, 0, 0, 1, 0x09, 0x10};
    if (parts.sps) {
        Append(payload, {0, 0, 0, 1});
        Append(payload, Sps(0, parts.level));
    }
    if (parts.pps) {
        Append(payload, {0, 0, 0, 1});
        Append(payload, Pps());
    }
    Append(payload, {0, 0, 1});
    Append(payload, Slice(parts.idr, number));
    return payload;
}

inline std::shared_ptr<StreamData> VideoUnit(std::uint64_t number, std::uint64_t rtp, std::uint64_t milliSec,
                                             const VideoParts& parts = kPicture) {
    return MakeUnit(VideoPayload(number, parts), rtp, milliSec);
}

/// A raw AAC frame by its first byte: a single channel element, and no ADTS sync word.
inline Bytes AudioPayload(std::uint64_t number) {
    Bytes payload = {0x01, 0x18};
    const std::string mark = Mark('A', number);
    payload.insert(payload.end(), mark.begin(), mark.end());
    return payload;
}

inline std::shared_ptr<StreamData> AudioUnit(std::uint64_t number, std::uint64_t rtp,
                                             std::uint64_t milliSec) {
    return MakeUnit(AudioPayload(number), rtp, milliSec);
}

struct Timecode {
    unsigned char hours = 0;
    unsigned char minutes = 0;
    unsigned char seconds = 0;
    unsigned char frames = 0;
    bool dropFrame = false;
};

struct MetaFields {
    std::optional<bool> recFlag;
    std::optional<Timecode> timecode;
};

/// One packet: a byte 01, a universal label, BER length, value (SMPTE ST 336).
inline Bytes Packet(const std::array<unsigned char, 16>& label, const Bytes& value) {
    Bytes packet(1 + label.size(), 0x01);
    std::copy(label.begin(), label.end(), packet.begin() + 1);
    if (value.size() < 0x80) {
        packet.push_back(static_cast<unsigned char>(value.size()));
    } else {
        Append(packet, {0x82, static_cast<unsigned char>(value.size() >> 8),
                        static_cast<unsigned char>(value.size())});
    }
    Append(packet, value);
    return packet;
}

/// An item of a local set: 2-byte tag, 2-byte length, value.
inline Bytes Item(unsigned tag, const Bytes& value) {
    Bytes item = {static_cast<unsigned char>(tag >> 8), static_cast<unsigned char>(tag),
                  static_cast<unsigned char>(value.size() >> 8), static_cast<unsigned char>(value.size())};
    Append(item, value);
    return item;
}

/// The set of record flag and timecode, and a packet of another kind that carries the number.
inline Bytes MetaPayload(std::uint64_t number, const MetaFields& fields) {
    static constexpr std::array<unsigned char, 16> kSetLabel = {
        0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00};
    static constexpr std::array<unsigned char, 16> kNumberLabel = {
        0x06, 0x0E, 0x2B, 0x34, 0x01, 0x01, 0x01, 0x01, 0x0F, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x01};
    const Bytes identifier = {0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17,
                              0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93};
    Bytes payload;
    if (fields.recFlag || fields.timecode) {
        Bytes set = Item(0xE000, identifier);
        if (fields.recFlag) {
            Append(set, Item(0xE101, {static_cast<unsigned char>(*fields.recFlag ? 1 : 0)}));
        }
        if (fields.timecode) {
            const Timecode& tc = *fields.timecode;
            Append(set, Item(0xE102, {tc.hours, tc.minutes, tc.seconds, tc.frames,
                                      static_cast<unsigned char>(tc.dropFrame ? 1 : 0)}));
        }
        Append(payload, Packet(kSetLabel, set));
    }
    const std::string mark = Mark('M', number);
    Append(payload, Packet(kNumberLabel, Bytes(mark.begin(), mark.end())));
    return payload;
}

inline std::shared_ptr<StreamData> MetaUnit(std::uint64_t number, std::uint64_t rtp, std::uint64_t milliSec,
                                            const MetaFields& fields = {}) {
    return MakeUnit(MetaPayload(number, fields), rtp, milliSec);
}

/// The number in the bytes of a unit or sample of `medium` ('V', 'A' or 'M'); nothing when there is none.
inline std::optional<std::uint64_t> NumberIn(char medium, const unsigned char* data, std::uint64_t size) {
    const std::string_view bytes(reinterpret_cast<const char*>(data), size);
    const std::size_t at = bytes.find(std::string{'#', medium});
    if (at == std::string_view::npos || at + 12 > bytes.size()) {
        return std::nullopt;
    }
    return std::stoull(std::string(bytes.substr(at + 2, 10)));
}

inline std::optional<std::uint64_t> NumberOf(char medium, nal_access::SampleData& sample) {
    return NumberIn(medium, sample.GetData(), sample.GetDataSize());
}

inline std::optional<std::uint64_t> NumberOf(char medium, const StreamData& unit) {
    return NumberIn(medium, unit.payload, unit.size);
}

/// A frame rate by its key in frames per 1000 seconds, as a fraction: `timescale / duration` frames a second.
struct FrameRate {
    std::uint32_t key;
    std::uint64_t timescale;
    std::uint64_t duration;
};

inline std::ostream& operator<<(std::ostream& out, const FrameRate& rate) {
    return out << rate.key;
}

inline constexpr FrameRate kFrameRates[] = {
    {23980, 24000, 1001}, {24000, 24000, 1000}, {25000, 25000, 1000}, {29970, 30000, 1001},
    {30000, 30000, 1000}, {50000, 50000, 1000}, {59940, 60000, 1001}, {60000, 60000, 1000},
};
inline constexpr FrameRate kRate25 = kFrameRates[2];
inline constexpr FrameRate kRate2997 = kFrameRates[3];

/// A stream without jitter: the times of each unit by its number. All media begin at `startMilliSec`.
struct StreamClock {
    FrameRate rate = kRate25;
    std::uint64_t startMilliSec = 1000;
    /// The RTP clocks at that instant.
    std::uint64_t videoRtp = 90000;
    std::uint64_t audioRtp = 48000;

    std::uint64_t VideoRtp(std::uint64_t n) const {
        return videoRtp + n * 90000 * rate.duration / rate.timescale;
    }
    std::uint64_t VideoMilliSec(std::uint64_t n) const {
        return startMilliSec + n * 1000 * rate.duration / rate.timescale;
    }
    std::uint64_t AudioRtp(std::uint64_t n) const { return audioRtp + n * 1024; }
    std::uint64_t AudioMilliSec(std::uint64_t n) const { return startMilliSec + n * 1024 / 48; }
    /// Audio frames that begin before video frame `n`.
    std::uint64_t AudioBefore(std::uint64_t n) const {
        return (n * rate.duration * 48000 + rate.timescale * 1024 - 1) / (rate.timescale * 1024);
    }

    std::shared_ptr<StreamData> Video(std::uint64_t n, const VideoParts& parts = kPicture) const {
        return VideoUnit(n, VideoRtp(n), VideoMilliSec(n), parts);
    }
    std::shared_ptr<StreamData> Audio(std::uint64_t n) const {
        return AudioUnit(n, AudioRtp(n), AudioMilliSec(n));
    }
    std::shared_ptr<StreamData> Meta(std::uint64_t n, const MetaFields& fields = {}) const {
        return MetaUnit(n, VideoRtp(n), VideoMilliSec(n), fields);
    }
};

}  // namespace stream_units
