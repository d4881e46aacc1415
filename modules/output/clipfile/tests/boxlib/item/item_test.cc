#include "boxlib/item/item.h"

#include "boxlib/support/entry_fixture.h"

namespace {

uint8_t kName[] = {'n', 0};
MbxHandler kHandler = {MbxCode("cfmd"), BufferOf(kName)};

uint8_t kText[] = {'<', 'x', '/', '>', 0};
MbxXmlParams kXml = {BufferOf(kText)};

MbxIlocExtent kSecondExtent = {0x21, 0x22, 0x23, nullptr};
MbxIlocExtent kFirstExtent = {0x11, 0x12, 0x13, &kSecondExtent};
MbxIlocItem kSecondItem = {2, 0x12, 0, 0x99, {}, nullptr};
MbxIlocItem kFirstItem = {1, 1, 3, 0x0102030405060708, {&kFirstExtent, &kSecondExtent}, &kSecondItem};
MbxIlocParams kIloc = {1, 4, 8, 8, 4, {&kFirstItem, &kSecondItem}};

uint8_t kFirstBytes[] = {0x01, 0x02};
uint8_t kSecondBytes[] = {0x03};
MbxItemData kSecondRange = {BufferOf(kSecondBytes), nullptr};
MbxItemData kFirstRange = {BufferOf(kFirstBytes), &kSecondRange};
MbxIdatParams kIdat = {{&kFirstRange, &kSecondRange}};

const MbxMetaParams kMeta = {&kHandler, &kXml, &kIloc, &kIdat};

const Bytes kHdlrGolden =
    Hex("00000022 'hdlr'"
        "00000000"                    // version, flags
        "00000000"                    // pre_defined
        "'cfmd'"                      // handler_type
        "00000000 00000000 00000000"  // reserved
        "'n' 00");                    // name

const Bytes kXmlGolden =
    Hex("00000011 'xml '"
        "00000000"     // version, flags
        "'<x/>' 00");  // xml

const Bytes kIlocGolden =
    Hex("00000050 'iloc'"
        "01 000000"         // version, flags
        "48 84"             // offset_size 4, length_size 8, base_offset_size 8, index_size 4
        "0002"              // item_count
        "0001"              // item_ID
        "0001"              // reserved, construction_method
        "0003"              // data_reference_index
        "0102030405060708"  // base_offset
        "0002"              // extent_count
        "00000011"          // extent_index
        "00000012"          // extent_offset
        "0000000000000013"  // extent_length
        "00000021"          // extent_index
        "00000022"          // extent_offset
        "0000000000000023"  // extent_length
        "0002"              // item_ID
        "0002"              // reserved, the low four bits of construction_method
        "0000"              // data_reference_index
        "0000000000000099"  // base_offset
        "0000");            // extent_count

const Bytes kIdatGolden =
    Hex("0000000B 'idat'"
        "0102"  // first range
        "03");  // second range

const BoxRegistration kRows[] = {
    RegisterBox<MbxXmlBox>({.name = "Xml",
                            .code = "xml ",
                            .parents = "meta",
                            .clause = "ISO/IEC 14496-12 8.11.2",
                            .presence = Presence::kOptional,
                            .golden = kXmlGolden,
                            .build = [](MbxContext* context, const MbxOptions* options,
                                        MbxXmlBox* box) { return MbxBuildXml(context, options, &kXml, box); },
                            .write = MbxWriteXmlBox,
                            .free = MbxFreeXml}),
    RegisterBox<MbxIlocBox>(
        {.name = "Iloc",
         .code = "iloc",
         .parents = "meta",
         .clause = "ISO/IEC 14496-12 8.11.3",
         .presence = Presence::kOptional,
         .golden = kIlocGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxIlocBox* box) { return MbxBuildIloc(context, options, &kIloc, box); },
         .write = MbxWriteIlocBox,
         .free = MbxFreeIloc}),
    RegisterBox<MbxIdatBox>(
        {.name = "Idat",
         .code = "idat",
         .parents = "meta",
         .clause = "ISO/IEC 14496-12 8.11.11",
         .presence = Presence::kOptional,
         .golden = kIdatGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxIdatBox* box) { return MbxBuildIdat(context, options, &kIdat, box); },
         .write = MbxWriteIdatBox,
         .free = MbxFreeIdat}),
    RegisterBox<MbxMetaBox>(
        {.name = "Meta",
         .code = "meta",
         .parents = "moov",
         .clause = "ISO/IEC 14496-12 8.11.1",
         .presence = Presence::kOptional,
         .golden = Hex("0000009A 'meta'"
                       "00000000") +  // version, flags
                   kHdlrGolden +
                   kXmlGolden + kIlocGolden + kIdatGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMetaBox* box) { return MbxBuildMeta(context, options, &kMeta, box); },
         .write = MbxWriteMetaBox,
         .free = MbxFreeMeta}),
};

