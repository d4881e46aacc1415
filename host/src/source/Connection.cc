#include "source/Connection.h"

#include <algorithm>
#include <utility>

#include "source/FirstStamp.h"
#include "source/StreamChoice.h"
#include "timing/Saturating.h"

namespace receiver {
namespace {

/// Packets that may wait for the first IDR frame.
constexpr std::size_t kLongestWait = 4000;
/// Pictures without an IDR frame among them after which the operator is told.
constexpr std::uint64_t kWithoutStart = 300;
/// Packets of a new stream, while none of the one before comes, that show a medium to have moved.
constexpr int kMoved = 25;

/// False for a stream of which the tables tell and nothing has come.
bool HasBegun(const AVStream& stream) {
    const AVCodecParameters& parameters = *stream.codecpar;
    return parameters.codec_type == AVMEDIA_TYPE_VIDEO   ? parameters.width > 0
           : parameters.codec_type == AVMEDIA_TYPE_AUDIO ? parameters.sample_rate > 0
                                                         : true;
}

}  // namespace

Connection::Connection(std::unique_ptr<Input> input, const SourceOptions& options,
                       const SourceDescription* before)
    : input_(std::move(input)), packet_(libav::NewPacket()), untouched_(libav::NewPacket()) {
    Choose(options);
    ahead_ = LookAhead(*input_, *video_, audio_);
    // A file of another container tells of each picture how long it stands.
    if (input_->Transport() || !input_->Recorded()) {
        MendFirstStamp(ahead_.packets, *video_, audio_);
    }
    AVFormatContext& format = input_->Format();
    paths_ = DecidePaths(format, *format.streams[video_->index], audio_, ahead_.packets, options, before);
    notices_.insert(notices_.end(), paths_.notices.begin(), paths_.notices.end());
    watch_.emplace(video_->codecpar->codec_id, paths_.description.frameRate, paths_.passes, Reordered());
    clock_.emplace(*video_, audio_, input_->Recorded(), Reordered());
    if (Reordered()) {
        const FrameRate& rate = paths_.description.frameRate;
        const AVRational period{static_cast<int>(rate.denominator), static_cast<int>(rate.numerator)};
        reorder_.emplace(*video_, paths_.description.reordering, av_rescale_q(1, period, video_->time_base));
    }
    steps_.emplace(*clock_);
    ReadTimecodeTag();
    paths_.description.summary += klv_.empty() ? "" : ", KLV";
}

void Connection::Choose(const SourceOptions& options) {
    AVFormatContext& format = input_->Format();
    const StreamChoice choice = ChooseStreams(format, options);
    if (!choice.notice.empty()) {
        notices_.push_back(choice.notice);
    }
    for (unsigned int index = 0; index < format.nb_streams; ++index) {
        AVStream* const stream = format.streams[index];
        if (static_cast<int>(index) == choice.video) {
            video_ = stream;
        } else if (static_cast<int>(index) == choice.audio) {
            audio_ = stream;
        } else if (stream->codecpar->codec_id == AV_CODEC_ID_SMPTE_KLV) {
            klv_.push_back({stream});
        } else if (HasBegun(*stream) &&
                   (choice.audio >= 0 || stream->codecpar->codec_type != AVMEDIA_TYPE_AUDIO)) {
            stream->discard = AVDISCARD_ALL;
        }
    }
}

std::int64_t Connection::SinceFirst(std::int64_t stamp) const {
    const AVRational rate = paths_.sourceRate;
    const std::int64_t counted =
        av_rescale(static_cast<std::int64_t>(earlyPictures_) * kVideoClock, rate.den, rate.num);
    const std::int64_t told = *firstVideoStamp_ > stamp ? -1 : stamp - *firstVideoStamp_;
    const bool likely = told >= 0 && Distance(told, counted) <= std::uint64_t{Timeline::kLongestGap};
    return likely ? told : counted;
}

void Connection::CheckOther(const AVPacket& packet) {
    const AVStream& stream = *input_->Format().streams[packet.stream_index];
    if (audio_ == nullptr && stream.codecpar->codec_type == AVMEDIA_TYPE_AUDIO &&
        avcodec_find_decoder(stream.codecpar->codec_id) != nullptr && input_->AskFor(stream.id)) {
        throw FormatChanged("audio has begun");
    }
    // Streams that had begun are no longer read. The tables of a programme may move a medium to another one.
    const bool video = stream.codecpar->codec_type == AVMEDIA_TYPE_VIDEO;
    const bool audio = audio_ != nullptr && stream.codecpar->codec_type == AVMEDIA_TYPE_AUDIO;
    if (video && newPictures_ == 0) {
        newPosition_ = packet.pos;
    }
    if (video && ++newPictures_ >= kMoved) {
        position_ = newPosition_;
        throw FormatChanged("the video moved to another stream");
    }
    if (audio && ++newSounds_ >= kMoved) {
        throw FormatChanged("the audio moved to another stream");
    }
}

void Connection::ReadTimecodeTag() {
    const AVFormatContext& format = input_->Format();
    const AVDictionaryEntry* tag = av_dict_get(video_->metadata, "timecode", nullptr, 0);
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
    assembler.Begin(audio_ != nullptr);
    for (const std::string& notice : notices_) {
        assembler.AddNotice(notice);
    }
}

bool Connection::ReadPacket() {
    if (!ahead_.packets.empty()) {
        packet_ = std::move(ahead_.packets.front());
        ahead_.packets.pop_front();
        return true;
    }
    av_packet_unref(packet_.get());
    return input_->Read(*packet_);
}

bool Connection::NextPacket() {
    if (!reorder_) {
        return ReadPacket();
    }
    next_ = reorder_->Take();
    while (!next_ && ReadPacket()) {
        const bool idr = IsOf(*packet_, video_) && (packet_->flags & AV_PKT_FLAG_KEY) != 0 &&
                         paths_.video->IsStart(*packet_);
        reorder_->Put(std::exchange(packet_, libav::NewPacket()), idr);
        next_ = reorder_->Take();
    }
    if (!next_) {
        return NextWaiting();
    }
    packet_ = std::move(next_->packet);
    return true;
}

bool Connection::NextWaiting() {
    reorder_->End();
    next_ = reorder_->Take();
    if (!next_) {
        return false;
    }
    packet_ = std::move(next_->packet);
    return true;
}

bool Connection::Pump() {
    if (!NextPacket()) {
        return false;
    }
    if (input_->Recorded()) {
        av_packet_unref(untouched_.get());
        libav::Check(av_packet_ref(untouched_.get(), packet_.get()), "hold a packet");
    }
    try {
        Accept();
    } catch (const FormatChanged&) {
        if (reorder_) {
            Packets rest = reorder_->TakeRest();
            std::move(ahead_.packets.begin(), ahead_.packets.end(), std::back_inserter(rest));
            ahead_.packets = std::move(rest);
        }
        throw;
    }
    return true;
}

void Connection::Accept() {
    if (reorder_ && IsOf(*packet_, video_) && (packet_->flags & AV_PKT_FLAG_CORRUPT) == 0) {
        position_ = packet_->pos;
        watch_->LookAtReordering(DelayOf(*packet_), next_->late);
        packet_->pts = next_->shown.value_or(AV_NOPTS_VALUE);
        packet_->dts = next_->turn.value_or(AV_NOPTS_VALUE);
    }
    if ((packet_->flags & AV_PKT_FLAG_CORRUPT) != 0) {
        steps_->Mark(assembler_->LastPicture());
    }
    if (input_->Transport() && IsOf(*packet_, audio_)) {
        newSounds_ = 0;
        for (const auto& packet : runs_.Put(std::exchange(packet_, libav::NewPacket()),
                                            audio_->codecpar->codec_id, audio_->time_base)) {
            Handle(*packet);
        }
        return;
    }
    if ((packet_->flags & AV_PKT_FLAG_CORRUPT) != 0) {
        ++damaged_;
        return;
    }
    if (IsOf(*packet_, video_)) {
        input_->Alive();
        HandleExpired();
    }
    Handle(*packet_);
}

void Connection::HandleExpired() {
    const std::int64_t stamp = Reordered() ? packet_->dts : packet_->pts;
    if (stamp == AV_NOPTS_VALUE) {
        return;
    }
    for (const auto& sound : runs_.Expire(stamp, video_->time_base)) {
        Handle(*sound);
    }
}

Packets Connection::TakeUnread() {
    if (newPictures_ >= kMoved || newSounds_ >= kMoved) {
        return {};
    }
    Packets unread = std::exchange(ahead_.packets, {});
    if (untouched_->data != nullptr) {
        unread.push_front(std::move(untouched_));
    }
    return unread;
}

std::unique_ptr<Input> Connection::End(std::unique_ptr<Connection> connection) {
    return std::move(connection->input_);
}

bool Connection::IsOf(const AVPacket& packet, const AVStream* stream) {
    return stream != nullptr && packet.stream_index == stream->index;
}

StreamClock::Track* Connection::KlvTrackOf(const AVPacket& packet) {
    const auto found = std::find_if(klv_.begin(), klv_.end(), [&packet](const StreamClock::Track& track) {
        return IsOf(packet, track.stream);
    });
    return found == klv_.end() ? nullptr : &*found;
}

void Connection::Handle(AVPacket& packet) {
    steps_->Put(packet, SteppingMedium(packet), assembler_->LastPicture(),
                [this](AVPacket& next) { Process(next); });
}

std::optional<StepWatch::Medium> Connection::SteppingMedium(const AVPacket& packet) const {
    const bool marked = input_->Transport() && !input_->Recorded() && paths_.passes && audio_ != nullptr &&
                        clock_->Anchored();
    if (marked && IsOf(packet, video_)) {
        return StepWatch::Medium::kVideo;
    }
    return marked && IsOf(packet, audio_) ? std::optional(StepWatch::Medium::kAudio) : std::nullopt;
}

void Connection::Process(AVPacket& packet) {
    position_ = packet.pos;
    const bool audio = IsOf(packet, audio_);
    newPictures_ = IsOf(packet, video_) ? 0 : newPictures_;
    newSounds_ = audio ? 0 : newSounds_;
    if (IsOf(packet, video_)) {
        HandleVideo(packet);
        used_ |= position_ >= input_->CarriedFrom();
    } else if (!audio && KlvTrackOf(packet) == nullptr) {
        CheckOther(packet);
    } else if (!clock_->Anchored()) {
        KeepEarly(packet);
    } else if (audio) {
        HandleAudio(packet, false);
    } else {
        HandleKlv(packet);
    }
}

void Connection::KeepEarly(AVPacket& packet) {
    // Before the first IDR frame nobody knows where this stands.
    libav::Owner<AVPacket> copy = libav::NewPacket();
    av_packet_move_ref(copy.get(), &packet);
    early_.push_back(std::move(copy));
    if (early_.size() > kLongestWait) {
        early_.pop_front();
    }
}

std::optional<std::int64_t> Connection::DelayOf(const AVPacket& packet) const {
    if (input_->Rtp() || packet.pts == AV_NOPTS_VALUE || packet.dts == AV_NOPTS_VALUE) {
        return std::nullopt;
    }
    return av_rescale_q(packet.pts - packet.dts, video_->time_base, kTicks);
}

bool Connection::Start(const AVPacket& packet, std::optional<std::int64_t> stamp) {
    if (!stamp || !paths_.video->IsStart(packet)) {
        if (++earlyPictures_ == kWithoutStart) {
            assembler_->AddNotice("no IDR frame came in " + std::to_string(kWithoutStart) +
                                  " pictures, and a recording begins with one: set the encoder to closed "
                                  "groups of pictures, each begun by an IDR frame");
        }
        return false;
    }
    const std::int64_t passed = SinceFirst(*stamp);
    const FrameRate& rate = paths_.description.frameRate;
    if (begin_ > 0) {
        begin_ = assembler_->Resume(rate, begin_ + passed);
    } else if (tag_) {
        const std::int64_t first = FrameNumberOf(*tag_, rate.timecodeFrames);
        assembler_->SetTimecode(
            TimecodeOf(first + assembler_->Grid().FramesIn(passed), rate.timecodeFrames, tag_->dropFrame));
    }
    if (!input_->Recorded()) {
        assembler_->SetArrival(begin_, ahead_.arrived + std::chrono::microseconds(passed * 100 / 9));
    }
    clock_->Begin(begin_, [this](const std::string& sentence) { assembler_->AddNotice(sentence); });
    clock_->Anchor(*stamp, delay_.value_or(0));
    return true;
}

void Connection::HandleVideo(AVPacket& packet) {
    const auto stamp = clock_->VideoStamp(packet);
    if (stamp && !firstVideoStamp_) {
        firstVideoStamp_ = stamp;
    }
    const auto delay = DelayOf(packet);
    watch_->Look({packet.data, static_cast<std::size_t>(packet.size)}, stamp, delay);
    const bool delaysKnown = delay && delay_;
    delay_ = delay && !paths_.passes ? delay : delay_;
    Packets early;
    if (!clock_->Anchored()) {
        if (!Start(packet, stamp)) {
            return;
        }
        early = std::exchange(early_, {});
    }
    // What belongs to the first picture has to be there before it and its sound complete each other.
    const auto sound = std::stable_partition(early.begin(), early.end(),
                                             [this](const auto& waiting) { return !IsOf(*waiting, audio_); });
    std::for_each(early.begin(), sound, [this](const auto& waiting) { HandleKlv(*waiting); });
    PlacePicture(packet, stamp, delaysKnown);
    paths_.video->Push(packet, ToPictures());
    std::for_each(sound, early.end(), [this](const auto& waiting) { HandleAudio(*waiting, true); });
}

void Connection::PlacePicture(AVPacket& packet, std::optional<std::int64_t> stamp, bool delaysKnown) {
    const bool hasTurn = Reordered() && packet.dts != AV_NOPTS_VALUE;
    const std::int64_t later = hasTurn ? av_rescale_q(packet.pts - packet.dts, video_->time_base, kTicks) : 0;
    packet.dts = AV_NOPTS_VALUE;
    if (Reordered()) {
        packet.dts = clock_->VideoTime(stamp, assembler_->Grid());
        packet.pts = packet.dts + later;
    } else if (paths_.passes) {
        packet.pts = clock_->VideoTime(stamp, assembler_->Grid());
    } else {
        // What is decoded in another order than it is shown in still comes in the order of its decoding.
        const std::int64_t behind = delay_.value_or(0);
        const auto decoded = stamp ? std::optional(*stamp - behind) : std::nullopt;
        packet.pts = clock_->VideoTime(decoded, assembler_->Grid().Period(), !delaysKnown) + behind;
    }
}

void Connection::HandleAudio(AVPacket& packet, bool waited) {
    packet.pts = clock_->AudioTime(clock_->AudioStamp(packet), AudioDuration(*audio_, packet.size), waited);
    packet.dts = AV_NOPTS_VALUE;
    // Sound that ends in front of this connection's pictures goes nowhere.
    if (packet.pts >= begin_ - AudioDuration(*audio_, 0) / 2) {
        paths_.audio->Push(packet, ToAudio());
    }
}

void Connection::HandleKlv(const AVPacket& packet) {
    // Behind an outage the last picture is that of the connection before.
    const std::int64_t last = std::max(assembler_->LastPicture(), begin_);
    std::optional<std::int64_t> time;
    if (const auto stamp = clock_->StampOf(*KlvTrackOf(packet), packet)) {
        // A stamp that belongs to no picture near is of no use.
        time = clock_->TimeNear(*stamp, last);
        if (time && *time < begin_) {
            return;
        }
    }
    for (const std::string& klv : klvPackets_.Take({packet.data, static_cast<std::size_t>(packet.size)})) {
        assembler_->AddKlv(klv, time);
    }
}

void Connection::Finish() {
    try {
        while (reorder_ && NextWaiting()) {
            Accept();
        }
        for (const auto& packet : runs_.Finish()) {
            Handle(*packet);
        }
        steps_->Release([this](AVPacket& packet) { Process(packet); });
    } catch (const FormatChanged&) {
        // Nothing follows in which the new format could go on.
    }
    paths_.video->Finish(ToPictures());
    if (paths_.audio) {
        paths_.audio->Finish(ToAudio());
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
    return damaged_ + runs_.Damaged() + paths_.video->Damaged() +
           (paths_.audio ? paths_.audio->Damaged() : 0) + klvPackets_.Damaged();
}

}  // namespace receiver
