#include "source/PictureTiming.h"

#include <algorithm>
#include <array>
#include <cstdint>

namespace receiver {
namespace {

/// payloadType of a picture timing message (D.1.1).
constexpr unsigned int kPictureTiming = 1;
/// counting_type of the drop-frame rule (table D-2): 0 and 1 are left out in each minute but every tenth.
constexpr unsigned int kDropFrame = 4;
/// NumClockTS of each pic_struct (table D-1).
constexpr std::array<unsigned int, 9> kClockStamps{1, 1, 1, 2, 2, 3, 3, 2, 3};
/// profile_idc of sets that tell of chroma (7.3.2.1.1).
constexpr std::array<unsigned int, 13> kChromaProfiles{100, 110, 122, 244, 44,  83, 86,
                                                       118, 128, 138, 139, 134, 135};
/// Cycles, buffers: no stream has more, and a damaged one is not read for longer.
constexpr std::uint32_t kMany = 255;

/// A unit's bytes behind its header without emulation prevention (7.3.1).
std::vector<unsigned char> PayloadOf(std::span<const unsigned char> unit) {
    std::vector<unsigned char> payload;
    unsigned int zeros = 0;
    for (const unsigned char byte : unit.subspan(1)) {
        if (zeros >= 2 && byte == 3) {
            zeros = 0;
            continue;
        }
        zeros = byte == 0 ? zeros + 1 : 0;
        payload.push_back(byte);
    }
    return payload;
}

/// Reads syntax elements (7.2). Behind the end everything is 0, and `Whole` is false.
class Bits {
 public:
    explicit Bits(std::span<const unsigned char> bytes) : bytes_(bytes) {}

    /// u(n), up to 32.
    std::uint32_t Number(unsigned int width) {
        std::uint32_t value = 0;
        for (unsigned int bit = 0; bit < width; ++bit) {
            value = value << 1U | Next();
        }
        return value;
    }
    bool Flag() { return Next() != 0; }
    void Skip(unsigned int width) { at_ += width; }
    /// ue(v); that many zeros or more are none.
    std::uint32_t Exponential() {
        unsigned int zeros = 0;
        while (zeros < 32 && Whole() && Next() == 0) {
            ++zeros;
        }
        return zeros < 32 ? (std::uint32_t{1} << zeros) - 1 + Number(zeros) : 0;
    }
    /// se(v), modulo 256, which is all that scaling lists need.
    std::uint32_t SignedModulo256() {
        const std::uint32_t code = Exponential();
        const std::uint32_t magnitude = (code + 1) / 2;
        return (code % 2 != 0 ? magnitude : 256 - magnitude % 256) % 256;
    }
    bool Whole() const { return at_ <= bytes_.size() * 8; }

 private:
    std::uint32_t Next() {
        const std::size_t at = at_++;
        return at / 8 < bytes_.size() ? bytes_[at / 8] >> (7 - at % 8) & 1U : 0;
    }

