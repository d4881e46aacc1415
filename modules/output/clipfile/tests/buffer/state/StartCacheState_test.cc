#include "buffer/state/StartCacheState.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "LogCapture.h"
#include "buffer/state/FakeStreamBuffer.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

nal_access::NalUnit nalUnit(unsigned char byte) {
    nal_access::NalUnit nal;
    nal.reserved = 77;
    nal.size = 1;
    nal.data =
        std::shared_ptr<unsigned char>(new unsigned char[1]{byte}, std::default_delete<unsigned char[]>());
    return nal;
}

class StartCacheStateTest : public ::testing::Test {
 protected:
    FakeStreamBuffer buffer;
    nal_access::NalUnit sps = nalUnit(1);
    nal_access::NalUnit pps = nalUnit(2);
    std::shared_ptr<StreamData> idr = stream_units::VideoUnit(0, 90000, 1000, stream_units::kIdr);
    StartCacheState state{&buffer, sps, pps, idr};
};

TEST_F(StartCacheStateTest, HandsParameterSetsAndIdrFrameToTheBufferOnEntry) {
    EXPECT_EQ(state.GetName(), "start");
    EXPECT_EQ(state.GetId(), kStartState);
    EXPECT_THAT(buffer.calls, IsEmpty());
    state.OnEnter();
    EXPECT_THAT(buffer.calls, ElementsAre("SetVideoSequenceHeader"));
    EXPECT_EQ(buffer.lastSps.data, sps.data);
    EXPECT_EQ(buffer.lastSps.size, 1u);
    EXPECT_EQ(buffer.lastSps.reserved, 77u);
    EXPECT_EQ(buffer.lastPps.data, pps.data);
    EXPECT_EQ(buffer.lastUnit, idr);
    state.OnExit();
    EXPECT_THAT(buffer.calls, ElementsAre("SetVideoSequenceHeader"));
}

TEST_F(StartCacheStateTest, QueuesUnitsOfEveryMediumInOrder) {
    LogCapture log;
    auto queue = std::make_shared<StreamQueue>(20, false);
    const std::shared_ptr<StreamData> units[] = {stream_units::VideoUnit(1, 93600, 1040),
                                                 stream_units::AudioUnit(0, 48000, 1000),
                                                 stream_units::MetaUnit(0, 90000, 1000)};
    EXPECT_EQ(state.Execute(units[0], queue, "video"), nullptr);
    EXPECT_EQ(state.Execute(units[1], queue, "audio"), nullptr);
    EXPECT_EQ(state.Execute(units[2], queue, "meta"), nullptr);
    for (const auto& unit : units) {
        EXPECT_EQ(queue->queue.Pop(), unit);
    }
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST_F(StartCacheStateTest, DropsTheUnitWithoutAQueue) {
    std::shared_ptr<StreamQueue> none;
    EXPECT_EQ(state.Execute(idr, none, "video"), nullptr);
}

TEST_F(StartCacheStateTest, CannotFinish) {
    StreamQueue queue(20, false);
    EXPECT_FALSE(state.CanFinish(queue.queue));
}

}  // namespace
}  // namespace clipfileModule
