#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "controller/Controller.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/LogLines.h"
#include "support/SchedulePoints.h"
#include "support/SettleEventLoop.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

const std::string kFile = "modules/output/clipfile/src/clipfileModule/controller/ControllerEvents.cc";

std::shared_ptr<Event> makeStatusEvent(const std::string& value) {
    return std::make_shared<TransferStatusNotifyEvent>(FakeHost::StatusMap{{"file_output_status", value}});
}

/// A running controller whose event thread stands in its wait.
class ControllerEventsTest : public testing::Test {
 protected:
    ControllerEventsTest() { registry_.Set("MP4OutputPath", "a"); }

    void SetUp() override {
        ASSERT_TRUE(controller_.Initialize(&host_));
        ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
        log_.Clear();
        first_ = host_.Transmissions().size();
    }
    void TearDown() override { controller_.Uninitialize(); }

    /// The values of the status maps that came since the set-up.
    std::vector<std::string> Values() {
        std::vector<std::string> values;
        const auto transmissions = host_.Transmissions();
        for (std::size_t i = first_; i < transmissions.size(); ++i) {
            values.push_back(transmissions[i].at("file_output_status"));
        }
        return values;
    }
    bool WaitForValues(std::size_t count) { return host_.WaitForTransmissions(first_ + count); }

    std::size_t first_ = 0;
    LogCapture log_;
    FakeRegistry registry_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
};

TEST_F(ControllerEventsTest, ExecutePostsStandby) {
    controller_.Execute();
    ASSERT_TRUE(WaitForValues(1));
    EXPECT_EQ(Values(), std::vector<std::string>{"standby"});
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("Execute").c_str(), "start."));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("Execute").c_str(), "end."));
}

TEST_F(ControllerEventsTest, APostIsLoggedOnBothSides) {
    controller_.PostEvent(makeStatusEvent("x"));
    ASSERT_TRUE(log_.WaitForText("end. no event."));
    for (const char* text : {"start. event_id = 6.", "end."}) {
        EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("PostEvent").c_str(), text)) << text;
    }
    std::vector<std::string> loop;
    for (const CapturedLine& line : log_.Lines()) {
        EXPECT_EQ(line.priority, LOG_PRIORITY_TRACE) << line;
        EXPECT_EQ(line.file, kFile) << line;
        // The loop itself may pass once more, for a signal of the set-up that came late.
        if (line.function != controllerFunction("PostEvent") &&
            line.function != controllerFunction("EventLoop")) {
            loop.push_back(line.function->substr(controllerFunction("").size()) + " " + line.text);
        }
    }
    EXPECT_EQ(loop, (std::vector<std::string>{"getEvent start.", "getEvent event id = 6.", "getEvent end.",
                                              "dispatchEvent start.", "OnTransferStatusNotify start.",
                                              "OnTransferStatusNotify end.", "dispatchEvent end.",
                                              "getEvent start.", "getEvent end. no event."}));
}

TEST_F(ControllerEventsTest, EventsRunInOrderOfArrival) {
    for (int i = 0; i < 100; ++i) {
        controller_.PostEvent(makeStatusEvent(std::to_string(i)));
    }
    ASSERT_TRUE(WaitForValues(100));
    const std::vector<std::string> values = Values();
    for (int i = 0; i < 100; ++i) {
        EXPECT_EQ(values[static_cast<std::size_t>(i)], std::to_string(i));
    }
}

TEST_F(ControllerEventsTest, SendEventGoesAheadOfAllThatWaitAndTwoOfThemRunInReverseOrder) {
    auto gate = log_.BlockAt([](const CapturedLine& line) {
        return line.function == controllerFunction("OnTransferStatusNotify");
    });
    controller_.PostEvent(makeStatusEvent("running"));
    ASSERT_TRUE(gate.WaitReached());
    controller_.PostEvent(makeStatusEvent("posted 1"));
    controller_.PostEvent(makeStatusEvent("posted 2"));
    controller_.SendEvent(makeStatusEvent("sent 1"));
    controller_.SendEvent(makeStatusEvent("sent 2"));
    gate.Release();
    ASSERT_TRUE(WaitForValues(5));
    EXPECT_EQ(Values(), (std::vector<std::string>{"running", "sent 2", "sent 1", "posted 1", "posted 2"}));
    EXPECT_EQ(log_.Count(LOG_PRIORITY_TRACE, controllerFunction("SendEvent").c_str(), "start. event_id = 6."),
              2U);
    EXPECT_EQ(log_.Count(LOG_PRIORITY_TRACE, controllerFunction("SendEvent").c_str(), "end."), 2U);
}

