#include "inspect/Inspection.h"

#include <gtest/gtest.h>

#include <sstream>

#include "common/ToolError.h"
#include "inspect/JsonReport.h"
#include "inspect/TextReport.h"
#include "reader/BigEndian.h"
#include "support/BoxFinder.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using test_stream::MakePlainStream;
using test_stream::ReadAll;
using test_stream::Record;
using test_stream::WriteAll;

class InspectionTest : public testing::TestWithParam<const char*> {
 protected:
    void record(const char* type, bool close, std::size_t chunks = 40) {
        Record(path(), {type, clipfileModule::RecordRules::kExact, close}, MakePlainStream(chunks));
    }
    Inspection inspect() const { return Inspect(InputFile(path())); }
    void cut(std::size_t size) const {
        auto bytes = ReadAll(path());
        bytes.resize(size);
        WriteAll(path(), bytes);
    }
    std::filesystem::path path() const { return folder_.Path() / "01_02_03_04.MP4"; }

    TempDir folder_;
};

INSTANTIATE_TEST_SUITE_P(Kinds, InspectionTest, testing::Values("normal", "fragment"),
                         [](const auto& instance) { return std::string(instance.param); });

TEST_P(InspectionTest, AClosedFileIsCounted) {
    record(GetParam(), true);
    const Inspection inspection = inspect();
    EXPECT_EQ(inspection.recording.completion, Completion::kClosed);
    EXPECT_EQ(inspection.recording.reason, "");
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    ASSERT_NE(video, nullptr);
    EXPECT_EQ(video->samples, 320U);
    EXPECT_EQ(video->chunks, 40U);
    EXPECT_EQ(video->syncSamples, 20U);
    EXPECT_EQ(video->longestGroup, 16U);
    EXPECT_EQ(video->duration, 320U * 1001);
    // 320 x 1001 / 30000 s are 500.5 frames of 1024 samples at 48 kHz.
    EXPECT_EQ(inspection.Find(FourCc("soun"))->samples, 501U);
    EXPECT_EQ(inspection.Find(FourCc("meta"))->samples, 320U);
    EXPECT_EQ(inspection.start, test_stream::kStart);
    // 01:02:03;04 and 319 frames: 10 seconds and 19 frames.
    EXPECT_EQ(inspection.end, (Timecode{1, 2, 13, 23, true}));
    EXPECT_EQ(inspection.lastUnit->timecode, inspection.end);
    EXPECT_EQ(inspection.metadataDistance, 0);
    EXPECT_EQ(inspection.recording.profile.video->width, 1920);
    EXPECT_EQ(inspection.recording.profile.video->codecInformation, 0x01640028U);
    EXPECT_EQ(inspection.recording.profile.audio->samplingRate, 48000U);
}

TEST_F(InspectionTest, AnUnfinishedNormalFileHasAProfileAndItsFirstUnit) {
    record("normal", false);
    const Inspection inspection = inspect();
    EXPECT_EQ(inspection.recording.completion, Completion::kUnfinished);
    EXPECT_EQ(inspection.recording.reason, "The length of its samples and 'moov' were never written.");
    EXPECT_TRUE(inspection.tracks.empty());
    EXPECT_EQ(inspection.recording.dataBegin, 192U);
    EXPECT_EQ(inspection.start, test_stream::kStart);
}

TEST_F(InspectionTest, ANormalFileCutInsideOfItsTablesIsUnfinished) {
    record("normal", true);
    cut(ReadAll(path()).size() - 100);
    EXPECT_EQ(inspect().recording.reason, "It has no whole 'moov'.");
}

TEST_F(InspectionTest, AnUnfinishedFragmentedFileIsCountedUpToItsEnd) {
    record("fragment", false, 70);
    const Inspection inspection = inspect();
    EXPECT_EQ(inspection.recording.reason, "It has no whole 'mfra'.");
    EXPECT_EQ(inspection.recording.fragmentCount, 1U);
    EXPECT_EQ(inspection.Find(FourCc("vide"))->samples, 512U);
}

