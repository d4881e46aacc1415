#include "control/ControlService.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>

#include "fakes/FakeSource.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;
using ::testing::IsEmpty;
using ::testing::SizeIs;

/// Keeps what is sent.
class FakeSender final : public LineSenderInterface {
 public:
    void Send(ClientId client, const std::string& line) override {
        sent[client].push_back(Json::parse(line));
    }
    bool Tell(ClientId client, const std::string& line, const std::string& last) override {
        Send(client, full ? last : line);
        return !full;
    }

    std::map<ClientId, std::vector<Json>> sent;
    bool full = false;
};

class ControlServiceTest : public ::testing::Test {
 protected:
    Json Ask(const std::string& line) {
        service_.OnLine(1, line, sender_);
        const std::vector<Json> sent = std::exchange(sender_.sent[1], {});
        return sent.empty() ? Json(nullptr) : sent.back();
    }
    Json AskFor(const std::string& method, const std::string& params = "{}") {
        return Ask(R"({"jsonrpc":"2.0","id":1,"method":")" + method + R"(","params":)" + params + "}");
    }

    const std::shared_ptr<CommandQueue> commands_ = std::make_shared<CommandQueue>();
    RunState state_{[] {}};
    EventQueue events_{[] {}};
    Preview preview_;
    FakeSender sender_;
    ControlService service_{
        commands_, state_, events_, preview_, [](const std::string&) { return std::nullopt; }, [] {}};
};

TEST_F(ControlServiceTest, TellsStatusAndFiles) {
    EXPECT_EQ(AskFor("status")["result"]["state"], "waiting_for_source");
    EXPECT_EQ(AskFor("files")["result"], Json::parse(R"({"files":[]})"));
    state_.FileOpened("/srv/10_00_00_00.MP4");
    EXPECT_EQ(AskFor("files", "[]")["result"]["files"][0]["path"], "/srv/10_00_00_00.MP4");
}

TEST_F(ControlServiceTest, RefusesByTheCodesOfTheProtocol) {
    EXPECT_EQ(Ask("{")["error"]["code"], -32700);
    EXPECT_EQ(Ask("{}")["error"]["code"], -32600);
    EXPECT_EQ(AskFor("statsu")["error"]["code"], -32601);
    EXPECT_EQ(AskFor("status", R"({"a":1})")["error"]["code"], -32602);
    EXPECT_EQ(AskFor("record.start", "[1]")["error"]["code"], -32602);
    for (const char* const params :
         {R"({"width":31})", R"({"width":1921})", R"({"width":"320"})", R"({"width":99999999999999999999})",
          R"({"width":320.5})", R"({"height":90})", "[320]", R"({"width":null})"}) {
        EXPECT_EQ(AskFor("preview", params)["error"]["code"], -32602) << params;
    }
}

TEST_F(ControlServiceTest, ANotificationIsNotAnswered) {
    EXPECT_EQ(Ask(R"({"jsonrpc":"2.0","method":"status"})"), nullptr);
    EXPECT_EQ(Ask(R"({"jsonrpc":"2.0","method":"nothing"})"), nullptr);
    // But what is none is told.
    EXPECT_EQ(Ask(R"({"jsonrpc":"2.0"})")["id"], nullptr);
}

TEST_F(ControlServiceTest, CommandsWithoutASourceAreRefused) {
    for (const char* const method : {"record.start", "record.stop", "record.split"}) {
        EXPECT_EQ(AskFor(method)["error"]["code"], -32001) << method;
    }
}

TEST_F(ControlServiceTest, ACommandThatIsRefusedAtOnceIsAnsweredAtOnce) {
    state_.Describe({});
    commands_->Close("the run is over");
    EXPECT_EQ(AskFor("record.start"),
              Json::parse(R"({"jsonrpc":"2.0","id":1,"error":{"code":-32002,"message":"the run is over"}})"));
}

TEST_F(ControlServiceTest, EventsComeFromTheSubscriptionOn) {
    events_.Display().Notice("before");
    service_.OnRound(sender_);
    EXPECT_EQ(AskFor("events")["result"], Json::object());
    EXPECT_TRUE(service_.Owes(1));
    EXPECT_FALSE(service_.Owes(2));
    events_.Display().Notice("behind");
    service_.OnRound(sender_);
    ASSERT_THAT(sender_.sent[1], SizeIs(1));
    EXPECT_EQ(sender_.sent[1][0]["method"], "event");
    EXPECT_EQ(sender_.sent[1][0]["params"]["text"], "behind");
    EXPECT_FALSE(sender_.sent[1][0].contains("id"));
    EXPECT_THAT(sender_.sent[2], IsEmpty());
}

TEST_F(ControlServiceTest, WhoAsksTwiceForEventsGetsThemOnce) {
    AskFor("events");
    AskFor("events");
    events_.Display().Notice("x");
    service_.OnRound(sender_);
    EXPECT_THAT(sender_.sent[1], SizeIs(1));
}

TEST_F(ControlServiceTest, WhoIsDroppedIsToldLast) {
    AskFor("events");
    sender_.full = true;
    events_.Display().Notice("x");
    events_.Display().Notice("y");
    service_.OnRound(sender_);
    ASSERT_THAT(sender_.sent[1], SizeIs(1));
    EXPECT_EQ(sender_.sent[1][0]["method"], "events.ended");
    EXPECT_FALSE(service_.Owes(1));
}

TEST_F(ControlServiceTest, WhoHasGoneIsForgotten) {
    AskFor("events");
    service_.OnGone(1);
    events_.Display().Notice("x");
    service_.OnRound(sender_);
    EXPECT_THAT(sender_.sent[1], IsEmpty());
}

TEST_F(ControlServiceTest, APreviewWithoutAPictureIsRefused) {
    EXPECT_EQ(AskFor("preview")["error"]["code"], -32003);
}

TEST_F(ControlServiceTest, APictureThatCannotBeDecodedIsAnErrorOfItsOwn) {
    // Its slices are empty.
    preview_.LookAt(MakeFrame(0, true, 0));
    EXPECT_EQ(AskFor("preview")["error"]["code"], -32603);
}

TEST_F(ControlServiceTest, TheEndTellsWhatIsLeft) {
    AskFor("events");
    state_.Describe({});
    Ask(R"({"jsonrpc":"2.0","id":2,"method":"record.start"})");
    commands_->Close("the run is over");
    events_.Display().Finish({});
    service_.Finish(sender_);
    ASSERT_THAT(sender_.sent[1], SizeIs(2));
    EXPECT_EQ(sender_.sent[1][0]["error"]["message"], "the run is over");
    EXPECT_EQ(sender_.sent[1][1]["params"]["event"], "summary");
}

}  // namespace
}  // namespace receiver
