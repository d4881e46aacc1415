#include "boxlib/item/movie_items.h"

#include "boxlib/support/entry_fixture.h"

namespace {

uint8_t kApid[] = {'u', 'r', 'n', ':', 'x', 0};
const MbxAinfParams kAinf = {0x020304, 0x68646563, BufferOf(kApid)};
constexpr MbxIodsParams kIods = {1, 0, {0xFF, 0xFE, 0x29, 0x15, 0xFD}, 0x01020304};

const BoxRegistration kRows[] = {
    RegisterBox<MbxAinfBox>(
        {.name = "Ainf",
         .code = "ainf",
         .parents = "moov",
         .clause = "Common File Format, Asset Information Box",
         .presence = Presence::kOptional,
         .golden = Hex("00000016 'ainf'"
                       "00 020304"     // version, flags
                       "68646563"      // profile_version
                       "'urn:x' 00"),  // APID
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxAinfBox* box) { return MbxBuildAinf(context, options, &kAinf, box); },
         .write = MbxWriteAinfBox,
         .free = MbxFreeAinf}),
    RegisterBox<MbxIodsBox>(
        {.name = "Iods",
         .code = "iods",
         .parents = "moov",
         .clause = "ISO/IEC 14496-14 5.1",
         .presence = Presence::kOptional,
         .golden = Hex("0000001B 'iods'"
                       "00000000"        // version, flags
                       "10 0D"           // MP4_IOD, 13 bytes
                       "004F"            // ObjectDescriptorID 1, no URL, no inline, reserved
                       "FF FE 29 15 FD"  // profiles and levels
                       "0E 04"           // ES_ID_Inc, 4 bytes
                       "01020304"),      // Track_ID
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxIodsBox* box) { return MbxBuildIods(context, options, &kIods, box); },
         .write = MbxWriteIodsBox,
         .free = MbxFreeIods}),
    RegisterBox<MbxFreeSpaceBox>(
        {.name = "Free",
         .code = "free",
         .parents = "moov",
         .clause = "ISO/IEC 14496-12 8.1.2",
         .presence = Presence::kOptional,
         .golden = Hex("0000000D 'free'"
                       "0000000000"),  // data
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxFreeSpaceBox* box) { return MbxBuildFree(context, options, 5, box); },
         .write = MbxWriteFreeBox,
         .free = MbxFreeFree}),
};

class MovieItemsTest : public BoxTest {
 protected:
    Bytes writeIods(const MbxIodsParams& params) {
        return WriteBuiltBox<MbxIodsBox>(
            context, &options, [&](MbxIodsBox* box) { return MbxBuildIods(context, &options, &params, box); },
            MbxWriteIodsBox, MbxFreeIods);
    }
};

TEST_F(MovieItemsTest, FreeOf0BytesIsNotBuilt) {
    MbxFreeSpaceBox* box = nullptr;
    EXPECT_EQ(MbxMakeFree(context, &options, 0, &box), MBX_OK);
    EXPECT_EQ(box, nullptr);
    ASSERT_EQ(MbxMakeFree(context, &options, 1, &box), MBX_OK);
    ASSERT_NE(box, nullptr);
    EXPECT_EQ(box->size, 9U);
    EXPECT_EQ(MbxFreeFree(context, box), MBX_OK);
}

TEST_F(MovieItemsTest, FreeOf524289BytesDoesTwoWritesAndReportsThemAll) {
    MbxFreeSpaceBox* box = nullptr;
    ASSERT_EQ(MbxMakeFree(context, &options, 524289, &box), MBX_OK);
    uint64_t written = 0;
    EXPECT_EQ(MbxWriteFreeBox(context, &options, &file, 0, box, &written, nullptr), MBX_OK);
    EXPECT_EQ(file.writeSizes, std::vector<uint64_t>({8, 524288, 1}));
    EXPECT_EQ(written, 8 + 524289U);
    EXPECT_EQ(box->size, 8 + 524289U);
    EXPECT_TRUE(file.bytes == Hex("00080009 'free'") + Repeat(0, 524289));
    EXPECT_EQ(MbxFreeFree(context, box), MBX_OK);
}

TEST_F(MovieItemsTest, InitialObjectDescriptorPacksItsFirstWord) {
    MbxIodsParams params = kIods;
    params.objectDescriptorId = 0x3FF;
    params.includeInlineProfileLevelFlag = 1;
    const Bytes written = writeIods(params);
    ASSERT_EQ(written.size(), 27U);
    EXPECT_BYTES(Bytes(written.begin() + 14, written.begin() + 16), Hex("FFDF"));
}

TEST_F(MovieItemsTest, AinfWithoutATextIsAHead) {
    const MbxAinfParams params = {0xFF000001, 2, {}};
    EXPECT_BYTES(
        WriteBuiltBox<MbxAinfBox>(
            context, &options, [&](MbxAinfBox* box) { return MbxBuildAinf(context, &options, &params, box); },
            MbxWriteAinfBox, MbxFreeAinf),
        Hex("00000010 'ainf' 00 000001 00000002"));
}

TEST_F(MovieItemsTest, BuildersRefuseNullArguments) {
    MbxAinfBox ainf = {};
    EXPECT_EQ(MbxBuildAinf(context, &options, nullptr, &ainf), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAinf(nullptr, &options, &kAinf, &ainf), MBX_ERR_INVALID_ARG);
    MbxIodsBox iods = {};
    EXPECT_EQ(MbxBuildIods(context, nullptr, &kIods, &iods), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildIods(context, &options, nullptr, &iods), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildFree(context, &options, 1, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(MovieItemsTest, ParametersAreReleasedWithAllThatTheyOwn) {
    MbxAinfParams* ainf = nullptr;
    ASSERT_EQ(MbxNew(context, &ainf), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 0, &ainf->apid, kApid, sizeof(kApid)), MBX_OK);
    EXPECT_EQ(MbxFreeAinfParams(context, ainf), MBX_OK);
    MbxIodsParams* iods = nullptr;
    ASSERT_EQ(MbxNew(context, &iods), MBX_OK);
    EXPECT_EQ(MbxFreeIodsParams(context, iods), MBX_OK);
    EXPECT_EQ(MbxFreeAinfParams(context, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreeIodsParams(nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
