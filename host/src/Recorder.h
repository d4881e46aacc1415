#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <optional>
#include <vector>

#include "common/FrameRate.h"
#include "metadata/TimecodeCounter.h"
#include "module/Interleaver.h"
#include "module/ModuleLog.h"
#include "module/ModuleSession.h"
#include "module/StreamFeed.h"
#include "operator/CommandQueue.h"
#include "operator/RecordPlan.h"
#include "options/Options.h"
#include "timing/AudioBalance.h"

namespace receiver {

/// Brings a source's units into the module: in one order of time, each frame behind its metadata unit with
/// timecode, record flag and the source's own packets.
///
/// What is left to do here is what the module cannot know: the order across media, gaps, addresses of frames,
/// and whether a stop was carried out. The rest is left to its exact record rules. A record command travels
/// in the metadata unit of its frame, and no schedule of the module's threads moves it: a recording holds the
/// frames from the first IDR frame with the flag to the last one that has it, with the audio that belongs to
/// them, and what has been pushed when the session ends is written. So everything is pushed from the first
/// frame on, also while nothing is recorded, for the audio in front of a recording to be there when it
/// begins.
///
/// One thread at a time.
class Recorder {
 public:
    /// The event thread of the module needs far less, unless it hangs or the module has failed.
    static constexpr std::chrono::milliseconds kStopPatience{1000};

    /// A recording begins with the frame `at`, or has ended in front of it.
    struct Change {
        bool begins = false;
        Timecode at;

        friend bool operator==(const Change&, const Change&) = default;
    };

    /// How far a run has come.
    struct Progress {
        std::optional<std::int64_t> firstFrame;
        std::int64_t lastFrame = 0;
        /// Of the last frame, at `frameRate`.
        std::optional<Timecode> timecode;
        FrameRate frameRate;
        std::uint64_t lateStops = 0;
        std::uint64_t recorded = 0;
        /// Of what the module reported as lost: marks, which nobody misses.
        std::uint64_t droppedMarks = 0;
        /// KLV packets of recordings whose picture did not come.
        std::uint64_t droppedPackets = 0;
    };

    struct Settings {
        OutputMode mode = OutputMode::kSync;
        FrameRate frameRate;
        /// As in `SourceDescription`.
        std::uint32_t reordering = 0;
        /// Address of the first frame where the source has none; time of day when not set.
        std::optional<Timecode> timecode;
        bool dropFrame = true;
        /// Length of the run in ticks of 90000 a second since the first frame.
        std::optional<std::int64_t> length;
        /// The source waits for us: follow the disk.
        bool followDisk = false;
        /// Files are fragmented.
        bool fragments = false;
        /// Called from time to time where the module is waited for, for what must not wait. It must not call
        /// the recorder.
        std::function<void()> meanwhile;
        /// At its end a recording waits so long for a slow disk; one that needs longer counts as hung. The
        /// module itself gives a writer 3.5 s to end.
        std::chrono::milliseconds diskPatience{30000};
        /// The same in front of a gap, where the source goes on meanwhile and not more than 15 s of it can
        /// wait.
        std::chrono::milliseconds gapPatience{5000};
        /// Of the run's recorder before this one, which a gap or a source that has become another one ended.
        std::optional<Progress> past;
    };

    /// All references must outlive the recorder.
    Recorder(const Settings& settings, ModuleSession& session, const ModuleLog& log, RecordPlan& plan,
             CommandQueue& commands);

    void Put(SourceUnit unit);

    /// The source is away: what waits for order is pushed, and a recording ends with its last frame, so that
    /// its file is closed and holds nothing of what comes behind the gap. The next one begins with the first
    /// IDR frame there. KLV packets that still wait for their picture are dropped, since the next picture is
    /// another one. A repetition has no effect.
    void Interrupt();

    /// In mode on a gap ends the recording and this recorder, since the module goes on in one file as long as
    /// the host is online. What comes from there on is for the recorder of another session.
    bool EndedByGap() const { return endedByGap_; }
    /// What has come behind the gap, in its order. Once, behind `Close`.
    std::vector<SourceUnit> TakeRest();

    /// The run is to end: nothing is recorded from the next frame on. That frame is needed until `Done`,
    /// since it tells that the audio of the last one is complete.
    void Finish();
    bool Finishing() const { return finishing_; }
    bool Done() const { return done_; }
    /// Ends a stream of which nothing more comes: pushes what waits for order, and waits until everything has
    /// left the module's first queues, which going offline empties, and until a slow disk has caught up.
    void Close();

    /// Stop commands that the module has not carried out within `kStopPatience`.
    std::uint64_t LateStops() const { return lateStops_; }

