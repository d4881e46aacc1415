#pragma once

// Streams for recordings that a test makes with the module's own muxers.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "buffer/chunk/ChunkData.h"
#include "common/OutputSettings.h"
#include "reader/MetadataUnit.h"
#include "recover/MuxerTarget.h"

namespace test_stream {

using Data = std::vector<unsigned char>;
using Chunks = std::vector<std::shared_ptr<clipfileModule::ChunkData>>;

/// The block of 64 bytes that the recorder adds to each unit, by docs/metadata-format.md.
extern const Data kRecorderBlock;

/// A unit of metadata as it stands in a file: record flag, timecode, the recorder's block.
Data MakeUnit(bool recordFlag, const clipfile::Timecode& timecode);

/// A stream at 29.97 frames a second, drop frame, from 01:02:03;04 on, in chunks of eight pictures.
struct Stream {
    clipfileModule::OutputSettings settings;
    Chunks chunks;
};
inline constexpr clipfile::Timecode kStart = {1, 2, 3, 4, true};
inline constexpr std::uint32_t kRate = 30;

/// Pictures of 20 and more bytes, each one NAL unit with its length, an IDR picture each 16, and audio frames
/// of 6 bytes that no decoder takes. 1920 x 1080 pixels.
Stream MakePlainStream(std::size_t chunks);
/// Moving picture and tone that decoders accept, 320 x 180 pixels.
Stream MakeCodedStream(std::size_t chunks);

/// How a recording is made.
struct Recording {
    const char* type = "normal";  // or "fragment"
    clipfileModule::RecordRules rules = clipfileModule::RecordRules::kExact;
    bool close = true;
};

/// 20 November 2026, 10:20:30.
inline constexpr clipfileModule::LocalTime kOpened = {2026, 11, 20, 10, 20, 30};

/// Records chunks into a new file at `path`, as the module does, and closes it if the plan says so.
void Record(const std::filesystem::path& path, const Recording& plan, const Stream& stream);

Data ReadAll(const std::filesystem::path& path);
void WriteAll(const std::filesystem::path& path, const Data& bytes);

}  // namespace test_stream
