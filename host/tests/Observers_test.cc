#include "Observers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <nlohmann/json.hpp>

#include "fakes/FakeDisplay.h"
#include "fakes/FakeSource.h"
#include "support/LineClient.h"
#include "support/TemporaryFolder.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

class ObserversTest : public ::testing::Test {
 protected:
    endtoend::TemporaryFolder folder_;
    Options options_;
    FakeDisplay display_;
    const std::shared_ptr<CommandQueue> commands_ = std::make_shared<CommandQueue>();
    Observers observers_{display_};
};

TEST_F(ObserversTest, WithoutOptionsTheDisplayAloneIsTold) {
    observers_.Start(options_, commands_);
    observers_.Describe({});
    observers_.LookAt(MakeFrame(0, true, 0));
    observers_.Display().Notice("a");
    observers_.Follow();
    observers_.Settle();
    observers_.End();
    EXPECT_THAT(display_.notices, ElementsAre("a"));
    EXPECT_EQ(observers_.Hooked().delivered, 0u);
}

TEST_F(ObserversTest, AClientOfTheSocketIsToldToo) {
    options_.control = (folder_.Path() / "a.sock").string();
    observers_.Start(options_, commands_);
    LineClient client(*options_.control);
    client.Send("{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"events\"}\n");
    EXPECT_NE(client.Line(), std::nullopt);
    observers_.Display().Notice("a");
    EXPECT_EQ(nlohmann::json::parse(client.Line().value_or("null"))["params"]["text"], "a");
    EXPECT_THAT(display_.notices, ElementsAre("a"));
    observers_.End();
    EXPECT_FALSE(std::filesystem::exists(*options_.control));
}

TEST_F(ObserversTest, WhatBecomesOfAHookIsToldToTheOperator) {
    options_.hook = "/nowhere/hook";
    observers_.Start(options_, commands_);
    observers_.Display().FileClosed("/srv/a.MP4");
    observers_.Settle();
    EXPECT_THAT(display_.notices, ElementsAre(HasSubstr("hook /nowhere/hook was not told of file_closed")));
    EXPECT_EQ(observers_.Hooked().failed, 1u);
    // A failure comes behind the end of the files.
    observers_.Display().Failure(ExitCode::kOutput, "no disk.");
    observers_.End();
    EXPECT_THAT(display_.notices, ElementsAre(HasSubstr("file_closed"), HasSubstr("failure")));
}

}  // namespace
}  // namespace receiver
