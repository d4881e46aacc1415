#include "Adts.h"

#include <cstddef>

namespace nal_access {

Bytes WithoutAdtsHeader(Bytes frame) {
    constexpr std::size_t kHeaderSize = 7;
    constexpr std::size_t kCrcSize = 2;
    constexpr unsigned int kFrequencies = 13;
    if (frame.size() < kHeaderSize) {
        return frame;
    }
    // syncword, ID, layer, protection_absent. No raw frame starts so: its first element would be ID_END.
    if (frame[0] != 0xFF || (frame[1] & 0xF6) != 0xF0) {
        return frame;
    }
    const bool hasCrc = (frame[1] & 1) == 0;
    const unsigned int frequency = (frame[2] >> 2) & 0x0FU;  // sampling_frequency_index
    const std::size_t length = (frame[3] & 0x03U) << 11 | static_cast<unsigned int>(frame[4]) << 3 |
                               static_cast<unsigned int>(frame[5]) >> 5;  // aac_frame_length
    const std::size_t header = kHeaderSize + (hasCrc ? kCrcSize : 0);
    if (frequency >= kFrequencies || length < header || length > frame.size()) {
        return frame;
    }
    return frame.subspan(header);
}

}  // namespace nal_access
