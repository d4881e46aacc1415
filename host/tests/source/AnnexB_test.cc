#include "source/AnnexB.h"

#include <gtest/gtest.h>

#include "AnnexBReader.h"

namespace receiver {
namespace {

using Bytes = std::vector<unsigned char>;

std::string Text(const Bytes& bytes) {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

// NAL units, each behind its start code. Of the parameter sets only the numbers matter: the first bit 1 is
// number 0, the bits 010 are number 1.
const Bytes kDelimiter{0, 0, 0, 1, 0x09, 0x10};
const Bytes kSequenceSet{0, 0, 0, 1, 0x67, 66, 0, 30, 0x80, 0x11};
const Bytes kOtherSequenceSet{0, 0, 0, 1, 0x67, 66, 0, 31, 0x80, 0x22};
const Bytes kPictureSet{0, 0, 0, 1, 0x68, 0x80, 0x33};
const Bytes kSecondPictureSet{0, 0, 0, 1, 0x68, 0x40, 0x44};
const Bytes kSei{0, 0, 1, 0x06, 0x05, 0x01, 0xFF, 0x80};
const Bytes kIdr{0, 0, 1, 0x65, 0x88, 0x84};
const Bytes kSlice{0, 0, 1, 0x41, 0x9A, 0x24};

Bytes operator+(Bytes a, const Bytes& b) {
    a.insert(a.end(), b.begin(), b.end());
    return a;
}

std::optional<std::string> Completed(const Bytes& known, const Bytes& unit) {
    ParameterSets sets;
    sets.Learn(NalUnits(known));
    return sets.Complete(unit, NalUnits(unit));
}

TEST(NalUnits, AreFoundBehindStartCodesOfThreeAndFourBytes) {
    const Bytes stream = kDelimiter + kSei + kIdr;
    const auto units = NalUnits(stream);
    ASSERT_EQ(units.size(), 3u);
    EXPECT_EQ(units[0].type, 9u);
    EXPECT_EQ(units[0].begin, 0u);
    EXPECT_EQ(units[0].end, 6u);
    EXPECT_EQ(Bytes(units[0].bytes.begin(), units[0].bytes.end()), (Bytes{0x09, 0x10}));
    EXPECT_EQ(units[1].type, 6u);
    EXPECT_EQ(units[1].begin, 6u);
    EXPECT_EQ(units[2].type, 5u);
    EXPECT_EQ(units[2].end, stream.size());
}

TEST(NalUnits, ZeroBytesBehindAUnitDoNotBelongToIt) {
    const Bytes stream = kPictureSet + Bytes{0, 0, 0} + kIdr;
    const auto units = NalUnits(stream);
    ASSERT_EQ(units.size(), 2u);
    EXPECT_EQ(Bytes(units[0].bytes.begin(), units[0].bytes.end()), (Bytes{0x68, 0x80, 0x33}));
    EXPECT_EQ(units[0].end, kPictureSet.size());
}

TEST(LeadingNalUnits, EndAtTheFirstSliceToWhichTheRestIsCounted) {
    for (const Bytes& slice : {kSlice, kIdr}) {
        const Bytes stream = kDelimiter + kSequenceSet + kSei + slice + kPictureSet + kSlice;
        const auto units = LeadingNalUnits(stream);
        const auto all = NalUnits(stream);
        ASSERT_EQ(units.size(), 4u);
        for (std::size_t i = 0; i < 3; ++i) {
            EXPECT_EQ(units[i].type, all[i].type);
            EXPECT_EQ(units[i].begin, all[i].begin);
            EXPECT_EQ(units[i].end, all[i].end);
            EXPECT_EQ(units[i].bytes.data(), all[i].bytes.data());
            EXPECT_EQ(units[i].bytes.size(), all[i].bytes.size());
        }
        EXPECT_EQ(units[3].type, all[3].type);
        EXPECT_EQ(units[3].begin, all[3].begin);
        EXPECT_EQ(units[3].end, stream.size());
        EXPECT_EQ(units[3].bytes.size(), slice.size() - 3 + kPictureSet.size() + kSlice.size());
    }
}

TEST(LeadingNalUnits, AreAllOfThemWithoutASlice) {
    const Bytes stream = kDelimiter + kSequenceSet + kPictureSet;
    EXPECT_EQ(LeadingNalUnits(stream).size(), 3u);
    EXPECT_TRUE(LeadingNalUnits(Bytes{}).empty());
    EXPECT_TRUE(LeadingNalUnits(Bytes{0, 0, 0, 5, 0x65}).empty());
}

TEST(NalUnits, NothingIsFoundInBytesWithoutStartCode) {
    EXPECT_TRUE(NalUnits(Bytes{}).empty());
    EXPECT_TRUE(NalUnits(Bytes{0, 0, 1}).empty());
    EXPECT_TRUE(NalUnits(Bytes{1, 2, 3, 4}).empty());
}

TEST(NalUnits, AStartCodeWithNothingBehindItEndsTheUnitBeforeIt) {
    const Bytes stream = kPictureSet + Bytes{0, 0, 1};
    const auto units = NalUnits(stream);
    ASSERT_EQ(units.size(), 1u);
    EXPECT_EQ(Bytes(units[0].bytes.begin(), units[0].bytes.end()), (Bytes{0x68, 0x80, 0x33}));
}

TEST(NalUnits, EmptyUnitsAreNone) {
    const Bytes stream = Bytes{0, 0, 1, 0, 0, 0, 1} + kIdr;
    const auto units = NalUnits(stream);
    ASSERT_EQ(units.size(), 1u);
    EXPECT_EQ(units[0].type, 5u);
}

/// The definition (ITU-T H.264 B.1.1) word for word: what stands between 00 00 01 and the next one or the
/// end, without zero bytes behind it.
std::vector<Bytes> Defined(const Bytes& stream) {
    std::vector<Bytes> units;
    std::optional<Bytes> unit;
    const auto finish = [&] {
        while (unit && !unit->empty() && unit->back() == 0) {
            unit->pop_back();
        }
        if (unit && !unit->empty()) {
            units.push_back(*unit);
        }
    };
    for (std::size_t at = 0; at < stream.size(); ++at) {
        if (at + 2 < stream.size() && stream[at] == 0 && stream[at + 1] == 0 && stream[at + 2] == 1) {
            finish();
            unit = Bytes();
            at += 2;
        } else if (unit) {
            unit->push_back(stream[at]);
        }
    }
    finish();
    return units;
}

TEST(NalUnits, OfEveryShortStreamAreThoseOfTheDefinitionAndOfTheAnalyser) {
    constexpr unsigned int kLength = 9;
    constexpr unsigned char kAlphabet[] = {0x00, 0x01, 0x65, 0x67};
    for (unsigned int number = 0; number < 1U << 2 * kLength; ++number) {
        Bytes stream;
        for (unsigned int at = 0; at < kLength; ++at) {
            stream.push_back(kAlphabet[number >> 2 * at & 3U]);
        }
        std::vector<Bytes> own;
        for (const NalUnit& unit : NalUnits(stream)) {
            own.emplace_back(unit.bytes.begin(), unit.bytes.end());
        }
        std::vector<Bytes> analysed;
        nal_access::AnnexBReader reader(stream);
        for (nal_access::Bytes unit; reader.Next(unit);) {
            analysed.emplace_back(unit.begin(), unit.end());
        }
        const std::vector<Bytes> defined = Defined(stream);
        ASSERT_EQ(own, defined) << testing::PrintToString(stream);
        ASSERT_EQ(analysed, defined) << testing::PrintToString(stream);
    }
}

TEST(ParameterSets, AnIdrFrameThatHasBothStaysAsItIs) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kDelimiter + kSequenceSet + kPictureSet + kIdr),
              std::nullopt);
}

