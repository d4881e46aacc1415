// What happens to a receiver in weeks of service.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>

#include <csignal>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::SizeIs;

const std::vector<std::string> kSmall = {"--size", "320x180", "--bitrate", "300", "--gop", "5"};

std::vector<std::string> Small(std::vector<std::string> options) {
    options.insert(options.end(), kSmall.begin(), kSmall.end());
    return options;
}

using FaultsTest = ReceiverFixture;

TEST_F(FaultsTest, AFullDiskEndsTheRunWithTheFileClosed) {
    // In a mount name space of this thread and of the programs that it starts.
    ASSERT_EQ(unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    ASSERT_EQ(mount("tmpfs", OutputFolder().c_str(), "tmpfs", 0, "size=151m"), 0);
    const Outcome outcome = RunReceiver({"--size", "640x360", "--bitrate", "100000", "--speed", "4"});
    EXPECT_EQ(outcome.code, 7) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("150 MiB"));
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(1));
    EXPECT_EQ(DecodeVideo(recordings.front()).messages, "");
    umount(OutputFolder().c_str());
}

TEST_F(FaultsTest, ADiskThatIsFullFromTheBeginningIsSaidBeforeAnythingIsMade) {
    ASSERT_EQ(unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    ASSERT_EQ(mount("tmpfs", OutputFolder().c_str(), "tmpfs", 0, "size=100m"), 0);
    const Outcome outcome = RunReceiver(Small({"--seconds", "10"}));
    EXPECT_EQ(outcome.code, 6) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("is full: 104.9 MB are free"));
    EXPECT_THAT(Recordings(), SizeIs(0));
    umount(OutputFolder().c_str());
}

TEST_F(FaultsTest, ASourceThatVanishesAndReturnsGoesOnInANewFile) {
    const FreePorts ports;
    const std::string port = std::to_string(ports.First());
    MaterialOptions options;
    options.seconds = 4;
    const Sent sent(MakeMaterial(folder, options));
    const auto receiver =
        Start({"--input", "udp://127.0.0.1:" + port, "--timeout", "2", "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    const std::string address = "udp://127.0.0.1:" + port + "?pkt_size=1316";
    ASSERT_EQ(SendTransportStream(sent.file, address)->Wait(), 0);
    ASSERT_TRUE(receiver->WaitForText("lost")) << receiver->AllText();
    // Its file is complete while it is away.
    ASSERT_TRUE(receiver->WaitForText("closed ")) << receiver->AllText() << Log();
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("25");
    expected.timecode = *receiver::ParseTimecode("10:00:00:00");
    const Range range = CheckRecording(Recordings().front(), sent, expected);
    EXPECT_EQ(range.first, 0U);
    EXPECT_EQ(range.count, sent.media.video.size());
    const auto again = SendTransportStream(sent.file, address);
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() == 2; })) << receiver->AllText() << Log();
    ASSERT_EQ(again->Wait(), 0);
    receiver->Signal(SIGINT);
    EXPECT_EQ(receiver->Wait(), 8) << receiver->AllText();
    for (const auto& recording : Recordings()) {
        const CodedMedia recorded = ReadCodedMedia(recording);
        EXPECT_GE(recorded.video.size(), 40U);
        EXPECT_LT(FindRun(sent.media.video, recorded.video), sent.media.video.size()) << recording;
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
}

