#include "fileout/FileOutput.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "LogCapture.h"
#include "support/ControllerRecorder.h"

namespace clipfileModule {
namespace {

using ::testing::ElementsAre;

TEST(FileOutput, ReportsThatItCannotRecordWithoutAMuxer) {
    LogCapture log;
    ControllerRecorder controller;
    FileOutput output;
    EXPECT_FALSE(output.Initialize(&controller, nullptr, "normal"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_ERROR, "clipfileModule::FileOutput::Initialize",
                             "mp4 file initialize error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 2"));
    EXPECT_TRUE(output.Uninitialize());
}

TEST(FileOutput, CountsTheChunksThatWait) {
    ControllerRecorder controller;
    FileOutput output;
    output.Initialize(&controller, nullptr, "normal");
    output.Start({});
    EXPECT_EQ(output.PushChunk(std::make_shared<ChunkData>()), 1u);
    EXPECT_EQ(output.PushChunk(std::make_shared<ChunkData>()), 2u);
    output.Stop();
    output.Start({});
    EXPECT_EQ(output.PushChunk(std::make_shared<ChunkData>()), 1u);
    output.Stop();
    output.Uninitialize();
}

}  // namespace
}  // namespace clipfileModule
