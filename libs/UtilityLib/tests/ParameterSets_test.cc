#include "ParameterSets.h"

#include <gtest/gtest.h>

#include "test_units.h"

namespace nal_access {
namespace {

using namespace testing;

std::vector<Bytes> Nals(std::initializer_list<const ByteVector*> nals) {
    std::vector<Bytes> result;
    for (const auto* nal : nals) {
        result.emplace_back(*nal);
    }
    return result;
}

TEST(FindIdrParameterSets, FollowsTheIdentifiersOfTheSlice) {
    ActiveParameterSets sets;
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kSps0, &kSps1, &kPps0, &kPps1Sps1, &kIdrPps1}), sets));
    EXPECT_EQ(sets.sequence.data(), kSps1.data());
    EXPECT_EQ(sets.picture.data(), kPps1Sps1.data());
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kSps0, &kSps1, &kPps0, &kPps1Sps1, &kIdrPps0}), sets));
    EXPECT_EQ(sets.sequence.data(), kSps0.data());
    EXPECT_EQ(sets.picture.data(), kPps0.data());
}

TEST(FindIdrParameterSets, TakesTheLastSetWithTheIdentifierBeforeTheSlice) {
    ActiveParameterSets sets;
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kSps0, &kSps0Other, &kPps0, &kIdrPps0, &kSps0}), sets));
    EXPECT_EQ(sets.sequence.data(), kSps0Other.data());
}

TEST(FindIdrParameterSets, LeavesASetEmptyThatTheSliceDoesNotReferTo) {
    ActiveParameterSets sets;
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kSps1, &kPps0, &kIdrPps0}), sets));
    EXPECT_TRUE(sets.sequence.empty());
    EXPECT_EQ(sets.picture.data(), kPps0.data());
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kPps1Sps0, &kIdrPps0}), sets));
    EXPECT_TRUE(sets.sequence.empty());
    EXPECT_TRUE(sets.picture.empty());
}

TEST(FindIdrParameterSets, GivesTheSequenceParameterSetAlsoWithoutThePictureParameterSet) {
    ActiveParameterSets sets;
    ASSERT_TRUE(FindIdrParameterSets(Nals({&kSps0, &kIdrPps0}), sets));
    EXPECT_EQ(sets.sequence.data(), kSps0.data());
    EXPECT_TRUE(sets.picture.empty());
}

TEST(FindIdrParameterSets, WantsAnIdrSliceThatStartsThePicture) {
    ActiveParameterSets sets;
    EXPECT_FALSE(FindIdrParameterSets(Nals({&kSps0, &kPps0, &kSlice}), sets));
    EXPECT_FALSE(FindIdrParameterSets(Nals({&kSps0, &kPps0, &kIdrSecondSlice}), sets));
    EXPECT_FALSE(FindIdrParameterSets({}, sets));
    EXPECT_TRUE(sets.sequence.empty());
    EXPECT_TRUE(sets.picture.empty());
}

TEST(ParameterSetFilter, FindsTheSetsOfTheFirstIdrPictureRedundant) {
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    EXPECT_TRUE(filter.IsRedundant(kSps0));
    EXPECT_TRUE(filter.IsRedundant(kPps0));
    EXPECT_FALSE(filter.IsRedundant(kIdrPps0));
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    EXPECT_TRUE(filter.IsRedundant(kSps0));
}

TEST(ParameterSetFilter, KeepsEverySetBeforeTheFirstIdrPicture) {
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kSlice}));
    EXPECT_FALSE(filter.IsRedundant(kSps0));
    EXPECT_FALSE(filter.IsRedundant(kPps0));
}

TEST(ParameterSetFilter, KeepsSetsThatTheFirstIdrPictureDoesNotUse) {
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kPps1Sps0, &kIdrPps1}));
    EXPECT_TRUE(filter.IsRedundant(kSps0));
    EXPECT_TRUE(filter.IsRedundant(kPps1Sps0));
    EXPECT_FALSE(filter.IsRedundant(kPps0));
}

TEST(ParameterSetFilter, KeepsEverySetOnceAnIdentifierWasTakenOver) {
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    filter.Observe(Nals({&kSps0Other, &kPps0, &kIdrPps0}));
    EXPECT_FALSE(filter.IsRedundant(kSps0Other));
    EXPECT_FALSE(filter.IsRedundant(kPps0));  // belongs to the new sequence parameter set now
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    EXPECT_FALSE(filter.IsRedundant(kSps0));  // takes its identifier back
}

TEST(ParameterSetFilter, TakesAnotherPictureParameterSetOfTheSameIdentifierForAReplacement) {
    const ByteVector other = {0x68, 0xCE, 0x3C, 0x81};
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    filter.Observe(Nals({&other, &kSlice}));
    EXPECT_FALSE(filter.IsRedundant(kPps0));
}

TEST(ParameterSetFilter, GoesOnDroppingWhenASetWithAnotherIdentifierAppears) {
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    filter.Observe(Nals({&kPps1Sps0, &kSps1, &kSlice}));
    EXPECT_TRUE(filter.IsRedundant(kSps0));
    EXPECT_TRUE(filter.IsRedundant(kPps0));
    EXPECT_FALSE(filter.IsRedundant(kPps1Sps0));
    EXPECT_FALSE(filter.IsRedundant(kSps1));
}

TEST(ParameterSetFilter, TakesAnUnreadableSetForAReplacement) {
    const ByteVector unreadable = {0x67, 0x42};
    ParameterSetFilter filter;
    filter.Observe(Nals({&kSps0, &kPps0, &kIdrPps0}));
    filter.Observe(Nals({&unreadable, &kSlice}));
    EXPECT_FALSE(filter.IsRedundant(kSps0));
}

}  // namespace
}  // namespace nal_access
