#pragma once

#include <optional>
#include <vector>

#include "reader/Fragment.h"
#include "reader/Recording.h"
#include "recover/ChunkSource.h"

namespace clipfile {

/// The chunks of a file that has a `moov`, by its tables and those of its fragments. It ends at the first
/// sample that is not whole, and where the tables contradict themselves.
class TableChunks : public ChunkSource {
 public:
    /// `file` and `recording`, which has a movie, must outlive it.
    TableChunks(const InputFile& file, const Recording& recording, const SampleClock& clock);
    ~TableChunks() override;

    Chunk Next() override;
    std::uint64_t Position() const override { return position_; }

 private:
    /// The medium of a track, in the order in which media stand in a chunk.
    enum Medium : std::size_t { kMeta, kAudio, kVideo, kMediumCount };
    struct Part;

    Chunk Take();
    static std::optional<Medium> MediumOf(const Track& track);
    void EnterMovie();
    bool EnterFragment();
    /// Takes the next runs in the order of the file that make a chunk. Nothing at the end of the part.
    std::optional<std::vector<std::pair<Medium, Run>>> TakeRuns();
    /// Reads the samples of runs. `isTorn_` is set where one is not whole, and the chunk then cut.
    Chunk ReadChunk(const std::vector<std::pair<Medium, Run>>& runs);
    bool ReadSample(Medium medium, const Sample& sample, clipfileModule::ChunkData& chunk);

    const InputFile& file_;
    const Recording& recording_;
    SampleClock clock_;
    FragmentCursor cursor_;
    std::unique_ptr<Part> part_;
    bool isTorn_ = false;
    std::uint64_t position_;
};

}  // namespace clipfile
