#include "module/ModuleLines.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <mutex>
#include <set>
#include <string>

#include "endtoend/LiveHost.h"

namespace receiver {
namespace {

using ::testing::Field;
using ::testing::Optional;

/// Notes what the lines of the process mean.
class Listener {
 public:
    Listener() { LogSinks::Add(sink_, LOG_PRIORITY_TRACE); }
    ~Listener() { LogSinks::Remove(sink_.get()); }
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;

    bool HasHeard(LineMeaning meaning) const {
        const std::lock_guard lock(sink_->mutex);
        return sink_->meanings.contains(meaning);
    }

 private:
    struct Sink final : LogSinkInterface {
        void OnLine(const LogLine& line) override {
            if (const auto understood = Understand(line)) {
                const std::lock_guard lock(mutex);
                meanings.insert(understood->meaning);
            }
        }
        std::mutex mutex;
        std::set<LineMeaning> meanings;
    };
    const std::shared_ptr<Sink> sink_ = std::make_shared<Sink>();
};

LogLine Line(_LogPriority priority, std::string_view text, const char* function = "f") {
    return {priority, "a.cc", function, 1, text};
}

// Nobody else tells the receiver of files and records: a line that the module words otherwise would be missed
// without a word.
TEST(ModuleLines, AreAllSaidByTheModule) {
    const Listener listener;
    {
        LiveHost host({.speed = 4});
        host.PushUntil(30, false);
        host.PushUntil(60, true);
        host.StarveOfMetadata();
        host.PushUntilLine("OP: FILE CREATE.", 1, true);
        host.PushUntilLine("OP: REMOVE STREAM.", 1, false);
    }
    {
        LiveHost host({.speed = 1000});
        const auto at = [&host](const char* text) {
            return host.log.BlockAt([text](const CapturedLine& line) { return line.text.starts_with(text); });
        };
        const auto video = at("ST: [V]");
        const auto audio = at("ST: [A]");
        const auto meta = at("ST: [M]");
        for (const LineMeaning dropped :
             {LineMeaning::kVideoDropped, LineMeaning::kAudioDropped, LineMeaning::kMetaDropped}) {
            while (!listener.HasHeard(dropped) && host.frame < 10000) {
                host.PushUntil(host.frame + 1, true);
            }
        }
    }
    {
        LiveHost host({.speed = 4}, {{"-outputPath", "\\\\127.0.0.1\\rec"}, {"-userName", "operator"}});
        host.PushUntilLine("LogonUser call failed.", 1, true);
    }
    for (const ModuleLine& line : kModuleLines) {
        EXPECT_TRUE(listener.HasHeard(line.meaning)) << line.text;
    }
}

TEST(ModuleLines, TheRestIsWhatStandsBetweenBeginningAndEnd) {
    EXPECT_THAT(Understand(Line(LOG_PRIORITY_TRACE, "output path = \"C:\\a \"b\".c\".")),
                Optional(Field(&UnderstoodLine::rest, "C:\\a \"b\".c")));
    EXPECT_THAT(Understand(Line(LOG_PRIORITY_TRACE, "ST: out_filename = \"\"")),
                Optional(Field(&UnderstoodLine::rest, "")));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_TRACE, "ST: out_filename = \"")));
}

TEST(ModuleLines, ALineMeansNothingAtAnotherPriorityOrOfAnotherFunction) {
    EXPECT_TRUE(Understand(Line(LOG_PRIORITY_TRACE, "end.", "clipfileModule::Controller::OnStopStream")));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_TRACE, "end.", "clipfileModule::Controller::OnStartStream")));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_TRACE, "end.", nullptr)));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_NOTICE, "OP: REC START. 10:00:00:00.")));
    EXPECT_TRUE(Understand(Line(LOG_PRIORITY_OPERATOR, "OP: REC START. 10:00:00:00.", nullptr)));
}

TEST(ModuleLines, WhatHasNoStarIsTheWholeLine) {
    EXPECT_TRUE(Understand(Line(LOG_PRIORITY_WARNING, "queue overflow (audio)")));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_WARNING, "queue overflow (audio).")));
    EXPECT_FALSE(Understand(Line(LOG_PRIORITY_TRACE, "start. event_id = 60.")));
}

}  // namespace
}  // namespace receiver
