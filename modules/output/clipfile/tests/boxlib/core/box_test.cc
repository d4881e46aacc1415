// The shape that all boxes share, on boxes that exist here only: a leaf, and a parent with an optional child,
// a mandatory one and a list.
#include "boxlib/core/box.h"

#include "boxlib/support/fixture.h"

namespace {

struct Leaf {
    uint64_t size;
    uint32_t value;
    Leaf* next;
};

struct Parent {
    uint64_t size;
    Leaf* optional;
    Leaf* mandatory;
    MbxList<Leaf> items;
};

MbxStatus writeLeafPayload(MbxContext* context, MbxFile* file, uint64_t position, const Leaf* box,
                           uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, box->value);
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus buildLeaf(MbxContext* context, const MbxOptions* options, uint32_t value, Leaf* box) {
    if (value == 0) return MBX_ERR_BAD_STATE;
    box->value = value;
    return MbxMeasureBox(context, options, box, writeLeafPayload);
}

MbxStatus writeLeaf(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                    const Leaf* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("leaf"), box, writeLeafPayload, written,
                       accumulated);
}

MbxStatus writeOptionalLeaf(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                            const Leaf* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("opti"), box, writeLeafPayload,
                               written, accumulated);
}

MbxStatus freeLeaf(MbxContext* context, Leaf* box) {
    return MbxFreeBox(context, box);
}

MbxStatus writeParentPayload(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                             const Parent* box, uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(writeOptionalLeaf(context, options, file, position + count, box->optional, nullptr, &count));
    MBX_TRY(writeLeaf(context, options, file, position + count, box->mandatory, nullptr, &count));
    MBX_TRY(MbxWriteEach(box->items.first, position, &count,
                         [&](const Leaf* item, uint64_t at, uint64_t* counter) {
                             return writeLeaf(context, options, file, at, item, nullptr, counter);
                         }));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus writeParent(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                      const Parent* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("prnt"), box, writeParentPayload, written,
                       accumulated);
}

MbxStatus freeParent(MbxContext* context, Parent* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(freeLeaf(context, box->optional));
        MBX_TRY(freeLeaf(context, box->mandatory));
        return MbxFreeList(context, &box->items, freeLeaf);
    });
}

class BoxShapeTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        ASSERT_EQ(MbxNew(context, &parent), MBX_OK);
    }

    void TearDown() override {
        EXPECT_EQ(freeParent(context, parent), MBX_OK);
        BoxTest::TearDown();
    }

    MbxStatus makeChild(Leaf** slot, uint32_t value) {
        return MbxMakeChild(
            context, slot, [&](Leaf* leaf) { return buildLeaf(context, &options, value, leaf); }, freeLeaf);
    }

    MbxStatus makeItem(uint32_t value) {
        return MbxMakeListItem(
            context, &parent->items, [&](Leaf* leaf) { return buildLeaf(context, &options, value, leaf); },
            freeLeaf);
    }

    MbxStatus measure() { return MbxMeasureBox(context, &options, parent, writeParentPayload); }

    Parent* parent = nullptr;
};

TEST_F(BoxShapeTest, TreeIsWrittenDepthFirstInTheOrderOfThePayloadWriter) {
    ASSERT_EQ(makeItem(3), MBX_OK);
    ASSERT_EQ(makeItem(4), MBX_OK);
    ASSERT_EQ(makeChild(&parent->mandatory, 2), MBX_OK);
    ASSERT_EQ(makeChild(&parent->optional, 1), MBX_OK);
    ASSERT_EQ(measure(), MBX_OK);
    uint64_t written = 0;
    uint64_t accumulated = 100;
    EXPECT_EQ(writeParent(context, &options, &file, 0, parent, &written, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000038 'prnt'"
                                 "0000000C 'opti' 00000001"
                                 "0000000C 'leaf' 00000002"
                                 "0000000C 'leaf' 00000003"
                                 "0000000C 'leaf' 00000004"));
    EXPECT_EQ(parent->size, 0x38U);
    EXPECT_EQ(written, 0x38U);
    EXPECT_EQ(accumulated, 100 + 0x38U);
}

TEST_F(BoxShapeTest, OptionalBoxWithANullRecordWritesNothing) {
    uint64_t written = 7;
    uint64_t accumulated = 100;
    EXPECT_EQ(writeOptionalLeaf(context, &options, &file, 0, nullptr, &written, &accumulated), MBX_OK);
    EXPECT_EQ(written, 0U);
    EXPECT_EQ(accumulated, 100U);
    EXPECT_EQ(file.seeks + file.writes, 0U);
}

