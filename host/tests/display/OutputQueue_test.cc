#include "display/OutputQueue.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <array>
#include <csignal>

namespace receiver {
namespace {

constexpr std::chrono::seconds kPatience{30};

std::string Remark(std::uint64_t count) {
    return "[" + std::to_string(count) + "]";
}

/// A pipe of the smallest size, whose reader is the test.
class OutputQueueTest : public ::testing::Test {
 protected:
    OutputQueueTest() {
        EXPECT_EQ(pipe2(ends_.data(), O_CLOEXEC), 0);
        // The system rounds it up to a page.
        capacity_ = static_cast<std::size_t>(fcntl(ends_[1], F_SETPIPE_SZ, 1));
    }
    ~OutputQueueTest() override {
        close(ends_[0]);
        close(ends_[1]);
    }

    /// Nothing more goes into the pipe until somebody reads.
    void Fill() const {
        const std::string filling(capacity_, '.');
        EXPECT_EQ(write(ends_[1], filling.data(), filling.size()), static_cast<ssize_t>(capacity_));
    }
    /// The thread of the queue hangs in the pipe.
    void WaitUntilFull() const {
        int count = 0;
        while (ioctl(ends_[0], FIONREAD, &count) == 0 && static_cast<std::size_t>(count) < capacity_) {
            std::this_thread::yield();
        }
    }
    /// The next bytes, so many.
    std::string Read(std::size_t count) const {
        std::string text(count, '\0');
        std::size_t done = 0;
        while (done < count) {
            const ssize_t got = read(ends_[0], text.data() + done, count - done);
            if (got <= 0) {
                break;
            }
            done += static_cast<std::size_t>(got);
        }
        text.resize(done);
        return text;
    }

    std::array<int, 2> ends_{};
    std::size_t capacity_ = 0;
};

TEST_F(OutputQueueTest, MessagesAreWrittenInTheirOrder) {
    OutputQueue queue(Remark);
    queue.Write(ends_[1], "one ");
    queue.Write(ends_[1], "two ");
    queue.Write(ends_[1], "three");
    EXPECT_TRUE(queue.Close(kPatience));
    EXPECT_EQ(Read(13), "one two three");
}

TEST_F(OutputQueueTest, AReaderWhoComesBackIsToldHowManyOfTheOldestAreMissing) {
    OutputQueue queue(Remark, 6);
    const std::string first(capacity_ + 1, 'a');
    queue.Write(ends_[1], first);
    WaitUntilFull();
    for (const char* const message : {"bbb", "ccc", "ddd", "eee"}) {
        queue.Write(ends_[1], message);
    }
    EXPECT_TRUE(queue.Busy());
    EXPECT_EQ(Read(first.size()), first);
    EXPECT_EQ(Read(9), "[2]dddeee");
    EXPECT_TRUE(queue.Close(kPatience));
    EXPECT_FALSE(queue.Busy());
}

TEST_F(OutputQueueTest, OneMessageMayBeLargerThanTheBound) {
    OutputQueue queue(Remark, 3);
    queue.Write(ends_[1], "a large message");
    EXPECT_TRUE(queue.Close(kPatience));
    EXPECT_EQ(Read(15), "a large message");
}

TEST_F(OutputQueueTest, TheEndWaitsNoLongerThanItsPatience) {
    Fill();
    OutputQueue queue(Remark);
    queue.Write(ends_[1], "never read");
    EXPECT_FALSE(queue.Close(std::chrono::milliseconds(1)));
    // Lets the thread go, which still has the pipe.
    Read(capacity_ + 10);
}

TEST_F(OutputQueueTest, AReaderWhoIsGoneCostsNothing) {
    sigset_t pipe;
    sigemptyset(&pipe);
    sigaddset(&pipe, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &pipe, nullptr);
    close(ends_[0]);
    ends_[0] = -1;
    OutputQueue queue(Remark);
    queue.Write(ends_[1], "to nobody");
    EXPECT_TRUE(queue.Close(kPatience));
}

TEST_F(OutputQueueTest, ADescriptorThatDoesNotBlockIsWaitedForToo) {
    Fill();
    fcntl(ends_[1], F_SETFL, O_NONBLOCK);
    OutputQueue queue(Remark);
    queue.Write(ends_[1], "late");
    EXPECT_EQ(Read(capacity_ + 4).substr(capacity_), "late");
    EXPECT_TRUE(queue.Close(kPatience));
}

TEST_F(OutputQueueTest, AStreamMakesAMessageOfWhatStandsInFrontOfAFlush) {
    OutputQueue queue(Remark);
    MessageStream stream(queue, ends_[1]);
    stream << "one " << 1 << std::endl << "two" << std::flush << std::flush << "never flushed";
    EXPECT_TRUE(queue.Close(kPatience));
    EXPECT_EQ(Read(9), "one 1\ntwo");
}

}  // namespace
}  // namespace receiver
