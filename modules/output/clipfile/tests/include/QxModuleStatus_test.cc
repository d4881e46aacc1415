#include "QxModuleStatus.h"

#include <gtest/gtest.h>

namespace {

// Hosts in the field know the numbers alone.
TEST(QxModuleStatus, StatusesHaveTheNumbersThatHostsKnow) {
    EXPECT_EQ(QxStatus::kNone, 0);
    EXPECT_EQ(QxStatus::kBufferingStopped, 3);
    EXPECT_EQ(QxStatus::kBufferingStarted, 4);
    EXPECT_EQ(QxStatus::kStreamFault, 6);
    EXPECT_EQ(QxStatus::kFailed, 7);
    EXPECT_EQ(QxStatus::kNoCause, 0);
}

TEST(QxModuleStatus, CausesHaveTheNumbersThatHostsKnow) {
    EXPECT_EQ(QxStreamFault::kFileTooSlow, 22);
    EXPECT_EQ(QxStreamFault::kVideoBufferFull, 23);
    EXPECT_EQ(QxStreamFault::kAudioBufferFull, 24);
    EXPECT_EQ(QxStreamFault::kMetaBufferFull, 25);
    EXPECT_EQ(QxStreamFault::kOffline, 26);

    EXPECT_EQ(QxFailure::kInitialize, 2);
    EXPECT_EQ(QxFailure::kLogon, 21);
    EXPECT_EQ(QxFailure::kFreeSpaceUnknown, 22);
    EXPECT_EQ(QxFailure::kDiskFull, 23);
    EXPECT_EQ(QxFailure::kDirectory, 24);
    EXPECT_EQ(QxFailure::kFileOpen, 25);
    EXPECT_EQ(QxFailure::kFileWrite, 26);
    EXPECT_EQ(QxFailure::kNoFirstChunk, 26);
    EXPECT_EQ(QxFailure::kFileClose, 27);
    EXPECT_EQ(QxFailure::kWriterHangs, 27);
}

TEST(QxModuleStatus, TheMapHasTheWordsThatHostsKnow) {
    EXPECT_STREQ(QxStatusMap::kFileOutput, "file_output_status");
    EXPECT_STREQ(QxStatusMap::kOutput, "output");
    EXPECT_STREQ(QxStatusMap::kStandby, "standby");
}

}  // namespace
