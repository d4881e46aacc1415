#pragma once

#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "common/ReceiverError.h"
#include "source/AudioPath.h"
#include "source/FormatWatch.h"
#include "source/Input.h"
#include "source/KlvPackets.h"
#include "source/UnitAssembler.h"
#include "source/VideoPath.h"
#include "timing/Timeline.h"

namespace receiver {

/// One opened input, from its packets to what an assembler takes.
class Connection {
 public:
    using Clock = std::chrono::steady_clock;

    /// Chooses streams, looks at the first second, and decides what passes and what is converted. `before`:
    /// what the source was in an earlier connection and may be again, or null. Throws `ReceiverError`
    /// (`kSourceUnsuitable`) when it cannot be recorded, `SourceLost` and `Stopped`.
    Connection(std::unique_ptr<Input> input, const SourceOptions& options, const SourceDescription* before);

    const SourceDescription& Description() const { return description_; }
    /// Files and servers of files.
    bool Recorded() const { return input_->Recorded(); }
    /// Sentences about what is converted.
    const std::vector<std::string>& Notices() const { return notices_; }

    /// From here on what the source carries goes to `assembler`; its first IDR frame stands at `begin`.
    /// `assembler` must outlive this.
    void Begin(UnitAssembler& assembler, std::int64_t begin);
    /// Passes one packet on. False at the end of the source. Throws like `Input`, and `FormatChanged`. In all
    /// these cases the connection is over.
    bool Pump();
    /// Gives out what is still on its way. Once, when the connection is over; then its input may be asked
    /// anew.
    void Finish();
    /// Ends the connection, all but the input, and gives that away.
    static std::unique_ptr<Input> End(std::unique_ptr<Connection> connection);
    /// The wait for the source is over: what still comes was held by the libraries.
    bool Flushing() const { return input_->TimedOut(); }
    /// When the input answered.
    Clock::time_point Opened() const { return input_->Rtp() ? connected_ : input_->Opened(); }
    /// Byte at which the last packet stood in the input, -1 when not known.
    std::int64_t Position() const { return position_; }

    /// Packets that could not be used, and were left out.
    std::uint64_t Damaged() const;

 private:
    using Packets = std::deque<libav::Owner<AVPacket>>;

    /// A stream of the input that is used.
    struct Stream {
        const AVStream* stream = nullptr;
        /// The last stamp, unwrapped, in the stream's own time base.
        std::optional<std::int64_t> last;
        /// Where the next packet would stand if nothing is missing, and when the last one came.
        std::int64_t expected = 0;
        Clock::time_point arrived;
        /// It has got to the beginning of the line.
        bool joined = false;
    };

    void Choose(const SourceOptions& options);
    void LookAhead();
    /// True when each medium that came has been tied to the sender's clock.
    bool Reported() const;
    void DecideVideo(const SourceOptions& options, const SourceDescription* before);
    void DecideAudio();
    void ReadTimecodeTag();
    /// Throws `FormatChanged` when it is of audio that was not there before.
    void CheckOther(const AVPacket& packet);
    bool NextPacket();
    void Handle(AVPacket& packet);
    void HandleVideo(AVPacket& packet);
    void HandleAudio(AVPacket& packet);
    void HandleKlv(const AVPacket& packet);
    Stream* StreamOf(const AVPacket& packet);
    /// The packet's stamp, unwrapped, in ticks of 90000. Nothing when it has none.
    std::optional<std::int64_t> StampOf(Stream& stream, const AVPacket& packet);
    /// How much later a picture is shown than decoded, where the source itself tells.
    std::optional<std::int64_t> DelayOf(const AVPacket& packet) const;
    std::int64_t Elapsed(Stream& stream, std::int64_t usual);
    std::int64_t TimeOf(Stream& stream, std::int64_t stamp, std::int64_t usual, std::int64_t back);
    std::int64_t AudioTime(std::int64_t stamp, std::int64_t usual);
    void Replay(Packets::iterator begin, Packets::iterator end);
    PictureSink ToPictures();
    AudioSink ToAudio();

    std::unique_ptr<Input> input_;
    Clock::time_point connected_;
    SourceDescription description_;
    std::vector<std::string> notices_;
    Stream video_;
    std::optional<Stream> audio_;
    std::deque<Stream> klv_;
    std::unique_ptr<VideoPathInterface> videoPath_;
    std::optional<FormatWatch> watch_;
    std::unique_ptr<AudioPathInterface> audioPath_;
    KlvPackets klvPackets_;
    libav::Owner<AVPacket> packet_;
    /// Packets that were read to look at them, then those that wait for the first IDR frame.
    Packets ahead_;
    Packets early_;

    UnitAssembler* assembler_ = nullptr;
    std::int64_t begin_ = 0;
    Timeline line_;
    /// The last stamp of any stream, in ticks of 90000, which tells the others how often the counter has
    /// wrapped.
    std::optional<std::int64_t> reference_;
    std::optional<std::int64_t> firstVideoStamp_;
    std::optional<Timecode> tag_;
    std::uint64_t damaged_ = 0;
    std::uint64_t withoutStart_ = 0;
    /// Packets are handled that came before the first IDR frame.
    bool replaying_ = false;
    bool passes_ = true;
    std::int64_t position_ = -1;
};

}  // namespace receiver
