#include "boxlib/core/descriptor.h"

#include "boxlib/support/fixture.h"

namespace {

class DescriptorTest : public BoxTest {
 protected:
    // A descriptor with tag `tag` and a body of `size` equal bytes.
    MbxStatus write(MbxFile* target, uint64_t position, uint32_t tag, uint64_t size, uint64_t* accumulated) {
        const Bytes body = Repeat(0xEE, size);
        return MbxWriteDescriptor(
            context, target, position, tag,
            [&](MbxFile* stream, uint64_t, uint64_t* counter) {
                return MbxWriteBytes(context, stream, body.data(), body.size(), nullptr, counter);
            },
            accumulated);
    }
};

TEST_F(DescriptorTest, HeaderCarriesTheSizeOfTheBody) {
    uint64_t accumulated = 100;
    EXPECT_EQ(write(&file, 0, MBX_TAG_DECODER_SPECIFIC_INFO, 2, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("05 02 EEEE"));
    EXPECT_EQ(accumulated, 104U);
}

TEST_F(DescriptorTest, EmptyBodyIsAHeaderWithSizeZero) {
    EXPECT_EQ(write(&file, 0, MBX_TAG_ES_DESCRIPTOR, 0, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("03 00"));
}

TEST_F(DescriptorTest, MeasuredLikeWritten) {
    for (const uint64_t size : {0U, 1U, 127U, 128U, 16383U, 16384U}) {
        MemoryFile target;
        uint64_t measured = 0;
        uint64_t written = 0;
        EXPECT_EQ(write(nullptr, 0, MBX_TAG_SL_CONFIG, size, &measured), MBX_OK);
        EXPECT_EQ(write(&target, 0, MBX_TAG_SL_CONFIG, size, &written), MBX_OK);
        EXPECT_EQ(measured, target.bytes.size());
        EXPECT_EQ(written, target.bytes.size());
    }
}

TEST_F(DescriptorTest, NestedBodiesKnowTheirPositions) {
    const auto outer = [&](MbxFile* target, uint64_t at, uint64_t* counter) {
        return write(target, at, MBX_TAG_DECODER_SPECIFIC_INFO, 1, counter);
    };
    EXPECT_EQ(MbxWriteDescriptor(context, &file, 3, MBX_TAG_DECODER_CONFIG, outer, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("000000"
                                 "04 03"
                                 "05 01 EE"));
}

TEST_F(DescriptorTest, FailureOfTheBodyIsPassedOn) {
    uint64_t accumulated = 100;
    file.failWrite = 2;
    EXPECT_EQ(write(&file, 0, MBX_TAG_SL_CONFIG, 1, &accumulated), MBX_ERR_IO);
    EXPECT_EQ(accumulated, 100U);
}

}  // namespace
