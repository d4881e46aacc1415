#include "journal/RecordingJournal.h"

#include <gtest/gtest.h>

#include <fstream>
#include <functional>

#include "fakes/FakeSource.h"
#include "journal/JournalFile.h"
#include "support/TempDir.h"

namespace receiver {
namespace {

class RecordingJournalTest : public ::testing::Test {
 protected:
    static bool WaitFor(const std::function<bool()>& condition) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        while (!condition() && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        return condition();
    }
    std::optional<clipfile::Journal> OnDisk() const {
        const auto journals = clipfile::JournalsIn(folder_.Path());
        return journals.size() == 1 ? clipfile::ReadJournal(journals[0]) : std::nullopt;
    }
    std::string In(const std::string& file) const { return folder_.Path().string() + "/" + file; }

    TempDir folder_;
};

TEST_F(RecordingJournalTest, NamesTheFilesThatAreOpenAndNothingElse) {
    RecordingJournal journal(folder_.Path());
    journal.Describe(FakeSource(1).Description());
    EXPECT_EQ(OnDisk(), std::nullopt);
    using Files = std::vector<std::string>;
    journal.SetOpenFiles({In("20261121/CAM1/a.MP4")});
    EXPECT_TRUE(WaitFor([&] { return OnDisk() && OnDisk()->files == Files{"20261121/CAM1/a.MP4"}; }));
    journal.SetOpenFiles({In("20261121/CAM1/a.MP4"), In("b.MP4")});
    EXPECT_TRUE(WaitFor([&] { return OnDisk() && OnDisk()->files.size() == 2; }));
    EXPECT_EQ(OnDisk()->frameRate, 25000U);
    EXPECT_EQ(OnDisk()->width, 320U);
    EXPECT_EQ(OnDisk()->height, 180U);
    journal.SetOpenFiles({});
    EXPECT_TRUE(WaitFor([&] { return clipfile::JournalsIn(folder_.Path()).empty(); }));
    EXPECT_EQ(journal.TakeWarning(), std::nullopt);
}

TEST_F(RecordingJournalTest, HasTheParameterSetsOfTheStream) {
    RecordingJournal journal(folder_.Path());
    journal.LookAt(MakeFrame(0, true, 1));
    journal.SetOpenFiles({In("a.MP4")});
    journal.LookAt(MakeFrame(3600, false, 2));
    journal.LookAt(MakeFrame(7200, true, 3));
    journal.LookAt(MakeAudio(0));
    ASSERT_TRUE(WaitFor([&] { return OnDisk().has_value(); }));
    ASSERT_EQ(OnDisk()->sets.size(), 1U);
    EXPECT_EQ(OnDisk()->sets[0].sps, (std::vector<unsigned char>{0x67, 0x42, 0xC0, 0x1E, 0x95, 0xA0}));
    EXPECT_EQ(OnDisk()->sets[0].pps, (std::vector<unsigned char>{0x68, 0xCE, 0x3C, 0x80}));
}

TEST_F(RecordingJournalTest, ParameterSetsThatFollowStandInFront) {
    RecordingJournal journal(folder_.Path());
    journal.SetOpenFiles({In("a.MP4")});
    SourceUnit other = MakeFrame(0, true, 1);
    other.data.get()[9] = 0xA1;
    journal.LookAt(MakeFrame(0, true, 1));
    journal.LookAt(other);
    ASSERT_TRUE(WaitFor([&] { return OnDisk() && OnDisk()->sets.size() == 2; }));
    EXPECT_EQ(OnDisk()->sets[0].sps.back(), 0xA1);
    EXPECT_EQ(OnDisk()->sets[1].sps.back(), 0xA0);
    journal.LookAt(MakeFrame(0, true, 1));
    ASSERT_TRUE(WaitFor([&] { return OnDisk()->sets[0].sps.back() == 0xA0; }));
    EXPECT_EQ(OnDisk()->sets.size(), 2U);
}

TEST_F(RecordingJournalTest, NamesTheNewestFilesBelowItsFolder) {
    RecordingJournal journal(folder_.Path() / "." / "");
    std::vector<std::string> files = {"/elsewhere/a.MP4"};
    for (std::size_t i = 0; i < clipfile::Journal::kMaxFiles + 1; ++i) {
        files.push_back(In(std::to_string(i) + ".MP4"));
    }
    journal.SetOpenFiles(files);
    ASSERT_TRUE(WaitFor([&] { return OnDisk().has_value(); }));
    EXPECT_EQ(OnDisk()->files.size(), clipfile::Journal::kMaxFiles);
    EXPECT_EQ(OnDisk()->files.front(), "1.MP4");
    EXPECT_EQ(OnDisk()->files.back(), "256.MP4");
}

TEST_F(RecordingJournalTest, StaysWithFilesThatAreOpenAtTheEnd) {
    {
        RecordingJournal journal(folder_.Path());
        journal.SetOpenFiles({In("a.MP4")});
        ASSERT_TRUE(WaitFor([&] { return OnDisk().has_value(); }));
    }
    ASSERT_TRUE(OnDisk());
    EXPECT_TRUE(clipfile::JournalFile::Claim(clipfile::JournalsIn(folder_.Path())[0]));
}

TEST_F(RecordingJournalTest, AFolderThatTakesNoneIsToldOnce) {
    RecordingJournal journal(folder_.Path() / "gone");
    journal.SetOpenFiles({In("gone/a.MP4")});
    std::optional<std::string> warning;
    ASSERT_TRUE(WaitFor([&] {
        warning = warning ? warning : journal.TakeWarning();
        return warning.has_value();
    }));
    EXPECT_TRUE(warning->starts_with("no journal can be kept, ")) << *warning;
    EXPECT_NE(warning->find("No such file or directory"), std::string::npos) << *warning;
    std::filesystem::create_directory(folder_.Path() / "gone");
    journal.SetOpenFiles({In("gone/b.MP4")});
    EXPECT_TRUE(WaitFor([&] { return clipfile::JournalsIn(folder_.Path() / "gone").size() == 1; }));
    EXPECT_EQ(journal.TakeWarning(), std::nullopt);
}

}  // namespace
}  // namespace receiver