TEST_F(ControllerEventsTest, APostDoesNotWaitForARunningHandler) {
    auto gate = log_.BlockAt([](const CapturedLine& line) {
        return line.function == controllerFunction("OnTransferStatusNotify");
    });
    controller_.PostEvent(makeStatusEvent("running"));
    ASSERT_TRUE(gate.WaitReached());
    // Both return while the handler is held.
    controller_.PostEvent(makeStatusEvent("posted"));
    controller_.SendEvent(makeStatusEvent("sent"));
    EXPECT_EQ(Values().size(), 0U);
    gate.Release();
    EXPECT_TRUE(WaitForValues(3));
}

TEST_F(ControllerEventsTest, AnEventWithId8IsInvalidAndDoesNotStopTheLoop) {
    controller_.PostEvent(std::make_shared<Event>(8));
    controller_.PostEvent(makeStatusEvent("after"));
    ASSERT_TRUE(WaitForValues(1));
    EXPECT_EQ(Values(), std::vector<std::string>{"after"});
    EXPECT_TRUE(
        log_.Contains(LOG_PRIORITY_WARNING, controllerFunction("dispatchEvent").c_str(), "invalid event."));
}

TEST_F(ControllerEventsTest, AStatusThatTheHostRefusesIsLoggedAndNotSentAgain) {
    host_.sendResult = 5;
    controller_.PostEvent(makeStatusEvent("refused"));
    ASSERT_TRUE(log_.WaitForText("SendTransmissionStatus() failed. result = 5."));
    host_.sendResult = 0;
    controller_.PostEvent(makeStatusEvent("after"));
    ASSERT_TRUE(WaitForValues(2));
    EXPECT_EQ(Values(), (std::vector<std::string>{"refused", "after"}));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_ERROR, controllerFunction("OnTransferStatusNotify").c_str(),
                              "SendTransmissionStatus() failed. result = 5."));
}

TEST_F(ControllerEventsTest, ASignalWithoutAPostIsNoEvent) {
    // Nothing tells when the thread is inside its wait, so the signal is repeated until it meets it there.
    ASSERT_TRUE(waitUntil([&] {
        peer_.SignalEventLoop();
        return log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("EventLoop").c_str(), "no event.");
    }));
    controller_.PostEvent(makeStatusEvent("after"));
    EXPECT_TRUE(WaitForValues(1));
}

TEST_F(ControllerEventsTest, NoPostIsLostHoweverManyThreadsPost) {
    constexpr int kThreads = 4;
    constexpr int kPosts = 2500;
    std::vector<std::thread> posters;
    for (int t = 0; t < kThreads; ++t) {
        posters.emplace_back([&] {
            for (int i = 0; i < kPosts; ++i) {
                controller_.PostEvent(makeStatusEvent("x"));
            }
        });
    }
    for (std::thread& poster : posters) {
        poster.join();
    }
    EXPECT_TRUE(WaitForValues(kThreads * kPosts));
}

TEST_F(ControllerEventsTest, EachOfManySinglePostsWakesTheLoop) {
    for (std::size_t i = 1; i <= 10000; ++i) {
        controller_.PostEvent(makeStatusEvent("x"));
        ASSERT_TRUE(WaitForValues(i)) << i;
    }
}

TEST_F(ControllerEventsTest, APostBetweenTheLastTestOfTheQueueAndTheWaitIsNotLost) {
    auto gate = log_.BlockAtText("end. no event.");
    controller_.PostEvent(makeStatusEvent("drained"));
    ASSERT_TRUE(gate.WaitReached());
    // The event thread has seen an empty queue and has not come to its wait.
    controller_.PostEvent(makeStatusEvent("in between"));
    gate.Release();
    ASSERT_TRUE(WaitForValues(2));
    EXPECT_EQ(Values(), (std::vector<std::string>{"drained", "in between"}));
}

