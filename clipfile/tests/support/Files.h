#pragma once

// What tests do to recordings.

#include <filesystem>

#include "reader/BigEndian.h"
#include "reader/Box.h"
#include "support/TestStream.h"

namespace test_stream {

/// The bytes of a file with its times of creation and modification left out: a file that was never closed
/// does not tell when it was opened.
inline Data WithoutTimes(const std::filesystem::path& path) {
    Data bytes = ReadAll(path);
    const clipfile::InputFile file(path);
    clipfile::WalkTree(file, [&](const clipfile::TreeItem& item) {
        const std::uint32_t type = item.box.type;
        if (type == clipfile::FourCc("mvhd") || type == clipfile::FourCc("tkhd") ||
            type == clipfile::FourCc("mdhd")) {
            const auto times = bytes.begin() + static_cast<std::ptrdiff_t>(item.box.Payload() + 4);
            std::fill(times, times + 8, static_cast<unsigned char>(0));
        }
        return true;
    });
    return bytes;
}

}  // namespace test_stream
