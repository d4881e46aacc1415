#include "source/LookAhead.h"

#include <algorithm>
#include <cmath>
#include <optional>
#include <utility>

#include "source/AudioEncoder.h"
#include "source/RtpStamps.h"
#include "source/VideoCheck.h"

namespace receiver {
namespace {

using Clock = std::chrono::steady_clock;

/// Pictures that are looked at before a source is taken.
constexpr std::size_t kPictures = 25;
/// Packets that this may take.
constexpr std::size_t kLongest = 4000;
/// How long the sender's first report is waited for, which RTP's senders give every five seconds or so.
constexpr std::chrono::seconds kReportPatience{6};
/// What the packets that are looked at may span, in ticks.
constexpr std::int64_t kLongestSpan = std::int64_t{60} * 90000;
/// What takes longer to read had not come yet; what the libraries hold is there at once.
constexpr std::chrono::milliseconds kHeld{2};

/// Works out when the first picture came, of which the libraries tell no time: it was there for longer than
/// the stamps of those behind it tell at the least.
class ArrivalWatch {
 public:
    void Enter(const AVPacket& packet, AVRational base, Clock::duration took) {
        const auto now = Clock::now();
        fresh_ |= took > kHeld;
        if (packet.pts == AV_NOPTS_VALUE) {
            return;
        }
        first_ = first_.value_or(packet.pts);
        arrived_ = arrived_.value_or(now);
        const std::int64_t ticks = av_rescale_q(packet.pts - *first_, base, kTicks);
        // A clock that leaps tells nothing.
        if (ticks > 0 && ticks < kLongestSpan) {
            arrived_ = std::min(*arrived_, now - std::chrono::microseconds(ticks * 100 / 9));
        }
    }
    /// `opened` is when the input answered, which its first bytes make it do, but for those of RTP.
    Clock::time_point Arrived(Clock::time_point opened, bool rtp) const {
        return (fresh_ || rtp) && arrived_ ? std::max(*arrived_, opened) : opened;
    }

 private:
    std::optional<std::int64_t> first_;
    std::optional<Clock::time_point> arrived_;
    /// A packet came while it was waited for.
    bool fresh_ = false;
};

bool IsOf(const AVPacket& packet, const AVStream& stream) {
    return packet.stream_index == stream.index;
}

/// True when each medium that came has been tied to the sender's clock.
bool Reported(const Packets& packets, const AVStream& video, const AVStream& audio) {
    const auto reported = [&packets](const AVStream& stream) {
        const auto last = std::find_if(packets.rbegin(), packets.rend(),
                                       [&stream](const auto& packet) { return IsOf(*packet, stream); });
        return last == packets.rend() || IsTied(**last);
    };
    return reported(video) && reported(audio);
}

/// The usual distance of pictures in the time base of the video.
std::int64_t StepOf(const Packets& packets, const AVStream& video) {
    return std::llround(PictureSpacing(video, packets) / av_q2d(video.time_base));
}

void MendRtp(const Packets& packets, const AVStream& video, const AVStream* audio) {
    for (const auto& packet : packets) {
        // The libraries infer these, wrongly.
        packet->dts = AV_NOPTS_VALUE;
    }
    const std::int64_t step = StepOf(packets, video);
    if (ComeReordered(video, step, packets)) {
        MendFirstReordered(video, step, packets);
    } else if (step > 0) {
        MendStamps(video, step, packets);
    }
    if (audio != nullptr) {
        MendStamps(*audio, av_rescale_q(AudioDuration(*audio, 0), kTicks, audio->time_base), packets);
    }
}

}  // namespace

std::int64_t AudioDuration(const AVStream& stream, int size) {
    const int samples = av_get_audio_frame_duration2(stream.codecpar, size);
    return samples > 0 && stream.codecpar->sample_rate > 0
               ? av_rescale(samples, kTicks.den, stream.codecpar->sample_rate)
               : av_rescale(kAudioFrame, kTicks.den, kAudioRate);
}

Beginning LookAhead(Input& input, const AVStream& video, const AVStream* audio) {
    Beginning beginning;
    Packets& packets = beginning.packets;
    ArrivalWatch arrival;
    std::size_t pictures = 0;
    const auto begun = Clock::now();
    const auto waits = [&] {
        return input.Rtp() && audio != nullptr && !Reported(packets, video, *audio) &&
               Clock::now() - begun < kReportPatience;
    };
    const auto readOn = [&] {
        while ((pictures < kPictures || waits()) && packets.size() < kLongest) {
            libav::Owner<AVPacket> packet = libav::NewPacket();
            const auto before = Clock::now();
            if (!input.Read(*packet)) {
                break;
            }
            if (IsOf(*packet, video)) {
                ++pictures;
                input.Alive();
                arrival.Enter(*packet, video.time_base, Clock::now() - before);
            }
            packets.push_back(std::move(packet));
        }
    };
    readOn();
    beginning.arrived = arrival.Arrived(input.Opened(), input.Rtp());
    if (input.Rtp()) {
        const std::int64_t step = StepOf(packets, video);
        if (const std::size_t dropped = DropBeforeLeap(video, step, packets); dropped > 0) {
            const std::int64_t passed = static_cast<std::int64_t>(dropped) * step;
            beginning.arrived +=
                std::chrono::microseconds(av_rescale_q(passed, video.time_base, {1, 1000000}));
            pictures -= dropped;
            readOn();
        }
        MendRtp(packets, video, audio);
    }
    return beginning;
}

}  // namespace receiver