TEST_F(ControllerEventsTest, ATerminateEventThatRunsStopsBufferingAndEndsTheLoop) {
    controller_.PostEvent(std::make_shared<TerminateEvent>());
    ASSERT_TRUE(host_.WaitForStatus({3, 0}));
    ASSERT_TRUE(log_.WaitFor([](const auto& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.function == controllerFunction("EventLoop") && line.text == "end.";
        });
    }));
    for (const char* text : {"start.", "end."}) {
        EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("OnTerminate").c_str(), text))
            << text;
        EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("BufferingStop").c_str(), text))
            << text;
    }
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("BufferingStop").c_str(),
                              "stream buffering stop."));
}

TEST_F(ControllerEventsTest, TheDrainRunsWhatWaitsAlsoAfterTerminate) {
    auto gate = log_.BlockAt([](const CapturedLine& line) {
        return line.function == controllerFunction("OnTransferStatusNotify");
    });
    controller_.PostEvent(makeStatusEvent("running"));
    ASSERT_TRUE(gate.WaitReached());
    controller_.PostEvent(std::make_shared<TerminateEvent>());
    controller_.PostEvent(makeStatusEvent("behind the end"));
    gate.Release();
    ASSERT_TRUE(WaitForValues(2));
    EXPECT_EQ(Values(), (std::vector<std::string>{"running", "behind the end"}));
}

/// The test ends the controller itself.
class ControllerEndTest : public ControllerEventsTest {
 protected:
    void TearDown() override {}
};

TEST_F(ControllerEndTest, UninitializeEndsAThreadThatStandsBetweenItsLastTestAndTheWait) {
    auto gate = log_.BlockAtText("end. no event.");
    controller_.PostEvent(makeStatusEvent("drained"));
    ASSERT_TRUE(gate.WaitReached());
    std::thread ender([&] { controller_.Uninitialize(); });
    ASSERT_TRUE(log_.WaitForText("start join..."));
    gate.Release();
    ender.join();
    EXPECT_EQ(host_.Statuses().size(), 0U);
    EXPECT_EQ(peer_.WaitingEvents(), 0U);
}

/// The event thread is held before it reaches its first wait.
class ControllerFirstWaitTest : public testing::Test {
 protected:
    ControllerFirstWaitTest() { registry_.Set("MP4OutputPath", "a"); }

    LogCapture log_;
    FakeRegistry registry_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    LogCapture::Gate gate_ = log_.BlockAt([](const CapturedLine& line) {
        return line.function == controllerFunction("EventLoop") && line.text == "start.";
    });
};

TEST_F(ControllerFirstWaitTest, TheFirstExecuteBeforeTheWaitIsDeliveredOnlyAtTheNextPost) {
    const SchedulePoints points;
    ASSERT_TRUE(controller_.Initialize(&host_));
    ASSERT_TRUE(gate_.WaitReached());
    const auto eventThread = log_.FindIf(
        [](const CapturedLine& line) { return line.function == controllerFunction("EventLoop"); });
    controller_.Execute();
    gate_.Release();
    // In front of the lock, and in front of the wait; that the events can be counted means that the thread
    // has given the lock back and is inside.
    ASSERT_TRUE(points.WaitFor(eventThread->thread, 2));
    EXPECT_EQ(peer_.WaitingEvents(), 1U);
    EXPECT_EQ(log_.CountIf(
                  [](const CapturedLine& line) { return line.function == controllerFunction("getEvent"); }),
              0U);
    controller_.PostEvent(makeStatusEvent("next"));
    ASSERT_TRUE(host_.WaitForTransmissions(2));
    EXPECT_EQ(host_.Transmissions()[0].at("file_output_status"), "standby");
    EXPECT_EQ(host_.Transmissions()[1].at("file_output_status"), "next");
    controller_.Uninitialize();
}

TEST_F(ControllerFirstWaitTest, UninitializeEndsAThreadThatHasNotReachedItsWait) {
    ASSERT_TRUE(controller_.Initialize(&host_));
    ASSERT_TRUE(gate_.WaitReached());
    std::thread ender([&] { controller_.Uninitialize(); });
    ASSERT_TRUE(log_.WaitForText("start join..."));
    gate_.Release();
    ender.join();
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("EventLoop").c_str(), "terminate."));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, controllerFunction("EventLoop").c_str(), "end."));
    EXPECT_EQ(host_.Statuses().size(), 0U);
}

}  // namespace
}  // namespace clipfileModule
