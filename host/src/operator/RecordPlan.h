#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

namespace receiver {

/// A stretch of the stream that is to be recorded, in ticks of 90000 a second since its first frame.
struct RecordRange {
    std::int64_t begin = 0;
    /// The first instant that is no longer recorded; nothing for an open end.
    std::optional<std::int64_t> end;

    friend bool operator==(const RecordRange&, const RecordRange&) = default;
};

/// Reads "2-9,12.5-20,30-": seconds, ascending, apart from each other, the last one with or without an end.
/// Nothing for any other text.
std::optional<std::vector<RecordRange>> ParseRecordRanges(std::string_view text);

/// Decides for each frame whether it is recorded, from ranges and from what the operator commands.
///
/// A recording begins at a frame of its own accord only when that is an IDR frame: a file can begin nowhere
/// else, and what the module would collect until then, it would have to trim.
class RecordPlan {
 public:
    /// Without ranges everything from the first frame on is recorded.
    explicit RecordPlan(std::vector<RecordRange> ranges);

    /// The record flag of the next frame, `elapsed` ticks after the first one.
    bool Next(std::int64_t elapsed, bool keyFrame);

    /// Commands of the operator; they hold until the next one or the next border of a range.
    void Start() { wanted_ = !finished_; }
    void Stop() { wanted_ = false; }
    /// The stream is interrupted: the recording ends, and the next one begins at the next IDR frame.
    void Interrupt() { recording_ = false; }
    /// The end of the run: nothing is recorded any more.
    void Finish() {
        finished_ = true;
        wanted_ = false;
    }

    /// The flag of the last frame.
    bool Recording() const { return recording_; }
    /// A recording is commanded, though it may still wait for its IDR frame.
    bool Wanted() const { return wanted_; }

 private:
    struct Border {
        std::int64_t time;
        bool record;
    };

    std::vector<Border> borders_;
    std::size_t passed_ = 0;
    bool wanted_;
    bool recording_ = false;
    bool finished_ = false;
};

}  // namespace receiver
