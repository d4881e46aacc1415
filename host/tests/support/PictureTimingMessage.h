#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace endtoend {

/// Writes syntax elements (ITU-T H.264 7.2).
class BitWriter {
 public:
    /// u(n)
    BitWriter& Number(std::uint64_t value, int width) {
        for (int at = width - 1; at >= 0; --at) {
            bits_ += (value >> at & 1U) != 0 ? '1' : '0';
        }
        return *this;
    }
    BitWriter& Flag(bool value) { return Number(value ? 1 : 0, 1); }
    /// ue(v), 9.1
    BitWriter& Exponential(std::uint32_t value) {
        int width = 1;
        while ((std::uint64_t{value} + 1) >> width != 0) {
            ++width;
        }
        return Number(0, width - 1).Number(std::uint64_t{value} + 1, width);
    }
    /// Filled up with a bit 1 and zeros.
    std::string Bytes() const {
        std::string bits = bits_ + '1';
        bits.resize((bits.size() + 7) / 8 * 8, '0');
        std::string bytes;
        for (std::size_t at = 0; at < bits.size(); at += 8) {
            bytes += static_cast<char>(std::stoi(bits.substr(at, 8), nullptr, 2));
        }
        return bytes;
    }

 private:
    std::string bits_;
};

/// A NAL unit with its start code and emulation prevention (7.4.1).
inline std::string NalUnit(char header, const std::string& payload) {
    std::string unit = std::string("\0\0\1", 3) + header;
    int zeros = 0;
    for (const char byte : payload) {
        if (zeros >= 2 && static_cast<unsigned char>(byte) <= 3) {
            unit += '\x03';
            zeros = 0;
        }
        zeros = byte == 0 ? zeros + 1 : 0;
        unit += byte;
    }
    return unit;
}

/// A picture timing message (D.1.3) with one clock timestamp, behind `delays` bits of buffering delays.
/// `Timecode` has hours, minutes, seconds and frames.
template <typename Timecode>
std::string PictureTimingMessage(const Timecode& timecode, unsigned int countingType, bool dropped = false,
                                 int delays = 0) {
    const std::string payload =
        BitWriter()
            .Number(0, delays)
            .Number(0, 4)  // pic_struct: a frame
            .Flag(true)    // clock_timestamp_flag
            .Number(0, 3)  // ct_type, nuit_field_based_flag
            .Number(countingType, 5)
            .Flag(true)   // full_timestamp_flag
            .Flag(false)  // discontinuity_flag
            .Flag(dropped)
            .Number(static_cast<std::uint64_t>(timecode.frames), 8)
            .Number(static_cast<std::uint64_t>(timecode.seconds), 6)
            .Number(static_cast<std::uint64_t>(timecode.minutes), 6)
            .Number(static_cast<std::uint64_t>(timecode.hours), 5)
            .Number(0, 24)  // time_offset, which is so long where nothing else is told
            .Bytes();
    return NalUnit('\x06', std::string("\x01", 1) + static_cast<char>(payload.size()) + payload + "\x80");
}

}  // namespace endtoend
