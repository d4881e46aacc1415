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
/// The places of a record are filled without a gap and each once, whatever the times are. An IDR frame is
/// shown behind all pictures that are decoded before it, and in front of all others (ITU-T H.264 C.4.4), so
/// the file that begins with one needs no other.
class PresentationOrder {
 public:
    /// A record begins whose first picture is shown `delay` pictures later than it is decoded.
    void Begin(std::int64_t delay);
    /// Places the next picture. `times`: when it is shown, and then the pictures that are known to follow it
    /// in decoding order, among them all that are shown before it, and none from an IDR frame on. Returns by
    /// how many pictures it is shown later than it is decoded. None is shown earlier; one whose times say so
    /// is shown at once.
    std::int32_t Place(const std::uint64_t* times, std::size_t count, bool isIdr);
    /// How many of the pictures placed lately are shown at or behind `end`.
    std::uint64_t CountFrom(std::uint64_t end) const;

 private:
    std::int64_t delay_ = 0;
    std::uint64_t decoded_ = 0;
    /// All places in front of this one are taken.
    std::uint64_t firstFree_ = 0;
    std::set<std::uint64_t> taken_;
    std::deque<std::uint64_t> lately_;
};

}  // namespace clipfileModule
