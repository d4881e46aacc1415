#include "journal/RecordingJournal.h"

#include <gtest/gtest.h>

#include <fstream>
#include <functional>
#include <thread>

#include "fakes/FakeSource.h"
#include "journal/JournalFile.h"
#include "support/TempDir.h"

namespace receiver {
namespace {

class RecordingJournalTest : public ::testing::Test {
 protected:
    static bool WaitFor(const std::function<bool()>& condition) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        bool holds = condition();
        while (!holds && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            holds = condition();
        }
        return holds;
    }
    std::optional<clipfile::Journal> OnDisk() const {
        const auto journals = clipfile::JournalsIn(folder_.Path());
        return journals.size() == 1 ? clipfile::ReadJournal(journals[0]) : std::nullopt;
    }
    /// Waits for a journal like that, and returns it.
    clipfile::Journal WaitForJournal(const std::function<bool(const clipfile::Journal&)>& isIt) const {
        clipfile::Journal found;
        EXPECT_TRUE(WaitFor([&] {
            const auto journal = OnDisk();
            found = journal.value_or(clipfile::Journal());
            return journal && isIt(*journal);
        }));
        return found;
    }
    static bool IsAny(const clipfile::Journal&) { return true; }
    std::string In(const std::string& file) const { return folder_.Path().string() + "/" + file; }

    TempDir folder_;
};

TEST_F(RecordingJournalTest, NamesTheFilesThatAreOpenAndNothingElse) {
    RecordingJournal journal(folder_.Path());
    journal.Describe(FakeSource(1).Description());
    EXPECT_EQ(OnDisk(), std::nullopt);
    using Files = std::vector<std::string>;
    journal.SetOpenFiles({In("20261121/CAM1/a.MP4")});
    WaitForJournal([](const auto& it) { return it.files == Files{"20261121/CAM1/a.MP4"}; });
    journal.SetOpenFiles({In("20261121/CAM1/a.MP4"), In("b.MP4")});
    const auto onDisk = WaitForJournal([](const auto& it) { return it.files.size() == 2; });
    EXPECT_EQ(onDisk.frameRate, 25000U);
    EXPECT_EQ(onDisk.width, 320U);
    EXPECT_EQ(onDisk.height, 180U);
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
    const auto onDisk = WaitForJournal(IsAny);
    ASSERT_EQ(onDisk.sets.size(), 1U);
    EXPECT_EQ(onDisk.sets[0].sps, (std::vector<unsigned char>{0x67, 0x42, 0xC0, 0x1E, 0x95, 0xA0}));
    EXPECT_EQ(onDisk.sets[0].pps, (std::vector<unsigned char>{0x68, 0xCE, 0x3C, 0x80}));
}

TEST_F(RecordingJournalTest, ParameterSetsThatFollowStandInFront) {
    RecordingJournal journal(folder_.Path());
    journal.SetOpenFiles({In("a.MP4")});
    SourceUnit other = MakeFrame(0, true, 1);
    other.data.get()[9] = 0xA1;
    journal.LookAt(MakeFrame(0, true, 1));
    journal.LookAt(other);
    const auto onDisk = WaitForJournal([](const auto& it) { return it.sets.size() == 2; });
    ASSERT_EQ(onDisk.sets.size(), 2U);
    EXPECT_EQ(onDisk.sets[0].sps.back(), 0xA1);
    EXPECT_EQ(onDisk.sets[1].sps.back(), 0xA0);
    journal.LookAt(MakeFrame(0, true, 1));
    const auto next =
        WaitForJournal([](const auto& it) { return !it.sets.empty() && it.sets[0].sps.back() == 0xA0; });
    EXPECT_EQ(next.sets.size(), 2U);
}

TEST_F(RecordingJournalTest, NamesTheNewestFilesBelowItsFolder) {
    RecordingJournal journal(folder_.Path() / "." / "");
    std::vector<std::string> files = {"/elsewhere/a.MP4"};
    for (std::size_t i = 0; i < clipfile::Journal::kMaxFiles + 1; ++i) {
        files.push_back(In(std::to_string(i) + ".MP4"));
    }
    journal.SetOpenFiles(files);
    const auto onDisk = WaitForJournal(IsAny);
    ASSERT_EQ(onDisk.files.size(), clipfile::Journal::kMaxFiles);
    EXPECT_EQ(onDisk.files.front(), "1.MP4");
    EXPECT_EQ(onDisk.files.back(), "256.MP4");
}

TEST_F(RecordingJournalTest, StaysWithFilesThatAreOpenAtTheEnd) {
    {
        RecordingJournal journal(folder_.Path());
        journal.SetOpenFiles({In("a.MP4")});
        WaitForJournal(IsAny);
    }
    // Its thread may end behind the object.
    const auto journals = clipfile::JournalsIn(folder_.Path());
    ASSERT_EQ(journals.size(), 1U);
    EXPECT_TRUE(WaitFor([&] { return clipfile::JournalFile::Claim(journals[0]).has_value(); }));
    EXPECT_EQ(WaitForJournal(IsAny).files, std::vector<std::string>{"a.MP4"});
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
