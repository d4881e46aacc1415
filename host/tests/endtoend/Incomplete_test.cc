// Runs that end as commanded, with something missing from their files: a sentence each, and no success.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <fstream>
#include <iterator>

#include "endtoend/ReceiverFixture.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::SizeIs;

constexpr int kIncomplete = 8;

class IncompleteTest : public ReceiverFixture {
 protected:
    void ExpectIncomplete(const std::vector<std::string>& options, const std::string& sentence,
                          std::size_t files) {
        const Outcome outcome = RunReceiver(options);
        EXPECT_EQ(outcome.code, kIncomplete) << outcome.errors;
        EXPECT_THAT(outcome.errors, HasSubstr(sentence));
        EXPECT_THAT(Recordings(), SizeIs(files));
    }
    /// A transport stream of `material` without its first two thirds, tables in front.
    std::filesystem::path Tail(const std::filesystem::path& material) const {
        constexpr std::size_t kPacket = 188;
        std::ifstream in(material, std::ios::binary);
        const std::string bytes{std::istreambuf_iterator<char>(in), {}};
        const std::filesystem::path tail = folder.Path() / "tail.ts";
        const std::size_t from = bytes.size() / kPacket * 2 / 3 * kPacket;
        std::ofstream(tail, std::ios::binary) << bytes.substr(0, 3 * kPacket) << bytes.substr(from);
        return tail;
    }
};

// A long group of pictures of which the receiver sees the end: an encoder that refreshes without IDR frames.
TEST_F(IncompleteTest, AStreamWithoutAnIdrFrame) {
    MaterialOptions options;
    options.pictureGroup = 25;
    options.more = {"-x264-params", "intra-refresh=1:scenecut=0"};
    const std::string tail = Tail(MakeMaterial(folder, options)).string();
    ExpectIncomplete({"--input", tail, "--speed", "8"},
                     "nothing was recorded: the source has sent no IDR frame", 0);
    const Outcome converted = RunReceiver({"--input", tail, "--speed", "8", "--transcode"});
    EXPECT_EQ(converted.code, 0) << converted.errors;
    EXPECT_THAT(converted.errors, HasSubstr("video is converted"));
    ASSERT_THAT(Recordings(), SizeIs(1));
    EXPECT_EQ(DecodeVideo(Recordings().front()).messages, "");
}

// A live source ends by the operator alone, who is not to take the run for a good one.
TEST_F(IncompleteTest, ALiveStreamWithoutAnIdrFrame) {
    MaterialOptions options;
    options.seconds = 30;
    options.pictureGroup = 25;
    options.more = {"-x264-params", "intra-refresh=1:scenecut=0"};
    const std::filesystem::path tail = Tail(MakeMaterial(folder, options));
    const FreePorts ports;
    const std::string url = "udp://127.0.0.1:" + std::to_string(ports.First());
    const auto receiver = Start({"--input", url});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    const auto sender = SendTransportStream(tail, url + "?pkt_size=1316");
    ASSERT_TRUE(receiver->WaitForText("source: H.264")) << receiver->AllText();
    receiver->Signal(SIGTERM);
    EXPECT_EQ(receiver->Wait(), kIncomplete);
    EXPECT_THAT(receiver->Errors(), HasSubstr("nothing was recorded: the source has sent no IDR frame"));
    EXPECT_THAT(Recordings(), SizeIs(0));
}

TEST_F(IncompleteTest, ARangeThatIsShorterThanTheGroupOfPictures) {
    ExpectIncomplete(
        {"--size", "320x180", "--seconds", "2", "--record", "0.2-0.5,1-2"},
        "nothing was recorded from 00:00:00.200 to 00:00:00.500 of the stream: no IDR frame came", 1);
}

TEST_F(IncompleteTest, ARangeBehindTheEndOfTheStream) {
    ExpectIncomplete({"--size", "320x180", "--seconds", "1", "--record", "0-1,5-9"},
                     "nothing was recorded from 00:00:05.000 of the stream on", 1);
}

TEST_F(IncompleteTest, AGapInTheSoundThatIsFilledWithSilence) {
    MaterialOptions options;
    options.more = {"-bsf:a", "noise=drop=between(n\\,40\\,44)"};
    ExpectIncomplete({"--input", MakeMaterial(folder, options).string(), "--speed", "4"},
                     "5 audio frames of the source did not come: silence was recorded instead", 1);
}

TEST_F(IncompleteTest, AFileThatIsDeletedWhileTheRunGoesOn) {
    const auto receiver = Start({"--size", "320x180", "--seconds", "4", "--record", "0-1,3-4"});
    ASSERT_TRUE(receiver->WaitForText("closed ")) << receiver->AllText();
    const auto deleted = Recordings().front();
    std::filesystem::remove(deleted);
    EXPECT_EQ(receiver->Wait(), kIncomplete);
    EXPECT_THAT(receiver->Errors(), HasSubstr(deleted.string() + " is gone: it was deleted or moved"));
    EXPECT_THAT(Recordings(), SizeIs(1));
}

}  // namespace
}  // namespace endtoend
