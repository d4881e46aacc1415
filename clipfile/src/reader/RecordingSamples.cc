#include "reader/RecordingSamples.h"

#include <algorithm>

namespace clipfile {

RecordingSamples::RecordingSamples(const InputFile& file, const Recording& recording, std::size_t track)
    : file_(file),
      recording_(recording),
      track_(track),
      cursor_(file, recording),
      source_(std::make_unique<TableSamples>(file, recording.movie->tracks[track].tables)) {}

std::optional<Sample> RecordingSamples::Next() {
    for (;;) {
        if (auto sample = source_->Next()) {
            sample->time += time_;
            sample->run += run_;
            nextTime_ = sample->time + sample->duration;
            nextRun_ = sample->run + 1;
            return sample;
        }
        if (!EnterFragment()) {
            return std::nullopt;
        }
    }
}

bool RecordingSamples::EnterFragment() {
    while (recording_.kind == FileKind::kFragmented) {
        const auto moof = cursor_.Next();
        if (!moof) {
            return false;
        }
        fragment_ = ReadFragment(file_, *moof, *recording_.movie);
        const auto part =
            std::find_if(fragment_.tracks.begin(), fragment_.tracks.end(),
                         [&](const TrackFragment& candidate) { return candidate.track == track_; });
        if (part != fragment_.tracks.end()) {
            source_ = std::make_unique<FragmentSamples>(file_, *part);
            time_ = nextTime_;
            run_ = nextRun_;
            return true;
        }
    }
    return false;
}

}  // namespace clipfile
