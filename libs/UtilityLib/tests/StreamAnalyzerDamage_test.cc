#include <gtest/gtest.h>

#include <cstdint>

#include "LogCapture.h"
#include "StreamAnalyzer.h"
#include "test_units.h"

/// Payloads come from a network: whatever is in them, the analyser stays inside them and its results stay
/// bounded. The units lie in heap blocks of their exact size, so the address sanitizer sees a read outside.
namespace nal_access {
namespace {

using namespace testing;

using Units = std::vector<std::shared_ptr<StreamData>>;
using Samples = std::vector<std::shared_ptr<SampleData>>;

/// Calls `check` with every prefix of `valid` and with every value of each of its bytes.
template <typename Check>
void ForAllDamage(const ByteVector& valid, Check check) {
    for (std::size_t length = 0; length <= valid.size(); ++length) {
        check(MakeUnit(ByteVector(valid.begin(), valid.begin() + static_cast<std::ptrdiff_t>(length))));
    }
    ByteVector damaged = valid;
    for (std::size_t i = 0; i < valid.size(); ++i) {
        for (int value = 0; value < 256; ++value) {
            damaged[i] = static_cast<unsigned char>(value);
            check(MakeUnit(damaged));
        }
        damaged[i] = valid[i];
    }
}

const ByteVector kVideo = Join({kStart4,
                                kDelimiter,
                                kStart4,
                                kSps0,
                                kStart3,
                                {0x67, 0x42, 0x00, 0x00, 0x03, 0x40},
                                kStart4,
                                kPps0,
                                kStart3,
                                {0x68, 0x00, 0x80, 0x60},
                                {0, 0},
                                kStart4,
                                kIdrPps0,
                                kStart3,
                                kIdrSecondSlice,
                                kStart4,
                                {0x0C, 0xFF, 0x80},
                                kStart3,
                                {0x0A}});
const ByteVector kMetadata = Join(
    {kForeignPacket, LocalSet(Join({kOwnIdentifier, kFlagOn, TimecodeItem(23, 59, 59, 29, 1)})), kBlock});

TEST(DamagedVideo, GivesBoundedSamples) {
    const LogCapture quiet;
    StreamAnalyzer fresh;
    ForAllDamage(kVideo, [&](const std::shared_ptr<StreamData>& unit) {
        Units units = {unit, unit};
        Samples samples;
        fresh.ConvertVideo(units, samples);
        ASSERT_EQ(samples.size(), 2U);
        for (const auto& sample : samples) {
            // Each NAL unit takes at least a start code of three bytes and gives a length of four.
            ASSERT_LE(sample->GetDataSize(), unit->size + unit->size / 4);
            // The lengths lead from one NAL unit to the next and to the end.
            const ByteVector bytes = BytesOf(*sample);
            std::size_t at = 0;
            while (at < bytes.size()) {
                ASSERT_LE(at + 4, bytes.size());
                const std::size_t length = static_cast<std::size_t>(bytes[at]) << 24 |
                                           static_cast<std::size_t>(bytes[at + 1]) << 16 |
                                           static_cast<std::size_t>(bytes[at + 2]) << 8 | bytes[at + 3];
                ASSERT_GT(length, 0U);
                at += 4 + length;
            }
            ASSERT_EQ(at, bytes.size());
        }
    });
}

TEST(DamagedVideo, GivesParameterSetsOfTheUnitAlone) {
    StreamAnalyzer analyzer;
    ForAllDamage(kVideo, [&](const std::shared_ptr<StreamData>& unit) {
        NalUnit sps;
        NalUnit pps;
        const bool start = analyzer.IsAccessUnitStart(unit, sps, pps);
        ASSERT_LE(sps.size + pps.size, unit->size);
        ASSERT_TRUE(start || sps.size + pps.size == 0);
        if (sps.size > 0) {
            ASSERT_EQ(sps.data.get()[0] & 0x1F, 7);
        }
        if (pps.size > 0) {
            ASSERT_EQ(pps.data.get()[0] & 0x1F, 8);
        }
    });
}

TEST(DamagedAudio, GivesAnEndOfTheUnit) {
    for (const ByteVector& frame :
         {ByteVector{0xFF, 0xF1, 0x4C, 0x80, 0x01, 0x5F, 0xFC, 0x21, 0x1A, 0x2B},
          ByteVector{0xFF, 0xF0, 0x4C, 0x80, 0x01, 0x9F, 0xFC, 0xC1, 0xC2, 0x21, 0x1A, 0x2B},
          ByteVector{0x21, 0x1A, 0x2B, 0x3C}}) {
        ForAllDamage(frame, [](const std::shared_ptr<StreamData>& unit) {
            Units units = {unit};
            Samples samples;
            StreamAnalyzer().ConvertAudio(units, samples);
            ASSERT_EQ(samples.size(), 1U);
            const std::uint64_t removed = unit->size - samples[0]->GetDataSize();
            ASSERT_TRUE(removed == 0 || removed == 7 || removed == 9);
            ASSERT_TRUE(
                std::equal(unit->payload + removed, unit->payload + unit->size, samples[0]->GetData()));
        });
    }
}

TEST(DamagedMetadata, KeepsThePayloadAndAddsAtMostTheBlock) {
    ByteVector block = kBlock;
    ForAllDamage(kMetadata, [&](const std::shared_ptr<StreamData>& unit) {
        Units units = {unit};
        Samples samples;
        StreamAnalyzer().ConvertMeta(units, samples, block);
        ASSERT_EQ(samples.size(), 1U);
        const std::uint64_t added = samples[0]->GetDataSize() - unit->size;
        ASSERT_TRUE(added == 0 || added == kBlock.size());
        ASSERT_TRUE(std::equal(unit->payload, unit->payload + unit->size, samples[0]->GetData()));
    });
}

TEST(DamagedMetadata, TakesADamagedBlock) {
    ForAllDamage(kBlock, [](const std::shared_ptr<StreamData>& damaged) {
        Units units = {MakeUnit(kMetadata)};
        Samples samples;
        ByteVector block(damaged->payload, damaged->payload + damaged->size);
        StreamAnalyzer().ConvertMeta(units, samples, block);
        ASSERT_EQ(samples.size(), 1U);
        ASSERT_LE(samples[0]->GetDataSize(), kMetadata.size() + block.size());
    });
}

TEST(DamagedMetadata, GivesATimecodeInRangeOrNone) {
    StreamAnalyzer analyzer;
    ForAllDamage(kMetadata, [&](const std::shared_ptr<StreamData>& unit) {
        for (const unsigned int rate : {0U, 30U}) {
            std::shared_ptr<SampleData> sample;
            bool dropFrame = false;
            analyzer.ConvertTmcd(unit, sample, dropFrame, rate, 1);
            if (sample) {
                ASSERT_EQ(sample->GetDataSize(), 4U);
                ASSERT_LE(sample->GetData()[0], 23);
                ASSERT_LE(sample->GetData()[1], 59);
                ASSERT_LE(sample->GetData()[2], 59);
                ASSERT_TRUE(rate == 0 || sample->GetData()[3] < rate);
            }
        }
    });
}

TEST(DamagedMetadata, LosesTheRecordFlagOnlyWithItsOwnPackets) {
    StreamAnalyzer analyzer;
    // Damage behind the set that carries the flag changes nothing.
    const std::size_t end = kMetadata.size() - kBlock.size();
    for (std::size_t i = end; i < kMetadata.size(); ++i) {
        ByteVector damaged = kMetadata;
        for (int value = 0; value < 256; ++value) {
            damaged[i] = static_cast<unsigned char>(value);
            const auto unit = MakeUnit(damaged);
            ASSERT_TRUE(analyzer.GetRecFlg(unit->payload, unit->size));
        }
    }
    std::size_t on = 0;
    ForAllDamage(kMetadata, [&](const std::shared_ptr<StreamData>& unit) {
        on += analyzer.GetRecFlg(unit->payload, unit->size) ? 1U : 0U;
    });
    EXPECT_GT(on, 0U);
}

}  // namespace
}  // namespace nal_access