class ItemTest : public BoxTest {
 protected:
    MbxStatus buildIloc(const MbxIlocParams& params) {
        return BuildStatus<MbxIlocBox>(
            context, [&](MbxIlocBox* box) { return MbxBuildIloc(context, &options, &params, box); },
            MbxFreeIloc);
    }

    Bytes writeIloc(const MbxIlocParams& params) {
        return WriteBuiltBox<MbxIlocBox>(
            context, &options, [&](MbxIlocBox* box) { return MbxBuildIloc(context, &options, &params, box); },
            MbxWriteIlocBox, MbxFreeIloc);
    }

    Bytes writeMeta(const MbxMetaParams& params) {
        return WriteBuiltBox<MbxMetaBox>(
            context, &options, [&](MbxMetaBox* box) { return MbxBuildMeta(context, &options, &params, box); },
            MbxWriteMetaBox, MbxFreeMeta);
    }

    // All records, linked in order.
    template <typename Record>
    static MbxList<Record> link(std::vector<Record>* records) {
        for (size_t i = 0; i + 1 < records->size(); i++) (*records)[i].next = &(*records)[i + 1];
        return {records->data(), &records->back()};
    }
};

TEST_F(ItemTest, IlocWithABaseOffsetSizeOf0WritesNoBaseOffset) {
    MbxIlocItem item = {1, 0, 3, 0x0102030405060708, {}, nullptr};
    const MbxIlocParams params = {0, 4, 4, 0, 0, {&item, &item}};
    EXPECT_BYTES(writeIloc(params), Hex("00000016 'iloc'"
                                        "00 000000"  // version, flags
                                        "44 00"      // sizes
                                        "0001"       // item_count
                                        "0001"       // item_ID
                                        "0003"       // data_reference_index
                                        "0000"));    // extent_count
}

TEST_F(ItemTest, IlocVersion0HasNeitherConstructionMethodNorIndex) {
    MbxIlocExtent extent = {0x11, 0x12, 0x13, nullptr};
    MbxIlocItem item = {1, 2, 3, 4, {&extent, &extent}, nullptr};
    const MbxIlocParams params = {0, 8, 4, 4, 8, {&item, &item}};
    EXPECT_BYTES(writeIloc(params), Hex("00000026 'iloc'"
                                        "00 000000"  // version, flags
                                        "84 40"      // offset 8, length 4, base offset 4; index_size is 0
                                        "0001"       // item_count
                                        "0001"       // item_ID
                                        "0003"       // data_reference_index
                                        "00000004"   // base_offset
                                        "0001"       // extent_count
                                        "0000000000000012"  // extent_offset
                                        "00000013"));       // extent_length
}

TEST_F(ItemTest, IlocSizeOtherThan0And4And8IsABrokenInvariant) {
    MbxIlocParams params = {1, 0, 0, 0, 0, {}};
    EXPECT_EQ(buildIloc(params), MBX_OK);
    for (const uint8_t size : {uint8_t{1}, uint8_t{2}, uint8_t{5}, uint8_t{16}}) {
        params = {1, size, 0, 0, 0, {}};
        EXPECT_EQ(buildIloc(params), MBX_ERR_INTERNAL);
        params = {1, 0, size, 0, 0, {}};
        EXPECT_EQ(buildIloc(params), MBX_ERR_INTERNAL);
        params = {1, 0, 0, size, 0, {}};
        EXPECT_EQ(buildIloc(params), MBX_ERR_INTERNAL);
        params = {1, 0, 0, 0, size, {}};
        EXPECT_EQ(buildIloc(params), MBX_ERR_INTERNAL);
        params.version = 0;  // without an index its size does not count
        EXPECT_EQ(buildIloc(params), MBX_OK);
    }
}

