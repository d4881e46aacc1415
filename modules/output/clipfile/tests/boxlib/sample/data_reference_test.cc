#include "boxlib/sample/data_reference.h"

#include "boxlib/support/registry.h"

namespace {

char kFolder[] = "file:///clips";
char kName[] = "urn:x";

// The texts are held with their terminators, as the records hold them.
MbxDataEntry urlOf(char* location, uint64_t size) {
    return {MbxCode("url "), {}, {reinterpret_cast<uint8_t*>(location), size}, nullptr};
}

const MbxDataEntry kSelf = urlOf(nullptr, 0);
const MbxDataEntry kUrn = {MbxCode("urn "),
                           {reinterpret_cast<uint8_t*>(kName), sizeof(kName)},
                           {reinterpret_cast<uint8_t*>(kFolder), sizeof(kFolder)},
                           nullptr};

// Lists that the boxes borrow: a self-contained entry, then a name.
struct Lists {
    MbxDataEntry first = kSelf;
    MbxDataEntry second = kUrn;
    MbxList<MbxDataEntry> list = {&first, &second};

    Lists() { first.next = &second; }
};

const MbxList<MbxDataEntry>* entries() {
    static Lists lists;
    return &lists.list;
}

const Bytes kUrlBytes =
    Hex("0000000C 'url '"
        "00 000001");  // version, flags: the media is in this file

const Bytes kUrnBytes =
    Hex("00000020 'urn '"
        "00 000000"             // version, flags
        "'urn:x' 00"            // name
        "'file:///clips' 00");  // location

const Bytes kDrefBytes = Hex("0000003C 'dref'"
                             "00 000000"    // version, flags
                             "00000002") +  // entry_count
                         kUrlBytes +
                         kUrnBytes;

const BoxRegistration kRows[] = {
    RegisterBox<MbxDinfBox>(
        {.name = "Dinf",
         .code = "dinf",
         .parents = "minf, MTSM",
         .clause = "ISO/IEC 14496-12 8.7.1",
         .presence = Presence::kMandatory,
         .golden = Hex("00000044 'dinf'") + kDrefBytes,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDinfBox* box) { return MbxBuildDinf(context, options, entries(), box); },
         .write = MbxWriteDinfBox,
         .free = MbxFreeDinf}),
    RegisterBox<MbxDrefBox>(
        {.name = "Dref",
         .code = "dref",
         .parents = "dinf",
         .clause = "ISO/IEC 14496-12 8.7.2",
         .presence = Presence::kMandatory,
         .golden = kDrefBytes,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDrefBox* box) { return MbxBuildDref(context, options, entries(), box); },
         .write = MbxWriteDrefBox,
         .free = MbxFreeDref}),
    RegisterBox<MbxDataEntryBox>(
        {.name = "Url",
         .code = "url ",
         .parents = "dref",
         .clause = "ISO/IEC 14496-12 8.7.2",
         .presence = Presence::kMandatory,
         .golden = kUrlBytes,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDataEntryBox* box) { return MbxBuildUrl(context, options, &kSelf, box); },
         .write = MbxWriteUrlBox,
         .free = MbxFreeUrl}),
    RegisterBox<MbxDataEntryBox>(
        {.name = "Urn",
         .code = "urn ",
         .parents = "dref",
         .clause = "ISO/IEC 14496-12 8.7.2",
         .presence = Presence::kMandatory,
         .golden = kUrnBytes,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDataEntryBox* box) { return MbxBuildUrn(context, options, &kUrn, box); },
         .write = MbxWriteUrnBox,
         .free = MbxFreeUrn}),
};

class DataReferenceTest : public BoxTest {
 protected:
    void TearDown() override {
        EXPECT_EQ(MbxFreeList(context, &list, MbxFreeDataEntry), MBX_OK);
        BoxTest::TearDown();
    }

    MbxStatus add(uint32_t code, const char* name, const char* location) {
        const MbxDataEntryParams params = {code, name, name != nullptr ? strlen(name) : 0, location,
                                           location != nullptr ? strlen(location) : 0};
        return MbxAddDataEntry(context, &list, &params, &index);
    }

