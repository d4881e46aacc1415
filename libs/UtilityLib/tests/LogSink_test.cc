#include "LogSink.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <string>
#include <thread>
#include <vector>

namespace {

class Recorder : public LogSinkInterface {
 public:
    void OnLine(const LogLine& line) override {
        ++lines;
        priority = line.priority;
        hasFile = line.file != nullptr;
        hasFunction = line.function != nullptr;
        number = line.line;
        text = line.text;
        thread = std::this_thread::get_id();
    }

    int lines = 0;
    int priority = 0;
    bool hasFile = false;
    bool hasFunction = false;
    int number = 0;
    std::string text;
    std::thread::id thread;
};

TEST(LogSinks, DeliverPriorityPlaceAndFormattedText) {
    const auto sink = std::make_shared<Recorder>();
    LogSinks::Add(sink, LOG_PRIORITY_SAMPLE);
    Logger::Put(LOG_PRIORITY_DETAIL, "file.cc", "function", 17, "%s = %llu.", "ts", 18446744073709551615ULL);
    LogSinks::Remove(sink.get());
    EXPECT_EQ(sink->lines, 1);
    EXPECT_EQ(sink->priority, 12);
    EXPECT_TRUE(sink->hasFile);
    EXPECT_TRUE(sink->hasFunction);
    EXPECT_EQ(sink->number, 17);
    EXPECT_EQ(sink->text, "ts = 18446744073709551615.");
    EXPECT_EQ(sink->thread, std::this_thread::get_id());
}

TEST(LogSinks, TellNullFromEmpty) {
    const auto sink = std::make_shared<Recorder>();
    LogSinks::Add(sink, LOG_PRIORITY_SAMPLE);
    Logger::Put(LOG_PRIORITY_TRACE, nullptr, nullptr, 0, "OP: line");
    EXPECT_FALSE(sink->hasFile);
    EXPECT_FALSE(sink->hasFunction);
    Logger::Put(LOG_PRIORITY_TRACE, "", "", 0, "line");
    EXPECT_TRUE(sink->hasFile);
    EXPECT_TRUE(sink->hasFunction);
    LogSinks::Remove(sink.get());
}

TEST(LogSinks, DeliverLinesUpToTheirOwnPriority) {
    const auto coarse = std::make_shared<Recorder>();
    const auto fine = std::make_shared<Recorder>();
    LogSinks::Add(coarse, LOG_PRIORITY_OPERATOR);
    LogSinks::Add(fine, LOG_PRIORITY_DETAIL);
    Logger::Put(LOG_PRIORITY_DETAIL, nullptr, nullptr, 0, "detail");
    Logger::Put(LOG_PRIORITY_SAMPLE, nullptr, nullptr, 0, "sample");
    EXPECT_EQ(coarse->lines, 0);
    EXPECT_EQ(fine->lines, 1);
    LogSinks::Remove(fine.get());
    Logger::Put(LOG_PRIORITY_DETAIL, nullptr, nullptr, 0, "detail");
    EXPECT_EQ(fine->lines, 1);
    LogSinks::Remove(coarse.get());
}

TEST(LogSinks, IgnoreAnUnknownSink) {
    Recorder unknown;
    LogSinks::Remove(&unknown);
    const auto sink = std::make_shared<Recorder>();
    LogSinks::Add(sink, LOG_PRIORITY_SAMPLE);
    LogSinks::Remove(&unknown);
    Logger::Put(LOG_PRIORITY_TRACE, nullptr, nullptr, 0, "line");
    EXPECT_EQ(sink->lines, 1);
    LogSinks::Remove(sink.get());
}

TEST(LogSinks, DeliverTextsOfAnyLength) {
    const auto sink = std::make_shared<Recorder>();
    LogSinks::Add(sink, LOG_PRIORITY_SAMPLE);
    for (const std::size_t length : {0U, 1U, 510U, 511U, 512U, 513U, 100000U}) {
        const std::string text(length, 'y');
        Logger::Put(LOG_PRIORITY_TRACE, nullptr, nullptr, 0, "%s", text.c_str());
        EXPECT_EQ(sink->text, text);
    }
    LogSinks::Remove(sink.get());
}

TEST(LogSinks, MayComeAndGoWhileOthersLog) {
    std::atomic<bool> done = false;
    std::vector<std::thread> threads;
    for (int i = 0; i < 3; ++i) {
        threads.emplace_back([&done] {
            while (!done) {
                Logger::Put(LOG_PRIORITY_TRACE, "file.cc", "function", 1, "line");
            }
        });
    }
    class Counter : public LogSinkInterface {
     public:
        void OnLine(const LogLine& line) override { matches += line.text == "line" ? 1 : 0; }
        std::atomic<int> matches = 0;
    };
    for (int i = 0; i < 200; ++i) {
        const auto sink = std::make_shared<Counter>();
        LogSinks::Add(sink, LOG_PRIORITY_SAMPLE);
        Logger::Put(LOG_PRIORITY_TRACE, "file.cc", "function", 1, "line");
        EXPECT_GT(sink->matches, 0);
        LogSinks::Remove(sink.get());
    }
    done = true;
    for (auto& thread : threads) {
        thread.join();
    }
}

}  // namespace
