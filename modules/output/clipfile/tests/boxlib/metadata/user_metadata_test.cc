#include "boxlib/metadata/user_metadata.h"

#include "boxlib/support/registry.h"

namespace {

uint8_t kUsageBytes[] = {0, 0, 0, 1, 0, 0, 0, 0};
uint8_t kTitleBytes[] = {'T', 'i'};

// Lists that the boxes borrow: two items, one of them flagged, and a metadata track.
struct Model {
    MbxMetadataItem usage = {10, 0, 0x55C4, 0, {kUsageBytes, 8}, nullptr};
    MbxMetadataItem title = {1, 1, 0x15C7, 3, {kTitleBytes, 2}, nullptr};
    MbxMetadataItem fileTitle = {1, 1, 0x15C7, 3, {kTitleBytes, 2}, nullptr};
    MbxDataEntry self = {MbxCode("url "), {}, {}, nullptr};
    MbxMetadataTrackEntry entry = {{0x11, 0x22, 0x33}, nullptr};
    MbxMetadataTrack track = {.header = {0, 0x01020304, 0x05060708, 63488},
                              .dataEntries = {&self, &self},
                              .sampleEntries = {},
                              .entries = {&entry, &entry},
                              .next = nullptr};
    MbxUserMetadata lists = {{&usage, &title}, {&fileTitle, &fileTitle}, {&track, &track}};

    Model() { usage.next = &title; }
};

const Model& model() {
    static const Model instance;
    return instance;
}

const Bytes kMtdt =
    Hex("00000028 'MTDT'"
        "0002"                 // item_count
        "0012 0000000A"        // size, type
        "55C4"                 // flag 0, language und
        "0000"                 // encoding
        "00000001 00 00 0000"  // data
        "000C 00000001"        // size, type
        "95C7"                 // flag 1, language eng
        "0003"                 // encoding
        "'Ti'");               // data

const Bytes kMtdf =
    Hex("00000016 'MTDF'"
        "0001"           // item_count
        "000C 00000001"  // size, type
        "15C7"           // no flag, language eng
        "0003"           // encoding
        "'Ti'");         // data

const Bytes kMthd =
    Hex("00000020 'MTHD'"
        "00 000000"            // version, flags
        "01020304"             // creation_time
        "05060708"             // modification_time
        "0000F800"             // track_ID
        "00000000 00000000");  // reserved

const Bytes kDinf = Hex("00000024 'dinf' 0000001C 'dref' 00000000 00000001 0000000C 'url ' 00000001");
const Bytes kStsd = Hex("00000010 'stsd' 00000000 00000000");

const Bytes kMdst =
    Hex("00000024 'MDST'"
        "00 000000"                   // version, flags
        "00000001"                    // entry_count
        "00000011 00000022 00000033"  // values
        "00000000 00000000");         // reserved

const Bytes kMtsm = Hex("00000080 'MTSM'") + kMthd + kDinf + kStsd + kMdst;

const Bytes kUsmtUuid = Hex("55534D54 21D24FCE BB88695C FAC9C740");

const BoxRegistration kRows[] = {
    RegisterBox<MbxUserMetadataBox>(
        {.name = "UserMetadata",
         .code = "uuid",
         .parents = "moov, trak",
         .clause = "own: user metadata",
         .presence = Presence::kOptional,
         // 8 + 16 + 22 + 40 + 128 bytes; MTDF stands before MTDT
         .golden = Hex("000000D6 'uuid'") + kUsmtUuid + kMtdf + kMtdt + kMtsm,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxUserMetadataBox* box) {
                 return MbxBuildUserMetadata(context, options, &model().lists, box);
             },
         .write = MbxWriteUserMetadataBox,
         .free = MbxFreeUserMetadata}),
    RegisterBox<MbxMetadataItemsBox>(
        {.name = "Mtdt",
         .code = "MTDT",
         .parents = "uuid USMT",
         .clause = "own: metadata items",
         .presence = Presence::kOptional,
         .golden = kMtdt,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxMetadataItemsBox* box) {
                 return MbxBuildMtdt(context, options, &model().lists.items, box);
             },
         .write = MbxWriteMtdtBox,
         .free = MbxFreeMtdt}),
    RegisterBox<MbxMetadataItemsBox>(
        {.name = "Mtdf",
         .code = "MTDF",
         .parents = "uuid USMT",
         .clause = "own: file metadata items",
         .presence = Presence::kOptional,
         .golden = kMtdf,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxMetadataItemsBox* box) {
                 return MbxBuildMtdf(context, options, &model().lists.fileItems, box);
             },
         .write = MbxWriteMtdfBox,
         .free = MbxFreeMtdf}),
    RegisterBox<MbxMtsmBox>(
        {.name = "Mtsm",
         .code = "MTSM",
         .parents = "uuid USMT",
         .clause = "own: metadata track",
         .presence = Presence::kOptional,
         .golden = kMtsm,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMtsmBox* box) { return MbxBuildMtsm(context, options, &model().track, box); },
         .write = MbxWriteMtsmBox,
         .free = MbxFreeMtsm}),
    RegisterBox<MbxMthdBox>(
        {.name = "Mthd",
         .code = "MTHD",
         .parents = "MTSM",
         .clause = "own: metadata track header",
         .presence = Presence::kMandatory,
         .golden = kMthd,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMthdBox* box) { return MbxBuildMthd(context, options, &model().track.header, box); },
         .write = MbxWriteMthdBox,
         .free = MbxFreeMthd}),
    RegisterBox<MbxMdstBox>(
        {.name = "Mdst",
         .code = "MDST",
         .parents = "MTSM",
         .clause = "own: metadata track table",
         .presence = Presence::kMandatory,
         .golden = kMdst,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMdstBox* box) { return MbxBuildMdst(context, options, &model().track.entries, box); },
         .write = MbxWriteMdstBox,
         .free = MbxFreeMdst}),
};

