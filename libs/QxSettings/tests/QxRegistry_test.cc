#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <string>

#include "TempDir.h"

namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

const std::string kHead = "[Qx/Other/MP4FileOut]\n";

/// Everything that a fresh process prints which finds its settings at `path`.
std::string Probe(const std::string& path, const std::string& arguments) {
    const std::string command = "QX_SETTINGS='" + path + "' '" SETTINGS_PROBE "' " + arguments + " 2>&1";
    std::FILE* const pipe = popen(command.c_str(), "r");
    if (pipe == nullptr) {
        ADD_FAILURE() << command;
        return {};
    }
    std::string output;
    std::array<char, 4096> block;
    while (const std::size_t got = std::fread(block.data(), 1, block.size(), pipe)) {
        output.append(block.data(), got);
    }
    EXPECT_EQ(pclose(pipe), 0) << command << "\n" << output;
    return output;
}

TEST(QxRegistry, GivesTextsAsTheyStand) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "MP4OutputPath = /srv/a b;c\nMP4AuthPassword=\n");
    EXPECT_EQ(Probe(path, "text MP4OutputPath MP4AuthPassword MP4AuthUserName"),
              "text MP4OutputPath=/srv/a b;c\n"
              "text MP4AuthPassword=\n"
              "missing MP4AuthUserName (untouched)\n");
}

TEST(QxRegistry, GivesNumbersAndLeavesTheValueWhenThereIsNone) {
    const TempDir dir;
    const std::string path =
        dir.Write(kHead + "a=4294967295\nb=4294967296\nc=-1\nd=\ne=0x10\nf= 12 \ng=1 2\n");
    EXPECT_EQ(Probe(path, "number a b c d e f g h"),
              "number a=4294967295\n"
              "missing b (99)\n"
              "missing c (99)\n"
              "missing d (99)\n"
              "missing e (99)\n"
              "number f=12\n"
              "missing g (99)\n"
              "missing h (99)\n");
}

TEST(QxRegistry, NumberCanBeReadAsText) {
    const TempDir dir;
    EXPECT_EQ(Probe(dir.Write(kHead + "MP4MaxFileSize=0060\n"), "text MP4MaxFileSize"),
              "text MP4MaxFileSize=0060\n");
}

TEST(QxRegistry, NoFileMeansNoKeysAndNoLogLine) {
    const TempDir dir;
    EXPECT_EQ(Probe(dir.Path() + "/missing.ini", "text MP4OutputPath"),
              "missing MP4OutputPath (untouched)\n");
}

TEST(QxRegistry, BrokenFileMeansNoKeysAndOneLineThatNamesFileAndLine) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "MP4OutputPath=/srv\nMP4AuthPassword s3cret\n");
    const std::string output = Probe(path, "text MP4OutputPath MP4AuthUserName");
    EXPECT_EQ(output, "log 4 libs/QxSettings/src/QxRegistry.cc QxRegistry::getValue: settings file " + path +
                          ", line 3: '=' character not found in line. no settings.\n"
                          "missing MP4OutputPath (untouched)\n"
                          "missing MP4AuthUserName (untouched)\n");
}

TEST(QxRegistry, DirectoryMeansNoKeysAndOneLineThatNamesIt) {
    const TempDir dir;
    EXPECT_EQ(Probe(dir.Path(), "number a b"),
              "log 4 libs/QxSettings/src/QxRegistry.cc QxRegistry::getValue: settings file " + dir.Path() +
                  ": Is a directory. no settings.\n"
                  "missing a (99)\n"
                  "missing b (99)\n");
}

TEST(QxRegistry, PercentSignsInThePathAreNotFormatted) {
    const TempDir dir;
    const std::string path = dir.Write("broken\n", "50%s%n.ini");
    EXPECT_THAT(Probe(path, "text a"), HasSubstr("settings file " + path + ", line 1: "));
}

TEST(QxRegistry, ValuesNeverReachTheLog) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "MP4AuthPassword=s3cret\nMP4AuthPassword=s3cret\n");
    const std::string output = Probe(path, "number MP4AuthPassword");
    EXPECT_THAT(output, StartsWith("log 4 "));
    EXPECT_THAT(output, Not(HasSubstr("s3cret")));
}

TEST(QxRegistry, NumberThatIsNoneLogsNothing) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "MP4AuthPassword=s3cret\n");
    EXPECT_EQ(Probe(path, "number MP4AuthPassword"), "missing MP4AuthPassword (99)\n");
}

TEST(QxRegistry, FileIsReadOnceAtTheFirstUse) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "a=first\n");
    EXPECT_EQ(Probe(path, "again a '" + path + "'"), "text a=first\ntext a=first\n");
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST(QxRegistry, ThreadsThatComeFirstTogetherAllSeeTheKeys) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "a=v\n");
    EXPECT_EQ(Probe(path, "race a 16"), "hits 16\n");
}

TEST(QxRegistry, ThreadsThatComeFirstTogetherLogABrokenFileOnce) {
    const TempDir dir;
    const std::string path = dir.Write(kHead + "broken\n");
    EXPECT_EQ(Probe(path, "race a 16"),
              "log 4 libs/QxSettings/src/QxRegistry.cc QxRegistry::getValue: settings file " + path +
                  ", line 2: '=' character not found in line. no settings.\n"
                  "hits 0\n");
}

}  // namespace
