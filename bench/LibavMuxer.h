#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "buffer/chunk/ChunkData.h"

struct AVFormatContext;
struct AVPacket;

/// libavformat's muxer of MP4 files with a video, a sound and a data track, fed chunk by chunk as the
/// module's is. All failures end the program: nobody is there to whom they could be told.
class LibavMuxer {
 public:
    /// Into the file `path`, or for an empty one into a sink that only counts.
    LibavMuxer(const std::string& path, bool fragmented);
    ~LibavMuxer();
    LibavMuxer(const LibavMuxer&) = delete;
    LibavMuxer& operator=(const LibavMuxer&) = delete;

    void Write(const clipfileModule::ChunkData& chunk);
    /// Completes and closes the file.
    void Close();
    std::uint64_t Bytes() const { return bytes_; }

 private:
    void AddVideo();
    void AddSound();
    void AddData();
    void WriteList(const std::vector<std::shared_ptr<nal_access::SampleData>>& samples, int stream,
                   std::int64_t duration, std::int64_t& time);

    AVFormatContext* format_ = nullptr;
    AVPacket* packet_ = nullptr;
    const bool counting_;
    std::uint64_t bytes_ = 0;
    std::int64_t pictureTime_ = 0;
    std::int64_t soundTime_ = 0;
    std::int64_t dataTime_ = 0;
};
