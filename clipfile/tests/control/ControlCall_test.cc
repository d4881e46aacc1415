#include "control/ControlCall.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <sstream>
#include <thread>

#include "support/TempDir.h"

namespace clipfile {
namespace {

/// Answers one client with given text, and keeps its first line.
class ControlCallTest : public ::testing::Test {
 protected:
    ControlCallTest() {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        Path().copy(address.sun_path, sizeof address.sun_path - 1);
        EXPECT_EQ(bind(listener_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        EXPECT_EQ(listen(listener_, 1), 0);
    }
    ~ControlCallTest() override { close(listener_); }

    std::string Path() const { return (folder_.Path() / "a.sock").string(); }
    ExitCode Call(const std::string& answer, const std::string& method, const std::string& params = "") {
        std::thread server([&] {
            const int client = accept(listener_, nullptr, nullptr);
            std::array<char, 4096> piece;
            while (asked_.find('\n') == std::string::npos) {
                const ssize_t count = recv(client, piece.data(), piece.size(), 0);
                if (count <= 0) {
                    break;
                }
                asked_.append(piece.data(), static_cast<std::size_t>(count));
            }
            send(client, answer.data(), answer.size(), MSG_NOSIGNAL);
            close(client);
        });
        ExitCode code{};
        try {
            code = CallControl({Path(), method, params}, out_, errors_);
        } catch (const ToolError& error) {
            code = error.Code();
            errors_ << error.what();
        }
        server.join();
        return code;
    }

    TempDir folder_;
    const int listener_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    std::string asked_;
    std::ostringstream out_;
    std::ostringstream errors_;
};

TEST_F(ControlCallTest, AsksAndPrintsTheResult) {
    EXPECT_EQ(
        Call("{\"jsonrpc\":\"2.0\",\"id\":1,\"result\":{\"b\":1,\"a\":2}}\n", "preview", R"({"width": 64})"),
        ExitCode::kSuccess);
    EXPECT_EQ(asked_, "{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"preview\",\"params\":{\"width\":64}}\n");
    EXPECT_EQ(out_.str(), "{\"b\":1,\"a\":2}\n");
    EXPECT_EQ(errors_.str(), "");
}

TEST_F(ControlCallTest, AnErrorIsToldInWords) {
    EXPECT_EQ(
        Call("{\"jsonrpc\":\"2.0\",\"id\":1,\"error\":{\"code\":-32002,\"message\":\"no recording runs\"}}\n",
             "record.stop"),
        ExitCode::kDefects);
    EXPECT_EQ(asked_, "{\"jsonrpc\":\"2.0\",\"id\":1,\"method\":\"record.stop\"}\n");
    EXPECT_EQ(out_.str(), "");
    EXPECT_EQ(errors_.str(), "clipfile: no recording runs.\n");
}

TEST_F(ControlCallTest, PrintsEventsUntilTheEnd) {
    EXPECT_EQ(Call("{\"jsonrpc\":\"2.0\",\"id\":1,\"result\":{}}\n"
                   "{\"jsonrpc\":\"2.0\",\"method\":\"event\",\"params\":{\"event\":\"notice\"}}\n"
                   "{\"jsonrpc\":\"2.0\",\"method\":\"event\",\"params\":{\"event\":\"summary\"}}\n",
                   "events"),
              ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), "{\"event\":\"notice\"}\n{\"event\":\"summary\"}\n");
}

TEST_F(ControlCallTest, AReceiverThatGoesWithoutAnAnswerIsNotReached) {
    for (const char* const answer : {"", "nonsense\n", "{}\n"}) {
        EXPECT_EQ(Call(answer, "status"), ExitCode::kUnreadable) << answer;
    }
}

TEST_F(ControlCallTest, ASocketWithoutAReceiverIsNotReached) {
    for (const std::string& path : {Path() + ".none", Path() + std::string(120, 'x')}) {
        try {
            CallControl({path, "status", ""}, out_, errors_);
            FAIL() << path;
        } catch (const ToolError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUnreadable) << error.what();
        }
    }
}

TEST_F(ControlCallTest, ParamsThatAreNoObjectAreAMistakeOfTheCommandLine) {
    for (const char* const params : {"{", "64", "[64]"}) {
        try {
            CallControl({Path(), "preview", params}, out_, errors_);
            FAIL() << params;
        } catch (const ToolError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
        }
    }
}

}  // namespace
}  // namespace clipfile
