#include "buffer/state/CacheState.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "LogCapture.h"
#include "buffer/state/ErrorCacheState.h"
#include "buffer/state/FakeStreamBuffer.h"
#include "buffer/state/StopCacheState.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kDump;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// Shows what the family shares.
class PlainState : public CacheState {
 public:
    explicit PlainState(StreamBufferInterface* owner) : CacheState("plain", kStartState, owner) {}
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& /*unit*/,
                                        std::shared_ptr<StreamQueue>& /*queue*/,
                                        const char* /*mediaType*/) override {
        return nullptr;
    }
    static void Dump(const char* text, const std::vector<unsigned char>& bytes) {
        dump(text, bytes.data(), bytes.size());
    }
};

TEST(CacheState, NumbersOfTheStatesAreFixed) {
    EXPECT_EQ(kStopState, 1);
    EXPECT_EQ(kWaitStartState, 2);
    EXPECT_EQ(kStartState, 3);
    EXPECT_EQ(kErrorState, 4);
    EXPECT_EQ(kEndSyncRecState, 5);
}

TEST(CacheState, BaseEntersAndLeavesWithoutEffectAndCanFinish) {
    LogCapture log;
    FakeStreamBuffer buffer;
    PlainState state(&buffer);
    state.OnEnter();
    state.OnExit();
    EXPECT_THAT(buffer.calls, IsEmpty());
    EXPECT_THAT(log.Lines(), IsEmpty());
    StreamQueue queue(20, false);
    queue.queue.Push(stream_units::VideoUnit(0, 0, 0));
    EXPECT_TRUE(state.CanFinish(queue.queue));
}

TEST(CacheState, DumpOfNothingLogsNone) {
    LogCapture log;
    PlainState::Dump("some text", {});
    EXPECT_THAT(log.Texts(), ElementsAre("some text, size = 0.", "none"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kDump, "some text, size = 0."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kDump, "none"));
}

TEST(CacheState, DumpLogsALineAfterEvery32Bytes) {
    std::vector<unsigned char> bytes;
    for (unsigned char i = 0; i < 33; ++i) {
        bytes.push_back(static_cast<unsigned char>(i + 0xF0));
    }
    LogCapture log;
    PlainState::Dump("x", bytes);
    EXPECT_THAT(log.Texts(), ElementsAre("x, size = 33.",
                                         "f0 f1 f2 f3 f4 f5 f6 f7 f8 f9 fa fb fc fd fe ff "
                                         "00 01 02 03 04 05 06 07 08 09 0a 0b 0c 0d 0e 0f ",
                                         "10 "));
    for (const CapturedLine& line : log.Lines()) {
        EXPECT_EQ(line.priority, LOG_PRIORITY_TRACE);
        EXPECT_EQ(line.function, kDump);
    }
}

TEST(CacheState, DumpOf32BytesIsOneLine) {
    LogCapture log;
    PlainState::Dump("x", std::vector<unsigned char>(32, 0xAB));
    const std::string line = "ab ab ab ab ab ab ab ab ab ab ab ab ab ab ab ab ";
    EXPECT_THAT(log.Texts(), ElementsAre("x, size = 32.", line + line));
}

template <typename State>
void expectDropsEverything(const char* name, CacheStateId id) {
    LogCapture log;
    FakeStreamBuffer buffer;
    State state(&buffer);
    EXPECT_EQ(state.GetName(), name);
    EXPECT_EQ(state.GetId(), id);
    auto queue = std::make_shared<StreamQueue>(20, false);
    for (const char* mediaType : {"video", "audio", "meta"}) {
        EXPECT_EQ(state.Execute(stream_units::VideoUnit(0, 0, 0, stream_units::kIdr), queue, mediaType),
                  nullptr);
    }
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_TRUE(state.CanFinish(queue->queue));
    state.OnEnter();
    state.OnExit();
    EXPECT_THAT(buffer.calls, IsEmpty());
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST(StopCacheState, DropsEveryUnitSilently) {
    expectDropsEverything<StopCacheState>("stop", kStopState);
}

TEST(ErrorCacheState, DropsEveryUnitSilently) {
    expectDropsEverything<ErrorCacheState>("error", kErrorState);
}

}  // namespace
}  // namespace clipfileModule
