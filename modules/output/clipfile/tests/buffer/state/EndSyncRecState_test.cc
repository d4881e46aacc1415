#include "buffer/state/EndSyncRecState.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "LogCapture.h"
#include "buffer/state/FakeStreamBuffer.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(EndSyncRecState, AsksForTheRemovalOnEntryOnly) {
    LogCapture log;
    FakeStreamBuffer buffer;
    EndSyncRecState state(&buffer);
    EXPECT_EQ(state.GetName(), "end_sync_rec");
    EXPECT_EQ(state.GetId(), kEndSyncRecState);
    EXPECT_THAT(buffer.calls, IsEmpty());
    state.OnEnter();
    EXPECT_THAT(buffer.calls, ElementsAre("NotifyEndSync"));
    state.OnExit();
    EXPECT_THAT(buffer.calls, ElementsAre("NotifyEndSync"));
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST(EndSyncRecState, DropsEveryUnitSilently) {
    LogCapture log;
    FakeStreamBuffer buffer;
    EndSyncRecState state(&buffer);
    auto queue = std::make_shared<StreamQueue>(20, false);
    for (const char* mediaType : {"video", "audio", "meta"}) {
        EXPECT_EQ(state.Execute(stream_units::VideoUnit(0, 0, 0, stream_units::kIdr), queue, mediaType),
                  nullptr);
    }
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST(EndSyncRecState, CanFinishOnceTheQueueIsEmpty) {
    FakeStreamBuffer buffer;
    EndSyncRecState state(&buffer);
    StreamQueue queue(20, false);
    EXPECT_TRUE(state.CanFinish(queue.queue));
    queue.queue.Push(stream_units::VideoUnit(0, 0, 0));
    EXPECT_FALSE(state.CanFinish(queue.queue));
    queue.queue.Pop();
    EXPECT_TRUE(state.CanFinish(queue.queue));
}

}  // namespace
}  // namespace clipfileModule
