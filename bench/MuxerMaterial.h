#pragma once

// The same made-up stream for both muxers of muxer_race: 59.94 pictures a second and as many units of
// metadata, sound of 48 kHz, in chunks of eight pictures as the module cuts them.

#include <cstdint>
#include <memory>
#include <vector>

#include "buffer/chunk/ChunkData.h"

namespace muxer_material {

inline constexpr std::uint32_t kPictureTicks = 1001;
inline constexpr std::uint32_t kPictureTimescale = 60000;
inline constexpr std::uint32_t kSoundTicks = 1024;
inline constexpr std::uint32_t kSoundTimescale = 48000;
inline constexpr std::uint64_t kPicturesPerChunk = 8;
/// High profile, level 4.2; a decoder would find nothing behind these bytes, and none looks.
inline const std::vector<unsigned char> kSequenceSet = {0x67, 0x64, 0x00, 0x2A, 0xAC};
inline const std::vector<unsigned char> kPictureSet = {0x68, 0xEE, 0x3C};

/// Frames of sound that begin before picture `number` is over.
inline std::uint64_t SoundBefore(std::uint64_t number) {
    return number * kPictureTicks * kSoundTimescale / (std::uint64_t{kPictureTimescale} * kSoundTicks);
}

/// Makes chunks without end. Sizes are uniform by half around `pictureBytes`, so that tables find no runs.
/// Bytes are shared between pictures: a day of them fits in memory.
class Chunks {
 public:
    explicit Chunks(std::size_t pictureBytes) {
        std::uint32_t state = 1;
        for (std::size_t i = 0; i < kKinds; ++i) {
            state = state * 1664525 + 1013904223;
            const std::size_t size = pictureBytes / 2 + (std::uint64_t{state} * pictureBytes >> 32);
            pictures_.push_back(Sample(size, i % kGroup == 0));
        }
        sound_ = Sample(300, true);
        metadata_ = Sample(200, true);
    }

    std::shared_ptr<clipfileModule::ChunkData> Next() {
        auto chunk = std::make_shared<clipfileModule::ChunkData>();
        for (std::uint64_t i = 0; i < kPicturesPerChunk; ++i) {
            chunk->video.push_back(pictures_[(picture_ + i) % kKinds]);
            chunk->meta.push_back(metadata_);
        }
        const std::uint64_t end = picture_ + kPicturesPerChunk;
        chunk->audio.assign(SoundBefore(end) - SoundBefore(picture_), sound_);
        picture_ = end;
        return chunk;
    }

 private:
    static constexpr std::size_t kKinds = 240;
    static constexpr std::size_t kGroup = 60;  // pictures from IDR frame to IDR frame

    static std::shared_ptr<nal_access::SampleData> Sample(std::size_t size, bool sync) {
        return std::make_shared<nal_access::SampleData>(std::vector<unsigned char>(size, 0x5A), 0, 0, sync);
    }

    std::vector<std::shared_ptr<nal_access::SampleData>> pictures_;
    std::shared_ptr<nal_access::SampleData> sound_;
    std::shared_ptr<nal_access::SampleData> metadata_;
    std::uint64_t picture_ = 0;
};

}  // namespace muxer_material
