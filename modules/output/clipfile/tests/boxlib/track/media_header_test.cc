#include "boxlib/track/media_header.h"

#include "boxlib/support/registry.h"

namespace {

MbxMediaInformation informationOf(uint32_t code) {
    return {.code = code, .graphicsMode = 0x24, .opcolor = {0x8000, 0x4000, 0x2000}, .balance = -256};
}

using Builder = MbxStatus (*)(MbxContext*, const MbxOptions*, const MbxMediaInformation*,
                              MbxMediaInformationBox*);
using Writer = MbxStatus (*)(MbxContext*, const MbxOptions*, MbxFile*, uint64_t,
                             const MbxMediaInformationBox*, uint64_t*, uint64_t*);
using PayloadWriter = MbxStatus (*)(MbxContext*, MbxFile*, uint64_t, const MbxMediaInformationBox*, uint64_t*,
                                    uint64_t*);
using Release = MbxStatus (*)(MbxContext*, MbxMediaInformationBox*);

BoxRegistration registerHeader(const char* name, uint32_t code, const char* text, const char* clause,
                               Bytes golden, Builder build, Writer write, Release release) {
    return RegisterBox<MbxMediaInformationBox>(
        {.name = name,
         .code = text,
         .parents = "minf",
         .clause = clause,
         .presence = Presence::kMandatory,
         .golden = std::move(golden),
         .build =
             [build, code](MbxContext* context, const MbxOptions* options, MbxMediaInformationBox* box) {
                 const MbxMediaInformation information = informationOf(code);
                 return build(context, options, &information, box);
             },
         .write = write,
         .free = release});
}

const Bytes kVmhd =
    Hex("00000014 'vmhd'"
        "00 000001"         // version, flags
        "0024"              // graphicsmode
        "8000 4000 2000");  // opcolor
const Bytes kSmhd =
    Hex("00000010 'smhd'"
        "00 000000"  // version, flags
        "FF00"       // balance
        "0000");     // reserved
const Bytes kSthd = Hex("0000000C 'sthd' 00 000000");
const Bytes kNmhd = Hex("0000000C 'nmhd' 00 000000");

const BoxRegistration kRows[] = {
    registerHeader("Vmhd", MbxCode("vmhd"), "vmhd", "ISO/IEC 14496-12 12.1.2", kVmhd, MbxBuildVmhd,
                   MbxWriteVmhdBox, MbxFreeVmhd),
    registerHeader("Smhd", MbxCode("smhd"), "smhd", "ISO/IEC 14496-12 12.2.2", kSmhd, MbxBuildSmhd,
                   MbxWriteSmhdBox, MbxFreeSmhd),
    registerHeader("Sthd", MbxCode("sthd"), "sthd", "ISO/IEC 14496-12 12.6.2", kSthd, MbxBuildSthd,
                   MbxWriteSthdBox, MbxFreeSthd),
    registerHeader("Nmhd", MbxCode("nmhd"), "nmhd", "ISO/IEC 14496-12 8.4.5.2", kNmhd, MbxBuildNmhd,
                   MbxWriteNmhdBox, MbxFreeNmhd),
};

class MediaHeaderTest : public BoxTest {};

TEST_F(MediaHeaderTest, DispatcherWritesTheHeaderOfTheCode) {
    const struct {
        uint32_t code;
        Bytes bytes;
    } kCases[] = {{MbxCode("vmhd"), kVmhd},
                  {MbxCode("smhd"), kSmhd},
                  {MbxCode("sthd"), kSthd},
                  {MbxCode("nmhd"), kNmhd}};
    for (const auto& c : kCases) {
        const MbxMediaInformation information = informationOf(c.code);
        MbxMediaInformationBox box = {};
        MemoryFile target;
        ASSERT_EQ(MbxMakeMediaInformation(context, &options, &information, &box), MBX_OK);
        EXPECT_EQ(MbxWriteMediaInformation(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        EXPECT_BYTES(target.bytes, c.bytes);
    }
}

TEST_F(MediaHeaderTest, UnknownCodeIsABrokenInvariant) {
    const MbxMediaInformation information = informationOf(MbxCode("hmhd"));
    MbxMediaInformationBox box = {};
    EXPECT_EQ(MbxMakeMediaInformation(context, &options, &information, &box), MBX_ERR_INTERNAL);
    box.values.code = MbxCode("hmhd");
    EXPECT_EQ(MbxWriteMediaInformation(context, &options, &file, 0, &box, nullptr, nullptr),
              MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxWriteMediaInformation(context, &options, &file, 0, nullptr, nullptr, nullptr),
              MBX_ERR_INVALID_ARG);
    EXPECT_TRUE(file.bytes.empty());
}

TEST_F(MediaHeaderTest, EachHeaderRefusesAnotherCode) {
    const struct {
        uint32_t code;
        Builder build;
        PayloadWriter write;
    } kHeaders[] = {{MbxCode("vmhd"), MbxBuildVmhd, MbxWriteVmhdPayload},
                    {MbxCode("smhd"), MbxBuildSmhd, MbxWriteSmhdPayload},
                    {MbxCode("sthd"), MbxBuildSthd, MbxWriteSthdPayload},
                    {MbxCode("nmhd"), MbxBuildNmhd, MbxWriteNmhdPayload}};
    for (const auto& header : kHeaders) {
        for (const auto& other : kHeaders) {
            const MbxMediaInformation information = informationOf(other.code);
            const MbxStatus expected = header.code == other.code ? MBX_OK : MBX_ERR_INTERNAL;
            MbxMediaInformationBox box = {};
            EXPECT_EQ(header.build(context, &options, &information, &box), expected);
            box.values.code = other.code;
            EXPECT_EQ(header.write(context, &file, 0, &box, nullptr, nullptr), expected);
        }
    }
}

}  // namespace
