#pragma once

// What tests feed to muxers: settings, chunks of made-up samples, and a clock that stands still.

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "buffer/chunk/ChunkData.h"
#include "common/OutputSettings.h"
#include "support/FakePlatform.h"
#include "support/TempDir.h"

namespace muxer_stream {

using Bytes = std::vector<unsigned char>;

/// High profile, level 4.0; the bytes behind it mean nothing here.
inline const Bytes kSps = {0x67, 0x64, 0x00, 0x28, 0xAC};
inline const Bytes kPps = {0x68, 0xEE, 0x3C};

inline nal_access::NalUnit MakeNal(const Bytes& bytes) {
    nal_access::NalUnit nal;
    nal.size = bytes.size();
    nal.data = std::shared_ptr<unsigned char>(new unsigned char[bytes.size()],
                                              std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), nal.data.get());
    return nal;
}

/// A stream of 1920 x 1080 pixels whose files go to `directory` itself.
inline clipfileModule::OutputSettings MakeSettings(const TempDir& directory, std::uint32_t framerate) {
    clipfileModule::OutputSettings settings;
    settings.outputPath = directory.ModulePath();
    settings.framerate = framerate;
    settings.width = 1920;
    settings.height = 1080;
    settings.bitrate = 50000000;
    settings.sps = MakeNal(kSps);
    settings.pps = MakeNal(kPps);
    return settings;
}

/// `size` bytes that differ from sample to sample.
inline std::shared_ptr<nal_access::SampleData> MakeSample(std::size_t size, unsigned char first,
                                                          bool sync = true) {
    Bytes bytes(size);
    for (std::size_t i = 0; i < size; ++i) {
        bytes[i] = static_cast<unsigned char>(first + 17 * i);
    }
    return std::make_shared<nal_access::SampleData>(bytes, 90000 + first, 1000 + first, sync);
}

/// Sizes of a chunk's samples, and the place of its one sync picture among its pictures (-1: none).
struct ChunkShape {
    std::vector<std::size_t> meta;
    std::vector<std::size_t> audio;
    std::vector<std::size_t> video;
    int sync = 0;
};

inline std::shared_ptr<clipfileModule::ChunkData> MakeChunk(const ChunkShape& shape,
                                                            unsigned char number = 0) {
    auto chunk = std::make_shared<clipfileModule::ChunkData>();
    auto next = static_cast<unsigned char>(number * 31);
    for (const std::size_t size : shape.meta) {
        chunk->meta.push_back(MakeSample(size, next++));
    }
    for (const std::size_t size : shape.audio) {
        chunk->audio.push_back(MakeSample(size, next++));
    }
    for (std::size_t i = 0; i < shape.video.size(); ++i) {
        chunk->video.push_back(MakeSample(shape.video[i], next++, static_cast<int>(i) == shape.sync));
    }
    return chunk;
}

/// One second's eighth, more or less: eight pictures, the first a sync picture.
inline const ChunkShape kPlainChunk = {{5, 5, 5, 5, 5, 5, 5, 5}, {6, 6}, {12, 9, 9, 9, 9, 9, 9, 9}, 0};

/// The bytes of a chunk as files hold them.
inline Bytes BytesOf(const clipfileModule::ChunkData& chunk) {
    Bytes bytes;
    for (const auto* list : {&chunk.meta, &chunk.audio, &chunk.video}) {
        for (const auto& sample : *list) {
            bytes.insert(bytes.end(), sample->GetData(), sample->GetData() + sample->GetDataSize());
        }
    }
    return bytes;
}

inline Bytes ReadFile(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    EXPECT_TRUE(in) << path;
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

/// 20 November 2026, 10:20:30 by the clocks on the wall, half a second in; two hours behind UTC.
inline void StopTheClock(FakePlatform& platform) {
    platform.Set([](FakePlatform::Hooks& hooks) {
        hooks.now = [] {
            return std::chrono::system_clock::time_point(std::chrono::seconds(1795177230)) +
                   std::chrono::milliseconds(500);
        };
        hooks.toLocalTime = [](std::chrono::system_clock::time_point time) {
            EXPECT_EQ(time, std::chrono::system_clock::time_point(std::chrono::seconds(1795177230)));
            return clipfileModule::LocalTime{2026, 11, 20, 10, 20, 30};
        };
    });
}

/// That moment in seconds since 1904, read as UTC: 44884 days (122 years of 365, the leap days of
/// 1904 to 2024, which are 31, and 323 days of 2026), 10 hours, 20 minutes, 30 seconds.
inline constexpr std::uint32_t kStoppedMp4Time = 3878014830;

}  // namespace muxer_stream
