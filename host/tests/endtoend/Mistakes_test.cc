// What a new user gets wrong, one thing after the other: each has its sentence and its exit code.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <nlohmann/json.hpp>

#include "endtoend/ReceiverFixture.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::AllOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

constexpr int kUsage = 2;
constexpr int kSourceUnavailable = 3;
constexpr int kSourceUnsuitable = 4;
constexpr int kModule = 5;

/// The last line that the program said.
std::string LastLine(std::string text) {
    while (!text.empty() && text.back() == '\n') {
        text.pop_back();
    }
    const std::size_t at = text.rfind('\n');
    return at == std::string::npos ? text : text.substr(at + 1);
}

struct Mistake {
    const char* name;
    std::vector<std::string> options;
    int code;
    /// What the sentence must name.
    const char* word;
};

std::ostream& operator<<(std::ostream& out, const Mistake& mistake) {
    return out << mistake.name;
}

class MistakesFixture : public ReceiverFixture {
 protected:
    void ExpectRefused(const std::vector<std::string>& options, int code, const std::string& word) {
        const Outcome outcome = RunReceiver(options);
        EXPECT_EQ(outcome.code, code) << outcome.errors;
        EXPECT_THAT(LastLine(outcome.errors),
                    AllOf(StartsWith("receiver: "), HasSubstr(word), EndsWith(".")));
        EXPECT_THAT(Recordings(), IsEmpty());
    }
};

class OptionMistakesTest : public MistakesFixture, public ::testing::WithParamInterface<Mistake> {};

TEST_P(OptionMistakesTest, GetsOneSentenceThatNamesIt) {
    const Outcome outcome = RunReceiver(GetParam().options);
    EXPECT_EQ(outcome.code, GetParam().code);
    EXPECT_THAT(outcome.errors, AllOf(StartsWith("receiver: "), HasSubstr(GetParam().word), EndsWith(".\n")));
    EXPECT_EQ(std::count(outcome.errors.begin(), outcome.errors.end(), '\n'), 1) << outcome.errors;
    EXPECT_EQ(outcome.output, "");
    EXPECT_THAT(std::filesystem::directory_iterator(OutputFolder()), std::filesystem::directory_iterator());
}

