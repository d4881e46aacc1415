// Calls of a whole receiver that fail where they reach the system: a choice of what scripts/faults tries.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>

#include "faults/FaultRun.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::IsEmpty;

/// Meets the fault, and expects that nothing is wrong with what comes of it.
FaultOutcome Meet(const FaultRunner& runner, const Fault& fault) {
    FaultOutcome outcome = runner.Run(fault);
    EXPECT_THAT(runner.WrongIn(outcome, fault), IsEmpty())
        << CallOf(fault) << " " << fault.number << ", " << EffectOf(fault) << "\n"
        << outcome.said;
    return outcome;
}

Fault FaultAt(const std::string& call, const std::string& suffix, std::size_t number, int error) {
    Fault fault{call, suffix, number};
    fault.error = error;
    return fault;
}

/// From call `number` on. Which one is whose may differ from run to run.
Fault FaultsFrom(const std::string& call, const std::string& suffix, std::size_t number, int error) {
    Fault fault = FaultAt(call, suffix, number, error);
    fault.once = false;
    return fault;
}

class BoundaryFaultsOfBothTypes : public ::testing::TestWithParam<FileType> {
 protected:
    const FaultRunner runner_{GetParam()};
};

TEST_P(BoundaryFaultsOfBothTypes, AWriteThatFailsEndsTheRunWithWhatWasWrittenBefore) {
    const std::size_t calls = runner_.CallsOf({"write", ".MP4"});
    for (const std::size_t number : {std::size_t{1}, calls / 2, calls}) {
        const FaultOutcome outcome = Meet(runner_, FaultAt("write", ".MP4", number, EIO));
        EXPECT_EQ(outcome.code, outcome.hit ? 7 : 0);
    }
    EXPECT_EQ(Meet(runner_, FaultsFrom("write", ".MP4", calls / 3, ENOSPC)).code, 7);
}

TEST_P(BoundaryFaultsOfBothTypes, AWriteThatIsCutShortIsGoneOnWith) {
    Fault half = FaultsFrom("write", ".MP4", 2, 0);
    half.isShort = true;
    EXPECT_EQ(Meet(runner_, half).code, 0);
}

TEST_P(BoundaryFaultsOfBothTypes, MemoryThatIsMissingEndsTheRunInOrder) {
    const std::size_t calls = runner_.CallsOf({"malloc", ""});
    for (const std::size_t number : {std::size_t{1}, calls / 3, calls - calls / 8}) {
        Meet(runner_, FaultAt("malloc", "", number, ENOMEM));
    }
}

INSTANTIATE_TEST_SUITE_P(, BoundaryFaultsOfBothTypes,
                         ::testing::Values(FileType::kNormal, FileType::kFragmented),
                         [](const auto& parameter) { return NameOf(parameter.param); });

class BoundaryFaults : public ::testing::Test {
 protected:
    const FaultRunner runner_{FileType::kNormal};
};

TEST_F(BoundaryFaults, AFileOrFolderThatCannotBeMadeEndsTheRun) {
    EXPECT_EQ(Meet(runner_, FaultAt("open", ".MP4", 1, EROFS)).cause, 25);
    EXPECT_EQ(Meet(runner_, FaultAt("open", ".MP4", 2, EDQUOT)).cause, 25);
    EXPECT_EQ(Meet(runner_, FaultAt("mkdir", "", 1, EDQUOT)).cause, 24);
    EXPECT_EQ(Meet(runner_, FaultAt("mkdir", "", 2, EROFS)).cause, 24);
}

TEST_F(BoundaryFaults, ADiskWhoseSpaceCannotBeReadEndsTheRun) {
    EXPECT_EQ(Meet(runner_, FaultsFrom("space", "", runner_.CallsOf({"space", ""}) / 2, ESTALE)).cause, 22);
}

TEST_F(BoundaryFaults, ADiskThatHasNotKeptWhatWasWrittenIsToldAndIsALoss) {
    Fault fault = FaultAt("sync", ".MP4", 1, EIO);
    fault.durable = "0.001";
    const FaultOutcome outcome = Meet(runner_, fault);
    EXPECT_EQ(outcome.code, 8);
    EXPECT_THAT(outcome.said, HasSubstr("the disk has not kept all that was written to "));
}

TEST_F(BoundaryFaults, AFolderThatCannotBeMadeDurableIsTold) {
    Fault fault = FaultAt("sync", "Unknown-Model", 1, EIO);
    fault.durable = "0.001";
    const FaultOutcome outcome = Meet(runner_, fault);
    EXPECT_EQ(outcome.code, 0);
    EXPECT_THAT(outcome.said, HasSubstr("Unknown-Model cannot be made durable: Input/output error"));
}

TEST_F(BoundaryFaults, WhatIsRecordedIsMadeDurableWithItsFolders) {
    for (const char* const suffix : {".MP4", "Unknown-Model", "recordings"}) {
        EXPECT_GT(runner_.CallsOf({"sync", suffix}), 0U) << suffix;
    }
    const FaultOutcome without = Meet(runner_, {});
    EXPECT_EQ(without.code, 0);
    EXPECT_EQ(CountCalls(without.calls, {"sync", ".MP4"}), 0U);
}

TEST_F(BoundaryFaults, AJournalThatCannotBeKeptIsToldAndRecordingGoesOn) {
    for (const char* const call : {"open", "write", "sync"}) {
        const FaultOutcome outcome = Meet(runner_, FaultAt(call, ".journal.new", 1, EIO));
        EXPECT_EQ(outcome.code, 0);
        EXPECT_THAT(outcome.said, HasSubstr("no journal can be kept, "));
    }
    EXPECT_THAT(Meet(runner_, FaultAt("rename", ".journal", 1, EROFS)).said,
                HasSubstr("no journal can be kept, "));
}

TEST_F(BoundaryFaults, AThreadThatCannotBeStartedEndsTheRunWithASentence) {
    // The first are the receiver's own, then come those of the module, then those of the recording.
    for (const std::size_t number : {1U, 2U, 3U, 4U}) {
        const FaultOutcome outcome = Meet(runner_, FaultAt("thread", "", number, EAGAIN));
        EXPECT_EQ(outcome.code, 1);
        EXPECT_THAT(outcome.said, HasSubstr("receiver: the system starts no more threads: "));
    }
    const std::size_t calls = runner_.CallsOf({"thread", ""});
    for (const std::size_t number : {calls / 2, calls - 2}) {
        Meet(runner_, FaultsFrom("thread", "", number, EAGAIN));
    }
}

}  // namespace
}  // namespace endtoend
