#pragma once

#include <cstddef>
#include <filesystem>
#include <set>

#include "damaged/TransportStream.h"
#include "support/CodedMedia.h"

namespace endtoend {

/// Seconds that a picture and an audio frame of the material last.
inline constexpr double kPicture = 1.0 / 25;
inline constexpr double kSound = 1024.0 / 48000;

/// What of the material comes through a damage whole, in numbers of pictures and audio frames that were sent.
struct Intact {
    std::set<std::size_t> pictures;
    std::set<std::size_t> sounds;
};

/// Of a transport stream: units of which no packet is missing, marked as erroneous or other than it was, and
/// whose packets are counted without a break. A packet that comes twice is a break too.
Intact IntactOf(const Pieces& sent, const Pieces& damaged);

/// Of a file of another container, which begins with `sent`'s bytes and now holds those of `damaged`: frames
/// of which no byte is another.
Intact IntactOf(const std::filesystem::path& file, const Bytes& sent, const Bytes& damaged);

/// How many of these recordings hold at least.
struct Owed {
    std::size_t pictures = 0;
    std::size_t sounds = 0;
};

/// A recording begins with an IDR frame, and so does the one behind a gap of more than half a second. With
/// missing pictures goes the sound that belongs to them, and up to a frame at each edge.
Owed OwedOf(const Intact& intact, const CodedMedia& sent);

}  // namespace endtoend
