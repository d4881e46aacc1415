#include "boxlib/core/block_list.h"

#include "boxlib/support/fixture.h"

namespace {

class BlockListTest : public BoxTest {
 protected:
    void TearDown() override {
        MbxBlockListRelease(context, &list);
        BoxTest::TearDown();
    }

    void append(uint32_t count) {
        for (uint32_t i = 0; i < count; i++) {
            ASSERT_EQ(MbxBlockListAppend(context, &list, i), MBX_OK);
        }
    }

    MbxBlockList list = {.capacity = 4, .first = nullptr, .current = nullptr};
};

TEST_F(BlockListTest, BlocksFillOneAfterTheOther) {
    append(9);
    ASSERT_NE(list.first, nullptr);
    EXPECT_EQ(list.first->count, 4U);
    EXPECT_EQ(list.first->next->count, 4U);
    EXPECT_EQ(list.first->next->next, list.current);
    EXPECT_EQ(list.current->count, 1U);
    EXPECT_EQ(list.current->next, nullptr);
    EXPECT_EQ(MbxBlockEntries<uint32_t>(list.first)[3], 3U);
    EXPECT_EQ(MbxBlockEntries<uint32_t>(list.current)[0], 8U);
}

TEST_F(BlockListTest, EntriesNeverMove) {
    const uint32_t one = 1;
    uint32_t* stored = nullptr;
    ASSERT_EQ(MbxBlockListAppend(context, &list, one, &stored), MBX_OK);
    append(100);
    EXPECT_EQ(*stored, 1U);
    EXPECT_EQ(stored, MbxBlockListFirst<uint32_t>(&list));
}

TEST_F(BlockListTest, CountSumsTheBlocks) {
    uint32_t total = 7;
    EXPECT_EQ(MbxBlockListCount(nullptr, &total), MBX_OK);
    EXPECT_EQ(total, 0U);
    append(9);
    EXPECT_EQ(MbxBlockListCount(&list, &total), MBX_OK);
    EXPECT_EQ(total, 9U);
    EXPECT_EQ(MbxBlockListCount(&list, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(BlockListTest, CountBeyondItsFieldOverflows) {
    append(5);
    uint16_t narrow = 7;
    EXPECT_EQ(MbxBlockListCount16(&list, &narrow), MBX_OK);
    EXPECT_EQ(narrow, 5U);
    list.first->count = 65534;
    EXPECT_EQ(MbxBlockListCount16(&list, &narrow), MBX_OK);
    EXPECT_EQ(narrow, 65535U);
    list.first->count = 65535;
    EXPECT_EQ(MbxBlockListCount16(&list, &narrow), MBX_ERR_OVERFLOW);
    EXPECT_EQ(narrow, 65535U);
    EXPECT_EQ(MbxBlockListCount16(&list, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBlockListCount16(nullptr, &narrow), MBX_OK);
    EXPECT_EQ(narrow, 0U);

    uint32_t total = 7;
    list.first->count = UINT32_MAX;
    EXPECT_EQ(MbxBlockListCount(&list, &total), MBX_ERR_OVERFLOW);
    EXPECT_EQ(total, 7U);
    list.first->count = 4;
}

TEST_F(BlockListTest, RefusedAllocationLeavesTheListAsItWas) {
    append(4);
    const uint32_t entry = 5;
    for (uint64_t n = 1; n <= 2; n++) {  // the block, then its array
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxBlockListAppend(context, &list, entry), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(list.current, list.first);
        EXPECT_EQ(list.first->next, nullptr);
        EXPECT_EQ(list.first->count, 4U);
    }
    EXPECT_EQ(MbxBlockListAppend(context, &list, entry), MBX_OK);
    EXPECT_EQ(*MbxBlockEntries<uint32_t>(list.current), 5U);
}

TEST_F(BlockListTest, ListWithoutACapacityIsABrokenInvariant) {
    list.capacity = 0;
    const uint32_t entry = 5;
    EXPECT_EQ(MbxBlockListAppend(context, &list, entry), MBX_ERR_INTERNAL);
}

TEST_F(BlockListTest, ReleasedListCanBeUsedAgain) {
    append(9);
    MbxBlockListRelease(context, &list);
    EXPECT_EQ(host.live.size(), 1U);  // the context
    EXPECT_EQ(list.capacity, 4U);
    EXPECT_EQ(MbxBlockListFirst<uint32_t>(&list), nullptr);
    append(5);
    uint32_t total = 0;
    EXPECT_EQ(MbxBlockListCount(&list, &total), MBX_OK);
    EXPECT_EQ(total, 5U);
}

TEST_F(BlockListTest, ManyEntriesCostTwoAllocationsPerBlock) {
    list.capacity = MBX_BLOCK_CAPACITY;
    const uint64_t before = host.allocations;
    append(1000);
    EXPECT_EQ(host.allocations, before + 2);
    append(1);
    EXPECT_EQ(host.allocations, before + 4);
}

}  // namespace
