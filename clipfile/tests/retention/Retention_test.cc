#include "retention/Retention.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <fstream>

#include "common/ToolError.h"
#include "recover/OriginalFile.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using std::chrono::hours;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
namespace fs = std::filesystem;

class RetentionTest : public testing::Test {
 protected:
    RetentionTest() { options_.folder = folder_.Path(); }

    /// A recording that was closed so long ago.
    fs::path Record(const std::string& folder, hours age, bool close = true) {
        fs::create_directories(folder_.Path() / folder);
        const fs::path path = folder_.Path() / folder / "01_02_03_04.MP4";
        test_stream::Record(path, {"normal", clipfileModule::RecordRules::kExact, close},
                            test_stream::MakePlainStream(2));
        return Aged(path, age);
    }
    fs::path Aged(const fs::path& path, hours age) const {
        fs::last_write_time(path, now_ - age);
        return path;
    }
    RetentionResult Run() {
        removed_.clear();
        kept_.clear();
        reasons_.clear();
        // However much goes: as on a disk that frees late.
        const RetentionSystem system{[this](const fs::path&) { return free_; }, [this] { return now_; }};
        return Retain(options_, system, [this](const RetentionStep& step) {
            (step.removed ? removed_ : kept_).push_back(step.path);
            reasons_.push_back(step.reason);
        });
    }
    /// Bytes of the disk that a file takes.
    static std::uint64_t Taken(const fs::path& path) {
        struct stat status {};
        EXPECT_EQ(stat(path.c_str(), &status), 0);
        return static_cast<std::uint64_t>(status.st_blocks) * 512;
    }

    TempDir folder_;
    RetentionOptions options_;
    const fs::file_time_type now_ = fs::file_time_type::clock::now();
    std::uint64_t free_ = 0;
    std::vector<std::string> removed_;
    std::vector<std::string> kept_;
    std::vector<std::string> reasons_;
};

TEST_F(RetentionTest, WithoutALimitNothingGoes) {
    const fs::path old = Record("a", hours(9999));
    EXPECT_TRUE(Run().isRoom);
    EXPECT_TRUE(fs::exists(old));
    EXPECT_THAT(reasons_, IsEmpty());
}

TEST_F(RetentionTest, WhatIsOlderGoesFromTheOldestOn) {
    const fs::path newer = Record("a", hours(25));
    const fs::path young = Record("b", hours(23));
    const fs::path oldest = Record("c/d", hours(50));
    options_.olderThan = hours(24);
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(oldest.string(), newer.string()));
    EXPECT_FALSE(fs::exists(oldest));
    EXPECT_FALSE(fs::exists(newer));
    EXPECT_TRUE(fs::exists(young));
}

TEST_F(RetentionTest, TheOldestGoUntilThereIsRoomAndNoMore) {
    const fs::path young = Record("a", hours(1));
    const fs::path oldest = Record("b", hours(3));
    const fs::path older = Record("c", hours(2));
    free_ = 1000;
    options_.keepFree = free_ + Taken(oldest) + 1;
    for (const bool dryRun : {true, false}) {
        options_.dryRun = dryRun;
        EXPECT_TRUE(Run().isRoom);
        EXPECT_THAT(removed_, ElementsAre(oldest.string(), older.string()));
        EXPECT_EQ(fs::exists(oldest), dryRun);
        EXPECT_EQ(fs::exists(older), dryRun);
    }
    EXPECT_TRUE(fs::exists(young));
    options_.keepFree = 1'000'000'000'000;
    EXPECT_FALSE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(young.string()));
}

TEST_F(RetentionTest, AFileThatHasAnotherNameDoesNotGoForRoom) {
    const fs::path linked = Record("a", hours(2));
    fs::create_hard_link(linked, folder_.Path() / "ingest");
    const fs::path other = Record("b", hours(1));
    free_ = 1000;
    options_.keepFree = free_ + 1;
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(other.string()));
    EXPECT_TRUE(fs::exists(linked));
}

TEST_F(RetentionTest, WhatIsNotClosedStaysAndIsTold) {
    const fs::path unfinished = Record("a", hours(50), false);
    options_.olderThan = hours(24);
    Run();
    EXPECT_THAT(kept_, ElementsAre(unfinished.string()));
    EXPECT_THAT(reasons_, ElementsAre(HasSubstr("It is not closed.")));
    EXPECT_TRUE(fs::exists(unfinished));
}

TEST_F(RetentionTest, WhatCannotBeVerifiedStaysAndIsTold) {
    const fs::path text = folder_.Path() / "01_00_00_00.MP4";
    std::ofstream(text) << "no recording";
    Aged(text, hours(50));
    const fs::path damaged = Record("a", hours(40));
    fs::resize_file(damaged, fs::file_size(damaged) - 10);
    Aged(damaged, hours(40));
    options_.olderThan = hours(24);
    Run();
    EXPECT_THAT(removed_, IsEmpty());
    EXPECT_THAT(kept_, ElementsAre(text.string(), damaged.string()));
}

TEST_F(RetentionTest, WhatSomebodyHoldsStaysAndIsTold) {
    const fs::path path = Record("a", hours(50));
    options_.olderThan = hours(24);
    {
        const OriginalFile held(path);
        Run();
    }
    EXPECT_THAT(kept_, ElementsAre(path.string()));
    EXPECT_TRUE(fs::exists(path));
    Run();
    EXPECT_THAT(removed_, ElementsAre(path.string()));
}

TEST_F(RetentionTest, LinksAndWhatTheyLeadToStay) {
    TempDir elsewhere;
    const fs::path target = elsewhere.Path() / "01_02_03_04.MP4";
    test_stream::Record(target, {}, test_stream::MakePlainStream(2));
    Aged(target, hours(50));
    fs::create_symlink(target, folder_.Path() / "01_02_03_04.MP4");
    fs::create_directory_symlink(elsewhere.Path(), folder_.Path() / "a");
    options_.olderThan = hours(24);
    Run();
    EXPECT_THAT(reasons_, IsEmpty());
    EXPECT_TRUE(fs::exists(target));
}

TEST_F(RetentionTest, AFolderThatIsMissingIsAFault) {
    options_.folder = folder_.Path() / "none";
    options_.olderThan = hours(24);
    EXPECT_THAT(Run().faults, ElementsAre(HasSubstr("No such file or directory")));
    options_.keepFree = 1;
    EXPECT_THROW(Retain(options_, ThisSystem(), [](const RetentionStep&) {}), ToolError);
}

TEST(RetentionTextTest, AgesAreDaysOrHours) {
    EXPECT_EQ(ParseAge("30d"), hours(720));
    EXPECT_EQ(ParseAge("12h"), hours(12));
    for (const char* const text : {"", "d", "30", "0d", "-1d", "1.5d", "30 d", "30D", "30dd",
                                   "99999999999999999999d", "9223372036854775807d", "10001d"}) {
        EXPECT_EQ(ParseAge(text), std::nullopt) << text;
    }
}

TEST(RetentionTextTest, SizesArePowersOfAThousand) {
    EXPECT_EQ(ParseBytes("500M"), 500'000'000u);
    EXPECT_EQ(ParseBytes("200G"), 200'000'000'000u);
    EXPECT_EQ(ParseBytes("2T"), 2'000'000'000'000u);
    for (const char* const text : {"", "G", "200", "0G", "-1G", "1.5G", "200GB", "99999999999T"}) {
        EXPECT_EQ(ParseBytes(text), std::nullopt) << text;
    }
}

}  // namespace
}  // namespace clipfile
