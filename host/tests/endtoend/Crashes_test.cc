// What a receiver that was killed leaves behind, and what the next one makes of it.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>

#include "endtoend/ReceiverFixture.h"
#include "support/FreePorts.h"
#include "support/Judges.h"

namespace endtoend {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;

/// Recovery takes only what other programs leave, and the other tests leave little.
constexpr std::chrono::seconds kWhenIdle{200};

class CrashesTest : public ReceiverFixture, public ::testing::WithParamInterface<const char*> {
 protected:
    /// The test picture, small and fast.
    static std::vector<std::string> Small(const std::string& timecode, std::vector<std::string> more) {
        more.insert(more.end(), {"--size", "320x180", "--bitrate", "300", "--gop", "5", "--speed", "8",
                                 "--timecode", timecode});
        return more;
    }
    std::vector<fs::path> Journals() const {
        std::vector<fs::path> found;
        for (const auto& entry : fs::directory_iterator(OutputFolder())) {
            if (entry.path().extension() == ".journal") {
                found.push_back(entry.path());
            }
        }
        return found;
    }
    /// Records until a chunk or fragment of the file is on the disk and its journal is too.
    std::unique_ptr<Process> Record(const std::string& type) {
        auto receiver = Start(Small("10:00:00:00", {"--file-type", type}));
        constexpr std::uintmax_t kBytes = 100'000;
        EXPECT_TRUE(WaitFor([&] {
            const auto recordings = Recordings();
            return recordings.size() == 1 && fs::file_size(recordings[0]) > kBytes && Journals().size() == 1;
        })) << receiver->AllText();
        return receiver;
    }
    fs::path Killed(const std::string& type) {
        const auto receiver = Record(type);
        receiver->Signal(SIGKILL);
        EXPECT_EQ(receiver->Wait(), 128 + SIGKILL);
        EXPECT_THAT(Recordings(), SizeIs(1));
        EXPECT_THAT(Journals(), SizeIs(1));
        orphan_ = Journals().at(0);
        return Recordings().at(0);
    }
    /// Runs a receiver until it says `text` and records, and ends it.
    void HearAndEnd(const std::vector<std::string>& options, const std::string& text) const {
        const std::size_t before = Recordings().size();
        const auto receiver = Start(options);
        EXPECT_TRUE(receiver->WaitForText(text)) << receiver->AllText();
        EXPECT_TRUE(WaitFor([&] { return Recordings().size() > before; })) << receiver->AllText();
        receiver->Signal(SIGINT);
        EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    }
    /// Files leave their journal behind the sentence that tells so.
    bool OrphanGoes() const {
        return WaitFor([&] { return !fs::exists(orphan_); });
    }
    static void ExpectWhole(const fs::path& file) {
        const Decoded video = DecodeVideo(file);
        EXPECT_EQ(video.messages, "");
        EXPECT_GE(video.checksums.size(), 30U);
        EXPECT_EQ(DecodeAudio(file).messages, "");
        EXPECT_EQ(AskFfprobe(file)["messages"].size(), 0U);
    }

    /// The journal of the receiver that was killed.
    fs::path orphan_;
};

INSTANTIATE_TEST_SUITE_P(Types, CrashesTest, ::testing::Values("normal", "fragment"),
                         [](const auto& instance) { return std::string(instance.param); });

TEST_P(CrashesTest, TheNextReceiverRecoversWhatAKilledOneHasLeft) {
    const fs::path file = Killed(GetParam());
    const auto next = Start(Small("11:00:00:00", {"--file-type", GetParam()}));
    ASSERT_TRUE(next->WaitForText("units of metadata are in " + file.string(), kWhenIdle)) << next->AllText();
    EXPECT_THAT(next->AllText(),
                HasSubstr(file.string() + " was never closed: its receiver is gone; it is recovered in the "
                                          "background"));
    EXPECT_TRUE(OrphanGoes());
    next->Signal(SIGINT);
    EXPECT_EQ(next->Wait(), 0) << next->AllText();
    EXPECT_THAT(Recordings(), SizeIs(2));
    ExpectWhole(file);
}

TEST_F(CrashesTest, FilesAreRecoveredWhileTheSourceIsAwaited) {
    const fs::path file = Killed("normal");
    const FreePorts ports;
    const auto waiting = Start({"--input", "udp://127.0.0.1:" + std::to_string(ports.First())});
    EXPECT_TRUE(waiting->WaitForText(file.string() + " was never closed")) << waiting->AllText();
    EXPECT_TRUE(waiting->WaitForText("units of metadata are in " + file.string(), kWhenIdle))
        << waiting->AllText();
    waiting->Signal(SIGINT);
    waiting->Wait();
    ExpectWhole(file);
}

TEST_F(CrashesTest, TwoReceiversOverOneFolderLeaveEachOthersFilesAlone) {
    const auto first = Record("normal");
    const fs::path file = Recordings().at(0);
    const fs::path journal = Journals().at(0);
    const Outcome second = RunReceiver(Small("11:00:00:00", {"--seconds", "4"}));
    EXPECT_EQ(second.code, 0) << second.errors;
    EXPECT_THAT(second.errors, Not(HasSubstr("was never closed")));
    EXPECT_TRUE(fs::exists(journal));
    first->Signal(SIGINT);
    EXPECT_EQ(first->Wait(), 0) << first->AllText();
    ExpectWhole(file);
}

TEST_F(CrashesTest, FilesAreRecoveredWhenTheOperatorAgrees) {
    const fs::path file = Killed("normal");
    const auto size = fs::file_size(file);
    HearAndEnd(Small("11:00:00:00", {"--recover", "no"}), file.string() + " was never closed");
    // Without a terminal nobody can be asked.
    HearAndEnd(Small("12:00:00:00", {"--recover", "ask"}), "clipfile recover makes a whole file of it");
    EXPECT_EQ(fs::file_size(file), size);
    EXPECT_TRUE(fs::exists(orphan_));

    const auto asking = Start(Small("13:00:00:00", {"--recover", "ask"}), Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(asking->WaitForText("press y")) << asking->AllText();
    EXPECT_EQ(fs::file_size(file), size);
    asking->Type("y");
    ASSERT_TRUE(asking->WaitForText("units of metadata are in", kWhenIdle)) << asking->AllText();
    asking->Type("q");
    EXPECT_EQ(asking->Wait(), 0) << asking->AllText();
    ExpectWhole(file);
}

}  // namespace
}  // namespace endtoend
