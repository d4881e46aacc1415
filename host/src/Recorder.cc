#include "Recorder.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <memory>
#include <utility>

#include "metadata/RecordMetadata.h"

namespace receiver {
namespace {

/// The module cuts its caches into chunks of so many frames, when twice as many are there.
constexpr std::uint64_t kChunkFrames = 8;
constexpr std::int64_t kAudioFrame = 1024;

/// Where frames lie further apart than this, in ticks, something is missing. The module does not notice: it
/// counts units, so its media would drift apart and the timecode of the file would be wrong behind the gap.
constexpr std::int64_t kGap = kVideoClock / 2;

/// An access unit delimiter (ISO/IEC 14496-10 7.3.2.4): a unit for the count that holds no picture.
constexpr std::array<unsigned char, 6> kEmptyVideo{0x00, 0x00, 0x00, 0x01, 0x09, 0xF0};

/// How often the chunk thread is nudged at the end, and how long it gets each time: it takes a look at its
/// caches for each unit that comes, and cuts one chunk a look.
constexpr int kNudges = 200;
constexpr std::chrono::milliseconds kNudgePause{5};

/// Half of the 48 chunks that may wait for the disk.
constexpr std::size_t kChunksAhead = 24;
/// What a recording holds although nothing waits: its first frame, and the chunk that it wrote last.
constexpr std::size_t kKeptChunks = 2;
/// A fragment is written when it has so many chunks.
constexpr std::size_t kFragmentChunks = 32;

/// A disk is slow, not hung, as long as it needs less than this for the chunks of one wait.
constexpr std::chrono::seconds kDiskPatience{30};

std::int64_t Period(const FrameRate& rate) {
    return kVideoClock * rate.denominator / rate.numerator;
}

/// The same moment in another count of frames.
Timecode AtRate(Timecode timecode, const FrameRate& from, const FrameRate& to, bool dropFrame) {
    timecode.frames = static_cast<std::uint8_t>(timecode.frames * to.timecodeFrames / from.timecodeFrames);
    timecode.dropFrame = dropFrame;
    while (!IsValid(timecode, to.timecodeFrames)) {
        ++timecode.frames;
    }
    return timecode;
}

}  // namespace

Recorder::Recorder(const Settings& settings, ModuleSession& session, const ModuleLog& log, RecordPlan& plan)
    : settings_(settings), session_(session), log_(log), plan_(plan), feed_(session.Stream()) {
    if (!settings_.past) {
        return;
    }
    const Progress& past = *settings_.past;
    firstFrame_ = past.firstFrame;
    lastFrame_ = past.lastFrame;
    lateStops_ = past.lateStops;
    timecode_ = past.timecode;
    if (past.timecode) {
        // The present rate's frame in front of the one that would have come next.
        const FrameRate& from = past.frameRate;
        const FrameRate& to = settings_.frameRate;
        const Timecode due = TimecodeOf(FrameNumberOf(*past.timecode, from.timecodeFrames) + 1,
                                        from.timecodeFrames, past.timecode->dropFrame);
        const Timecode next = AtRate(due, from, to, to.dropFrame && settings_.dropFrame);
        counter_.emplace(
            to, TimecodeOf(FrameNumberOf(next, to.timecodeFrames) - 1, to.timecodeFrames, next.dropFrame));
        counter_->Next(lastFrame_ + Period(from) - Period(to), std::nullopt);
    }
}

void Recorder::Put(SourceUnit unit) {
    interleaver_.Put(std::move(unit));
    while (const std::optional<SourceUnit> next = interleaver_.Take()) {
        Push(*next);
    }
}

void Recorder::Finish() {
    finishing_ = true;
    plan_.Finish();
}

bool Recorder::Done() const {
    if (!finishing_) {
        return false;
    }
    // Going offline has no timestamp. The run ends with a whole chunk, so that none of it is lost.
    return settings_.mode == OutputMode::kOn ? recordedFrames_ % kChunkFrames == 0
                                             : log_.OpenRecordings() == 0;
}

std::int64_t Recorder::Elapsed() const {
    return firstFrame_ ? lastFrame_ - *firstFrame_ : 0;
}

void Recorder::Push(const SourceUnit& unit) {
    switch (unit.medium) {
        case Medium::kVideo:
            PushFrame(unit);
            break;
        case Medium::kAudio:
            if (commanded_) {
                feed_.PushAudio(unit.time, unit.data, unit.size);
            }
            lastAudio_ = unit.time;
            break;
        case Medium::kKlv:
            packets_.emplace_back(unit.data.get(), unit.data.get() + unit.size);
            break;
    }
}

void Recorder::PushFrame(const SourceUnit& unit) {
    if (!firstFrame_) {
        firstFrame_ = unit.time;
    } else if (unit.time - lastFrame_ > kGap) {
        EndBeforeGap();
    }
    lastFrame_ = unit.time;
    if (settings_.length && Elapsed() >= *settings_.length) {
        Finish();
    }
    timecode_ = NextTimecode(unit);
    const bool pushed =
        settings_.mode == OutputMode::kOn ? PushOnlineMeta(unit, *timecode_) : PushSyncMeta(unit, *timecode_);
    packets_.clear();
    if (!pushed) {
        return;
    }
    feed_.PushVideo(unit.time, unit.data, unit.size);
    if (settings_.followDisk) {
        feed_.WaitForDisk(KeptChunks() + kChunksAhead);
    }
}

bool Recorder::PushOnlineMeta(const SourceUnit& unit, const Timecode& timecode) {
    if (!commanded_) {
        if (!unit.keyFrame || finishing_) {
            return false;
        }
        // Online with the first IDR frame and not before: what came earlier would only be trimmed.
        commanded_ = true;
        since_ = timecode;
        session_.GoOnline();
    } else if (Done()) {
        return false;
    }
    ++recordedFrames_;
    feed_.PushMeta(unit.time, BuildMetadata(true, timecode, packets_));
    return true;
}

bool Recorder::PushSyncMeta(const SourceUnit& unit, const Timecode& timecode) {
    const bool before = plan_.Recording();
    const bool record = plan_.Next(Elapsed(), unit.keyFrame);
    if (record != before) {
        since_ = timecode;
        recordedFrames_ = 0;
    }
    recordedFrames_ += record ? 1 : 0;
    commanded_ = commanded_ || record;
    if (!commanded_) {
        return false;
    }
    const int stops = log_.Stops();
    if (record != before) {
        feed_.Settle();
    }
    feed_.PushMeta(unit.time, BuildMetadata(record, timecode, packets_));
    if (record && !before) {
        feed_.Settle();
    }
    if (before && !record) {
        AwaitStop(stops + 1);
    }
    return true;
}

void Recorder::AwaitStop(int count) {
    lateStops_ += log_.WaitForStops(count, kStopPatience) ? 0 : 1;
}

void Recorder::Interrupt() {
    while (const std::optional<SourceUnit> next = interleaver_.TakeRest()) {
        Push(*next);
    }
    EndBeforeGap();
}

void Recorder::EndBeforeGap() {
    if (settings_.mode != OutputMode::kSync || !plan_.Recording()) {
        return;
    }
    plan_.Interrupt();
    if (log_.OpenRecordings() <= 0) {
        return;
    }
    feed_.Settle();
    const auto left = static_cast<std::int64_t>(CutWholeChunks(true));
    // Between the last frame of the last whole chunk and the one behind it.
    PushStop(FrameTime(lastFrame_, -left) + FrameTime(0, 1) / 2);
}

void Recorder::PushStop(std::int64_t time) {
    const int stops = log_.Stops();
    const int open = log_.OpenRecordings();
    const std::vector<unsigned char> meta = BuildMetadata(false, std::nullopt, {});
    feed_.PushMeta(time, meta);
    AwaitStop(stops + 1);
    // The chunk thread looks for the end when a unit comes, and none does on its own.
    for (int i = 0; i < kNudges && log_.OpenRecordings() >= open; ++i) {
        feed_.PushMeta(time, meta);
        feed_.Frames().WaitForUncut(0, kNudgePause);
    }
}

Timecode Recorder::NextTimecode(const SourceUnit& unit) {
    if (!counter_) {
        const FrameRate& rate = settings_.frameRate;
        const bool dropFrame = rate.dropFrame && settings_.dropFrame;
        counter_.emplace(
            rate, settings_.timecode ? *settings_.timecode : TimecodeOfDay(SecondsOfDay(), rate, dropFrame));
    }
    return counter_->Next(unit.time, unit.timecode);
}

std::int64_t Recorder::FrameTime(std::int64_t from, std::int64_t frames) const {
    const FrameRate& rate = settings_.frameRate;
    return from + frames * kVideoClock * rate.denominator / rate.numerator;
}

void Recorder::PushPadding(bool record, std::size_t uncut) {
    const std::shared_ptr<unsigned char> empty(new unsigned char[kEmptyVideo.size()],
                                               std::default_delete<unsigned char[]>());
    std::copy(kEmptyVideo.begin(), kEmptyVideo.end(), empty.get());
    const std::vector<unsigned char> meta = BuildMetadata(record, std::nullopt, {});
    std::int64_t frame = 0;
    const auto pushMetaAndAudio = [&] {
        const std::int64_t time = FrameTime(lastFrame_, ++frame);
        feed_.PushMeta(time, meta);
        // Audio a little ahead of the frames, so that it reaches beyond the end of the last chunk.
        while (lastAudio_ * kVideoClock < (time + kVideoClock / 10) * kAudioClock) {
            lastAudio_ += kAudioFrame;
            feed_.PushAudio(lastAudio_, empty, kEmptyVideo.size());
        }
    };
    // Enough for every whole chunk to be cut, too few to be cut themselves.
    for (std::uint64_t i = 0; i < kChunkFrames; ++i) {
        pushMetaAndAudio();
        feed_.PushVideo(FrameTime(lastFrame_, frame), empty, kEmptyVideo.size());
    }
    for (int i = 0;
         i < kNudges && log_.OpenRecordings() > 0 && !feed_.Frames().WaitForUncut(uncut, kNudgePause); ++i) {
        pushMetaAndAudio();
    }
}

std::uint64_t Recorder::Close(bool over) {
    if (over) {
        interleaver_.Finish();
        while (const std::optional<SourceUnit> next = interleaver_.Take()) {
            Push(*next);
        }
    }
    if (log_.OpenRecordings() <= 0) {
        return 0;
    }
    feed_.Settle();
    const bool recording = settings_.mode == OutputMode::kOn || plan_.Recording();
    const std::uint64_t left = CutWholeChunks(false);
    feed_.Frames().WaitForChunks(KeptChunks(), kDiskPatience);
    return recording ? left : 0;
}

std::uint64_t Recorder::CutWholeChunks(bool record) {
    // Nothing is held where a recording still waits for its first frame.
    if (feed_.Frames().UncutUnits() == 0) {
        return 0;
    }
    const std::uint64_t left = recordedFrames_ % kChunkFrames;
    PushPadding(record, kChunkFrames + left);
    const std::size_t held = feed_.Frames().UncutUnits();
    return std::max<std::uint64_t>(left, held > kChunkFrames ? held - kChunkFrames : 0);
}

std::size_t Recorder::KeptChunks() const {
    const std::size_t kept = kKeptChunks + (settings_.fragments ? kFragmentChunks : 0);
    return kept * static_cast<std::size_t>(std::max(log_.OpenRecordings(), 1));
}

}  // namespace receiver
