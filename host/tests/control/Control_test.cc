#include "control/Control.h"

#include <gtest/gtest.h>

#include <condition_variable>
#include <filesystem>
#include <mutex>
#include <nlohmann/json.hpp>

#include "display/DisplayGroup.h"
#include "fakes/FakeSource.h"
#include "support/LineClient.h"
#include "support/TemporaryFolder.h"
#include "support/WaitUntil.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

class ControlTest : public ::testing::Test {
 protected:
    std::string Path() const { return (folder_.Path() / "a.sock").string(); }
    static Json Ask(LineClient& client, const std::string& method) {
        client.Send(R"({"jsonrpc":"2.0","id":1,"method":")" + method + "\"}\n");
        return Json::parse(client.Line().value_or("null"));
    }

    endtoend::TemporaryFolder folder_;
    const std::shared_ptr<CommandQueue> commands_ = std::make_shared<CommandQueue>();
};

TEST_F(ControlTest, ServesARunFromBeginningToEnd) {
    Control control(Path(), commands_, SizeOnDisk);
    DisplayGroup group;
    for (DisplayInterface* const display : control.Displays()) {
        group.Add(*display);
    }
    LineClient client(Path());
    EXPECT_EQ(Ask(client, "status")["result"]["state"], "waiting_for_source");
    control.Describe({});
    EXPECT_EQ(Ask(client, "status")["result"]["state"], "idle");
    EXPECT_EQ(Ask(client, "events")["result"], Json::object());
    group.RecordStarted({10, 0, 0, 0, false});
    EXPECT_EQ(Json::parse(client.Line().value_or("null"))["params"]["event"], "record_started");
    // The run's state is there before its event.
    EXPECT_EQ(Ask(client, "status")["result"]["state"], "recording");
    group.Finish({});
    commands_->Close("the run is over");
    control.End();
    EXPECT_EQ(Json::parse(client.Line().value_or("null"))["params"]["event"], "summary");
    EXPECT_EQ(client.Line(), std::nullopt);
    EXPECT_TRUE(client.Closed());
    EXPECT_FALSE(std::filesystem::exists(Path()));
}

TEST_F(ControlTest, AnAnswerWaitsForItsCommandWhileOthersAreServed) {
    Control control(Path(), commands_, SizeOnDisk);
    control.Describe({});
    LineClient one(Path());
    LineClient other(Path());
    one.Send("{\"jsonrpc\":\"2.0\",\"id\":7,\"method\":\"record.start\"}\n");
    EXPECT_EQ(Ask(other, "status")["result"]["state"], "idle");
    commands_->Close("the run is over");
    EXPECT_EQ(Json::parse(one.Line().value_or("null"))["id"], 7);
    control.End();
}

TEST_F(ControlTest, ADiskThatHangsHoldsUpNeitherTheRunNorItsEnd) {
    // Shared: the thread is left to itself.
    struct Gate {
        std::mutex mutex;
        std::condition_variable changed;
        bool reached = false;
        bool open = false;
    };
    const auto gate = std::make_shared<Gate>();
    const FileSizer hangs = [gate](const std::string&) -> std::optional<std::uint64_t> {
        std::unique_lock lock(gate->mutex);
        gate->reached = true;
        gate->changed.notify_all();
        gate->changed.wait(lock, [&] { return gate->open; });
        return std::nullopt;
    };
    {
        Control control(Path(), commands_, hangs);
        control.Describe({});
        DisplayInterface& state = *control.Displays().front();
        state.FileOpened("/srv/10_00_00_00.MP4");
        const LineClient client(Path());
        client.Send("{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"files\"}\n");
        std::unique_lock lock(gate->mutex);
        gate->changed.wait(lock, [&] { return gate->reached; });
        lock.unlock();
        state.FileClosed("/srv/10_00_00_00.MP4");
        control.LookAt(MakeFrame(0, true, 0));
        control.End(std::chrono::milliseconds(1));
        EXPECT_FALSE(std::filesystem::exists(Path()));
    }
    {
        const std::lock_guard lock(gate->mutex);
        gate->open = true;
        gate->changed.notify_all();
    }
    // The thread gives up all that it has when it ends: `gate` and `hangs` are what is left.
    EXPECT_TRUE(WaitUntil([&] { return gate.use_count() == 2; }));
}

TEST_F(ControlTest, AFaultIsToldAndEndsAllConnections) {
    struct NoException {};
    const FileSizer fails = [](const std::string&) -> std::optional<std::uint64_t> { throw NoException(); };
    Control control(Path(), commands_, fails);
    control.Describe({});
    control.Displays().front()->FileOpened("/srv/10_00_00_00.MP4");
    LineClient client(Path());
    LineClient other(Path());
    client.Send("{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"files\"}\n");
    EXPECT_EQ(client.Line(), std::nullopt);
    EXPECT_EQ(other.Line(), std::nullopt);
    EXPECT_TRUE(other.Closed());
    std::optional<std::string> fault;
    EXPECT_TRUE(WaitUntil([&] {
        fault = control.TakeFault();
        return fault.has_value();
    }));
    EXPECT_EQ(fault, "the control socket serves nobody any more: an error without words");
    EXPECT_EQ(control.TakeFault(), std::nullopt);
    EXPECT_THROW(LineClient{Path()}, std::system_error);
    control.End();
}

}  // namespace
}  // namespace receiver
