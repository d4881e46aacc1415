#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "support/BoxFinder.h"
#include "support/FakePlatform.h"
#include "support/FaultyFiles.h"
#include "support/GoldenFile.h"
#include "support/MuxerStream.h"
#include "support/TempDir.h"

namespace clipfileModule {

/// A muxer of the given kind at 25 frames a second, with a clock that stands still and files that can fail.
template <typename Muxer>
class MuxerFixture : public ::testing::Test {
 protected:
    using Bytes = muxer_stream::Bytes;

    MuxerFixture() { muxer_stream::StopTheClock(platform); }

    void initialize() { ASSERT_TRUE(muxer.Initialize()); }
    /// Opens "01_02_03_04.MP4".
    void open(std::uint32_t framerate = 25000, bool dropFrame = true) {
        initialize();
        ASSERT_TRUE(
            muxer.Open(muxer_stream::MakeSettings(directory, framerate), golden::kTimecode, dropFrame));
    }
    void write(const muxer_stream::ChunkShape& shape = muxer_stream::kPlainChunk, int count = 1) {
        for (int i = 0; i < count; ++i) {
            ASSERT_TRUE(muxer.Write(muxer_stream::MakeChunk(shape, static_cast<unsigned char>(i))));
        }
    }
    void close() {
        ASSERT_TRUE(muxer.WriteTmcd(golden::kTimecode));
        ASSERT_TRUE(muxer.Close());
    }
    std::filesystem::path path() const { return directory.Path() / "01_02_03_04.MP4"; }
    Bytes file() const { return muxer_stream::ReadFile(path()); }
    std::size_t fileCount() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(directory.Path()), {}));
    }
    /// Names of the routines in the order in which they began.
    std::vector<std::string> routines() const {
        std::vector<std::string> names;
        for (const CapturedLine& line : log.Lines()) {
            if (line.text == "start.") {
                EXPECT_EQ(line.priority, LOG_PRIORITY_DETAIL);
                names.push_back(line.function->substr(line.function->rfind(':') + 1));
            }
        }
        return names;
    }
    /// The numbers at the ends of the error lines, first to last.
    std::vector<long> errorResults() const {
        std::vector<long> results;
        for (const CapturedLine& line : log.Lines()) {
            if (line.priority == LOG_PRIORITY_ERROR && line.text.starts_with("error. error_line = ")) {
                results.push_back(std::stol(line.text.substr(line.text.find("result = ") + 9)));
            }
        }
        return results;
    }

    LogCapture log;
    FakePlatform platform;
    FaultyFiles faults;
    TempDir directory;
    Muxer muxer;
};

}  // namespace clipfileModule
