#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "buffer/chunk/ChunkData.h"

namespace clipfile {

/// Bytes of a chunk, above which it is none of a recording: eight pictures at the highest bit rates have 20
/// MB.
inline constexpr std::uint64_t kMaxChunk = 256 * 1024 * 1024;

using Chunk = std::shared_ptr<clipfileModule::ChunkData>;

/// The chunks of a recording in the order of the file, up to where it is torn. The last one may be shorter:
/// it then holds the pictures that are whole, with their metadata and their audio.
class ChunkSource {
 public:
    virtual ~ChunkSource() = default;
    /// The next chunk, or null at the end.
    virtual Chunk Next() = 0;
    /// Where the samples end that were given so far, or, at the end, where the good bytes end.
    virtual std::uint64_t Position() const = 0;
};

/// Counts the samples of a recording, to cut its last chunk in step.
class SampleClock {
 public:
    /// Ticks of the video track in a second and in a picture.
    SampleClock(std::uint32_t timescale, std::uint32_t pictureDuration)
        : timescale_(timescale), pictureDuration_(pictureDuration) {}

    void Count(const clipfileModule::ChunkData& chunk) {
        pictures_ += chunk.video.size();
        audioFrames_ += chunk.audio.size();
    }
    /// Cuts a chunk, which is not counted yet, to its first `pictures` pictures: as many units of metadata,
    /// and audio to within half a frame of where they end. Null without pictures.
    Chunk Cut(Chunk chunk, std::size_t pictures) const;

 private:
    std::uint64_t timescale_;
    std::uint64_t pictureDuration_;
    std::uint64_t pictures_ = 0;
    std::uint64_t audioFrames_ = 0;
};

}  // namespace clipfile
