#include "journal/Journal.h"

#include <gtest/gtest.h>

namespace clipfile {
namespace {

constexpr const char* kText = R"({
  "version": 1,
  "frames_per_1000_seconds": 29970,
  "width": 320,
  "height": 180,
  "audio": {
    "codec": "AAC LC",
    "sample_rate": 48000,
    "channels": 2
  },
  "parameter_sets": [
    {
      "sps": "67640028ac",
      "pps": "68ee0f"
    }
  ],
  "files": [
    "20261121/CAM1/01_02_03_04.MP4"
  ]
}
)";

Journal MakeJournal() {
    Journal journal;
    journal.frameRate = 29970;
    journal.width = 320;
    journal.height = 180;
    journal.sets = {{{0x67, 0x64, 0x00, 0x28, 0xAC}, {0x68, 0xEE, 0x0F}}};
    journal.files = {"20261121/CAM1/01_02_03_04.MP4"};
    return journal;
}

std::string With(const std::string& from, const std::string& to) {
    std::string text = kText;
    text.replace(text.find(from), from.size(), to);
    return text;
}

TEST(Journal, HasATextThatPeopleCanRead) {
    EXPECT_EQ(ToText(MakeJournal()), kText);
}

TEST(Journal, ComesBackFromItsText) {
    const auto journal = ParseJournal(kText);
    ASSERT_TRUE(journal);
    EXPECT_EQ(journal->frameRate, 29970U);
    EXPECT_EQ(journal->width, 320U);
    EXPECT_EQ(journal->height, 180U);
    ASSERT_EQ(journal->sets.size(), 1U);
    EXPECT_EQ(journal->sets[0].sps, MakeJournal().sets[0].sps);
    EXPECT_EQ(journal->sets[0].pps, MakeJournal().sets[0].pps);
    EXPECT_EQ(journal->files, MakeJournal().files);
}

TEST(Journal, ATornTextIsNone) {
    const std::string whole = kText;
    for (std::size_t size = 0; size + 2 < whole.size(); ++size) {
        EXPECT_FALSE(ParseJournal(whole.substr(0, size))) << size;
    }
}

TEST(Journal, AFileOutsideOfItsFolderMakesItNone) {
    const std::string file = "20261121/CAM1/01_02_03_04.MP4";
    for (const char* const path :
         {"/etc/passwd", "../a.MP4", "a/../../b.MP4", "..", "", "a/", "a.MP4\\u0000/b"}) {
        EXPECT_FALSE(ParseJournal(With(file, path))) << path;
    }
}

TEST(Journal, ANameThatIsNotUtf8StandsAsItsBytes) {
    Journal journal = MakeJournal();
    journal.files = {"20261121/CAM\xE9/a.MP4"};
    const std::string text = ToText(journal);
    EXPECT_NE(text.find("\"hex\": \"32303236313132312f43414de92f612e4d5034\""), std::string::npos) << text;
    const auto read = ParseJournal(text);
    ASSERT_TRUE(read);
    EXPECT_EQ(read->files, journal.files);
    const std::string name = "\"20261121/CAM1/01_02_03_04.MP4\"";
    EXPECT_FALSE(ParseJournal(With(name, "{\"hex\": \"2e2e2f61\"}"))) << "../a";
    EXPECT_FALSE(ParseJournal(With(name, "{\"hex\": \"\"}")));
    EXPECT_FALSE(ParseJournal(With(name, "{}")));
    EXPECT_FALSE(ParseJournal(With(name, "17")));
}

TEST(Journal, WhatHasAnotherFormIsNone) {
    EXPECT_FALSE(ParseJournal(With("\"version\": 1", "\"version\": 2")));
    EXPECT_FALSE(ParseJournal(With("29970", "\"29970\"")));
    EXPECT_FALSE(ParseJournal(With("67640028ac", "67640028a")));
    EXPECT_FALSE(ParseJournal(With("67640028ac", "67640028ag")));
    EXPECT_FALSE(ParseJournal(With("67640028ac", "")));
    EXPECT_FALSE(ParseJournal(With("67640028ac", std::string(10000, '0'))));
    EXPECT_FALSE(ParseJournal(With("\"68ee0f\"", "null")));
    EXPECT_FALSE(ParseJournal("[]"));
    EXPECT_FALSE(ParseJournal("17"));
    EXPECT_FALSE(ParseJournal(std::string(100000, '[')));
}

TEST(Journal, HasOnlySoManyFilesAndSets) {
    Journal journal = MakeJournal();
    journal.files.resize(Journal::kMaxFiles + 1, "a.MP4");
    EXPECT_FALSE(ParseJournal(ToText(journal)));
    journal.files.pop_back();
    EXPECT_TRUE(ParseJournal(ToText(journal)));
    journal.sets.resize(Journal::kMaxSets + 1, journal.sets[0]);
    EXPECT_FALSE(ParseJournal(ToText(journal)));
}

}  // namespace
}  // namespace clipfile
