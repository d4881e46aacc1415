#include "Program.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <regex>
#include <set>
#include <sstream>

#include "support/ByteFile.h"
#include "support/SystemCalls.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

class ProgramTest : public testing::Test {
 protected:
    ProgramTest() {
        SystemCalls().availableBytes = [] { return std::uint64_t{1'000'000'000'000}; };
    }
    ExitCode run(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "clipfile");
        out_.str("");
        errors_.str("");
        return RunProgram(arguments, out_, errors_);
    }
    /// In a process of its own, which writes into a file.
    ExitCode runApart(const std::vector<std::string>& arguments) {
        const pid_t child = fork();
        if (child == 0) {
            const ExitCode code = run(arguments);
            std::ofstream(log_) << out_.str() << errors_.str();
            _exit(static_cast<int>(code));
        }
        int status = 0;
        EXPECT_EQ(wait4(child, &status, 0, &usage_), child);
        EXPECT_TRUE(WIFEXITED(status));
        return static_cast<ExitCode>(WEXITSTATUS(status));
    }
    /// Kilobytes in memory at most, those of this process included.
    long memoryOf(const std::vector<std::string>& arguments) {
        runApart(arguments);
        return usage_.ru_maxrss;
    }
    std::string said() const {
        std::ifstream in(log_);
        return {std::istreambuf_iterator<char>(in), {}};
    }
    std::string path(const std::string& name) const { return (folder_.Path() / name).string(); }
    void recordNormal(const std::string& name, bool close = true) const {
        test_stream::Record(path(name), {"normal", clipfileModule::RecordRules::kExact, close},
                            test_stream::MakePlainStream(2));
    }

    SystemCallGuard guard_;
    TempDir folder_;
    TempDir logs_;
    rusage usage_ = {};
    std::filesystem::path log_ = logs_.Path() / "said";
    std::ostringstream out_;
    std::ostringstream errors_;
};

TEST_F(ProgramTest, TheManPageHasEachOption) {
    std::string help;
    for (const char* const command : {"inspect", "verify", "recover", "retention", "control"}) {
        EXPECT_EQ(run({command, "--help"}), ExitCode::kSuccess);
        help += out_.str();
    }
    const test_stream::Data bytes = test_stream::ReadAll(CLIPFILE_MAN_PAGE);
    std::string page(bytes.begin(), bytes.end());
    // Its hyphens are "\-".
    std::erase(page, '\\');
    const std::regex option("--[a-z][-a-z]*");
    const auto optionsIn = [&](const std::string& text) {
        return std::set<std::string>(std::sregex_token_iterator(text.begin(), text.end(), option),
                                     std::sregex_token_iterator());
    };
    std::set<std::string> expected = optionsIn(help);
    expected.erase("--help");
    EXPECT_EQ(optionsIn(page), expected);
    EXPECT_GT(expected.size(), 9U);
}

TEST_F(ProgramTest, MistakesOfTheCommandLineHaveACodeOfTheirOwn) {
    EXPECT_EQ(run({}), ExitCode::kUsage);
    EXPECT_EQ(run({"inspect"}), ExitCode::kUsage);
    EXPECT_EQ(run({"paint", "x"}), ExitCode::kUsage);
    EXPECT_EQ(run({"inspect", "--size", "x"}), ExitCode::kUsage);
    EXPECT_EQ(run({"--help"}), ExitCode::kSuccess);
    EXPECT_NE(out_.str().find("inspect"), std::string::npos);
}

TEST_F(ProgramTest, RetentionTellsEachFileAndRemovesIt) {
    const std::string old = path("01_02_03_04.MP4");
    recordNormal("01_02_03_04.MP4");
    std::filesystem::last_write_time(old,
                                     std::filesystem::file_time_type::clock::now() - std::chrono::hours(30));
    const std::string folder = folder_.Path().string();
    EXPECT_EQ(run({"retention", folder, "--older-than", "1d", "--dry-run"}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), old + " would be removed: it is older than the limit.\n");
    EXPECT_TRUE(std::filesystem::exists(old));
    EXPECT_EQ(run({"retention", folder, "--older-than", "1d"}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), old + " is removed: it is older than the limit.\n");
    EXPECT_FALSE(std::filesystem::exists(old));
}

