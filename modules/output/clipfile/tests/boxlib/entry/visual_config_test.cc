#include "boxlib/entry/visual_config.h"

#include "boxlib/support/entry_fixture.h"

namespace {

constexpr Mbx3stpParams kStep = {1, 0x15, {0x0102, 0x0304, 0x0506}};

uint8_t kRaw[] = {0xDE, 0xAD, 0xBE};
const MbxBuffer kData = BufferOf(kRaw);

const BoxRegistration kRows[] = {
    RegisterBox<Mbx3stpBox>(
        {.name = "3stp",
         .code = "3STP",
         .parents = "entries of kind 9",
         .clause = "own: stereo mode",
         .presence = Presence::kMandatory,
         .golden = Hex("0000000F '3STP'"
                       "35"                // mode 001, value 10101
                       "0102 0304 0506"),  // details of modes 1 and 2
         .build = [](MbxContext* context, const MbxOptions* options,
                     Mbx3stpBox* box) { return MbxBuild3stp(context, options, &kStep, box); },
         .write = MbxWrite3stpBox,
         .free = MbxFree3stp}),
    RegisterBox<Mbx3ddsBox>(
        {.name = "3dds",
         .code = "uuid",
         .parents = "mp4v avc1 hvc1",
         .clause = "own: stereo description",
         .presence = Presence::kOptional,
         .golden = Hex("0000001B 'uuid'"
                       "33444453 21D24FCE BB88695C FAC9C740"  // `3DDS`
                       "DEADBE"),                             // data
         .build = [](MbxContext* context, const MbxOptions* options,
                     Mbx3ddsBox* box) { return MbxBuild3dds(context, options, &kData, box); },
         .write = MbxWrite3ddsBox,
         .free = MbxFree3dds}),
    RegisterBox<MbxRinfBox>(
        {.name = "Rinf",
         .code = "rinf",
         .parents = "mp4v avc1 hvc1",
         .clause = "ISO/IEC 14496-12 8.15.3",
         .presence = Presence::kOptional,
         .golden = Hex("0000000B 'rinf'"
                       "DEADBE"),  // data
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxRinfBox* box) { return MbxBuildRinf(context, options, &kData, box); },
         .write = MbxWriteRinfBox,
         .free = MbxFreeRinf}),
};

class VisualConfigTest : public BoxTest {};

TEST_F(VisualConfigTest, StereoDetailsAreWrittenInModes1And2Only) {
    for (uint8_t mode = 0; mode < 8; mode++) {
        const Mbx3stpParams params = {mode, 0, {1, 2, 3}};
        const Bytes written = WriteBuiltBox<Mbx3stpBox>(
            context, &options, [&](Mbx3stpBox* box) { return MbxBuild3stp(context, &options, &params, box); },
            MbxWrite3stpBox, MbxFree3stp);
        const bool detailed = mode == 1 || mode == 2;
        ASSERT_EQ(written.size(), detailed ? 15U : 9U) << int{mode};
        EXPECT_EQ(written[8], mode << 5);
    }
}

TEST_F(VisualConfigTest, BuildersRefuseNullArguments) {
    Mbx3stpBox step = {};
    EXPECT_EQ(MbxBuild3stp(context, &options, nullptr, &step), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuild3stp(nullptr, &options, &kStep, &step), MBX_ERR_INVALID_ARG);
    Mbx3ddsBox stereo = {};
    EXPECT_EQ(MbxBuild3dds(context, &options, nullptr, &stereo), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuild3dds(context, nullptr, &kData, &stereo), MBX_ERR_INVALID_ARG);
    MbxRinfBox rinf = {};
    EXPECT_EQ(MbxBuildRinf(context, &options, nullptr, &rinf), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildRinf(context, &options, &kData, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
