// The tests' own tools, before anything rests on them.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>

#include "support/CodedMedia.h"
#include "support/FreePorts.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/Process.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

TEST(ProcessTest, KeepsExitCodeAndBothOutputsApart) {
    const Outcome outcome = RunProgram({"sh", "-c", "echo said; echo warned >&2; exit 3"});
    EXPECT_EQ(outcome.code, 3);
    EXPECT_EQ(outcome.output, "said\n");
    EXPECT_EQ(outcome.errors, "warned\n");
}

TEST(ProcessTest, TellsTheSignalThatEndedIt) {
    Process process({"sleep", "60"});
    EXPECT_EQ(process.Wait(std::chrono::milliseconds(20)), std::nullopt);
    process.Signal(SIGTERM);
    EXPECT_EQ(process.Wait(), 128 + SIGTERM);
}

TEST(ProcessTest, HangsUpWhenItsTerminalIsClosed) {
    Process process({"sh", "-c", "test -t 1 && echo terminal; sleep 60"}, {},
                    Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(process.WaitForText("terminal"));
    process.CloseTerminal();
    EXPECT_EQ(process.Wait(), 128 + SIGHUP);
}

TEST(ProcessTest, TypesOnATerminal) {
    Process process({"sh", "-c", "read line; echo got $line"}, {}, Process::Terminal::kPseudoTerminal);
    process.Type("key\n");
    EXPECT_TRUE(process.WaitForText("got key"));
}

TEST(FreePortsTest, TwoThatAskGetDifferentOnes) {
    const FreePorts one;
    const FreePorts other;
    EXPECT_EQ(one.First() % 2, 0);
    EXPECT_NE(one.First(), other.First());
}

TEST(KlvTest, PacketsOfAllLengthFormsAreCutApartAgain) {
    Bytes run;
    std::vector<Bytes> packets;
    for (std::size_t i = 0; i < 20; ++i) {
        packets.push_back(MakeKlvPacket(i));
        run.insert(run.end(), packets.back().begin(), packets.back().end());
    }
    EXPECT_EQ(SplitKlv(run), packets);
    EXPECT_EQ(FindRun(packets, {packets[4], packets[5]}), 4U);
    EXPECT_EQ(FindRun(packets, {packets[4], packets[6]}), packets.size());
}

TEST(MaterialTest, HoldsWhatTheTestsCompareWith) {
    const TemporaryFolder folder;
    MaterialOptions options;
    options.seconds = 1;
    options.picturesPerKlv = 2;
    const auto file = MakeMaterial(folder, options);
    const CodedMedia media = ReadCodedMedia(file);
    ASSERT_EQ(media.video.size(), 25U);
    EXPECT_TRUE(media.video[0].idr);
    EXPECT_TRUE(media.video[10].idr);
    EXPECT_FALSE(media.video[9].idr);
    EXPECT_GE(media.audio.size(), 46U);
    ASSERT_EQ(media.data.size(), 13U);
    for (std::size_t i = 0; i < media.data.size(); ++i) {
        EXPECT_EQ(media.data[i], MakeKlvPacket(i));
    }
    const Decoded decoded = DecodeVideo(file);
    EXPECT_EQ(decoded.checksums.size(), 25U);
    EXPECT_EQ(decoded.messages, "");
    EXPECT_EQ(StreamOf(AskFfprobe(file), "video").value("nb_read_packets", ""), "25");
    EXPECT_EQ(AskMediaInfo(file, "Video").value("Format", ""), "AVC");
}

TEST(MaterialTest, IsRepeatedWithoutAGap) {
    const TemporaryFolder folder;
    MaterialOptions options;
    options.seconds = 0.7;
    const auto once = MakeMaterial(folder, options);
    const auto thrice = folder.Path() / "thrice.ts";
    // 0.64 s are 16 pictures and 30 AAC frames.
    RepeatMaterial(once, thrice, 16, 30, 3, 25);
    const CodedMedia media = ReadCodedMedia(thrice);
    ASSERT_EQ(media.video.size(), 48U);
    ASSERT_EQ(media.audio.size(), 90U);
    EXPECT_EQ(media.video[15], media.video[47]);
    EXPECT_EQ(media.audio[0], media.audio[60]);
    const auto answer = AskFfprobe(thrice);
    EXPECT_EQ(StreamOf(answer, "video").value("duration", ""), "1.920000");
    EXPECT_EQ(StreamOf(answer, "audio").value("duration", ""), "1.920000");
}

TEST(MaterialTest, ThePicturesOfTwoContainersAreTheSame) {
    const TemporaryFolder folder;
    MaterialOptions options;
    options.seconds = 0.4;
    const CodedMedia transport = ReadCodedMedia(MakeMaterial(folder, options));
    options.container = "mp4";
    const CodedMedia movie = ReadCodedMedia(MakeMaterial(folder, options));
    ASSERT_EQ(transport.video.size(), 10U);
    EXPECT_EQ(transport.video, movie.video);
}

}  // namespace
}  // namespace endtoend
