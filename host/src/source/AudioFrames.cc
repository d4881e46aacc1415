#include "source/AudioFrames.h"

#include <array>

namespace receiver {
namespace {

using Bytes = std::span<const std::uint8_t>;
using Size = std::optional<std::size_t>;
using Rates = std::array<std::size_t, 15>;

/// `count` bits from bit `first` on.
std::size_t BitsAt(Bytes bytes, std::size_t first, std::size_t count) {
    std::size_t value = 0;
    for (std::size_t bit = first; bit < first + count; ++bit) {
        value = value << 1 | (bytes[bit / 8] >> (7 - bit % 8) & 1U);
    }
    return value;
}

/// ADTS (ISO/IEC 14496-3 1.A.2.2): syncword, ID, layer 0, and further on aac_frame_length.
Size AdtsSize(Bytes frame) {
    if (frame.size() < 7 || BitsAt(frame, 0, 12) != 0xFFF || BitsAt(frame, 13, 2) != 0) {
        return std::nullopt;
    }
    return BitsAt(frame, 30, 13);
}

/// Kilobits a second of bitrate_index 1 to 14 (ISO/IEC 11172-3 2.4.2.3, 13818-3 2.4.2.3).
constexpr Rates kLayer1{0, 32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448};
constexpr Rates kLayer2{0, 32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384};
constexpr Rates kLayer3{0, 32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320};
constexpr Rates kLowLayer1{0, 32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256};
constexpr Rates kLow{0, 8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160};

/// MPEG audio (ISO/IEC 11172-3 2.4.1.3 and 2.4.3.1).
Size MpegSize(Bytes frame) {
    if (frame.size() < 4 || BitsAt(frame, 0, 12) != 0xFFF) {
        return std::nullopt;
    }
    const bool low = BitsAt(frame, 12, 1) == 0;
    // Written as 3, 2 and 1.
    const std::size_t layer = 4 - BitsAt(frame, 13, 2);
    const std::size_t index = BitsAt(frame, 16, 4);
    const std::size_t frequency = BitsAt(frame, 20, 2);
    const std::size_t padding = BitsAt(frame, 22, 1);
    if (layer > 3 || index == 0 || index == 15 || frequency == 3) {
        return std::nullopt;
    }
    constexpr std::array<std::size_t, 3> kFrequencies{44100, 48000, 32000};
    const std::size_t hertz = kFrequencies[frequency] / (low ? 2 : 1);
    if (layer == 1) {
        return ((low ? kLowLayer1 : kLayer1)[index] * 12000 / hertz + padding) * 4;
    }
    const std::size_t rate = (low ? kLow : layer == 2 ? kLayer2 : kLayer3)[index];
    return (low && layer == 3 ? 72000 : 144000) * rate / hertz + padding;
}

/// AC-3 and E-AC-3 (ETSI TS 102 366 4.4.1 and E.1.3.1): syncword, and by bsid the size of its frame or an
/// index of the table of sizes.
Size Ac3Size(Bytes frame) {
    if (frame.size() < 6 || BitsAt(frame, 0, 16) != 0x0B77) {
        return std::nullopt;
    }
    constexpr std::size_t kLastPlain = 10;
    if (BitsAt(frame, 40, 5) > kLastPlain) {
        return (BitsAt(frame, 21, 11) + 1) * 2;
    }
    constexpr std::array<std::size_t, 19> kRates{32,  40,  48,  56,  64,  80,  96,  112, 128, 160,
                                                 192, 224, 256, 320, 384, 448, 512, 576, 640};
    const std::size_t frequency = BitsAt(frame, 32, 2);
    const std::size_t index = BitsAt(frame, 34, 6);
    if (frequency == 3 || index / 2 >= kRates.size()) {
        return std::nullopt;
    }
    const std::size_t rate = kRates[index / 2];
    switch (frequency) {
        case 0:
            return rate * 4;
        case 1:
            // 1536 samples at 44.1 kHz, in words of two bytes: an odd index has one word more.
            return (rate * 96000 / 44100 + index % 2) * 2;
        default:
            return rate * 6;
    }
}

}  // namespace

std::optional<std::size_t> AudioFrameSize(AVCodecID codec, std::span<const std::uint8_t> frame) {
    switch (codec) {
        case AV_CODEC_ID_AAC:
            return AdtsSize(frame);
        case AV_CODEC_ID_MP1:
        case AV_CODEC_ID_MP2:
        case AV_CODEC_ID_MP3:
            return MpegSize(frame);
        case AV_CODEC_ID_AC3:
        case AV_CODEC_ID_EAC3:
            return Ac3Size(frame);
        default:
            return std::nullopt;
    }
}

bool IsWholeAudioFrame(AVCodecID codec, const AVPacket& packet) {
    Bytes left(packet.data, static_cast<std::size_t>(packet.size));
    do {
        const Size size = AudioFrameSize(codec, left);
        if (!size || *size == 0 || *size > left.size()) {
            return false;
        }
        left = left.subspan(*size);
    } while (!left.empty());
    return true;
}

}  // namespace receiver