    /// Of the last frame.
    const std::optional<Timecode>& LastTimecode() const { return timecode_; }
    /// A recording is commanded and waits for its IDR frame.
    bool Waiting() const;
    /// The beginnings and ends of recordings since the last call.
    std::vector<Change> TakeChanges();
    /// The last frame has come: a recording that is still open has ended behind it.
    void NoteEnd();
    /// Frames that belong to recordings.
    std::uint64_t Recorded() const { return recorded_; }
    Progress Past() const;
    /// Pictures that the module holds: those not cut into chunks, and one of each chunk that waits.
    std::size_t HeldPictures() const { return feed_.Frames().UncutUnits() + feed_.Frames().WaitingChunks(); }
    /// Stream time of the last frame since the first one, in ticks of 90000 a second.
    std::int64_t Elapsed() const;

 private:
    using Clock = std::chrono::steady_clock;

    void Push(const SourceUnit& unit);
    void PushRest();
    void PushAudio(const SourceUnit& unit);
    void PutAudio(const SourceUnit& unit);
    void PutHeldAudio();
    void PushFrame(const SourceUnit& unit);
    /// False when the frame does not go to the module.
    bool PushOnlineMeta(const SourceUnit& unit, const Timecode& timecode);
    bool PushSyncMeta(const SourceUnit& unit, const Timecode& timecode);
    void PushFlag(std::int64_t time, bool record, const std::vector<unsigned char>& meta);
    /// A recording begins with the frame at `time`.
    void BeginBalance(std::int64_t time);
    /// The recording, if any, ends with the last frame.
    void EndBeforeGap();
    /// Drops the KLV packets up to `end`, whose picture lies in the gap that begins here.
    void DropPackets(std::int64_t end);
    void KeepRest(const SourceUnit& unit);
    /// The recording, if any, has ended with the last frame, and so has what stops commanded.
    void NoteEndBehindLast();
    void NoteChange(bool begins, const Timecode& at);
    /// The address behind that of the last frame.
    Timecode NextAddress() const;
    void PushVideo(const SourceUnit& unit);
    /// When the next picture is decoded, whose turn it is at `time`: as many turns earlier as pictures may be
    /// decoded ahead, so that none is shown before its decoding, whatever is missing.
    std::int64_t DecodingTimeOf(std::int64_t time);
    /// Silence behind the audio of a recording that ends in front of a gap. The module counts the frames of
    /// audio that its pictures need, which may be one more than there are, and looks at the one behind.
    void PushSilentEnd();
    /// A picture behind the end of a recording. It is never written: the module ends a recording when the
    /// pictures have reached its end, and while the source is away no other one gets there.
    void PushEndMark();
    /// Sees whether the module has carried out the stops so far, and waits for that within `patience`. The
    /// recording ends on its frame all the same, but a module that carries out nothing closes no file.
    void CheckStops(std::chrono::milliseconds patience);
    Timecode NextTimecode(const SourceUnit& unit);
    std::int64_t FrameTime(std::int64_t from, std::int64_t frames) const;
    std::size_t KeptChunks() const;
    std::vector<std::vector<unsigned char>> Packets() const;

    const Settings settings_;
    ModuleSession& session_;
    const ModuleLog& log_;
    RecordPlan& plan_;
    CommandQueue& commands_;
    StreamFeed feed_;
    Interleaver interleaver_;
    std::optional<TimecodeCounter> counter_;
    std::optional<Timecode> timecode_;
    std::vector<Change> changes_;
    /// What the last change was.
    bool open_ = false;
    std::uint64_t recorded_ = 0;
    std::uint64_t droppedPackets_ = 0;
    std::optional<std::int64_t> firstFrame_;
    std::int64_t lastFrame_ = 0;
    /// That went to the module.
    std::optional<SourceUnit> lastAudio_;
    /// Turns of the last pictures, as many as may be decoded ahead. None behind a gap.
    std::deque<std::int64_t> turns_;
    /// When the last frame is decoded.
    std::int64_t decodedAt_ = 0;
    AudioBalance balance_;
    /// Stands so far behind the last frame that the next one tells whether a gap lies between.
    std::vector<SourceUnit> heldAudio_;
    /// KLV packets since the last frame.
    std::vector<SourceUnit> packets_;
    bool endedByGap_ = false;
    std::vector<SourceUnit> rest_;
    bool finishing_ = false;
    /// The first frame that is not recorded any more.
    std::optional<std::int64_t> finishedAt_;
    bool done_ = false;
    /// In mode on: the module records.
    bool online_ = false;
    /// The record flag that was pushed last.
    std::optional<bool> flag_;
    /// Stop commands that the module should have carried out so far, those before this recorder included, and
    /// since when one waits to be carried out.
    int stops_;
    std::optional<Clock::time_point> stopSince_;
    std::uint64_t lateStops_ = 0;
};

}  // namespace receiver
