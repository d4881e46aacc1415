#pragma once

// Expected bytes, written as a box tree reads in the standard.

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace golden {

using Bytes = std::vector<unsigned char>;

inline Bytes operator+(Bytes left, const Bytes& right) {
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

inline Bytes Number(std::uint64_t value, int bytes) {
    Bytes result;
    for (int shift = 8 * (bytes - 1); shift >= 0; shift -= 8) {
        result.push_back(static_cast<unsigned char>(value >> shift));
    }
    return result;
}
inline Bytes U8(std::uint64_t value) {
    return Number(value, 1);
}
inline Bytes U16(std::uint64_t value) {
    return Number(value, 2);
}
inline Bytes U24(std::uint64_t value) {
    return Number(value, 3);
}
inline Bytes U32(std::uint64_t value) {
    return Number(value, 4);
}
inline Bytes U64(std::uint64_t value) {
    return Number(value, 8);
}
inline Bytes Zeros(std::size_t count) {
    return Bytes(count, 0);
}
/// A text without terminator: codes, names.
inline Bytes Text(std::string_view text) {
    return Bytes(text.begin(), text.end());
}
/// A text with its terminator.
inline Bytes CString(std::string_view text) {
    return Text(text) + U8(0);
}
/// `value`, `count` times.
inline Bytes Repeat(std::size_t count, const Bytes& value) {
    Bytes result;
    for (std::size_t i = 0; i < count; ++i) {
        result.insert(result.end(), value.begin(), value.end());
    }
    return result;
}

/// A box with the 8-byte header.
inline Bytes Box(std::string_view type, const Bytes& payload) {
    return U32(payload.size() + 8) + Text(type) + payload;
}
inline Bytes FullBox(std::string_view type, unsigned version, std::uint32_t flags, const Bytes& payload) {
    return Box(type, U8(version) + U24(flags) + payload);
}

/// The last twelve bytes that the system's own uuids share.
inline Bytes OwnUuid(std::string_view code) {
    return Text(code) + Bytes{0x21, 0xD2, 0x4F, 0xCE, 0xBB, 0x88, 0x69, 0x5C, 0xFA, 0xC9, 0xC7, 0x40};
}

}  // namespace golden