TEST_F(ProgramTest, RetentionEndsWithACodeWhereSomethingStays) {
    recordNormal("01_02_03_04.MP4", false);
    std::filesystem::last_write_time(path("01_02_03_04.MP4"),
                                     std::filesystem::file_time_type::clock::now() - std::chrono::hours(30));
    const std::string folder = folder_.Path().string();
    EXPECT_EQ(run({"retention", folder, "--older-than", "1d", "--json"}), ExitCode::kDefects);
    const auto step = nlohmann::json::parse(out_.str());
    EXPECT_EQ(step.at("goes"), false);
    EXPECT_EQ(step.at("removed"), false);
    EXPECT_TRUE(std::filesystem::exists(path("01_02_03_04.MP4")));
    EXPECT_EQ(run({"retention", folder, "--keep-free", "9999999T"}), ExitCode::kDefects);
    EXPECT_NE(errors_.str().find("less of the disk is free"), std::string::npos);
    EXPECT_EQ(run({"retention", folder}), ExitCode::kUsage);
    EXPECT_EQ(run({"retention", folder, "--older-than", "soon"}), ExitCode::kUsage);
    EXPECT_EQ(run({"retention", path("none"), "--older-than", "1d"}), ExitCode::kUsage);
}

TEST_F(ProgramTest, ControlAsksAReceiverThatMayNotBeThere) {
    EXPECT_EQ(run({"control", path("none.sock"), "status"}), ExitCode::kUnreadable);
    EXPECT_EQ(errors_.str(), "clipfile: no receiver can be reached at " + path("none.sock") +
                                 ": No such file or directory.\n");
    EXPECT_EQ(run({"control", path("none.sock"), "preview", "{"}), ExitCode::kUsage);
    EXPECT_EQ(run({"control", path("none.sock")}), ExitCode::kUsage);
}

class HostileInputTest : public ProgramTest, public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(Commands, HostileInputTest, testing::Values("inspect", "verify", "recover"),
                         [](const auto& instance) { return std::string(instance.param); });

TEST_P(HostileInputTest, WhatIsNoRecordingIsToldInASentence) {
    const std::string empty = path("empty.MP4");
    const std::string text = path("text.MP4");
    const std::string foreign = path("foreign.MP4");
    const std::string broken = path("broken.MP4");
    const std::string missing = path("missing.MP4");
    std::ofstream(empty).close();
    std::ofstream(text) << "This is the text of a person, and longer than the head of a box.";
    test_stream::WriteAll(foreign, byte_file::Join({byte_file::MakeBox("ftyp", {byte_file::Text("isom")}),
                                                    byte_file::MakeBox("mdat", {byte_file::Words({1})})}));
    recordNormal("broken.MP4", false);
    // The length of `VPRF` in the profile: 10 bytes, where it has 52.
    test_stream::Data bytes = test_stream::ReadAll(broken);
    const std::string type = "VPRF";
    const auto at = std::search(bytes.begin(), bytes.end(), type.begin(), type.end());
    ASSERT_NE(at, bytes.end());
    *(at - 1) = 10;
    test_stream::WriteAll(broken, bytes);
    const std::string place = std::to_string(at - bytes.begin() - 4);
    const std::pair<std::string, std::string> cases[] = {
        {empty, empty + " is empty."},
        {text, text + " is no MP4 file."},
        {foreign, foreign + " is an MP4 file, but none of this recorder: it lacks its profile."},
        {broken, broken + " has a broken profile: 'VPRF' at " + place + " is too short."},
        {missing, missing + " does not exist."},
        {"/dev/null", "/dev/null is no regular file."},
    };
    for (const auto& [file, sentence] : cases) {
        EXPECT_EQ(run({GetParam(), file}), ExitCode::kUnreadable) << file;
        EXPECT_EQ(out_.str(), "");
        EXPECT_EQ(errors_.str(), "clipfile: " + sentence + "\n");
    }
}

