#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "common/FrameRate.h"
#include "common/Timecode.h"
#include "source/StopCheck.h"

namespace receiver {

enum class Medium { kVideo, kAudio, kKlv };

/// Clock rates of the media, as the module wants its timestamps: ticks a second.
inline constexpr std::int64_t kVideoClock = 90000;
inline constexpr std::int64_t kAudioClock = 48000;
/// Samples of an audio frame, each a tick of its clock.
inline constexpr int kAudioFrame = 1024;

/// Where pictures lie further apart than this, in ticks of 90000, a recording ends, and another one begins.
inline constexpr std::int64_t kLongestStep = kVideoClock / 2;

/// One unit of a source, ready for the module.
struct SourceUnit {
    using Clock = std::chrono::steady_clock;

    Medium medium = Medium::kVideo;
    /// When the unit is due, since the beginning of the source: 90000 ticks a second for video and KLV, 48000
    /// for audio. Never negative but for a first audio frame, which may begin half its length before the
    /// first picture; 64 bits wide without wraps, increasing within a medium, continuous over whatever the
    /// source does to its own clock (wraps, a reconnection, where the time that has passed counts).
    std::int64_t time = 0;
    /// Video: one access unit as Annex B byte stream, with both parameter sets in front of each IDR frame.
    /// Audio: one AAC LC frame with its ADTS header, 1024 samples at 48 kHz, stereo. KLV: one packet as the
    /// source carried it (SMPTE ST 336), from its universal label on.
    std::shared_ptr<unsigned char> data;
    std::size_t size = 0;
    /// Video: an IDR frame.
    bool keyFrame = false;
    /// Video: the address that the source gives this frame.
    std::optional<Timecode> timecode;
    /// Video of a live source: when the frame came, by its place in the stream.
    std::optional<Clock::time_point> arrived = {};
    /// Audio: how long pictures are missing between the frame before and this one, in samples. As many whole
    /// frames of audio are left out; how to make up for the rest depends on where a recording began.
    std::int64_t passed = 0;
    /// Video: how much later than at `time` the picture is shown, below 0 earlier, in ticks of 90000.
    /// Pictures come in the order of their decoding, and the n-th of them has the time of the n-th one shown.
    std::int64_t later = 0;
};

/// What a source is.
struct SourceDescription {
    FrameRate frameRate;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Of the video, in kilobits a second; 0 where the source does not say.
    std::uint32_t bitrate = 0;
    /// One line for the operator: "H.264 High 1280x720 25 fps, AAC LC 48 kHz stereo, KLV".
    std::string summary;
    /// Pictures that may be decoded in front of one that is shown before all of them. 0 where pictures are
    /// decoded in the order in which they are shown.
    std::uint32_t reordering = 0;
};

/// What a source met so far.
struct SourceCounts {
    /// Video frames that the source's timestamps say have been there and that never came.
    std::uint64_t lostFrames = 0;
    /// Packets that arrived damaged and were not passed on.
    std::uint64_t damagedPackets = 0;
    std::uint64_t reconnections = 0;
    /// How often the source became another one.
    std::uint64_t changes = 0;
    /// The source is lost and not back yet.
    bool away = false;
    /// Audio frames that are silence because those of the source did not come.
    std::uint64_t silentFrames = 0;
    /// Pictures in front of the first IDR frame of a connection. A recording cannot begin with them.
    std::uint64_t earlyPictures = 0;
};

/// Hears of what an operator should know, one sentence each ("the source was lost: ...; trying again in 4 s",
/// "audio is converted: MP2 48 kHz stereo to AAC LC"). Called on the thread that opens or reads.
class SourceListenerInterface {
 public:
    virtual void OnNotice(const std::string& sentence) = 0;

 protected:
    ~SourceListenerInterface() = default;
};

/// A source of coded units: a network stream, a file, the built-in test picture.
class SourceInterface {
 public:
    enum class Result {
        /// `unit` is filled.
        kUnit,
        /// The file is over.
        kEnd,
        /// `Stop` was called.
        kStopped,
        /// The source is another one from here on: `Description` tells what. Times go on. What came before
        /// and
        /// what follows cannot share a file.
        kChanged,
        /// Nothing came for about 100 ms, or a reconnection goes on. The caller looks after its other
        /// business and
        /// reads again.
        kIdle,
    };

    virtual ~SourceInterface() = default;
    virtual const SourceDescription& Description() const = 0;
    /// The next unit, in the order of time across media but for what the source itself delivers late. Files
    /// and the test picture come at their own speed (times the speed that was asked for): the call waits
    /// until the unit is due. Throws `ReceiverError` when the source turned out to be one that cannot be
    /// recorded after all.
    virtual Result Read(SourceUnit& unit) = 0;
    virtual SourceCounts Counts() const = 0;
    /// Makes the present and every later `Read` return `kStopped` soon, also in the middle of a connection
    /// attempt. From any thread.
    virtual void Stop() = 0;
};

/// What the operator asked for.
struct SourceOptions {
    /// An address as FFmpeg's libraries write it, a file, or "test:".
    std::string url = "test:";
    /// Files and "test:": how many times real time. Above 0.
    double speed = 1.0;
    /// Converts video that cannot be recorded as it is.
    bool transcode = false;
    /// Goes on trying while a network source is not there yet, and when it is lost.
    bool reconnect = true;
    /// "test:" and conversions. A rate and a size that are not set are 25 and 1280x720 for "test:" and those
    /// of the source for a conversion.
    std::optional<FrameRate> frameRate;
    std::optional<std::uint32_t> width;
    std::optional<std::uint32_t> height;
    /// Kilobits a second.
    std::uint32_t bitrate = 8000;
    /// Frames from one IDR frame to the next; 0 is the number of frames in a second.
    std::uint32_t pictureGroup = 0;
    /// Of several programs or streams: the program's number, and which of its videos and audios, from 1.
    std::optional<std::uint32_t> program;
    std::optional<std::uint32_t> video;
    std::optional<std::uint32_t> audio;
    /// Seconds without a unit after which a network source counts as lost.
    double timeout = 5.0;
};

/// Opens a source. A live one that is not there yet is waited for, told once and then every minute, unless
/// `reconnect` is off. Throws `ReceiverError` with `kSourceUnavailable` or `kSourceUnsuitable`. `listener`
/// must live as long as the source. While the source is being opened, `stop` is asked from time to time, and
/// true ends the attempt with a null pointer.
std::unique_ptr<SourceInterface> OpenSource(const SourceOptions& options, SourceListenerInterface& listener,
                                            const StopCheck& stop);

}  // namespace receiver
