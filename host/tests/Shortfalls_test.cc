#include "Shortfalls.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::int64_t kSecond = 90000;

/// Two files of 50 frames, of a stream of 100.
RunRecord WholeRun() {
    RunRecord run;
    run.anyFrame = true;
    run.recordedFrames = 100;
    run.length = 4 * kSecond;
    run.files = {{"a.MP4", 1000, "10:00:00:00", 2, 50, ""}, {"b.MP4", 1000, "10:00:02:00", 2, 50, ""}};
    return run;
}

TEST(Shortfalls, ARunWithEverythingHasNone) {
    EXPECT_THAT(ShortfallsOf(WholeRun()), IsEmpty());
}

TEST(Shortfalls, ASourceThatHasSentNothingIsToldUnlessTheOperatorEndedTheRun) {
    RunRecord run;
    EXPECT_THAT(ShortfallsOf(run),
                ElementsAre("nothing was recorded: the source has sent no IDR frame; set the encoder to "
                            "closed groups of pictures, or use --transcode"));
    run.endedByOperator = true;
    EXPECT_THAT(ShortfallsOf(run), IsEmpty());
}

TEST(Shortfalls, PicturesWithoutAnIdrFrameAreToldWhoeverEndedTheRun) {
    RunRecord run;
    run.earlyPictures = true;
    run.endedByOperator = true;
    EXPECT_THAT(ShortfallsOf(run),
                ElementsAre("nothing was recorded: the source has sent no IDR frame; set the encoder to "
                            "closed groups of pictures, or use --transcode"));
}

TEST(Shortfalls, TheAdviceToTranscodeIsNotGivenToWhomHasDoneSo) {
    RunRecord run;
    run.transcode = true;
    EXPECT_THAT(ShortfallsOf(run),
                ElementsAre("nothing was recorded: the source has sent no IDR frame; set the encoder to "
                            "closed groups of pictures"));
}

TEST(Shortfalls, ARunThatRecordsEverythingNeedsAnIdrFrame) {
    RunRecord run;
    run.anyFrame = true;
    run.everything = true;
    EXPECT_THAT(ShortfallsOf(run), ElementsAre("nothing was recorded: no IDR frame came"));
}

TEST(Shortfalls, ARangeBehindTheEndIsToldUnlessTheOperatorEndedTheRun) {
    RunRecord run = WholeRun();
    run.unreached = RecordRange{kSecond * 25 / 2, std::nullopt};
    EXPECT_THAT(
        ShortfallsOf(run),
        ElementsAre("nothing was recorded from 00:00:12.500 of the stream on: it has ended at 00:00:04.000"));
    run.endedByOperator = true;
    EXPECT_THAT(ShortfallsOf(run), IsEmpty());
}

TEST(Shortfalls, SilenceInThePlaceOfMissingAudioIsTold) {
    RunRecord run = WholeRun();
    run.silentFrames = 1;
    EXPECT_THAT(ShortfallsOf(run),
                ElementsAre("1 audio frame of the source did not come: silence was recorded instead"));
}

TEST(Shortfalls, AFileThatIsGoneOrCannotBeReadIsNamed) {
    RunRecord run = WholeRun();
    run.files[0].problem = "No such file or directory";
    run.files[0].frames = 0;
    run.files[1].problem = "Invalid data";
    EXPECT_THAT(ShortfallsOf(run), ElementsAre("a.MP4 is gone: it was deleted or moved while the run went on",
                                               "b.MP4 cannot be read: Invalid data"));
}

TEST(Shortfalls, FramesThatAreInNoFileAreCounted) {
    RunRecord run = WholeRun();
    run.files[1].frames = 49;
    EXPECT_THAT(ShortfallsOf(run), ElementsAre("1 frame that should have been recorded is in no file"));
    run.files.pop_back();
    EXPECT_THAT(ShortfallsOf(run), ElementsAre("50 frames that should have been recorded are in no file"));
}

TEST(Shortfalls, AMissedRecordingIsDescribedByItsPlace) {
    EXPECT_EQ(Describe({kSecond, kSecond * 6 / 5}),
              "nothing was recorded from 00:00:01.000 to 00:00:01.200 of the stream: no IDR frame came in "
              "between");
}

}  // namespace
}  // namespace receiver
