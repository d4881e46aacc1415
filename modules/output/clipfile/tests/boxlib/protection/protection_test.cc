#include "boxlib/protection/protection.h"

#include "boxlib/support/entry_fixture.h"

namespace {

MbxFrmaParams kFrma = {MbxCode("avc1")};
uint8_t kUrl[] = {'u', 'r', 'l', 0};
MbxSchmParams kSchm = {MbxCode("cenc"), 0x00010000, BufferOf(kUrl)};
MbxTencParams kTenc = {1,
                       8,
                       {0x10, 0x11, 0x12, 0x13, 0x14, 0x15, 0x16, 0x17,  //
                        0x18, 0x19, 0x1A, 0x1B, 0x1C, 0x1D, 0x1E, 0x1F}};
MbxSchiParams kSchi = {&kTenc};
const MbxSinfParams kSinf = {&kFrma, &kSchm, &kSchi, {}, nullptr};

MbxKeyId kSecondKey = {{0x20, 0x21, 0x22, 0x23, 0x24, 0x25, 0x26, 0x27,  //
                        0x28, 0x29, 0x2A, 0x2B, 0x2C, 0x2D, 0x2E, 0x2F},
                       nullptr};
MbxKeyId kFirstKey = {{0x10, 0x11, 0x12, 0x13, 0x14, 0x15, 0x16, 0x17,  //
                       0x18, 0x19, 0x1A, 0x1B, 0x1C, 0x1D, 0x1E, 0x1F},
                      &kSecondKey};
uint8_t kData[] = {0xDA, 0x7A};
const MbxPsshParams kPssh = {1,
                             {0x50, 0x51, 0x52, 0x53, 0x54, 0x55, 0x56, 0x57,  //
                              0x58, 0x59, 0x5A, 0x5B, 0x5C, 0x5D, 0x5E, 0x5F},
                             {&kFirstKey, &kSecondKey},
                             BufferOf(kData),
                             nullptr};

const Bytes kFrmaGolden =
    Hex("0000000C 'frma'"
        "'avc1'");  // data_format

const Bytes kSchmGolden =
    Hex("00000018 'schm'"
        "00 000001"   // version, flags: there is a URL
        "'cenc'"      // scheme_type
        "00010000"    // scheme_version
        "'url' 00");  // scheme_uri

const Bytes kTencGolden =
    Hex("00000020 'tenc'"
        "00000000"                            // version, flags
        "000001"                              // default_IsEncrypted
        "08"                                  // default_IV_size
        "101112131415161718191A1B1C1D1E1F");  // default_KID

const Bytes kSchiGolden = Hex("00000028 'schi'") + kTencGolden;

const BoxRegistration kRows[] = {
    RegisterBox<MbxFrmaBox>(
        {.name = "Frma",
         .code = "frma",
         .parents = "sinf",
         .clause = "ISO/IEC 14496-12 8.12.2",
         .presence = Presence::kMandatory,
         .golden = kFrmaGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxFrmaBox* box) { return MbxBuildFrma(context, options, &kFrma, box); },
         .write = MbxWriteFrmaBox,
         .free = MbxFreeFrma}),
    RegisterBox<MbxSchmBox>(
        {.name = "Schm",
         .code = "schm",
         .parents = "sinf",
         .clause = "ISO/IEC 14496-12 8.12.5",
         .presence = Presence::kOptional,
         .golden = kSchmGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxSchmBox* box) { return MbxBuildSchm(context, options, &kSchm, box); },
         .write = MbxWriteSchmBox,
         .free = MbxFreeSchm}),
    RegisterBox<MbxTencBox>(
        {.name = "Tenc",
         .code = "tenc",
         .parents = "schi",
         .clause = "ISO/IEC 23001-7 8.2",
         .presence = Presence::kMandatory,
         .golden = kTencGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxTencBox* box) { return MbxBuildTenc(context, options, &kTenc, box); },
         .write = MbxWriteTencBox,
         .free = MbxFreeTenc}),
    RegisterBox<MbxSchiBox>(
        {.name = "Schi",
         .code = "schi",
         .parents = "sinf",
         .clause = "ISO/IEC 14496-12 8.12.6",
         .presence = Presence::kOptional,
         .golden = kSchiGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxSchiBox* box) { return MbxBuildSchi(context, options, &kSchi, box); },
         .write = MbxWriteSchiBox,
         .free = MbxFreeSchi}),
    RegisterBox<MbxSinfBox>(
        {.name = "Sinf",
         .code = "sinf",
         .parents = "mp4v avc1 hvc1 mp4a rtmd and entries of kind 10",
         .clause = "ISO/IEC 14496-12 8.12.1",
         .presence = Presence::kMandatory,
         .golden = Hex("00000054 'sinf'") + kFrmaGolden + kSchmGolden + kSchiGolden,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxSinfBox* box) { return MbxBuildSinf(context, options, &kSinf, box); },
         .write = MbxWriteSinfBox,
         .free = MbxFreeSinf}),
    RegisterBox<MbxPsshBox>(
        {.name = "Pssh",
         .code = "pssh",
         .parents = "moov",
         .clause = "ISO/IEC 23001-7 8.1",
         .presence = Presence::kMandatory,
         .golden = Hex("00000046 'pssh'"
                       "01 000000"                         // version, flags
                       "505152535455565758595A5B5C5D5E5F"  // SystemID
                       "00000002"                          // KID_count
                       "101112131415161718191A1B1C1D1E1F"  // KID
                       "202122232425262728292A2B2C2D2E2F"  // KID
                       "00000002"                          // DataSize
                       "DA7A"),                            // Data
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxPsshBox* box) { return MbxBuildPssh(context, options, &kPssh, box); },
         .write = MbxWritePsshBox,
         .free = MbxFreePssh}),
};