TEST_F(BoxShapeTest, MandatoryBoxWithANullRecordIsRefused) {
    uint64_t written = 7;
    EXPECT_EQ(writeLeaf(context, &options, &file, 0, nullptr, &written, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(written, 7U);
    EXPECT_EQ(measure(), MBX_ERR_INVALID_ARG);  // the parent lacks its mandatory child
}

TEST_F(BoxShapeTest, SizeMode2CostsEightBytesForEveryBoxOfTheTree) {
    ASSERT_EQ(makeChild(&parent->mandatory, 2), MBX_OK);
    ASSERT_EQ(makeItem(3), MBX_OK);
    ASSERT_EQ(measure(), MBX_OK);
    const uint64_t small = parent->size;
    options.box_size_mode = 2;
    ASSERT_EQ(measure(), MBX_OK);
    EXPECT_EQ(parent->size, small + 3 * 8);
}

TEST_F(BoxShapeTest, ParentSumsWhatItsChildrenWriteAndNotTheirStoredSizes) {
    ASSERT_EQ(makeChild(&parent->mandatory, 2), MBX_OK);
    parent->mandatory->size = 0x55;
    ASSERT_EQ(measure(), MBX_OK);
    EXPECT_EQ(parent->size, 8 + 12U);
    EXPECT_EQ(writeLeaf(context, &options, &file, 0, parent->mandatory, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000055 'leaf' 00000002"));
}

TEST_F(BoxShapeTest, EveryBoxCostsOneSeekForItsHeaderAndOneForItsPayload) {
    ASSERT_EQ(makeChild(&parent->mandatory, 2), MBX_OK);
    ASSERT_EQ(measure(), MBX_OK);
    EXPECT_EQ(writeParent(context, &options, &file, 0, parent, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(file.seeks, 4U);
    EXPECT_EQ(file.writes, 3U);
}

TEST_F(BoxShapeTest, ChildWhoseBuildFailsIsReleased) {
    EXPECT_EQ(makeChild(&parent->optional, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(parent->optional, nullptr);
    EXPECT_EQ(makeItem(0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(parent->items.first, nullptr);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(makeItem(1), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(parent->items.first, nullptr);
}

TEST_F(BoxShapeTest, ChildThatIsSetTwiceIsABrokenInvariant) {
    ASSERT_EQ(makeChild(&parent->optional, 1), MBX_OK);
    const Leaf* first = parent->optional;
    EXPECT_EQ(makeChild(&parent->optional, 2), MBX_ERR_INTERNAL);
    EXPECT_EQ(parent->optional, first);
}

TEST_F(BoxShapeTest, FreeRefusesANullContextAndAllowsANullRecord) {
    EXPECT_EQ(freeLeaf(nullptr, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(freeLeaf(context, nullptr), MBX_OK);
    EXPECT_EQ(freeParent(nullptr, parent), MBX_ERR_INVALID_ARG);
}

class TableTest : public BoxTest {
 protected:
    void TearDown() override {
        MbxBlockListRelease(context, &list);
        BoxTest::TearDown();
    }

    void append(std::initializer_list<uint32_t> values) {
        for (const uint32_t value : values) {
            ASSERT_EQ(MbxBlockListAppend(context, &list, value), MBX_OK);
        }
    }

    // Rows of two words: the entry, and its double.
    MbxStatus write(MbxFile* target, uint64_t* accumulated) {
        return MbxWriteTable<uint32_t, uint32_t, 2>(
            context, target, &list,
            [](uint32_t entry, uint32_t* row) {
                row[0] = MbxBig32(entry);
                row[1] = MbxBig32(2 * entry);
            },
            accumulated);
    }

    MbxBlockList list = {.capacity = 2, .first = nullptr, .current = nullptr};
};

TEST_F(TableTest, EachBlockIsOneWrite) {
    append({1, 2, 3});
    uint64_t accumulated = 100;
    EXPECT_EQ(write(&file, &accumulated), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000001 00000002"
                                 "00000002 00000004"
                                 "00000003 00000006"));
    EXPECT_EQ(file.writeSizes, std::vector<uint64_t>({16, 8}));
    EXPECT_EQ(accumulated, 124U);
}

TEST_F(TableTest, MeasuringAllocatesAndConvertsAsWell) {
    append({1, 2, 3});
    const uint64_t before = host.allocations;
    uint64_t accumulated = 100;
    EXPECT_EQ(write(nullptr, &accumulated), MBX_OK);
    EXPECT_EQ(accumulated, 124U);
    EXPECT_EQ(host.allocations, before + 2);
}

TEST_F(TableTest, EmptyBlockEndsTheWalk) {
    append({1, 2, 3});
    list.first->count = 0;
    uint64_t accumulated = 100;
    EXPECT_EQ(write(&file, &accumulated), MBX_OK);
    EXPECT_EQ(accumulated, 100U);
    list.first->count = 2;
}

TEST_F(TableTest, TemporaryArraysAreReleasedOnEveryPath) {
    append({1, 2, 3});
    const size_t live = host.live.size();
    file.failWrite = 2;
    EXPECT_EQ(write(&file, nullptr), MBX_ERR_IO);
    EXPECT_EQ(host.live.size(), live);
    host.failAllocation = host.allocations + 2;
    EXPECT_EQ(write(nullptr, nullptr), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(host.live.size(), live);
}

}  // namespace
