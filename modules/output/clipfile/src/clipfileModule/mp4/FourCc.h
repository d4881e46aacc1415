#pragma once

#include <cstdint>

namespace clipfileModule {

/// A four-character code of a box, brand or handler as the number that boxes carry.
constexpr std::uint32_t FourCc(const char (&text)[5]) {
    std::uint32_t code = 0;
    for (int i = 0; i < 4; ++i) {
        code = code << 8 | static_cast<unsigned char>(text[i]);
    }
    return code;
}

}  // namespace clipfileModule
