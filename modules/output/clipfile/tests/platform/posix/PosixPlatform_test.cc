#include "platform/posix/PosixPlatform.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <time.h>

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <future>
#include <limits>
#include <memory>
#include <string>
#include <thread>

#include "support/TempDir.h"

namespace clipfileModule {

void PrintTo(const LocalTime& time, std::ostream* out) {
    *out << time.year << "-" << time.month << "-" << time.day << " " << time.hour << ":" << time.minute << ":"
         << time.second;
}

static bool operator==(const LocalTime& a, const LocalTime& b) {
    return a.year == b.year && a.month == b.month && a.day == b.day && a.hour == b.hour &&
           a.minute == b.minute && a.second == b.second;
}

namespace {

namespace fs = std::filesystem;
using std::chrono::system_clock;

/// Sets the time zone of the process for a test. Each test is a process of its own under ctest.
class TimeZone {
 public:
    explicit TimeZone(const char* zone) {
        setenv("TZ", zone, 1);
        tzset();
    }
    ~TimeZone() {
        unsetenv("TZ");
        tzset();
    }
};

system_clock::time_point At(std::int64_t seconds) {
    return system_clock::time_point(std::chrono::seconds(seconds));
}

TEST(PosixPlatform, TellsLocalTimeByTheZone) {
    const PosixPlatform platform;
    const TimeZone zone("EST5EDT,M3.2.0,M11.1.0");
    // 2026-11-20 04:30:15 UTC is the evening before in winter time; 2026-07-01 00:00:00 UTC is in summer
    // time.
    EXPECT_EQ(platform.ToLocalTime(At(1795149015)), (LocalTime{2026, 11, 19, 23, 30, 15}));
    EXPECT_EQ(platform.ToLocalTime(At(1782864000)), (LocalTime{2026, 6, 30, 20, 0, 0}));
}

TEST(PosixPlatform, CutsLocalTimeToWholeSecondsAlsoBefore1970) {
    const PosixPlatform platform;
    const TimeZone zone("UTC0");
    using std::chrono::milliseconds;
    EXPECT_EQ(platform.ToLocalTime(At(0) + milliseconds(999)), (LocalTime{1970, 1, 1, 0, 0, 0}));
    EXPECT_EQ(platform.ToLocalTime(At(0) - milliseconds(1)), (LocalTime{1969, 12, 31, 23, 59, 59}));
}

TEST(PosixPlatform, TellsTimesPast32BitSeconds) {
    const PosixPlatform platform;
    const TimeZone zone("UTC0");
    EXPECT_EQ(platform.ToLocalTime(At(4102444800)), (LocalTime{2100, 1, 1, 0, 0, 0}));
}

TEST(PosixPlatform, ReadsTheSystemClock) {
    const PosixPlatform platform;
    const auto before = system_clock::now();
    const auto now = platform.Now();
    EXPECT_LE(before, now);
    EXPECT_LE(now, system_clock::now());
}

TEST(PosixPlatform, TurnsBackslashesIntoSlashesAndNothingElse) {
    const PosixPlatform platform;
    EXPECT_EQ(platform.NativePath("\\rec\\20261120\\Cam A\\"), "/rec/20261120/Cam A/");
    EXPECT_EQ(platform.NativePath("\\\\server\\share"), "//server/share");
    EXPECT_EQ(platform.NativePath("/rec/\xE3\x82\xAF\\01_02_03_04(2).MP4"),
              "/rec/\xE3\x82\xAF/01_02_03_04(2).MP4");
    EXPECT_EQ(platform.NativePath(""), "");
}

TEST(PosixPlatform, TellsTheSpaceThatTheCallerMayUse) {
    const PosixPlatform platform;
    const TempDir dir;
    // Other programs write meanwhile, so the same number has to come out only once in many readings.
    bool equal = false;
    for (int i = 0; i < 1000 && !equal; ++i) {
        std::uint64_t bytes = 0;
        ASSERT_EQ(platform.AvailableSpace(dir.ModulePath(), bytes), 0);
        equal = bytes == fs::space(dir.Path()).available;
    }
    EXPECT_TRUE(equal);
}

TEST(PosixPlatform, ReportsWhyTheSpaceCannotBeTold) {
    const PosixPlatform platform;
    const TempDir dir;
    std::uint64_t bytes = 42;
    EXPECT_EQ(platform.AvailableSpace(dir.ModulePath() + "\\none", bytes), ENOENT);
    EXPECT_EQ(platform.AvailableSpace("", bytes), ENOENT);
    EXPECT_EQ(bytes, 42u);
}

TEST(PosixPlatform, CountsSpaceIn64Bits) {
    constexpr std::uint64_t kMost = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(PosixPlatform::ToBytes(0x100000000, 4096), 0x100000000000u);
    EXPECT_EQ(PosixPlatform::ToBytes(3, 512), 1536u);
    EXPECT_EQ(PosixPlatform::ToBytes(5, 0), 0u);
    EXPECT_EQ(PosixPlatform::ToBytes(kMost / 4096, 4096), kMost / 4096 * 4096);
    EXPECT_EQ(PosixPlatform::ToBytes(kMost / 4096 + 1, 4096), kMost);
}

TEST(PosixPlatform, TellsWhetherThereIsAnythingAtAPath) {
    const PosixPlatform platform;
    const TempDir dir;
    std::ofstream(dir.Path() / "file") << "x";
    fs::create_symlink("loop", dir.Path() / "loop");
    EXPECT_EQ(platform.TestExistence(dir.ModulePath()), 0);
    EXPECT_EQ(platform.TestExistence(dir.ModulePath() + "\\file"), 0);
    EXPECT_EQ(platform.TestExistence(dir.ModulePath() + "\\none"), kNoSuchPath);
    EXPECT_EQ(platform.TestExistence(dir.ModulePath() + "\\none\\none"), kNoSuchPath);
    EXPECT_EQ(platform.TestExistence(dir.ModulePath() + "\\file\\none"), ENOTDIR);
    EXPECT_EQ(platform.TestExistence(dir.ModulePath() + "\\loop"), ELOOP);
}

TEST(PosixPlatform, MakesDirectoriesByPathsOfTheModule) {
    const PosixPlatform platform;
    const TempDir dir;
    const std::string path = dir.ModulePath() + "\\20261120\\Cam";
    EXPECT_FALSE(platform.Exists(path));
    boost::system::error_code error;
    EXPECT_TRUE(platform.CreateDirectories(path, error));
    EXPECT_TRUE(platform.Exists(path));
    EXPECT_TRUE(fs::is_directory(dir.Path() / "20261120" / "Cam"));
}

TEST(PosixPlatform, ALogonToNoShareFails) {
    const PosixPlatform platform;
    clipfileModule::LogonToken token = clipfileModule::kNoLogon;
    EXPECT_NE(platform.Logon("user", "\\\\server", "secret", token), 0);
    EXPECT_EQ(token, clipfileModule::kNoLogon);
}

TEST(PosixPlatform, GivesUpAThreadWithoutWaitingForIt) {
    const PosixPlatform platform;
    struct Signals {
        std::promise<void> release;
        std::promise<void> ended;
    };
    // The thread outlives its owner, and so does what it uses.
    const auto signals = std::make_shared<Signals>();
    std::future<void> ended = signals->ended.get_future();
    std::thread thread([signals] {
        signals->release.get_future().wait();
        signals->ended.set_value();
    });
    platform.GiveUp(thread);
    EXPECT_FALSE(thread.joinable());
    signals->release.set_value();
    ended.wait();
}

TEST(PosixPlatform, IsTheSystemThatTheModuleRunsOn) {
    EXPECT_NE(dynamic_cast<const PosixPlatform*>(&GetPlatform()), nullptr);
}

}  // namespace
}  // namespace clipfileModule
