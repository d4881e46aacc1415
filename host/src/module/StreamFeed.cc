#include "module/StreamFeed.h"

#include <algorithm>
#include <memory>

namespace receiver {
namespace {

/// Where the timeline of a run begins. Not 0, which the module takes for "from the beginning of everything".
constexpr std::int64_t kOriginSeconds = 10;

/// A queue of the module holds 50; above this one the feed waits, until it is half empty: a feed that waits
/// for room for a single unit and the module would wake each other for each.
constexpr std::uint64_t kQueueBound = 40;
constexpr std::uint64_t kQueueRefill = 20;
/// Units from one mark to the next.
constexpr int kUnitsPerMark = 8;

/// A disk that hangs slows the feed down and does not stop it: the module has to find out and say so.
constexpr std::chrono::milliseconds kDiskPause{1000};
/// Far below the 600 units that the module caches, far above what a late medium needs.
constexpr std::size_t kUncutBound = 250;
/// A pause for the thread that cuts chunks. It cannot be waited for: it may need more of the stream.
constexpr std::chrono::milliseconds kUncutPause{5};

std::shared_ptr<StreamData> MakeUnit(std::int64_t time, std::int64_t clock,
                                     const std::shared_ptr<unsigned char>& data, std::size_t size,
                                     std::function<void()> released) {
    const std::shared_ptr<StreamData> unit(new StreamData,
                                           [released = std::move(released)](StreamData* gone) {
                                               delete gone;
                                               if (released) {
                                                   released();
                                               }
                                           });
    unit->rtp_timestamp = static_cast<std::uint64_t>(time + kOriginSeconds * clock);
    unit->timestamp = unit->rtp_timestamp * 1000 / static_cast<std::uint64_t>(clock);
    unit->data = data;
    unit->size = size;
    unit->payload = data.get();
    return unit;
}

}  // namespace

void StreamFeed::PushVideo(std::int64_t time, const std::shared_ptr<unsigned char>& data, std::size_t size) {
    Push(video_, MakeUnit(time, kVideoClock, data, size, frames_.Enter()));
}

void StreamFeed::PushReordered(std::int64_t time, std::int64_t shown,
                               const std::shared_ptr<unsigned char>& data, std::size_t size) {
    const std::shared_ptr<StreamData> unit = MakeUnit(time, kVideoClock, data, size, frames_.Enter());
    unit->presentation_timestamp = unit->rtp_timestamp + static_cast<std::uint64_t>(shown - time);
    Push(video_, unit);
}

void StreamFeed::PushAudio(std::int64_t time, const std::shared_ptr<unsigned char>& data, std::size_t size) {
    Push(audio_, MakeUnit(time, kAudioClock, data, size, {}));
}

void StreamFeed::PushMeta(std::int64_t time, const std::vector<unsigned char>& bytes) {
    const std::shared_ptr<unsigned char> data(new unsigned char[bytes.size()],
                                              std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), data.get());
    Push(meta_, MakeUnit(time, kVideoClock, data, bytes.size(), {}));
}

void StreamFeed::Push(Queue& queue, const std::shared_ptr<StreamData>& unit) {
    // One place for the unit, one for the mark behind it.
    if (queue.gauge.Bound() > kQueueBound - 2) {
        WaitFor(queue, kQueueRefill);
    }
    queue.gauge.Enter();
    (stream_.*queue.push)(unit);
    if (++queue.sinceMark >= kUnitsPerMark) {
        PushMark(queue);
    }
}

void StreamFeed::PushMark(Queue& queue) {
    queue.sinceMark = 0;
    // Others that get lost do so later, in a flush, and nobody reports them.
    const std::uint64_t before = queue.gauge.Dropped();
    (stream_.*queue.push)(queue.gauge.MakeMark());
    droppedMarks_ += queue.gauge.Dropped() - before;
}

void StreamFeed::WaitFor(Queue& queue, std::uint64_t bound) {
    const bool stalled = queue.stalledAt == queue.gauge.Passed();
    const auto wait = [&](std::chrono::milliseconds part) { return queue.gauge.WaitForBound(bound, part); };
    if (WaitInParts(wait, stalled ? std::chrono::milliseconds(0) : patience_)) {
        queue.stalledAt.reset();
    } else {
        queue.stalledAt = queue.gauge.Passed();
    }
}

bool StreamFeed::WaitInParts(const std::function<bool(std::chrono::milliseconds)>& wait,
                             std::chrono::milliseconds patience) const {
    using std::chrono::steady_clock;
    const auto end = steady_clock::now() + patience;
    auto left = patience;
    while (!wait(std::min(left, kMeanwhile))) {
        left = std::chrono::ceil<std::chrono::milliseconds>(end - steady_clock::now());
        if (left <= std::chrono::milliseconds(0)) {
            return false;
        }
        if (meanwhile_) {
            meanwhile_();
        }
    }
    return true;
}

void StreamFeed::Settle() {
    for (Queue* const queue : {&video_, &audio_, &meta_}) {
        PushMark(*queue);
    }
    for (Queue* const queue : {&video_, &audio_, &meta_}) {
        WaitFor(*queue, 0);
    }
}

void StreamFeed::WaitForDisk(std::size_t chunks) {
    WaitForChunks(chunks, kDiskPause);
    frames_.WaitForUncut(kUncutBound, kUncutPause);
}

bool StreamFeed::WaitForChunks(std::size_t chunks, std::chrono::milliseconds patience) const {
    return WaitInParts([&](std::chrono::milliseconds part) { return frames_.WaitForChunks(chunks, part); },
                       patience);
}

}  // namespace receiver
