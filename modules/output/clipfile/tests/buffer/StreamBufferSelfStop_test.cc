// A host may stop a recording from inside a status that a thread of that recording reports.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <string>
#include <system_error>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"

namespace clipfileModule {
namespace {

using ::testing::Each;
using ::testing::ElementsAre;

/// What comes after the stop that failed, and does what that one left.
struct Aftermath {
    const char* name;
    std::function<void(BufferHarness&)> run;
};

const Aftermath kAftermaths[] = {
    {"Stop", [](BufferHarness& harness) { harness.buffer->Stop(); }},
    {"Start", [](BufferHarness& harness) { harness.Start(); }},
    {"Destruction",
     [](BufferHarness& harness) {
         harness.controller.Clear();
         harness.buffer.reset();
         // For the harness, which stops its buffer in the end.
         harness.buffer = std::make_shared<StreamBuffer>(&harness.controller, 0, -1);
     }},
};

class StreamBufferSelfStop : public ::testing::TestWithParam<std::tuple<RecordRules, Aftermath>> {
 protected:
    StreamBufferSelfStop() { harness.settings.recordRules = std::get<0>(GetParam()); }
    void finish() { std::get<1>(GetParam()).run(harness); }

    BufferHarness harness;
};

TEST_P(StreamBufferSelfStop, OnTheChunkThreadThrowsAndLeavesTheRestToTheNext) {
    std::atomic<int> thrown = 0;
    harness.controller.SetStatusHook([&] {
        try {
            harness.buffer->Stop();
        } catch (const std::system_error& error) {
            thrown += error.code() == std::errc::resource_deadlock_would_occur ? 1 : 100;
        }
    });
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.recorder.SetQueueSize(49);
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.controller.WaitForCall("status 6 22", wait); }));
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE error -> stop."));
    finish();
    EXPECT_EQ(thrown, 1);
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Start", "Stop", "Uninitialize"));
    // What is stopped does not ask to begin again.
    EXPECT_THAT(harness.controller.Calls(), Each("status 6 22"));
}

TEST_P(StreamBufferSelfStop, OnTheWriterKeepsTheFileOutputUntilItHasStopped) {
    std::atomic<bool> isWriter = true;
    harness.recorder.SetStopHook([&] {
        if (isWriter) {
            throw std::system_error(std::make_error_code(std::errc::resource_deadlock_would_occur));
        }
    });
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    EXPECT_THROW(harness.buffer->Stop(), std::system_error);
    // Each further stop of the writer itself fails as the first one did.
    EXPECT_THROW(harness.buffer->Stop(), std::system_error);
    isWriter = false;
    finish();
    EXPECT_THAT(harness.recorder.At(0).calls,
                ElementsAre("Initialize", "Start", "Stop", "Stop", "Stop", "Uninitialize"));
}

INSTANTIATE_TEST_SUITE_P(Rules, StreamBufferSelfStop,
                         ::testing::Combine(::testing::Values(RecordRules::kKept, RecordRules::kExact),
                                            ::testing::ValuesIn(kAftermaths)),
                         [](const auto& tested) {
                             const bool exact = std::get<0>(tested.param) == RecordRules::kExact;
                             return std::string(exact ? "Exact" : "Kept") + std::get<1>(tested.param).name;
                         });

}  // namespace
}  // namespace clipfileModule
