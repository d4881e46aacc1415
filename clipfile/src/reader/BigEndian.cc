#include "reader/BigEndian.h"

namespace clipfile {

namespace {

void AppendHex(std::string& text, unsigned char byte) {
    static constexpr char kDigits[] = "0123456789ABCDEF";
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15];
}

}  // namespace

std::string FourCcText(std::uint32_t code) {
    std::string text;
    for (int shift = 24; shift >= 0; shift -= 8) {
        const auto byte = static_cast<unsigned char>(code >> shift);
        if (byte >= 0x20 && byte < 0x7F) {
            text += static_cast<char>(byte);
        } else {
            text += "\\x";
            AppendHex(text, byte);
        }
    }
    return text;
}

std::string HexText(std::span<const unsigned char> bytes) {
    std::string text;
    for (const unsigned char byte : bytes) {
        AppendHex(text, byte);
    }
    return text;
}

}  // namespace clipfile
