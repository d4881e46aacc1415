#include "boxlib/core/row_table.h"

#include "boxlib/support/fixture.h"

namespace {

class RowTableTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        ASSERT_EQ(MbxScratchInit(context, MBX_MEMORY_CLASS, 8192, &scratch), MBX_OK);
    }

    void TearDown() override {
        MbxScratchRelease(context, &scratch);
        BoxTest::TearDown();
    }

    MbxScratch scratch = {};
};

TEST_F(RowTableTest, ScratchServesRowsUpToItsSizeAndABlockServesMore) {
    struct Case {
        uint64_t count;
        uint64_t allocations;
    };
    for (const Case& c : {Case{8191, 0}, Case{8192, 0}, Case{8193, 1}}) {
        const uint64_t before = host.allocations;
        const uint64_t bytesBefore = host.liveBytes;
        MbxRows rows;
        ASSERT_EQ(MbxTakeRows(context, &scratch, c.count, 1, &rows), MBX_OK);
        EXPECT_EQ(host.allocations - before, c.allocations) << c.count;
        EXPECT_EQ(rows.data == scratch.data, c.allocations == 0);
        EXPECT_EQ(host.liveBytes - bytesBefore, c.allocations * (c.count + 8));
        MbxReleaseRows(context, &rows);
        MbxReleaseRows(context, &rows);
        EXPECT_EQ(host.liveBytes, bytesBefore);
    }
}

TEST_F(RowTableTest, AnEmptyScratchMakesEveryTableAllocate) {
    MbxRows rows;
    ASSERT_EQ(MbxTakeRows(context, nullptr, 1, 1, &rows), MBX_OK);
    EXPECT_NE(rows.temporary, nullptr);
    MbxReleaseRows(context, &rows);
    const MbxScratch empty = {8192, nullptr};
    ASSERT_EQ(MbxTakeRows(context, &empty, 1, 1, &rows), MBX_OK);
    EXPECT_NE(rows.temporary, nullptr);
    MbxReleaseRows(context, &rows);
}

TEST_F(RowTableTest, NoRowsTakeNoRoom) {
    MbxRows rows;
    ASSERT_EQ(MbxTakeRows(context, &scratch, 0, 8, &rows), MBX_OK);
    EXPECT_EQ(rows.data, nullptr);
    ASSERT_EQ(MbxTakeRows(context, &scratch, 8, 0, &rows), MBX_OK);
    EXPECT_EQ(rows.data, nullptr);
}

TEST_F(RowTableTest, MoreRowsThanABlockCanHoldAreNoMemory) {
    MbxRows rows;
    EXPECT_EQ(MbxTakeRows(context, &scratch, UINT64_MAX, 16, &rows), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(MbxTakeRows(context, &scratch, 0x20000000, 8, &rows), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(rows.data, nullptr);
}

TEST_F(RowTableTest, RowsAreWrittenAtOnceAndReleasedOnEveryPath) {
    const auto fill = [](uint8_t* data) {
        MbxRowBytes rows = {data};
        MbxAppend(&rows, 0x0102030405060708, 8);
        MbxAppend(&rows, 0xAABBCCDD, 3);
        MbxAppend(&rows, 0x7F, 1);
        return MBX_OK;
    };
    uint64_t count = 5;
    EXPECT_EQ(MbxWriteRows(context, nullptr, &file, 2, 6, fill, &count), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0102030405060708 BBCCDD 7F"));
    EXPECT_EQ(count, 17U);
    EXPECT_EQ(file.writes, 1U);

    const size_t live = host.live.size();
    const auto refuse = [](uint8_t*) { return MBX_ERR_INTERNAL; };
    EXPECT_EQ(MbxWriteRows(context, nullptr, &file, 2, 6, refuse, &count), MBX_ERR_INTERNAL);
    file.failWrite = 2;
    EXPECT_EQ(MbxWriteRows(context, nullptr, &file, 2, 6, fill, &count), MBX_ERR_IO);
    EXPECT_EQ(count, 17U);
    EXPECT_EQ(host.live.size(), live);
}

}  // namespace
