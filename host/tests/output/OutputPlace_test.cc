#include "output/OutputPlace.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

using ::testing::HasSubstr;

class OutputPlaceTest : public ::testing::Test {
 protected:
    OutputPlaceTest() : store_(::testing::TempDir() + "receiver_place_XXXXXX") {
        const int file = mkstemp(store_.data());
        EXPECT_GE(file, 0);
        close(file);
        setenv("QX_SETTINGS", store_.c_str(), 1);
    }
    ~OutputPlaceTest() override { unlink(store_.c_str()); }

    OutputPlace Of(const std::string& output) {
        options_.output = output;
        return PlaceOf(options_);
    }

    std::string store_;
    Options options_;
};

TEST_F(OutputPlaceTest, ALocalFolderHasSlashesAndNoneAtItsEnd) {
    const OutputPlace place = Of("/srv\\rec//");
    EXPECT_EQ(place.folder, "/srv/rec");
    EXPECT_EQ(place.parameter, "/srv/rec");
    EXPECT_FALSE(place.onShare);
    EXPECT_EQ(Of("/").folder, "/");
    EXPECT_EQ(place.prefix, "Unknown-Model");
}

TEST_F(OutputPlaceTest, AShareIsWrittenWithSlashesOrBackslashes) {
    for (const char* const written :
         {"//server/share/my rec", "\\\\server\\share\\my rec\\", "/\\server/share\\my rec/"}) {
        const OutputPlace place = Of(written);
        EXPECT_TRUE(place.onShare) << written;
        EXPECT_EQ(place.folder, "//server/share/my rec") << written;
        EXPECT_EQ(place.parameter, "\\\\server\\share\\my rec") << written;
    }
}

TEST_F(OutputPlaceTest, AServerMayBeAnIpv6AddressInBrackets) {
    const OutputPlace place = Of("//[fd00::5]:4450/share/rec");
    EXPECT_TRUE(place.onShare);
    EXPECT_EQ(place.folder, "//[fd00::5]:4450/share/rec");
    EXPECT_EQ(place.parameter, "\\\\[fd00::5]:4450\\share\\rec");
}

TEST_F(OutputPlaceTest, AShareWithoutANameIsRefused) {
    for (const char* const written :
         {"//server", "\\\\server\\", "//", "//ser ver/share", "//fd00::5/share"}) {
        try {
            Of(written);
            ADD_FAILURE() << written;
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            EXPECT_THAT(error.what(), HasSubstr("names no share: write //server/share/folder."));
        }
    }
}

// A store is read once in a process: what stands in one is tested with the whole program.
TEST_F(OutputPlaceTest, WithoutOptionAndStoreThereIsADefault) {
    EXPECT_EQ(PlaceOf(options_).folder, "recordings");
    EXPECT_EQ(PlaceOf(options_).parameter, "recordings");
    EXPECT_EQ(PlaceOf(options_).user, "");
}

TEST_F(OutputPlaceTest, AFolderWithTheModulesWordForNoneIsStillAFolder) {
    EXPECT_EQ(Of("none").parameter, "./none");
}

TEST_F(OutputPlaceTest, TakesCredentialsAndPrefixFromTheOptions) {
    options_.user = "me";
    options_.password = "mine";
    options_.prefix = "";
    const OutputPlace place = Of("//server/share");
    EXPECT_EQ(place.user, "me");
    EXPECT_EQ(place.password, "mine");
    EXPECT_EQ(place.prefix, "");
}

}  // namespace
}  // namespace receiver
