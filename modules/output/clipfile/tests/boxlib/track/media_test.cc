#include "boxlib/track/media.h"

#include "boxlib/support/registry.h"
#include "boxlib/support/track_fixture.h"

namespace {

uint8_t kName[] = "Sound Media Handler";

const MbxTrack* track() {
    static const MbxTrack instance = [] {
        static MbxDataEntry self = {MbxCode("url "), {}, {}, nullptr};
        MbxTrack made = {};
        made.mediaHeader = {20, 0x01020304, 0x05060708, 48000, 0, 0x95C7};
        made.handler = {MbxCode("soun"), {kName, sizeof(kName)}};
        made.mediaInformation.code = MbxCode("smhd");
        made.dataEntries = {&self, &self};
        return made;
    }();
    return &instance;
}

const Bytes kMdhd =
    Hex("00000020 'mdhd'"
        "00 000000"  // version, flags
        "01020304"   // creation_time
        "05060708"   // modification_time
        "0000BB80"   // timescale
        "00000000"   // duration
        "15C7"       // pad, language
        "0000");     // pre_defined

const Bytes kHdlr =
    Hex("00000034 'hdlr'"
        "00 000000"                   // version, flags
        "00000000"                    // pre_defined
        "'soun'"                      // handler_type
        "00000000 00000000 00000000"  // reserved
        "'Sound Media Handler' 00");  // name

const Bytes kMinf = Hex("00000098 'minf' 00000010 'smhd' 00000000 0000 0000") + SelfDinf() + EmptyStbl();

const BoxRegistration kRows[] = {
    RegisterBox<MbxMdiaBox>(
        {.name = "Mdia",
         .code = "mdia",
         .parents = "trak",
         .clause = "ISO/IEC 14496-12 8.4.1",
         .presence = Presence::kMandatory,
         .golden = Hex("000000F4 'mdia'") + kMdhd + kHdlr + kMinf,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMdiaBox* box) { return MbxBuildMdia(context, options, track(), box); },
         .write = MbxWriteMdiaBox,
         .free = MbxFreeMdia}),
    RegisterBox<MbxMdhdBox>(
        {.name = "Mdhd",
         .code = "mdhd",
         .parents = "mdia",
         .clause = "ISO/IEC 14496-12 8.4.2",
         .presence = Presence::kMandatory,
         .golden = kMdhd,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMdhdBox* box) { return MbxBuildMdhd(context, options, track(), box); },
         .write = MbxWriteMdhdBox,
         .free = MbxFreeMdhd}),
    RegisterBox<MbxHdlrBox>(
        {.name = "Hdlr",
         .code = "hdlr",
         .parents = "mdia, meta",
         .clause = "ISO/IEC 14496-12 8.4.3",
         .presence = Presence::kMandatory,
         .golden = kHdlr,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxHdlrBox* box) { return MbxBuildHdlr(context, options, &track()->handler, box); },
         .write = MbxWriteHdlrBox,
         .free = MbxFreeHdlr}),
    RegisterBox<MbxMinfBox>(
        {.name = "Minf",
         .code = "minf",
         .parents = "mdia",
         .clause = "ISO/IEC 14496-12 8.4.4",
         .presence = Presence::kMandatory,
         .golden = kMinf,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMinfBox* box) { return MbxBuildMinf(context, options, track(), box); },
         .write = MbxWriteMinfBox,
         .free = MbxFreeMinf}),
};

class MediaTest : public BoxTest {
 protected:
    Bytes writeMdhd() {
        MbxMdhdBox box = {};
        MemoryFile target;
        EXPECT_EQ(MbxBuildMdhd(context, &options, &own, &box), MBX_OK);
        EXPECT_EQ(MbxWriteMdhdBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        return target.bytes;
    }

    MbxTrack own = *track();
    MbxSampleSegment segment = {};
};

TEST_F(MediaTest, DurationIsWhatTheFirstSegmentReaches) {
    MbxSampleSegment second = {};
    second.decodeDuration = 5000;
    segment.firstDecodeTime = 100;
    segment.decodeDuration = 24;
    segment.next = &second;
    own.segments = {&segment, &second};
    EXPECT_BYTES(writeMdhd(), Hex("00000020 'mdhd' 00000000 01020304 05060708 0000BB80 0000007C 15C7 0000"));
}

TEST_F(MediaTest, GivenDurationIsNotComputed) {
    own.segments = {&segment, &segment};
    segment.decodeDuration = 24;
    own.mediaHeader.fieldsSet |= MBX_MEDIA_DURATION;
    own.mediaHeader.duration = 99;
    uint64_t duration = 0;
    EXPECT_EQ(MbxComputeMediaDuration(&own, &duration), MBX_OK);
    EXPECT_EQ(duration, 99U);
    EXPECT_EQ(MbxComputeMediaDuration(nullptr, &duration), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxComputeMediaDuration(&own, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(MediaTest, Version1HasWideTimes) {
    options.time_version_mode = 1;
    own.mediaHeader.creationTime = 1ULL << 32;
    EXPECT_BYTES(writeMdhd(), Hex("0000002C 'mdhd' 01000000 0000000100000000 0000000005060708 0000BB80"
                                  "0000000000000000 15C7 0000"));
}

TEST_F(MediaTest, TopBitOfTheLanguageIsZero) {
    own.mediaHeader.language = 0xFFFF;
    EXPECT_BYTES(writeMdhd(), Hex("00000020 'mdhd' 00000000 01020304 05060708 0000BB80 00000000 7FFF 0000"));
}

TEST_F(MediaTest, DurationBeyond64BitsOverflows) {
    own.segments = {&segment, &segment};
    segment.firstDecodeTime = 1;
    segment.decodeDuration = UINT64_MAX;
    MbxMdhdBox box = {};
    EXPECT_EQ(MbxBuildMdhd(context, &options, &own, &box), MBX_ERR_OVERFLOW);
}

TEST_F(MediaTest, UnknownMediaHeaderIsABrokenInvariant) {
    own.mediaInformation.code = MbxCode("hmhd");
    MbxMinfBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    EXPECT_EQ(MbxBuildMinf(context, &options, &own, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeMinf(context, box), MBX_OK);
}

}  // namespace
