// Weeks of recording begin with ten minutes in which nothing grows.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "endtoend/LongRecording.h"

namespace {

class LongRecordingTest : public ::testing::TestWithParam<const char*> {};

TEST_P(LongRecordingTest, TakesNoMoreMemoryAndFilesFromFileToFile) {
    LongRecording recording(GetParam(), 2);
    std::vector<Usage> minutes;
    for (int minute = 0; minute < 10; ++minute) {
        recording.RecordMinute();
        minutes.push_back(Usage::Now());
    }
    EXPECT_EQ(recording.FileCount(), 5U);
    const auto heapIn = [&](std::ptrdiff_t begin, std::ptrdiff_t end) {
        return std::max_element(minutes.begin() + begin, minutes.begin() + end,
                                [](const Usage& a, const Usage& b) { return a.heapBytes < b.heapBytes; })
            ->heapBytes;
    };
    // Two files each. What the last chunks and fragment hold differs from one look to the next, by 200 KiB at
    // the most; one lost unit in a hundred frames would be more.
    EXPECT_LT(heapIn(6, 10), heapIn(2, 6) + (256 << 10));
    for (const Usage& usage : minutes) {
        // A look between a close and an open sees one file less.
        EXPECT_LE(usage.openFiles, minutes.front().openFiles + 1);
    }
    EXPECT_LE(minutes.back().openFiles, minutes.front().openFiles + 1);
}

INSTANTIATE_TEST_SUITE_P(FileTypes, LongRecordingTest, ::testing::Values("normal", "fragment"),
                         [](const auto& tested) { return std::string(tested.param); });

}  // namespace
