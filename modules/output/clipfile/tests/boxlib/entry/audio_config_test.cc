#include "boxlib/entry/audio_config.h"

#include "boxlib/support/entry_fixture.h"

namespace {

constexpr MbxSratParams kSrat = {96000};
constexpr MbxDac3Params kDac3 = {1, 8, 2, 7, 1, 15};
constexpr MbxDec3Params kDec3 = {640, 0, 1, 16, 2, 7, 1, 0, 0};
constexpr MbxDdtsParams kDdts = {48000, 768000, 754500, 24, 1, 3, 1, 9, 0x1234, 1, 5, 0x000F};
constexpr MbxFcfgParams kFcfg = {0x01020304, {0xA, 0x5, 0x2}};

const BoxRegistration kRows[] = {
    RegisterBox<MbxSratBox>(
        {.name = "Srat",
         .code = "srat",
         .parents = "mp4a",
         .clause = "ISO/IEC 14496-12 12.2.3",
         .presence = Presence::kOptional,
         .golden = Hex("00000010 'srat'"
                       "00000000"    // version, flags
                       "00017700"),  // sampling_rate
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxSratBox* box) { return MbxBuildSrat(context, options, &kSrat, box); },
         .write = MbxWriteSratBox,
         .free = MbxFreeSrat}),
    RegisterBox<MbxDac3Box>(
        {.name = "Dac3",
         .code = "dac3",
         .parents = "mp4a",
         .clause = "ETSI TS 102 366 F.4",
         .presence = Presence::kOptional,
         // fscod 01, bsid 01000, bsmod 010, acmod 111, lfeon 1, bit_rate_code 01111, 00000
         .golden = Hex("0000000B 'dac3'"
                       "50"    // 01 01000 0
                       "BD"    // 10 111 1 01
                       "E0"),  // 111 00000
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDac3Box* box) { return MbxBuildDac3(context, options, &kDac3, box); },
         .write = MbxWriteDac3Box,
         .free = MbxFreeDac3}),
    RegisterBox<MbxDec3Box>(
        {.name = "Dec3",
         .code = "dec3",
         .parents = "mp4a",
         .clause = "ETSI TS 102 366 F.6",
         .presence = Presence::kOptional,
         // fscod 01, bsid 10000, bsmod 00010, acmod 111, lfeon 1
         .golden = Hex("0000000D 'dec3'"
                       "1400"  // data_rate 640 in 13 bits, num_ind_sub 0 in three
                       "60"    // 01 10000 0
                       "2F"    // 0010 111 1
                       "00"),  // reserved, num_dep_sub 0, reserved
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDec3Box* box) { return MbxBuildDec3(context, options, &kDec3, box); },
         .write = MbxWriteDec3Box,
         .free = MbxFreeDec3}),
    RegisterBox<MbxDdtsBox>(
        {.name = "Ddts",
         .code = "ddts",
         .parents = "mp4a",
         .clause = "ETSI TS 102 114 E.2.2.3.1",
         .presence = Presence::kOptional,
         // FrameDuration 01, StreamConstruction 00011, CoreLFEPresent 1, CoreLayout 001001,
         // CoreSize 01001000110100, StereoDownmix 1, RepresentationType 101, ChannelLayout 000F
         .golden = Hex("0000001C 'ddts'"
                       "0000BB80"  // DTSSamplingFrequency
                       "000BB800"  // maxBitrate
                       "000B8344"  // avgBitrate
                       "18"        // pcmSampleDepth
                       "47"        // 01 00011 1
                       "25"        // 001001 01
                       "23"        // 00100011
                       "4D"        // 0100 1 101
                       "000F"      // ChannelLayout
                       "00"),      // no further assets, reserved
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxDdtsBox* box) { return MbxBuildDdts(context, options, &kDdts, box); },
         .write = MbxWriteDdtsBox,
         .free = MbxFreeDdts}),
    RegisterBox<MbxFcfgBox>(
        {.name = "Fcfg",
         .code = "fcfg",
         .parents = "mp4a",
         .clause = "own: sound configuration",
         .presence = Presence::kOptional,
         .golden = Hex("0000000E 'fcfg'"
                       "01020304"  // the word
                       "A5"        // values of four and four bits
                       "80"),      // a value of two bits at the top
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxFcfgBox* box) { return MbxBuildFcfg(context, options, &kFcfg, box); },
         .write = MbxWriteFcfgBox,
         .free = MbxFreeFcfg}),
};

class AudioConfigTest : public BoxTest {
 protected:
    Bytes writeDec3(const MbxDec3Params& params) {
        return WriteBuiltBox<MbxDec3Box>(
            context, &options, [&](MbxDec3Box* box) { return MbxBuildDec3(context, &options, &params, box); },
            MbxWriteDec3Box, MbxFreeDec3);
    }
};

TEST_F(AudioConfigTest, DependentSubstreamsOfDec3TakeTwoBytes) {
    MbxDec3Params params = kDec3;
    params.num_dep_sub = 3;
    params.chan_loc = 0x101;
    // 000 0011 1 00000001
    EXPECT_BYTES(writeDec3(params), Hex("0000000E 'dec3' 1400 602F 0701"));
    params.num_dep_sub = 15;
    params.chan_loc = 0x1FF;
    EXPECT_BYTES(writeDec3(params), Hex("0000000E 'dec3' 1400 602F 1FFF"));
}

TEST_F(AudioConfigTest, Dec3DescribesOneSubstreamWhateverItsCountSays) {
    MbxDec3Params params = kDec3;
    params.num_ind_sub = 7;
    EXPECT_BYTES(writeDec3(params), Hex("0000000D 'dec3' 1407 602F 00"));
}

TEST_F(AudioConfigTest, BuildersRefuseNullArguments) {
    MbxSratBox srat = {};
    EXPECT_EQ(MbxBuildSrat(context, &options, nullptr, &srat), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSrat(nullptr, &options, &kSrat, &srat), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSrat(context, nullptr, &kSrat, &srat), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSrat(context, &options, &kSrat, nullptr), MBX_ERR_INVALID_ARG);
    MbxDac3Box dac3 = {};
    EXPECT_EQ(MbxBuildDac3(context, &options, nullptr, &dac3), MBX_ERR_INVALID_ARG);
    MbxDec3Box dec3 = {};
    EXPECT_EQ(MbxBuildDec3(context, &options, nullptr, &dec3), MBX_ERR_INVALID_ARG);
    MbxDdtsBox ddts = {};
    EXPECT_EQ(MbxBuildDdts(context, &options, nullptr, &ddts), MBX_ERR_INVALID_ARG);
    MbxFcfgBox fcfg = {};
    EXPECT_EQ(MbxBuildFcfg(context, &options, nullptr, &fcfg), MBX_ERR_INVALID_ARG);
}

}  // namespace
