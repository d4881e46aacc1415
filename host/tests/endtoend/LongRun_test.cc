// An hour of stream, at many times its speed, with rotation.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

using ::testing::SizeIs;

using LongRunTest = ReceiverFixture;

// Files of ten minutes have 15000 pictures at 25 frames a second: a whole number of chunks, of periods in
// which audio and video are in step, and of picture groups of 25.
TEST_F(LongRunTest, OfAnHourEveryPictureIsInOneOfTheFiles) {
    MaterialOptions options;
    options.size = "96x64";
    options.pictureGroup = 25;
    options.seconds = 65;
    const auto hour = folder.Path() / "hour.ts";
    // 64 seconds have 3000 AAC frames; 57 times that is an hour and 48 seconds.
    RepeatMaterial(MakeMaterial(folder, options), hour, 1600, 3000, 57, 25);
    const CodedMedia source = ReadCodedMedia(hour);

    const Outcome outcome = RunReceiver(
        {"--input", hour.string(), "--speed", "400", "--max-minutes", "10", "--timecode", "09:30:00:00"});

    ASSERT_EQ(outcome.code, 0) << outcome.errors << Log();
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(7));
    std::size_t picture = 0;
    std::size_t sound = 0;
    for (std::size_t i = 0; i < recordings.size(); ++i) {
        SCOPED_TRACE(recordings[i]);
        const CodedMedia recorded = ReadCodedMedia(recordings[i]);
        EXPECT_EQ(recordings[i].filename(),
                  FileNameOf(
                      receiver::TimecodeOf(static_cast<std::int64_t>((570 * 60 + 600 * i) * 25), 25, false)));
        if (i + 1 < recordings.size()) {
            EXPECT_EQ(recorded.video.size(), 15000U);
            EXPECT_EQ(recorded.audio.size(), 28125U);
        }
        EXPECT_EQ(recorded.data.size(), recorded.video.size());
        EXPECT_TRUE(recorded.video.front().idr);
        ASSERT_LE(picture + recorded.video.size(), source.video.size());
        ASSERT_LE(sound + recorded.audio.size(), source.audio.size());
        EXPECT_TRUE(std::equal(recorded.video.begin(), recorded.video.end(),
                               source.video.begin() + static_cast<std::ptrdiff_t>(picture)));
        EXPECT_TRUE(std::equal(recorded.audio.begin(), recorded.audio.end(),
                               source.audio.begin() + static_cast<std::ptrdiff_t>(sound)));
        picture += recorded.video.size();
        sound += recorded.audio.size();
        EXPECT_THAT(AskFfprobe(recordings[i])["messages"], SizeIs(0));
    }
    EXPECT_EQ(picture, source.video.size());
}

}  // namespace
}  // namespace endtoend
