#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <set>
#include <vector>

namespace clipfileModule {

/// Tells where the pictures of a record, which come in decoding order, stand in the order in which they are
/// shown. Both orders are counted from the first picture on, as the files count their time: the earlier one
/// of two pictures is in front, whatever the jitter of its time, and where pictures were lost the gap closes.
///
/// The places of a record are filled without a gap and each once. An IDR frame is shown behind all pictures
/// that are decoded before it, and in front of all others (ITU-T H.264 C.4.4), so the file that begins with
/// one needs no other.
///
/// No picture is shown before it is decoded. One whose place has gone by, which only times that contradict
/// each other bring about, comes at the next free one, and all that follow come later by the place that was
/// left.
class PresentationOrder {
 public:
    /// By how many pictures the first one must be shown later than it is decoded, so that of pictures with
    /// these `times`, in decoding order and none behind an IDR frame, each can be shown in its turn.
    static std::int64_t FindDelay(const std::vector<std::uint64_t>& times);

    /// A record begins whose first picture is shown `delay` pictures later than it is decoded.
    void Begin(std::int64_t delay);
    /// Places the next picture. `times`: when it is shown, and then the pictures that are known to follow it
    /// in decoding order, among them all that are shown before it, and none from an IDR frame on. Returns by
    /// how many pictures it is shown later than it is decoded, 0 or more.
    std::int32_t Place(const std::uint64_t* times, std::size_t count, bool isIdr);
    /// True when all pictures that were placed are shown before any that follows.
    bool IsClosed() const { return taken_.empty() && firstFree_ == decoded_ + left_; }
    /// The times of the pictures placed since the last IDR frame, it included; of the latest ones where there
    /// are many.
    const std::deque<std::uint64_t>& Latest() const { return latest_; }
    /// How many of those are shown at or behind `end`.
    std::uint64_t CountFrom(std::uint64_t end) const;

 private:
    std::uint64_t nextFree(std::uint64_t place) const;
    /// Gives up the places in front of `place`, which have gone by.
    void leaveBefore(std::uint64_t place);

    std::int64_t delay_ = 0;
    std::uint64_t decoded_ = 0;
    /// Places that no picture got.
    std::uint64_t left_ = 0;
    /// All places in front of this one are taken or left.
    std::uint64_t firstFree_ = 0;
    std::set<std::uint64_t> taken_;
    std::deque<std::uint64_t> latest_;
};

}  // namespace clipfileModule
