#include "recover/ChunkSource.h"

#include <algorithm>

namespace clipfile {

namespace {

constexpr std::uint64_t kAudioRate = 48000;
constexpr std::uint64_t kAudioFrame = 1024;

}  // namespace

Chunk SampleClock::Cut(Chunk chunk, std::size_t pictures) const {
    if (pictures == 0 || timescale_ == 0) {
        return nullptr;
    }
    chunk->video.resize(std::min(pictures, chunk->video.size()));
    chunk->meta.resize(std::min(chunk->video.size(), chunk->meta.size()));
    const std::uint64_t end = (pictures_ + chunk->video.size()) * pictureDuration_ * kAudioRate / timescale_;
    std::size_t frames = 0;
    while (frames < chunk->audio.size() && (audioFrames_ + frames) * kAudioFrame + kAudioFrame / 2 <= end) {
        ++frames;
    }
    chunk->audio.resize(frames);
    return chunk;
}

}  // namespace clipfile
