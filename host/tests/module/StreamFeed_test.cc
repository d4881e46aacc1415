#include "module/StreamFeed.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <string>
#include <thread>

namespace receiver {
namespace {

using ::testing::ElementsAre;

std::shared_ptr<unsigned char> Bytes(std::size_t size) {
    return {new unsigned char[size](), std::default_delete<unsigned char[]>()};
}

/// A module that keeps what it gets until it is told to let go.
class KeepingModule : public QxModuleStreamInterface {
 public:
    virtual ~KeepingModule() = default;
    void PushReserved(const std::shared_ptr<StreamData>&) override {}
    void PushVideo(const std::shared_ptr<StreamData>& unit) override { video.push_back(unit); }
    void PushAudio(const std::shared_ptr<StreamData>& unit) override { audio.push_back(unit); }
    void PushMeta(const std::shared_ptr<StreamData>& unit) override { meta.push_back(unit); }

    std::deque<std::shared_ptr<StreamData>> video;
    std::deque<std::shared_ptr<StreamData>> audio;
    std::deque<std::shared_ptr<StreamData>> meta;
};

/// A module with a bounded queue for video that a thread of its own empties slowly, and that drops when full.
class QueueingModule final : public KeepingModule {
 public:
    static constexpr std::size_t kCapacity = 50;

    QueueingModule() : thread_([this] { Run(); }) {}
    ~QueueingModule() override {
        {
            const std::lock_guard lock(mutex_);
            ended_ = true;
        }
        changed_.notify_all();
        thread_.join();
    }

    /// Takes nothing more out of the queue.
    void Halt() {
        const std::lock_guard lock(mutex_);
        halted_ = true;
    }
    /// Takes everything out, and goes on.
    void Resume() {
        std::unique_lock lock(mutex_);
        halted_ = false;
        changed_.notify_all();
        changed_.wait(lock, [this] { return queue_.empty(); });
    }

    void PushVideo(const std::shared_ptr<StreamData>& unit) override {
        const std::lock_guard lock(mutex_);
        if (queue_.size() >= kCapacity) {
            ++dropped;
            return;
        }
        queue_.push_back(unit);
        changed_.notify_all();
    }

    void PushAudio(const std::shared_ptr<StreamData>& unit) override {
        if (keepsAudio) {
            KeepingModule::PushAudio(unit);
        }
    }
    void PushMeta(const std::shared_ptr<StreamData>&) override {}

    bool keepsAudio = false;
    int dropped = 0;
    int taken = 0;