INSTANTIATE_TEST_SUITE_P(
    Options, OptionMistakesTest,
    ::testing::Values(
        Mistake{"UnknownOption", {"--inptu", "test:"}, kUsage, "--inptu"},
        Mistake{"StrayWord", {"test:"}, kUsage, "test:"},
        Mistake{"MissingValue", {"--input"}, kUsage, "--input"},
        Mistake{"TwoInputs", {"--input", "test:", "--input", "b.ts"}, kUsage, "--input"},
        Mistake{"NoSuchRate", {"--fps", "26"}, kUsage, "23.98, 24, 25, 29.97, 30, 50, 59.94"},
        Mistake{"SizeWithoutHeight", {"--size", "1280"}, kUsage, "--size"},
        Mistake{"OddSize", {"--size", "641x480"}, kUsage, "even"},
        Mistake{"BitrateWithUnit", {"--bitrate", "8M"}, kUsage, "--bitrate"},
        Mistake{"NegativeGop", {"--gop", "-1"}, kUsage, "--gop"},
        Mistake{"SpeedOfZero", {"--speed", "0"}, kUsage, "--speed"},
        Mistake{"SpeedThatIsNoNumber", {"--speed", "nan"}, kUsage, "nan is no number"},
        Mistake{"PortThatDoesNotExist", {"--input", "udp://127.0.0.1:99999"}, kUsage, "99999 is no port"},
        Mistake{"PassphraseTooShort",
                {"--input", "srt://127.0.0.1:9000?passphrase=open"},
                kUsage,
                "4 characters, and SRT takes 10 to 79"},
        Mistake{"RangesThatAreEmpty", {"--record", ""}, kUsage, "--record is empty"},
        Mistake{
            "UserWithoutAShare", {"--user", "joe"}, kUsage, "--user goes with a folder on a network share"},
        Mistake{"SpeedOfALiveSource", {"--input", "udp://127.0.0.1:1", "--speed", "2"}, kUsage, "--speed"},
        Mistake{"RateOfAFile", {"--input", "a.ts", "--fps", "25"}, kUsage, "--fps"},
        Mistake{"WrongFileType", {"--file-type", "fragmented"}, kUsage, "--file-type"},
        Mistake{"WrongMode", {"--mode", "auto"}, kUsage, "--mode"},
        Mistake{"WrongNaluType", {"--nalu-type", "avc"}, kUsage, "--nalu-type"},
        Mistake{"MinutesInWords", {"--max-minutes", "an hour"}, kUsage, "--max-minutes"},
        Mistake{"NegativeSeconds", {"--seconds", "-5"}, kUsage, "--seconds"},
        Mistake{"RangeBackwards", {"--record", "9-2"}, kUsage, "--record"},
        Mistake{"RangesThatOverlap", {"--record", "2-9,8-12"}, kUsage, "--record"},
        Mistake{"RangeInWords", {"--record", "all"}, kUsage, "--record"},
        Mistake{"RangesInModeOn", {"--mode", "on", "--record", "2-9"}, kUsage, "--record"},
        Mistake{"TimecodeWithoutFrames", {"--timecode", "10:00:00"}, kUsage, "HH:MM:SS:FF"},
        Mistake{"TimecodeBeyondADay", {"--timecode", "24:00:00:00"}, kUsage, "--timecode"},
        Mistake{"DropFrameForbiddenAndAskedFor",
                {"--fps", "29.97", "--timecode", "10:00:00;00", "--no-drop-frame"},
                kUsage,
                "--no-drop-frame"},
        Mistake{"PrefixWithAFolder", {"--prefix", "a/b"}, kUsage, "--prefix"},
        Mistake{"ShareWithoutAName", {"--output", "//server"}, kUsage, "//server/share/folder"},
        Mistake{"PriorityBeyondTheScale", {"--log-priority", "14"}, kUsage, "--log-priority"},
        Mistake{"TimeoutOfZero", {"--timeout", "0"}, kUsage, "--timeout"},
        Mistake{"TwoPasswords", {"--password", "a", "--password-file", "b"}, kUsage, "--password"},
        Mistake{"PasswordFileMissing", {"--password-file", "/no/such/file"}, kUsage, "/no/such/file"},
        Mistake{"SettingsMissing", {"--settings", "/no/such/settings.ini"}, kUsage, "/no/such/settings.ini"},
        Mistake{"NoSuchModule", {"--module", "/no/such/libclipfile.so"}, kModule, "/no/such/libclipfile.so"},
        Mistake{"NotAModule", {"--module", "/bin/sh"}, kModule, "/bin/sh"},
        Mistake{"NoSuchSourceFile", {"--input", "/no/such/file.ts"}, kSourceUnavailable, "/no/such/file.ts"},
        Mistake{"NoSuchProtocol", {"--input", "carrier-pigeon://loft"}, kSourceUnavailable, "carrier-pigeon"},
        Mistake{"NoSuchHost",
                {"--input", "http://no.such.host.invalid/a.ts", "--no-reconnect"},
                kSourceUnavailable,
                "no.such.host"},
        Mistake{"NobodyListens",
                {"--input", "http://127.0.0.1:9/a.ts", "--no-reconnect"},
                kSourceUnavailable,
                "127.0.0.1"}),
    ::testing::PrintToStringParamName());

using MistakesTest = MistakesFixture;

TEST_F(MistakesTest, AMissingOutputFolderIsMade) {
    const auto missing = folder.Path() / "new";
    const Outcome outcome =
        RunReceiver({"--output", missing.string(), "--size", "320x180", "--seconds", "2"});
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_EQ(RecordingsIn(missing).size(), 1U);
}

