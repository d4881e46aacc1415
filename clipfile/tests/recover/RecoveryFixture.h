#pragma once

#include <gtest/gtest.h>

#include <optional>
#include <random>

#include "common/ToolError.h"
#include "recover/Recovery.h"
#include "support/Files.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {

/// A recording that was cut, and what the recorder would have made of the chunks in front of the cut.
class RecoveryFixture : public testing::Test {
 protected:
    using Data = test_stream::Data;

    std::filesystem::path path(const std::string& name) const { return folder_.Path() / name; }
    std::filesystem::path original() const { return path("01_02_03_04.MP4"); }
    std::filesystem::path recovered() const { return path("01_02_03_04.recovered.MP4"); }

    /// The sentence with which recovery fails.
    std::string failure(const RecoveryOptions& options = {}) const {
        try {
            RecoverFile(original(), options);
        } catch (const ToolError& error) {
            return error.what();
        }
        return "";
    }
    /// The chunks of which the first `pictures` pictures are there, the last one cut in step.
    static test_stream::Stream firstPictures(const test_stream::Stream& stream, std::size_t pictures) {
        test_stream::Stream cut;
        cut.settings = stream.settings;
        std::size_t audioFrames = 0;
        for (std::size_t i = 0; i < stream.chunks.size() && 8 * i < pictures; ++i) {
            auto chunk = std::make_shared<clipfileModule::ChunkData>(*stream.chunks[i]);
            if (pictures < 8 * i + 8) {
                chunk->video.resize(pictures - 8 * i);
                chunk->meta.resize(pictures - 8 * i);
                // A frame that begins less than half its length before the end of the pictures is left out.
                const std::size_t end = pictures * 1001 * 48000;
                while (!chunk->audio.empty() &&
                       ((audioFrames + chunk->audio.size() - 1) * 1024 + 512) * 30000 > end) {
                    chunk->audio.pop_back();
                }
            }
            audioFrames += chunk->audio.size();
            cut.chunks.push_back(chunk);
        }
        return cut;
    }
    /// Where each picture ends behind the start of its chunk's samples, and the length of all of them.
    static std::vector<std::size_t> pictureEnds(const clipfileModule::ChunkData& chunk, std::size_t& length) {
        std::size_t at = 0;
        for (const auto* const list : {&chunk.meta, &chunk.audio}) {
            for (const auto& sample : *list) {
                at += sample->GetDataSize();
            }
        }
        std::vector<std::size_t> ends;
        for (const auto& picture : chunk.video) {
            ends.push_back(at += picture->GetDataSize());
        }
        length = at;
        return ends;
    }
    /// Pictures of chunks from `first` to before `last`, whose samples begin at `begin`, that end before
    /// `cut`.
    static std::size_t picturesBefore(const test_stream::Stream& stream, std::size_t first, std::size_t last,
                                      std::size_t begin, std::size_t cut) {
        std::size_t count = 0;
        for (std::size_t i = first; i < std::min(last, stream.chunks.size()); ++i) {
            std::size_t length = 0;
            for (const std::size_t end : pictureEnds(*stream.chunks[i], length)) {
                count += begin + end <= cut ? 1 : 0;
            }
            begin += length;
        }
        return count;
    }
    /// Cuts `whole` there, recovers it, and compares it with what the recorder makes of the pictures before.
    void expectRecovered(const Data& whole, std::size_t cut, const test_stream::Stream& stream,
                         std::size_t pictures, const test_stream::Recording& plan,
                         const RecoveryOptions& options) {
        std::filesystem::remove(recovered());
        test_stream::WriteAll(original(),
                              Data(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(cut)));
        if (pictures == 0) {
            EXPECT_NE(failure(options), "") << "cut at " << cut;
            return;
        }
        RecoveryResult result;
        ASSERT_NO_THROW(result = RecoverFile(original(), options)) << "cut at " << cut;
        EXPECT_EQ(result.pictures, pictures) << "cut at " << cut;
        test_stream::Recording closed = plan;
        closed.close = true;
        test_stream::Record(path("expected.mp4"), closed, firstPictures(stream, pictures));
        EXPECT_TRUE(test_stream::WithoutTimes(recovered()) == test_stream::WithoutTimes(path("expected.mp4")))
            << "cut at " << cut;
    }

    TempDir folder_;
};

}  // namespace clipfile