class UserMetadataTest : public BoxTest {
 protected:
    void TearDown() override {
        EXPECT_EQ(MbxReleaseUserMetadata(context, &lists), MBX_OK);
        BoxTest::TearDown();
    }

    MbxStatus put(uint32_t type, uint16_t language, uint16_t encoding, const Bytes& data, uint8_t flag = 0) {
        const MbxMetadataItemParams params = {type, flag, language, encoding, data.data(), data.size()};
        return MbxPutMetadataItem(context, &lists.items, &params, &count);
    }

    Bytes write() {
        MbxUserMetadataBox* box = nullptr;
        EXPECT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildUserMetadata(context, &options, &lists, box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteUserMetadataBox(context, &options, &target, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(MbxFreeUserMetadata(context, box), MBX_OK);
        return target.bytes;
    }

    MbxUserMetadata lists = {};
    uint32_t count = 7;
};

TEST_F(UserMetadataTest, ItemPutTwiceWithTheSameKeyKeepsOneItemWithTheSecondData) {
    ASSERT_EQ(put(10, 0x55C4, 0, Hex("0102"), 0), MBX_OK);
    EXPECT_EQ(count, 1U);
    ASSERT_EQ(put(10, 0x55C4, 0, Hex("030405"), 1), MBX_OK);
    EXPECT_EQ(count, 1U);
    EXPECT_BYTES(write(), Hex("0000002F 'uuid'") + kUsmtUuid +
                              Hex("00000017 'MTDT' 0001 000D 0000000A D5C4 0000 030405"));
}

TEST_F(UserMetadataTest, ItemsDifferByTypeLanguageOrEncoding) {
    ASSERT_EQ(put(10, 1, 1, Hex("01")), MBX_OK);
    ASSERT_EQ(put(11, 1, 1, Hex("02")), MBX_OK);
    ASSERT_EQ(put(10, 2, 1, Hex("03")), MBX_OK);
    ASSERT_EQ(put(10, 1, 2, Hex("04")), MBX_OK);
    EXPECT_EQ(count, 4U);
}

TEST_F(UserMetadataTest, LongestDataGivesAnItemOf65535BytesAndOneMoreIsRefused) {
    ASSERT_EQ(put(10, 0, 0, Repeat(0xAA, 65525)), MBX_OK);
    const Bytes bytes = write();
    EXPECT_BYTES(Bytes(bytes.begin() + 24, bytes.begin() + 40), Hex("00010009 'MTDT' 0001 FFFF 0000000A"));
    EXPECT_EQ(bytes.size(), 8 + 16 + 8 + 2 + 65535U);
    EXPECT_EQ(put(11, 0, 0, Repeat(0xAA, 65526)), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(count, 1U);
}

TEST_F(UserMetadataTest, ItemAbove65535BytesIsABrokenInvariantWhenItIsWritten) {
    ASSERT_EQ(put(10, 0, 0, Repeat(0xAA, 65525)), MBX_OK);
    lists.items.first->data.size = 65526;
    MbxMetadataItemsBox box = {};
    EXPECT_EQ(MbxBuildMtdt(context, &options, &lists.items, &box), MBX_ERR_INTERNAL);
    lists.items.first->data.size = 65525;
}

TEST_F(UserMetadataTest, RefusedValuesAllocateNothing) {
    const uint64_t before = host.allocations;
    EXPECT_EQ(put(10, 0, 0, Hex("01"), 2), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(put(10, 0x8000, 0, Hex("01")), MBX_ERR_INVALID_ARG);
    const MbxMetadataItemParams noData = {10, 0, 0, 0, nullptr, 5};
    EXPECT_EQ(MbxPutMetadataItem(context, &lists.items, &noData, &count), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxPutMetadataItem(nullptr, &lists.items, &noData, &count), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxPutMetadataItem(context, nullptr, &noData, &count), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxPutMetadataItem(context, &lists.items, nullptr, &count), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxPutMetadataItem(context, &lists.items, &noData, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(host.allocations, before);
    EXPECT_EQ(count, 7U);
    EXPECT_EQ(lists.items.first, nullptr);
}

TEST_F(UserMetadataTest, ItemWithoutDataIsAllowed) {
    ASSERT_EQ(put(10, 0, 0, {}), MBX_OK);
    EXPECT_BYTES(write(),
                 Hex("0000002C 'uuid'") + kUsmtUuid + Hex("00000014 'MTDT' 0001 000A 0000000A 0000 0000"));
}

TEST_F(UserMetadataTest, FailedAdditionLeavesTheListAsItWas) {
    ASSERT_EQ(put(10, 0, 0, Hex("01")), MBX_OK);
    for (uint64_t n = 1; n <= 2; n++) {  // the item, its data
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(put(11, 0, 0, Hex("02")), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(lists.items.first, lists.items.last);
    }
}

TEST_F(UserMetadataTest, FailedReplacementLosesTheOldDataAndKeepsTheItem) {
    ASSERT_EQ(put(10, 0, 0, Hex("01"), 1), MBX_OK);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(put(10, 0, 0, Hex("02"), 0), MBX_ERR_NO_MEMORY);
    ASSERT_NE(lists.items.first, nullptr);
    EXPECT_EQ(lists.items.first, lists.items.last);
    EXPECT_EQ(lists.items.first->data.size, 0U);
    EXPECT_EQ(lists.items.first->flag, 1U);
}

TEST_F(UserMetadataTest, MoreThan65535ItemsOverflow) {
    std::vector<MbxMetadataItem> items(65536, MbxMetadataItem{1, 0, 0, 0, {}, nullptr});
    for (size_t i = 1; i < items.size(); i++) items[i - 1].next = &items[i];
    MbxList<MbxMetadataItem> list = {&items[1], &items.back()};
    MbxMetadataItemsBox box = {};
    EXPECT_EQ(MbxBuildMtdt(context, &options, &list, &box), MBX_OK);
    list.first = &items[0];
    EXPECT_EQ(MbxBuildMtdt(context, &options, &list, &box), MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxBuildMtdf(context, &options, &list, &box), MBX_ERR_OVERFLOW);
}

TEST_F(UserMetadataTest, HasUserMetadataLooksAtAllThreeLists) {
    const Model& m = model();
    EXPECT_FALSE(MbxHasUserMetadata(&lists));
    const MbxUserMetadata items = {m.lists.items, {}, {}};
    const MbxUserMetadata fileItems = {{}, m.lists.fileItems, {}};
    const MbxUserMetadata tracks = {{}, {}, m.lists.tracks};
    EXPECT_TRUE(MbxHasUserMetadata(&items));
    EXPECT_TRUE(MbxHasUserMetadata(&fileItems));
    EXPECT_TRUE(MbxHasUserMetadata(&tracks));
}

TEST_F(UserMetadataTest, TrackHeaderVersionComesFromTheRecord) {
    const MbxMetadataTrackHeader header = {1, 0x1020304, 0x5060708, 65535};
    MbxMthdBox box = {};
    ASSERT_EQ(MbxBuildMthd(context, &options, &header, &box), MBX_OK);
    EXPECT_EQ(MbxWriteMthdBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000028 'MTHD' 01000000 0000000001020304 0000000005060708 0000FFFF"
                                 "00000000 00000000"));
}

TEST_F(UserMetadataTest, TrackTimesAbove32BitsAreRefusedWhateverTheMode) {
    MbxMetadataTrack track = {};
    EXPECT_EQ(MbxSetMetadataTrackTimes(&track, 64, UINT32_MAX, 1ULL << 32), MBX_OK);
    EXPECT_EQ(track.header.creationTime, UINT32_MAX);
    EXPECT_EQ(track.header.modificationTime, 0U);
    EXPECT_EQ(MbxSetMetadataTrackTimes(&track, 128, 1ULL << 32, 5), MBX_OK);
    EXPECT_EQ(track.header.modificationTime, 5U);
    EXPECT_EQ(MbxSetMetadataTrackTimes(&track, 64, 1ULL << 32, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetMetadataTrackTimes(&track, 128, 0, 1ULL << 32), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetMetadataTrackTimes(&track, 63, 1ULL << 32, 1ULL << 32), MBX_OK);
    EXPECT_EQ(track.header.creationTime, UINT32_MAX);
}

}  // namespace
