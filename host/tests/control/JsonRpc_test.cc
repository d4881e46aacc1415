#include "control/JsonRpc.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

RpcCode CodeOf(std::string_view line) {
    const RpcRequest request = ParseRpcRequest(line);
    return request.error ? request.error->Code() : RpcCode{};
}

/// On a thread whose stack has a megabyte.
void RunOnASmallStack(std::function<void()> work) {
    pthread_attr_t attributes;
    ASSERT_EQ(pthread_attr_init(&attributes), 0);
    ASSERT_EQ(pthread_attr_setstacksize(&attributes, 1 << 20), 0);
    const auto run = [](void* argument) -> void* {
        (*static_cast<std::function<void()>*>(argument))();
        return nullptr;
    };
    pthread_t thread{};
    ASSERT_EQ(pthread_create(&thread, &attributes, run, &work), 0);
    pthread_join(thread, nullptr);
    pthread_attr_destroy(&attributes);
}

TEST(JsonRpcTest, ReadsARequest) {
    const RpcRequest request =
        ParseRpcRequest(R"({"jsonrpc":"2.0","id":7,"method":"preview","params":{"width":640}})");
    EXPECT_FALSE(request.error);
    EXPECT_EQ(request.id, Json(7));
    EXPECT_EQ(request.method, "preview");
    EXPECT_EQ(request.params, nlohmann::json({{"width", 640}}));
}

TEST(JsonRpcTest, ANotificationHasNoIdAndOneOfNullIsARequest) {
    EXPECT_FALSE(ParseRpcRequest(R"({"jsonrpc":"2.0","method":"status"})").id);
    EXPECT_EQ(ParseRpcRequest(R"({"jsonrpc":"2.0","method":"status","id":null})").id, Json(nullptr));
}

TEST(JsonRpcTest, WhatIsNoJsonIsAParseErrorWithoutAnId) {
    for (const char* const line : {"", "{", "status", "{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"sta",
                                   "\xff\xfe", "\"\xc3\x28\"", "{} {}"}) {
        EXPECT_EQ(CodeOf(line), RpcCode::kParse) << line;
        EXPECT_EQ(ParseRpcRequest(line).id, Json(nullptr)) << line;
    }
    EXPECT_EQ(CodeOf(std::string_view("\0\0\0", 3)), RpcCode::kParse);
}

TEST(JsonRpcTest, WhatIsNoRequestIsAnInvalidOne) {
    for (const char* const line :
         {"1", "null", "[]", R"([{"jsonrpc":"2.0","id":1,"method":"status"}])", "{}",
          R"({"jsonrpc":"1.0","id":1,"method":"status"})", R"({"id":1,"method":"status"})",
          R"({"jsonrpc":"2.0","id":1})", R"({"jsonrpc":"2.0","id":1,"method":5})",
          R"({"jsonrpc":"2.0","id":[1],"method":"status"})", R"({"jsonrpc":"2.0","id":{},"method":"status"})",
          R"({"jsonrpc":"2.0","id":true,"method":"status"})",
          R"({"jsonrpc":"2.0","id":1,"method":"status","params":1})"}) {
        EXPECT_EQ(CodeOf(line), RpcCode::kInvalidRequest) << line;
        EXPECT_TRUE(ParseRpcRequest(line).id) << line;
    }
}

TEST(JsonRpcTest, AnErrorCarriesTheIdWhereThatCanBeRead) {
    EXPECT_EQ(ParseRpcRequest(R"({"id":"a","method":"status"})").id, Json("a"));
    EXPECT_EQ(ParseRpcRequest(R"({"jsonrpc":"2.0","id":[1],"method":"status"})").id, Json(nullptr));
}

TEST(JsonRpcTest, DeepNestingIsReadWithoutADeepStack) {
    // As deep as the longest line of a client can be.
    const std::string open(32700, '[');
    const std::string nested = open + std::string(32700, ']');
    RunOnASmallStack([&] {
        EXPECT_EQ(CodeOf(open), RpcCode::kParse);
        EXPECT_EQ(CodeOf(R"({"jsonrpc":"2.0","id":)" + nested + "}"), RpcCode::kInvalidRequest);
        const RpcRequest request =
            ParseRpcRequest(R"({"jsonrpc":"2.0","id":1,"method":"x","params":)" + nested + "}");
        EXPECT_FALSE(request.error);
        EXPECT_TRUE(request.params.is_array());
    });
}

TEST(JsonRpcTest, AnswersErrorsAndNotificationsAreLines) {
    EXPECT_EQ(RpcAnswer("a", {{"x", 1}}), "{\"jsonrpc\":\"2.0\",\"id\":\"a\",\"result\":{\"x\":1}}\n");
    EXPECT_EQ(RpcErrorAnswer(nullptr, {RpcCode::kParse, "no"}),
              "{\"jsonrpc\":\"2.0\",\"id\":null,\"error\":{\"code\":-32700,\"message\":\"no\"}}\n");
    EXPECT_EQ(RpcNotification("event", Json{{"x", 1}}),
              "{\"jsonrpc\":\"2.0\",\"method\":\"event\",\"params\":{\"x\":1}}\n");
    EXPECT_EQ(RpcNotificationOf("event", "{\"x\":1}\n"),
              "{\"jsonrpc\":\"2.0\",\"method\":\"event\",\"params\":{\"x\":1}}\n");
}

TEST(JsonRpcTest, BytesThatAreNoTextAreReplaced) {
    EXPECT_EQ(RpcAnswer(1, {{"path", "a\xff.MP4"}}),
              "{\"jsonrpc\":\"2.0\",\"id\":1,\"result\":{\"path\":\"a\xEF\xBF\xBD.MP4\"}}\n");
}

}  // namespace
}  // namespace receiver
