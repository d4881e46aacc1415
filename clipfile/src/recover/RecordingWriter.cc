#include "recover/RecordingWriter.h"

#include <array>
#include <cstdio>
#include <system_error>

#include "common/ToolError.h"
#include "mp4/InputStreamInfo.h"
#include "mp4/Mp4MuxerFactory.h"
#include "reader/BigEndian.h"

namespace clipfile {

namespace {

/// Frames per 1000 seconds, by which the recorder names its frame rates.
constexpr std::uint32_t kFrameRateKeys[] = {23980, 24000, 25000, 29970, 30000, 50000, 59940, 60000};

nal_access::NalUnit ToNalUnit(const std::vector<unsigned char>& bytes) {
    nal_access::NalUnit unit;
    unit.size = bytes.size();
    unit.data = std::shared_ptr<unsigned char>(new unsigned char[bytes.size()],
                                               std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), unit.data.get());
    return unit;
}

/// The recorder's own table of rates is asked for the one that the profile shows.
void FindFrameRate(const InputFile& file, const VideoProfile& video, RecordingSetup& setup) {
    for (const std::uint32_t key : kFrameRateKeys) {
        setup.settings.framerate = key;
        clipfileModule::InputStreamInfo info;
        info.MakeInputStreamInfo(setup.settings);
        if (info.video_average_framerate == video.frameRate &&
            info.video_average_framerate_point == video.frameRateFraction) {
            setup.timescale = info.video_track_timescale;
            setup.pictureDuration = info.video_sample_duration;
            return;
        }
    }
    throw ToolError(ExitCode::kDefects,
                    file.Path().string() + " was recorded at a frame rate that no recorder has.");
}

/// The timecode in the name of a file, "HH_MM_SS_FF", behind which a counter may stand.
std::optional<Timecode> TimecodeOfName(const std::filesystem::path& path) {
    unsigned hours = 0;
    unsigned minutes = 0;
    unsigned seconds = 0;
    unsigned frames = 0;
    const std::string stem = path.stem().string();
    if (stem.size() < 11 ||
        std::sscanf(stem.c_str(), "%2u_%2u_%2u_%2u", &hours, &minutes, &seconds, &frames) != 4 ||
        hours > 23 || minutes > 59 || seconds > 59) {
        return std::nullopt;
    }
    return Timecode{static_cast<std::uint8_t>(hours), static_cast<std::uint8_t>(minutes),
                    static_cast<std::uint8_t>(seconds), static_cast<std::uint8_t>(frames), false};
}

/// Only a stream with timecode gives a file its timecode. The name has that of the first picture, which may
/// be some frames from that of the first unit.
Timecode FileTimecode(const std::filesystem::path& path, const MetadataUnit& firstUnit) {
    if (!firstUnit.timecode) {
        return {};
    }
    Timecode timecode = TimecodeOfName(path).value_or(*firstUnit.timecode);
    timecode.dropFrame = firstUnit.timecode->dropFrame;
    return timecode;
}

/// Exact rules leave edit lists out of fragmented files, but for reordered video; normal files are alike.
clipfileModule::RecordRules RulesOf(const Recording& recording) {
    const bool hasEdit = recording.movie && recording.movie->Find(FourCc("soun")) != nullptr &&
                         recording.movie->Find(FourCc("soun"))->edit.has_value();
    return hasEdit ? clipfileModule::RecordRules::kKept : clipfileModule::RecordRules::kExact;
}

}  // namespace

RecordingSetup ReadSetup(const InputFile& file, const Recording& recording, const MetadataUnit& firstUnit) {
    if (!recording.profile.video) {
        throw ToolError(ExitCode::kDefects, file.Path().string() + " does not tell its picture size.");
    }
    const VideoProfile& video = *recording.profile.video;
    RecordingSetup setup;
    setup.kind = recording.kind;
    setup.settings.width = video.width;
    setup.settings.height = video.height;
    setup.settings.bitrate = video.averageBitrate;
    setup.settings.recordRules = RulesOf(recording);
    FindFrameRate(file, video, setup);
    setup.timecode = FileTimecode(file.Path(), firstUnit);
    if (recording.movie) {
        const Track* const timecode = recording.movie->Find(FourCc("tmcd"));
        if (timecode != nullptr && timecode->timecode) {
            setup.timecode.dropFrame = timecode->timecode->IsDropFrame();
        }
        setup.opened = FromMp4Time(recording.movie->creationTime);
    } else {
        // No file tells when it was opened before it is closed. It was written last when its last chunk came.
        setup.opened = ToLocalTime(file.ModifiedSeconds());
    }
    return setup;
}

RecordingWriter::RecordingWriter(const std::filesystem::path& path, const RecordingSetup& setup,
                                 const ParameterSets& sets)
    : path_(path), setup_(setup), target_(path, setup.opened) {
    setup_.settings.sps = ToNalUnit(sets.sps);
    setup_.settings.pps = ToNalUnit(sets.pps);
    clipfileModule::Mp4MuxerFactory().Create(setup.kind == FileKind::kNormal ? "normal" : "fragment", muxer_);
    const std::array<unsigned char, 4> timecode = {setup.timecode.hours, setup.timecode.minutes,
                                                   setup.timecode.seconds, setup.timecode.frames};
    Check(muxer_->Initialize());
    Check(muxer_->Open(setup_.settings, timecode.data(), setup.timecode.dropFrame));
}

RecordingWriter::~RecordingWriter() {
    muxer_->Uninitialize();
}

void RecordingWriter::Write(const Chunk& chunk) {
    Check(muxer_->Write(chunk));
}

void RecordingWriter::Close() {
    const std::array<unsigned char, 4> timecode = {setup_.timecode.hours, setup_.timecode.minutes,
                                                   setup_.timecode.seconds, setup_.timecode.frames};
    Check(muxer_->WriteTmcd(timecode.data()));
    Check(muxer_->Close());
}

void RecordingWriter::Check(bool succeeded) const {
    if (succeeded) {
        return;
    }
    const std::string reason =
        target_.Error() != 0 ? std::generic_category().message(target_.Error()) : "its index has no room";
    throw ToolError(ExitCode::kUnreadable, path_.string() + " cannot be written: " + reason + ".");
}

}  // namespace clipfile