TEST(ParameterSets, OtherFramesStayAsTheyAre) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kDelimiter + kSlice), std::nullopt);
}

TEST(ParameterSets, BothGoBehindTheDelimiterAndBeforeEverythingElse) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kDelimiter + kSei + kIdr),
              Text(kDelimiter + kSequenceSet + kPictureSet + kSei + kIdr));
}

TEST(ParameterSets, WithoutADelimiterBothComeFirst) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kSei + kIdr),
              Text(kSequenceSet + kPictureSet + kSei + kIdr));
}

TEST(ParameterSets, OnlyTheMissingKindIsAdded) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kSequenceSet + kIdr),
              Text(kSequenceSet + kPictureSet + kIdr));
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet, kDelimiter + kPictureSet + kIdr),
              Text(kDelimiter + kSequenceSet + kPictureSet + kIdr));
}

TEST(ParameterSets, EveryPictureParameterSetIsAdded) {
    EXPECT_EQ(Completed(kSequenceSet + kSecondPictureSet + kPictureSet, kIdr),
              Text(kSequenceSet + kPictureSet + kSecondPictureSet + kIdr));
}

TEST(ParameterSets, TheLastOneOfANumberCounts) {
    EXPECT_EQ(Completed(kSequenceSet + kPictureSet + kOtherSequenceSet, kIdr),
              Text(kOtherSequenceSet + kPictureSet + kIdr));
}

TEST(ParameterSets, NothingIsAddedWhereNothingIsKnown) {
    EXPECT_EQ(Completed({}, kIdr), std::nullopt);
}

}  // namespace
}  // namespace receiver
