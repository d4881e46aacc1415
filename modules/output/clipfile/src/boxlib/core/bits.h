// Fields that do not end on bytes: they are lined up in a word, most significant first, which is then
// composed.
#pragma once

#include <cstdint>

// Appends the low `width` bits of `value`.
inline void MbxPutBits(uint64_t* word, uint32_t width, uint64_t value) {
    *word = *word << width | (value & ((uint64_t{1} << width) - 1));
}
