#include "hooks/HookQueue.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <condition_variable>
#include <mutex>
#include <stdexcept>

#include "support/WaitTimes.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

HookEvent Event(const std::string& name) {
    return {name, "{}\n", {}};
}

/// Keeps what it is told, and may hang.
class FakeTarget final : public HookTargetInterface {
 public:
    std::optional<std::string> Deliver(const HookEvent& event) override {
        std::unique_lock lock(mutex_);
        told_.push_back(event.name);
        changed_.notify_all();
        if (event.name == "throws") {
            throw std::runtime_error("it threw");
        }
        changed_.wait(lock, [&] { return !hangs_ || ended_; });
        return event.name == "fails" || ended_ ? std::optional<std::string>("it failed") : std::nullopt;
    }
    void End() override {
        const std::lock_guard lock(mutex_);
        ended_ = !ignoresEnd_;
        changed_.notify_all();
    }
    std::string Name() const override { return "hook x"; }

    void IgnoreEnd() {
        const std::lock_guard lock(mutex_);
        ignoresEnd_ = true;
    }
    void Hang(bool hangs) {
        const std::lock_guard lock(mutex_);
        hangs_ = hangs;
        changed_.notify_all();
    }
    void WaitUntilTold(std::size_t count) {
        std::unique_lock lock(mutex_);
        EXPECT_TRUE(changed_.wait_for(lock, kDeadline, [&] { return told_.size() >= count; }));
    }
    std::vector<std::string> Told() {
        const std::lock_guard lock(mutex_);
        return told_;
    }

 private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<std::string> told_;
    bool hangs_ = false;
    bool ended_ = false;
    bool ignoresEnd_ = false;
};

class HookQueueTest : public ::testing::Test {
 protected:
    const std::shared_ptr<FakeTarget> target_ = std::make_shared<FakeTarget>();
    HookQueue queue_{target_};
};

TEST_F(HookQueueTest, DeliversInOrder) {
    queue_.Post(Event("a"));
    queue_.Post(Event("b"));
    EXPECT_TRUE(queue_.Wait(kDeadline));
    EXPECT_THAT(target_->Told(), ElementsAre("a", "b"));
    EXPECT_EQ(queue_.Counts().delivered, 2u);
    EXPECT_THAT(queue_.TakeSentences(), IsEmpty());
}

TEST_F(HookQueueTest, TellsAndCountsEachFailureAndGoesOn) {
    queue_.Post(Event("fails"));
    queue_.Post(Event("throws"));
    queue_.Post(Event("c"));
    EXPECT_TRUE(queue_.Wait(kDeadline));
    EXPECT_THAT(queue_.TakeSentences(), ElementsAre("hook x was not told of fails: it failed",
                                                    "hook x was not told of throws: it threw"));
    EXPECT_THAT(queue_.TakeSentences(), IsEmpty());
    EXPECT_EQ(queue_.Counts().failed, 2u);
    EXPECT_EQ(queue_.Counts().delivered, 1u);
}

TEST_F(HookQueueTest, TheOldestGiveWayBehindATargetThatHangs) {
    target_->Hang(true);
    queue_.Post(Event("hangs"));
    target_->WaitUntilTold(1);
    for (std::size_t i = 0; i < HookQueue::kBound + 1; ++i) {
        queue_.Post(Event(std::to_string(i)));
    }
    EXPECT_THAT(queue_.TakeSentences(), ElementsAre("hook x was not told of 0: too many events wait for it"));
    target_->Hang(false);
    EXPECT_TRUE(queue_.Wait(kDeadline));
    EXPECT_EQ(queue_.Counts().delivered, HookQueue::kBound + 1);
}

TEST_F(HookQueueTest, TheEndGivesUpWhatIsNotDelivered) {
    target_->Hang(true);
    queue_.Post(Event("hangs"));
    queue_.Post(Event("waits"));
    target_->WaitUntilTold(1);
    EXPECT_FALSE(queue_.Wait(kNow));
    queue_.End();
    EXPECT_THAT(queue_.TakeSentences(),
                ElementsAre("hook x was not told of waits: it has not taken it before the end of the run",
                            "hook x was not told of hangs: it has not taken it before the end of the run"));
    EXPECT_THAT(target_->Told(), ElementsAre("hangs"));
    queue_.Post(Event("late"));
    EXPECT_EQ(queue_.Counts().failed, 3u);
    EXPECT_TRUE(queue_.Wait(kNow));
}

TEST_F(HookQueueTest, NobodyWaitsTwiceForATargetThatHearsNoEnd) {
    target_->IgnoreEnd();
    target_->Hang(true);
    queue_.Post(Event("hangs"));
    target_->WaitUntilTold(1);
    queue_.GiveUp();
    EXPECT_TRUE(queue_.Wait(kDeadline));
    EXPECT_EQ(queue_.Counts().delivered + queue_.Counts().failed, 0u);
    target_->Hang(false);
}

}  // namespace
}  // namespace receiver
