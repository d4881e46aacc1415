#pragma once

// A file that a muxer has made of a coded stream, for programs that judge it.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>

#include "mp4/Mp4MuxerFactory.h"
#include "support/CodedMedia.h"
#include "support/FakePlatform.h"
#include "support/MuxerStream.h"

struct RecordingPlan {
    const char* type;  // "normal" or "fragment"
    clipfileModule::RecordRules rules;
    std::uint32_t key;  // frames per 1000 seconds
    std::uint32_t timescale;
    std::uint32_t duration;  // ticks of a frame
    bool dropFrame;
    std::size_t chunks;                 // of 8 pictures
    std::size_t silentChunks = 0;       // at the start, without audio
    std::size_t chunksWithoutMeta = 0;  // at the start
};

/// Moving picture and tone, with a unit of 64 bytes of metadata a picture, from 01:02:03:04 on. The clock
/// stands still.
class CodedRecording {
 public:
    static constexpr unsigned char kTimecode[4] = {1, 2, 3, 4};

    /// Opens the file and writes all chunks. The file is not closed.
    void Record(const RecordingPlan& plan) {
        plan_ = plan;
        muxer_stream::StopTheClock(platform_);
        media_ =
            MakeCodedMedia(work_, plan.timescale, plan.duration, plan.chunks * 8, AudioBefore(plan.chunks));
        clipfileModule::OutputSettings settings = muxer_stream::MakeSettings(directory_, plan.key);
        settings.recordRules = plan.rules;
        settings.width = kCodedWidth;
        settings.height = kCodedHeight;
        settings.sps = media_.sps;
        settings.pps = media_.pps;
        ASSERT_TRUE(clipfileModule::Mp4MuxerFactory().Create(plan.type, muxer_));
        ASSERT_TRUE(muxer_->Initialize());
        ASSERT_TRUE(muxer_->Open(settings, kTimecode, plan.dropFrame));
        for (std::size_t i = 0; i < plan.chunks; ++i) {
            ASSERT_TRUE(muxer_->Write(chunk(i)));
        }
    }
    /// Writes the timecode and closes the file.
    void Close() {
        ASSERT_TRUE(muxer_->WriteTmcd(kTimecode));
        ASSERT_TRUE(muxer_->Close());
    }
    /// Audio frames that begin before a chunk, those of chunks recorded without audio included.
    std::size_t AudioBefore(std::size_t chunk) const {
        const std::uint64_t perFrame = plan_.timescale * 1024ULL;
        return (chunk * 8 * plan_.duration * 48000 + perFrame - 1) / perFrame;
    }
    std::filesystem::path Path() const { return directory_.Path() / "01_02_03_04.MP4"; }
    const CodedMedia& Media() const { return media_; }
    /// A directory of its own for what judges leave behind.
    const TempDir& Work() const { return work_; }

 private:
    std::shared_ptr<clipfileModule::ChunkData> chunk(std::size_t number) const {
        const auto made = std::make_shared<clipfileModule::ChunkData>();
        const auto at = [](const auto& list, std::size_t n) {
            return list.begin() + static_cast<std::ptrdiff_t>(n);
        };
        made->video.assign(at(media_.video, 8 * number), at(media_.video, 8 * number + 8));
        if (number >= plan_.silentChunks) {
            made->audio.assign(at(media_.audio, AudioBefore(number)),
                               at(media_.audio, AudioBefore(number + 1)));
        }
        for (std::size_t n = 0; number >= plan_.chunksWithoutMeta && n < 8; ++n) {
            made->meta.push_back(muxer_stream::MakeSample(64, static_cast<unsigned char>(8 * number + n)));
        }
        return made;
    }

    FakePlatform platform_;
    TempDir directory_;
    TempDir work_;
    RecordingPlan plan_ = {};
    CodedMedia media_;
    std::shared_ptr<clipfileModule::Mp4Muxer> muxer_;
};
