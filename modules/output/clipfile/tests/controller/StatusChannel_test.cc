#include "controller/StatusChannel.h"

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <latch>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "support/FakeHost.h"

namespace clipfileModule {
namespace {

using Statuses = std::vector<FakeHost::Status>;

/// Runs code of the test inside its calls, before the status counts.
class HookedHost : public FakeHost {
 public:
    std::function<void()> inGetStatus = [] {};
    std::function<void(Status)> inSetStatus = [](Status) {};

    int GetStatus() override {
        const int status = FakeHost::GetStatus();
        inGetStatus();
        return status;
    }
    void SetStatus(int status, int cause) override {
        FakeHost::SetStatus(status, cause);
        inSetStatus({status, cause});
    }
};

class StatusChannelTest : public testing::Test {
 protected:
    void SetStatuses(const Statuses& statuses) {
        for (const auto& [status, cause] : statuses) {
            channel_->Set(status, cause);
        }
    }

    HookedHost host_;
    std::shared_ptr<StatusChannel> channel_ = std::make_shared<StatusChannel>(&host_);
};

TEST_F(StatusChannelTest, DeliversInOrderAndNothingBehindA7) {
    SetStatuses({{4, 0}, {6, 22}});
    EXPECT_FALSE(channel_->IsFinal());
    SetStatuses({{7, 22}, {6, 26}, {7, 27}, {3, 0}});
    EXPECT_TRUE(channel_->IsFinal());
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {6, 22}, {7, 22}}));
}

TEST_F(StatusChannelTest, A7StaysFinalWhenTheHostForgetsIt) {
    channel_->Set(7, 22);
    host_.ForceStatus(0);
    channel_->Set(4, 0);
    EXPECT_TRUE(channel_->IsFinal());
    EXPECT_EQ(host_.Statuses(), (Statuses{{7, 22}}));
}

TEST_F(StatusChannelTest, AHostWithA7OfItsOwnIsToldNothingUntilItTakesThatBack) {
    host_.ForceStatus(7);
    channel_->Set(4, 0);
    EXPECT_FALSE(channel_->IsFinal());
    host_.ForceStatus(0);
    channel_->Set(3, 0);
    EXPECT_EQ(host_.Statuses(), (Statuses{{3, 0}}));
}

TEST_F(StatusChannelTest, WhatComesWhileTheHostIsAskedWaitsForNobodyAndIsDeliveredByTheThreadThatAsks) {
    std::latch asked(1);
    std::latch answer(1);
    std::atomic<bool> first = true;
    std::vector<std::thread::id> deliverers;
    host_.inGetStatus = [&] {
        if (first.exchange(false)) {
            asked.count_down();
            answer.wait();
        }
    };
    host_.inSetStatus = [&](FakeHost::Status) { deliverers.push_back(std::this_thread::get_id()); };
    std::thread slow([&] { channel_->Set(4, 0); });
    const std::thread::id slowId = slow.get_id();
    asked.wait();
    // All of them return although the host does not answer.
    SetStatuses({{7, 22}, {6, 26}, {3, 0}});
    EXPECT_TRUE(channel_->IsFinal());
    EXPECT_TRUE(host_.Statuses().empty());
    answer.count_down();
    slow.join();
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {7, 22}}));
    EXPECT_EQ(deliverers, (std::vector<std::thread::id>{slowId, slowId}));
}

TEST_F(StatusChannelTest, StatusesThatTheHostSetsOffFromInsideSetStatusFollowInOrder) {
    host_.inSetStatus = [&](FakeHost::Status status) {
        if (status == FakeHost::Status{6, 22}) {
            channel_->Set(6, 26);
            EXPECT_EQ(host_.Statuses().size(), 1U) << "delivered inside the call";
            channel_->Set(3, 0);
        }
    };
    channel_->Set(6, 22);
    EXPECT_EQ(host_.Statuses(), (Statuses{{6, 22}, {6, 26}, {3, 0}}));
}

TEST_F(StatusChannelTest, AHostMaySetStatusesUnderALockThatItsOwnCallsTake) {
    std::recursive_mutex lock;
    std::latch inside(1);
    host_.inGetStatus = [&] { const std::lock_guard held(lock); };
    std::thread other;
    {
        const std::lock_guard held(lock);
        other = std::thread([&] {
            inside.count_down();
            channel_->Set(6, 22);
        });
        inside.wait();
        // The other thread may stand in front of the lock with the delivery in hand.
        channel_->Set(6, 26);
    }
    other.join();
    const Statuses statuses = host_.Statuses();
    ASSERT_EQ(statuses.size(), 2U);
    EXPECT_NE(statuses[0], statuses[1]);
}