 private:
    void Run() {
        std::unique_lock lock(mutex_);
        while (true) {
            changed_.wait(lock, [this] { return ended_ || (!halted_ && !queue_.empty()); });
            if (queue_.empty()) {
                return;
            }
            const std::shared_ptr<StreamData> unit = std::move(queue_.front());
            queue_.pop_front();
            taken += unit->payload != nullptr ? 1 : 0;
            changed_.notify_all();
            lock.unlock();
            std::this_thread::yield();
            lock.lock();
        }
    }

    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::shared_ptr<StreamData>> queue_;
    bool ended_ = false;
    bool halted_ = false;
    std::thread thread_;
};

TEST(StreamFeed, UnitsCarryTheirTimesOnTheirClocksTenSecondsOn) {
    KeepingModule module;
    StreamFeed feed(module);
    const auto data = Bytes(3);
    feed.PushVideo(3003, data, 3);
    feed.PushAudio(1024, data, 3);
    feed.PushMeta(3003, {0x01, 0x02});
    ASSERT_EQ(module.video.size(), 1u);
    EXPECT_EQ(module.video[0]->rtp_timestamp, 903003u);
    // 10033.37 and 10021.33 ms.
    EXPECT_EQ(module.video[0]->timestamp, 10033u);
    EXPECT_EQ(module.video[0]->data, data);
    EXPECT_EQ(module.video[0]->payload, data.get());
    EXPECT_EQ(module.video[0]->size, 3u);
    EXPECT_EQ(module.audio[0]->rtp_timestamp, 481024u);
    EXPECT_EQ(module.audio[0]->timestamp, 10021u);
    EXPECT_EQ(module.meta[0]->rtp_timestamp, 903003u);
    EXPECT_EQ(module.meta[0]->timestamp, 10033u);
    EXPECT_THAT(std::vector<unsigned char>(module.meta[0]->payload, module.meta[0]->payload + 2),
                ElementsAre(1, 2));
}

TEST(StreamFeed, TimesGoOnBeyondTheWrapsOfShorterClocks) {
    KeepingModule module;
    StreamFeed feed(module);
    const std::int64_t wrapped33 = (std::int64_t{1} << 33) + 5;
    feed.PushVideo(wrapped33, Bytes(1), 1);
    EXPECT_EQ(module.video[0]->rtp_timestamp, 8589934597u + 900000u);
    EXPECT_EQ(module.video[0]->timestamp, (8589934597u + 900000u) / 90);
}

TEST(StreamFeed, AnEighthUnitIsFollowedByAMark) {
    KeepingModule module;
    StreamFeed feed(module);
    for (int i = 0; i < 8; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    ASSERT_EQ(module.video.size(), 9u);
    EXPECT_EQ(module.video[8]->payload, nullptr);
}

TEST(StreamFeed, WaitsWhenAQueueFillsUpSoThatNothingIsDropped) {
    QueueingModule module;
    StreamFeed feed(module);
    for (int i = 0; i < 3000; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    feed.Settle();
    EXPECT_EQ(module.dropped, 0);
    EXPECT_EQ(module.taken, 3000);
}

// As after a machine that was suspended.
TEST(StreamFeed, AModuleThatHaltedIsWaitedForAgainAsSoonAsItMoves) {
    QueueingModule module;
    StreamFeed feed(module, std::chrono::milliseconds(500));
    module.Halt();
    for (int i = 0; i < 100; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    const int dropped = module.dropped;
    EXPECT_GT(dropped, 0);
    module.Resume();
    for (int i = 100; i < 3000; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    feed.Settle();
    EXPECT_EQ(module.dropped, dropped);
}

// Not even a dropped mark counts as one that came through.
TEST(StreamFeed, AModuleThatHaltsIsWaitedForOnce) {
    QueueingModule module;
    module.Halt();
    constexpr std::chrono::milliseconds kPatience{300};
    StreamFeed feed(module, kPatience);
    const auto begin = std::chrono::steady_clock::now();
    for (int i = 0; i < 300; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    const auto passed = std::chrono::steady_clock::now() - begin;
    EXPECT_GE(passed, kPatience);
    EXPECT_LT(passed, 3 * kPatience);
}

TEST(StreamFeed, AQueueThatHaltsDoesNotLetTheOthersOverflow) {
    QueueingModule module;
    module.keepsAudio = true;
    StreamFeed feed(module, std::chrono::seconds(3));
    for (int i = 0; i < 3000; ++i) {
        if (i < 60) {
            feed.PushAudio(i, Bytes(1), 1);
        }
        feed.PushVideo(i, Bytes(1), 1);
    }
    EXPECT_EQ(module.dropped, 0);
}

TEST(StreamFeed, WhileTheModuleIsWaitedForItsOwnerGoesOnWithOtherThings) {
    KeepingModule module;
    int calls = 0;
    // A wait of an hour, but for what happens meanwhile.
    StreamFeed feed(module, std::chrono::hours(1), [&] {
        ++calls;
        module.video.clear();
    });
    for (int i = 0; i < 100; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    EXPECT_GT(calls, 0);
}

TEST(StreamFeed, WhileTheDiskIsWaitedForItsOwnerGoesOnWithOtherThings) {
    KeepingModule module;
    int calls = 0;
    StreamFeed feed(module, StreamFeed::kPatience, [&] {
        ++calls;
        module.video.clear();
    });
    for (int i = 0; i < 3; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    // A chunk of two is cut, and its first one waits for the disk.
    module.video.erase(module.video.begin() + 1);
    EXPECT_TRUE(feed.WaitForChunks(0, std::chrono::hours(1)));
    EXPECT_EQ(calls, 1);
}

TEST(StreamFeed, MarksThatTheModuleDropsAreCounted) {
    QueueingModule module;
    StreamFeed feed(module, std::chrono::milliseconds(0));
    EXPECT_EQ(feed.DroppedMarks(), 0u);
    module.Halt();
    // The queue takes 44 units and the 5 marks behind each eight, one unit more, and then drops.
    for (int i = 0; i < 64; ++i) {
        feed.PushVideo(i, Bytes(1), 1);
    }
    EXPECT_EQ(module.dropped, 64 + 8 - 50);
    EXPECT_EQ(feed.DroppedMarks(), 3u);
}

/// Lets go of everything, on a thread of its own, when the last of the three marks has come.
class ReleasingModule final : public KeepingModule {
 public:
    ~ReleasingModule() override { thread_.join(); }

    void PushMeta(const std::shared_ptr<StreamData>& unit) override {
        KeepingModule::PushMeta(unit);
        thread_ = std::thread([this] {
            released = true;
            video.clear();
            audio.clear();
            meta.clear();
        });
    }

    std::atomic<bool> released{false};

 private:
    std::thread thread_;
};

TEST(StreamFeed, SettlingWaitsUntilEveryQueueHasLetGo) {
    ReleasingModule module;
    StreamFeed feed(module);
    feed.PushVideo(0, Bytes(1), 1);
    feed.PushAudio(0, Bytes(1), 1);
    feed.Settle();
    EXPECT_TRUE(module.released);
}

TEST(StreamFeed, TheLedgerFollowsTheVideoUnits) {
    KeepingModule module;
    StreamFeed feed(module);
    feed.PushVideo(0, Bytes(1), 1);
    feed.PushVideo(1, Bytes(1), 1);
    EXPECT_EQ(feed.Frames().UncutUnits(), 2u);
    module.video.clear();
    EXPECT_EQ(feed.Frames().UncutUnits(), 0u);
}

TEST(StreamFeed, UnitsMayOutliveTheFeed) {
    KeepingModule module;
    {
        StreamFeed feed(module);
        feed.PushVideo(0, Bytes(1), 1);
        feed.PushMeta(0, {0x01});
    }
    module.video.clear();
    module.meta.clear();
}

}  // namespace
}  // namespace receiver
