#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "common/ReceiverError.h"
#include "options/Options.h"

namespace receiver {
namespace {

using ::testing::EndsWith;
using ::testing::HasSubstr;

/// Reads command lines that name a configuration file.
class ConfigFileTest : public testing::Test {
 protected:
    ConfigFileTest() {
        std::string name = (std::filesystem::temp_directory_path() / "config.XXXXXX").string();
        folder_ = mkdtemp(name.data());
        file_ = folder_ / "studio1.toml";
    }
    ~ConfigFileTest() override { std::filesystem::remove_all(folder_); }

    std::optional<Options> Parse(const std::string& config, std::vector<std::string> more,
                                 std::string& text) {
        std::ofstream(file_) << config;
        more.insert(more.begin(), {"receiver", "--config", file_.string()});
        std::vector<const char*> arguments;
        for (const std::string& argument : more) {
            arguments.push_back(argument.c_str());
        }
        return ParseOptions(static_cast<int>(arguments.size()), arguments.data(), text);
    }
    Options Parsed(const std::string& config, const std::vector<std::string>& more = {}) {
        std::string text;
        const auto options = Parse(config, more, text);
        EXPECT_TRUE(options);
        return options.value_or(Options());
    }
    /// The sentence with which a configuration is refused, without the folder of the file in it.
    std::string Refusal(const std::string& config, const std::vector<std::string>& more = {}) {
        std::string text;
        try {
            Parse(config, more, text);
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            const std::string sentence = error.what();
            const std::string folder = folder_.string() + "/";
            return sentence.starts_with(folder) ? sentence.substr(folder.size()) : sentence;
        }
        ADD_FAILURE() << "was accepted";
        return {};
    }

