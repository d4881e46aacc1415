#include "control/ControlServer.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <functional>
#include <list>
#include <memory>
#include <set>
#include <thread>

#include "support/LineClient.h"
#include "support/TemporaryFolder.h"
#include "support/WaitUntil.h"

namespace receiver {
namespace {

/// Answers "echo X" with X, "big" with more than may wait, "later" with nothing; "tell" asks for events.
class EchoHandler final : public LineHandlerInterface {
 public:
    void OnLine(ClientId client, const std::string& line, LineSenderInterface& sender) override {
        ++lines;
        if (line == "tell") {
            listeners_.insert(client);
        } else if (line == "later") {
            owed_.insert(client);
        } else if (line == "big") {
            sender.Send(client, std::string(ControlServer::kMostWaiting + 1, 'b') + '\n');
        } else {
            sender.Send(client, "<" + line + ">\n");
        }
    }
    std::optional<Clock::time_point> OnRound(LineSenderInterface& sender) override {
        for (int count = toTell.exchange(0); count > 0; --count) {
            std::erase_if(listeners_, [&](ClientId client) {
                return !sender.Tell(client, std::string(1000, 'e') + '\n', "last\n");
            });
        }
        if (settle.exchange(false)) {
            for (const ClientId client : std::exchange(owed_, {})) {
                sender.Send(client, "owed\n");
            }
        }
        listening = listeners_.size();
        owing = owed_.size();
        return std::nullopt;
    }
    bool Owes(ClientId client) const override { return owed_.contains(client); }
    void OnGone(ClientId client) override {
        listeners_.erase(client);
        owed_.erase(client);
        ++gone;
    }

    std::atomic<int> lines{0};
    std::atomic<int> gone{0};
    std::atomic<int> toTell{0};
    std::atomic<bool> settle{false};
    std::atomic<std::size_t> listening{0};
    std::atomic<std::size_t> owing{0};

 private:
    std::set<ClientId> listeners_;
    std::set<ClientId> owed_;
};

class ControlServerTest : public ::testing::Test {
 protected:
    explicit ControlServerTest(std::chrono::milliseconds patience = ControlServer::kPatience)
        : server_(socket_, wakeUp_, handler_, patience) {}
    ~ControlServerTest() override { End(std::chrono::milliseconds(0)); }

    void End(std::chrono::milliseconds patience) {
        if (thread_.joinable()) {
            patience_ = patience;
            ending_ = true;
            wakeUp_.Signal();
            thread_.join();
        }
    }
    std::string Path() const { return (folder_.Path() / "a.sock").string(); }
    /// Has the handler tell `count` events of 1001 bytes.
    void Tell(int count) {
        handler_.toTell = count;
        wakeUp_.Signal();
        EXPECT_TRUE(WaitUntil([this] { return handler_.toTell == 0; }));
    }

