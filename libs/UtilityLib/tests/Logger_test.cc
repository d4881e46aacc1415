#include "Logger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cctype>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "log_process.h"

namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

std::vector<std::string> Lines(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

/// The line without time, zone and thread, whose form it checks: d stands for a digit, s for a sign.
std::string Body(const std::string& line) {
    const std::string form = "dddd-dd-dd dd:dd:dd.dddddd sdd:dd [";
    std::size_t at = 0;
    for (; at < form.size() && at < line.size(); ++at) {
        const char c = line[at];
        const bool fits = form[at] == 'd'   ? std::isdigit(c) != 0
                          : form[at] == 's' ? c == '+' || c == '-'
                                            : c == form[at];
        EXPECT_TRUE(fits) << line << " at " << at;
    }
    const std::size_t end = line.find_first_not_of("0123456789", at);
    EXPECT_GT(end, at) << line;
    EXPECT_EQ(line.substr(end, 2), "] ");
    return line.substr(end + 2);
}

std::vector<std::string> Bodies(const std::string& text) {
    std::vector<std::string> bodies;
    for (const auto& line : Lines(text)) {
        bodies.push_back(Body(line));
    }
    return bodies;
}

class LoggerProcess : public ::testing::Test {
 protected:
    /// Runs a scenario to its end with the log in `log_`.
    int Run(const std::string& scenario, std::vector<std::string> variables = {}) {
        variables.push_back("QX_LOG=" + log_);
        LogProcess process(folder_, {LOG_PROGRAM, scenario}, variables);
        const int result = process.Wait();
        standardError_ = process.StandardError();
        return result;
    }
    std::vector<std::string> Log() const { return Bodies(ReadFile(log_)); }
    mode_t Mode() const {
        struct stat status {};
        EXPECT_EQ(stat(log_.c_str(), &status), 0);
        return status.st_mode & 07777;
    }

    TemporaryFolder folder_;
    std::string log_ = folder_.File("log");
    std::string standardError_;
};

// Threshold

TEST_F(LoggerProcess, WritesUpToPrioritySixByDefault) {
    EXPECT_EQ(Run("Priorities"), 0);
    EXPECT_THAT(Log(), ElementsAre("3 priority 3", "4 priority 4", "5 priority 5", "6 priority 6"));
    EXPECT_THAT(standardError_, IsEmpty());
}

TEST_F(LoggerProcess, WritesUpToTheGivenPriority) {
    EXPECT_EQ(Run("Priorities", {"QX_LOG_PRIORITY=4"}), 0);
    EXPECT_THAT(Log(), ElementsAre("3 priority 3", "4 priority 4"));
}

TEST_F(LoggerProcess, WritesEveryLineAtPriority13) {
    EXPECT_EQ(Run("Priorities", {"QX_LOG_PRIORITY=13"}), 0);
    EXPECT_THAT(Log(), SizeIs(7));
}

TEST_F(LoggerProcess, MakesNoFileWhenNothingIsWritten) {
    EXPECT_EQ(Run("Priorities", {"QX_LOG_PRIORITY=0"}), 0);
    EXPECT_FALSE(std::filesystem::exists(log_));
}

TEST_F(LoggerProcess, TakesTheDefaultForAnEmptyPriority) {
    EXPECT_EQ(Run("Priorities", {"QX_LOG_PRIORITY="}), 0);
    EXPECT_THAT(Log(), SizeIs(4));
}

TEST_F(LoggerProcess, SaysThatABadPriorityWasReplacedByTheDefault) {
    for (const std::string bad : {"14", "-1", "6x", "x", " 6", "+6", "99999999999999999999"}) {
        std::filesystem::remove(log_);
        EXPECT_EQ(Run("Priorities", {"QX_LOG_PRIORITY=" + bad}), 0);
        EXPECT_THAT(Log(), ElementsAre("5 QX_LOG_PRIORITY is no number from 0 to 13; 6 is taken.",
                                       "3 priority 3", "4 priority 4", "5 priority 5", "6 priority 6"))
            << bad;
    }
}

TEST_F(LoggerProcess, ReadsTheEnvironmentOnce) {
    EXPECT_EQ(Run("EnvironmentIsReadOnce"), 0);
    EXPECT_THAT(Log(), ElementsAre("4 dir/file.cc:12 Class::Operation: first"));
}

TEST_F(LoggerProcess, DoesNotFormatADisabledLine) {
    EXPECT_EQ(Run("DisabledLineIsNotFormatted"), 0);
}

// Form and file

TEST_F(LoggerProcess, WritesTimeThreadPriorityAndPlaceWhereGiven) {
    EXPECT_EQ(Run("Forms"), 0);
    EXPECT_THAT(Log(),
                ElementsAre("4 dir/file.cc:12 Class::Operation: full", "3 OP: bare",
                            "4 Class::Operation: function alone", "4 dir/file.cc:7 file alone",
                            "4 tab\tnewline\\x0adelete\\x7fumlaut\xC3\xA4", "4 " + std::string(5000, 'x')));
}

TEST_F(LoggerProcess, WritesLocalTime) {
    EXPECT_EQ(Run("Exit", {"TZ=XYZ-5:45"}), 0);
    EXPECT_THAT(ReadFile(log_), HasSubstr(" +05:45 ["));
}

TEST_F(LoggerProcess, CreatesTheFileForItsOwnerAloneUnderALooseUmask) {
    EXPECT_EQ(Run("LooseUmask"), 0);
    EXPECT_EQ(Mode(), 0600U);
}

TEST_F(LoggerProcess, AppendsToAFileThatExistsAndKeepsItsMode) {
    std::ofstream(log_) << "2026-11-20 12:00:00.000000 +00:00 [1] 3 from yesterday\n";
    std::filesystem::permissions(log_, std::filesystem::perms(0640));
    EXPECT_EQ(Run("Exit"), 0);
    EXPECT_THAT(Log(), ElementsAre("3 from yesterday", "4 dir/file.cc:12 Class::Operation: before exit"));
    EXPECT_EQ(Mode(), 0640U);
}

TEST_F(LoggerProcess, WritesToStandardErrorWithoutAFile) {
    for (const std::vector<std::string>& variables :
         {std::vector<std::string>{}, std::vector<std::string>{"QX_LOG="}}) {
        LogProcess process(folder_, {LOG_PROGRAM, "Exit"}, variables);
        EXPECT_EQ(process.Wait(), 0);
        EXPECT_THAT(Bodies(process.StandardError()),
                    ElementsAre("4 dir/file.cc:12 Class::Operation: before exit"));
    }
}

TEST_F(LoggerProcess, FallsBackToStandardErrorAndSaysSo) {
    log_ = folder_.File("missing/log");
    EXPECT_EQ(Run("Exit"), 0);
    EXPECT_THAT(
        Bodies(standardError_),
        ElementsAre("5 The log \"" + log_ +
                        "\" cannot be opened (No such file or directory), standard error takes its place.",
                    "4 dir/file.cc:12 Class::Operation: before exit"));
}

TEST_F(LoggerProcess, FallsBackWhenNobodyReadsThePipeThatIsTheLog) {
    ASSERT_EQ(mkfifo(log_.c_str(), 0600), 0);
    EXPECT_EQ(Run("Exit"), 0);
    EXPECT_THAT(Bodies(standardError_), ElementsAre(HasSubstr("cannot be opened (No such device or address)"),
                                                    EndsWith(": before exit")));
}

// A log that cannot keep up

TEST_F(LoggerProcess, LetsTheOldestLinesGiveWayAndSaysHowMany) {
    ASSERT_EQ(mkfifo(log_.c_str(), 0600), 0);
    const int pipe = open(log_.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    LogProcess process(folder_, {LOG_PROGRAM, "Flood"}, {"QX_LOG=" + log_});
    // Nobody has read a byte of the log: the callers did not wait for it.
    ASSERT_EQ(process.Hear(), "flooded");
    ASSERT_EQ(fcntl(pipe, F_SETFL, 0), 0);
    std::string text;
    char buffer[65536];
    for (ssize_t got = 0; (got = read(pipe, buffer, sizeof buffer)) > 0;) {
        text.append(buffer, static_cast<std::size_t>(got));
    }
    close(pipe);
    EXPECT_EQ(process.Wait(), 0);

    const auto bodies = Bodies(text);
    int written = 0;
    int lost = 0;
    int last = -1;
    for (const auto& body : bodies) {
        int number = -1;
        if (std::sscanf(body.c_str(), "4 line %d", &number) == 1) {
            EXPECT_GT(number, last);
            last = number;
            ++written;
        } else {
            ASSERT_EQ(std::sscanf(body.c_str(), "5 %d log lines were lost here.", &number), 1) << body;
            lost += number;
        }
    }
    EXPECT_GT(lost, 0);
    EXPECT_EQ(written + lost, 30000);
    EXPECT_EQ(last, 29999) << "the newest lines stay";
}

TEST_F(LoggerProcess, GoesOnWhenTheDiskRefusesLines) {
    log_ = "/dev/full";
    EXPECT_EQ(Run("Threads"), 0);
    EXPECT_THAT(Bodies(standardError_),
                ElementsAre("5 The log cannot be written (No space left on device)."));
}

TEST_F(LoggerProcess, SurvivesTheReaderOfItsPipe) {
    ASSERT_EQ(mkfifo(log_.c_str(), 0600), 0);
    const int pipe = open(log_.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    LogProcess process(folder_, {LOG_PROGRAM, "ReaderLeaves"}, {"QX_LOG=" + log_});
    ASSERT_EQ(process.Hear(), "logged");
    close(pipe);
    EXPECT_EQ(process.Wait(), 0);
    EXPECT_THAT(Bodies(process.StandardError()), ElementsAre("5 The log cannot be written (Broken pipe)."));
}

// Threads and the end of the process

TEST_F(LoggerProcess, KeepsTheOrderOfEachThread) {
    EXPECT_EQ(Run("Threads"), 0);
    const auto log = Log();
    ASSERT_THAT(log, SizeIs(4000));
    std::vector<int> next(4, 0);
    for (const auto& line : log) {
        int thread = -1;
        int number = -1;
        ASSERT_EQ(std::sscanf(line.c_str(), "4 thread %d line %d", &thread, &number), 2) << line;
        EXPECT_EQ(number, next.at(static_cast<std::size_t>(thread))++);
    }
}

TEST_F(LoggerProcess, WritesEverythingBeforeExit) {
    EXPECT_EQ(Run("Exit"), 0);
    EXPECT_THAT(Log(), ElementsAre("4 dir/file.cc:12 Class::Operation: before exit"));
}

TEST_F(LoggerProcess, WritesLinesOfStaticDestructors) {
    EXPECT_EQ(Run("StaticDestruction"), 0);
    EXPECT_THAT(Log(), ElementsAre(EndsWith(": main"), EndsWith(": static destruction")));
}

TEST_F(LoggerProcess, EndsWhileAThreadGoesOnLogging) {
    EXPECT_EQ(Run("ThreadOutlivesMain"), 0);
    EXPECT_THAT(Log().at(0), EndsWith(": main"));
}

TEST_F(LoggerProcess, ServesAChildOfFork) {
    EXPECT_EQ(Run("Fork"), 0);
    const auto log = Log();
    EXPECT_THAT(log, ::testing::UnorderedElementsAre(EndsWith(": parent before"), EndsWith(": child"),
                                                     EndsWith(": parent after")));
}

TEST_F(LoggerProcess, LeavesErrnoAlone) {
    EXPECT_EQ(Run("KeepsErrno"), 0);
    EXPECT_THAT(Log(), ElementsAre(EndsWith(": enabled")));
}

TEST_F(LoggerProcess, TakesNoSignalOnItsThread) {
    EXPECT_EQ(Run("BlocksSignals"), 0);
}

TEST_F(LoggerProcess, WritesEverythingBeforeItIsUnloaded) {
    LogProcess process(folder_, {UNLOAD_PROGRAM, "Cycle", UTILITY_LIBRARY}, {"QX_LOG=" + log_});
    EXPECT_EQ(process.Wait(), 0);
    std::vector<std::string> expected;
    for (int i = 0; i < 20; ++i) {
        expected.push_back("4 file.cc:1 function: cycle " + std::to_string(i));
        expected.push_back("4 file.cc:1 function: cycle " + std::to_string(i) + " again");
    }
    EXPECT_EQ(Log(), expected);
    EXPECT_THAT(process.StandardError(), IsEmpty());
}

TEST_F(LoggerProcess, WritesALineThatComesAfterItsEnd) {
    LogProcess process(folder_, {UNLOAD_PROGRAM, "Late", UTILITY_LIBRARY}, {"QX_LOG=" + log_});
    EXPECT_EQ(process.Wait(), 0);
    EXPECT_THAT(Log(), ElementsAre("4 early", "4 late"));
}

TEST_F(LoggerProcess, SaysThatTheLogCannotBeOpenedAlsoAfterItsEnd) {
    LogProcess process(folder_, {UNLOAD_PROGRAM, "Late", UTILITY_LIBRARY},
                       {"QX_LOG=" + folder_.File("missing/log")});
    EXPECT_EQ(process.Wait(), 0);
    EXPECT_THAT(Bodies(process.StandardError()), ElementsAre(HasSubstr("cannot be opened"), "4 early",
                                                             HasSubstr("cannot be opened"), "4 late"));
}

}  // namespace
