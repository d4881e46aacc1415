#include "RunSettings.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "common/ReceiverError.h"
#include "support/Rates.h"

namespace receiver {
namespace {

using ::testing::HasSubstr;
using ::testing::Pair;
using ::testing::UnorderedElementsAre;

/// The sentence of a usage error; empty when there is none.
template <typename Action>
std::string UsageError(Action action) {
    try {
        action();
    } catch (const ReceiverError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kUsage);
        return error.what();
    }
    return {};
}

TEST(CheckUser, AUserNeedsAShare) {
    Options options;
    OutputPlace place;
    place.folder = "/srv/rec";
    EXPECT_EQ(UsageError([&] { CheckUser(options, place); }), "");
    options.user = "joe";
    EXPECT_THAT(UsageError([&] { CheckUser(options, place); }), HasSubstr("'/srv/rec' is none"));
    place.onShare = true;
    EXPECT_EQ(UsageError([&] { CheckUser(options, place); }), "");
}

TEST(ParametersOf, TellTheModuleWhatTheOperatorAndTheSourceSay) {
    Options options;
    options.prefix = "CAM1";
    options.user = "joe";
    options.password = "secret";
    options.fileType = "fragment";
    OutputPlace place;
    place.parameter = "/srv/rec";
    SourceDescription source;
    source.frameRate = Rate("59.94");
    source.width = 1920;
    source.height = 1080;
    source.bitrate = 8000;
    const StartParameters parameters = ParametersOf(options, place, source);
    EXPECT_THAT(parameters.texts,
                UnorderedElementsAre(Pair("-outputPath", "/srv/rec"), Pair("-fileType", "fragment"),
                                     Pair("-naluType", "normal"), Pair("-outputMode", "sync"),
                                     Pair("-recordRules", "exact"), Pair("-filePrefix", "CAM1"),
                                     Pair("-userName", "joe"), Pair("-password", "secret")));
    EXPECT_THAT(parameters.numbers,
                UnorderedElementsAre(Pair("-encodedHeight", 1080), Pair("-encodedWidth", 1920),
                                     Pair("-encodedFPS", 59940), Pair("-encodedBPS", 8000)));
}

TEST(ParametersOf, ReorderedPicturesAreAnnounced) {
    SourceDescription source;
    source.frameRate = Rate("25");
    source.reordering = 1;
    EXPECT_EQ(ParametersOf({}, {}, source).texts.at("-pictureOrder"), "decoding");
    source.reordering = 0;
    EXPECT_EQ(ParametersOf({}, {}, source).texts.count("-pictureOrder"), 0u);
}

TEST(ParametersOf, WhatNobodySaysIsLeftToTheModule) {
    Options options;
    options.mode = OutputMode::kOn;
    SourceDescription source;
    source.frameRate = Rate("25");
    const StartParameters parameters = ParametersOf(options, {}, source);
    EXPECT_EQ(parameters.texts.at("-outputMode"), "on");
    for (const char* const name : {"-filePrefix", "-userName", "-password"}) {
        EXPECT_EQ(parameters.texts.count(name), 0u) << name;
    }
    EXPECT_EQ(parameters.numbers.count("-encodedBPS"), 0u);
}

TEST(RecorderSettingsOf, ATimecodeMustExistAtTheRate) {
    Options options;
    options.timecode = Timecode{10, 0, 0, 25, false};
    EXPECT_THAT(UsageError([&] { RecorderSettingsOf(options, Rate("25")); }),
                HasSubstr("--timecode 10:00:00:25 does not exist"));
    EXPECT_EQ(UsageError([&] { RecorderSettingsOf(options, Rate("30")); }), "");
    options.timecode = Timecode{10, 0, 0, 0, true};
    EXPECT_THAT(UsageError([&] { RecorderSettingsOf(options, Rate("30")); }), HasSubstr("does not exist"));
}

TEST(RecorderSettingsOf, WhatDropFrameLeavesOutIsRefusedUnlessItIsForbidden) {
    Options options;
    options.timecode = Timecode{10, 1, 0, 0, false};
    EXPECT_THAT(UsageError([&] { RecorderSettingsOf(options, Rate("29.97")); }),
                HasSubstr("left out by the drop-frame rule"));
    options.dropFrame = false;
    EXPECT_EQ(RecorderSettingsOf(options, Rate("29.97")).timecode, options.timecode);
    options.dropFrame = true;
    options.timecode = Timecode{10, 1, 0, 2, false};
    EXPECT_TRUE(RecorderSettingsOf(options, Rate("29.97")).timecode->dropFrame);
}

TEST(RecorderSettingsOf, OnlyASourceThatWaitsFollowsTheDisk) {
    Options options;
    options.seconds = 2.5;
    EXPECT_TRUE(RecorderSettingsOf(options, Rate("25")).followDisk);
    EXPECT_EQ(RecorderSettingsOf(options, Rate("25")).length, 225000);
    options.source.url = "udp://:9000";
    EXPECT_FALSE(RecorderSettingsOf(options, Rate("25")).followDisk);
}

}  // namespace
}  // namespace receiver
