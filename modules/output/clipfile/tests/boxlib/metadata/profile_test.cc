#include "boxlib/metadata/profile.h"

#include "boxlib/support/registry.h"

namespace {

MbxProfileEntry entryOf(uint32_t code) {
    return {code, {0x101, 0x102, 0x103, 0x104, 0x105, 0x106, 0x107, 0x108, 0x109, 0x10A}, nullptr};
}

const Bytes kFprf =
    Hex("00000014 'FPRF'"
        "00000000"    // version, flags
        "20000000"    // format
        "00000000");  // reserved

const Bytes kAprf =
    Hex("0000002C 'APRF'"
        "00000000"  // version, flags
        "00000101 00000102 00000103 00000104 00000105 00000106 00000107 00000108");

const Bytes kVprf =
    Hex("00000034 'VPRF'"
        "00000000"  // version, flags
        "00000101 00000102 00000103 00000104 00000105 00000106 00000107 00000108 00000109"
        "0000010A");

const Bytes kBprf =
    Hex("00000018 'BPRF'"
        "00000000"  // version, flags
        "00000101 00000102 00000103");

const Bytes kPprf =
    Hex("00000018 'PPRF'"
        "00000000"  // version, flags
        "00000101 00000102 00000103");

uint8_t kExtraBytes[] = {0xDE, 0xAD, 0xBE};
const MbxProfileExtra kVideoExtra = {MbxCode("VPRF"), {7, 8}, {kExtraBytes, 3}, nullptr};

const Bytes kPrex =
    Hex("0000001B 'PREX'"
        "00000000"  // version, flags
        "'VPRF'"    // sub_type
        "00000007 00000008"
        "DEADBE");  // data

const Bytes kUuid = Hex("50524F46 21D24FCE BB88695C FAC9C740");

// A profile with one entry of each code and one extra.
struct WholeProfile {
    MbxProfileEntry entries[4] = {entryOf(MbxCode("APRF")), entryOf(MbxCode("VPRF")),
                                  entryOf(MbxCode("BPRF")), entryOf(MbxCode("PPRF"))};
    MbxProfileExtra extra = kVideoExtra;
    MbxProfile profile = {0x20000000, {}, {}};

    WholeProfile() {
        for (MbxProfileEntry& entry : entries) MbxListAppend(&profile.entries, &entry);
        MbxListAppend(&profile.extras, &extra);
    }
};

const BoxRegistration kRows[] = {
    RegisterBox<MbxProfBox>(
        {.name = "Prof",
         .code = "uuid",
         .parents = "file",
         .clause = "own: file profile",
         .presence = Presence::kMandatory,
         // 8 + 16 + 8 + 20 + 44 + 52 + 24 + 24 + 27 bytes
         .golden = Hex("000000DF 'uuid'") + kUuid +
                   Hex("00000000"     // version, flags
                       "00000006") +  // entry_count
                   kFprf +
                   kAprf + kVprf + kBprf + kPprf + kPrex,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxProfBox* box) {
                 WholeProfile whole;
                 // The box copies all but the extra's bytes, which it borrows.
                 whole.profile.extras = {const_cast<MbxProfileExtra*>(&kVideoExtra), nullptr};
                 return MbxBuildProf(context, options, &whole.profile, box);
             },
         .write = MbxWriteProfBox,
         .free = MbxFreeProf}),
    RegisterBox<MbxFprfBox>({.name = "Fprf",
                             .code = "FPRF",
                             .parents = "uuid PROF",
                             .clause = "own: file profile",
                             .presence = Presence::kMandatory,
                             .golden = kFprf,
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxFprfBox* box) {
                                     const MbxProfile profile = {0x20000000, {}, {}};
                                     return MbxBuildFprf(context, options, &profile, box);
                                 },
                             .write = MbxWriteFprfBox,
                             .free = MbxFreeFprf}),
    RegisterBox<MbxProfileEntryBox>(
        {.name = "Aprf",
         .code = "APRF",
         .parents = "uuid PROF",
         .clause = "own: audio profile",
         .presence = Presence::kMandatory,
         .golden = kAprf,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxProfileEntryBox* box) {
                 const MbxProfileEntry entry = entryOf(MbxCode("APRF"));
                 return MbxBuildAprf(context, options, &entry, box);
             },
         .write = MbxWriteAprfBox,
         .free = MbxFreeAprf}),
    RegisterBox<MbxProfileEntryBox>(
        {.name = "Vprf",
         .code = "VPRF",
         .parents = "uuid PROF",
         .clause = "own: video profile",
         .presence = Presence::kMandatory,
         .golden = kVprf,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxProfileEntryBox* box) {
                 const MbxProfileEntry entry = entryOf(MbxCode("VPRF"));
                 return MbxBuildVprf(context, options, &entry, box);
             },
         .write = MbxWriteVprfBox,
         .free = MbxFreeVprf}),
    RegisterBox<MbxProfileEntryBox>(
        {.name = "Bprf",
         .code = "BPRF",
         .parents = "uuid PROF",
         .clause = "own: book profile",
         .presence = Presence::kMandatory,
         .golden = kBprf,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxProfileEntryBox* box) {
                 const MbxProfileEntry entry = entryOf(MbxCode("BPRF"));
                 return MbxBuildBprf(context, options, &entry, box);
             },
         .write = MbxWriteBprfBox,
         .free = MbxFreeBprf}),
    RegisterBox<MbxProfileEntryBox>(
        {.name = "Pprf",
         .code = "PPRF",
         .parents = "uuid PROF",
         .clause = "own: packed data profile",
         .presence = Presence::kMandatory,
         .golden = kPprf,
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxProfileEntryBox* box) {
                 const MbxProfileEntry entry = entryOf(MbxCode("PPRF"));
                 return MbxBuildPprf(context, options, &entry, box);
             },
         .write = MbxWritePprfBox,
         .free = MbxFreePprf}),
    RegisterBox<MbxPrexBox>(
        {.name = "Prex",
         .code = "PREX",
         .parents = "uuid PROF",
         .clause = "own: profile extension",
         .presence = Presence::kMandatory,
         .golden = kPrex,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxPrexBox* box) { return MbxBuildPrex(context, options, &kVideoExtra, box); },
         .write = MbxWritePrexBox,
         .free = MbxFreePrex}),
};

