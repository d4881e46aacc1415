#include "message_handler/QxMessageHandler.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "support/ControllerRecorder.h"

namespace clipfileModule {
namespace {

class QxMessageHandlerTest : public testing::Test {
 protected:
    /// Texts logged since the last call, each checked for priority and place.
    std::vector<std::string> TakeLog(const std::string& function) {
        std::vector<std::string> texts;
        for (const CapturedLine& line : log_.Lines()) {
            EXPECT_EQ(line.priority, LOG_PRIORITY_TRACE) << line;
            EXPECT_EQ(line.file,
                      "modules/output/clipfile/src/clipfileModule/message_handler/QxMessageHandler.cc")
                << line;
            EXPECT_EQ(line.function, "clipfileModule::QxMessageHandler::" + function) << line;
            texts.push_back(line.text);
        }
        log_.Clear();
        return texts;
    }
    /// What the handler asked of its controller since the last call.
    std::vector<std::string> TakeCalls() {
        std::vector<std::string> calls = controller_.Calls();
        calls.erase(calls.begin(), calls.begin() + static_cast<std::ptrdiff_t>(taken_));
        taken_ += calls.size();
        return calls;
    }
    /// The settings that the event `index` carries.
    const OutputSettings& Posted(std::size_t index) {
        events_ = controller_.Events();
        EXPECT_EQ(events_.at(index)->id, 1);
        return std::static_pointer_cast<ChangeInStreamInfoEvent>(events_.at(index))->settings;
    }
    std::uint32_t Disconnect(std::uint32_t kind) {
        QxInputOutputDisconnectionRequest request;
        request.connectionKind = kind;
        return handler_.NotifyInputOutputDisconnectionRequest(&request);
    }

    using Texts = std::vector<std::string>;

    LogCapture log_;
    ControllerRecorder controller_;
    QxMessageHandler handler_{&controller_};

 private:
    std::size_t taken_ = 0;
    std::vector<std::shared_ptr<Event>> events_;
};

TEST_F(QxMessageHandlerTest, TheFirstOnlineStartsBuffering) {
    handler_.NotifyOnlineStatus();
    EXPECT_EQ(TakeCalls(), Texts{"BufferingStart"});
    ASSERT_EQ(log_.Lines().size(), 2U);
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::QxMessageHandler::NotifyOnlineStatus",
                              "notify online."));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::QxMessageHandler::startFileOutput",
                              "start file output."));
}

TEST_F(QxMessageHandlerTest, ASecondOnlineDoesNothing) {
    handler_.NotifyOnlineStatus();
    TakeCalls();
    log_.Clear();
    handler_.NotifyOnlineStatus();
    EXPECT_TRUE(TakeCalls().empty());
    EXPECT_TRUE(log_.Lines().empty());
}

TEST_F(QxMessageHandlerTest, OfflineBeforeAnyOnlineDoesNothing) {
    handler_.NotifyOfflineStatus();
    EXPECT_TRUE(TakeCalls().empty());
    EXPECT_TRUE(log_.Lines().empty());
}

TEST_F(QxMessageHandlerTest, OfflineSetsStatus6Cause26AndThenStopsBuffering) {
    handler_.NotifyOnlineStatus();
    TakeCalls();
    log_.Clear();
    handler_.NotifyOfflineStatus();
    EXPECT_EQ(TakeCalls(), (Texts{"status 6 26", "BufferingStop"}));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::QxMessageHandler::NotifyOfflineStatus",
                              "notify offline."));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::QxMessageHandler::stopFileOutput",
                              "stop file output."));
}

TEST_F(QxMessageHandlerTest, OnlineAfterADisconnectDoesNothingSinceOnlineStayedTrue) {
    handler_.NotifyOnlineStatus();
    TakeCalls();
    EXPECT_EQ(Disconnect(1), 0U);
    EXPECT_EQ(TakeCalls(), Texts{"BufferingStop"});
    handler_.NotifyOnlineStatus();
    EXPECT_TRUE(TakeCalls().empty());
}

TEST_F(QxMessageHandlerTest, OfflineAndOnlineAfterADisconnectStartOutputAgain) {
    handler_.NotifyOnlineStatus();
    Disconnect(1);
    TakeCalls();
    handler_.NotifyOfflineStatus();
    // Output had stopped already: only `online` is cleared.
    EXPECT_TRUE(TakeCalls().empty());
    handler_.NotifyOnlineStatus();
    EXPECT_EQ(TakeCalls(), Texts{"BufferingStart"});
}

