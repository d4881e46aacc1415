#include "boxlib/core/stream.h"

#include "boxlib/support/fixture.h"

namespace {

constexpr uint32_t kType = MbxCode("abcd");

class StreamTest : public BoxTest {
 protected:
    uint64_t written = 7;
    uint64_t accumulated = 100;
};

TEST_F(StreamTest, SeekWithoutAFileDoesNothing) {
    EXPECT_EQ(MbxSeek(context, nullptr, 5), MBX_OK);
    EXPECT_EQ(MbxSeek(nullptr, nullptr, 5), MBX_OK);
}

TEST_F(StreamTest, SeekMovesToTheAbsolutePosition) {
    EXPECT_EQ(MbxSeek(context, &file, 1ULL << 40), MBX_OK);
    EXPECT_EQ(file.position, 1ULL << 40);
}

TEST_F(StreamTest, AnyFailureOfSeekIsAnIoError) {
    for (const MbxStatus failure : {MBX_ERR_INVALID_ARG, MBX_ERR_IO, static_cast<MbxStatus>(99)}) {
        file.failure = failure;
        file.failSeek = file.seeks + 1;
        EXPECT_EQ(MbxSeek(context, &file, 5), MBX_ERR_IO);
    }
}

TEST_F(StreamTest, SeekRefusesAPositionBeyondSignedRange) {
    EXPECT_EQ(MbxSeek(context, &file, 1ULL << 63), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(file.seeks, 0U);
}

TEST_F(StreamTest, WriteBytesCountsWithAndWithoutAFile) {
    EXPECT_EQ(MbxWriteBytes(context, &file, "abc", 3, &written, &accumulated), MBX_OK);
    EXPECT_EQ(written, 3U);
    EXPECT_EQ(accumulated, 103U);
    EXPECT_BYTES(file.bytes, Hex("'abc'"));
    EXPECT_EQ(MbxWriteBytes(context, nullptr, "abcd", 4, &written, &accumulated), MBX_OK);
    EXPECT_EQ(written, 4U);
    EXPECT_EQ(accumulated, 107U);
    EXPECT_EQ(file.writes, 1U);
    EXPECT_EQ(MbxWriteBytes(context, &file, "e", 1, nullptr, nullptr), MBX_OK);
}

TEST_F(StreamTest, WriteOfNothingDoesNotCallTheHost) {
    EXPECT_EQ(MbxWriteBytes(context, &file, nullptr, 0, &written, &accumulated), MBX_OK);
    EXPECT_EQ(written, 0U);
    EXPECT_EQ(accumulated, 100U);
    EXPECT_EQ(file.writes, 0U);
}

TEST_F(StreamTest, FailedWriteIsAnIoErrorAndLeavesTheCounts) {
    for (const MbxStatus failure : {MBX_ERR_INVALID_ARG, MBX_ERR_IO, static_cast<MbxStatus>(99)}) {
        file.failure = failure;
        file.failWrite = file.writes + 1;
        EXPECT_EQ(MbxWriteBytes(context, &file, "abc", 3, &written, &accumulated), MBX_ERR_IO);
    }
    EXPECT_EQ(written, 7U);
    EXPECT_EQ(accumulated, 100U);
}

TEST_F(StreamTest, ShortWriteThatReportsSuccessIsAnIoError) {
    file.shortWrite = 1;
    EXPECT_EQ(MbxWriteBytes(context, &file, "abc", 3, &written, &accumulated), MBX_ERR_IO);
    EXPECT_EQ(written, 7U);
    EXPECT_EQ(accumulated, 100U);
}

TEST_F(StreamTest, WriteRefusesNullData) {
    EXPECT_EQ(MbxWriteBytes(context, &file, nullptr, 3, &written, &accumulated), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteBytes(nullptr, &file, "abc", 3, &written, &accumulated), MBX_ERR_INVALID_ARG);
}

TEST_F(StreamTest, OverrunOfTheComposingBufferIsABrokenInvariant) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutZeros(&bytes, 200);
    EXPECT_EQ(MbxWriteComposed(context, &file, &bytes, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(file.writes, 0U);
}

TEST_F(StreamTest, FixedPayloadSeeksWritesAndReports) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut16(&bytes, 0x0102);
    EXPECT_EQ(MbxWriteFixedPayload(context, &file, 2, &bytes, &written, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000 0102"));
    EXPECT_EQ(written, 2U);
    EXPECT_EQ(accumulated, 102U);
}

struct HeaderCase {
    uint32_t mode;
    uint64_t size;
    MbxStatus status;
    const char* bytes;
};

TEST_F(StreamTest, BoxHeaderTakesTheFormOfTheMode) {
    const HeaderCase kCases[] = {
        {0, 8, MBX_OK, "00000008 'abcd'"},
        {0, 0xFFFFFFFF, MBX_OK, "FFFFFFFF 'abcd'"},
        {0, 0x100000000, MBX_ERR_BAD_STATE, ""},
        {1, 8, MBX_OK, "00000008 'abcd'"},
        {1, 0xFFFFFFFF, MBX_OK, "FFFFFFFF 'abcd'"},
        {1, 0x100000000, MBX_OK, "00000001 'abcd' 0000000100000000"},
        {2, 16, MBX_OK, "00000001 'abcd' 0000000000000010"},
        {2, UINT64_MAX, MBX_OK, "00000001 'abcd' FFFFFFFFFFFFFFFF"},
        {3, 8, MBX_ERR_INVALID_ARG, ""},
        {UINT32_MAX, 8, MBX_ERR_INVALID_ARG, ""},
    };
    for (const HeaderCase& c : kCases) {
        SCOPED_TRACE(testing::Message() << "mode " << c.mode << ", size " << c.size);
        options.box_size_mode = c.mode;
        MemoryFile target;
        written = 7;
        accumulated = 100;
        EXPECT_EQ(MbxWriteBoxHeader(context, &options, &target, 0, c.size, kType, &written, &accumulated),
                  c.status);
        EXPECT_BYTES(target.bytes, Hex(c.bytes));
        EXPECT_EQ(written, c.status == MBX_OK ? target.bytes.size() : 7U);
        EXPECT_EQ(accumulated, 100 + target.bytes.size());

        uint64_t measured = 7;
        EXPECT_EQ(MbxWriteBoxHeader(context, &options, nullptr, 0, c.size, kType, &measured, nullptr),
                  c.status);
        EXPECT_EQ(measured, written);
    }
}

TEST_F(StreamTest, BoxHeaderCostsOneSeekAndOneWrite) {
    EXPECT_EQ(MbxWriteBoxHeader(context, &options, &file, 3, 8, kType, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(file.seeks, 1U);
    EXPECT_EQ(file.writes, 1U);
    EXPECT_BYTES(file.bytes, Hex("000000 00000008 'abcd'"));
}

TEST_F(StreamTest, BoxHeaderRefusesNullArguments) {
    EXPECT_EQ(MbxWriteBoxHeader(nullptr, &options, &file, 0, 8, kType, nullptr, nullptr),
              MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteBoxHeader(context, nullptr, &file, 0, 8, kType, nullptr, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(file.seeks, 0U);
}

TEST_F(StreamTest, TotalSizeAddsTheHeaderThatTheModeGives) {
    const struct {
        uint32_t mode;
        uint64_t payload;
        MbxStatus status;
        uint64_t total;
    } kCases[] = {
        {0, 0, MBX_OK, 8},
        {0, 0xFFFFFFF7, MBX_OK, 0xFFFFFFFF},
        {0, 0xFFFFFFF8, MBX_ERR_BAD_STATE, 7},
        {1, 0xFFFFFFF7, MBX_OK, 0xFFFFFFFF},
        {1, 0xFFFFFFF8, MBX_OK, 0x100000008},
        {2, 0, MBX_OK, 16},
        {2, UINT64_MAX - 16, MBX_OK, UINT64_MAX},
        {2, UINT64_MAX - 15, MBX_ERR_OVERFLOW, 7},
        {3, 0, MBX_ERR_INVALID_ARG, 7},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << "mode " << c.mode << ", payload " << c.payload);
        options.box_size_mode = c.mode;
        uint64_t total = 7;
        EXPECT_EQ(MbxBoxTotalSize(context, &options, c.payload, &total), c.status);
        EXPECT_EQ(total, c.total);
    }
    EXPECT_EQ(MbxBoxTotalSize(context, &options, 0, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(StreamTest, BoxOfExactlyAllOnesHasASmallHeaderAndOneByteMoreIsRefused) {
    options.box_size_mode = 0;
    EXPECT_EQ(MbxWriteBoxHeader(context, &options, &file, 0, 0xFFFFFFFF, kType, &written, nullptr), MBX_OK);
    EXPECT_EQ(written, 8U);
    EXPECT_EQ(MbxWriteBoxHeader(context, &options, &file, 0, 0x100000000, kType, &written, nullptr),
              MBX_ERR_BAD_STATE);
}

TEST_F(StreamTest, StandaloneHeaderNumbersItsFormsDifferently) {
    const struct {
        uint32_t form;
        uint64_t payload;
        MbxStatus status;
        const char* bytes;
    } kCases[] = {
        {0, 0, MBX_OK, "00000008 'abcd'"},
        {0, 0xFFFFFFF8, MBX_ERR_BAD_STATE, ""},
        {1, 0, MBX_OK, "00000001 'abcd' 0000000000000010"},
        {2, 0, MBX_OK, "00000008 'abcd'"},
        {2, 0xFFFFFFF8, MBX_OK, "00000001 'abcd' 0000000100000008"},
        {1, 0xFFFFFFFFFFFFFFEF, MBX_OK, "00000001 'abcd' FFFFFFFFFFFFFFFF"},
        {1, 0xFFFFFFFFFFFFFFF0, MBX_ERR_INVALID_ARG, ""},
        {3, 0, MBX_ERR_INTERNAL, ""},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << "form " << c.form << ", payload " << c.payload);
        MemoryFile target;
        EXPECT_EQ(MbxWriteStandaloneHeader(context, c.form, &target, 0, c.payload, kType, nullptr, nullptr),
                  c.status);
        EXPECT_BYTES(target.bytes, Hex(c.bytes));
    }
}

TEST_F(StreamTest, ShortHeaderHasSixBytes) {
    EXPECT_EQ(MbxWriteShortHeader(context, &file, 1, 65535, 10, &written, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00 FFFF 0000000A"));
    EXPECT_EQ(written, 6U);
    EXPECT_EQ(accumulated, 106U);
    EXPECT_EQ(MbxWriteShortHeader(context, &file, 1, 65536, 10, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxWriteShortHeader(nullptr, &file, 1, 6, 10, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(StreamTest, ShortTotalSizeAddsSix) {
    uint64_t total = 7;
    EXPECT_EQ(MbxShortTotalSize(context, 65529, &total), MBX_OK);
    EXPECT_EQ(total, 65535U);
    total = 7;
    EXPECT_EQ(MbxShortTotalSize(context, 65530, &total), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxShortTotalSize(context, UINT64_MAX, &total), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxShortTotalSize(context, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(total, 7U);
}

TEST_F(StreamTest, DescriptorSizeTakesAsFewGroupsAsItNeeds) {
    const struct {
        uint64_t payload;
        const char* bytes;
    } kCases[] = {
        {0, "03 00"},
        {1, "03 01"},
        {127, "03 7F"},
        {128, "03 8100"},
        {0x3FFF, "03 FF7F"},
        {0x4000, "03 818000"},
        {0x1FFFFF, "03 FFFF7F"},
        {0x200000, "03 81808000"},
        {0xFFFFFFF, "03 FFFFFF7F"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.payload);
        MemoryFile target;
        uint64_t total = 0;
        accumulated = 100;
        EXPECT_EQ(MbxWriteDescriptorHeader(context, &target, 0, c.payload, 3, &total, &accumulated), MBX_OK);
        EXPECT_BYTES(target.bytes, Hex(c.bytes));
        EXPECT_EQ(accumulated, 100 + target.bytes.size());
        EXPECT_EQ(total, target.bytes.size() + c.payload);
    }
}

TEST_F(StreamTest, DescriptorPayloadOf127HasAOneByteSizeAnd128HasTwo) {
    EXPECT_EQ(MbxWriteDescriptorHeader(context, &file, 0, 127, 5, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(MbxWriteDescriptorHeader(context, &file, 2, 128, 5, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("05 7F  05 8100"));
}

TEST_F(StreamTest, DescriptorSizeBeyondFourGroupsOverflows) {
    uint64_t total = 7;
    EXPECT_EQ(MbxWriteDescriptorHeader(context, &file, 0, 1 << 28, 3, &total, &accumulated),
              MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxWriteDescriptorHeader(context, &file, 0, UINT64_MAX, 3, &total, &accumulated),
              MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxWriteDescriptorHeader(nullptr, &file, 0, 1, 3, &total, &accumulated), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(total, 7U);
    EXPECT_EQ(accumulated, 100U);
    EXPECT_TRUE(file.bytes.empty());
}

TEST_F(StreamTest, UuidIsFourBigEndianWords) {
    const uint32_t words[4] = {0x00010203, 0x04050607, 0x08090A0B, 0x0C0D0E0F};
    EXPECT_EQ(MbxWriteUuid(context, &file, 0, words, &written, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00010203 04050607 08090A0B 0C0D0E0F"));
    EXPECT_EQ(written, 16U);
    EXPECT_EQ(accumulated, 116U);
    EXPECT_EQ(MbxWriteUuid(context, &file, 0, nullptr, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(StreamTest, ZerosOfExactlyOneChunkAreOneWrite) {
    EXPECT_EQ(MbxWriteZeros(context, &file, 0, 524288, &written, &accumulated), MBX_OK);
    EXPECT_EQ(file.writeSizes, std::vector<uint64_t>({524288}));
    EXPECT_EQ(written, 524288U);
    EXPECT_EQ(accumulated, 100 + 524288U);
}

TEST_F(StreamTest, ZerosCountTheLastWriteOnly) {
    EXPECT_EQ(MbxWriteZeros(context, &file, 10, 2 * 524288 + 5, &written, &accumulated), MBX_OK);
    EXPECT_EQ(file.writeSizes, std::vector<uint64_t>({524288, 524288, 5}));
    EXPECT_EQ(file.seeks, 3U);
    EXPECT_EQ(file.bytes.size(), 10 + 2 * 524288 + 5U);
    EXPECT_EQ(written, 5U);
    EXPECT_EQ(accumulated, 105U);
}

TEST_F(StreamTest, ZerosMeasureAllThatWasAsked) {
    EXPECT_EQ(MbxWriteZeros(context, nullptr, 0, 2 * 524288 + 5, &written, &accumulated), MBX_OK);
    EXPECT_EQ(written, 2 * 524288 + 5U);
    EXPECT_EQ(accumulated, 100 + 2 * 524288 + 5U);
}

TEST_F(StreamTest, NoZerosAreNoWrite) {
    EXPECT_EQ(MbxWriteZeros(context, &file, 0, 0, &written, nullptr), MBX_OK);
    EXPECT_EQ(written, 0U);
    EXPECT_EQ(file.writes, 0U);
}

TEST_F(StreamTest, ZerosReportEveryFailure) {
    const auto attempt = [this](MemoryFile* target) {
        written = 7;
        return MbxWriteZeros(context, target, 0, 2 * 524288 + 5, &written, nullptr);
    };
    for (uint64_t n = 1; n <= 3; n++) {
        MemoryFile failing;
        failing.failWrite = n;
        EXPECT_EQ(attempt(&failing), MBX_ERR_IO);
        MemoryFile shortened;
        shortened.shortWrite = n;
        EXPECT_EQ(attempt(&shortened), MBX_ERR_IO);
        MemoryFile lost;
        lost.failSeek = n;
        EXPECT_EQ(attempt(&lost), MBX_ERR_IO);
        EXPECT_EQ(written, 7U);
    }
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(attempt(&file), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(MbxWriteZeros(nullptr, &file, 0, 5, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
