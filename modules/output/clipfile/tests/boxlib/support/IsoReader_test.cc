#include "boxlib/support/IsoReader.h"

#include "boxlib/support/fixture.h"

namespace {

// A movie of one track with two samples, by hand.
Bytes movie(const std::string& stsz, const std::string& stss) {
    const Bytes stbl = Hex("00000020 'stsd' 00000000 00000001 00000010 'rtmd' 000000000000 0001"
                           "00000018 'stts' 00000000 00000001 00000002 0000000A"
                           "0000001C 'stsc' 00000000 00000001 00000001 00000002 00000001") +
                       Hex(stsz) + Hex("00000014 'stco' 00000000 00000001 00001000") + Hex(stss);
    const auto box = [](const std::string& type, const Bytes& payload) {
        return Words({static_cast<uint32_t>(payload.size() + 8)}) + Hex("'" + type + "'") + payload;
    };
    const Bytes matrix = Repeat(0, 36);
    const Bytes mvhd = Hex("00000000 00000000 00000000 000003E8 00000014 00010000 0100 0000") + Repeat(0, 8) +
                       matrix + Repeat(0, 24) + Hex("00000002");
    const Bytes tkhd = Hex("00000007 00000000 00000000 00000001 00000000 00000014") + Repeat(0, 8) +
                       Hex("0000 0000 0000 0000") + matrix + Repeat(0, 8);
    const Bytes mdhd = Hex("00000000 00000000 00000000 000003E8 00000014 55C4 0000");
    const Bytes hdlr = Hex("00000000 00000000 'meta' 00000000 00000000 00000000 00");
    const Bytes mdia = box("mdhd", mdhd) + box("hdlr", hdlr) + box("minf", box("stbl", stbl));
    return box("moov", box("mvhd", mvhd) + box("trak", box("tkhd", tkhd) + box("mdia", mdia)));
}

const char* const kSizes = "0000001C 'stsz' 00000000 00000000 00000002 00000005 00000007";
const char* const kSyncs = "00000014 'stss' 00000000 00000001 00000001";

TEST(IsoReaderTest, ReadsTheSamplesOfAMovie) {
    const iso::Movie read = iso::ReadMovie(movie(kSizes, kSyncs));
    const iso::Track& track = read.track(1);
    EXPECT_EQ(read.timescale, 1000U);
    EXPECT_EQ(track.handler, "meta");
    EXPECT_EQ(track.entryTypes, std::vector<std::string>{"rtmd"});
    ASSERT_EQ(track.samples.size(), 2U);
    EXPECT_EQ(track.samples[0].offset, 0x1000U);
    EXPECT_EQ(track.samples[1].offset, 0x1005U);
    EXPECT_EQ(track.samples[1].size, 7U);
    EXPECT_EQ(track.samples[1].decodeTime, 10U);
    EXPECT_TRUE(track.samples[0].isSync);
    EXPECT_FALSE(track.samples[1].isSync);
    EXPECT_FALSE(read.fragmented);
    EXPECT_THROW(read.track(2), iso::IsoError);
}

TEST(IsoReaderTest, RefusesWhatContradictsItself) {
    EXPECT_THROW(iso::ReadMovie({}), iso::IsoError);
    EXPECT_THROW(iso::ReadMovie(Hex("00000008 'moof'")), iso::IsoError);
    // One size too few, one too many, a byte left over, a sample number beyond the end, no sizes at all.
    EXPECT_THROW(iso::ReadMovie(movie("00000018 'stsz' 00000000 00000000 00000001 00000005", "")),
                 iso::IsoError);
    EXPECT_THROW(iso::ReadMovie(movie("00000014 'stsz' 00000000 00000005 00000003", "")), iso::IsoError);
    EXPECT_THROW(iso::ReadMovie(movie("00000015 'stsz' 00000000 00000005 00000002 00", "")), iso::IsoError);
    EXPECT_THROW(iso::ReadMovie(movie(kSizes, "00000014 'stss' 00000000 00000001 00000003")), iso::IsoError);
    EXPECT_THROW(iso::ReadMovie(movie("", "")), iso::IsoError);
}

TEST(IsoReaderTest, RefusesEveryPrefixOfAMovie) {
    const Bytes whole = movie(kSizes, kSyncs);
    for (size_t length = 0; length < whole.size(); length++) {
        EXPECT_THROW(
            iso::ReadMovie(Bytes(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length))),
            iso::IsoError)
            << length;
    }
}

TEST(IsoReaderTest, TellsBoxesWithTheirPlaces) {
    const std::vector<iso::Box> boxes = iso::ReadBoxes(
        Hex("00000008 'free' 00000001 'moov' 0000000000000020 00000008 'abcd' 00000008 'efgh'"));
    ASSERT_EQ(boxes.size(), 2U);
    EXPECT_EQ(boxes[0].type, "free");
    EXPECT_EQ(boxes[1].position, 8U);
    EXPECT_EQ(boxes[1].headerSize, 16U);
    EXPECT_EQ(boxes[1].size, 32U);
    EXPECT_EQ(boxes[1].childTypes(), "abcd efgh");
    EXPECT_EQ(boxes[1].get("efgh").position, 32U);
    EXPECT_EQ(boxes[1].find("ijkl"), nullptr);
    EXPECT_THROW(boxes[1].get("ijkl"), iso::IsoError);
}

}  // namespace