TEST_F(QxMessageHandlerTest, ADisconnectOfKind1WithOutputNotStartedGives0AndStopsNothing) {
    EXPECT_EQ(Disconnect(1), 0U);
    EXPECT_TRUE(TakeCalls().empty());
    EXPECT_EQ(TakeLog("NotifyInputOutputDisconnectionRequest"),
              (Texts{"start.", "notify disconnect received.", "end. result = 0."}));
}

TEST_F(QxMessageHandlerTest, ADisconnectOfAnotherKindGives3AndOutputKeepsRunning) {
    handler_.NotifyOnlineStatus();
    TakeCalls();
    log_.Clear();
    for (const std::uint32_t kind : {0U, 2U, 0xFFFFFFFFU}) {
        EXPECT_EQ(Disconnect(kind), 3U);
        EXPECT_TRUE(TakeCalls().empty());
        EXPECT_EQ(TakeLog("NotifyInputOutputDisconnectionRequest"),
                  (Texts{"start.", "notify disconnect received.", "end. result = 3."}));
    }
    handler_.NotifyOfflineStatus();
    EXPECT_EQ(TakeCalls(), (Texts{"status 6 26", "BufferingStop"}));
}

TEST_F(QxMessageHandlerTest, ConnectHalvesThreeRatesAndLeavesAllOthersAlone) {
    struct Case {
        std::uint32_t input;
        std::uint32_t file;
    };
    const Case cases[] = {{50000, 25000}, {59940, 29970}, {60000, 30000}, {23980, 23980}, {24000, 24000},
                          {25000, 25000}, {29970, 29970}, {30000, 30000}, {0, 0},         {12345, 12345}};
    std::size_t posted = 0;
    for (const Case& c : cases) {
        QxInputOutputConnectRequest request;
        request.framerate = c.input;
        EXPECT_EQ(handler_.NotifyInputOutputConnectRequest(&request), 0U);
        EXPECT_EQ(Posted(posted++).framerate, c.file) << c.input;
    }
}

TEST_F(QxMessageHandlerTest, ConnectLogsTheUnmappedRateAndPostsTheInputsDescription) {
    QxInputOutputConnectRequest request;
    request.framerate = 59940;
    request.bitrate = 60000;
    request.width = 1920;
    request.height = 1080;
    request.properties["filePrefix"] = "CAM1";
    request.properties["other"] = "ignored";
    EXPECT_EQ(handler_.NotifyInputOutputConnectRequest(&request), 0U);
    EXPECT_EQ(TakeLog("NotifyInputOutputConnectRequest"),
              (Texts{"start.", "notify input output connect request received.", "framerate : 59940.",
                     "bitrate   : 60000.", "width     : 1920.", "height    : 1080.", "end. result = 0."}));
    EXPECT_EQ(TakeCalls(), Texts{"post 1"});
    const OutputSettings& settings = Posted(0);
    EXPECT_EQ(settings.framerate, 29970U);
    EXPECT_EQ(settings.bitrate, 60000U);
    EXPECT_EQ(settings.width, 1920U);
    EXPECT_EQ(settings.height, 1080U);
    EXPECT_EQ(settings.filePrefix, "CAM1");
    EXPECT_EQ(settings.outputPath, "");
}

TEST_F(QxMessageHandlerTest, APrefixLivesOnInConnectionsThatBringNone) {
    QxInputOutputConnectRequest request;
    request.properties["filePrefix"] = "CAM1";
    handler_.NotifyInputOutputConnectRequest(&request);
    request.properties.clear();
    handler_.NotifyInputOutputConnectRequest(&request);
    EXPECT_EQ(Posted(1).filePrefix, "CAM1");
    request.properties["filePrefix"] = "";
    handler_.NotifyInputOutputConnectRequest(&request);
    EXPECT_EQ(Posted(2).filePrefix, "");
}

TEST_F(QxMessageHandlerTest, AConnectionReplyIsOnlyLogged) {
    EXPECT_EQ(handler_.NotifyModuleConnectionRequestReply(nullptr), 0U);
    EXPECT_EQ(TakeLog("NotifyModuleConnectionRequestReply"),
              (Texts{"start.", "notify module connection request reply.", "end. result = 0."}));
    EXPECT_TRUE(TakeCalls().empty());
}

