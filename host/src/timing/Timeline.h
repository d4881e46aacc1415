#pragma once

#include <cstdint>
#include <optional>

namespace receiver {

/// The counter of `bits` bits that is meant, of all that look like `stamp`: the one nearest to `reference`.
/// With 63 bits or more nothing wraps, and `stamp` is the answer.
std::int64_t UnwrapNear(std::int64_t stamp, int bits, std::int64_t reference);

/// Puts the stamps of a source, whatever its clock does, on one line of time that only goes forward. All
/// numbers are ticks of 90000 a second; stamps are unwrapped.
///
/// A line is `stamp + offset`. The offset is the same for all media, which keeps them in step, and changes
/// when the source is anchored anew or when a stamp cannot belong to it: its clock has jumped. For a while
/// after a jump both offsets are in use, since the other media get there later. Not for several threads.
class Timeline {
 public:
    /// How far a stamp may stand ahead of what its medium has reached and still be a gap. What lies further
    /// is a jump of the clock.
    static constexpr std::int64_t kLongestGap = std::int64_t{10} * 90000;
    /// How long the offset from before a jump stays in use.
    static constexpr std::int64_t kOverlap = std::int64_t{5} * 90000;

    bool Anchored() const { return offset_.has_value(); }
    /// Makes `stamp` stand at `time`.
    void Anchor(std::int64_t stamp, std::int64_t time);

    struct Place {
        std::int64_t time = 0;
        /// What the source's clock jumped by to stand there, 0 when it did not jump.
        std::int64_t jump = 0;
    };
    /// Where `stamp` stands. `expected` is where the medium's next unit would stand were the source to go on
    /// evenly; `elapsed` is how much longer than that nothing has come (0 where the wall clock does not
    /// count); `back` is how far behind `expected` a stamp of this medium may stand. A line must be anchored.
    Place TimeOf(std::int64_t stamp, std::int64_t expected, std::int64_t elapsed, std::int64_t back);
    /// The source's clock made a step by so many ticks (below 0: back) where its next unit is expected at
    /// `time`.
    void Step(std::int64_t ticks, std::int64_t time);
    /// Where `stamp` stands by the offset that brings it nearest to `expected`, for media that tell nothing
    /// of jumps. A line must be anchored.
    std::int64_t Nearest(std::int64_t stamp, std::int64_t expected) const;

 private:
    std::optional<std::int64_t> offset_;
    std::optional<std::int64_t> previous_;
    /// The time of the last jump.
    std::int64_t jumped_ = 0;
};

}  // namespace receiver
