#include "controller/Mp4FileOutput.h"

#include <gtest/gtest.h>

#include <memory>

#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

TEST(Mp4FileOutput, GetModuleIntervalGives10000BeforeDuringAndAfterALife) {
    FakeRegistry registry;
    registry.Set("MP4OutputPath", "a");
    FakeHost host;
    Mp4FileOutput module;
    const auto interval = [&] {
        unsigned int value = 0;
        EXPECT_TRUE(module.GetModuleInterval(&value));
        return value;
    };
    EXPECT_EQ(interval(), 10000U);
    ASSERT_TRUE(module.Initialize(&host));
    EXPECT_EQ(interval(), 10000U);
    EXPECT_TRUE(module.Uninitialize());
    EXPECT_EQ(interval(), 10000U);
}

TEST(Mp4FileOutput, ReservedOperationsGiveTheirConstants) {
    Mp4FileOutput module;
    EXPECT_TRUE(module.ReservedOperationA());
    EXPECT_TRUE(module.ReservedOperationB());
    EXPECT_EQ(module.ReservedOperationC(), 0);
}

TEST(Mp4FileOutput, GivesTheSameInterfacesEveryTime) {
    Mp4FileOutput module;
    QxModuleStreamInterface* stream = nullptr;
    QxModuleNotifyInterface* notify = nullptr;
    ASSERT_TRUE(module.GetStreamInterface(&stream));
    ASSERT_TRUE(module.GetNotifyInterface(&notify));
    ASSERT_NE(stream, nullptr);
    ASSERT_NE(notify, nullptr);
    QxModuleStreamInterface* streamAgain = nullptr;
    QxModuleNotifyInterface* notifyAgain = nullptr;
    EXPECT_TRUE(module.GetStreamInterface(&streamAgain));
    EXPECT_TRUE(module.GetNotifyInterface(&notifyAgain));
    EXPECT_EQ(streamAgain, stream);
    EXPECT_EQ(notifyAgain, notify);
}

TEST(Mp4FileOutput, InitializeGivesTheControllersResult) {
    FakeRegistry registry;
    FakeHost host;
    Mp4FileOutput module;
    EXPECT_FALSE(module.Initialize(&host));
    EXPECT_EQ(host.GetStatus(), 7);
}

TEST(Mp4FileOutput, ExecutePostsStandbyAndReturnsTrue) {
    FakeRegistry registry;
    registry.Set("MP4OutputPath", "a");
    FakeHost host;
    Mp4FileOutput module;
    ASSERT_TRUE(module.Initialize(&host));
    EXPECT_TRUE(waitUntil([&] {
        EXPECT_TRUE(module.Execute());
        return !host.Transmissions().empty();
    }));
    EXPECT_EQ(host.Transmissions()[0], (FakeHost::StatusMap{{"file_output_status", "standby"}}));
    EXPECT_TRUE(module.Uninitialize());
}

TEST(Mp4FileOutput, NotificationsReachTheController) {
    FakeRegistry registry;
    registry.Set("MP4OutputPath", "a");
    FakeHost host;
    host.texts["-outputMode"] = "off";
    Mp4FileOutput module;
    ASSERT_TRUE(module.Initialize(&host));
    QxModuleNotifyInterface* notify = nullptr;
    ASSERT_TRUE(module.GetNotifyInterface(&notify));
    notify->NotifyOnlineStatus();
    notify->NotifyOfflineStatus();
    EXPECT_EQ(host.Statuses(), (std::vector<FakeHost::Status>{{4, 0}, {6, 26}, {3, 0}}));
    EXPECT_TRUE(module.Uninitialize());
}

}  // namespace
}  // namespace clipfileModule
