#pragma once

#include "LogCapture.h"
#include "support/LogLines.h"

/// Where the log lines of a recording and of its states come from.
namespace stream_buffer_log {

inline constexpr char kFile[] = "modules/output/clipfile/src/clipfileModule/buffer/StreamBuffer.cc";
inline constexpr char kChunkFile[] = "modules/output/clipfile/src/clipfileModule/buffer/StreamBufferChunk.cc";

inline constexpr char kStart[] = "clipfileModule::StreamBuffer::Start";
inline constexpr char kStop[] = "clipfileModule::StreamBuffer::Stop";
inline constexpr char kCancel[] = "clipfileModule::StreamBuffer::Cancel";
inline constexpr char kSetHeader[] = "clipfileModule::StreamBuffer::SetVideoSequenceHeader";
inline constexpr char kRemoveBefore[] = "clipfileModule::StreamBuffer::removeBefore";
inline constexpr char kMakeChunk[] = "clipfileModule::StreamBuffer::makeChunk";
inline constexpr char kDump[] = "clipfileModule::CacheState::dump";

/// A line that `StreamBuffer.cc` logs.
inline auto Line(_LogPriority priority, const char* function, const char* text) {
    return LineOf(kFile, priority, function, text);
}

}  // namespace stream_buffer_log
