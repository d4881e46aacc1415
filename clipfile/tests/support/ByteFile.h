#pragma once

// Files that a test writes out byte by byte.

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <string>
#include <vector>

#include "support/TempDir.h"

namespace byte_file {

using Data = std::vector<unsigned char>;

/// Big-endian.
inline Data Number(std::uint64_t value, int width) {
    Data data;
    for (int shift = 8 * (width - 1); shift >= 0; shift -= 8) {
        data.push_back(static_cast<unsigned char>(value >> shift));
    }
    return data;
}

inline Data Join(std::initializer_list<Data> parts) {
    Data data;
    for (const Data& part : parts) {
        data.insert(data.end(), part.begin(), part.end());
    }
    return data;
}

/// 32-bit numbers.
inline Data Words(std::initializer_list<std::uint32_t> words) {
    Data data;
    for (const std::uint32_t word : words) {
        const Data bytes = Number(word, 4);
        data.insert(data.end(), bytes.begin(), bytes.end());
    }
    return data;
}

inline Data Text(const std::string& text) {
    return {text.begin(), text.end()};
}

/// A box with the small header.
inline Data MakeBox(const std::string& type, std::initializer_list<Data> parts) {
    const Data payload = Join(parts);
    return Join({Number(8 + payload.size(), 4), Text(type), payload});
}

/// A file in a folder of its own.
class ByteFile {
 public:
    explicit ByteFile(const Data& data) {
        std::ofstream out(Path(), std::ios::binary);
        out.write(reinterpret_cast<const char*>(data.data()), static_cast<std::streamsize>(data.size()));
    }
    std::filesystem::path Path() const { return folder_.Path() / "file.MP4"; }

 private:
    TempDir folder_;
};

}  // namespace byte_file