    std::filesystem::path folder_;
    std::filesystem::path file_;
};

TEST_F(ConfigFileTest, HoldsOptionsUnderTheirNames) {
    const Options options = Parsed(
        "# Studio 1\n"
        "input = \"srt://0.0.0.0:9000?mode=listener\"\n"
        "output = '/srv/recordings'\n"
        "prefix = \"STUDIO1\"\n"
        "file-type = \"fragment\"\n"
        "max-minutes = 60\n"
        "timeout = 2.5\n"
        "group-write = true\n"
        "no-drop-frame = false\n"
        "record = \"2-9,12-\"\n");
    EXPECT_EQ(options.source.url, "srt://0.0.0.0:9000?mode=listener");
    EXPECT_EQ(options.output, "/srv/recordings");
    EXPECT_EQ(options.prefix, "STUDIO1");
    EXPECT_EQ(options.fileType, "fragment");
    EXPECT_EQ(options.maxMinutes, 60u);
    EXPECT_EQ(options.source.timeout, 2.5);
    EXPECT_TRUE(options.groupWrite);
    EXPECT_TRUE(options.dropFrame);
    EXPECT_EQ(options.record.size(), 2u);
}

TEST_F(ConfigFileTest, ANumberKeepsItsDigits) {
    EXPECT_EQ(Parsed("seconds = 86401.25\n").seconds, 86401.25);
    EXPECT_EQ(Parsed("seconds = 1234567.5\n").seconds, 1234567.5);
}

TEST_F(ConfigFileTest, AnEmptyOneChangesNothing) {
    EXPECT_EQ(Parsed("").source.url, "test:");
}

TEST_F(ConfigFileTest, TheCommandLineHasPrecedence) {
    const Options options =
        Parsed("prefix = \"A\"\nmax-minutes = 60\n", {"--prefix", "B", "--output", "elsewhere"});
    EXPECT_EQ(options.prefix, "B");
    EXPECT_EQ(options.maxMinutes, 60u);
    EXPECT_EQ(options.output, "elsewhere");
}

TEST_F(ConfigFileTest, WhatIsNoTomlIsRefusedWithLineAndColumn) {
    EXPECT_THAT(Refusal("prefix = \"A\"\nmax-minutes = = 3\n"), testing::StartsWith("studio1.toml:2:15: "));
    EXPECT_THAT(Refusal("prefix = \"A\nB\"\n"), testing::StartsWith("studio1.toml:1:12: "));
    EXPECT_THAT(Refusal("prefix = \"A\"\nprefix = \"B\"\n"), testing::StartsWith("studio1.toml:2:"));
}

TEST_F(ConfigFileTest, ANameThatNoOptionHasIsRefusedWithLineAndColumn) {
    EXPECT_EQ(
        Refusal("prefix = \"A\"\n  inptu = \"test:\"\n"),
        "studio1.toml:2:3: there is no 'inptu' in a configuration; its names are those of the options.");
}

TEST_F(ConfigFileTest, WhatAsksForSomethingElseThanARunHasNoPlaceInIt) {
    for (const std::string name : {"help", "version", "check", "config"}) {
        EXPECT_EQ(Refusal(name + " = true\n"),
                  "studio1.toml:1:1: there is no '" + name +
                      "' in a configuration; its names are those of the options.");
    }
}

TEST_F(ConfigFileTest, APasswordHasNoPlaceInIt) {
    EXPECT_EQ(
        Refusal("password = \"secret\"\n"),
        "studio1.toml:1:1: a password has no place in a configuration: name its file with password-file.");
}

TEST_F(ConfigFileTest, AValueThatNoOptionTakesIsRefusedWithLineAndColumn) {
    EXPECT_EQ(Refusal("input = [\"a\", \"b\"]\n"),
              "studio1.toml:1:9: input is a text or a number, and nothing else.");
    EXPECT_EQ(Refusal("[input]\nurl = 3\n"),
              "studio1.toml:1:1: input is a text or a number, and nothing else.");
    EXPECT_EQ(Refusal("prefix = true\n"),
              "studio1.toml:1:10: prefix is a text or a number, and nothing else.");
    EXPECT_EQ(Refusal("prefix = \"a\\u0000b\"\n"),
              "studio1.toml:1:10: prefix is a text or a number, and nothing else.");
    EXPECT_EQ(Refusal("json = 1\n"), "studio1.toml:1:8: json is true or false.");
}

TEST_F(ConfigFileTest, AWrongValueIsRefusedWithItsPlace) {
    EXPECT_THAT(Refusal("\nspeed = 0\n"), testing::StartsWith("studio1.toml:2:1: --speed: "));
    EXPECT_EQ(
        Refusal("record = \"9-2\"\n"),
        "studio1.toml:1:1: --record 9-2 cannot be read: write ascending ranges of seconds that do not touch, "
        "such as 2-9,12-20 or 5-.");
    EXPECT_EQ(Refusal("prefix = \"\"\n"),
              "studio1.toml:1:1: --prefix is empty: give it a value, or leave it out.");
}

TEST_F(ConfigFileTest, AMistakeOfTheCommandLineIsNotBlamedOnTheFile) {
    EXPECT_THAT(Refusal("speed = 2\n", {"--speed", "0"}), testing::StartsWith("--speed"));
}

TEST_F(ConfigFileTest, AFileThatIsNotThereIsRefused) {
    std::string text;
    const char* const arguments[] = {"receiver", "--config", "/does/not/exist.toml"};
    try {
        ParseOptions(3, arguments, text);
        ADD_FAILURE();
    } catch (const ReceiverError& error) {
        EXPECT_THAT(error.what(), HasSubstr("/does/not/exist.toml"));
    }
}

TEST_F(ConfigFileTest, CheckSaysThatNothingIsWrongAndRunsNothing) {
    std::string text;
    EXPECT_FALSE(Parse("prefix = \"A\"\n", {"--check"}, text));
    EXPECT_EQ(text, "receiver: nothing is wrong with the options.\n");
    EXPECT_THAT(Refusal("prefix = \"\"\n", {"--check"}), EndsWith("give it a value, or leave it out."));
}

}  // namespace
}  // namespace receiver