    Bytes write() {
        MbxDrefBox* box = nullptr;
        EXPECT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildDref(context, &options, &list, box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteDrefBox(context, &options, &target, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(MbxFreeDref(context, box), MBX_OK);
        return target.bytes;
    }

    MbxList<MbxDataEntry> list = {};
    uint32_t index = 0;
};

TEST_F(DataReferenceTest, UrlWithAnEmptyLocationHasFlags1AndAPayloadOfFourBytes) {
    ASSERT_EQ(add(MbxCode("url "), nullptr, nullptr), MBX_OK);
    EXPECT_EQ(index, 1U);
    EXPECT_BYTES(write(), Hex("0000001C 'dref' 00000000 00000001  0000000C 'url ' 00000001"));
}

TEST_F(DataReferenceTest, UrlWithALocationOfATerminatorAloneCountsAsEmpty) {
    for (const uint64_t length : {1U, 2U}) {
        const MbxDataEntryParams params = {MbxCode("url "), nullptr, 0, "\0x", length};
        ASSERT_EQ(MbxAddDataEntry(context, &list, &params, &index), MBX_OK);
    }
    EXPECT_BYTES(write(), Hex("00000028 'dref' 00000000 00000002"
                              "0000000C 'url ' 00000001"
                              "0000000C 'url ' 00000001"));
}

TEST_F(DataReferenceTest, UrnWithALocationOfATerminatorAloneStoresIt) {
    const MbxDataEntryParams params = {MbxCode("urn "), "n", 1, "", 1};
    ASSERT_EQ(MbxAddDataEntry(context, &list, &params, &index), MBX_OK);
    EXPECT_BYTES(write(), Hex("0000001F 'dref' 00000000 00000001  0000000F 'urn ' 00000000 'n' 00 00"));
}

TEST_F(DataReferenceTest, UrlWithALocationHasFlags0AndATerminator) {
    ASSERT_EQ(add(MbxCode("url "), nullptr, "a/b"), MBX_OK);
    EXPECT_BYTES(write(), Hex("00000020 'dref' 00000000 00000001  00000010 'url ' 00000000 'a/b' 00"));
}

TEST_F(DataReferenceTest, UrnWithAnEmptyNameStoresOneTerminator) {
    ASSERT_EQ(add(MbxCode("urn "), nullptr, "a/b"), MBX_OK);
    EXPECT_BYTES(write(), Hex("00000021 'dref' 00000000 00000001  00000011 'urn ' 00000000 00 'a/b' 00"));
}

TEST_F(DataReferenceTest, EntriesStandInOrderOfAddition) {
    ASSERT_EQ(add(MbxCode("urn "), "n", nullptr), MBX_OK);
    ASSERT_EQ(add(MbxCode("url "), nullptr, nullptr), MBX_OK);
    EXPECT_EQ(index, 2U);
    EXPECT_BYTES(write(), Hex("0000002A 'dref' 00000000 00000002"
                              "0000000E 'urn ' 00000000 'n' 00"
                              "0000000C 'url ' 00000001"));
}

TEST_F(DataReferenceTest, OtherCodesAreABrokenInvariant) {
    EXPECT_EQ(add(MbxCode("alis"), nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(list.first, nullptr);

    MbxDataEntry bad = {MbxCode("alis"), {}, {}, nullptr};
    const MbxList<MbxDataEntry> badList = {&bad, &bad};
    MbxDrefBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    EXPECT_EQ(MbxBuildDref(context, &options, &badList, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeDref(context, box), MBX_OK);

    MbxDataEntryBox badBox = {8, MbxCode("alis"), &bad, nullptr};
    const MbxDrefBox dref = {8, {&badBox, &badBox}};
    EXPECT_EQ(MbxWriteDrefBox(context, &options, &file, 0, &dref, nullptr, nullptr), MBX_ERR_INTERNAL);
}

TEST_F(DataReferenceTest, EachEntryBoxRefusesTheOtherCode) {
    MbxDataEntryBox box = {};
    EXPECT_EQ(MbxBuildUrl(context, &options, &kUrn, &box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxBuildUrn(context, &options, &kSelf, &box), MBX_ERR_INTERNAL);
    box.code = MbxCode("urn ");
    EXPECT_EQ(MbxWriteUrlPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
    box.code = MbxCode("url ");
    EXPECT_EQ(MbxWriteUrnPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
}

TEST_F(DataReferenceTest, AddRefusesALengthWithoutAText) {
    const MbxDataEntryParams noLocation = {MbxCode("url "), nullptr, 0, nullptr, 5};
    EXPECT_EQ(MbxAddDataEntry(context, &list, &noLocation, &index), MBX_ERR_INVALID_ARG);
    const MbxDataEntryParams noName = {MbxCode("urn "), nullptr, 5, nullptr, 0};
    EXPECT_EQ(MbxAddDataEntry(context, &list, &noName, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(list.first, nullptr);
}

TEST_F(DataReferenceTest, AddRefusesNullArguments) {
    const MbxDataEntryParams params = {MbxCode("url "), nullptr, 0, nullptr, 0};
    EXPECT_EQ(MbxAddDataEntry(nullptr, &list, &params, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataEntry(context, nullptr, &params, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataEntry(context, &list, nullptr, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataEntry(context, &list, &params, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(DataReferenceTest, RefusedAllocationLeavesTheListAsItWas) {
    for (uint64_t n = 1; n <= 3; n++) {  // the entry, its name, its location
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(add(MbxCode("urn "), "name", "place"), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(list.first, nullptr);
    }
    EXPECT_EQ(add(MbxCode("urn "), "name", "place"), MBX_OK);
}

}  // namespace
