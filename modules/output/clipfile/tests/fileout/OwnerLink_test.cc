#include "fileout/OwnerLink.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <future>
#include <memory>
#include <thread>

#include "support/ControllerRecorder.h"
#include "support/FileOutputHarness.h"

namespace clipfileModule {
namespace {

using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(OwnerLink, PassesCallsAndResultsUntilItIsCut) {
    ControllerRecorder controller;
    TimecodeBuffer buffer;
    OwnerLink link(&controller, &buffer);
    unsigned char timecode[4] = {};
    bool dropFrame = false;
    buffer.SetResults(true, true, true);

    link.SetStatus(7, 26);
    link.PostEvent(std::make_shared<TerminateEvent>());
    EXPECT_TRUE(link.MakeFileTimecode(MakeChunk(4)));
    EXPECT_TRUE(link.GetFileTimecode(timecode, &dropFrame));
    EXPECT_THAT(timecode, ElementsAre(1, 2, 3, 4));
    EXPECT_TRUE(dropFrame);
    EXPECT_TRUE(link.GetFileTimecode(timecode));
    EXPECT_FALSE(link.IsCut());
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 26", "post 7"));
    EXPECT_THAT(buffer.Calls(),
                ElementsAre("MakeFileTimecode 4", "GetFileTimecode with flag", "GetFileTimecode"));
}

TEST(OwnerLink, PassesNothingOnceItIsCut) {
    auto controller = std::make_unique<ControllerRecorder>();
    auto buffer = std::make_unique<TimecodeBuffer>();
    OwnerLink link(controller.get(), buffer.get());
    EXPECT_TRUE(link.Cut(milliseconds(0)));
    EXPECT_TRUE(link.IsCut());
    EXPECT_THAT(controller->Calls(), IsEmpty());
    controller.reset();
    buffer.reset();

    unsigned char timecode[4] = {9, 9, 9, 9};
    bool dropFrame = false;
    link.SetStatus(7, 26);
    link.PostEvent(std::make_shared<TerminateEvent>());
    EXPECT_FALSE(link.MakeFileTimecode(MakeChunk(4)));
    EXPECT_FALSE(link.GetFileTimecode(timecode, &dropFrame));
    EXPECT_FALSE(link.GetFileTimecode(timecode));
    EXPECT_THAT(timecode, ElementsAre(9, 9, 9, 9));
}

/// A controller that holds a call of `SetStatus`.
class HoldingController : public ControllerRecorder {
 public:
    void SetStatus(int status, int cause) override {
        entered.set_value();
        release.get_future().wait();
        ControllerRecorder::SetStatus(status, cause);
    }
    std::promise<void> entered;
    std::promise<void> release;
};

TEST(OwnerLink, CutWaitsForACallThatHasBegun) {
    HoldingController controller;
    TimecodeBuffer buffer;
    OwnerLink link(&controller, &buffer);
    std::thread caller([&] { link.SetStatus(7, 26); });
    controller.entered.get_future().wait();
    std::thread cutter([&] { EXPECT_TRUE(link.Cut(std::chrono::seconds(30))); });
    while (!link.IsCut()) {
        std::this_thread::yield();
    }
    EXPECT_THAT(controller.Calls(), IsEmpty());
    controller.release.set_value();
    cutter.join();
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 26"));
    caller.join();
}

TEST(OwnerLink, CutDoesNotWaitForEverForACallThatAHostHolds) {
    HoldingController controller;
    TimecodeBuffer buffer;
    OwnerLink link(&controller, &buffer);
    std::thread caller([&] { link.SetStatus(7, 26); });
    controller.entered.get_future().wait();
    EXPECT_FALSE(link.Cut(milliseconds(1)));
    EXPECT_TRUE(link.IsCut());
    controller.release.set_value();
    caller.join();
    link.SetStatus(7, 27);
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 26"));
}

}  // namespace
}  // namespace clipfileModule
