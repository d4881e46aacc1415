#include "output/FolderWatch.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <atomic>
#include <condition_variable>
#include <map>
#include <mutex>
#include <thread>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

/// What a folder says, from any thread.
struct Script {
    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::optional<std::uint64_t> freeBytes = 7;
    /// By date.
    std::map<std::string, std::string> obstacles;
    bool hangs = false;
    int looks = 0;
};

class ScriptedFolder final : public OutputFolder {
 public:
    explicit ScriptedFolder(std::shared_ptr<Script> script) : script_(std::move(script)) {}

    bool Prepare() override { return false; }
    std::optional<std::uint64_t> FreeBytes() override {
        std::unique_lock lock(script_->mutex);
        ++script_->looks;
        script_->changed.notify_all();
        script_->changed.wait(lock, [this] { return !script_->hangs; });
        return script_->freeBytes;
    }
    std::string Obstacle(const std::string& date, const std::string& prefix) override {
        const std::lock_guard lock(script_->mutex);
        const auto found = script_->obstacles.find(date + "/" + prefix);
        return found == script_->obstacles.end() ? std::string() : found->second;
    }
    bool Exists(const std::string&) override { return false; }
    RecordedFile ReadBackFile(const std::string&) override { return {}; }

 private:
    const std::shared_ptr<Script> script_;
};

class FolderWatchTest : public ::testing::Test {
 protected:
    FolderWatchTest() {
        setenv("TZ", "UTC", 1);
        tzset();
    }
    void Start() {
        watch_.emplace(
            std::make_unique<ScriptedFolder>(script_), "CAM1", [this] { return now_.load(); },
            std::chrono::milliseconds(1));
    }
    void Set(const std::function<void(Script&)>& change) {
        const std::lock_guard lock(script_->mutex);
        change(*script_);
        script_->changed.notify_all();
    }
    /// Waits for looks that begin from now on.
    void WaitForLooks(int count) {
        std::unique_lock lock(script_->mutex);
        const int end = script_->looks + count;
        EXPECT_TRUE(
            script_->changed.wait_for(lock, std::chrono::seconds(30), [&] { return script_->looks >= end; }));
    }

    // 2026-11-21, 12:00:00 UTC.
    static constexpr std::time_t kNoon = 1795262400;
    const std::shared_ptr<Script> script_ = std::make_shared<Script>();
    std::atomic<std::time_t> now_ = kNoon;
    std::optional<FolderWatch> watch_;
};

TEST_F(FolderWatchTest, DatesAreThoseOfTheLocalTime) {
    EXPECT_EQ(DateOf(kNoon), "20261121");
    setenv("TZ", "UTC-13", 1);
    tzset();
    EXPECT_EQ(DateOf(kNoon), "20261122");
}

TEST_F(FolderWatchTest, TomorrowIsTheNextDateAlsoWhereADayHas23Or25Hours) {
    // Central Europe: summer from the last Sunday of March to the last one of October.
    setenv("TZ", "CET-1CEST,M3.5.0,M10.5.0/3", 1);
    tzset();
    // 2026-03-28, 23:30 local time; 2026-10-25, 00:30; 2026-12-31, 12:00.
    EXPECT_EQ(DateAfter(1774737000), "20260329");
    EXPECT_EQ(DateAfter(1792881000), "20261026");
    EXPECT_EQ(DateAfter(1798714800), "20270101");
    ScriptedFolder folder(script_);
    Set([](Script& script) { script.obstacles["20260329/CAM1"] = "closed"; });
    EXPECT_THROW(ExpectDatedFolders(folder, "CAM1", 1774737000), ReceiverError);
}

TEST_F(FolderWatchTest, TellsTheLatestFreeSpace) {
    Start();
    WaitForLooks(2);
    EXPECT_EQ(watch_->FreeBytes(), 7U);
    Set([](Script& script) { script.freeBytes = 5; });
    WaitForLooks(2);
    EXPECT_EQ(watch_->FreeBytes(), 5U);
    EXPECT_EQ(watch_->Obstacle(), "");
    EXPECT_EQ(watch_->TakeWarning(), std::nullopt);
}

TEST_F(FolderWatchTest, AnObstacleOfTodayIsToldWhileItLasts) {
    Start();
    Set([](Script& script) { script.obstacles["20261121/CAM1"] = "closed"; });
    WaitForLooks(2);
    EXPECT_EQ(watch_->Obstacle(), "closed");
    Set([](Script& script) { script.obstacles.clear(); });
    WaitForLooks(2);
    EXPECT_EQ(watch_->Obstacle(), "");
}

TEST_F(FolderWatchTest, AnObstacleOfTomorrowIsAWarningOnceUntilTheLastMinute) {
    Set([](Script& script) { script.obstacles["20261122/CAM1"] = "closed"; });
    now_ = kNoon + 43200 - 61;
    Start();
    WaitForLooks(3);
    EXPECT_EQ(watch_->Obstacle(), "");
    EXPECT_EQ(watch_->TakeWarning(), "closed");
    WaitForLooks(2);
    EXPECT_EQ(watch_->TakeWarning(), std::nullopt);
    now_ = kNoon + 43200 - 60;
    WaitForLooks(2);
    EXPECT_EQ(watch_->Obstacle(), "closed");
}

TEST_F(FolderWatchTest, AFolderThatHangsHoldsUpNobody) {
    Set([](Script& script) { script.hangs = true; });
    Start();
    {
        std::unique_lock lock(script_->mutex);
        script_->changed.wait(lock, [this] { return script_->looks > 0; });
    }
    EXPECT_EQ(watch_->FreeBytes(), std::nullopt);
    EXPECT_EQ(watch_->Obstacle(), "");
    watch_.reset();
    Set([](Script& script) { script.hangs = false; });
}

}  // namespace
}  // namespace receiver