TEST_P(HostileInputTest, GigabytesOfZerosTakeNoMemory) {
    const std::string zeros = path("zeros.MP4");
    const std::string torn = path("01_02_03_04.MP4");
    std::ofstream(zeros).close();
    recordNormal("01_02_03_04.MP4", false);
    const long unused = memoryOf({"--help"});
    for (const std::string& file : {zeros, torn}) {
        std::filesystem::resize_file(file, 10'000'000'000);
        // What the address sanitizer keeps of freed memory comes on top.
        constexpr long kFlat = 300'000;
        EXPECT_LT(memoryOf({GetParam(), file}) - unused, kFlat) << file;
        EXPECT_NE(said(), "");
    }
    EXPECT_EQ(runApart({GetParam(), zeros}), ExitCode::kUnreadable);
    EXPECT_EQ(said(), "clipfile: " + zeros + " is no MP4 file.\n");
}

TEST_F(ProgramTest, AFolderIsNoFileToInspect) {
    EXPECT_EQ(run({"inspect", folder_.Path().string()}), ExitCode::kUnreadable);
    EXPECT_EQ(errors_.str(), "clipfile: " + folder_.Path().string() + " is a folder, not a file.\n");
}

TEST_F(ProgramTest, ReadingAllZerosTakesNoMemoryEither) {
    recordNormal("01_02_03_04.MP4");
    const long unused = memoryOf({"--help"});
    std::filesystem::resize_file(path("01_02_03_04.MP4"), 10'000'000'000);
    EXPECT_LT(memoryOf({"verify", "--deep", path("01_02_03_04.MP4")}) - unused, 300'000);
    EXPECT_NE(said(), "");
}

TEST_F(ProgramTest, AFileThatCannotBeReadDoesNotKeepTheOthersBack) {
    recordNormal("a.MP4");
    EXPECT_EQ(run({"inspect", path("missing.MP4"), path("a.MP4")}), ExitCode::kUnreadable);
    EXPECT_TRUE(out_.str().starts_with(path("a.MP4") + ": normal, closed"));
}

TEST_F(ProgramTest, JsonHasALineAFileAndToldErrorsToo) {
    recordNormal("a.MP4");
    EXPECT_EQ(run({"inspect", "--json", path("a.MP4"), path("missing.MP4")}), ExitCode::kUnreadable);
    std::istringstream lines(out_.str());
    std::string line;
    std::getline(lines, line);
    EXPECT_EQ(nlohmann::json::parse(line).at("closed"), true);
    std::getline(lines, line);
    EXPECT_EQ(nlohmann::json::parse(line).at("error"), path("missing.MP4") + " does not exist.");
    EXPECT_EQ(errors_.str(), "");
}

TEST_F(ProgramTest, BoxesAreListedOfAnyMp4File) {
    test_stream::WriteAll(
        path("foreign.MP4"),
        byte_file::MakeBox("moov", {byte_file::MakeBox("mfhd", {byte_file::Words({0, 7})})}));
    EXPECT_EQ(run({"inspect", "--boxes", path("foreign.MP4")}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(),
              "moov at 0, 24 bytes\n"
              "  mfhd at 8, 16 bytes\n"
              "      version 0, flags 000000, sequence_number 7\n");
    EXPECT_EQ(run({"inspect", "--boxes", "--json", path("foreign.MP4")}), ExitCode::kSuccess);
    const auto json = nlohmann::json::parse(out_.str());
    EXPECT_EQ(json.at("boxes").at(0).at("children").at(0).at("fields").at("sequence_number"), 7);
}

TEST_F(ProgramTest, BoxesOfARecordingNameTheirFields) {
    recordNormal("a.MP4");
    EXPECT_EQ(run({"inspect", "--boxes", "--rows", "1", path("a.MP4")}), ExitCode::kSuccess);
    for (const char* const text :
         {"major_brand ZQVC, minor_version 01001FFF", "format 20000000", "handler_type meta",
          "sequenceParameterSetNALUnit 67640028AC", "sample_count 16, sample_delta 1001",
          "number_of_frames 30", "      15 more rows"}) {
        EXPECT_NE(out_.str().find(text), std::string::npos) << text;
    }
}

TEST_F(ProgramTest, DrawingsAreNewFilesBesideTheReport) {
    test_stream::Record(path("a.MP4"), {"normal", clipfileModule::RecordRules::kExact, true},
                        test_stream::MakeCodedStream(4));
    EXPECT_EQ(run({"inspect", "--plot", path("a.svg"), "--thumbnails", path("a.png"), path("a.MP4")}),
              ExitCode::kSuccess)
        << errors_.str();
    EXPECT_TRUE(out_.str().starts_with(path("a.MP4") + ": normal, closed"));
    EXPECT_TRUE(std::filesystem::exists(path("a.svg")));
    EXPECT_TRUE(std::filesystem::exists(path("a.png")));
    const test_stream::Data before = test_stream::ReadAll(path("a.MP4"));
    EXPECT_EQ(run({"inspect", "--plot", path("a.MP4"), path("a.MP4")}), ExitCode::kUnreadable);
    EXPECT_EQ(errors_.str(), "clipfile: " + path("a.MP4") + " cannot be written: File exists.\n");
    EXPECT_EQ(test_stream::ReadAll(path("a.MP4")), before);
    EXPECT_EQ(run({"inspect", "--plot", path("b.svg"), path("a.MP4"), path("a.MP4")}), ExitCode::kUsage);
}

TEST_F(ProgramTest, DefectsAreALineEachAndACode) {
    recordNormal("01_02_03_04.MP4");
    EXPECT_EQ(run({"verify", path("01_02_03_04.MP4")}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), "");
    recordNormal("open.MP4", false);
    EXPECT_EQ(run({"verify", folder_.Path().string()}), ExitCode::kDefects);
    EXPECT_EQ(
        out_.str(),
        path("open.MP4") + ": It is not closed. The length of its samples and 'moov' were never written.\n");
    EXPECT_EQ(run({"verify", "--json", path("01_02_03_04.MP4"), path("missing.MP4")}), ExitCode::kUnreadable);
    EXPECT_EQ(out_.str(), "{\"file\":\"" + path("missing.MP4") + "\",\"error\":\"" + path("missing.MP4") +
                              " does not exist.\"}\n{\"file\":\"" + path("01_02_03_04.MP4") +
                              "\",\"defects\":[]}\n");
}

TEST_F(ProgramTest, RecoveryTellsWhatItHasWritten) {
    test_stream::Record(path("a.MP4"), {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(32));
    EXPECT_EQ(run({"recover", path("a.MP4")}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), path("a.MP4") +
                              ": 256 pictures, 400 audio frames and 256 units of metadata are in " +
                              path("a.recovered.MP4") + "; 0 bytes behind them belong to nothing whole.\n");
    EXPECT_EQ(run({"recover", path("a.recovered.MP4")}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), path("a.recovered.MP4") + " is closed: nothing to recover.\n");
}

TEST_F(ProgramTest, UnattendedRecoveryPutsAVerifiedFileInThePlaceOfItsOriginal) {
    const std::string file = path("01_02_03_04.MP4");
    test_stream::Record(file, {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakeCodedStream(32));
    // A process of its own, since it gives way for good.
    EXPECT_EQ(runApart({"recover", "--unattended", file}), ExitCode::kSuccess);
    EXPECT_EQ(run({"verify", "--deep", file}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), "");
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder_.Path()), {}), 1);
}

TEST_F(ProgramTest, UnattendedRecoveryLeavesAFileWithDefectsBesideItsOriginal) {
    // No decoder takes its audio.
    test_stream::Record(path("01_02_03_04.MP4"), {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(32));
    EXPECT_EQ(runApart({"recover", "--unattended", path("01_02_03_04.MP4")}), ExitCode::kSuccess);
    EXPECT_NE(said().find(path("01_02_03_04.MP4") + " stays beside it: the recovered file has "),
              std::string::npos)
        << said();
    EXPECT_TRUE(std::filesystem::exists(path("01_02_03_04.recovered.MP4")));
    EXPECT_EQ(run({"verify", path("01_02_03_04.MP4")}), ExitCode::kDefects);
    EXPECT_EQ(runApart({"recover", "--unattended", path("01_02_03_04.MP4")}), ExitCode::kSuccess);
    EXPECT_EQ(said(), path("01_02_03_04.MP4") + " is passed over: " + path("01_02_03_04.recovered.MP4") +
                          " is there already.\n");
}

TEST_F(ProgramTest, UnattendedRecoveryIsHopelessForWhatWillNeverBeARecording) {
    // What a fragmented file is before its first fragment, 5 to 11 seconds.
    test_stream::Record(path("whole.MP4"), {"fragment", clipfileModule::RecordRules::kExact, true},
                        test_stream::MakePlainStream(32));
    test_stream::Data bytes = test_stream::ReadAll(path("whole.MP4"));
    const std::size_t head = bytes[3];  // `ftyp`
    const std::map<std::string, test_stream::Data> files = {
        {"empty", {}},
        {"head", test_stream::Data(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(head))},
        {"zeros", test_stream::Data(4096)},
        {"foreign", byte_file::Join({byte_file::MakeBox("ftyp", {byte_file::Text("isom")}),
                                     byte_file::MakeBox("moov", {})})}};
    const std::map<std::string, std::string> reasons = {
        {"empty", "is empty."},
        {"head", "ends before its first sample: nothing was recorded in it."},
        {"zeros", "is no MP4 file."},
        {"foreign", "is an MP4 file, but none of this recorder: it lacks its profile."}};
    for (const auto& [name, data] : files) {
        const std::string file = path(name + ".MP4");
        test_stream::WriteAll(file, data);
        EXPECT_EQ(runApart({"recover", "--unattended", file}), ExitCode::kDefects) << name;
        EXPECT_EQ(said(), "clipfile: " + file + " " + reasons.at(name) + "\n");
        EXPECT_EQ(run({"recover", file}), ExitCode::kUnreadable) << "it is no recording";
        EXPECT_EQ(test_stream::ReadAll(file), data);
    }
    EXPECT_EQ(runApart({"recover", "--unattended", path("missing.MP4")}), ExitCode::kUnreadable);
}

TEST_F(ProgramTest, UnattendedRecoveryEndsWhenTheDiskFillsUp) {
    const std::string file = path("01_02_03_04.MP4");
    test_stream::Record(file, {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(32));
    const test_stream::Data before = test_stream::ReadAll(file);
    for (const int full : {0, 1, 2, 3}) {
        SystemCalls().availableBytes = [full, looks = 0]() mutable {
            return std::uint64_t{looks++ < full ? 2'000'000'000U : 900'000'000U};
        };
        EXPECT_EQ(runApart({"recover", "--unattended", file}), ExitCode::kUnreadable) << full;
        EXPECT_EQ(said(), "clipfile: " + file +
                              " is not recovered: its disk has 900 MB of free space, and what is recorded "
                              "needs them.\n");
        EXPECT_EQ(test_stream::ReadAll(file), before);
        EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder_.Path()), {}), 1) << full;
    }
}

TEST_F(ProgramTest, UnattendedRecoveryGivesWay) {
    int level = 0;
    const pid_t child = fork();
    if (child == 0) {
        run({"recover", "--unattended", path("missing.MP4")});
        _exit(getpriority(PRIO_PROCESS, 0));
    }
    ASSERT_EQ(waitpid(child, &level, 0), child);
    EXPECT_EQ(WEXITSTATUS(level), 19);
}

TEST_F(ProgramTest, RecoveryOfAFolderPassesOverWhatIsRecoveredAlready) {
    test_stream::Record(path("a.MP4"), {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(32));
    EXPECT_EQ(run({"recover", "--json", folder_.Path().string()}), ExitCode::kSuccess);
    EXPECT_EQ(nlohmann::json::parse(out_.str()).at("pictures"), 256);
    EXPECT_EQ(run({"recover", folder_.Path().string()}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(),
              path("a.MP4") + " is passed over: " + path("a.recovered.MP4") + " is there already.\n");
    EXPECT_EQ(run({"recover", "--json", folder_.Path().string()}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), "{\"file\":\"" + path("a.MP4") + "\",\"recovered\":false,\"there_already\":\"" +
                              path("a.recovered.MP4") + "\"}\n");
    std::filesystem::remove(path("a.MP4"));
    EXPECT_EQ(run({"recover", folder_.Path().string()}), ExitCode::kSuccess);
    EXPECT_EQ(out_.str(), folder_.Path().string() + " has no unfinished recording.\n");
}

TEST_F(ProgramTest, RecoveryOfAFolderTellsOfEveryFileThatIsNotClosed) {
    test_stream::WriteAll(path("empty.MP4"), {});
    EXPECT_EQ(run({"recover", folder_.Path().string()}), ExitCode::kUnreadable);
    EXPECT_EQ(out_.str(), "");
    EXPECT_EQ(errors_.str(), "clipfile: " + path("empty.MP4") + " is empty.\n");
}

TEST_F(ProgramTest, FilesOfOneNameInTwoFoldersAreBothRecovered) {
    for (const char* const day : {"in/20261120", "in/20261121", "out"}) {
        std::filesystem::create_directories(path(day));
    }
    for (const char* const file : {"in/20261120/a.MP4", "in/20261121/a.MP4"}) {
        test_stream::Record(path(file), {"fragment", clipfileModule::RecordRules::kExact, false},
                            test_stream::MakePlainStream(32));
    }
    EXPECT_EQ(run({"recover", "--output", path("out"), path("in")}), ExitCode::kSuccess);
    EXPECT_TRUE(std::filesystem::exists(path("out/20261120/a.MP4")));
    EXPECT_TRUE(std::filesystem::exists(path("out/20261121/a.MP4")));
}

TEST_F(ProgramTest, ANameThatTheSystemRefusesIsTold) {
    const std::string longName(300, 'a');
    for (const char* const command : {"verify", "recover"}) {
        EXPECT_EQ(run({command, longName}), ExitCode::kUnreadable) << command;
        EXPECT_EQ(errors_.str(), "clipfile: " + longName + " cannot be opened: File name too long.\n");
    }
}

TEST_F(ProgramTest, DefectsComeWithTheirFile) {
    recordNormal("a.MP4", false);
    recordNormal("b.MP4", false);
    const std::string sentence =
        ": It is not closed. The length of its samples and 'moov' were never written.\n";
    // The error of the missing file is told behind the lines of the first one, on the same stream.
    std::vector<std::string> arguments = {"clipfile", "verify", path("a.MP4"), path("missing.MP4"),
                                          path("b.MP4")};
    EXPECT_EQ(RunProgram(arguments, out_, out_), ExitCode::kUnreadable);
    EXPECT_EQ(out_.str(), path("a.MP4") + sentence + "clipfile: " + path("missing.MP4") +
                              " does not exist.\n" + path("b.MP4") + sentence);
}

TEST_F(ProgramTest, WhatCannotBeRecoveredIsToldWithTheReason) {
    test_stream::Record(path("a.MP4"), {"fragment", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(1));
    EXPECT_EQ(run({"recover", path("a.MP4")}), ExitCode::kDefects);
    EXPECT_EQ(errors_.str(),
              "clipfile: " + path("a.MP4") + " cannot be recovered: there is no whole picture in it.\n");
    EXPECT_EQ(run({"recover", "--in-place", "--output", folder_.Path().string(), path("a.MP4")}),
              ExitCode::kUsage);
}

}  // namespace
}  // namespace clipfile
