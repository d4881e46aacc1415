// The tests' own tools, before anything rests on them.

#include <gmock/gmock.h>
#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <csignal>

#include "support/CodedMedia.h"
#include "support/FrameJudge.h"
#include "support/FreePorts.h"
#include "support/Judges.h"
#include "support/LossyRelay.h"
#include "support/Material.h"
#include "support/NumberedMedia.h"
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

/// A material of a second with pictures and sounds of which no two are alike, and a copy of it.
class FrameJudgeTest : public ::testing::Test {
 protected:
    FrameJudgeTest() {
        MaterialOptions options;
        options.seconds = 1;
        options.more = {"-filter_complex", "anoisesrc=sample_rate=48000:seed=7[noise]", "-map", "0:v", "-map",
                        "[noise]"};
        sent_ = MakeMaterial(folder_, options);
        judge_.AddSent(sent_);
    }
    FrameJudge::Verdict JudgeCopy(const std::vector<std::string>& options) {
        const auto copy = (folder_.Path() / "copy.ts").string();
        std::vector<std::string> command{"ffmpeg", "-v", "error", "-y", "-i", sent_.string()};
        command.insert(command.end(), options.begin(), options.end());
        command.insert(command.end(), {"-c", "copy", copy});
        const Outcome outcome = RunProgram(command);
        EXPECT_EQ(outcome.code, 0) << outcome.errors;
        return judge_.Judge(copy);
    }

    const TemporaryFolder folder_;
    std::filesystem::path sent_;
    FrameJudge judge_;
};

TEST_F(FrameJudgeTest, FindsNothingWrongWithACopy) {
    const FrameJudge::Verdict verdict = JudgeCopy({});
    EXPECT_EQ(judge_.SentPictures(), 25U);
    EXPECT_EQ(verdict.pictures, 25U);
    EXPECT_GE(verdict.sounds, 46U);
    EXPECT_EQ(verdict.unknownPictures + verdict.unknownSounds, 0U);
    EXPECT_EQ(verdict.missingPictures + verdict.missingSounds, 0U);
    EXPECT_LT(verdict.outOfStep, 0.001);
}

TEST_F(FrameJudgeTest, CountsWhatIsMissing) {
    const FrameJudge::Verdict verdict =
        JudgeCopy({"-bsf:v", "noise=drop=between(n\\,12\\,14)", "-bsf:a", "noise=drop=eq(n\\,20)"});
    EXPECT_EQ(verdict.pictures, 22U);
    EXPECT_EQ(verdict.missingPictures, 3U);
    EXPECT_EQ(verdict.missingSounds, 1U);
}

TEST_F(FrameJudgeTest, MeasuresHowFarTheSoundIsOutOfStep) {
    const FrameJudge::Verdict verdict = JudgeCopy({"-bsf:a", "setts=ts=TS+9000"});
    EXPECT_NEAR(verdict.outOfStep, 0.1, 0.001);
}

/// Two seconds, as they were sent.
struct NumberedTest : ::testing::Test {
    static void SetUpTestSuite() {
        const TemporaryFolder folder;
        part.start = 2;
        part.number = 1000;
        WriteNumbered(part, folder.Path() / "a.ts");
        sent = ReadNumbered(folder.Path() / "a.ts");
    }
    static NumberedPart part;
    static NumberedRecording sent;
    static NumberedRecording changed;
};
NumberedPart NumberedTest::part;
NumberedRecording NumberedTest::sent;
NumberedRecording NumberedTest::changed;

TEST_F(NumberedTest, FindsWhatWasSentInStep) {
    ASSERT_THAT(sent.numbers, ::testing::SizeIs(50));
    EXPECT_EQ(sent.numbers.back(), 1049U);
    EXPECT_EQ(sent.CountOf(part), 50U);
    ASSERT_THAT(sent.bursts, ::testing::SizeIs(2));
    EXPECT_EQ(sent.bursts[0].second, 2);
    EXPECT_EQ(sent.bursts[1].second, 3);
    ExpectInStep(sent, part);
}

TEST_F(NumberedTest, TellsOfSoundThatIsOutOfStep) {
    changed = sent;
    changed.bursts[1].time += 0.022;
    EXPECT_NONFATAL_FAILURE(ExpectInStep(changed, part), "of second 3");
}

TEST_F(NumberedTest, TellsOfSoundThatIsMissing) {
    changed = sent;
    changed.bursts.pop_back();
    EXPECT_NONFATAL_FAILURE(ExpectInStep(changed, part), "second 3 is not heard");
}