TEST_F(StatusChannelTest, WhatTheHostThrowsLeavesSetAndLosesNoOtherStatus) {
    host_.inSetStatus = [&](FakeHost::Status status) {
        if (status.first == 6) {
            channel_->Set(7, 23);
            throw std::runtime_error("host");
        }
    };
    EXPECT_THROW(channel_->Set(6, 23), std::runtime_error);
    EXPECT_EQ(host_.Statuses(), (Statuses{{6, 23}, {7, 23}}));
}

TEST_F(StatusChannelTest, GivesTheDeliveryBackWhenTheHostThrows) {
    host_.inGetStatus = [] { throw std::runtime_error("host"); };
    EXPECT_THROW(channel_->Set(4, 0), std::runtime_error);
    host_.inGetStatus = [] {};
    channel_->Set(3, 0);
    EXPECT_EQ(host_.Statuses(), (Statuses{{3, 0}}));
}

TEST_F(StatusChannelTest, AHoldKeepsTheStatusesOfItsThreadBackUntilItGoes) {
    {
        const StatusChannel::Hold outer(channel_);
        {
            const StatusChannel::Hold inner(channel_);
            channel_->Set(6, 22);
        }
        EXPECT_TRUE(host_.Statuses().empty());
        channel_->Set(7, 27);
        EXPECT_TRUE(channel_->IsFinal());
        EXPECT_TRUE(host_.Statuses().empty());
    }
    EXPECT_EQ(host_.Statuses(), (Statuses{{6, 22}, {7, 27}}));
}

TEST_F(StatusChannelTest, AHoldKeepsNoOtherThreadBack) {
    const StatusChannel::Hold hold(channel_);
    channel_->Set(6, 22);
    std::thread([&] { channel_->Set(6, 26); }).join();
    EXPECT_EQ(host_.Statuses(), (Statuses{{6, 22}, {6, 26}}));
}

TEST_F(StatusChannelTest, WhatTheHostThrowsAtTheEndOfAHoldIsLogged) {
    const LogCapture log;
    host_.inSetStatus = [](FakeHost::Status) { throw std::runtime_error("host"); };
    {
        const StatusChannel::Hold hold(channel_);
        channel_->Set(6, 22);
    }
    const auto line = log.Find("SetStatus() of the host threw.");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->priority, LOG_PRIORITY_ERROR);
}

TEST_F(StatusChannelTest, AClosedChannelTellsTheHostNothing) {
    channel_->Close();
    SetStatuses({{4, 0}, {7, 22}});
    EXPECT_FALSE(channel_->IsFinal());
    EXPECT_TRUE(host_.Statuses().empty());
}

TEST_F(StatusChannelTest, AThreadThatIsInsideTheHostWhenTheChannelClosesCallsItNoMore) {
    std::latch inside(1);
    std::latch leave(1);
    host_.inSetStatus = [&](FakeHost::Status) {
        inside.count_down();
        leave.wait();
    };
    // It holds the channel as well: nobody else has to.
    std::thread hung([channel = channel_] { channel->Set(6, 22); });
    inside.wait();
    channel_->Set(7, 27);
    channel_->Close();
    channel_.reset();
    leave.count_down();
    hung.join();
    EXPECT_EQ(host_.Statuses(), (Statuses{{6, 22}}));
}

/// Many threads, a host that sets off statuses of its own and one that holds a lock across its calls.
TEST_F(StatusChannelTest, LosesNothingAndEndsWithThe7UnderContention) {
    constexpr int kRounds = 300;
    constexpr int kThreads = 4;
    constexpr int kCalls = 8;
    for (int round = 0; round < kRounds; ++round) {
        HookedHost host;
        const auto channel = std::make_shared<StatusChannel>(&host);
        std::recursive_mutex lock;
        std::atomic<int> nested = 0;
        host.inGetStatus = [&] {
            const std::lock_guard held(lock);
            std::this_thread::yield();
        };
        host.inSetStatus = [&](FakeHost::Status status) {
            if (status.first == 6 && status.second % 3 == 0) {
                ++nested;
                channel->Set(3, 0);
            }
        };
        const bool fails = round % 2 == 0;
        std::vector<std::thread> threads;
        for (int t = 0; t < kThreads; ++t) {
            threads.emplace_back([&, t] {
                for (int i = 0; i < kCalls; ++i) {
                    std::unique_lock across(lock, std::defer_lock);
                    if (i % kThreads == t) {
                        across.lock();
                    }
                    const bool last = fails && t == 0 && i == kCalls / 2;
                    channel->Set(last ? 7 : 6, last ? 22 : i);
                }
            });
        }
        for (std::thread& thread : threads) {
            thread.join();
        }
        const Statuses statuses = host.Statuses();
        if (fails) {
            ASSERT_FALSE(statuses.empty());
            EXPECT_EQ(statuses.back(), (FakeHost::Status{7, 22})) << "in round " << round;
        } else {
            EXPECT_EQ(statuses.size(), static_cast<std::size_t>(kThreads * kCalls + nested))
                << "in round " << round;
        }
    }
}

}  // namespace
}  // namespace clipfileModule
