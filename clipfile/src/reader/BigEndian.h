#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

namespace clipfile {

/// A number of `count` bytes, at most 8, most significant first. `bytes` has at least that many.
inline std::uint64_t ReadBigEndian(const unsigned char* bytes, std::size_t count) {
    std::uint64_t value = 0;
    for (std::size_t i = 0; i < count; ++i) {
        value = value << 8 | bytes[i];
    }
    return value;
}

inline std::uint16_t ReadU16(const unsigned char* bytes) {
    return static_cast<std::uint16_t>(ReadBigEndian(bytes, 2));
}
inline std::uint32_t ReadU32(const unsigned char* bytes) {
    return static_cast<std::uint32_t>(ReadBigEndian(bytes, 4));
}
inline std::uint64_t ReadU64(const unsigned char* bytes) {
    return ReadBigEndian(bytes, 8);
}

/// A four-character code as a number: what stands in the file.
constexpr std::uint32_t FourCc(const char (&text)[5]) {
    std::uint32_t value = 0;
    for (int i = 0; i < 4; ++i) {
        value = value << 8 | static_cast<unsigned char>(text[i]);
    }
    return value;
}

/// The code as text; bytes that do not print appear as \xHH.
std::string FourCcText(std::uint32_t code);
/// Two digits for each byte.
std::string HexText(std::span<const unsigned char> bytes);

}  // namespace clipfile
