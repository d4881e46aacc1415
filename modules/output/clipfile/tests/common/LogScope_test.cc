#include "common/LogScope.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>

#include "LogCapture.h"

namespace clipfileModule {

namespace scope_test {

void plain() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "work.");
}

void withDetails(int number) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE, " number = %d.", number);
}

bool withResult(bool result) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    return scope.Return("func_result", result);
}

void endedBeforeItsLastStep() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    scope.End();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "step behind the end.");
}

bool endedByALineOfItsOwn() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    scope.EndAs(LOG_PRIORITY_ERROR, "end. no event.");
    return scope.Return("result", false);
}

void dismissed() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    scope.Dismiss();
}

void leftByAnException() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    throw std::runtime_error("fault");
}

/// Runs a function while an exception is on its way.
struct RunsInUnwinding {
    ~RunsInUnwinding() { plain(); }
};

}  // namespace scope_test

namespace {

using ::testing::ElementsAre;

TEST(LogScope, LogsStartAndEndWithPlaceAndPriority) {
    const LogCapture log;
    scope_test::plain();
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "work.", "end."));
    for (const char* const text : {"start.", "end."}) {
        const auto line = log.Find(text);
        EXPECT_EQ(line->priority, LOG_PRIORITY_TRACE);
        EXPECT_EQ(line->function, "clipfileModule::scope_test::plain");
        EXPECT_TRUE(line->file->ends_with("LogScope_test.cc"));
        EXPECT_GT(line->line, 0);
    }
}

TEST(LogScope, PutsDetailsOnTheFirstLine) {
    const LogCapture log;
    scope_test::withDetails(7);
    EXPECT_THAT(log.Texts(), ElementsAre("start. number = 7.", "end."));
}

TEST(LogScope, PutsTheResultOnTheLastLineAndPassesItOn) {
    const LogCapture log;
    EXPECT_TRUE(scope_test::withResult(true));
    EXPECT_FALSE(scope_test::withResult(false));
    EXPECT_THAT(log.Texts(),
                ElementsAre("start.", "end. func_result = 1.", "start.", "end. func_result = 0."));
    EXPECT_EQ(log.Find("end. func_result = 1.")->priority, LOG_PRIORITY_DETAIL);
}

TEST(LogScope, EndsOnceWhereItIsTold) {
    const LogCapture log;
    scope_test::endedBeforeItsLastStep();
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "end.", "step behind the end."));
}

TEST(LogScope, EndsWithALineOfItsOwnInThePlaceOfTheLastOne) {
    const LogCapture log;
    EXPECT_FALSE(scope_test::endedByALineOfItsOwn());
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "end. no event."));
    EXPECT_EQ(log.Find("end. no event.")->priority, LOG_PRIORITY_ERROR);
}

TEST(LogScope, EndsWithoutALineWhenDismissed) {
    const LogCapture log;
    scope_test::dismissed();
    EXPECT_THAT(log.Texts(), ElementsAre("start."));
}

TEST(LogScope, HasNoLastLineWhenAnExceptionLeavesTheFunction) {
    const LogCapture log;
    EXPECT_THROW(scope_test::leftByAnException(), std::runtime_error);
    EXPECT_THAT(log.Texts(), ElementsAre("start."));
}

TEST(LogScope, HasItsLastLineInAFunctionThatRunsWhileAnExceptionIsOnItsWay) {
    const LogCapture log;
    try {
        const scope_test::RunsInUnwinding runs;
        throw std::runtime_error("fault");
    } catch (const std::runtime_error&) {
    }
    EXPECT_THAT(log.Texts(), ElementsAre("start.", "work.", "end."));
}

}  // namespace
}  // namespace clipfileModule
