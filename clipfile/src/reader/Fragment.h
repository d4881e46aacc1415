#pragma once

#include <cstdint>
#include <vector>

#include "reader/Movie.h"

namespace clipfile {

/// A run of samples of a fragment (8.8.8).
struct TrackRun {
    std::uint64_t offset = 0;
    /// False where the run says nothing of its place, and follows on the one before.
    bool hasOffset = false;
    std::uint32_t flags = 0;
    std::uint32_t firstSampleFlags = 0;
    /// Rows of the fields that `flags` names; none where every sample has the defaults.
    Table rows;
    std::uint64_t sampleCount = 0;
};

/// What a fragment tells of a track (8.8.6).
struct TrackFragment {
    /// Place in `Movie::tracks`.
    std::size_t track = 0;
    std::uint64_t baseOffset = 0;
    SampleDefaults defaults;
    std::vector<TrackRun> runs;
};

/// A `moof`.
struct Fragment {
    Box box;
    std::uint32_t sequenceNumber = 0;
    std::vector<TrackFragment> tracks;
};

/// Reads a whole `moof`. Throws `FormatError` where it contradicts itself or names a track that `movie`
/// lacks.
Fragment ReadFragment(const InputFile& file, const Box& moof, const Movie& movie);

/// Goes through the samples of a track in a fragment. Times begin at 0.
class FragmentSamples : public SampleSource {
 public:
    /// `fragment` must outlive it.
    FragmentSamples(const InputFile& file, const TrackFragment& fragment);
    std::optional<Sample> Next() override;

 private:
    const TrackFragment& fragment_;
    std::size_t run_ = 0;
    std::uint64_t sample_ = 0;  // in the run
    std::uint64_t offset_;
    std::uint64_t time_ = 0;
    TableReader rows_;
};

}  // namespace clipfile
