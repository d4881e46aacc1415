#include "boxlib/core/list.h"

#include "boxlib/support/fixture.h"

namespace {

struct Item {
    uint32_t key;
    Item* next;
};

class ListTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        for (const uint32_t key : {10, 20, 20, 30}) {
            Item* item = nullptr;
            ASSERT_EQ(MbxNew(context, &item), MBX_OK);
            item->key = key;
            MbxListAppend(&list, item);
        }
    }

    void TearDown() override {
        EXPECT_EQ(MbxFreeList(context, &list, release), MBX_OK);
        EXPECT_EQ(list.first, nullptr);
        EXPECT_EQ(list.last, nullptr);
        BoxTest::TearDown();
    }

    static MbxStatus release(MbxContext* context, Item* item) {
        MbxFree(context, item);
        return MBX_OK;
    }

    MbxList<Item> list = {};
};

TEST_F(ListTest, AppendKeepsOrderAndTail) {
    EXPECT_EQ(list.first->key, 10U);
    EXPECT_EQ(list.first->next->key, 20U);
    EXPECT_EQ(list.last->key, 30U);
    EXPECT_EQ(list.last->next, nullptr);
}

TEST_F(ListTest, Count) {
    uint32_t count = 7;
    EXPECT_EQ(MbxListCount(list.first, &count), MBX_OK);
    EXPECT_EQ(count, 4U);
    EXPECT_EQ(MbxListCount<Item>(nullptr, &count), MBX_OK);
    EXPECT_EQ(count, 0U);
    EXPECT_EQ(MbxListCount(list.first, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ListTest, CountUpToALimitOverflowsAboveIt) {
    uint32_t count = 7;
    EXPECT_EQ(MbxListCountUpTo(&list, 4, &count), MBX_OK);
    EXPECT_EQ(count, 4U);
    EXPECT_EQ(MbxListCountUpTo(&list, 3, &count), MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxListCountUpTo(&list, 4, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ListTest, AtIsOneBased) {
    Item* item = nullptr;
    EXPECT_EQ(MbxListAt(list.first, 1, &item), MBX_OK);
    EXPECT_EQ(item, list.first);
    EXPECT_EQ(MbxListAt(list.first, 4, &item), MBX_OK);
    EXPECT_EQ(item, list.last);
    EXPECT_EQ(MbxListAt(list.first, 0, &item), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(item, list.last);
    EXPECT_EQ(MbxListAt<Item>(list.first, 1, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ListTest, BeyondTheEndIsNullAndNoFailure) {
    Item* item = list.first;
    EXPECT_EQ(MbxListAt(list.first, 5, &item), MBX_OK);
    EXPECT_EQ(item, nullptr);
    item = list.first;
    EXPECT_EQ(MbxListAt<Item>(nullptr, 1, &item), MBX_OK);
    EXPECT_EQ(item, nullptr);
}

TEST_F(ListTest, RequireTurnsAMissingRecordIntoNotFound) {
    Item* item = nullptr;
    EXPECT_EQ(MbxListRequire(list.first, 5, &item), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxListRequire(list.first, 0, &item), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxListRequire(list.first, 2, &item), MBX_OK);
    EXPECT_EQ(item, list.first->next);
}

TEST_F(ListTest, FindGivesTheFirstHitAndItsPlace) {
    Item* item = nullptr;
    uint32_t position = 7;
    const auto key = [](uint32_t wanted) { return [wanted](const Item& i) { return i.key == wanted; }; };
    EXPECT_EQ(MbxListFind(list.first, key(20), &item, &position), MBX_OK);
    EXPECT_EQ(item, list.first->next);
    EXPECT_EQ(position, 2U);
    EXPECT_EQ(MbxListFind(list.first, key(30), &item, nullptr), MBX_OK);
    EXPECT_EQ(item, list.last);
    EXPECT_EQ(MbxListFind(list.first, key(40), &item, &position), MBX_OK);
    EXPECT_EQ(item, nullptr);
    EXPECT_EQ(position, 0U);
    EXPECT_EQ(MbxListFind<Item>(list.first, key(20), nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
