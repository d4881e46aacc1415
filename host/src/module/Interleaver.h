#pragma once

#include <array>
#include <cstdint>
#include <deque>
#include <optional>

#include "source/SourceInterface.h"

namespace receiver {

/// Puts the units of a source in one order of time across its media. The module cuts chunks by counting
/// units, so audio that reaches it on the wrong side of the frame which starts a record would stay out of
/// step for the whole record; and what a multiplexer sends late, often half a second, must not be on the
/// wrong side.
///
/// At the same instant KLV comes before video, since it goes with that frame, and video before audio.
class Interleaver {
 public:
    /// No unit is held back for longer than this, in stream time, when another medium falls silent.
    static constexpr std::int64_t kPatienceSeconds = 2;

    void Put(SourceUnit unit);
    /// The next unit, if nothing earlier is to be expected.
    std::optional<SourceUnit> Take();
    /// The next unit, whatever is to be expected: the source is over, or was lost and what follows lies
    /// behind a gap.
    std::optional<SourceUnit> TakeRest();

 private:
    static constexpr std::size_t kMedia = 3;

    /// The medium whose unit is the next one; null when there is none.
    std::deque<SourceUnit>* Next();
    static SourceUnit PopFront(std::deque<SourceUnit>& units);

    /// In the order in which units of the same instant come out.
    std::array<std::deque<SourceUnit>, kMedia> waiting_;
    /// The latest time that was put in, on the common clock. Media that others wait for: video and audio.
    std::array<std::int64_t, kMedia> latest_{-1, -1, -1};
};

}  // namespace receiver
