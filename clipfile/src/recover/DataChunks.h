#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <vector>

#include "media/Decoders.h"
#include "reader/InputFile.h"
#include "reader/MetadataUnit.h"
#include "recover/ChunkSource.h"

namespace clipfile {

/// The chunks of a normal file without tables, found from its samples alone. A chunk is units of metadata,
/// known by their key and the recorder's block at their end; audio frames, which are decoded to find where
/// they end; and pictures, which are NAL units behind their lengths, up to the next chunk's key.
class DataChunks : public ChunkSource {
 public:
    /// `file` must outlive it. The samples lie from `begin` to `end`.
    DataChunks(const InputFile& file, std::uint64_t begin, std::uint64_t end, const SampleClock& clock);

    Chunk Next() override;
    std::uint64_t Position() const override { return position_; }

 private:
    struct Extent {
        std::uint64_t offset = 0;
        std::uint64_t size = 0;
        bool isSync = true;
    };
    struct Pictures {
        std::vector<Extent> whole;
        /// The last one is not whole, or it cannot be told.
        bool isTorn = false;
    };

    /// At most `size` bytes from `offset` on, less at the end. Valid until the next call.
    Bytes At(std::uint64_t offset, std::size_t size);
    /// Whether a unit of metadata begins here.
    bool IsKeyAt(std::uint64_t offset);
    std::vector<Extent> FindMetadata(std::uint64_t& offset);
    /// End of the unit that begins at `offset`, or nothing when it is not whole.
    std::optional<std::uint64_t> FindUnitEnd(std::uint64_t offset);
    /// The packet that begins at `offset`, valid until the next call of `At`.
    std::optional<KlvPacket> PacketAt(std::uint64_t offset);
    std::optional<std::uint64_t> FindBlockEnd(std::uint64_t offset);
    /// Takes audio frames until pictures begin. Nothing when none do.
    std::optional<Pictures> FindAudioAndPictures(std::uint64_t& offset, std::size_t units,
                                                 std::vector<Extent>& audio);
    /// Size of the audio frame at `offset`, or 0 when none decodes there.
    std::size_t AudioFrameAt(std::uint64_t offset);
    /// The pictures that begin at `offset`, for so many units of metadata; nothing when none do.
    std::optional<Pictures> FindPictures(std::uint64_t offset, std::size_t units);
    /// Makes pictures of fields where each picture has two.
    void PairFields(Pictures& pictures, std::size_t units);
    Chunk MakeChunk(const std::vector<Extent>& meta, const std::vector<Extent>& audio,
                    const Pictures& pictures);

    const InputFile& file_;
    std::uint64_t end_;
    SampleClock clock_;
    std::uint64_t position_;
    bool isTorn_ = false;

    std::vector<unsigned char> window_;
    std::uint64_t windowOffset_ = 0;
    AudioFrameFinder audioFrames_;
    /// Sizes of the frames from `knownOffset_` on that were found ahead.
    std::deque<std::size_t> known_;
    std::uint64_t knownOffset_ = 0;
    std::size_t fieldsInPicture_ = 1;
    std::size_t slicesInPicture_ = 0;
};

}  // namespace clipfile
