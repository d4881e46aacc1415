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

/// What a plan says of a frame.
struct RecordDecision {
    /// The record flag.
    bool record = false;
    /// A recording has ended in front of the frame; one begins with it. Both where one follows the other.
    bool ended = false;
    bool begun = false;

    friend bool operator==(const RecordDecision&, const RecordDecision&) = default;
};

/// A stretch of the stream that was to be recorded and of which nothing is: it held no IDR frame. In ticks of
/// 90000 a second since the first frame of the stream.
struct MissedRecording {
    std::int64_t begin = 0;
    std::int64_t end = 0;

    friend bool operator==(const MissedRecording&, const MissedRecording&) = default;
};

/// Decides for each frame whether it is recorded, from ranges and from what the operator commands.
///
/// A recording begins at a frame of its own accord only when that is an IDR frame: a file can begin nowhere
/// else, and what the module would collect until then, it would have to trim.
class RecordPlan {
 public:
    /// Without ranges everything from the first frame on is recorded.
    explicit RecordPlan(std::vector<RecordRange> ranges);

    /// What becomes of the next frame, `elapsed` ticks after the first one.
    RecordDecision Next(std::int64_t elapsed, bool keyFrame);

    /// Commands of the operator; they hold until the next one or the next border of a range.
    void Start();
    void Stop();
    /// The recording goes on as another one from the next IDR frame on.
    void Split() { split_ = true; }
    /// The stream is interrupted: the recording ends, and the next one begins at the next IDR frame.
    void Interrupt() { recording_ = false; }
    /// The end of the run: nothing is recorded any more.
    void Finish();

    /// The flag of the last frame.
    bool Recording() const { return recording_; }
    /// A recording is commanded, though it may still wait for its IDR frame.
    bool Wanted() const { return wanted_; }
    /// A stop was commanded since the last frame.
    bool Stopped() const { return stopped_; }
    bool Finished() const { return finished_; }

    /// What was missed since the last call.
    std::vector<MissedRecording> TakeMissed();
    /// The first range that the stream has not come to.
    std::optional<RecordRange> Unreached() const;

 private:
    struct Border {
        std::int64_t time;
        bool record;
    };

    void Want(std::int64_t since);
    void Unwant(std::int64_t end);

    std::vector<Border> borders_;
    std::size_t passed_ = 0;
    bool wanted_;
    bool recording_ = false;
    bool finished_ = false;
    /// Since the last frame.
    bool stopped_ = false;
    bool split_ = false;
    /// Of the last frame; nothing before the first.
    std::optional<std::int64_t> elapsed_;
    /// Something was recorded since a recording was wanted last.
    bool begun_ = false;
    /// Since when one is wanted of which there is nothing yet.
    std::optional<std::int64_t> waitingSince_;
    std::vector<MissedRecording> missed_;
};

}  // namespace receiver
