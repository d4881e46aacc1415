#pragma once

// Finds boxes in a file by their path. Knows headers and containers, nothing of what boxes mean.

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace box_finder {

using Bytes = std::vector<unsigned char>;

inline std::uint64_t Number(const Bytes& bytes, std::size_t at, int count) {
    std::uint64_t value = 0;
    for (int i = 0; i < count; ++i) {
        value = value << 8 | bytes.at(at + static_cast<std::size_t>(i));
    }
    return value;
}

struct FoundBox {
    std::string type;
    std::size_t offset;  // of the header, in the file
    std::size_t header;  // size of it
    std::size_t size;    // of the whole box
    Bytes payload;
};

/// The boxes that stand one behind the other in `bytes`, which begins at `offset` of its file. Throws when
/// they do not fill it exactly.
inline std::vector<FoundBox> Children(const Bytes& bytes, std::size_t offset = 0) {
    std::vector<FoundBox> boxes;
    for (std::size_t at = 0; at < bytes.size();) {
        std::uint64_t size = Number(bytes, at, 4);
        std::size_t header = 8;
        if (size == 1) {
            size = Number(bytes, at + 8, 8);
            header = 16;
        }
        if (size < header || size > bytes.size() - at) {
            throw std::runtime_error("box of " + std::to_string(size) + " bytes at " +
                                     std::to_string(offset + at));
        }
        const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(at);
        boxes.push_back(
            {std::string(begin + 4, begin + 8), offset + at, header, size,
             Bytes(begin + static_cast<std::ptrdiff_t>(header), begin + static_cast<std::ptrdiff_t>(size))});
        at += size;
    }
    return boxes;
}

inline std::vector<FoundBox> Children(const FoundBox& box) {
    return Children(box.payload, box.offset + box.header);
}

/// Types in their order, as "ftyp uuid mdat moov".
inline std::string Types(const std::vector<FoundBox>& boxes) {
    std::string text;
    for (const FoundBox& box : boxes) {
        text += (text.empty() ? "" : " ") + box.type;
    }
    return text;
}

/// The box at a path such as "moov/trak:2/mdia", where ":2" means the second of its type. Throws when there
/// is none.
inline FoundBox Find(const Bytes& file, const std::string& path) {
    std::vector<FoundBox> level = Children(file);
    std::optional<FoundBox> found;
    for (std::size_t at = 0; at <= path.size();) {
        const std::size_t end = std::min(path.find('/', at), path.size());
        const std::string step = path.substr(at, end - at);
        int nth = step.size() > 5 ? std::stoi(step.substr(5)) : 1;
        if (found) {
            level = Children(*found);
        }
        found.reset();
        for (FoundBox& box : level) {
            if (box.type == step.substr(0, 4) && --nth == 0) {
                found = std::move(box);
                break;
            }
        }
        if (!found) {
            throw std::runtime_error("no " + step + " of " + path);
        }
        at = end + 1;
    }
    return *found;
}

/// A number in the payload of the box at `path`.
inline std::uint64_t Field(const Bytes& file, const std::string& path, std::size_t at, int count) {
    return Number(Find(file, path).payload, at, count);
}

}  // namespace box_finder
