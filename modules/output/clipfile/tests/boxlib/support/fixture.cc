#include "boxlib/support/fixture.h"

#include <algorithm>
#include <cctype>
#include <stdexcept>

Bytes Hex(const std::string& text) {
    Bytes bytes;
    const auto digit = [](char c) {
        if (!std::isxdigit(static_cast<unsigned char>(c)))
            throw std::invalid_argument("not a hexadecimal digit");
        return std::isdigit(static_cast<unsigned char>(c)) ? c - '0' : std::toupper(c) - 'A' + 10;
    };
    for (size_t i = 0; i < text.size();) {
        if (text[i] == ' ') {
            i++;
        } else if (text[i] == '\'') {
            const size_t end = text.find('\'', i + 1);
            if (end == std::string::npos) throw std::invalid_argument("quote without end");
            bytes.insert(bytes.end(), text.begin() + static_cast<std::ptrdiff_t>(i) + 1,
                         text.begin() + static_cast<std::ptrdiff_t>(end));
            i = end + 1;
        } else {
            if (i + 1 == text.size()) throw std::invalid_argument("half a byte");
            bytes.push_back(static_cast<uint8_t>(digit(text[i]) << 4 | digit(text[i + 1])));
            i += 2;
        }
    }
    return bytes;
}

Bytes Repeat(uint8_t byte, size_t count) {
    return Bytes(count, byte);
}

Bytes Words(std::initializer_list<uint32_t> words) {
    Bytes bytes;
    for (const uint32_t word : words) {
        for (int shift = 24; shift >= 0; shift -= 8) bytes.push_back(static_cast<uint8_t>(word >> shift));
    }
    return bytes;
}

Bytes operator+(Bytes a, const Bytes& b) {
    a.insert(a.end(), b.begin(), b.end());
    return a;
}

std::string Dump(const Bytes& bytes) {
    std::string text;
    char cell[24];
    for (size_t i = 0; i < bytes.size(); i++) {
        if (i % 16 == 0) {
            std::snprintf(cell, sizeof(cell), "\n%06zx:", i);
            text += cell;
        }
        std::snprintf(cell, sizeof(cell), i % 4 == 0 ? "  %02x" : " %02x", bytes[i]);
        text += cell;
    }
    return text;
}

testing::AssertionResult SameBytes(const char* actualText, const char* expectedText, const Bytes& actual,
                                   const Bytes& expected) {
    if (actual == expected) return testing::AssertionSuccess();
    const auto line = [](const Bytes& bytes, size_t begin) {
        const size_t end = std::min(bytes.size(), begin + 32);
        if (begin >= end) return std::string(" nothing");
        return Dump(Bytes(bytes.begin() + static_cast<std::ptrdiff_t>(begin),
                          bytes.begin() + static_cast<std::ptrdiff_t>(end)));
    };
    const auto differing = std::mismatch(actual.begin(), actual.end(), expected.begin(), expected.end());
    const auto offset = static_cast<size_t>(differing.first - actual.begin());
    const size_t begin = offset / 16 * 16;
    return testing::AssertionFailure()
           << actualText << " has " << actual.size() << " bytes, " << expectedText << " has "
           << expected.size() << "; they differ at byte " << offset << ".\nFrom byte " << begin
           << " on, actual:" << line(actual, begin) << "\nexpected:" << line(expected, begin);
}
