#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "reader/Table.h"

namespace clipfile {

/// A sample of a track, as the tables describe it. Nothing says that its bytes are in the file.
struct Sample {
    std::uint64_t offset = 0;
    std::uint32_t size = 0;
    /// Decode time in ticks of the track, from the first sample of the same source on.
    std::uint64_t time = 0;
    std::uint32_t duration = 0;
    bool isSync = false;
    /// The chunk of `moov`, or the run of the fragment, that holds it, from 0.
    std::uint64_t run = 0;
};

/// The samples of a track, one after the other.
class SampleSource {
 public:
    virtual ~SampleSource() = default;
    /// The next sample, or nothing at the end. Throws `FormatError` where the tables contradict each other.
    virtual std::optional<Sample> Next() = 0;
};

/// The tables of a track in `moov` (ISO/IEC 14496-12 8.6, 8.7).
struct SampleTables {
    Table times;                    // stts
    Table sizes;                    // stsz, no rows where all samples have `constantSize`
    Table chunks;                   // stsc
    Table chunkOffsets;             // stco or co64
    Table syncSamples;              // stss
    bool hasSyncSamples = false;    // without it all are sync samples
    bool hasComposition = false;    // ctts, with an offset that is not 0
    std::uint32_t firstOffset = 0;  // how much later than decoded the first sample is shown
    std::uint32_t constantSize = 0;
    std::uint64_t sampleCount = 0;
};

/// Reads the tables from the children of `stbl`. Throws `FormatError` for one that is missing or longer than
/// its box.
SampleTables ReadSampleTables(const InputFile& file, const Box& stbl);

/// Goes through the samples of `moov`. The tables are read some kilobytes at a time.
class TableSamples : public SampleSource {
 public:
    TableSamples(const InputFile& file, const SampleTables& tables);
    std::optional<Sample> Next() override;

 private:
    void EnterChunk();
    std::uint32_t NextDuration();
    bool IsSync(std::uint64_t number);

    std::uint64_t sampleCount_;
    std::uint32_t constantSize_;
    bool allSync_;
    bool wideOffsets_;
    TableReader times_;
    TableReader sizes_;
    TableReader chunks_;
    TableReader chunkOffsets_;
    TableReader syncSamples_;

    std::uint64_t sample_ = 0;  // number of the next, from 0
    std::uint64_t chunk_ = 0;   // number of the one after the current, from 0
    std::uint64_t chunkRow_ = 0;
    std::uint64_t leftInChunk_ = 0;
    std::uint64_t offset_ = 0;
    std::uint64_t timesRow_ = 0;
    std::uint64_t leftInTimes_ = 0;
    std::uint32_t duration_ = 0;
    std::uint64_t time_ = 0;
    std::uint64_t syncRow_ = 0;
};

/// Samples of one track that lie side by side.
struct Run {
    std::uint64_t offset = 0;
    std::vector<Sample> samples;

    std::uint64_t End() const { return samples.back().offset + samples.back().size; }
};

/// Groups the samples of a source by the chunk or run that holds them.
class RunReader {
 public:
    /// Samples of a run, above which a file is none of ours: a chunk of eight pictures has 17 audio frames.
    static constexpr std::size_t kMaxSamples = 4096;

    explicit RunReader(SampleSource& source) : source_(source), next_(source.Next()) {}

    /// The next run, or nothing at the end. Throws `FormatError` for one of too many samples.
    std::optional<Run> Next();

 private:
    SampleSource& source_;
    std::optional<Sample> next_;
};

}  // namespace clipfile
