#include "module/Host.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(Host, GivesStartParametersAndDefaultsForTheOthers) {
    Host host({{{"-filePrefix", "CAM1"}}, {{"-encodedWidth", 1920}}});
    std::string text;
    host.GetParameter("-filePrefix", text, "Unknown-Model");
    EXPECT_EQ(text, "CAM1");
    host.GetParameter("-outputPath", text, "none");
    EXPECT_EQ(text, "none");
    int number = 0;
    host.GetParameter("-encodedWidth", number, 1280);
    EXPECT_EQ(number, 1920);
    host.GetParameter("-encodedHeight", number, 720);
    EXPECT_EQ(number, 720);
}

TEST(Host, KeepsTheStatusLastSetAndEachOneBeforeUntilItIsTaken) {
    Host host({});
    EXPECT_EQ(host.GetStatus(), 0);
    host.SetStatus(4, 0);
    host.SetStatus(6, 22);
    EXPECT_EQ(host.GetStatus(), 6);
    EXPECT_EQ(host.Status(), (ModuleStatus{6, 22}));
    EXPECT_FALSE(host.Failed());
    EXPECT_THAT(host.TakeStatuses(), ElementsAre(ModuleStatus{4, 0}, ModuleStatus{6, 22}));
    EXPECT_THAT(host.TakeStatuses(), IsEmpty());
    EXPECT_EQ(host.GetStatus(), 6);
}

TEST(Host, StatusSevenIsTheFailure) {
    Host host({});
    host.SetStatus(7, 27);
    EXPECT_TRUE(host.Failed());
    EXPECT_EQ(host.GetStatus(), 7);
}

TEST(Host, TheStatusMapTellsWhetherAFileIsWritten) {
    Host host({});
    EXPECT_FALSE(host.Writing());
    EXPECT_FALSE(host.WaitForMap(std::chrono::milliseconds(0)));
    EXPECT_EQ(host.SendTransmissionStatus({{"file_output_status", "output"}}), 0);
    EXPECT_TRUE(host.WaitForMap(std::chrono::milliseconds(0)));
    EXPECT_TRUE(host.Writing());
    EXPECT_EQ(host.SendTransmissionStatus({{"file_output_status", "standby"}}), 0);
    EXPECT_FALSE(host.Writing());
}

TEST(Host, IsCalledFromSeveralThreadsAtOnce) {
    Host host({});
    std::vector<std::thread> threads;
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&host] {
            for (int i = 0; i < 200; ++i) {
                host.SetStatus(4, 0);
                host.SendTransmissionStatus({{"file_output_status", "output"}});
                EXPECT_EQ(host.GetStatus(), 4);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(host.TakeStatuses().size(), 800u);
}

}  // namespace
}  // namespace receiver
