#include "boxlib/core/bytes.h"

#include "boxlib/support/fixture.h"

namespace {

class BytesTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        std::memset(&bytes, 0xEE, sizeof(bytes));
        MbxBeginBytes(context, &bytes);
    }

    Bytes composed() const { return {bytes.data, bytes.data + bytes.length}; }

    MbxBytes bytes;
};

TEST_F(BytesTest, FourCharacterCodesReadFromTheLeft) {
    EXPECT_EQ(MbxCode("moov"), 0x6D6F6F76U);
    EXPECT_EQ(MbxCode("url "), 0x75726C20U);
}

TEST_F(BytesTest, EveryWidthIsBigEndian) {
    MbxPut8(&bytes, 0x12);
    MbxPut16(&bytes, 0x1234);
    MbxPut24(&bytes, 0x123456);
    MbxPut32(&bytes, 0x12345678);
    MbxPut48(&bytes, 0x123456789ABC);
    MbxPut64(&bytes, 0x123456789ABCDEF0);
    EXPECT_BYTES(composed(), Hex("12 1234 123456 12345678 123456789ABC 123456789ABCDEF0"));
}

TEST_F(BytesTest, HigherBitsAreCut) {
    MbxPut8(&bytes, 0xABCDEF01);
    MbxPut16(&bytes, 0xABCDEF01);
    MbxPut24(&bytes, 0xABCDEF01);
    MbxPut48(&bytes, 0xFFFF000000000001);
    EXPECT_BYTES(composed(), Hex("01 EF01 CDEF01 000000000001"));
}

TEST_F(BytesTest, EveryValueOfSixteenBitsComesBack) {
    for (uint32_t value = 0; value <= UINT16_MAX; value++) {
        bytes.length = 0;
        MbxPut16(&bytes, value);
        ASSERT_EQ(bytes.data[0] << 8 | bytes.data[1], static_cast<int>(value));
    }
}

TEST_F(BytesTest, EverySingleBitOfEveryWidthStandsAtItsPlace) {
    for (uint32_t width = 1; width <= 8; width++) {
        for (uint32_t bit = 0; bit < 8 * width; bit++) {
            MbxBeginBytes(context, &bytes);
            MbxPut(&bytes, 1ULL << bit, width);
            Bytes expected(width, 0);
            expected[width - 1 - bit / 8] = static_cast<uint8_t>(1 << bit % 8);
            ASSERT_EQ(composed(), expected) << "bit " << bit << " of " << width << " bytes";
        }
    }
}

TEST_F(BytesTest, ReservedBytesAreZero) {
    MbxPut8(&bytes, 0xFF);
    MbxPutZeros(&bytes, 5);
    MbxPut8(&bytes, 0xFF);
    EXPECT_BYTES(composed(), Hex("FF 0000000000 FF"));
}

TEST_F(BytesTest, VersionChoosesTheWidth) {
    MbxPutByVersion(&bytes, 0, 0x1122334455667788);
    MbxPutByVersion(&bytes, 1, 0x1122334455667788);
    EXPECT_BYTES(composed(), Hex("55667788 1122334455667788"));
}

TEST_F(BytesTest, HeadOfAFullBox) {
    MbxPutVersionFlags(&bytes, 1, 0xFF020304);
    EXPECT_BYTES(composed(), Hex("01 020304"));
}

TEST_F(BytesTest, NothingIsWrittenBeyondTheBuffer) {
    MbxPutZeros(&bytes, sizeof(bytes.data) - 1);
    MbxPut8(&bytes, 7);
    EXPECT_EQ(bytes.overrun, 0U);
    MbxPut8(&bytes, 8);
    EXPECT_EQ(bytes.overrun, 1U);
    EXPECT_EQ(bytes.length, sizeof(bytes.data));

    MbxBeginBytes(context, &bytes);
    MbxPutZeros(&bytes, sizeof(bytes.data) - 7);
    MbxPut64(&bytes, 1);
    EXPECT_EQ(bytes.overrun, 1U);
    MbxBeginBytes(context, &bytes);
    MbxPutZeros(&bytes, sizeof(bytes.data) + 1);
    EXPECT_EQ(bytes.overrun, 1U);
    EXPECT_EQ(bytes.length, 0U);
}

TEST_F(BytesTest, StoredWordsComeBack) {
    uint8_t store[4];
    MbxStore16(store, 0xABCD);
    EXPECT_BYTES(Bytes(store, store + 2), Hex("ABCD"));
    MbxStore32(store, 0x89ABCDEF);
    EXPECT_BYTES(Bytes(store, store + 4), Hex("89ABCDEF"));
    EXPECT_EQ(MbxGet32(store), 0x89ABCDEFU);
}

TEST_F(BytesTest, BigEndianWordsReadAsBytesInMemory) {
    const uint32_t word = MbxBig32(0x01020304);
    const uint64_t wide = MbxBig64(0x0102030405060708);
    const auto* a = reinterpret_cast<const uint8_t*>(&word);
    const auto* b = reinterpret_cast<const uint8_t*>(&wide);
    EXPECT_BYTES(Bytes(a, a + 4), Hex("01020304"));
    EXPECT_BYTES(Bytes(b, b + 8), Hex("0102030405060708"));
}

}  // namespace
