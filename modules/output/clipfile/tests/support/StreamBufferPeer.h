#pragma once

#include <array>
#include <cstddef>

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
};

}  // namespace clipfileModule
