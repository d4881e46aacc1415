#include "boxlib/core/buffer.h"

#include "boxlib/support/fixture.h"

namespace {

class BufferTest : public BoxTest {
 protected:
    void TearDown() override {
        MbxBufferRelease(context, &buffer);
        BoxTest::TearDown();
    }

    Bytes held() const { return {buffer.data, buffer.data + buffer.size}; }

    MbxBuffer buffer = {};
};

TEST_F(BufferTest, BytesAreCopiedAsTheyStand) {
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, "ab\0cd", 5), MBX_OK);
    EXPECT_BYTES(held(), Hex("'ab' 00 'cd'"));
}

TEST_F(BufferTest, TextEndsAtItsTerminator) {
    EXPECT_EQ(MbxBufferAssign(context, 1, &buffer, "abc\0efghi", 10), MBX_OK);
    EXPECT_BYTES(held(), Hex("'abc' 00"));
    EXPECT_EQ(buffer.size, 4U);
}

TEST_F(BufferTest, TextWithoutATerminatorGetsOne) {
    EXPECT_EQ(MbxBufferAssign(context, 1, &buffer, "abcdef", 3), MBX_OK);
    EXPECT_BYTES(held(), Hex("'abc' 00"));
}

TEST_F(BufferTest, EmptyTextWithATerminatorIsOneByte) {
    EXPECT_EQ(MbxBufferAssign(context, 1, &buffer, "", 1), MBX_OK);
    EXPECT_BYTES(held(), Hex("00"));
}

TEST_F(BufferTest, NothingLeavesTheBufferEmpty) {
    ASSERT_EQ(MbxBufferAssign(context, 0, &buffer, "abc", 3), MBX_OK);
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, nullptr, 0), MBX_OK);
    EXPECT_EQ(buffer.data, nullptr);
    EXPECT_EQ(buffer.size, 0U);
    EXPECT_EQ(MbxBufferAssign(context, 1, &buffer, "abc", 0), MBX_OK);
    EXPECT_EQ(buffer.data, nullptr);
}

TEST_F(BufferTest, SecondAssignmentReleasesTheFirst) {
    ASSERT_EQ(MbxBufferAssign(context, 0, &buffer, "abc", 3), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 0, &buffer, "defg", 4), MBX_OK);
    EXPECT_BYTES(held(), Hex("'defg'"));
    EXPECT_EQ(host.frees, 1U);
}

TEST_F(BufferTest, FailureLeavesTheBufferEmpty) {
    ASSERT_EQ(MbxBufferAssign(context, 0, &buffer, "abc", 3), MBX_OK);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, "defg", 4), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(buffer.data, nullptr);
    EXPECT_EQ(buffer.size, 0U);

    host.failCopy = host.copies + 1;
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, "defg", 4), MBX_ERR_INTERNAL);
    EXPECT_EQ(buffer.data, nullptr);
}

TEST_F(BufferTest, RefusesNullArguments) {
    EXPECT_EQ(MbxBufferAssign(nullptr, 0, &buffer, "abc", 3), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBufferAssign(context, 0, nullptr, "abc", 3), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, nullptr, 3), MBX_ERR_INVALID_ARG);
}

TEST_F(BufferTest, SizeThatNoBlockHoldsIsRefused) {
    EXPECT_EQ(MbxBufferAssign(context, 0, &buffer, "abc", 1ULL << 32), MBX_ERR_NO_MEMORY);
}

TEST_F(BufferTest, AssignTextStoresTheTerminatorOfAnEmptyText) {
    EXPECT_EQ(MbxBufferAssignText(context, &buffer, nullptr, 0), MBX_OK);
    EXPECT_BYTES(held(), Hex("00"));
    EXPECT_EQ(MbxBufferAssignText(context, &buffer, "xy", 2), MBX_OK);
    EXPECT_BYTES(held(), Hex("'xy' 00"));
}

TEST_F(BufferTest, ReleaseIsSafeTwice) {
    ASSERT_EQ(MbxBufferAssign(context, 0, &buffer, "abc", 3), MBX_OK);
    MbxBufferRelease(context, &buffer);
    MbxBufferRelease(context, &buffer);
    EXPECT_EQ(host.frees, 1U);
}

}  // namespace
