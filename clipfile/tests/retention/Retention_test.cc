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
        const RetentionSystem system{
            .freeBytes = [this](const fs::path&) { return free_ + (freesAtOnce_ ? Freed() : settled_); },
            .settle = [this](const fs::path&) { settled_ = freesLate_ ? Freed() : 0; },
            .fileSystem = [this](const fs::path& path) { return path == elsewhere_ ? 2 : 1; },
            .now = [this] { return now_; }};
        return Retain(options_, system, [this](const RetentionStep& step) {
            (step.removed ? removed_ : kept_).push_back(step.path);
            reasons_.push_back(step.reason);
        });
    }
    /// Recordings, the oldest last, and what each of them holds on the disk.
    void RecordThree() {
        made_ = {Record("a", hours(1)), Record("b", hours(2)), Record("c", hours(3))};
        for (const fs::path& path : made_) {
            struct stat status {};
            ASSERT_EQ(stat(path.c_str(), &status), 0);
            held_.push_back(static_cast<std::uint64_t>(status.st_blocks) * 512);
            ASSERT_GT(held_.back(), 0u);
        }
    }
    /// What those held that are gone.
    std::uint64_t Freed() const {
        std::uint64_t freed = 0;
        for (std::size_t i = 0; i < made_.size(); ++i) {
            freed += fs::exists(made_[i]) ? 0 : held_[i];
        }
        return freed;
    }

    TempDir folder_;
    RetentionOptions options_;
    const fs::file_time_type now_ = fs::file_time_type::clock::now();
    // The disk:
    std::uint64_t free_ = 0;
    bool freesAtOnce_ = true;
    bool freesLate_ = false;
    std::uint64_t settled_ = 0;
    fs::path elsewhere_;

    std::vector<fs::path> made_;
    std::vector<std::uint64_t> held_;
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

TEST_F(RetentionTest, TheOldestGoUntilThereIsRoom) {
    RecordThree();
    options_.keepFree = held_[2] + 1;
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(made_[2].string(), made_[1].string()));
    EXPECT_TRUE(fs::exists(made_[0]));
    options_.keepFree = 1'000'000'000;
    EXPECT_FALSE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(made_[0].string()));
}

TEST_F(RetentionTest, ADryRunTellsTheSameAndRemovesNothing) {
    RecordThree();
    options_.dryRun = true;
    options_.keepFree = held_[2] + 1;
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(made_[2].string(), made_[1].string()));
    EXPECT_TRUE(fs::exists(made_[2]));
    EXPECT_TRUE(fs::exists(made_[1]));
}

TEST_F(RetentionTest, BehindAFileThatFreesNothingNoneGoes) {
    // As with snapshots.
    freesAtOnce_ = false;
    RecordThree();
    options_.keepFree = 1'000'000'000;
    const RetentionResult result = Run();
    EXPECT_THAT(removed_, ElementsAre(made_[2].string()));
    EXPECT_FALSE(result.isRoom);
    EXPECT_THAT(result.standstill, HasSubstr("removing " + made_[2].string() + " freed nothing"));
}

TEST_F(RetentionTest, ADiskThatFreesLateIsWaitedFor) {
    freesAtOnce_ = false;
    freesLate_ = true;
    RecordThree();
    options_.keepFree = held_[2] + 1;
    const RetentionResult result = Run();
    EXPECT_THAT(removed_, ElementsAre(made_[2].string(), made_[1].string()));
    EXPECT_TRUE(result.isRoom);
    EXPECT_THAT(result.standstill, IsEmpty());
}

TEST_F(RetentionTest, NoMoreGoThanHaveToByTheirSizesThoughOthersFillTheDisk) {
    RecordThree();
    options_.keepFree = held_[2] + 1;
    RetentionSystem system{.freeBytes = [this](const fs::path&) { return Freed() / 2; },
                           .settle = [](const fs::path&) {},
                           .fileSystem = [](const fs::path&) { return 1; },
                           .now = [this] { return now_; }};
    EXPECT_FALSE(Retain(options_, system, [](const RetentionStep&) {}).isRoom);
    EXPECT_TRUE(fs::exists(made_[0]));
    EXPECT_FALSE(fs::exists(made_[1]));
}

TEST_F(RetentionTest, WhatHasAnotherNameDoesNotGoForRoom) {
    RecordThree();
    fs::create_hard_link(made_[2], folder_.Path() / "ingest");
    options_.keepFree = 1;
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(kept_, ElementsAre(made_[2].string()));
    EXPECT_THAT(reasons_.front(), HasSubstr("without it no more would be free"));
    EXPECT_THAT(removed_, ElementsAre(made_[1].string()));
    // It may go for its age.
    options_.olderThan = hours(2);
    Run();
    EXPECT_THAT(removed_, ElementsAre(made_[2].string()));
}

TEST_F(RetentionTest, WhatLiesOnAnotherDiskDoesNotGoForRoom) {
    RecordThree();
    elsewhere_ = made_[2];
    options_.keepFree = 1;
    EXPECT_TRUE(Run().isRoom);
    EXPECT_THAT(removed_, ElementsAre(made_[1].string()));
    EXPECT_THAT(kept_, IsEmpty());
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
