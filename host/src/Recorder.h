#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <vector>

#include "common/FrameRate.h"
#include "metadata/TimecodeCounter.h"
#include "module/Interleaver.h"
#include "module/ModuleLog.h"
#include "module/ModuleSession.h"
#include "module/StreamFeed.h"
#include "operator/RecordPlan.h"
#include "options/Options.h"

namespace receiver {

/// Brings a source's units into the module: in one order of time, each frame behind its metadata unit with
/// timecode, record flag and the source's own packets, and record commands so that no schedule of the
/// module's threads moves them by a frame.
///
/// A record command travels in the metadata unit of its frame, which goes first. Before a recording begins
/// and again before its first frame follows, the feed waits until the module has worked off everything: so no
/// earlier audio gets into the recording, and its IDR frame cannot overtake the command on the way through
/// the module's three queue threads, which would cost a whole group of pictures. A stop is waited for too:
/// the module carries it out on another thread, and it ends whatever recording is open by then, so that a
/// late one would end the next recording. For the same reason nothing is pushed before the first recording:
/// the module takes a first unit without the flag for a stop.
///
/// One thread at a time.
class Recorder {
 public:
    /// The event thread of the module needs far less, unless it hangs or the module has failed.
    static constexpr std::chrono::milliseconds kStopPatience{1000};

    /// How far a run has come.
    struct Progress {
        std::optional<std::int64_t> firstFrame;
        std::int64_t lastFrame = 0;
        /// Of the last frame, at `frameRate`.
        std::optional<Timecode> timecode;
        FrameRate frameRate;
        std::uint64_t lateStops = 0;
    };

    struct Settings {
        OutputMode mode = OutputMode::kSync;
        FrameRate frameRate;
        /// Address of the first frame where the source has none; time of day when not set.
        std::optional<Timecode> timecode;
        bool dropFrame = true;
        /// Length of the run in ticks of 90000 a second since the first frame.
        std::optional<std::int64_t> length;
        /// The source waits for us: follow the disk.
        bool followDisk = false;
        /// Files are fragmented.
        bool fragments = false;
        /// Of an earlier recorder of the run, whose source has become another one.
        std::optional<Progress> past;
    };

    /// All references must outlive the recorder.
    Recorder(const Settings& settings, ModuleSession& session, const ModuleLog& log, RecordPlan& plan);

    void Put(SourceUnit unit);

    /// The source is away: what waits for order is pushed, and a recording in mode sync ends with the last
    /// whole chunk, so that its file is closed and holds nothing of what comes behind the gap. The next one
    /// begins with the first IDR frame there. A repetition has no effect.
    void Interrupt();

    /// The run is to end: nothing is recorded from the next frame on. More of the stream is needed until
    /// `Done`, for the module to cut what came before.
    void Finish();
    bool Finishing() const { return finishing_; }
    /// Everything up to the end is on its way to the disk.
    bool Done() const;
    /// Ends a stream of which nothing more comes: what waits for order is pushed, then units that are never
    /// written, which let the module cut all whole chunks that it still holds. `over` says that the source
    /// itself has ended. Returns the number of frames that stay out of the recording: a chunk is 8 frames.
    std::uint64_t Close(bool over);

    /// Stop commands that the module has not carried out within `kStopPatience`.
    std::uint64_t LateStops() const { return lateStops_; }

    /// Of the last frame.
    const std::optional<Timecode>& LastTimecode() const { return timecode_; }
    /// The first frame with the record flag that the last one has.
    const std::optional<Timecode>& Since() const { return since_; }
    Progress Past() const { return {firstFrame_, lastFrame_, timecode_, settings_.frameRate, lateStops_}; }
    /// Stream time of the last frame since the first one, in ticks of 90000 a second.
    std::int64_t Elapsed() const;

 private:
    void Push(const SourceUnit& unit);
    void PushFrame(const SourceUnit& unit);
    /// False when the frame does not go to the module.
    bool PushOnlineMeta(const SourceUnit& unit, const Timecode& timecode);
    bool PushSyncMeta(const SourceUnit& unit, const Timecode& timecode);
    void EndBeforeGap();
    Timecode NextTimecode(const SourceUnit& unit);
    std::int64_t FrameTime(std::int64_t from, std::int64_t frames) const;
    /// Until no more than `uncut` units are left, padding included. `record` is the record flag of the
    /// padding.
    void PushPadding(bool record, std::size_t uncut);
    /// The number of frames that are left over.
    std::uint64_t CutWholeChunks(bool record);
    void PushStop(std::int64_t time);
    /// Until the module has carried out `count` stop commands.
    void AwaitStop(int count);
    std::size_t KeptChunks() const;

    const Settings settings_;
    ModuleSession& session_;
    const ModuleLog& log_;
    RecordPlan& plan_;
    StreamFeed feed_;
    Interleaver interleaver_;
    std::optional<TimecodeCounter> counter_;
    std::optional<Timecode> timecode_;
    std::optional<Timecode> since_;
    std::optional<std::int64_t> firstFrame_;
    std::int64_t lastFrame_ = 0;
    std::int64_t lastAudio_ = 0;
    /// KLV packets since the last frame.
    std::vector<std::vector<unsigned char>> packets_;
    bool finishing_ = false;
    /// A recording was commanded: by going online, or by the first record flag.
    bool commanded_ = false;
    /// Frames of the present recording.
    std::uint64_t recordedFrames_ = 0;
    std::uint64_t lateStops_ = 0;
};

}  // namespace receiver
