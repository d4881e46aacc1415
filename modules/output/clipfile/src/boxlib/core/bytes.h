// Big-endian composing: the fixed part of a box is put together in a small stack buffer that is cleared
// first, so that reserved bytes are zero.
#pragma once

#include <bit>

#include "boxlib/core/context.h"

inline void MbxStore16(uint8_t* bytes, uint16_t value) {
    bytes[0] = static_cast<uint8_t>(value >> 8);
    bytes[1] = static_cast<uint8_t>(value);
}

inline void MbxStore32(uint8_t* bytes, uint32_t value) {
    MbxStore16(bytes, static_cast<uint16_t>(value >> 16));
    MbxStore16(bytes + 2, static_cast<uint16_t>(value));
}

inline uint32_t MbxGet32(const uint8_t* bytes) {
    return static_cast<uint32_t>(bytes[0]) << 24 | static_cast<uint32_t>(bytes[1]) << 16 |
           static_cast<uint32_t>(bytes[2]) << 8 | bytes[3];
}

// The value whose bytes in memory are the big-endian form, for table rows that are converted a block at a
// time.
inline uint32_t MbxBig32(uint32_t value) {
    if constexpr (std::endian::native == std::endian::big) return value;
    return __builtin_bswap32(value);
}

inline uint64_t MbxBig64(uint64_t value) {
    if constexpr (std::endian::native == std::endian::big) return value;
    return __builtin_bswap64(value);
}

// The stack buffer of a payload writer. Larger than the largest fixed part (112 bytes, `mvhd` version 1).
struct MbxBytes {
    uint8_t data[128];
    uint32_t length;
    uint32_t overrun;  // not 0: something did not fit, which MbxWriteComposed reports as MBX_ERR_INTERNAL
};

inline void MbxBeginBytes(MbxContext* context, MbxBytes* bytes) {
    MbxClear(context, bytes, sizeof(MbxBytes));
}

// Appends the low `width` bytes of `value`, most significant first.
inline void MbxPut(MbxBytes* bytes, uint64_t value, uint32_t width) {
    if (width > sizeof(bytes->data) - bytes->length) {
        bytes->overrun = 1;
        return;
    }
    for (uint32_t i = 0; i < width; i++) {
        bytes->data[bytes->length + i] = static_cast<uint8_t>(value >> (8 * (width - 1 - i)));
    }
    bytes->length += width;
}

inline void MbxPut8(MbxBytes* bytes, uint32_t value) {
    MbxPut(bytes, value, 1);
}
inline void MbxPut16(MbxBytes* bytes, uint32_t value) {
    MbxPut(bytes, value, 2);
}
inline void MbxPut24(MbxBytes* bytes, uint32_t value) {
    MbxPut(bytes, value, 3);
}
inline void MbxPut32(MbxBytes* bytes, uint32_t value) {
    MbxPut(bytes, value, 4);
}
inline void MbxPut48(MbxBytes* bytes, uint64_t value) {
    MbxPut(bytes, value, 6);
}
inline void MbxPut64(MbxBytes* bytes, uint64_t value) {
    MbxPut(bytes, value, 8);
}

// A field of 64 bits in version 1 and 32 bits, cut, in version 0.
inline void MbxPutByVersion(MbxBytes* bytes, uint32_t version, uint64_t value) {
    MbxPut(bytes, value, version == 1 ? 8 : 4);
}

// Skips `count` bytes, which stay zero.
inline void MbxPutZeros(MbxBytes* bytes, uint32_t count) {
    if (count > sizeof(bytes->data) - bytes->length) {
        bytes->overrun = 1;
        return;
    }
    bytes->length += count;
}

// The head of a full box (ISO/IEC 14496-12 4.2).
inline void MbxPutVersionFlags(MbxBytes* bytes, uint32_t version, uint32_t flags) {
    MbxPut8(bytes, version);  // unsigned int(8) version
    MbxPut24(bytes, flags);   // bit(24) flags
}
