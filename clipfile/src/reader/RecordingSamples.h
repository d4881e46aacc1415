#pragma once

#include <memory>
#include <optional>

#include "reader/Fragment.h"
#include "reader/Recording.h"

namespace clipfile {

/// All samples of a track, those of `moov` and then those of each whole fragment. Times and runs count on.
class RecordingSamples : public SampleSource {
 public:
    /// `track` is a place in the movie's tracks. `file` and `recording`, which has a movie, must outlive it.
    RecordingSamples(const InputFile& file, const Recording& recording, std::size_t track);

    /// Throws `FormatError` where the tables or a fragment contradict themselves.
    std::optional<Sample> Next() override;

 private:
    /// Goes over to the next fragment that has samples of the track. False behind the last.
    bool EnterFragment();

    const InputFile& file_;
    const Recording& recording_;
    std::size_t track_;
    FragmentCursor cursor_;
    Fragment fragment_;
    std::unique_ptr<SampleSource> source_;
    std::uint64_t time_ = 0;      // of the source's first sample
    std::uint64_t run_ = 0;       // the source's first
    std::uint64_t nextTime_ = 0;  // behind the last sample that was given
    std::uint64_t nextRun_ = 0;
};

}  // namespace clipfile
