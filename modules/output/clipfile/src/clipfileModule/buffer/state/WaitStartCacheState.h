#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "buffer/state/CacheState.h"
#include "common/OutputSettings.h"

namespace clipfileModule {

/// The recording waits for its first IDR frame with both parameter sets. Audio and metadata are cached from
/// the start timestamp on, video is dropped.
class WaitStartCacheState : public CacheState {
 public:
    explicit WaitStartCacheState(StreamBufferInterface* owner, RecordRules recordRules = RecordRules::kKept,
                                 PictureOrder pictureOrder = PictureOrder::kPresentation);

    /// Drops or queues the unit, or takes it as the start of the recording. The IDR frame that starts it is
    /// not queued: it reaches the video cache on entry of the start state.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;

 private:
    bool isBeforeStart(const StreamData& unit, std::string_view mediaType) const;
    /// The stop timestamp to cancel the recording with, when the unit says that it can begin no more.
    std::optional<std::int64_t> stopPassedBy(const StreamData& unit, std::string_view mediaType) const;

    /// When the unit is presented, in milliseconds.
    std::uint64_t presentedAt(const StreamData& unit, std::string_view mediaType) const;

    const RecordRules rules;
    const PictureOrder order;
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
};

}  // namespace clipfileModule
