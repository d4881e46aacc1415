#include "source/Connection.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "common/Credentials.h"
#include "source/RtpStamps.h"
#include "source/StreamChoice.h"
#include "source/Summary.h"
#include "source/VideoCheck.h"
#include "source/VideoConverter.h"
#include "source/VideoPass.h"
#include "timing/Saturating.h"

namespace receiver {
namespace {

constexpr AVRational kTicks{1, 90000};
/// Pictures that are looked at before a source is taken.
constexpr std::size_t kLookAhead = 25;
/// Packets that may wait for the first IDR frame.
constexpr std::size_t kLongestWait = 4000;
/// Pictures without an IDR frame among them after which the operator is told.
constexpr std::uint64_t kWithoutStart = 300;
/// How far behind the expected time reordered pictures may stand.
constexpr std::int64_t kBackReordered = 90000;
/// And what comes in the order of time, whose stamps merely jitter: this, or three units.
constexpr std::int64_t kBack = 13500;
/// How long the sender's first report is waited for, which RTP's senders give every five seconds or so.
constexpr std::chrono::seconds kReportPatience{6};
/// The timecode of a file is counted on from its first picture to the first IDR frame no further than this.
constexpr std::int64_t kLongestCount = std::int64_t{3600} * 90000;

/// The length of the audio frame in a packet of `size` bytes, in ticks.
std::int64_t AudioDuration(const AVStream& stream, int size) {
    const int samples = av_get_audio_frame_duration2(stream.codecpar, size);
    return samples > 0 && stream.codecpar->sample_rate > 0
               ? av_rescale(samples, kTicks.den, stream.codecpar->sample_rate)
               : av_rescale(kAudioFrame, kTicks.den, kAudioRate);
}

/// How far behind the expected time a unit of `usual` ticks may stand.
std::int64_t Back(std::int64_t usual) {
    return std::max(3 * usual, kBack);
}

}  // namespace

Connection::Connection(std::unique_ptr<Input> input, const SourceOptions& options,
                       const SourceDescription* before)
    : input_(std::move(input)), packet_(libav::NewPacket()) {
    Choose(options);
    LookAhead();
    DecideVideo(options, before);
    DecideAudio();
    ReadTimecodeTag();
    connected_ = Clock::now();
    description_.summary += klv_.empty() ? "" : ", KLV";
}

void Connection::Choose(const SourceOptions& options) {
    AVFormatContext& format = input_->Format();
    const StreamChoice choice = ChooseStreams(format, options);
    if (!choice.notice.empty()) {
        notices_.push_back(choice.notice);
    }
    const int video = choice.video;
    const int audio = choice.audio;
    for (unsigned int index = 0; index < format.nb_streams; ++index) {
        AVStream* const stream = format.streams[index];
        if (static_cast<int>(index) == video) {
            video_.stream = stream;
        } else if (static_cast<int>(index) == audio) {
            audio_ = Stream{stream, {}, 0, {}};
        } else if (stream->codecpar->codec_id == AV_CODEC_ID_SMPTE_KLV) {
            klv_.push_back({stream, {}, 0, {}});
        } else if (audio >= 0 || stream->codecpar->codec_type != AVMEDIA_TYPE_AUDIO) {
            stream->discard = AVDISCARD_ALL;
        }
    }
}

void Connection::CheckOther(const AVPacket& packet) {
    const AVStream& stream = *input_->Format().streams[packet.stream_index];
    if (!audio_ && stream.codecpar->codec_type == AVMEDIA_TYPE_AUDIO &&
        avcodec_find_decoder(stream.codecpar->codec_id) != nullptr && input_->AskFor(stream.id)) {
        throw FormatChanged("audio has begun");
    }
}

void Connection::LookAhead() {
    std::size_t pictures = 0;
    const auto begun = Clock::now();
    const auto waits = [&] {
        return input_->Rtp() && audio_ && !Reported() && Clock::now() - begun < kReportPatience;
    };
    while ((pictures < kLookAhead || waits()) && ahead_.size() < kLongestWait) {
        libav::Owner<AVPacket> packet = libav::NewPacket();
        if (!input_->Read(*packet)) {
            break;
        }
        if (packet->stream_index == video_.stream->index) {
            ++pictures;
            input_->Alive();
        }
        ahead_.push_back(std::move(packet));
    }
    if (!input_->Rtp()) {
        return;
    }
    for (const auto& packet : ahead_) {
        // The libraries infer these, wrongly.
        packet->dts = AV_NOPTS_VALUE;
    }
    const AVStream& video = *video_.stream;
    if (const double spacing = PictureSpacing(video, ahead_); spacing > 0) {
        MendStamps(video, std::llround(spacing / av_q2d(video.time_base)), ahead_);
    }
    if (audio_) {
        const AVStream& audio = *audio_->stream;
        MendStamps(audio, av_rescale_q(AudioDuration(audio, 0), kTicks, audio.time_base), ahead_);
    }
}

bool Connection::Reported() const {
    const auto reported = [this](const AVStream& stream) {
        const auto last = std::find_if(ahead_.rbegin(), ahead_.rend(), [&stream](const auto& packet) {
            return packet->stream_index == stream.index;
        });
        return last == ahead_.rend() || IsTied(**last);
    };
    return reported(*video_.stream) && reported(*audio_->stream);
}

void Connection::DecideVideo(const SourceOptions& options, const SourceDescription* before) {
    AVFormatContext& format = input_->Format();
    AVStream& stream = *format.streams[video_.stream->index];
    const AVCodecParameters& parameters = *stream.codecpar;
    const bool converted = options.transcode;
    const VideoFindings findings =
        CheckVideo(format, stream, ahead_, before != nullptr && !converted ? &before->frameRate : nullptr);
    const std::string reason = WhyNotPassed(parameters, findings);
    description_.width = static_cast<std::uint32_t>(parameters.width);
    description_.height = static_cast<std::uint32_t>(parameters.height);
    if (findings.rate) {
        description_.frameRate = *findings.rate;
    }
    description_.bitrate = static_cast<std::uint32_t>(
        (parameters.bit_rate != 0 ? parameters.bit_rate : std::max<std::int64_t>(0, format.bit_rate)) / 1000);
    if (!converted && !reason.empty()) {
        throw ReceiverError(ExitCode::kSourceUnsuitable, reason + ", or use --transcode");
    }
    if (parameters.width <= 0 || parameters.height <= 0) {
        throw ReceiverError(
            ExitCode::kSourceUnsuitable,
            "the video of '" + WithoutCredentials(format.url) +
                "' cannot be read: no parameter sets came; set the encoder to send them with each "
                "IDR frame");
    }
    std::string codec = "H.264";
    if (const char* const profile = avcodec_profile_name(parameters.codec_id, parameters.profile)) {
        codec += std::string(" ") + profile;
    }
    const VideoEncoding encoding = EncodingOf(options, description_);
    passes_ = reason.empty() && (!converted || (encoding.frameRate == description_.frameRate &&
                                                encoding.width == description_.width &&
                                                encoding.height == description_.height));
    if (findings.interlaced) {
        notices_.emplace_back(passes_ ? "the video is interlaced and is recorded as such"
                                      : "the video is interlaced and becomes progressive");
    }
    if (passes_) {
        videoPath_ = std::make_unique<VideoPass>(parameters);
    } else {
        if (!findings.rate && !options.frameRate) {
            throw ReceiverError(
                ExitCode::kSourceUnsuitable,
                "the frame rate of the source is none that can be recorded: tell --transcode which "
                "one to make of it with --fps");
        }
        videoPath_ = std::make_unique<VideoConverter>(parameters, encoding, findings.toldRate);
        const std::string from = std::string(avcodec_get_name(parameters.codec_id)) + " " +
                                 std::to_string(parameters.width) + "x" + std::to_string(parameters.height);
        description_ = {encoding.frameRate, encoding.width, encoding.height, encoding.bitrate, {}};
        codec = "H.264";
        notices_.push_back("video is converted: " + from + " to " + VideoSummary(codec, description_));
    }
    description_.summary = VideoSummary(codec, description_);
    watch_.emplace(parameters.codec_id, description_.frameRate, passes_);
}

void Connection::DecideAudio() {
    if (!audio_) {
        notices_.emplace_back("there is no audio: silence is recorded");
        description_.summary += ", silence";
        return;
    }
    const AVCodecParameters& parameters = *audio_->stream->codecpar;
    const auto first = std::find_if(ahead_.begin(), ahead_.end(), [this](const auto& packet) {
        return packet->stream_index == audio_->stream->index;
    });
    description_.summary += std::string(", ") + kRecordedAudioSummary;
    if (CanPass(parameters, first == ahead_.end() ? nullptr : first->get())) {
        audioPath_ = std::make_unique<AudioPass>();
        return;
    }
    audioPath_ = std::make_unique<AudioConverter>(parameters);
    notices_.push_back("audio is converted: " + AudioSummary(parameters) + " to " + kRecordedAudioSummary);
}

void Connection::ReadTimecodeTag() {
    const AVFormatContext& format = input_->Format();
    const AVDictionaryEntry* tag = av_dict_get(video_.stream->metadata, "timecode", nullptr, 0);
    for (unsigned int index = 0; tag == nullptr && index < format.nb_streams; ++index) {
        tag = av_dict_get(format.streams[index]->metadata, "timecode", nullptr, 0);
    }
    if (tag == nullptr) {
        tag = av_dict_get(format.metadata, "timecode", nullptr, 0);
    }
    if (tag != nullptr) {
        tag_ = ParseTimecode(tag->value);
    }
}

void Connection::Begin(UnitAssembler& assembler, std::int64_t begin) {
    assembler_ = &assembler;
    begin_ = begin;
    assembler.Begin(audio_.has_value());
    for (const std::string& notice : notices_) {
        assembler.AddNotice(notice);
    }
}

bool Connection::NextPacket() {
    if (!ahead_.empty()) {
        packet_ = std::move(ahead_.front());
        ahead_.pop_front();
        return true;
    }
    av_packet_unref(packet_.get());
    return input_->Read(*packet_);
}

bool Connection::Pump() {
    if (!NextPacket()) {
        return false;
    }
    if ((packet_->flags & AV_PKT_FLAG_CORRUPT) != 0) {
        ++damaged_;
        return true;
    }
    if (packet_->stream_index == video_.stream->index) {
        input_->Alive();
    }
    position_ = packet_->pos;
    Handle(*packet_);
    return true;
}

std::unique_ptr<Input> Connection::End(std::unique_ptr<Connection> connection) {
    return std::move(connection->input_);
}

void Connection::Handle(AVPacket& packet) {
    const Stream* const stream = StreamOf(packet);
    if (stream == nullptr) {
        CheckOther(packet);
        return;
    }
    if (stream == &video_) {
        HandleVideo(packet);
    } else if (!line_.Anchored()) {
        // Before the first IDR frame nobody knows where this stands.
        libav::Owner<AVPacket> copy = libav::NewPacket();
        av_packet_move_ref(copy.get(), &packet);
        early_.push_back(std::move(copy));
        if (early_.size() > kLongestWait) {
            early_.pop_front();
        }
    } else if (audio_ && stream == &*audio_) {
        HandleAudio(packet);
    } else {
        HandleKlv(packet);
    }
}

Connection::Stream* Connection::StreamOf(const AVPacket& packet) {
    if (packet.stream_index == video_.stream->index) {
        return &video_;
    }
    if (audio_ && packet.stream_index == audio_->stream->index) {
        return &*audio_;
    }
    const auto found = std::find_if(klv_.begin(), klv_.end(), [&packet](const Stream& stream) {
        return packet.stream_index == stream.stream->index;
    });
    return found == klv_.end() ? nullptr : &*found;
}

std::optional<std::int64_t> Connection::StampOf(Stream& stream, const AVPacket& packet) {
    const std::int64_t raw = packet.pts != AV_NOPTS_VALUE ? packet.pts : packet.dts;
    if (raw == AV_NOPTS_VALUE) {
        return std::nullopt;
    }
    const AVRational base = stream.stream->time_base;
    if (!stream.last) {
        stream.last = reference_ ? av_rescale_q(*reference_, kTicks, base) : raw;
    }
    stream.last = UnwrapNear(raw, stream.stream->pts_wrap_bits, *stream.last);
    const std::int64_t stamp = av_rescale_q(*stream.last, base, kTicks);
    reference_ = stamp;
    return stamp;
}

std::optional<std::int64_t> Connection::DelayOf(const AVPacket& packet) const {
    if (input_->Rtp() || packet.pts == AV_NOPTS_VALUE || packet.dts == AV_NOPTS_VALUE) {
        return std::nullopt;
    }
    return av_rescale_q(packet.pts - packet.dts, video_.stream->time_base, kTicks);
}

std::int64_t Connection::Elapsed(Stream& stream, std::int64_t usual) {
    const auto now = Clock::now();
    const auto since = std::exchange(stream.arrived, now);
    if (input_->Recorded() || since == Clock::time_point()) {
        return 0;
    }
    const auto ticks = std::chrono::duration_cast<std::chrono::microseconds>(now - since).count() * 9 / 100;
    return std::max<std::int64_t>(0, ticks - usual);
}

std::int64_t Connection::TimeOf(Stream& stream, std::int64_t stamp, std::int64_t usual, std::int64_t back) {
    const Timeline::Place place = line_.TimeOf(stamp, stream.expected, Elapsed(stream, usual), back);
    if (place.jump != 0) {
        assembler_->AddNotice("the source's clock jumped by " + std::to_string(place.jump / 90) +
                              " ms; the recording goes on without the jump");
    }
    stream.expected = place.time + usual;
    return place.time;
}

void Connection::HandleVideo(AVPacket& packet) {
    const auto stamp = StampOf(video_, packet);
    if (stamp && !firstVideoStamp_) {
        firstVideoStamp_ = stamp;
    }
    watch_->Look({packet.data, static_cast<std::size_t>(packet.size)}, stamp, DelayOf(packet));
    const std::int64_t period = assembler_->Grid().Period();
    if (!line_.Anchored()) {
        if (!stamp || !videoPath_->IsStart(packet)) {
            if (++withoutStart_ == kWithoutStart) {
                assembler_->AddNotice(
                    "no IDR frame came in " + std::to_string(kWithoutStart) +
                    " pictures, and a recording begins with one: set the encoder to closed groups "
                    "of pictures, each begun by an IDR frame");
            }
            return;
        }
        line_.Anchor(*stamp, begin_);
        video_.expected = begin_;
        if (audio_) {
            audio_->expected = begin_;
        }
        const std::int64_t passed = *stamp - *firstVideoStamp_;
        if (tag_ && begin_ == 0 && passed >= 0 && passed < kLongestCount) {
            const FrameRate& rate = description_.frameRate;
            const std::int64_t first = FrameNumberOf(*tag_, rate.timecodeFrames);
            assembler_->SetTimecode(TimecodeOf(first + assembler_->Grid().FramesIn(passed),
                                               rate.timecodeFrames, tag_->dropFrame));
        }
    }
    packet.pts =
        stamp ? TimeOf(video_, *stamp, period, passes_ ? Back(period) : kBackReordered) : video_.expected;
    packet.dts = AV_NOPTS_VALUE;
    video_.expected = packet.pts + period;
    // What belongs to the first picture has to be there before it and its sound complete each other.
    auto waiting = std::exchange(early_, {});
    const auto sound = std::stable_partition(waiting.begin(), waiting.end(), [this](const auto& early) {
        return !audio_ || StreamOf(*early) != &*audio_;
    });
    Replay(waiting.begin(), sound);
    videoPath_->Push(packet, ToPictures());
    Replay(sound, waiting.end());
}

void Connection::Replay(Packets::iterator begin, Packets::iterator end) {
    replaying_ = true;
    std::for_each(begin, end, [this](const auto& packet) { Handle(*packet); });
    replaying_ = false;
}

void Connection::HandleAudio(AVPacket& packet) {
    // Of several frames behind one stamp each further one begins where the one before ends.
    const std::int64_t usual = AudioDuration(*audio_->stream, packet.size);
    const auto stamp = StampOf(*audio_, packet);
    packet.pts = stamp ? AudioTime(*stamp, usual) : audio_->expected;
    packet.dts = AV_NOPTS_VALUE;
    audio_->expected = packet.pts + usual;
    // Sound that ends in front of this connection's pictures goes nowhere.
    if (packet.pts >= begin_ - AudioDuration(*audio_->stream, 0) / 2) {
        audioPath_->Push(packet, ToAudio());
    }
}

std::int64_t Connection::AudioTime(std::int64_t stamp, std::int64_t usual) {
    if (!audio_->joined) {
        const std::int64_t time = line_.Nearest(stamp, begin_);
        const bool near = Distance(time, begin_) <= static_cast<std::uint64_t>(Timeline::kLongestGap);
        // The sound of pictures in front of the first IDR frame, however many these were. On another clock
        // than that of the IDR frame it belongs to pictures before it as well.
        const bool before = time < begin_ - usual / 2;
        if (replaying_ ? before || !near : before && near) {
            return std::min(time, begin_ - usual);
        }
        audio_->joined = true;
        // Audio may begin at any time of the pictures.
        if (Distance(time, video_.expected) <= static_cast<std::uint64_t>(Timeline::kLongestGap)) {
            audio_->expected = time;
        }
    }
    return TimeOf(*audio_, stamp, usual, Back(usual));
}

void Connection::HandleKlv(const AVPacket& packet) {
    Stream& stream = *StreamOf(packet);
    // Behind an outage the last picture is that of the connection before.
    const std::int64_t last = std::max(assembler_->LastPicture(), begin_);
    std::optional<std::int64_t> time;
    if (const auto stamp = StampOf(stream, packet)) {
        time = line_.Nearest(*stamp, last);
        // A stamp that belongs to no picture near is of no use.
        if (*time < last - Timeline::kLongestGap || *time > last + Timeline::kLongestGap) {
            time.reset();
        } else if (*time < begin_) {
            return;
        }
    }
    for (const std::string& klv : klvPackets_.Take({packet.data, static_cast<std::size_t>(packet.size)})) {
        assembler_->AddKlv(klv, time);
    }
}

void Connection::Finish() {
    videoPath_->Finish(ToPictures());
    if (audioPath_) {
        audioPath_->Finish(ToAudio());
    }
    assembler_->Finish();
}

PictureSink Connection::ToPictures() {
    return [this](const CodedPicture& picture) { assembler_->AddPicture(picture); };
}

AudioSink Connection::ToAudio() {
    return [this](const CodedAudio& audio) { assembler_->AddAudio(audio); };
}

std::uint64_t Connection::Damaged() const {
    return damaged_ + videoPath_->Damaged() + (audioPath_ ? audioPath_->Damaged() : 0) +
           klvPackets_.Damaged();
}

}  // namespace receiver