class ProtectionTest : public BoxTest {
 protected:
    Bytes writeSinf(const MbxSinfParams& params) {
        return WriteBuiltBox<MbxSinfBox>(
            context, &options, [&](MbxSinfBox* box) { return MbxBuildSinf(context, &options, &params, box); },
            MbxWriteSinfBox, MbxFreeSinf);
    }

    Bytes writePssh(const MbxPsshParams& params) {
        return WriteBuiltBox<MbxPsshBox>(
            context, &options, [&](MbxPsshBox* box) { return MbxBuildPssh(context, &options, &params, box); },
            MbxWritePsshBox, MbxFreePssh);
    }
};

TEST_F(ProtectionTest, PsshVersion0HasNoKeyIdsAndWritesADataSizeEvenForNoData) {
    MbxPsshParams params = kPssh;
    params.version = 0;
    params.data = {};
    EXPECT_BYTES(writePssh(params), Hex("00000020 'pssh' 00000000"
                                        "505152535455565758595A5B5C5D5E5F"
                                        "00000000"));
}

TEST_F(ProtectionTest, PsshVersion1WritesAKeyIdCountEvenForNoKeyIds) {
    MbxPsshParams params = kPssh;
    params.keyIds = {};
    EXPECT_BYTES(writePssh(params), Hex("00000026 'pssh' 01000000"
                                        "505152535455565758595A5B5C5D5E5F"
                                        "00000000 00000002 DA7A"));
}

TEST_F(ProtectionTest, PsshDataAbove32BitsOverflows) {
    MbxPsshParams params = kPssh;
    params.data.size = uint64_t{UINT32_MAX} + 1;  // only measured
    EXPECT_EQ(BuildStatus<MbxPsshBox>(
                  context, [&](MbxPsshBox* box) { return MbxBuildPssh(context, &options, &params, box); },
                  MbxFreePssh),
              MBX_ERR_OVERFLOW);
}

TEST_F(ProtectionTest, SinfNeedsNeitherSchmNorSchi) {
    MbxSinfParams params = {&kFrma, nullptr, nullptr, {}, nullptr};
    EXPECT_BYTES(writeSinf(params), Hex("00000014 'sinf'") + kFrmaGolden);
    params.schi = &kSchi;
    EXPECT_BYTES(writeSinf(params), Hex("0000003C 'sinf'") + kFrmaGolden + kSchiGolden);
}

TEST_F(ProtectionTest, SinfWithoutFrmaHoldsRawBytes) {
    const MbxSinfParams params = {nullptr, &kSchm, &kSchi, BufferOf(kData), nullptr};
    EXPECT_BYTES(writeSinf(params), Hex("0000000A 'sinf' DA7A"));
}

