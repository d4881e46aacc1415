#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/IncompleteChunks.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kChunkFile;
using stream_buffer_log::kMakeChunk;
using stream_units::kIdr;

using StreamBufferDumpIncomplete = IncompleteChunks;

TEST(StreamBufferDump, AChunkIsDumpedBeforeItIsCounted) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    ASSERT_TRUE(log.WaitForText("ST: [C]\t8\t15\t8\t0"));
    const auto lines = log.Lines();
    const auto video = std::find_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
        return line.text == "---------- video. size = 8.";
    });
    ASSERT_NE(video, lines.end());
    EXPECT_EQ(video->priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(video->function, "clipfileModule::StreamBuffer::dumpChunk");
    EXPECT_EQ(video->file, kChunkFile);
    // Only the chunk thread logs in between, so its lines are taken alone.
    std::vector<std::string> texts;
    for (auto line = video; line != lines.end() && texts.size() < 36; ++line) {
        if (line->thread == video->thread) {
            texts.push_back(line->text);
        }
    }
    ASSERT_EQ(texts.size(), 36u);
    // Index, sync, index times duration, rtp timestamp, timestamp, size, duration. The IDR frame keeps no
    // parameter sets: slice 3 + 13 bytes and a 4-byte length; pictures have the same size.
    EXPECT_THAT(texts[1], ::testing::MatchesRegex("0\t1\t0\t90000\t1000\t[0-9]+\t1000\\."));
    EXPECT_THAT(texts[2], ::testing::MatchesRegex("1\t0\t1000\t93600\t1040\t[0-9]+\t1000\\."));
    EXPECT_THAT(texts[8], ::testing::MatchesRegex("7\t0\t7000\t115200\t1280\t[0-9]+\t1000\\."));
    EXPECT_EQ(texts[9], "---------- audio. size = 15.");
    EXPECT_EQ(texts[10].substr(0, 2), "0\t");
    EXPECT_EQ(texts[24].substr(0, 5), "14\t1\t") << "an audio frame can be decoded on its own";
    EXPECT_NE(texts[24].find("\t14336\t62336\t1298\t"), std::string::npos) << texts[24];
    EXPECT_EQ(texts[25], "---------- meta.  size = 8.");
    EXPECT_EQ(texts[34], "ST: a/v sync 8\t15\t8");
    EXPECT_EQ(texts[35], "ST: [C]\t8\t15\t8\t0");
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: [C]\t8\t15\t8\t0"));
    for (const auto& line : lines) {
        if (line.text == texts[1]) {
            EXPECT_EQ(line.priority, LOG_PRIORITY_DETAIL);
            EXPECT_EQ(line.function, "clipfileModule::StreamBuffer::dump");
        }
    }
}

TEST_F(StreamBufferDumpIncomplete, TheCachesAreDumpedUnitByUnit) {
    pushMeta(2);
    ASSERT_TRUE(harness.WaitForCached(0, 0, 2));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no audio buffer."));
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.text == "---------- meta buffer : size = 2. front = 90000, back = 93600";
        });
    }));
    harness.buffer->Stop();
    const auto lines = log.Lines();
    const auto header = std::find_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
        return line.text == "ST: no audio buffer.";
    });
    std::vector<CapturedLine> own;
    for (auto line = header; line != lines.end(); ++line) {
        if (line->thread == header->thread) {
            own.push_back(*line);
        }
    }
    ASSERT_GE(own.size(), 2u);
    // 16 video units, and more when a pass had to be asked for again.
    std::size_t count = 16;
    while (count < 40 && own[1].text != "ST: [B]\t" + std::to_string(count) + "\t0\t2") {
        ++count;
    }
    ASSERT_LT(count, 40u) << own[1].text;
    ASSERT_GE(own.size(), 2u + 1 + count + 1 + 1 + 2);
    EXPECT_EQ(own[1].priority, LOG_PRIORITY_TRACE);
    EXPECT_FALSE(own[1].function.has_value());
    const std::uint64_t back = harness.clock.VideoRtp(count == 16 ? 15 : 1000 + count - 17);
    EXPECT_EQ(own[2].text, "---------- video buffer : size = " + std::to_string(count) +
                               ". front = 90000, back = " + std::to_string(back));
    EXPECT_EQ(own[2].priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(own[2].function, "clipfileModule::StreamBuffer::dumpBuffer");
    const std::string size = std::to_string(stream_units::VideoPayload(0, kIdr).size());
    EXPECT_EQ(own[3].text, "rtp_timestamp = 90000, timestamp = 1000, size = " + size + ".");
    EXPECT_EQ(own[3].priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(own[3].function, "clipfileModule::StreamBuffer::dumpBuffer");
    EXPECT_EQ(own[3 + count].text, "---------- audio buffer : size = 0. front = 0, back = 0");
    EXPECT_EQ(own[4 + count].text, "---------- meta buffer : size = 2. front = 90000, back = 93600");
    const std::string metaSize = std::to_string(stream_units::MetaPayload(0, {}).size());
    EXPECT_EQ(own[5 + count].text, "rtp_timestamp = 90000, timestamp = 1000, size = " + metaSize + ".");
    EXPECT_EQ(own[6 + count].text, "rtp_timestamp = 93600, timestamp = 1040, size = " + metaSize + ".");
}

TEST(StreamBufferDump, TheChunkThreadLogsNoLineOfItsOwnAtStartAndEnd) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    harness.buffer->Stop();
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) { return line.function == kMakeChunk; }), 0u);
}

}  // namespace
}  // namespace clipfileModule
