// A module that was built without network shares.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "shares/ShareRecordingFixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::Pair;

constexpr const char* kShare = "\\\\127.0.0.1\\rec";

class NoSharesTest : public ShareRecording, public ::testing::WithParamInterface<const char*> {};

TEST_P(NoSharesTest, ARecordingToAShareFailsAndTheLogSaysWhy) {
    const std::string user = GetParam();
    FakeHost host;
    setUp(host, kShare, user, "secret");
    Record(host);
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 21)));
    EXPECT_EQ(log_.Count("no network shares: built without libsmbclient."), 1U);
    // ENOTSUP is 5f.
    EXPECT_TRUE(log_.Contains(
        LOG_PRIORITY_ERROR, "clipfileModule::FileOutput::useNetDrive",
        ("LogonUser call failed. 0, 5f, " + std::string(kShare) + ", " + user + ", secret").c_str()));
    EXPECT_FALSE(std::filesystem::exists("127.0.0.1"));
}

INSTANTIATE_TEST_SUITE_P(Users, NoSharesTest, ::testing::Values("recorder", ""));

}  // namespace