    endtoend::TemporaryFolder folder_;
    WakeUp wakeUp_;
    ControlSocket socket_{Path()};
    EchoHandler handler_;
    ControlServer server_;
    std::atomic<bool> ending_{false};
    std::chrono::milliseconds patience_{0};
    std::thread thread_{[this] {
        while (!ending_) {
            server_.Serve();
        }
        server_.Finish(patience_);
    }};
};

TEST_F(ControlServerTest, AnswersEachLineInItsOrder) {
    LineClient client(Path());
    client.Send("a\nb\n");
    client.Send("c");
    EXPECT_EQ(client.Line(), "<a>");
    EXPECT_EQ(client.Line(), "<b>");
    client.Send("d\n");
    EXPECT_EQ(client.Line(), "<cd>");
}

TEST_F(ControlServerTest, ServesSeveralClients) {
    LineClient one(Path());
    LineClient other(Path());
    other.Send("other\n");
    one.Send("one\n");
    EXPECT_EQ(one.Line(), "<one>");
    EXPECT_EQ(other.Line(), "<other>");
}

TEST_F(ControlServerTest, HalfALineIsForgottenWithItsClient) {
    {
        LineClient client(Path());
        client.Send("half");
    }
    EXPECT_TRUE(WaitUntil([this] { return handler_.gone == 1; }));
    EXPECT_EQ(handler_.lines, 0);
}

TEST_F(ControlServerTest, AllLinesOfAClientThatHasGoneAreTaken) {
    for (int round = 1; round <= 20; ++round) {
        {
            const LineClient client(Path());
            client.Send("later\nbig\na\nb\n");
        }
        EXPECT_TRUE(WaitUntil([&] { return handler_.gone == round; }));
        EXPECT_EQ(handler_.lines, 4 * round);
    }
    {
        // More than is read at once.
        const LineClient client(Path());
        std::string lines;
        for (int i = 0; i < 10000; ++i) {
            lines += "a\n";
        }
        client.Send(lines);
    }
    EXPECT_TRUE(WaitUntil([&] { return handler_.gone == 21; }));
    EXPECT_EQ(handler_.lines, 80 + 10000);
}

TEST_F(ControlServerTest, AClientThatSendsNoMoreStillGetsItsAnswers) {
    LineClient client(Path());
    client.Send("a\nlater\n");
    client.EndInput();
    EXPECT_EQ(client.Line(), "<a>");
    EXPECT_TRUE(WaitUntil([this] {
        wakeUp_.Signal();
        return handler_.owing == 1;
    }));
    handler_.settle = true;
    wakeUp_.Signal();
    EXPECT_EQ(client.Line(), "owed");
    EXPECT_EQ(client.Line(), std::nullopt);
    EXPECT_TRUE(client.Closed());
}

TEST_F(ControlServerTest, ALineWithoutAnEndIsRefusedAndCostsNoMemory) {
    LineClient client(Path());
    const std::string piece(1 << 16, 'x');
    // Refused long before the end, which shows as a closed connection.
    for (int i = 0; i < 160 && client.Send(piece); ++i) {
    }
    EXPECT_EQ(
        client.Line(),
        R"({"jsonrpc":"2.0","id":null,"error":{"code":-32005,"message":"a line has at most 65536 bytes"}})");
    EXPECT_EQ(client.Line(), std::nullopt);
    EXPECT_TRUE(client.Closed());
    EXPECT_EQ(handler_.lines, 0);
}

TEST_F(ControlServerTest, TheLongestLineIsTaken) {
    LineClient client(Path());
    const std::string longest(ControlClient::kLongestLine, 'x');
    client.Send(longest + "\n");
    EXPECT_EQ(client.Line(), "<" + longest + ">");
    client.Send(longest + "x\n");
    EXPECT_NE(client.Line().value_or("").find("-32005"), std::string::npos);
}

TEST_F(ControlServerTest, OneClientTooManyIsToldSo) {
    std::list<LineClient> clients;
    for (std::size_t i = 0; i < ControlServer::kMostClients; ++i) {
        clients.emplace_back(Path());
        clients.back().Send("in\n");
        EXPECT_EQ(clients.back().Line(), "<in>");
    }
    LineClient surplus(Path());
    EXPECT_EQ(
        surplus.Line(),
        R"({"jsonrpc":"2.0","id":null,"error":{"code":-32006,"message":"too many clients are connected"}})");
    EXPECT_EQ(surplus.Line(), std::nullopt);
    // A place that is free again is given to the next one.
    clients.pop_front();
    EXPECT_TRUE(WaitUntil([this] { return handler_.gone == 1; }));
    LineClient next(Path());
    next.Send("in\n");
    EXPECT_EQ(next.Line(), "<in>");
}

TEST_F(ControlServerTest, WhoDoesNotReadAnswersIsNotReadEither) {
    LineClient hog(Path());
    for (int i = 0; i < 20; ++i) {
        hog.Send("big\n");
    }
    LineClient other(Path());
    for (int i = 0; i < 30; ++i) {
        other.Send("x\n");
        EXPECT_EQ(other.Line(), "<x>");
    }
    // The system takes one or two for the client, and one or two wait.
    EXPECT_LT(handler_.lines, 30 + 6);
    for (int i = 0; i < 20; ++i) {
        EXPECT_EQ(hog.Line().value_or("").size(), ControlServer::kMostWaiting + 1) << i;
    }
}

TEST_F(ControlServerTest, WhoDoesNotReadEventsGetsALastLineAndIsClosed) {
    LineClient sleeper(Path());
    LineClient reader(Path());
    sleeper.Send("tell\n");
    EXPECT_TRUE(WaitUntil([this] {
        wakeUp_.Signal();
        return handler_.listening == 1;
    }));
    // Two megabytes: the system takes some hundred kilobytes, and 256 wait.
    Tell(2000);
    EXPECT_TRUE(WaitUntil([this] {
        wakeUp_.Signal();
        return handler_.listening == 0;
    }));
    reader.Send("a\n");
    EXPECT_EQ(reader.Line(), "<a>");
    std::string last;
    int events = 0;
    while (const auto line = sleeper.Line()) {
        last = *line;
        events += line->starts_with("eee") ? 1 : 0;
    }
    EXPECT_TRUE(sleeper.Closed());
    EXPECT_EQ(last, "last");
    EXPECT_GE(events, 256);
    EXPECT_LT(events, 2000);
}

TEST_F(ControlServerTest, WhoGoesInTheMiddleOfAnAnswerHarmsNobody) {
    for (int i = 0; i < 10; ++i) {
        LineClient client(Path());
        client.Send("big\nbig\nbig\n");
    }
    LineClient other(Path());
    other.Send("x\n");
    EXPECT_EQ(other.Line(), "<x>");
    EXPECT_TRUE(WaitUntil([this] { return handler_.gone == 10; }));
}

TEST_F(ControlServerTest, WithoutADescriptorForAClientItWaitsForOne) {
    LineClient client(Path());
    client.Send("in\n");
    EXPECT_EQ(client.Line(), "<in>");
    rlimit limit{};
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
    const int next = dup(STDIN_FILENO);
    close(next);
    // One is left, which the client itself takes.
    const rlimit one{static_cast<rlim_t>(next) + 1, limit.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &one), 0);
    LineClient late(Path());
    late.Send("x\n");
    client.Send("still\n");
    EXPECT_EQ(client.Line(), "<still>");
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);
    EXPECT_EQ(late.Line(), "<x>");
}

