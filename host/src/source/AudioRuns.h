#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "source/LookAhead.h"

namespace receiver {

/// Checks the audio of a transport stream run by run: a unit of the stream holds several frames, of which the
/// sender stamps the first one. The libraries count on from there, so that behind a loss each frame stands
/// too early, or has what is left of another one's bytes, up to the next stamp. A run is held until that
/// stamp shows whether its frames fill the time up to there, and goes as a whole or not at all; but no longer
/// than 0.4 s of sound, and not when the pictures are a second further. Of audio whose frames do not tell
/// their length (AAC in LATM) only what is marked as damaged is left out.
class AudioRuns {
 public:
    /// Takes the next packet, coded by `codec` and stamped in ticks of `base`, and gives those that may go
    /// on, in their order.
    Packets Put(libav::Owner<AVPacket> packet, AVCodecID codec, AVRational base);
    /// Tells that a picture stamped `stamp`, in ticks of `base`, has come, and gives what waits for a stamp
    /// that may be far away: the sound may pause.
    Packets Expire(std::int64_t stamp, AVRational base);
    /// The stream is over: what is left.
    Packets Finish();

    /// Frames that were left out.
    std::uint64_t Damaged() const { return damaged_; }

 private:
    /// A run against the time up to the next one.
    enum class Length { kFull, kShort, kUnknown };

    /// The frame is the first one that begins in its unit of the transport stream.
    bool HasStamp(const AVPacket& packet) const;
    /// What of the run may go on, where the next one is stamped with `next` (or does not come).
    Packets Close(std::optional<std::int64_t> next);
    Length Measure(const Packets& run, std::int64_t next) const;
    /// The sound that is held, in ticks of 90000.
    std::int64_t Held() const;

    Packets run_;
    AVRational base_{1, 90000};
    /// Of the last unit that a frame began in.
    std::int64_t position_ = -1;
    /// What came before the run has lost bytes.
    bool behindDamage_ = false;
    AVCodecID codec_ = AV_CODEC_ID_NONE;
    /// The stream is one of frames with headers that tell their length.
    bool tellsLengths_ = false;
    std::uint64_t damaged_ = 0;
};

}  // namespace receiver
