#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
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

/// A listener that somebody disturbs who connects and goes away.
class DisturbedListener : public SourceTest {
 protected:
    using Clock = std::chrono::steady_clock;

    /// A connection to the listener, once it takes one.
    int Connect() const {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(ports_.First());
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        int connection = -1;
        EXPECT_TRUE(WaitUntil([&] {
            connection = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
            if (connect(connection, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) {
                return true;
            }
            close(connection);
            return false;
        }));
        return connection;
    }
    /// For how long nobody listens behind a disturbance: the shortest of some, of which a busy machine may
    /// lengthen any.
    Clock::duration ClosedTime() const {
        Clock::duration shortest = Clock::duration::max();
        int connection = Connect();
        for (int time = 0; time < 5; ++time) {
            close(connection);
            const auto closed = Clock::now();
            connection = Connect();
            shortest = std::min(shortest, Clock::now() - closed);
        }
        close(connection);
        return shortest;
    }
    void Send(const string& bytes) const {
        const int connection = Connect();
        for (std::size_t sent = 0; sent < bytes.size();) {
            const ssize_t count = send(connection, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
            ASSERT_GT(count, 0);
            sent += static_cast<std::size_t>(count);
        }
        close(connection);
    }

    static constexpr std::chrono::milliseconds kLongest{600};
    endtoend::FreePorts ports_;
};

TEST_F(DisturbedListener, IsBackAtOnceBeforeAndBehindItsSender) {
    Ffmpeg("-f lavfi -i testsrc2=size=128x96:rate=25:duration=3 " + string(kPlainH264) + "a.ts");
    SourceOptions options;
    options.url = "tcp://127.0.0.1:" + std::to_string(ports_.First()) + "?listen=1";
    auto opened = std::async(std::launch::async, [&] { return OpenSource(options, notices_, nullptr); });
    EXPECT_LT(ClosedTime(), kLongest);
    Send(FileBytes(Path("a.ts")));
    const auto source = opened.get();
    ASSERT_NE(source, nullptr);
    EXPECT_EQ(ReadAll(*source, 20).size(), 20u);
    EXPECT_LT(ClosedTime(), kLongest);
    Send(FileBytes(Path("a.ts")));
    EXPECT_EQ(ReadAll(*source, 200).size(), 200u);
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
