#include "mp4/MuxerRoutine.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "LogCapture.h"

namespace clipfileModule {

namespace routine_test {

MbxStatus work(MbxStatus second) {
    MUXER_ROUTINE(routine);
    MUXER_STEP(routine, MBX_OK);
    MUXER_STEP(routine, second);
    return routine.Return(MBX_OK);
}

bool answer(bool open) {
    MUXER_ROUTINE(routine);
    return open ? routine.Return(true) : routine.ReturnNotOpen();
}

}  // namespace routine_test

namespace {

using ::testing::ElementsAre;

constexpr char kWork[] = "clipfileModule::routine_test::work";
constexpr char kAnswer[] = "clipfileModule::routine_test::answer";

TEST(MuxerRoutine, LogsStartAndEndWithTheResultAtPriority12) {
    LogCapture log;
    EXPECT_EQ(routine_test::work(MBX_OK), MBX_OK);
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "end. ret = 0."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, kWork, "start."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, kWork, "end. ret = 0."));
    EXPECT_TRUE(log.Find("start.")->file->ends_with("MuxerRoutine_test.cc"));
}

TEST(MuxerRoutine, LogsAFailedStepAtPriority4WithItsSourceLine) {
    LogCapture log;
    EXPECT_EQ(routine_test::work(MBX_ERR_IO), MBX_ERR_IO);
    const std::vector<CapturedLine> lines = log.Lines();
    ASSERT_EQ(lines.size(), 3U);
    // The step stands two lines below the routine's first.
    const int line = lines[0].line + 2;
    EXPECT_EQ(lines[1].line, line);
    EXPECT_EQ(lines[1].text, "error. error_line = " + std::to_string(line) + ", result = 257.");
    EXPECT_EQ(lines[1].priority, LOG_PRIORITY_ERROR);
    EXPECT_EQ(lines[1].function, kWork);
    EXPECT_EQ(lines[2].text, "end. ret = 257.");
}

TEST(MuxerRoutine, ATrueResultIsLoggedAs1) {
    LogCapture log;
    EXPECT_TRUE(routine_test::answer(true));
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "end. ret = 1."));
}

TEST(MuxerRoutine, ARunWithoutAnOpenFileEndsWithALineOfItsOwnAtPriority11) {
    LogCapture log;
    EXPECT_FALSE(routine_test::answer(false));
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "end. file not open."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kAnswer, "end. file not open."));
}

}  // namespace
}  // namespace clipfileModule