    std::span<const unsigned char> bytes_;
    std::size_t at_ = 0;
};

void SkipScalingList(Bits& bits, unsigned int size) {
    std::uint32_t last = 8;
    std::uint32_t next = 8;
    for (unsigned int entry = 0; entry < size; ++entry) {
        if (next != 0) {
            next = (last + bits.SignedModulo256()) % 256;
        }
        last = next == 0 ? last : next;
    }
}

void SkipChroma(Bits& bits) {
    const std::uint32_t format = bits.Exponential();
    if (format == 3) {
        bits.Flag();  // separate_colour_plane_flag
    }
    bits.Exponential();  // bit_depth_luma_minus8
    bits.Exponential();  // bit_depth_chroma_minus8
    bits.Flag();         // qpprime_y_zero_transform_bypass_flag
    if (!bits.Flag()) {  // seq_scaling_matrix_present_flag
        return;
    }
    const unsigned int lists = format == 3 ? 12 : 8;
    for (unsigned int list = 0; list < lists; ++list) {
        if (bits.Flag()) {  // seq_scaling_list_present_flag
            SkipScalingList(bits, list < 6 ? 16 : 64);
        }
    }
}

void SkipPictureOrder(Bits& bits) {
    const std::uint32_t type = bits.Exponential();  // pic_order_cnt_type
    if (type == 0) {
        bits.Exponential();  // log2_max_pic_order_cnt_lsb_minus4
    } else if (type == 1) {
        bits.Flag();         // delta_pic_order_always_zero_flag
        bits.Exponential();  // offset_for_non_ref_pic
        bits.Exponential();  // offset_for_top_to_bottom_field
        const std::uint32_t cycle = std::min(bits.Exponential(), kMany);
        for (std::uint32_t entry = 0; entry < cycle; ++entry) {
            bits.Exponential();  // offset_for_ref_frame
        }
    }
}

/// From the beginning of a sequence parameter set to its usability information. False when it has none.
bool GoToUsability(Bits& bits) {
    const std::uint32_t profile = bits.Number(8);
    bits.Skip(16);       // constraint flags, level_idc
    bits.Exponential();  // seq_parameter_set_id
    if (std::find(kChromaProfiles.begin(), kChromaProfiles.end(), profile) != kChromaProfiles.end()) {
        SkipChroma(bits);
    }
    bits.Exponential();  // log2_max_frame_num_minus4
    SkipPictureOrder(bits);
    bits.Exponential();  // max_num_ref_frames
    bits.Flag();         // gaps_in_frame_num_value_allowed_flag
    bits.Exponential();  // pic_width_in_mbs_minus1
    bits.Exponential();  // pic_height_in_map_units_minus1
    if (!bits.Flag()) {  // frame_mbs_only_flag
        bits.Flag();     // mb_adaptive_frame_field_flag
    }
    bits.Flag();        // direct_8x8_inference_flag
    if (bits.Flag()) {  // frame_cropping_flag
        for (int side = 0; side < 4; ++side) {
            bits.Exponential();
        }
    }
    return bits.Flag();  // vui_parameters_present_flag
}

/// From the beginning of the usability information to the parameters of its decoder models.
void GoToDecoderModels(Bits& bits) {
    if (bits.Flag() && bits.Number(8) == 255) {  // aspect_ratio_idc: extended
        bits.Skip(32);
    }
    if (bits.Flag()) {  // overscan_info_present_flag
        bits.Flag();
    }
    if (bits.Flag()) {  // video_signal_type_present_flag
        bits.Skip(4);
        if (bits.Flag()) {  // colour_description_present_flag
            bits.Skip(24);
        }
    }
    if (bits.Flag()) {  // chroma_loc_info_present_flag
        bits.Exponential();
        bits.Exponential();
    }
    if (bits.Flag()) {  // timing_info_present_flag
        bits.Skip(65);
    }
}

/// From the restrictions of the stream, with which the usability information ends.
std::optional<std::uint32_t> ReorderFramesAt(Bits& bits) {
    if (!bits.Flag()) {  // bitstream_restriction_flag
        return std::nullopt;
    }
    bits.Flag();         // motion_vectors_over_pic_boundaries_flag
    bits.Exponential();  // max_bytes_per_pic_denom
    bits.Exponential();  // max_bits_per_mb_denom
    bits.Exponential();  // log2_max_mv_length_horizontal
    bits.Exponential();  // log2_max_mv_length_vertical
    const std::uint32_t frames = bits.Exponential();
    return bits.Whole() ? std::optional(frames) : std::nullopt;
}

}  // namespace

std::optional<PictureTiming::Layout> PictureTiming::LayoutOf(std::span<const unsigned char> parameterSet) {
    const std::vector<unsigned char> bytes = PayloadOf(parameterSet);
    Bits bits(bytes);
    if (!GoToUsability(bits)) {
        return std::nullopt;
    }
    GoToDecoderModels(bits);
    Layout layout;
    bool models = false;
    for (int model = 0; model < 2; ++model) {  // nal_hrd_parameters, vcl_hrd_parameters
        if (!bits.Flag()) {
            continue;
        }
        models = true;
        const std::uint32_t buffers = std::min(bits.Exponential(), kMany) + 1;  // cpb_cnt_minus1
        bits.Skip(8);
        for (std::uint32_t buffer = 0; buffer < buffers; ++buffer) {
            bits.Exponential();
            bits.Exponential();
            bits.Flag();
        }
        bits.Skip(5);                                 // initial_cpb_removal_delay_length_minus1
        layout.cpbRemovalDelay = bits.Number(5) + 1;  // cpb_removal_delay_length_minus1
        layout.dpbOutputDelay = bits.Number(5) + 1;   // dpb_output_delay_length_minus1
        bits.Skip(5);                                 // time_offset_length
    }
    if (models) {
        bits.Flag();  // low_delay_hrd_flag
    }
    layout.pictureStructure = bits.Flag();
    layout.reorderFrames = ReorderFramesAt(bits);
    return bits.Whole() ? std::optional(layout) : std::nullopt;
}

void PictureTiming::Look(const std::vector<NalUnit>& units) {
    for (const NalUnit& unit : units) {
        if (unit.type == kNalSequenceParameterSet) {
            layout_ = LayoutOf(unit.bytes);
        } else if (unit.type == kNalMessages && layout_ && layout_->pictureStructure) {
            LookAtMessages(unit.bytes);
        }
    }
}

void PictureTiming::LookAtMessages(std::span<const unsigned char> message) {
    const std::vector<unsigned char> bytes = PayloadOf(message);
    std::span<const unsigned char> rest = bytes;
    const auto number = [&rest] {
        std::size_t value = 0;
        while (!rest.empty()) {
            const unsigned char byte = rest.front();
            rest = rest.subspan(1);
            value += byte;
            if (byte != 255) {
                break;
            }
        }
        return value;
    };
    // A message takes two bytes and more; behind the last one stand the trailing bits.
    while (rest.size() > 2) {
        const std::size_t type = number();
        const std::size_t told = number();
        const std::size_t size = std::min(told, rest.size());
        if (type == kPictureTiming) {
            LookAtTiming(rest.first(size));
        }
        rest = rest.subspan(size);
    }
}

void PictureTiming::LookAtTiming(std::span<const unsigned char> payload) {
    Bits bits(payload);
    bits.Skip(layout_->cpbRemovalDelay + layout_->dpbOutputDelay);
    const std::uint32_t structure = bits.Number(4);
    unsigned int stamps = structure < kClockStamps.size() ? kClockStamps[structure] : 0;
    while (stamps > 0 && !bits.Flag()) {  // clock_timestamp_flag
        --stamps;
    }
    if (stamps == 0) {
        return;
    }
    bits.Skip(3);  // ct_type, nuit_field_based_flag
    const std::uint32_t counting = bits.Number(5);
    bits.Skip(2);  // full_timestamp_flag, discontinuity_flag
    const bool dropped = bits.Flag();
    if (bits.Whole()) {
        dropFrame_ = counting == kDropFrame || (dropped && counting > 1 && counting < 7);
    }
}

}  // namespace receiver