TEST_F(FaultsTest, WithoutReconnectionALostSourceEndsTheRun) {
    const FreePorts ports;
    const std::string port = std::to_string(ports.First());
    MaterialOptions options;
    options.seconds = 2;
    const Sent sent(MakeMaterial(folder, options));
    const auto receiver = Start({"--input", "udp://127.0.0.1:" + port, "--timeout", "8", "--no-reconnect",
                                 "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    const auto sender = SendTransportStream(sent.file, "udp://127.0.0.1:" + port + "?pkt_size=1316");
    EXPECT_EQ(receiver->Wait(), 3) << receiver->AllText();
    EXPECT_THAT(receiver->Errors(), HasSubstr("receiver: the source was lost: "));
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("25");
    expected.timecode = *receiver::ParseTimecode("10:00:00:00");
    EXPECT_EQ(CheckRecording(Recordings().front(), sent, expected).count, sent.media.video.size());
}

TEST_F(FaultsTest, TwoReceiversOnOneFolderKeepTheirFilesApart) {
    const auto options = Small({"--seconds", "3", "--timecode", "10:00:00:00"});
    const auto one = Start(options);
    // Both look for a free name before they take it: the second one must not look in the same moment.
    ASSERT_TRUE(one->WaitForText("writing ")) << one->AllText();
    const auto other = Start(options);
    EXPECT_EQ(one->Wait(), 0) << one->AllText();
    EXPECT_EQ(other->Wait(), 0) << other->AllText();
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2));
    for (const auto& recording : recordings) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
        EXPECT_EQ(StreamOf(AskFfprobe(recording), "tmcd")["tags"].value("timecode", ""), "10:00:00:00");
    }
}

TEST_F(FaultsTest, ATerminalThatIsClosedDoesNotEndTheRecording) {
    const auto receiver = Start(Small({"--seconds", "3"}), Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(receiver->WaitForText("REC ")) << receiver->AllText();
    receiver->CloseTerminal();
    EXPECT_EQ(receiver->Wait(), 0);
    ASSERT_THAT(Recordings(), SizeIs(1));
    EXPECT_GE(DecodeVideo(Recordings().front()).checksums.size(), 48U);
}

TEST_F(FaultsTest, AReaderOfTheOutputThatGoesAwayDoesNotEndTheRecording) {
    std::vector<std::string> command = {"bash", "-c", "\"$@\" | head -n 1; exit ${PIPESTATUS[0]}",
                                        "receiver"};
    const auto receiver = CommandOf(Small({"--seconds", "2", "--json"}));
    command.insert(command.end(), receiver.begin(), receiver.end());
    const Outcome outcome = RunProgram(command, environment);
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    ASSERT_THAT(Recordings(), SizeIs(1));
    EXPECT_EQ(DecodeVideo(Recordings().front()).checksums.size(), 50U);
}

TEST_F(FaultsTest, KeysOnATerminalDriveTheRecord) {
    const auto receiver = Start(Small({"--seconds", "60"}), Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(receiver->WaitForText("REC ")) << receiver->AllText();
    receiver->Type("s");
    ASSERT_TRUE(WaitFor([&] { return Log().find("OP: FILE CLOSE.") != std::string::npos; }))
        << receiver->AllText();
    receiver->Type("r");
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() == 2; })) << receiver->AllText();
    receiver->Type("q");
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    for (const auto& recording : Recordings()) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
}

TEST_F(FaultsTest, KeysAreHeardWhileTheSourceIsNotThereYet) {
    const FreePorts ports;
    const auto receiver =
        Start({"--input", "udp://127.0.0.1:" + std::to_string(ports.First()), "--timeout", "1"},
              Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(receiver->WaitForText("waiting for it")) << receiver->AllText();
    receiver->Type("x");
    ASSERT_TRUE(receiver->WaitForText("keys: r records")) << receiver->AllText();
    receiver->Type("q");
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
}

TEST_F(FaultsTest, AfterAKillAFragmentedFileIsReadable) {
    const auto receiver = Start(Small({"--file-type", "fragment", "--fps", "50", "--speed", "4"}));
    // The first fragment is on disk, and the next one is begun.
    ASSERT_TRUE(WaitFor([&] {
        const auto recordings = Recordings();
        // It is no media file before the first 256 pictures.
        return recordings.size() == 1 &&
               AskFfprobe(recordings.front()).value("/streams/0/nb_read_packets"_json_pointer, "").size() >
                   0 &&
               ReadCodedMedia(recordings.front()).video.size() >= 512;
    })) << receiver->AllText();
    receiver->Signal(SIGKILL);
    EXPECT_EQ(receiver->Wait(), 128 + SIGKILL);
    const Decoded decoded = DecodeVideo(Recordings().front());
    EXPECT_EQ(decoded.checksums.size() % 256, 0U);
    EXPECT_GE(decoded.checksums.size(), 512U);
    EXPECT_EQ(decoded.messages, "");
}

}  // namespace
}  // namespace endtoend
