#include <gmock/gmock.h>

#include <fstream>

#include "endtoend/ReceiverFixture.h"
#include "support/CodedMedia.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::SizeIs;

class FormatChangesTest : public ReceiverFixture {
 protected:
    /// Two parts of one stream, one behind the other.
    std::filesystem::path Join(const MaterialOptions& first, const MaterialOptions& second) const {
        const auto whole = folder.Path() / "changing.ts";
        std::ofstream out(whole, std::ios::binary);
        for (const MaterialOptions& options : {first, second}) {
            const auto part = MakeMaterial(folder, options);
            out << std::ifstream(part, std::ios::binary).rdbuf();
            std::filesystem::remove(part);
        }
        return whole;
    }
};

TEST_F(FormatChangesTest, AnotherSizeAndRateGoOnInAFileOfTheirOwn) {
    MaterialOptions first;
    first.seconds = 2;
    MaterialOptions second = first;
    second.size = "256x144";
    second.rate = "50";
    second.more = {"-output_ts_offset", "2", "-mpegts_flags", "+initial_discontinuity"};
    const auto whole = Join(first, second);
    const Outcome outcome =
        RunReceiver({"--input", whole.string(), "--timecode", "10:00:00:00", "--speed", "4"});
    EXPECT_EQ(outcome.code, 8) << outcome.errors;
    EXPECT_THAT(
        outcome.errors,
        HasSubstr("the picture changed from 320x180 to 256x144: the recording goes on in a new file"));
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2)) << outcome.errors;
    EXPECT_EQ(recordings[0].filename(), "10_00_00_00.MP4");
    EXPECT_EQ(recordings[1].filename(), "10_00_02_00.MP4");
    EXPECT_EQ(StreamOf(AskFfprobe(recordings[0]), "avc1").value("width", 0), 320);
    const auto after = StreamOf(AskFfprobe(recordings[1]), "avc1");
    EXPECT_EQ(after.value("width", 0), 256);
    EXPECT_EQ(after.value("avg_frame_rate", ""), "50/1");
    for (const auto& recording : recordings) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
    EXPECT_GE(DecodeVideo(recordings[0]).checksums.size(), 40U);
    EXPECT_GE(DecodeVideo(recordings[1]).checksums.size(), 90U);
}

}  // namespace
}  // namespace endtoend
