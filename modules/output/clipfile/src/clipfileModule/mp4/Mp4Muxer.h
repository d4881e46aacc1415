#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <string>

#include "boxlib/mbx_types.h"
#include "buffer/chunk/ChunkData.h"
#include "common/OutputSettings.h"
#include "mp4/InputStreamInfo.h"

namespace clipfileModule {

/// Writes one file: a muxer is made for it, and released with it.
///
/// Life: `Initialize`, `Open`, `Write` for each chunk, `WriteTmcd`, `Close`, `Uninitialize`. A muxer belongs
/// to one thread at a time. Failures are logged where they are found, and nothing is retried: a file that
/// failed stays on disk as far as it was written, and can still be closed.
class Mp4Muxer {
 public:
    static constexpr std::uint64_t kUnmeasured = std::numeric_limits<std::uint64_t>::max();

    /// Makes what a file needs in memory. False without memory.
    virtual bool Initialize() = 0;
    /// Releases it. Always true.
    virtual bool Uninitialize() = 0;
    /// Creates a file in the directory `stream.outputPath`, which exists, under a name made from the four
    /// bytes of `timecode` (hours, minutes, seconds, frames), or of the local time when it is null.
    /// `dropFrame` counts where the frame rate permits drop frame. False when no free name can be told, when
    /// the file cannot be created or written, or for a stream whose parameters make no file; no file is open
    /// then.
    virtual bool Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) = 0;
    /// Adds the samples of a chunk. False without an open file, and when a sample cannot be entered or
    /// written: the file's tables and bytes may then differ by that chunk.
    virtual bool Write(const std::shared_ptr<ChunkData>& chunk) = 0;
    /// Adds the one timecode sample, which spans all video written so far, from four bytes as in `Open`.
    /// False without an open file, and when the sample cannot be entered or written.
    virtual bool WriteTmcd(const unsigned char* timecode) = 0;
    /// Bytes of the file with the samples that it will get next.
    virtual std::uint64_t GetWrittenSize() = 0;
    /// Bytes that closing the file will still add. `kUnmeasured` when that cannot be told; with kept rules a
    /// normal file says 0 then.
    virtual std::uint64_t GetBoxSize() = 0;
    /// Video written so far, in ticks of the video's time scale.
    virtual std::uint64_t GetDuration() = 0;
    /// `minutes` in ticks of the video's time scale.
    virtual std::uint64_t MinutesToDuration(std::uint64_t minutes) = 0;
    /// Completes the file and closes it. False without an open file, and when anything could not be written;
    /// the file is closed in any case.
    virtual bool Close() = 0;
    virtual bool IsOpen() = 0;
    /// Keeps a record beside the file.
    virtual void AddFileRecord(std::uint64_t value, const std::string& first, const std::string& second) = 0;

    virtual ~Mp4Muxer() = default;

 protected:
    /// The forms of boxes that this kind of file takes.
    virtual void FillSessionConfig(MbxSessionConfig& config) = 0;
    /// Makes the profile with the word that tells the kind of file.
    virtual MbxStatus createFprf() = 0;
    /// Not 0 when the first sample of each chunk gets a row in the fragment index.
    virtual std::uint32_t IsFragmentOpen() = 0;
    /// Enters the samples of a chunk in the tables of their tracks.
    virtual MbxStatus writeSampleInfo(const InputStreamInfo& info, const ChunkData& chunk) = 0;
    /// Back to the state after construction.
    virtual void Reset() = 0;
};

}  // namespace clipfileModule