TEST_F(ItemTest, IlocWithMoreThan65535ItemsOrExtentsOverflows) {
    std::vector<MbxIlocItem> items(65535, MbxIlocItem{});
    MbxIlocParams params = {0, 4, 4, 0, 0, link(&items)};
    EXPECT_EQ(buildIloc(params), MBX_OK);
    items.push_back({});
    params.items = link(&items);
    EXPECT_EQ(buildIloc(params), MBX_ERR_OVERFLOW);

    std::vector<MbxIlocExtent> extents(65535, MbxIlocExtent{});
    MbxIlocItem item = {1, 0, 0, 0, link(&extents), nullptr};
    params.items = {&item, &item};
    EXPECT_EQ(buildIloc(params), MBX_OK);
    extents.push_back({});
    item.extents = link(&extents);
    EXPECT_EQ(buildIloc(params), MBX_ERR_OVERFLOW);
}

TEST_F(ItemTest, MetaNeedsAHandlerAndNothingElse) {
    MbxMetaParams params = {&kHandler, nullptr, nullptr, nullptr};
    EXPECT_BYTES(writeMeta(params), Hex("0000002E 'meta' 00000000") + kHdlrGolden);
    params.idat = &kIdat;
    EXPECT_BYTES(writeMeta(params), Hex("00000039 'meta' 00000000") + kHdlrGolden + kIdatGolden);
    params.handler = nullptr;
    EXPECT_EQ(BuildStatus<MbxMetaBox>(
                  context, [&](MbxMetaBox* box) { return MbxBuildMeta(context, &options, &params, box); },
                  MbxFreeMeta),
              MBX_ERR_INVALID_ARG);
    MbxMetaBox box = {};
    EXPECT_EQ(MbxWriteMetaBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ItemTest, BuildersRefuseNullArguments) {
    MbxXmlBox xml = {};
    EXPECT_EQ(MbxBuildXml(context, &options, nullptr, &xml), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildXml(nullptr, &options, &kXml, &xml), MBX_ERR_INVALID_ARG);
    MbxIlocBox iloc = {};
    EXPECT_EQ(MbxBuildIloc(context, nullptr, &kIloc, &iloc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildIloc(context, &options, nullptr, &iloc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildIdat(context, &options, &kIdat, nullptr), MBX_ERR_INVALID_ARG);
    MbxMetaBox meta = {};
    EXPECT_EQ(MbxBuildMeta(context, &options, nullptr, &meta), MBX_ERR_INVALID_ARG);
}

TEST_F(ItemTest, ParametersAreReleasedWithAllThatTheyOwn) {
    MbxMetaParams* meta = nullptr;
    ASSERT_EQ(MbxNew(context, &meta), MBX_OK);
    ASSERT_EQ(MbxNew(context, &meta->handler), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 1, &meta->handler->name, "n", 1), MBX_OK);
    ASSERT_EQ(MbxNew(context, &meta->xml), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 1, &meta->xml->text, "<x/>", 4), MBX_OK);
    ASSERT_EQ(MbxNew(context, &meta->iloc), MBX_OK);
    MbxIlocItem* item = nullptr;
    ASSERT_EQ(MbxNew(context, &item), MBX_OK);
    MbxListAppend(&meta->iloc->items, item);
    MbxIlocExtent* extent = nullptr;
    ASSERT_EQ(MbxNew(context, &extent), MBX_OK);
    MbxListAppend(&item->extents, extent);
    ASSERT_EQ(MbxNew(context, &meta->idat), MBX_OK);
    MbxItemData* range = nullptr;
    ASSERT_EQ(MbxNew(context, &range), MBX_OK);
    MbxListAppend(&meta->idat->ranges, range);
    ASSERT_EQ(MbxBufferAssign(context, 0, &range->bytes, kFirstBytes, 2), MBX_OK);
    EXPECT_EQ(MbxFreeMetaParams(context, meta), MBX_OK);
    EXPECT_EQ(host.live.size(), 1U);  // the context
    EXPECT_EQ(MbxFreeMetaParams(context, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreeMetaParams(nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