TEST_F(InspectionTest, SamplesOfATornFragmentAreNotCounted) {
    record("fragment", false, 64);
    const auto mdat = box_finder::Find(ReadAll(path()), "mdat:2");
    cut(mdat.offset + mdat.size / 2);
    const Inspection inspection = inspect();
    EXPECT_EQ(inspection.recording.reason, "It ends inside of the samples of fragment 1.");
    EXPECT_GT(inspection.Find(FourCc("vide"))->samples, 256U);
    EXPECT_LT(inspection.Find(FourCc("vide"))->samples, 512U);
}

TEST_F(InspectionTest, ATornIndexOfAFragmentIsTold) {
    record("fragment", false, 64);
    const auto moof = box_finder::Find(ReadAll(path()), "moof");
    cut(moof.offset + moof.size / 2);
    const Inspection inspection = inspect();
    EXPECT_EQ(inspection.recording.reason, "It ends inside of the index of fragment 1.");
    EXPECT_EQ(inspection.Find(FourCc("vide"))->samples, 256U);
}

TEST_F(InspectionTest, AFragmentedFileWithoutItsFirstFragmentHoldsNothing) {
    record("fragment", false, 31);
    EXPECT_EQ(inspect().recording.reason, "It ends before its first fragment was written.");
}

TEST_P(InspectionTest, EveryCutIsBorne) {
    record(GetParam(), true, 33);
    const auto bytes = ReadAll(path());
    for (std::size_t size = bytes.size() - 1; size > 0; size = size * 14 / 15) {
        cut(size);
        try {
            const Inspection inspection = inspect();
            EXPECT_EQ(inspection.recording.completion, Completion::kUnfinished) << size;
        } catch (const ToolError& error) {
            EXPECT_LT(size, 192U) << error.what();
        }
    }
}

TEST_F(InspectionTest, TheTextNamesTracksTimecodesAndProfile) {
    record("normal", true, 2);
    std::ostringstream out;
    PrintText(out, inspect());
    EXPECT_EQ(out.str(), path().string() +
                             ": normal, closed, 5.1 kB, 00:00:00.534, 01:02:03;04 to 01:02:03;19\n"
                             "  video     avc1, 1920x1080, High level 4.0, 29.97 frames/s, 16 pictures in 2 "
                             "chunks, 1 of them IDR, "
                             "at most 16 apart, 8 kbit/s\n"
                             "  audio     mp4a, 48000 Hz, 2 channels, 25 frames, 2 kbit/s\n"
                             "  timecode  tmcd, 30 frames a second, drop frame\n"
                             "  metadata  rtmd, 16 units, 28 kbit/s\n"
                             "  start     audio +0.0 ms, metadata +0 frames from the first picture\n"
                             "  first     record on, 01:02:03;04, 2 packets\n"
                             "  last      record on, 01:02:03;19, 2 packets\n"
                             "  profile   20000000, avc1 1920x1080, 29.97 frames/s, bit rate 50000, High "
                             "level 4.0, mp4a 48000 Hz 2 "
                             "channels 125 kbit/s\n");
}

TEST_F(InspectionTest, TheJsonHoldsTheSame) {
    record("fragment", true, 33);
    const auto json = ToJson(inspect());
    EXPECT_EQ(json.at("kind"), "fragmented");
    EXPECT_EQ(json.at("closed"), true);
    EXPECT_EQ(json.at("fragments"), 1);
    EXPECT_EQ(json.at("start"), "01:02:03;04");
    EXPECT_EQ(json.at("tracks").at(0).at("samples"), 264);
    EXPECT_EQ(json.at("tracks").at(2).at("drop_frame"), true);
    EXPECT_EQ(json.at("first_unit").at("record_flag"), true);
    EXPECT_EQ(json.at("profile").at("video").at("width"), 1920);
}

}  // namespace
}  // namespace clipfile
