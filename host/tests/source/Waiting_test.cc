#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <future>
#include <mutex>

#include "SourceTesting.h"
#include "support/FreePorts.h"
#include "support/Senders.h"
#include "support/WaitUntil.h"

namespace receiver {
namespace {

using std::string;

/// Tells a test when the first sentence has come.
class FirstNotice final : public SourceListenerInterface {
 public:
    void OnNotice(const string& sentence) override {
        const std::lock_guard lock(mutex_);
        if (sentences_.empty()) {
            first_.set_value();
        }
        sentences_.push_back(sentence);
    }
    [[nodiscard]] bool Wait() {
        return first_.get_future().wait_for(std::chrono::seconds(30)) == std::future_status::ready;
    }
    std::vector<string> Sentences() const {
        const std::lock_guard lock(mutex_);
        return sentences_;
    }

 private:
    mutable std::mutex mutex_;
    std::promise<void> first_;
    std::vector<string> sentences_;
};

struct Address {
    const char* name;
    /// PORT stands for the port.
    string receiver;
    string sender;
    /// ffmpeg listens at the sender's address.
    bool server = false;
    string format = "mpegts";
};
void PrintTo(const Address& address, std::ostream* out) {
    *out << address.name;
}

class Waiting : public SourceTest, public testing::WithParamInterface<Address> {
 protected:
    string With(string text) const {
        for (std::size_t at = 0; (at = text.find("PORT")) != string::npos;) {
            text.replace(at, 4, std::to_string(ports_.First()));
        }
        return text;
    }
    SourceOptions Options() const {
        SourceOptions options;
        options.url = With(GetParam().receiver);
        // Shorter, a busy machine takes a sender that has just answered for one that is silent.
        options.timeout = 3;
        return options;
    }

