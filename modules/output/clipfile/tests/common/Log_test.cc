#include "common/Log.h"

#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <memory>
#include <string>

#include "LogCapture.h"

namespace clipfileModule {

namespace {

template <std::size_t Size>
std::string nameOf(const char (&pretty)[Size]) {
    return FunctionName(pretty).text;
}

}  // namespace

class LogTestSubject {
 public:
    LogTestSubject() { CLIPFILE_LOG(LOG_PRIORITY_TRACE, "constructor"); }
    std::shared_ptr<std::map<int, std::string>> Build(const std::function<void(int)>&) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "number %d", 5);
        return nullptr;
    }
    void InLambda() {
        const auto log = [] { CLIPFILE_LOG(LOG_PRIORITY_TRACE, "lambda"); };
        log();
    }
    static const char* Static() {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "static");
        return nullptr;
    }
};

/// A part of another class, by whose name the log knows it.
class LogTestPart {
 public:
    void Log() { CLIPFILE_LOG(LOG_PRIORITY_TRACE, "part"); }
    void InLambda() {
        [] { CLIPFILE_LOG(LOG_PRIORITY_TRACE, "lambda of the part"); }();
    }

 private:
    static constexpr char kLogClass[] = "LogTestSubjectAsAWhole";
};

TEST(FunctionName, LeavesOffResultTypeAndParameters) {
    EXPECT_EQ(nameOf("bool clipfileModule::Controller::Initialize(QxModuleHostInterface*)"),
              "clipfileModule::Controller::Initialize");
}

TEST(FunctionName, PassesOverTemplateArgumentsOfTheResultType) {
    EXPECT_EQ(nameOf("std::map<int, std::function<void(int)> > a::B::c(std::vector<int>) const"), "a::B::c");
}

TEST(FunctionName, PassesOverPointersAndReferences) {
    EXPECT_EQ(nameOf("const char* a::b()"), "a::b");
    EXPECT_EQ(nameOf("const char *a::b()"), "a::b");
    EXPECT_EQ(nameOf("int& a::b()"), "a::b");
}

TEST(FunctionName, ReadsConstructors) {
    EXPECT_EQ(nameOf("a::B::B(int)"), "a::B::B");
}

TEST(Log, NamesTheClassThatAPartOfItTells) {
    const LogCapture log;
    LogTestPart part;
    part.Log();
    part.InLambda();
    EXPECT_EQ(log.Find("part")->function, "clipfileModule::LogTestSubjectAsAWhole::Log");
    EXPECT_EQ(log.Find("lambda of the part")->function, "clipfileModule::LogTestSubjectAsAWhole::InLambda");
}

TEST(Log, NamesSourceFunctionAndLine) {
    const LogCapture log;
    LogTestSubject subject;
    subject.Build({});
    const auto line = log.Find("number 5");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->priority, LOG_PRIORITY_WARNING);
    EXPECT_EQ(line->file, "modules/output/clipfile/tests/common/Log_test.cc");
    EXPECT_EQ(line->function, "clipfileModule::LogTestSubject::Build");
    EXPECT_GT(line->line, 0);
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_TRACE, "clipfileModule::LogTestSubject::LogTestSubject", "constructor"));
}

TEST(Log, NamesTheFunctionAroundALambda) {
    const LogCapture log;
    LogTestSubject().InLambda();
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, "clipfileModule::LogTestSubject::InLambda", "lambda"));
}

TEST(Log, NamesAFunctionThatGivesAPointer) {
    const LogCapture log;
    LogTestSubject::Static();
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, "clipfileModule::LogTestSubject::Static", "static"));
}

TEST(Log, PlainLinesNameNoPlace) {
    const LogCapture log;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: %s", "text");
    const auto line = log.Find("OP: text");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->file, std::nullopt);
    EXPECT_EQ(line->function, std::nullopt);
    EXPECT_EQ(line->line, 0);
}

}  // namespace clipfileModule
