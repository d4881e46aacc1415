#include "LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>

namespace {

using ::testing::ElementsAre;

void Trace(const char* text) {
    Logger::Put(LOG_PRIORITY_TRACE, "file.cc", "function", 1, "%s", text);
}

TEST(LogCapture, HoldsEveryPriorityAndEveryField) {
    const LogCapture log;
    Logger::Put(LOG_PRIORITY_SAMPLE, "file.cc", "function", 5, "%d", 17);
    Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "OP: line");
    const auto lines = log.Lines();
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[0].priority, LOG_PRIORITY_SAMPLE);
    EXPECT_EQ(lines[0].file, "file.cc");
    EXPECT_EQ(lines[0].function, "function");
    EXPECT_EQ(lines[0].line, 5);
    EXPECT_EQ(lines[0].text, "17");
    EXPECT_EQ(lines[0].thread, std::this_thread::get_id());
    EXPECT_EQ(lines[1].file, std::nullopt);
    EXPECT_EQ(lines[1].function, std::nullopt);
}

TEST(LogCapture, CountsAndFindsLines) {
    LogCapture log;
    Trace("a");
    Trace("b");
    Trace("a");
    Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "a");
    EXPECT_EQ(log.Count("a"), 3U);
    EXPECT_EQ(log.Count(LOG_PRIORITY_TRACE, "function", "a"), 2U);
    EXPECT_EQ(log.Count(LOG_PRIORITY_OPERATOR, nullptr, "a"), 1U);
    EXPECT_EQ(log.Count(LOG_PRIORITY_OPERATOR, "function", "a"), 0U);
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) { return line.text < "b"; }), 3U);
    EXPECT_TRUE(log.Contains("b"));
    EXPECT_FALSE(log.Contains("c"));
    EXPECT_EQ(log.Find("b")->line, 1);
    EXPECT_FALSE(log.Find("c"));
    EXPECT_THAT(log.Texts(), ElementsAre("a", "b", "a", "a"));
    EXPECT_THAT(log.Texts(LOG_PRIORITY_OPERATOR), ElementsAre("a"));
    log.Clear();
    EXPECT_TRUE(log.Lines().empty());
}

TEST(LogCapture, WaitsForLinesOfOtherThreads) {
    const LogCapture log;
    std::thread thread([] {
        Trace("first");
        Trace("second");
    });
    EXPECT_TRUE(log.WaitForText("second"));
    EXPECT_TRUE(log.WaitFor([](const auto& lines) { return lines.size() == 2; }));
    thread.join();
    EXPECT_FALSE(log.WaitForText("third", 1, std::chrono::milliseconds(0)));
    EXPECT_FALSE(log.WaitForText("second", 2, std::chrono::milliseconds(0)));
}

TEST(LogCapture, HoldsOneThreadAtALineAndNoOther) {
    LogCapture log;
    auto gate = log.BlockAtText("held");
    std::thread thread([] {
        Trace("held");
        Trace("after");
    });
    ASSERT_TRUE(gate.WaitReached());
    EXPECT_TRUE(log.Contains("held"));
    Trace("held");  // only the first one is held
    Trace("other");
    EXPECT_FALSE(log.Contains("after"));
    gate.Release();
    EXPECT_TRUE(log.WaitForText("after"));
    thread.join();
}

TEST(LogCapture, HoldsNobodyAfterAnEarlyRelease) {
    LogCapture log;
    auto gate = log.BlockAtText("line");
    gate.Release();
    Trace("line");
    EXPECT_FALSE(gate.WaitReached(std::chrono::milliseconds(0)));
}

TEST(LogCapture, ReleasesEveryThreadAtItsEnd) {
    std::unique_ptr<LogCapture::Gate> gate;
    std::thread thread;
    {
        LogCapture log;
        gate = std::make_unique<LogCapture::Gate>(log.BlockAtText("held"));
        thread = std::thread([] { Trace("held"); });
        EXPECT_TRUE(gate->WaitReached());
    }
    thread.join();
}

TEST(LogCapture, RunsAHookOnTheLoggingThread) {
    LogCapture log;
    std::thread::id ran;
    log.OnLine([&](const CapturedLine& line) {
        if (line.text == "outer") {
            ran = std::this_thread::get_id();
            Trace("inner");
        }
    });
    std::thread thread([] { Trace("outer"); });
    const auto id = thread.get_id();
    thread.join();
    EXPECT_EQ(ran, id);
    EXPECT_THAT(log.Texts(), ElementsAre("outer", "inner"));
}

TEST(LogCapture, LeavesOtherCapturesAlone) {
    const LogCapture outer;
    {
        const LogCapture inner(LOG_PRIORITY_OPERATOR);
        Trace("line");
        EXPECT_TRUE(inner.Lines().empty());
    }
    EXPECT_EQ(outer.Count("line"), 1U);
}

}  // namespace