    endtoend::FreePorts ports_;
    FirstNotice told_;
};

TEST_P(Waiting, ALiveSourceThatIsNotThereYetIsWaitedForAndToldOnce) {
    Ffmpeg(
        "-f lavfi -i testsrc2=size=128x96:rate=25:duration=8 -f lavfi -i sine=sample_rate=48000:duration=8 " +
        string(kPlainH264) + kPlainAac + "a.ts");
    static std::atomic<bool> stop;
    stop = false;
    auto opened = std::async(std::launch::async,
                             [&] { return OpenSource(Options(), told_, [] { return stop.load(); }); });
    EXPECT_TRUE(told_.Wait());
    std::vector<string> command{"ffmpeg", "-v",   "error", "-nostdin",       "-re", "-i", Path("a.ts"),
                                "-c",     "copy", "-f",    GetParam().format};
    if (GetParam().server) {
        command.insert(command.end(), {"-listen", "1"});
    }
    command.push_back(With(GetParam().sender));
    const endtoend::Process sender(command);
    stop = opened.wait_for(std::chrono::seconds(40)) != std::future_status::ready;
    const auto source = opened.get();
    ASSERT_NE(source, nullptr);
    EXPECT_EQ(source->Description().frameRate.key, 25000u);
    EXPECT_EQ(ReadAll(*source, 20).size(), 20u);
    const auto sentences = told_.Sentences();
    EXPECT_EQ(std::count_if(sentences.begin(), sentences.end(),
                            [](const string& sentence) { return sentence.ends_with("; waiting for it"); }),
              1)
        << testing::PrintToString(sentences);
}

TEST_P(Waiting, WithoutReconnectionItIsTheEndAtOnce) {
    const auto error = Refusal(Options());
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnavailable);
    EXPECT_EQ(string(error.what()).find("waiting"), string::npos);
}

INSTANTIATE_TEST_SUITE_P(
    All, Waiting,
    testing::Values(Address{"UDP", "udp://127.0.0.1:PORT", "udp://127.0.0.1:PORT?pkt_size=1316"},
                    Address{"SRT listener with a stream id", "srt://127.0.0.1:PORT?mode=listener",
                            "srt://127.0.0.1:PORT?streamid=live/camera"},
                    Address{"SRT caller", "srt://127.0.0.1:PORT?streamid=live/camera",
                            "srt://127.0.0.1:PORT?mode=listener"},
                    Address{"HTTP", "http://127.0.0.1:PORT/a.ts", "http://127.0.0.1:PORT/a.ts", true},
                    Address{"RTMP listener", "rtmp://0.0.0.0:PORT/live/key", "rtmp://127.0.0.1:PORT/live/key",
                            false, "flv"}));

/// A listener that somebody disturbs who connects and goes away. It takes one connection and closes its port
/// only then: who connects in between is reset, was not taken, and has to try again.
class DisturbedListener : public SourceTest {
 protected:
    /// A connection to the port, once it is open; -1 when that takes too long.
    int Connect() const {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(ports_.First());
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        int connection = -1;
        const bool connected = WaitUntil([&] {
            connection = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
            if (connect(connection, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) {
                return true;
            }
            close(connection);
            poll(nullptr, 0, 5);
            return false;
        });
        return connected ? connection : -1;
    }
    /// Sends `bytes` and the end of them, and waits for the listener to close the connection, which it does
    /// when it has read them. False for a connection that was reset, or left open for ever.
    static bool Taken(int connection, const string& bytes) {
        timeval patience{30, 0};
        setsockopt(connection, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
        for (std::size_t sent = 0; sent < bytes.size();) {
            const ssize_t count = send(connection, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
            if (count <= 0) {
                return false;
            }
            sent += static_cast<std::size_t>(count);
        }
        shutdown(connection, SHUT_WR);
        char byte = 0;
        return recv(connection, &byte, 1, 0) == 0;
    }
    /// Sends `bytes` in a connection that the listener takes.
    [[nodiscard]] bool Send(const string& bytes) const {
        constexpr int kTries = 20;
        for (int time = 0; time < kTries; ++time) {
            const int connection = Connect();
            if (connection < 0) {
                break;
            }
            const bool taken = Taken(connection, bytes);
            close(connection);
            if (taken) {
                return true;
            }
        }
        return false;
    }
    [[nodiscard]] bool Disturb() const { return Send("") && Send("") && Send(""); }

    endtoend::FreePorts ports_;
};

TEST_F(DisturbedListener, TakesItsSenderBeforeAndBehindAnother) {
    Ffmpeg("-f lavfi -i testsrc2=size=128x96:rate=25:duration=3 " + string(kPlainH264) + "a.ts");
    const string sent = FileBytes(Path("a.ts"));
    SourceOptions options;
    options.url = "tcp://127.0.0.1:" + std::to_string(ports_.First()) + "?listen=1";
    // No machine is so busy that a sender seems silent.
    options.timeout = 60;
    static std::atomic<bool> stop;
    stop = false;
    auto opened = std::async(std::launch::async,
                             [&] { return OpenSource(options, notices_, [] { return stop.load(); }); });
    const bool taken = Disturb() && Send(sent);
    stop = !taken;
    const auto source = opened.get();
    ASSERT_TRUE(taken);
    ASSERT_NE(source, nullptr);
    ASSERT_TRUE(Disturb());
    ASSERT_TRUE(Send(sent));
    // The pictures of the first sender and most of those of the second one.
    std::size_t pictures = 0;
    while (pictures < 140) {
        const auto units = ReadAll(*source, 1);
        ASSERT_EQ(units.size(), 1u);
        pictures += Of(Medium::kVideo, units).size();
    }
}

class StoppedWaiting : public Waiting {};

TEST_P(StoppedWaiting, IsOverAtOnce) {
    static std::atomic<bool> stop;
    stop = false;
    const SourceOptions options = Options();
    auto opened = std::async(std::launch::async,
                             [&] { return OpenSource(options, told_, [] { return stop.load(); }); });
    ASSERT_TRUE(told_.Wait());
    stop = true;
    EXPECT_EQ(opened.get(), nullptr);
}

INSTANTIATE_TEST_SUITE_P(All, StoppedWaiting,
                         testing::Values(Address{"UDP", "udp://127.0.0.1:PORT", ""},
                                         Address{"HTTP", "http://127.0.0.1:PORT/a.ts", ""}));

}  // namespace
}  // namespace receiver
