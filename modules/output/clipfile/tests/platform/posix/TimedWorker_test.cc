#include "platform/posix/TimedWorker.h"

#include <gtest/gtest.h>
#include <signal.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <future>
#include <memory>
#include <thread>

#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using std::chrono::steady_clock;

/// Tells which threads made and destroyed it.
struct Traced {
    struct Record {
        std::atomic<std::thread::id> madeBy{};
        std::atomic<std::thread::id> destroyedBy{};
    };
    explicit Traced(std::shared_ptr<Record> to) : record(std::move(to)) {
        record->madeBy = std::this_thread::get_id();
    }
    ~Traced() { record->destroyedBy = std::this_thread::get_id(); }
    Traced(const Traced&) = delete;
    Traced& operator=(const Traced&) = delete;

    const std::shared_ptr<Record> record;
};

class TimedWorkerTest : public ::testing::Test {
 protected:
    std::unique_ptr<TimedWorker<Traced>> make(milliseconds jobLimit, milliseconds endLimit) {
        return std::make_unique<TimedWorker<Traced>>([to = record] { return std::make_unique<Traced>(to); },
                                                     jobLimit, endLimit);
    }
    bool IsDestroyed() const { return record->destroyedBy.load() != std::thread::id(); }

    const std::shared_ptr<Traced::Record> record = std::make_shared<Traced::Record>();
};

TEST_F(TimedWorkerTest, RunsEachJobOnTheThreadThatOwnsTheResource) {
    auto worker = make(seconds(30), seconds(30));
    auto first = std::make_shared<std::thread::id>();
    EXPECT_EQ(worker->Run([first](Traced&) {
        *first = std::this_thread::get_id();
        return 7;
    }),
              7);
    EXPECT_EQ(worker->Run([](Traced&) { return 0; }), 0);
    EXPECT_NE(*first, std::this_thread::get_id());
    EXPECT_EQ(record->madeBy.load(), *first);
    worker.reset();
    EXPECT_EQ(record->destroyedBy.load(), *first);
}

TEST_F(TimedWorkerTest, HandlesNoSignalOfTheProcess) {
    auto worker = make(seconds(30), seconds(30));
    auto blocked = std::make_shared<std::pair<bool, bool>>();
    EXPECT_EQ(worker->Run([blocked](Traced&) {
        sigset_t mask;
        pthread_sigmask(SIG_SETMASK, nullptr, &mask);
        *blocked = {sigismember(&mask, SIGPIPE) == 1, sigismember(&mask, SIGTERM) == 1};
        return 0;
    }),
              0);
    EXPECT_TRUE(blocked->first);
    EXPECT_TRUE(blocked->second);
    sigset_t own;
    pthread_sigmask(SIG_SETMASK, nullptr, &own);
    EXPECT_EQ(sigismember(&own, SIGPIPE), 0);
}

TEST_F(TimedWorkerTest, LeavesAJobThatPassesTheLimitAndFailsEveryLaterOneAtOnce) {
    std::promise<void> answer;
    const std::shared_future<void> answered = answer.get_future().share();
    {
        auto worker = make(milliseconds(50), seconds(30));
        EXPECT_EQ(worker->Run([answered](Traced&) {
            answered.wait();
            return 0;
        }),
                  ETIMEDOUT);
        bool ran = false;
        const auto before = steady_clock::now();
        EXPECT_EQ(worker->Run([&ran](Traced&) {
            ran = true;
            return 0;
        }),
                  ETIMEDOUT);
        worker.reset();
        EXPECT_LT(steady_clock::now() - before, seconds(20));
        EXPECT_FALSE(ran);
        EXPECT_FALSE(IsDestroyed());
    }
    answer.set_value();
    EXPECT_TRUE(waitUntil([&] { return IsDestroyed(); }));
}

TEST_F(TimedWorkerTest, TakesATimeOutOfTheJobItselfForItsOwn) {
    auto worker = make(seconds(30), seconds(30));
    EXPECT_EQ(worker->Run([](Traced&) { return ETIMEDOUT; }), ETIMEDOUT);
    const auto ran = std::make_shared<bool>(false);
    EXPECT_EQ(worker->Run([ran](Traced&) {
        *ran = true;
        return 0;
    }),
              ETIMEDOUT);
    EXPECT_FALSE(*ran);
    worker.reset();
    EXPECT_TRUE(waitUntil([&] { return IsDestroyed(); }));
}

TEST_F(TimedWorkerTest, WaitsForAnEndThatTakesLongUpToItsLimit) {
    struct Slow {
        explicit Slow(std::shared_future<void> until) : answered(std::move(until)) {}
        ~Slow() { answered.wait(); }
        Slow(const Slow&) = delete;
        Slow& operator=(const Slow&) = delete;
        const std::shared_future<void> answered;
    };
    std::promise<void> answer;
    const std::shared_future<void> answered = answer.get_future().share();
    auto worker = std::make_unique<TimedWorker<Slow>>([answered] { return std::make_unique<Slow>(answered); },
                                                      seconds(30), milliseconds(50));
    const auto before = steady_clock::now();
    worker.reset();
    EXPECT_GE(steady_clock::now() - before, milliseconds(50));
    answer.set_value();
}

}  // namespace
}  // namespace clipfileModule