// More than the last folder is missing where a disk is not mounted, and then the recordings would fill
// another.
TEST_F(MistakesTest, AnOutputFolderWhoseParentIsMissing) {
    const auto missing = folder.Path() / "not-mounted" / "recordings";
    ExpectRefused({"--output", missing.string()}, kOutput, missing.string());
    EXPECT_FALSE(std::filesystem::exists(missing.parent_path()));
}

TEST_F(MistakesTest, AFileInThePlaceOfTheOutputFolder) {
    const auto file = folder.Path() / "file";
    std::ofstream(file) << "not a folder";
    ExpectRefused({"--output", file.string()}, kOutput, file.string());
}

// The superuser may write anywhere but where nobody may.
TEST_F(MistakesTest, AnOutputFolderThatCannotBeWritten) {
    ExpectRefused({"--output", "/proc/recordings"}, kOutput, "/proc/recordings");
}

TEST_F(MistakesTest, ASourceThatIsNoMediaFile) {
    const auto file = folder.Path() / "letter.ts";
    std::ofstream(file) << std::string(20000, 'x');
    ExpectRefused({"--input", file.string()}, kSourceUnavailable, file.string());
}

TEST_F(MistakesTest, ASourceWithoutVideo) {
    const auto file = folder.Path() / "tone.wav";
    ASSERT_EQ(
        RunProgram({"ffmpeg", "-v", "error", "-f", "lavfi", "-i", "sine", "-t", "1", file.string()}).code, 0);
    ExpectRefused({"--input", file.string()}, kSourceUnsuitable, "video");
}

TEST_F(MistakesTest, ABareH264StreamIsBlamedForItsMissingTimeStamps) {
    const auto file = folder.Path() / "bare.h264";
    ASSERT_EQ(RunProgram({"ffmpeg", "-v", "error", "-i", MakeMaterial(folder).string(), "-c", "copy", "-an",
                          file.string()})
                  .code,
              0);
    ExpectRefused({"--input", file.string()}, kSourceUnsuitable, "time stamps");
    ExpectRefused({"--input", file.string(), "--transcode"}, kSourceUnsuitable, "no audio");
}

TEST_F(MistakesTest, ACodecThatIsNotH264) {
    const auto file = folder.Path() / "mpeg2.ts";
    ASSERT_EQ(RunProgram({"ffmpeg", "-v", "error", "-f", "lavfi", "-i", "testsrc2=size=320x180:rate=25", "-t",
                          "1", "-c:v", "mpeg2video", file.string()})
                  .code,
              0);
    ExpectRefused({"--input", file.string()}, kSourceUnsuitable, "--transcode");
}

TEST_F(MistakesTest, ReorderedPicturesOfWhichNothingTellsWhenTheyAreShown) {
    MaterialOptions options;
    options.container = "avi";
    options.seconds = 2;
    options.more = {"-preset", "medium", "-bf", "2", "-x264-params", "b-adapt=0"};
    ExpectRefused({"--input", MakeMaterial(folder, options).string()}, kSourceUnsuitable, "--transcode");
}

TEST_F(MistakesTest, AFrameRateOutsideTheTable) {
    MaterialOptions options;
    options.rate = "15";
    options.seconds = 2;
    ExpectRefused({"--input", MakeMaterial(folder, options).string()}, kSourceUnsuitable, "15");
}

TEST_F(MistakesTest, AWrongPassphrase) {
    const FreePorts ports;
    const auto material = MakeMaterial(folder);
    const std::string address = "srt://127.0.0.1:" + std::to_string(ports.First());
    const auto sender = SendTransportStream(material, address + "?mode=listener&passphrase=the-right-one");
    ASSERT_TRUE(WaitUntilBound(ports.First())) << sender->AllText();
    const Outcome outcome = RunReceiver({"--input", address + "?passphrase=the-wrong-one", "--no-reconnect"});
    EXPECT_EQ(outcome.code, kSourceUnavailable);
    EXPECT_THAT(LastLine(outcome.errors), AllOf(StartsWith("receiver: "), HasSubstr("passphrase")));
    // It is a secret all the same.
    EXPECT_EQ(outcome.errors.find("the-wrong-one"), std::string::npos) << outcome.errors;
}

