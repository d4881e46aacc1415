#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "buffer/chunk/ChunkData.h"
#include "support/StreamUnits.h"

/// Follows the numbers of a recording's samples through its chunks: none may be missing, twice or out of
/// order.
class ChunkFollower {
 public:
    /// What one chunk held.
    struct Record {
        std::size_t video = 0;
        std::size_t audio = 0;
        std::size_t meta = 0;
        bool sync = false;
        /// All numbers followed on those of the chunk before.
        bool inOrder = false;
    };

    /// All media begin with the number `first`, or wherever they do.
    explicit ChunkFollower(std::optional<std::uint64_t> first = std::nullopt)
        : video_(first), audio_(first), meta_(first) {}

    void Take(const clipfileModule::ChunkData& chunk) {
        const std::lock_guard lock(mutex_);
        Record record;
        record.video = chunk.video.size();
        record.audio = chunk.audio.size();
        record.meta = chunk.meta.size();
        record.sync = chunk.sync;
        record.inOrder = follow('V', chunk.video, video_);
        record.inOrder = follow('A', chunk.audio, audio_) && record.inOrder;
        record.inOrder = follow('M', chunk.meta, meta_) && record.inOrder;
        records_.push_back(record);
    }
    std::vector<Record> Records() const {
        const std::lock_guard lock(mutex_);
        return records_;
    }

 private:
    static bool follow(char medium, const std::vector<std::shared_ptr<nal_access::SampleData>>& samples,
                       std::optional<std::uint64_t>& next) {
        bool inOrder = true;
        for (const auto& sample : samples) {
            const std::optional<std::uint64_t> number = stream_units::NumberOf(medium, *sample);
            inOrder = inOrder && number && (!next || *number == *next);
            next = number.value_or(0) + 1;
        }
        return inOrder;
    }

    mutable std::mutex mutex_;
    // Guarded by mutex_:
    std::optional<std::uint64_t> video_;
    std::optional<std::uint64_t> audio_;
    std::optional<std::uint64_t> meta_;
    std::vector<Record> records_;
};
