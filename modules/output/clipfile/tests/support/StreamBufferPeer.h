#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <memory>

#include "buffer/StreamBuffer.h"

namespace clipfileModule {

/// Shows tests what a recording has cached: its units reach the caches on threads of their own.
class StreamBufferPeer {
 public:
    /// Units in the video, audio and metadata cache.
    static std::array<std::size_t, 3> Cached(StreamBuffer& buffer) {
        MutexLock lock(buffer.bufferMutex);
        return {buffer.videoBuffer.size(), buffer.audioBuffer.size(), buffer.metaBuffer.size()};
    }
    /// True when a unit of audio or metadata has reached its cache.
    static bool Holds(StreamBuffer& buffer, const std::shared_ptr<StreamData>& unit) {
        MutexLock lock(buffer.bufferMutex);
        const auto isIn = [&unit](const auto& cache) {
            return std::find(cache.begin(), cache.end(), unit) != cache.end();
        };
        return isIn(buffer.audioBuffer) || isIn(buffer.metaBuffer);
    }
};

}  // namespace clipfileModule
