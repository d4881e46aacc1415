#include "inspect/Thumbnails.h"

#include <algorithm>

#include "common/ToolError.h"
#include "media/ContactSheet.h"
#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "reader/RecordingSamples.h"

namespace clipfile {

namespace {

constexpr int kColumns = 6;
constexpr std::uint64_t kPictures = 24;
constexpr int kCellWidth = 240;
/// The highest and the flattest picture.
constexpr std::uint64_t kMaxCellHeight = 960;
constexpr std::uint64_t kMinCellHeight = 30;
/// Above this a picture is none of a recording.
constexpr std::uint32_t kMaxPicture = 64'000'000;

ContactSheet::Cell CellOf(const Track& track) {
    const std::uint64_t height =
        track.width == 0 ? 0 : std::uint64_t{kCellWidth} * track.height / track.width / 2 * 2;
    return {kCellWidth, static_cast<int>(std::clamp(height, kMinCellHeight, kMaxCellHeight))};
}

/// The IDR pictures that stand first in each of so many equal parts of the track.
std::vector<Sample> ChooseSamples(const InputFile& file, const Inspection& inspection,
                                  const TrackSummary& video) {
    const auto place = static_cast<std::size_t>(&video - inspection.tracks.data());
    std::vector<Sample> chosen;
    RecordingSamples samples(file, inspection.recording, place);
    const std::uint64_t parts = std::min(kPictures, video.syncSamples);
    for (std::uint64_t i = 0; i < video.samples && chosen.size() < parts; ++i) {
        const auto sample = samples.Next();
        if (!sample) {
            break;
        }
        const bool isDue = i * parts >= chosen.size() * video.samples;
        if (sample->isSync && isDue && sample->size <= kMaxPicture) {
            chosen.push_back(*sample);
        }
    }
    return chosen;
}

ToolError NoPicture(const InputFile& file, const std::string& reason) {
    return {ExitCode::kUnreadable, file.Path().string() + " gives no thumbnails: " + reason + "."};
}

}  // namespace

std::vector<unsigned char> MakeThumbnails(const InputFile& file, const Inspection& inspection) {
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    if (video == nullptr || !video->track.avc || video->track.avc->sps.empty() ||
        video->track.avc->pps.empty()) {
        throw NoPicture(file, "it has no index yet, which 'recover' makes");
    }
    const std::vector<Sample> chosen = ChooseSamples(file, inspection, *video);
    const auto count = static_cast<int>(chosen.size());
    const int columns = std::clamp(count, 1, kColumns);
    ContactSheet sheet(columns, std::max(1, (count + columns - 1) / columns), CellOf(video->track));
    const ParameterSets sets = {video->track.avc->sps.front(), video->track.avc->pps.front()};
    bool hasAny = false;
    for (const Sample& sample : chosen) {
        hasAny = sheet.Add(sets, file.Read(sample.offset, sample.size)) || hasAny;
    }
    if (!hasAny) {
        throw NoPicture(file, "none of its IDR pictures decodes");
    }
    return sheet.Png();
}

}  // namespace clipfile