TEST_F(NumberedTest, TellsOfAPictureThatIsMissing) {
    changed = sent;
    changed.numbers.erase(changed.numbers.begin() + 20);
    changed.times.pop_back();
    EXPECT_FATAL_FAILURE(ExpectInStep(changed, part), "first + at");
}

/// A UDP socket of this machine.
class Socket {
 public:
    explicit Socket(std::uint16_t port) : file_(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
        const sockaddr_in address = loopback(port);
        EXPECT_EQ(bind(file_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        const timeval patience{kPatience.count(), 0};
        setsockopt(file_, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    }
    ~Socket() { close(file_); }
    Socket(const Socket&) = delete;
    Socket& operator=(const Socket&) = delete;

    void Send(std::uint16_t port, char byte) const {
        const sockaddr_in address = loopback(port);
        EXPECT_EQ(sendto(file_, &byte, 1, 0, reinterpret_cast<const sockaddr*>(&address), sizeof address), 1);
    }
    char Receive() {
        char byte = 0;
        socklen_t length = sizeof from_;
        EXPECT_EQ(recvfrom(file_, &byte, 1, 0, reinterpret_cast<sockaddr*>(&from_), &length), 1);
        return byte;
    }
    /// Where the last packet came from.
    std::uint16_t From() const { return ntohs(from_.sin_port); }

 private:
    static sockaddr_in loopback(std::uint16_t port) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(port);
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        return address;
    }

    int file_;
    sockaddr_in from_{};
};

TEST(LossyRelayTest, PassesPacketsInBothDirections) {
    const FreePorts ports;
    const std::uint16_t front = ports.First();
    Socket receiver(static_cast<std::uint16_t>(front + 1));
    Socket sender(static_cast<std::uint16_t>(front + 2));
    const LossyRelay relay(front, static_cast<std::uint16_t>(front + 1), {}, 1);
    sender.Send(front, 'a');
    EXPECT_EQ(receiver.Receive(), 'a');
    receiver.Send(receiver.From(), 'b');
    EXPECT_EQ(sender.Receive(), 'b');
    EXPECT_EQ(sender.From(), front);
    EXPECT_EQ(relay.Forth().passed, 1U);
    EXPECT_EQ(relay.Back().passed, 1U);
}

TEST(LossyRelayTest, DropsItsShareAndNothingElse) {
    const FreePorts ports;
    const std::uint16_t front = ports.First();
    Socket receiver(static_cast<std::uint16_t>(front + 1));
    const Socket sender(static_cast<std::uint16_t>(front + 2));
    const LossyRelay relay(front, static_cast<std::uint16_t>(front + 1), {.share = 0.25}, 1);
    constexpr std::uint64_t kPackets = 200;
    for (std::uint64_t number = 1; number <= kPackets; ++number) {
        const auto passed = relay.Forth().passed;
        sender.Send(front, static_cast<char>(number));
        while (relay.Forth().passed + relay.Forth().dropped < number) {
            std::this_thread::yield();
        }
        if (relay.Forth().passed > passed) {
            EXPECT_EQ(receiver.Receive(), static_cast<char>(number));
        }
    }
    // Five standard deviations of a binomial distribution.
    EXPECT_NEAR(static_cast<double>(relay.Forth().dropped), 50, 31);
}

TEST(LossyRelayTest, DropsEverythingForTheLengthOfABurst) {
    const FreePorts ports;
    const std::uint16_t front = ports.First();
    Socket receiver(static_cast<std::uint16_t>(front + 1));
    const Socket sender(static_cast<std::uint16_t>(front + 2));
    const PacketLoss loss{.burst = std::chrono::milliseconds(20), .every = std::chrono::milliseconds(40)};
    const LossyRelay relay(front, static_cast<std::uint16_t>(front + 1), loss, 1);
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    std::uint64_t number = 0;
    // What was dropped before a packet passed again.
    std::uint64_t behind = 0;
    while (behind == 0 && std::chrono::steady_clock::now() < deadline) {
        const auto before = relay.Forth();
        sender.Send(front, static_cast<char>(++number));
        while (relay.Forth().passed + relay.Forth().dropped < number) {
            std::this_thread::yield();
        }
        if (relay.Forth().passed > before.passed) {
            EXPECT_EQ(receiver.Receive(), static_cast<char>(number));
            behind = before.dropped;
        }
    }
    EXPECT_GT(behind, 0U);
}

}  // namespace
}  // namespace endtoend