TEST_F(QxMessageHandlerTest, ASetPropertiesRequestIsOnlyLogged) {
    EXPECT_EQ(handler_.NotifySetPropertiesRequest(nullptr), 0U);
    EXPECT_EQ(TakeLog("NotifySetPropertiesRequest"), (Texts{"start.", "end. result = 0."}));
    EXPECT_TRUE(TakeCalls().empty());
}

/// A controller that cannot stop a recording, or that runs no more.
class TroubledController : public ControllerRecorder {
 public:
    bool throws = false;
    bool running = true;

    void BufferingStop() override {
        ControllerRecorder::BufferingStop();
        if (throws) {
            throw std::system_error(std::make_error_code(std::errc::resource_deadlock_would_occur));
        }
    }
    bool IsRunning() const override { return running; }
};

class QxMessageHandlerTroubleTest : public testing::Test {
 protected:
    using Texts = std::vector<std::string>;

    LogCapture log_;
    TroubledController controller_;
    QxMessageHandler handler_{&controller_};
};

TEST_F(QxMessageHandlerTroubleTest, AStopThatThrowsLeavesTheHandlerReadyForTheNextStart) {
    handler_.NotifyOnlineStatus();
    controller_.throws = true;
    EXPECT_THROW(handler_.NotifyOfflineStatus(), std::system_error);
    controller_.throws = false;
    handler_.NotifyOnlineStatus();
    handler_.NotifyOfflineStatus();
    EXPECT_EQ(controller_.Calls(), (Texts{"BufferingStart", "status 6 26", "BufferingStop", "BufferingStart",
                                          "status 6 26", "BufferingStop"}));
}

TEST_F(QxMessageHandlerTroubleTest, ADisconnectThatThrowsLeavesTheOutputStopped) {
    handler_.NotifyOnlineStatus();
    controller_.throws = true;
    QxInputOutputDisconnectionRequest request;
    request.connectionKind = 1;
    EXPECT_THROW(handler_.NotifyInputOutputDisconnectionRequest(&request), std::system_error);
    EXPECT_EQ(handler_.NotifyInputOutputDisconnectionRequest(&request), 0U);
    EXPECT_EQ(controller_.Calls(), (Texts{"BufferingStart", "BufferingStop"}));
}

TEST_F(QxMessageHandlerTroubleTest, OutsideALifeEachNotificationIsOneLineAndNothingElse) {
    controller_.running = false;
    const QxInputOutputConnectRequest connect;
    QxInputOutputDisconnectionRequest disconnect;
    disconnect.connectionKind = 1;
    const std::vector<std::pair<std::string, std::function<void()>>> notifications = {
        {"NotifyInputOutputConnectRequest",
         [&] { EXPECT_EQ(handler_.NotifyInputOutputConnectRequest(&connect), 3U); }},
        {"NotifyModuleConnectionRequestReply",
         [&] { EXPECT_EQ(handler_.NotifyModuleConnectionRequestReply(nullptr), 3U); }},
        {"NotifyInputOutputDisconnectionRequest",
         [&] { EXPECT_EQ(handler_.NotifyInputOutputDisconnectionRequest(&disconnect), 3U); }},
        {"NotifySetPropertiesRequest", [&] { EXPECT_EQ(handler_.NotifySetPropertiesRequest(nullptr), 3U); }},
        {"NotifyOnlineStatus", [&] { handler_.NotifyOnlineStatus(); }},
        {"NotifyOfflineStatus", [&] { handler_.NotifyOfflineStatus(); }},
    };
    for (const auto& [name, notify] : notifications) {
        log_.Clear();
        notify();
        const auto lines = log_.Lines();
        ASSERT_EQ(lines.size(), 1U) << name;
        EXPECT_EQ(lines[0].priority, LOG_PRIORITY_WARNING) << name;
        EXPECT_EQ(lines[0].text, name + " is called without initialize.");
    }
    EXPECT_TRUE(controller_.Calls().empty());
    // The online state of before counts.
    controller_.running = true;
    handler_.NotifyOnlineStatus();
    EXPECT_EQ(controller_.Calls(), Texts{"BufferingStart"});
}

}  // namespace
}  // namespace clipfileModule
