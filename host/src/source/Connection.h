#pragma once

#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "common/ReceiverError.h"
#include "source/AudioRuns.h"
#include "source/FormatWatch.h"
#include "source/Input.h"
#include "source/KlvPackets.h"
#include "source/LookAhead.h"
#include "source/ReorderBuffer.h"
#include "source/StepHold.h"
#include "source/StreamClock.h"
#include "source/StreamPaths.h"
#include "source/UnitAssembler.h"

namespace receiver {

/// One opened input, from its packets to what an assembler takes.
class Connection {
 public:
    using Clock = std::chrono::steady_clock;

    /// Chooses streams, looks at the first second, and decides what passes and what is converted. `before`:
    /// what the source was in an earlier connection and may be again, or null. Throws `ReceiverError`
    /// (`kSourceUnsuitable`) when it cannot be recorded, `SourceLost` and `Stopped`.
    Connection(std::unique_ptr<Input> input, const SourceOptions& options, const SourceDescription* before);

    const SourceDescription& Description() const { return paths_.description; }
    /// Files and servers of files.
    bool Recorded() const { return input_->Recorded(); }
    /// Sentences about what is converted.
    const std::vector<std::string>& Notices() const { return notices_; }

    /// From here on what the source carries goes to `assembler`, which must outlive this. Its first IDR frame
    /// stands at 0, behind an earlier connection later than `begin` by as much as it comes behind the first
    /// picture.
    void Begin(UnitAssembler& assembler, std::int64_t begin);
    /// Passes one packet on. False at the end of the source. Throws like `Input`, and `FormatChanged`. In all
    /// these cases the connection is over.
    bool Pump();
    /// Gives out what is still on its way. Once, when the connection is over; then its input may be asked
    /// anew.
    void Finish();
    /// What was read and not used, when a change of the format has ended the connection: the packet that
    /// showed it, as it came, and what was read ahead behind it. Of files alone, and nothing where a medium
    /// moved, of which packets are gone. Once.
    Packets TakeUnread();
    /// Ends the connection, all but the input, and gives that away.
    static std::unique_ptr<Input> End(std::unique_ptr<Connection> connection);
    /// The wait for the source is over: what still comes was held by the libraries.
    bool Flushing() const { return input_->TimedOut(); }
    /// When the first picture came.
    Clock::time_point Arrived() const { return ahead_.arrived; }
    /// Byte of the input at which what was not used begins, -1 when not known.
    std::int64_t Position() const { return position_; }

    /// A picture was taken that came behind the last change.
    bool Used() const { return used_; }

    /// Packets that could not be used, and were left out.
    std::uint64_t Damaged() const;
    /// Pictures in front of the first IDR frame.
    std::uint64_t EarlyPictures() const { return earlyPictures_; }

 private:
    void Choose(const SourceOptions& options);
    void ReadTimecodeTag();
    /// Throws `FormatChanged` when it is of audio that was not there before, or of what ours has become.
    void CheckOther(const AVPacket& packet);
    /// The next packet as it is read.
    bool ReadPacket();
    /// The next one whose turn is known where pictures come reordered. Both false when there is none.
    bool NextPacket();
    /// Of those that wait for their turn, when nothing is read any more.
    bool NextWaiting();
    void Accept();
    void Handle(AVPacket& packet);
    void Process(AVPacket& packet);
    /// Which of the two media it is of, where steps of the clock can be told from losses: in a live stream
    /// whose missing packets are marked. Of a file, where counters of four bits are all that tells, a loss
    /// would at times be taken for a step.
    std::optional<StepWatch::Medium> SteppingMedium(const AVPacket& packet) const;
    /// The sound that waits for a stamp which the pictures have passed.
    void HandleExpired();
    void HandleVideo(AVPacket& packet);
    /// False when the picture, stamped so, cannot be the first one of the line. Else it stands at `begin_`.
    bool Start(const AVPacket& packet, std::optional<std::int64_t> stamp);
    void HandleAudio(AVPacket& packet, bool waited);
    void HandleKlv(const AVPacket& packet);
    void KeepEarly(AVPacket& packet);
    /// How long after the first picture the one stamped with `stamp` comes, by the stamps, or by the count
    /// of pictures where the first stamp is none to believe.
    std::int64_t SinceFirst(std::int64_t stamp) const;
    static bool IsOf(const AVPacket& packet, const AVStream* stream);
    StreamClock::Track* KlvTrackOf(const AVPacket& packet);
    /// The pictures are recorded as they come, which is not the order in which they are shown.
    bool Reordered() const { return paths_.passes && paths_.description.reordering > 0; }
    /// Gives the picture its place on the line, stamped so, where this is known.
    void PlacePicture(AVPacket& packet, std::optional<std::int64_t> stamp, bool delaysKnown);
    /// How much later a picture is shown than decoded, where the source itself tells.
    std::optional<std::int64_t> DelayOf(const AVPacket& packet) const;
    PictureSink ToPictures();
    AudioSink ToAudio();

    std::unique_ptr<Input> input_;
    const AVStream* video_ = nullptr;
    const AVStream* audio_ = nullptr;
    std::deque<StreamClock::Track> klv_;
    std::vector<std::string> notices_;
    /// Packets that were read to look at them, then those that wait for the first IDR frame.
    Beginning ahead_;
    Packets early_;
    StreamPaths paths_;
    std::optional<FormatWatch> watch_;
    std::optional<StreamClock> clock_;
    KlvPackets klvPackets_;
    std::optional<StepHold> steps_;
    /// Where pictures come reordered and are recorded so, and what it gave last.
    std::optional<ReorderBuffer> reorder_;
    std::optional<ReorderBuffer::Next> next_;
    /// Of the audio of a transport stream.
    AudioRuns runs_;
    libav::Owner<AVPacket> packet_;
    /// The same as it came. Of files alone.
    libav::Owner<AVPacket> untouched_;

    UnitAssembler* assembler_ = nullptr;
    std::int64_t begin_ = 0;
    std::optional<std::int64_t> firstVideoStamp_;
    /// Of the last picture of which it is known. Only where pictures are converted.
    std::optional<std::int64_t> delay_;
    std::optional<Timecode> tag_;
    std::uint64_t damaged_ = 0;
    std::uint64_t earlyPictures_ = 0;
    std::int64_t position_ = -1;
    bool used_ = false;
    /// Packets of new streams since the last of our own.
    int newPictures_ = 0;
    /// Of the first of these.
    std::int64_t newPosition_ = -1;
    int newSounds_ = 0;
};

}  // namespace receiver