// The module reads the store too, and to it both kinds of slashes are one.
TEST_F(MistakesTest, BackslashesInTheOutputFolderOfTheSettingsStore) {
    const auto place = folder.Path() / "from the store";
    std::ofstream(folder.Path() / "settings.ini")
        << "[Qx/Other/MP4FileOut]\nMP4OutputPath = " << folder.Path().string() << "\\from the store\\\n";
    const Outcome outcome = RunProgram(
        {RECEIVER_PROGRAM, "--module", CLIPFILE_MODULE, "--size", "320x180", "--seconds", "2"}, environment);
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("made the output folder " + place.string() + "\n"));
    EXPECT_EQ(RecordingsIn(place).size(), 1U);
}

// The store of a run with --max-minutes is a copy.
TEST_F(MistakesTest, ASettingsStoreIsReadAlikeWithAndWithoutALengthOfFiles) {
    const auto place = folder.Path() / "from the store";
    std::ofstream(folder.Path() / "settings.ini")
        << "[ Qx/Other/MP4FileOut ] ; this machine\nMP4OutputPath = " << place.string() << "\n";
    for (const std::string minutes : {"--json", "--max-minutes=5"}) {
        const Outcome outcome = RunProgram(
            {RECEIVER_PROGRAM, "--module", CLIPFILE_MODULE, "--size", "320x180", "--seconds", "1", minutes},
            environment);
        EXPECT_EQ(outcome.code, 0) << outcome.errors;
    }
    EXPECT_EQ(RecordingsIn(place).size(), 2U);
}

TEST_F(MistakesTest, InJsonAWrongOptionIsAnEventToo) {
    for (const std::vector<std::string>& options :
         {std::vector<std::string>{"--json", "--speed", "nan"}, {"--record", "9-2", "--json"}}) {
        const Outcome outcome = RunReceiver(options);
        EXPECT_EQ(outcome.code, kUsage);
        EXPECT_EQ(outcome.errors, "");
        const auto event = nlohmann::json::parse(outcome.output);
        EXPECT_EQ(event["event"], "failure");
        EXPECT_EQ(event["exit_code"], kUsage);
        EXPECT_THAT(event["text"].get<std::string>(),
                    HasSubstr(options[0] == "--json" ? "--speed" : "--record"));
        EXPECT_THAT(event["time"].get<std::string>(), ::testing::MatchesRegex("....-..-..T..:..:..\\....Z"));
    }
}

TEST_F(MistakesTest, APortOnWhichNothingArrives) {
    const FreePorts ports;
    const std::string address = "udp://127.0.0.1:" + std::to_string(ports.First());
    ExpectRefused({"--input", address, "--timeout", "1", "--no-reconnect"}, kSourceUnavailable, address);
}

TEST_F(MistakesTest, HelpAndVersionAreNoMistakes) {
    const Outcome help = RunReceiver({"--help"});
    EXPECT_EQ(help.code, 0);
    EXPECT_EQ(help.errors, "");
    for (const char* const option :
         {"--input",         "--output",    "--prefix",      "--user",        "--password", "--password-file",
          "--file-type",     "--mode",      "--nalu-type",   "--max-minutes", "--fps",      "--size",
          "--bitrate",       "--gop",       "--seconds",     "--speed",       "--record",   "--timecode",
          "--no-drop-frame", "--transcode", "--module",      "--settings",    "--log",      "--log-priority",
          "--json",          "--timeout",   "--no-reconnect"}) {
        EXPECT_THAT(help.output, HasSubstr(option));
    }
    EXPECT_EQ(RunReceiver({"--version"}).code, 0);
}

}  // namespace
}  // namespace endtoend
