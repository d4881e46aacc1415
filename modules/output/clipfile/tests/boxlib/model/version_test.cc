#include "boxlib/model/version.h"

#include "boxlib/model/model.h"
#include "boxlib/support/fixture.h"

namespace {

constexpr uint64_t kFits = UINT32_MAX;
constexpr uint64_t kWide = 1ULL << 32;

// A version, or the status of a choice that was refused.
std::string outcome(MbxStatus status, uint32_t version) {
    if (status == MBX_OK) return version == 0 ? "0" : "1";
    return status == MBX_ERR_BAD_STATE ? "bad state" : status == MBX_ERR_INTERNAL ? "internal" : "other";
}

class VersionTest : public testing::Test {
 protected:
    const MbxOptions* mode(uint32_t value) {
        options.time_version_mode = value;
        return &options;
    }

    std::string time(uint32_t m, uint64_t creation, uint64_t modification, uint64_t duration) {
        uint32_t version = 9;
        const MbxStatus status = MbxChooseTimeVersion(mode(m), creation, modification, duration, &version);
        return outcome(status, version);
    }

    std::string edits(uint32_t m, std::vector<MbxEdit> list) {
        for (size_t i = 1; i < list.size(); i++) list[i - 1].next = &list[i];
        uint32_t version = 9;
        const MbxStatus status =
            MbxChooseEditVersion(mode(m), list.empty() ? nullptr : list.data(), &version);
        return outcome(status, version);
    }

    std::string index(uint32_t m, uint64_t at, uint64_t offset) {
        uint32_t version = 9;
        const MbxStatus status = MbxChooseIndexVersion(mode(m), at, offset, &version);
        return outcome(status, version);
    }

    std::string value(uint32_t m, bool needsWide) {
        uint32_t version = 9;
        const MbxStatus status = MbxChooseValueVersion(mode(m), needsWide, &version);
        return outcome(status, version);
    }

    MbxOptions options = {};
};

MbxEdit edit(uint64_t duration, int64_t mediaTime) {
    return {duration, mediaTime, 1, 0, nullptr};
}

TEST_F(VersionTest, TimeBoxesInModes0And2RefuseOnlyWhenAllThreeAreWide) {
    for (const uint32_t m : {0U, 2U}) {
        EXPECT_EQ(time(m, kFits, kFits, kFits), "0");
        EXPECT_EQ(time(m, kWide, kFits, kFits), "0");
        EXPECT_EQ(time(m, kFits, kWide, kFits), "0");
        EXPECT_EQ(time(m, kFits, kFits, kWide), "0");
        EXPECT_EQ(time(m, kWide, kWide, kFits), "0");
        EXPECT_EQ(time(m, kFits, kWide, kWide), "0");
        EXPECT_EQ(time(m, kWide, kWide, kWide), "bad state");
    }
}

TEST_F(VersionTest, TimeBoxesInMode1TakeVersion1WhenAnyIsWide) {
    EXPECT_EQ(time(1, kFits, kFits, kFits), "0");
    EXPECT_EQ(time(1, kWide, 0, 0), "1");
    EXPECT_EQ(time(1, 0, kWide, 0), "1");
    EXPECT_EQ(time(1, 0, 0, kWide), "1");
}

TEST_F(VersionTest, TimeBoxesInMode3AreAlwaysVersion1) {
    EXPECT_EQ(time(3, 0, 0, 0), "1");
}

TEST_F(VersionTest, EditsInModes0And2RefuseOnlyOnceBothConditionsWereSeen) {
    for (const uint32_t m : {0U, 2U}) {
        EXPECT_EQ(edits(m, {}), "0");
        EXPECT_EQ(edits(m, {edit(kWide, 0), edit(kWide, INT32_MIN)}), "0");
        EXPECT_EQ(edits(m, {edit(0, INT32_MAX + 1LL), edit(kFits, INT32_MIN - 1LL)}), "0");
        EXPECT_EQ(edits(m, {edit(kWide, INT32_MAX + 1LL)}), "bad state");
        EXPECT_EQ(edits(m, {edit(kWide, 0), edit(0, INT32_MIN - 1LL)}), "bad state");
        EXPECT_EQ(edits(m, {edit(0, INT64_MAX), edit(0, 0), edit(UINT64_MAX, 0)}), "bad state");
    }
}

TEST_F(VersionTest, EditsInMode1TakeVersion1WhenEitherIsSeen) {
    EXPECT_EQ(edits(1, {edit(kFits, INT32_MAX), edit(0, INT32_MIN)}), "0");
    EXPECT_EQ(edits(1, {edit(0, 0), edit(kWide, 0)}), "1");
    EXPECT_EQ(edits(1, {edit(0, INT32_MAX + 1LL)}), "1");
    EXPECT_EQ(edits(1, {edit(0, INT32_MIN - 1LL)}), "1");
}

TEST_F(VersionTest, EditsInMode3AreAlwaysVersion1) {
    EXPECT_EQ(edits(3, {}), "1");
}

TEST_F(VersionTest, UnknownModeIsABrokenInvariantForTimesAndEdits) {
    EXPECT_EQ(time(4, 0, 0, 0), "internal");
    EXPECT_EQ(edits(4, {}), "internal");
    EXPECT_EQ(time(UINT32_MAX, 0, 0, 0), "internal");
}

TEST_F(VersionTest, FragmentIndexInMode0IsVersion1) {
    EXPECT_EQ(index(0, 0, 0), "1");
}

TEST_F(VersionTest, FragmentIndexInMode1TakesVersion1WhenEitherIsWide) {
    EXPECT_EQ(index(1, kFits, kFits), "0");
    EXPECT_EQ(index(1, kWide, 0), "1");
    EXPECT_EQ(index(1, 0, kWide), "1");
}

TEST_F(VersionTest, FragmentIndexInMode2RefusesWhenEitherIsWide) {
    EXPECT_EQ(index(2, kFits, kFits), "0");
    EXPECT_EQ(index(2, kWide, 0), "bad state");
    EXPECT_EQ(index(2, 0, kWide), "bad state");
}

TEST_F(VersionTest, FragmentIndexInMode3IsVersion1) {
    EXPECT_EQ(index(3, 0, 0), "1");
}

TEST_F(VersionTest, ValuesFollowTheModes) {
    for (const uint32_t m : {0U, 2U}) {
        EXPECT_EQ(value(m, false), "0");
        EXPECT_EQ(value(m, true), "bad state");
    }
    EXPECT_EQ(value(1, false), "0");
    EXPECT_EQ(value(1, true), "1");
    EXPECT_EQ(value(3, false), "1");
}

TEST_F(VersionTest, UnknownModeIsAsMode2ForTheFragmentIndexAndValues) {
    for (const uint32_t m : {4U, UINT32_MAX}) {
        EXPECT_EQ(index(m, kFits, kFits), "0");
        EXPECT_EQ(index(m, kWide, 0), "bad state");
        EXPECT_EQ(index(m, 0, kWide), "bad state");
        EXPECT_EQ(value(m, false), "0");
        EXPECT_EQ(value(m, true), "bad state");
    }
}

TEST_F(VersionTest, ChoosersRefuseNullArguments) {
    uint32_t version = 9;
    EXPECT_EQ(MbxChooseTimeVersion(nullptr, 0, 0, 0, &version), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseTimeVersion(&options, 0, 0, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseEditVersion(nullptr, nullptr, &version), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseEditVersion(&options, nullptr, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseIndexVersion(nullptr, 0, 0, &version), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseIndexVersion(&options, 0, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseValueVersion(nullptr, false, &version), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseValueVersion(&options, false, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
