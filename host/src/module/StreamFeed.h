#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "QxModuleStreamInterface.h"
#include "module/FrameLedger.h"
#include "module/QueueGauge.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Pushes a stream into the module, no faster than it can take it: with exact rules, too, the module drops
/// what its queues have no room for, has no other way of saying that it is too much, and forgets what is in
/// them when the host goes offline.
///
/// Timestamps. `rtp_timestamp` is the unit's time plus ten seconds on the clock of its medium, 64 bits wide
/// and never wrapped. `timestamp` is the same in whole milliseconds, rounded down for all media, as the
/// module does when it compares a record's limits with it.
///
/// One thread at a time.
class StreamFeed {
 public:
    /// The module can be held up for 3.5 s by a disk that hangs, and goes on then.
    static constexpr std::chrono::milliseconds kPatience{5000};
    static constexpr std::chrono::milliseconds kMeanwhile{50};

    /// A queue of the module that has not moved for `patience` is not waited for again until it does.
    /// `meanwhile`, which may be null, is called every `kMeanwhile` of a wait, on the waiting thread. It must
    /// not call the feed.
    explicit StreamFeed(QxModuleStreamInterface& stream, std::chrono::milliseconds patience = kPatience,
                        std::function<void()> meanwhile = nullptr)
        : stream_(stream), patience_(patience), meanwhile_(std::move(meanwhile)) {}
    StreamFeed(const StreamFeed&) = delete;
    StreamFeed& operator=(const StreamFeed&) = delete;

    /// Times in ticks of 90000 a second, for audio of 48000.
    void PushVideo(std::int64_t time, const std::shared_ptr<unsigned char>& data, std::size_t size);
    /// A picture that is decoded at `time` and shown at `shown`, for a module that takes pictures in decoding
    /// order.
    void PushReordered(std::int64_t time, std::int64_t shown, const std::shared_ptr<unsigned char>& data,
                       std::size_t size);
    void PushAudio(std::int64_t time, const std::shared_ptr<unsigned char>& data, std::size_t size);
    void PushMeta(std::int64_t time, const std::vector<unsigned char>& bytes);

    /// Waits until the module has taken everything that was pushed out of its first queues, which it empties
    /// when the host goes offline.
    void Settle();

    /// For sources that can wait: waits a little when more than `chunks` wait for the disk, or when the
    /// module is behind with cutting them. A file at full speed would otherwise outrun the disk, which costs
    /// a recording.
    void WaitForDisk(std::size_t chunks);
    /// Waits until no more than `chunks` wait for the disk. False after `patience`.
    bool WaitForChunks(std::size_t chunks, std::chrono::milliseconds patience) const;

    /// Marks that the module had no room for, and reports as it does lost units.
    std::uint64_t DroppedMarks() const { return droppedMarks_; }

    /// What the module holds of the video.
    const FrameLedger& Frames() const { return frames_; }

 private:
    struct Queue {
        void (QxModuleStreamInterface::*push)(const std::shared_ptr<StreamData>&);
        QueueGauge gauge{};
        int sinceMark = 0;
        /// How far it had come when it was waited for in vain.
        std::optional<std::uint64_t> stalledAt{};
    };

    void Push(Queue& queue, const std::shared_ptr<StreamData>& unit);
    void PushMark(Queue& queue);
    void WaitFor(Queue& queue, std::uint64_t bound);
    /// Calls `wait` with parts of `patience` until it gives true. False when it never does.
    bool WaitInParts(const std::function<bool(std::chrono::milliseconds)>& wait,
                     std::chrono::milliseconds patience) const;

    QxModuleStreamInterface& stream_;
    const std::chrono::milliseconds patience_;
    const std::function<void()> meanwhile_;
    Queue video_{&QxModuleStreamInterface::PushVideo};
    Queue audio_{&QxModuleStreamInterface::PushAudio};
    Queue meta_{&QxModuleStreamInterface::PushMeta};
    FrameLedger frames_;
    std::uint64_t droppedMarks_ = 0;
};

}  // namespace receiver
