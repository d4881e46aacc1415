#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "StreamAnalyzer.h"
#include "StreamData.h"

namespace clipfileModule {

/// The unit of work between `StreamBuffer` and `FileOutput`: the samples of eight video units with just the
/// audio and metadata that belong to them. Filled by one thread, and read-only once it was queued.
struct ChunkData {
    /// Bytes of all samples in the three lists together.
    std::uint64_t size = 0;
    // Contract: chunk-reserved-words. Always zero.
    std::uint64_t reserved0 = 0;
    std::uint64_t reserved1 = 0;
    std::uint64_t reserved2 = 0;
    /// True when the audio and video cadences meet at the end of this chunk: a new file may begin behind it.
    bool sync = false;
    std::vector<std::shared_ptr<nal_access::SampleData>> video;
    std::vector<std::shared_ptr<nal_access::SampleData>> audio;
    std::vector<std::shared_ptr<nal_access::SampleData>> meta;
    /// First units of the chunk, before conversion. The timecode of a file is read from `firstMeta`.
    std::shared_ptr<StreamData> firstVideo;
    std::shared_ptr<StreamData> firstMeta;
    /// Of video in decoding order: when the first of these pictures is shown that is shown, on the clock of
    /// `rtp_timestamp`.
    std::uint64_t firstShown = 0;
    /// Of video in decoding order: by how many pictures each of `video` is shown later than it is decoded.
    /// Empty where both orders are one.
    std::vector<std::int32_t> shownLater;
    /// Of these: every picture so far is shown before all that follow.
    bool isOrderClosed = false;
    /// Of these, this chunk included: pictures that others need and that lie behind the end of the record.
    std::uint64_t hiddenVideo = 0;
};

}  // namespace clipfileModule
