#pragma once

#include <deque>
#include <optional>
#include <string>

#include "source/CodedUnits.h"
#include "source/ProducerInterface.h"
#include "timing/AudioGrid.h"
#include "timing/FrameGrid.h"

namespace receiver {

/// Makes units of what comes out of a source, connection after connection: puts pictures and audio on their
/// grids, audio and KLV behind the picture that they belong to, silence where audio is missing, and counts
/// the timecode on from picture to picture. Times in are those of the source's time line.
class UnitAssembler {
 public:
    explicit UnitAssembler(const FrameRate& rate);

    /// A connection begins; `audio` tells whether it carries audio. A gap before its first picture is no loss
    /// of frames, since nobody knows what was sent.
    void Begin(bool audio);
    /// From the next picture on `rate` is the rate. What came before is complete. Gives the place of that
    /// picture, which comes at `time`: on the grid, so that picture and sound are moved alike.
    std::int64_t Resume(const FrameRate& rate, std::int64_t time);
    /// The picture at `time` came at `arrived`. Those behind it come in time.
    void SetArrival(std::int64_t time, SourceUnit::Clock::time_point arrived);
    /// The source is another one from here on.
    void AddChange(const SourceDescription& description) { batch_.emplace_back(description); }
    /// The address of the next picture, unless the picture knows better.
    void SetTimecode(const Timecode& timecode);
    void AddPicture(const CodedPicture& picture);
    void AddAudio(const CodedAudio& audio);
    /// Without a time the packet belongs to the last picture.
    void AddKlv(const std::string& packet, std::optional<std::int64_t> time);
    void AddNotice(const std::string& sentence) { batch_.emplace_back(sentence); }
    /// The source is over: gives out what waits for a further picture, and silence where the audio ends
    /// before the last one does.
    void Finish();

    /// What was made since the last call.
    Batch Take();

    /// Where the next picture is expected, and the last one stands. 0 and -1 before the first.
    std::int64_t End() const { return grid_.End(); }
    std::int64_t LastPicture() const { return lastPicture_; }
    const FrameGrid& Grid() const { return grid_; }
    std::uint64_t LostFrames() const { return lostFrames_; }
    /// Audio frames that did not come and are silence.
    std::uint64_t SilentFrames() const { return silentFrames_; }

 private:
    struct Klv {
        std::string packet;
        std::int64_t time = 0;
    };

    void Release(std::int64_t time);
    void PlaceAudio(const CodedAudio& audio);
    void EmitKlv(const Klv& klv);
    void EmitAudio(std::int64_t time, const CodedAudio& audio);
    void EmitSilence(std::int64_t time);
    void CountSilence();
    void MakeSilence(std::int64_t time);
    std::optional<SourceUnit::Clock::time_point> ArrivalOf(std::int64_t time) const;
    std::optional<Timecode> TimecodeOfFrame(std::int64_t index, const CodedPicture& picture);
    /// Counts pictures that should go with the sound behind `end`.
    void CountMissingEnd(std::int64_t end);
    /// Tells the gaps that were counted, from time to time.
    void Report();
    void TellGaps();

    FrameRate rate_;
    FrameGrid grid_;
    AudioGrid audioGrid_;
    const CodedAudio silence_;
    Batch batch_;
    bool audio_ = false;
    /// Audio of the connection has come.
    bool audioBegun_ = false;
    bool resumed_ = true;
    std::int64_t lastPicture_ = -1;
    std::int64_t lastKlv_ = 0;
    /// When a picture at 0 would have come.
    std::optional<SourceUnit::Clock::time_point> origin_;
    /// What is ahead of the pictures.
    std::deque<CodedAudio> heldAudio_;
    std::deque<Klv> heldKlv_;

    std::optional<Timecode> nextTimecode_;
    /// A frame whose address is known, and its address as a number.
    std::optional<std::int64_t> addressedFrame_;
    std::int64_t address_ = 0;
    bool dropFrame_ = false;

    std::uint64_t lostFrames_ = 0;
    std::uint64_t silentFrames_ = 0;
    /// What the next sentence tells of.
    struct Tally {
        std::uint64_t lost = 0;
        std::uint64_t filled = 0;
        std::uint64_t overlapping = 0;
        std::uint64_t leftOut = 0;
    } tally_;
    std::optional<std::int64_t> lastReport_;
};

}  // namespace receiver
