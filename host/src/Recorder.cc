#include "Recorder.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <limits>
#include <memory>
#include <utility>

#include "metadata/RecordMetadata.h"
#include "source/AudioEncoder.h"

namespace receiver {
namespace {

/// An access unit delimiter (ISO/IEC 14496-10 7.3.2.4): a unit that holds no picture.
constexpr std::array<unsigned char, 6> kDelimiter{0x00, 0x00, 0x00, 0x01, 0x09, 0xF0};

/// Frames of silence behind the audio of a recording: one that may be written, and one behind that.
constexpr std::int64_t kSilentEnd = 2;

/// Half of the 48 chunks that may wait for the disk.
constexpr std::size_t kChunksAhead = 24;
/// What a recording holds although nothing waits: its first frame, and the chunk that it wrote last.
constexpr std::size_t kKeptChunks = 2;
/// A fragment is written when it has so many chunks.
constexpr std::size_t kFragmentChunks = 32;

std::int64_t Period(const FrameRate& rate) {
    return kVideoClock * rate.denominator / rate.numerator;
}

Timecode Following(const Timecode& timecode, const FrameRate& rate) {
    return TimecodeOf(FrameNumberOf(timecode, rate.timecodeFrames) + 1, rate.timecodeFrames,
                      timecode.dropFrame);
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

/// The last instant that the module tells from `time`: it looks at whole milliseconds.
std::int64_t JustBefore(std::int64_t time) {
    constexpr std::int64_t kMillisecond = kVideoClock / 1000;
    return time / kMillisecond * kMillisecond - 1;
}

}  // namespace

Recorder::Recorder(const Settings& settings, ModuleSession& session, const ModuleLog& log, RecordPlan& plan,
                   CommandQueue& commands)
    : settings_(settings),
      session_(session),
      log_(log),
      plan_(plan),
      commands_(commands),
      feed_(session.Stream(), StreamFeed::kPatience, settings.meanwhile),
      stops_(log.Stops()) {
    if (!settings_.past) {
        return;
    }
    const Progress& past = *settings_.past;
    firstFrame_ = past.firstFrame;
    lastFrame_ = past.lastFrame;
    lateStops_ = past.lateStops;
    recorded_ = past.recorded;
    droppedPackets_ = past.droppedPackets;
    timecode_ = past.timecode;
    if (past.timecode) {
        // The present rate's frame in front of the one that would have come next.
        const FrameRate& from = past.frameRate;
        const FrameRate& to = settings_.frameRate;
        const Timecode next =
            AtRate(Following(*past.timecode, from), from, to, to.dropFrame && settings_.dropFrame);
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
    CheckStops(std::chrono::milliseconds(0));
}

void Recorder::Finish() {
    finishing_ = true;
    plan_.Finish();
}

bool Recorder::Waiting() const {
    // In mode on everything is wanted.
    return plan_.Wanted() && !(settings_.mode == OutputMode::kOn ? online_ : plan_.Recording());
}

Recorder::Progress Recorder::Past() const {
    const std::uint64_t before = settings_.past ? settings_.past->droppedMarks : 0;
    return {firstFrame_,
            lastFrame_,
            timecode_,
            settings_.frameRate,
            lateStops_,
            recorded_,
            before + feed_.DroppedMarks(),
            droppedPackets_};
}

std::int64_t Recorder::Elapsed() const {
    return firstFrame_ ? lastFrame_ - *firstFrame_ : 0;
}

void Recorder::Push(const SourceUnit& unit) {
    if (done_) {
        return;
    }
    if (endedByGap_) {
        rest_.push_back(unit);
        return;
    }
    switch (unit.medium) {
        case Medium::kVideo:
            PushFrame(unit);
            break;
        case Medium::kAudio:
            PushAudio(unit);
            break;
        case Medium::kKlv:
            packets_.push_back(unit);
            break;
    }
}

void Recorder::BeginBalance(std::int64_t time) {
    balance_.Begin(time * kAudioClock / kVideoClock,
                   lastAudio_ ? std::optional(lastAudio_->time) : std::nullopt);
}

void Recorder::PushAudio(const SourceUnit& unit) {
    // Audio behind a gap may begin half a frame before the picture there.
    constexpr std::int64_t kLead = kAudioFrame / 2 * kVideoClock / kAudioClock;
    const std::int64_t time = unit.time * kVideoClock / kAudioClock;
    if (firstFrame_ && time - lastFrame_ > kLongestStep - kLead) {
        heldAudio_.push_back(unit);
    } else {
        PutAudio(unit);
    }
}

void Recorder::PutHeldAudio() {
    for (const SourceUnit& unit : std::exchange(heldAudio_, {})) {
        PutAudio(unit);
    }
}

void Recorder::PutAudio(const SourceUnit& unit) {
    if (!balance_.Takes(unit.time, unit.passed)) {
        return;
    }
    lastAudio_ = unit;
    if (settings_.mode == OutputMode::kSync || online_) {
        feed_.PushAudio(unit.time, unit.data, unit.size);
    }
}

void Recorder::PushFrame(const SourceUnit& unit) {
    if (!firstFrame_) {
        firstFrame_ = unit.time;
    } else if (unit.time - lastFrame_ > kLongestStep) {
        // The module does not notice what is missing: it counts units, so its media would drift apart and the
        // timecode of the file would be wrong behind the gap.
        turns_.clear();
        DropPackets(unit.time - Period(settings_.frameRate));
        EndBeforeGap();
        if (endedByGap_) {
            KeepRest(unit);
            return;
        }
    }
    PutHeldAudio();
    lastFrame_ = unit.time;
    decodedAt_ = DecodingTimeOf(unit.time);
    if (settings_.length && Elapsed() >= *settings_.length) {
        Finish();
    }
    timecode_ = NextTimecode(unit);
    const bool pushed =
        settings_.mode == OutputMode::kOn ? PushOnlineMeta(unit, *timecode_) : PushSyncMeta(unit, *timecode_);
    packets_.clear();
    if (pushed) {
        PushVideo(unit);
        if (settings_.followDisk) {
            feed_.WaitForDisk(KeptChunks() + kChunksAhead);
        }
    }
    if (finishing_) {
        // Pictures that are shown in front of that frame may be decoded behind it.
        finishedAt_ = finishedAt_.value_or(unit.time);
        done_ = decodedAt_ >= *finishedAt_;
    }
}

std::int64_t Recorder::DecodingTimeOf(std::int64_t time) {
    if (turns_.empty()) {
        for (std::int64_t ahead = settings_.reordering; ahead > 0; --ahead) {
            turns_.push_back(FrameTime(time, -ahead));
        }
    }
    turns_.push_back(time);
    const std::int64_t decoded = turns_.front();
    turns_.pop_front();
    return decoded;
}

void Recorder::PushVideo(const SourceUnit& unit) {
    if (settings_.reordering == 0) {
        feed_.PushVideo(unit.time, unit.data, unit.size);
    } else {
        feed_.PushReordered(decodedAt_, unit.time + unit.later, unit.data, unit.size);
    }
}

bool Recorder::PushOnlineMeta(const SourceUnit& unit, const Timecode& timecode) {
    if (finishing_ || (!online_ && !unit.keyFrame)) {
        NoteChange(false, timecode);
        return false;
    }
    if (!online_) {
        // With the first IDR frame and not before: what waits for one is limited in the module. Only the
        // audio that is nearest to the frame may begin before it.
        online_ = true;
        NoteChange(true, timecode);
        session_.GoOnline();
        BeginBalance(unit.time);
        if (lastAudio_) {
            feed_.PushAudio(lastAudio_->time, lastAudio_->data, lastAudio_->size);
        }
    }
    ++recorded_;
    feed_.PushMeta(unit.time, BuildMetadata(true, timecode, Packets()));
    return true;
}

bool Recorder::PushSyncMeta(const SourceUnit& unit, const Timecode& timecode) {
    commands_.Apply(plan_);
    const RecordDecision decision = plan_.Next(Elapsed(), unit.keyFrame);
    if (decision.ended) {
        NoteChange(false, timecode);
        balance_.End();
    }
    if (decision.begun) {
        NoteChange(true, timecode);
        BeginBalance(unit.time);
    }
    if (decision.ended && decision.begun) {
        PushFlag(JustBefore(unit.time), false, BuildMetadata(false, std::nullopt, {}));
    }
    recorded_ += decision.record ? 1 : 0;
    PushFlag(unit.time, decision.record, BuildMetadata(decision.record, timecode, Packets()));
    commands_.Settle(decision, timecode);
    return true;
}

void Recorder::PushFlag(std::int64_t time, bool record, const std::vector<unsigned char>& meta) {
    // To the module a first unit without the flag is a stop, too.
    if (flag_ != record && !record) {
        ++stops_;
        stopSince_ = stopSince_.value_or(Clock::now());
    }
    flag_ = record;
    feed_.PushMeta(time, meta);
}

void Recorder::CheckStops(std::chrono::milliseconds patience) {
    if (!stopSince_) {
        return;
    }
    if (log_.WaitForStops(stops_, patience)) {
        stopSince_.reset();
    } else if (Clock::now() - *stopSince_ >= kStopPatience) {
        stopSince_.reset();
        // From here on: the module may have missed it for good.
        stops_ = log_.Stops();
        ++lateStops_;
    }
}

void Recorder::PushRest() {
    while (const std::optional<SourceUnit> next = interleaver_.TakeRest()) {
        Push(*next);
    }
}

void Recorder::Interrupt() {
    PushRest();
    if (endedByGap_) {
        // The rest held a gap, which has ended the recording. What lies behind it is for the next recorder.
        return;
    }
    const bool recording = plan_.Recording();
    DropPackets(std::numeric_limits<std::int64_t>::max());
    EndBeforeGap();
    if (recording && !plan_.Recording()) {
        PushEndMark();
    }
    CheckStops(std::chrono::milliseconds(0));
}

void Recorder::EndBeforeGap() {
    if (settings_.mode == OutputMode::kOn) {
        if (online_ && !finishing_) {
            endedByGap_ = true;
            PushSilentEnd();
        }
    } else if (plan_.Recording()) {
        plan_.Interrupt();
        balance_.End();
        NoteEndBehindLast();
        PushFlag(FrameTime(lastFrame_, 1), false, BuildMetadata(false, std::nullopt, {}));
        PushSilentEnd();
    }
}

void Recorder::DropPackets(std::int64_t end) {
    const std::size_t dropped =
        std::erase_if(packets_, [end](const SourceUnit& packet) { return packet.time <= end; });
    // What belongs to no recording is missed by nobody.
    if (settings_.mode == OutputMode::kOn ? online_ : plan_.Recording()) {
        droppedPackets_ += dropped;
    }
}

void Recorder::KeepRest(const SourceUnit& unit) {
    rest_ = std::exchange(packets_, {});
    rest_.insert(rest_.end(), heldAudio_.begin(), heldAudio_.end());
    heldAudio_.clear();
    rest_.push_back(unit);
}

std::vector<SourceUnit> Recorder::TakeRest() {
    return std::exchange(rest_, {});
}

void Recorder::PushSilentEnd() {
    if (!lastAudio_) {
        return;
    }
    const CodedAudio silence = SilentFrame();
    for (std::int64_t frame = 1; frame <= kSilentEnd; ++frame) {
        feed_.PushAudio(lastAudio_->time + frame * kAudioFrame, silence.data, silence.size);
    }
}

void Recorder::PushEndMark() {
    const std::shared_ptr<unsigned char> delimiter(new unsigned char[kDelimiter.size()],
                                                   std::default_delete<unsigned char[]>());
    std::copy(kDelimiter.begin(), kDelimiter.end(), delimiter.get());
    const std::int64_t end = FrameTime(lastFrame_, 1);
    if (settings_.reordering == 0) {
        feed_.PushVideo(end, delimiter, kDelimiter.size());
    } else {
        feed_.PushReordered(end, end, delimiter, kDelimiter.size());
    }
}

void Recorder::NoteChange(bool begins, const Timecode& at) {
    if (open_ != begins) {
        open_ = begins;
        changes_.push_back({begins, at});
    }
}

void Recorder::NoteEnd() {
    if (timecode_) {
        NoteEndBehindLast();
    }
}

void Recorder::NoteEndBehindLast() {
    const Timecode end = NextAddress();
    NoteChange(false, end);
    commands_.Settle({.ended = true}, end);
}

std::vector<Recorder::Change> Recorder::TakeChanges() {
    return std::exchange(changes_, {});
}

Timecode Recorder::NextAddress() const {
    return Following(*timecode_, settings_.frameRate);
}

Timecode Recorder::NextTimecode(const SourceUnit& unit) {
    if (!counter_) {
        const FrameRate& rate = settings_.frameRate;
        const bool dropFrame = rate.dropFrame && settings_.dropFrame;
        counter_.emplace(rate, settings_.timecode
                                   ? *settings_.timecode
                                   : TimecodeOfDay(SecondsOfDay(unit.arrived), rate, dropFrame));
    }
    return counter_->Next(unit.time, unit.timecode);
}

std::int64_t Recorder::FrameTime(std::int64_t from, std::int64_t frames) const {
    const FrameRate& rate = settings_.frameRate;
    return from + frames * kVideoClock * rate.denominator / rate.numerator;
}

void Recorder::Close() {
    PushRest();
    feed_.Settle();
    CheckStops(kStopPatience);
    feed_.WaitForChunks(KeptChunks(), endedByGap_ ? settings_.gapPatience : settings_.diskPatience);
}

std::vector<std::vector<unsigned char>> Recorder::Packets() const {
    std::vector<std::vector<unsigned char>> packets;
    for (const SourceUnit& unit : packets_) {
        packets.emplace_back(unit.data.get(), unit.data.get() + unit.size);
    }
    return packets;
}

std::size_t Recorder::KeptChunks() const {
    const std::size_t kept = kKeptChunks + (settings_.fragments ? kFragmentChunks : 0);
    return kept * static_cast<std::size_t>(std::max(log_.OpenRecordings(), 1));
}

}  // namespace receiver