TEST_F(ProtectionTest, SchmWithoutAUrlHasNoFlags) {
    const MbxSchmParams params = {MbxCode("cenc"), 0x00010000, {}};
    EXPECT_BYTES(
        WriteBuiltBox<MbxSchmBox>(
            context, &options, [&](MbxSchmBox* box) { return MbxBuildSchm(context, &options, &params, box); },
            MbxWriteSchmBox, MbxFreeSchm),
        Hex("00000014 'schm' 00000000 'cenc' 00010000"));
}

TEST_F(ProtectionTest, SchiWithoutTencIsRefused) {
    const MbxSchiParams params = {nullptr};
    EXPECT_EQ(BuildStatus<MbxSchiBox>(
                  context, [&](MbxSchiBox* box) { return MbxBuildSchi(context, &options, &params, box); },
                  MbxFreeSchi),
              MBX_ERR_INVALID_ARG);
    MbxSchiBox box = {};
    EXPECT_EQ(MbxWriteSchiBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ProtectionTest, TencKeepsTheLow24BitsOfItsFlag) {
    MbxTencParams params = kTenc;
    params.isEncrypted = 0xFF123456;
    const Bytes written = WriteBuiltBox<MbxTencBox>(
        context, &options, [&](MbxTencBox* box) { return MbxBuildTenc(context, &options, &params, box); },
        MbxWriteTencBox, MbxFreeTenc);
    ASSERT_EQ(written.size(), 32U);
    EXPECT_BYTES(Bytes(written.begin() + 12, written.begin() + 16), Hex("123456 08"));
}

TEST_F(ProtectionTest, BuildersRefuseNullArguments) {
    MbxFrmaBox frma = {};
    EXPECT_EQ(MbxBuildFrma(context, &options, nullptr, &frma), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildFrma(nullptr, &options, &kFrma, &frma), MBX_ERR_INVALID_ARG);
    MbxSchmBox schm = {};
    EXPECT_EQ(MbxBuildSchm(context, &options, nullptr, &schm), MBX_ERR_INVALID_ARG);
    MbxTencBox tenc = {};
    EXPECT_EQ(MbxBuildTenc(context, nullptr, &kTenc, &tenc), MBX_ERR_INVALID_ARG);
    MbxSchiBox schi = {};
    EXPECT_EQ(MbxBuildSchi(context, &options, nullptr, &schi), MBX_ERR_INVALID_ARG);
    MbxSinfBox sinf = {};
    EXPECT_EQ(MbxBuildSinf(context, &options, nullptr, &sinf), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildPssh(context, &options, &kPssh, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ProtectionTest, ParametersAreReleasedWithAllThatTheyOwn) {
    MbxSinfParams* sinf = nullptr;
    ASSERT_EQ(MbxNew(context, &sinf), MBX_OK);
    ASSERT_EQ(MbxNew(context, &sinf->frma), MBX_OK);
    ASSERT_EQ(MbxNew(context, &sinf->schm), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 0, &sinf->schm->url, kUrl, sizeof(kUrl)), MBX_OK);
    ASSERT_EQ(MbxNew(context, &sinf->schi), MBX_OK);
    ASSERT_EQ(MbxNew(context, &sinf->schi->tenc), MBX_OK);
    ASSERT_EQ(MbxBufferAssign(context, 0, &sinf->raw, kData, sizeof(kData)), MBX_OK);
    EXPECT_EQ(MbxFreeSinfParams(context, sinf), MBX_OK);

    MbxPsshParams* pssh = nullptr;
    ASSERT_EQ(MbxNew(context, &pssh), MBX_OK);
    MbxKeyId* keyId = nullptr;
    ASSERT_EQ(MbxNew(context, &keyId), MBX_OK);
    MbxListAppend(&pssh->keyIds, keyId);
    ASSERT_EQ(MbxBufferAssign(context, 0, &pssh->data, kData, sizeof(kData)), MBX_OK);
    EXPECT_EQ(MbxFreePsshParams(context, pssh), MBX_OK);

    EXPECT_EQ(MbxFreeSinfParams(context, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreePsshParams(nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
