#include "boxlib/movie/file.h"

#include "boxlib/support/registry.h"

namespace {

MbxBrand kBrands[] = {
    {MbxCode("ZQVC"), &kBrands[1]}, {MbxCode("mp42"), &kBrands[2]}, {MbxCode("iso2"), nullptr}};
const MbxFileType kFileType = {MbxCode("ZQVC"), 0x01001FFF, {&kBrands[0], &kBrands[2]}};

const Bytes kFtyp =
    Hex("0000001C 'ftyp'"  // size, type
        "'ZQVC'"           // major_brand
        "01001FFF"         // minor_version
        "'ZQVC'"           // compatible_brands
        "'mp42'"
        "'iso2'");

const BoxRegistration kFtypRow = RegisterBox<MbxFtypBox>(
    {.name = "Ftyp",
     .code = "ftyp",
     .parents = "file",
     .clause = "ISO/IEC 14496-12 4.3",
     .presence = Presence::kMandatory,
     .golden = kFtyp,
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxFtypBox* box) { return MbxBuildFtyp(context, options, &kFileType, box); },
     .write =
         [](MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
            const MbxFtypBox* box, uint64_t* written, uint64_t* accumulated) {
             return MbxWriteFtypBox(context, options, MBX_SELECT_FTYP, file, position, box, written,
                                    accumulated);
         },
     .free = MbxFreeFtyp});

class FileBoxTest : public BoxTest {};

TEST_F(FileBoxTest, SelectorWritesASegmentTypeBox) {
    MbxFtypBox box = {};
    ASSERT_EQ(MbxBuildFtyp(context, &options, &kFileType, &box), MBX_OK);
    EXPECT_EQ(MbxWriteFtypBox(context, &options, 1, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000001C 'styp' 'ZQVC' 01001FFF 'ZQVC' 'mp42' 'iso2'"));
}

TEST_F(FileBoxTest, UnknownSelectorIsABrokenInvariant) {
    MbxFtypBox box = {};
    ASSERT_EQ(MbxBuildFtyp(context, &options, &kFileType, &box), MBX_OK);
    EXPECT_EQ(MbxWriteFtypBox(context, &options, 2, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_TRUE(file.bytes.empty());
}

TEST_F(FileBoxTest, WithoutCompatibleBrandsTheBoxHasItsTwoWords) {
    const MbxFileType bare = {MbxCode("isom"), 1, {}};
    MbxFtypBox box = {};
    ASSERT_EQ(MbxBuildFtyp(context, &options, &bare, &box), MBX_OK);
    EXPECT_EQ(MbxWriteFtypBox(context, &options, 0, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000010 'ftyp' 'isom' 00000001"));
}

TEST_F(FileBoxTest, BuildRefusesNullArguments) {
    MbxFtypBox box = {};
    EXPECT_EQ(MbxBuildFtyp(nullptr, &options, &kFileType, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildFtyp(context, nullptr, &kFileType, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildFtyp(context, &options, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildFtyp(context, &options, &kFileType, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
