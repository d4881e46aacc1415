#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>

#include "common/OutputSettings.h"
#include "media/ParameterSets.h"
#include "mp4/Mp4Muxer.h"
#include "reader/MetadataUnit.h"
#include "reader/Recording.h"
#include "recover/ChunkSource.h"
#include "recover/MuxerTarget.h"

namespace clipfile {

/// What a recording was made from, besides its chunks.
struct RecordingSetup {
    clipfileModule::OutputSettings settings;
    FileKind kind = FileKind::kNormal;
    /// Of the first picture; zeros where the stream had none.
    Timecode timecode;
    /// When the recorder opened it.
    clipfileModule::LocalTime opened;
    /// Ticks of the video track in a second and in a picture.
    std::uint32_t timescale = 0;
    std::uint32_t pictureDuration = 0;
};

/// Works out from a file's profile, its `moov` where it has one, and its name, how it was recorded.
/// `firstUnit` is the metadata of its first picture. Throws `ToolError` for a frame rate that no recorder
/// has.
RecordingSetup ReadSetup(const InputFile& file, const Recording& recording, const MetadataUnit& firstUnit);

/// Writes a new file as the recorder does, through its own muxers.
class RecordingWriter {
 public:
    /// Throws `ToolError` when `path` cannot be created.
    RecordingWriter(const std::filesystem::path& path, const RecordingSetup& setup,
                    const ParameterSets& sets);
    ~RecordingWriter();

    /// Throw `ToolError` when the file cannot be written.
    void Write(const Chunk& chunk);
    void Close();

 private:
    void Check(bool succeeded) const;

    std::filesystem::path path_;
    RecordingSetup setup_;
    MuxerTarget target_;
    std::shared_ptr<clipfileModule::Mp4Muxer> muxer_;
};

}  // namespace clipfile
