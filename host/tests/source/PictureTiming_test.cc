#include "source/PictureTiming.h"

#include "SourceTesting.h"
#include "support/PictureTimingMessage.h"

namespace receiver {
namespace {

using endtoend::BitWriter;
using endtoend::PictureTimingMessage;
using std::string;

/// A sequence parameter set with everything that may stand in front of the decoder models' parameters, and
/// these: delays of 16 and 10 bits.
string FullParameterSet() {
    BitWriter set;
    set.Number(100, 8).Number(0, 8).Number(31, 8).Exponential(0);  // High, level 3.1, number 0
    set.Exponential(1).Exponential(0).Exponential(0).Flag(false);  // 4:2:0, 8 bits
    set.Flag(true).Flag(true);                                     // scaling matrix, its first list
    set.Exponential(3).Exponential(15);                            // delta_scale 2, -8: the rest follows
    set.Exponential(3);                                            // 2 + 10 - 8 - 4: next 4
    for (int entry = 3; entry < 16; ++entry) {
        set.Exponential(0);
    }
    set.Number(0, 7);    // the other lists
    set.Exponential(0);  // log2_max_frame_num_minus4
    set.Exponential(1);  // pic_order_cnt_type
    set.Flag(false).Exponential(0).Exponential(0).Exponential(1).Exponential(2);
    set.Exponential(1).Flag(false).Exponential(7).Exponential(5);
    set.Flag(false).Flag(true).Flag(true);  // fields may be coded
    set.Flag(true).Exponential(0).Exponential(0).Exponential(0).Exponential(4);
    set.Flag(true);                               // vui_parameters_present_flag
    set.Flag(true).Number(255, 8).Number(1, 32);  // aspect ratio
    set.Flag(true).Flag(true);                    // overscan
    set.Flag(true).Number(10, 4).Flag(true).Number(0x010101, 24);
    set.Flag(true).Exponential(0).Exponential(0);  // chroma location
    set.Flag(true).Number(1001, 32).Number(60000, 32).Flag(true);
    set.Flag(true).Exponential(1).Number(0, 8);  // nal_hrd_parameters, two buffers
    for (int buffer = 0; buffer < 2; ++buffer) {
        set.Exponential(1000).Exponential(2000).Flag(false);
    }
    set.Number(23, 5).Number(15, 5).Number(9, 5).Number(24, 5);
    set.Flag(false).Flag(false);  // vcl_hrd_parameters, low_delay_hrd_flag
    set.Flag(true).Flag(false);   // pic_struct_present_flag, bitstream_restriction_flag
    return endtoend::NalUnit('\x67', set.Bytes());
}

bool DropFrameIn(const string& stream) {
    PictureTiming timing;
    timing.Look(NalUnits({reinterpret_cast<const unsigned char*>(stream.data()), stream.size()}));
    return timing.DropFrame();
}

constexpr Timecode kTime{10, 20, 30, 4, false};
/// Lengths of the delays of `FullParameterSet`.
constexpr int kDelays = 16 + 10;

TEST(PictureTiming, TheDropFrameRuleIsReadBehindAllThatMayStandInFrontOfIt) {
    EXPECT_TRUE(DropFrameIn(FullParameterSet() + PictureTimingMessage(kTime, 4, false, kDelays)));
    EXPECT_FALSE(DropFrameIn(FullParameterSet() + PictureTimingMessage(kTime, 1, false, kDelays)));
    EXPECT_FALSE(DropFrameIn(FullParameterSet() + PictureTimingMessage(kTime, 0, true, kDelays)));
}

TEST(PictureTiming, ADroppedNumberIsEnoughWithACountingTypeThatDrops) {
    EXPECT_TRUE(DropFrameIn(FullParameterSet() + PictureTimingMessage(kTime, 6, true, kDelays)));
    EXPECT_FALSE(DropFrameIn(FullParameterSet() + PictureTimingMessage(kTime, 6, false, kDelays)));
}

TEST(PictureTiming, MessagesWithoutAParameterSetAreNotUnderstood) {
    EXPECT_FALSE(DropFrameIn(PictureTimingMessage(kTime, 4)));
}

TEST(PictureTiming, WhatIsCutShortIsNotUnderstood) {
    const string set = FullParameterSet();
    const string message = PictureTimingMessage(kTime, 4, false, kDelays);
    for (std::size_t size = 0; size < set.size() - 4; ++size) {
        DropFrameIn(set.substr(0, size) + message);
    }
    for (std::size_t size = 0; size < 10; ++size) {
        EXPECT_FALSE(DropFrameIn(set + message.substr(0, size))) << size;
    }
}

class PictureTimingOfFiles : public SourceTest {
 protected:
    /// A second of pictures whose IDR frames, every 12, have these timecodes.
    void Make(const string& rate, const std::vector<Timecode>& timecodes, unsigned int countingType) const {
        // A parameter set that announces the messages, without the encoder's own.
        Ffmpeg("-f lavfi -i testsrc2=size=128x96:duration=1:rate=" + rate + kPlainH264 +
               "-x264-params pic-struct=1 -bsf:v filter_units=remove_types=6 a.h264");
        const string plain = FileBytes(Path("a.h264"));
        string timed;
        std::size_t from = 0;
        for (const Timecode& timecode : timecodes) {
            const std::size_t idr = plain.find(string("\0\0\1\x65", 4), from);
            ASSERT_NE(idr, string::npos);
            timed += plain.substr(from, idr - from) + PictureTimingMessage(timecode, countingType) +
                     plain.substr(idr, 4);
            from = idr + 4;
        }
        timed += plain.substr(from);
        std::FILE* const file = std::fopen(Path("timed.h264").c_str(), "wb");
        std::fwrite(timed.data(), 1, timed.size(), file);
        ASSERT_EQ(std::fclose(file), 0);
        Ffmpeg("-r " + rate + " -i timed.h264 -c copy timed.ts");
    }
};

TEST_F(PictureTimingOfFiles, TimecodesOfIdrFramesAreReadAndCountedOn) {
    Make("25", {{9, 8, 7, 20, false}, {9, 8, 8, 7, false}, {9, 8, 8, 19, false}}, 0);
    const auto video = Of(Medium::kVideo, ReadFile("timed.ts"));
    ASSERT_EQ(video.size(), 25u);
    EXPECT_EQ(video[0].timecode, (Timecode{9, 8, 7, 20, false}));
    EXPECT_EQ(video[4].timecode, (Timecode{9, 8, 7, 24, false}));
    EXPECT_EQ(video[5].timecode, (Timecode{9, 8, 8, 0, false}));
    EXPECT_EQ(video[24].timecode, (Timecode{9, 8, 8, 19, false}));
}

TEST_F(PictureTimingOfFiles, TheCountingTypeTellsOfDropFrameWithoutADroppedNumber) {
    Make("30000/1001", {{10, 0, 59, 20, false}, {10, 1, 0, 4, false}, {10, 1, 0, 16, false}}, 4);
    // Its units have lengths in front of them, and the parameter sets stand in its header.
    Ffmpeg("-i timed.ts -c copy -bsf:v 'filter_units=remove_types=7|8' timed.mp4");
    struct Case {
        const char* file;
        bool transcode;
    };
    for (const Case& test : {Case{"timed.ts", false}, Case{"timed.ts", true}, Case{"timed.mp4", false},
                             Case{"timed.mp4", true}}) {
        SCOPED_TRACE(string(test.file) + (test.transcode ? " converted" : ""));
        SourceOptions options = Fast(test.file);
        options.transcode = test.transcode;
        options.width = test.transcode ? std::optional<std::uint32_t>(64) : std::nullopt;
        const auto video = Of(Medium::kVideo, ReadAll(*OpenSource(options, notices_, nullptr)));
        ASSERT_GE(video.size(), 29u);
        EXPECT_EQ(video[0].timecode, (Timecode{10, 0, 59, 20, true}));
        EXPECT_EQ(video[9].timecode, (Timecode{10, 0, 59, 29, true}));
        EXPECT_EQ(video[10].timecode, (Timecode{10, 1, 0, 2, true}));
        EXPECT_EQ(video[28].timecode, (Timecode{10, 1, 0, 20, true}));
    }
}

TEST_F(PictureTimingOfFiles, WithoutThatCountingTypeNoNumbersAreDropped) {
    Make("30000/1001", {{10, 0, 59, 20, false}}, 1);
    const auto video = Of(Medium::kVideo, ReadFile("timed.ts"));
    ASSERT_GE(video.size(), 29u);
    EXPECT_EQ(video[10].timecode, (Timecode{10, 1, 0, 0, false}));
}

}  // namespace
}  // namespace receiver
