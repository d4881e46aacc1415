#include "recover/TableChunks.h"

#include <algorithm>
#include <array>

#include "media/NalUnits.h"
#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

/// Whether the sample ends in the zeros that go on behind it. No NAL unit ends with one (ISO/IEC
/// 14496-10 7.4.1).
bool RunsOutInZeros(const InputFile& file, const Sample& sample) {
    if (sample.size == 0) {
        return false;
    }
    const std::uint64_t last = sample.offset + sample.size - 1;
    const std::vector<unsigned char> bytes =
        file.Read(last, static_cast<std::size_t>(std::min<std::uint64_t>(16, file.Size() - last)));
    return std::all_of(bytes.begin(), bytes.end(), [](unsigned char byte) { return byte == 0; });
}

}  // namespace

/// `moov` or a fragment, with the next run of each medium.
struct TableChunks::Part {
    struct Medium {
        std::unique_ptr<SampleSource> samples;
        std::unique_ptr<RunReader> runs;
        std::optional<Run> next;
    };

    void Add(TableChunks::Medium medium, std::unique_ptr<SampleSource> samples) {
        Medium& added = media[medium];
        added.samples = std::move(samples);
        added.runs = std::make_unique<RunReader>(*added.samples);
        added.next = added.runs->Next();
    }
    /// The medium whose run comes first in the file.
    std::optional<TableChunks::Medium> First() const {
        std::optional<std::size_t> first;
        for (std::size_t i = 0; i < media.size(); ++i) {
            if (media[i].next && (!first || media[i].next->offset < media[*first].next->offset)) {
                first = i;
            }
        }
        return first ? std::optional(static_cast<TableChunks::Medium>(*first)) : std::nullopt;
    }

    Fragment fragment;  // the samples refer to it
    std::array<Medium, kMediumCount> media;
};

TableChunks::TableChunks(const InputFile& file, const Recording& recording, const SampleClock& clock)
    : file_(file),
      recording_(recording),
      clock_(clock),
      cursor_(file, recording),
      position_(recording.dataBegin) {}

TableChunks::~TableChunks() = default;

std::optional<TableChunks::Medium> TableChunks::MediumOf(const Track& track) {
    switch (track.handler) {
        case FourCc("meta"):
            return kMeta;
        case FourCc("soun"):
            return kAudio;
        case FourCc("vide"):
            return kVideo;
        default:
            return std::nullopt;
    }
}

void TableChunks::EnterMovie() {
    part_ = std::make_unique<Part>();
    for (const Track& track : recording_.movie->tracks) {
        if (const auto medium = MediumOf(track)) {
            part_->Add(*medium, std::make_unique<TableSamples>(file_, track.tables));
        }
    }
}

bool TableChunks::EnterFragment() {
    const auto moof = recording_.kind == FileKind::kFragmented ? cursor_.Next() : std::nullopt;
    if (!moof) {
        return false;
    }
    part_ = std::make_unique<Part>();
    part_->fragment = ReadFragment(file_, *moof, *recording_.movie);
    for (const TrackFragment& track : part_->fragment.tracks) {
        if (const auto medium = MediumOf(recording_.movie->tracks[track.track])) {
            part_->Add(*medium, std::make_unique<FragmentSamples>(file_, track));
        }
    }
    return true;
}

Chunk TableChunks::Next() {
    try {
        return Take();
    } catch (const FormatError&) {
        // Tables may be broken where their bytes never reached the disk. What came before them is good.
        isTorn_ = true;
        return nullptr;
    }
}

Chunk TableChunks::Take() {
    if (part_ == nullptr) {
        EnterMovie();
    }
    while (!isTorn_) {
        const auto runs = TakeRuns();
        if (!runs) {
            isTorn_ = !EnterFragment();
            continue;
        }
        if (Chunk chunk = ReadChunk(*runs)) {
            clock_.Count(*chunk);
            return chunk;
        }
    }
    return nullptr;
}

std::optional<std::vector<std::pair<TableChunks::Medium, Run>>> TableChunks::TakeRuns() {
    std::vector<std::pair<Medium, Run>> runs;
    while (const auto medium = part_->First()) {
        // Metadata, audio, video: what does not go on in this order begins another chunk.
        if (!runs.empty() && *medium <= runs.back().first) {
            break;
        }
        Part::Medium& source = part_->media[*medium];
        runs.emplace_back(*medium, std::move(*source.next));
        source.next = source.runs->Next();
    }
    return runs.empty() ? std::nullopt : std::optional(std::move(runs));
}

Chunk TableChunks::ReadChunk(const std::vector<std::pair<Medium, Run>>& runs) {
    const auto chunk = std::make_shared<clipfileModule::ChunkData>();
    for (const auto& [medium, run] : runs) {
        for (const Sample& sample : run.samples) {
            if (!ReadSample(medium, sample, *chunk)) {
                isTorn_ = true;
                return clock_.Cut(chunk, chunk->video.size());
            }
        }
        position_ = std::max(position_, run.End());
    }
    return chunk;
}

bool TableChunks::ReadSample(Medium medium, const Sample& sample, clipfileModule::ChunkData& chunk) {
    if (sample.offset > file_.Size() || sample.size > file_.Size() - sample.offset) {
        return false;
    }
    chunk.size += sample.size;
    if (chunk.size > kMaxChunk) {
        throw FormatError(sample.offset, "A chunk has more bytes than any of a recording.");
    }
    std::vector<unsigned char> bytes = file_.Read(sample.offset, sample.size);
    // A file system may give back zeros for what it had not written yet when the power went.
    if (medium == kVideo && (!IsWholePicture(bytes) || RunsOutInZeros(file_, sample))) {
        return false;
    }
    auto& list = medium == kMeta ? chunk.meta : medium == kAudio ? chunk.audio : chunk.video;
    list.push_back(std::make_shared<nal_access::SampleData>(std::move(bytes), 0, 0, sample.isSync));
    return true;
}

}  // namespace clipfile