TEST_F(ControlServerTest, TheEndWaitsForWhoReads) {
    LineClient client(Path());
    client.Send("big\n");
    EXPECT_TRUE(WaitUntil([this] { return handler_.lines == 1; }));
    std::thread reading([&client] {
        EXPECT_EQ(client.Line().value_or("").size(), ControlServer::kMostWaiting + 1);
        EXPECT_EQ(client.Line(), std::nullopt);
    });
    End(std::chrono::seconds(30));
    reading.join();
    EXPECT_EQ(server_.Clients(), 0u);
}

TEST_F(ControlServerTest, TheEndDoesNotWaitForWhoDoesNot) {
    LineClient client(Path());
    client.Send("big\nbig\n");
    EXPECT_TRUE(WaitUntil([this] { return handler_.lines >= 1; }));
    End(std::chrono::milliseconds(1));
    EXPECT_EQ(server_.Clients(), 0u);
}

class ImpatientControlServerTest : public ControlServerTest {
 protected:
    ImpatientControlServerTest() : ControlServerTest(std::chrono::milliseconds(50)) {}
};

TEST_F(ImpatientControlServerTest, WhoLeavesALineWithoutItsEndIsClosed) {
    LineClient client(Path());
    client.Send("whole\n");
    EXPECT_EQ(client.Line(), "<whole>");
    client.Send("half");
    EXPECT_EQ(client.Line(), std::nullopt);
    EXPECT_TRUE(client.Closed());
    EXPECT_EQ(handler_.lines, 1);
}

TEST_F(ImpatientControlServerTest, WhoNeverReadsIsClosed) {
    LineClient client(Path());
    client.Send("big\nbig\nbig\nbig\n");
    EXPECT_TRUE(WaitUntil([this] { return handler_.gone == 1; }));
}

TEST_F(ImpatientControlServerTest, WhoIsIdleMakesPlaceForWhoComesButNotWhoWaits) {
    LineClient waiting(Path());
    waiting.Send("later\n");
    std::list<LineClient> idle;
    for (std::size_t i = 1; i < ControlServer::kMostClients; ++i) {
        idle.emplace_back(Path());
        idle.back().Send("in\n");
        EXPECT_EQ(idle.back().Line(), "<in>");
    }
    // Until the oldest of them has been idle for long enough.
    EXPECT_TRUE(WaitUntil([this] {
        LineClient next(Path());
        next.Send("next\n");
        return next.Line() == "<next>";
    }));
    EXPECT_EQ(idle.front().Line(), std::nullopt);
    handler_.settle = true;
    wakeUp_.Signal();
    EXPECT_EQ(waiting.Line(), "owed");
}

}  // namespace
}  // namespace receiver