class ProfileTest : public BoxTest {
 protected:
    void write(const MbxProfile* profile) {
        MbxProfBox* box = nullptr;
        ASSERT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildProf(context, &options, profile, box), MBX_OK);
        EXPECT_EQ(MbxWriteProfBox(context, &options, &file, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(MbxFreeProf(context, box), MBX_OK);
    }
};

TEST_F(ProfileTest, OneAudioAndOneVideoProfileGiveAnEntryCountOfThree) {
    MbxProfileEntry video = entryOf(MbxCode("VPRF"));
    MbxProfileEntry audio = entryOf(MbxCode("APRF"));
    audio.next = &video;
    const MbxProfile profile = {0x30000000, {&audio, &video}, {}};
    write(&profile);
    ASSERT_GT(file.bytes.size(), 32U);
    // The count stands at payload offset 20, behind 8 bytes of header.
    EXPECT_BYTES(Bytes(file.bytes.begin() + 28, file.bytes.begin() + 32), Hex("00000003"));
    EXPECT_BYTES(file.bytes, Hex("00000094 'uuid'") + kUuid + Hex("00000000 00000003") +
                                 Hex("00000014 'FPRF' 00000000 30000000 00000000") + kAprf + kVprf);
}

TEST_F(ProfileTest, WithoutAProfileTheCountIsZeroAndNothingFollows) {
    write(nullptr);
    EXPECT_BYTES(file.bytes, Hex("00000020 'uuid'") + kUuid + Hex("00000000 00000000"));
}

TEST_F(ProfileTest, EntriesStandInListOrder) {
    MbxProfileEntry audio = entryOf(MbxCode("APRF"));
    MbxProfileEntry video = entryOf(MbxCode("VPRF"));
    video.next = &audio;
    const MbxProfile profile = {0x20000000, {&video, &audio}, {}};
    write(&profile);
    EXPECT_BYTES(file.bytes,
                 Hex("00000094 'uuid'") + kUuid + Hex("00000000 00000003") + kFprf + kVprf + kAprf);
}

TEST_F(ProfileTest, UnknownCodeInTheListIsABrokenInvariant) {
    MbxProfileEntry bad = entryOf(MbxCode("XPRF"));
    const MbxProfile profile = {0, {&bad, &bad}, {}};
    MbxProfBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    EXPECT_EQ(MbxBuildProf(context, &options, &profile, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeProf(context, box), MBX_OK);
}

TEST_F(ProfileTest, UnknownCodeInARecordIsABrokenInvariant) {
    MbxProfileEntryBox bad = {8, MbxCode("XPRF"), {}, nullptr};
    MbxFprfBox fprf = {8, 0};
    const MbxProfBox box = {8, &fprf, {&bad, &bad}, {}};
    EXPECT_EQ(MbxWriteProfBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
}

TEST_F(ProfileTest, EachEntryBoxRefusesAnotherCode) {
    const MbxProfileEntry video = entryOf(MbxCode("VPRF"));
    const MbxProfileEntry audio = entryOf(MbxCode("APRF"));
    MbxProfileEntryBox box = {};
    EXPECT_EQ(MbxBuildAprf(context, &options, &video, &box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxBuildVprf(context, &options, &audio, &box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxBuildBprf(context, &options, &audio, &box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxBuildPprf(context, &options, &audio, &box), MBX_ERR_INTERNAL);
    box.code = MbxCode("BPRF");
    EXPECT_EQ(MbxWriteAprfPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxWriteVprfPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxWritePprfPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
    box.code = MbxCode("PPRF");
    EXPECT_EQ(MbxWriteBprfPayload(context, &file, 0, &box, nullptr, nullptr), MBX_ERR_INTERNAL);
}

TEST_F(ProfileTest, ExtraOfAnotherTypeHasNoValues) {
    const MbxProfileExtra extra = {MbxCode("BPRF"), {7, 8}, {kExtraBytes, 2}, nullptr};
    MbxPrexBox box = {};
    ASSERT_EQ(MbxBuildPrex(context, &options, &extra, &box), MBX_OK);
    EXPECT_EQ(MbxWritePrexBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000012 'PREX' 00000000 'BPRF' DEAD"));
}

TEST_F(ProfileTest, ExtraOfAnAudioProfileHasValuesAndNeedsNoData) {
    const MbxProfileExtra extra = {MbxCode("APRF"), {7, 8}, {nullptr, 0}, nullptr};
    MbxPrexBox box = {};
    ASSERT_EQ(MbxBuildPrex(context, &options, &extra, &box), MBX_OK);
    EXPECT_EQ(MbxWritePrexBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000018 'PREX' 00000000 'APRF' 00000007 00000008"));
}

}  // namespace
