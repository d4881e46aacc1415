#include "reader/BoxFields.h"

#include <gtest/gtest.h>

#include "reader/BigEndian.h"
#include "support/ByteFile.h"

namespace clipfile {

void PrintTo(const BoxLayout& layout, std::ostream* out) {
    *out << layout.type;
}

namespace {

using byte_file::ByteFile;
using byte_file::Data;
using byte_file::MakeBox;
using byte_file::Number;
using byte_file::Text;
using byte_file::Words;

std::string TextOf(const std::vector<Field>& fields) {
    std::string text;
    for (const Field& field : fields) {
        text += (text.empty() ? "" : " ") + field.name + "=" + FieldText(field);
    }
    return text;
}

BoxFields FieldsOf(const Data& box, std::uint32_t parent = 0, std::size_t maxRows = 100) {
    const ByteFile bytes(box);
    const InputFile file(bytes.Path());
    return ReadBoxFields(file, *BoxCursor(file, 0, file.Size()).Next(), parent, maxRows);
}

TEST(BoxFields, TimesAreWideInVersion1) {
    EXPECT_EQ(TextOf(FieldsOf(MakeBox("mehd", {Words({0, 5})})).fields),
              "version=0 flags=000000 fragment_duration=5");
    EXPECT_EQ(TextOf(FieldsOf(MakeBox("mehd", {Words({0x01000000, 1, 5})})).fields),
              "version=1 flags=000000 fragment_duration=4294967301");
}

TEST(BoxFields, FieldsDependOnFlags) {
    EXPECT_EQ(TextOf(FieldsOf(MakeBox("tfhd", {Words({0x000011, 4, 0, 1000, 7})})).fields),
              "version=0 flags=000011 track_ID=4 base_data_offset=1000 default_sample_size=7");
}

TEST(BoxFields, RowsAreAsManyAsTheCountSaysAndThereIsRoomFor) {
    const Data box = MakeBox("trun", {Words({0x000201, 3, 0xFFFFFFFE, 10, 20})});
    const BoxFields all = FieldsOf(box);
    EXPECT_EQ(TextOf(all.fields), "version=0 flags=000201 sample_count=3 data_offset=-2");
    EXPECT_EQ(all.rowCount, 2U);
    ASSERT_EQ(all.rows.size(), 2U);
    EXPECT_EQ(TextOf(all.rows[1]), "sample_size=20");
    EXPECT_EQ(FieldsOf(box, 0, 1).rows.size(), 1U);
}

TEST(BoxFields, RowsWithoutACountGoOnToTheEnd) {
    const BoxFields fields = FieldsOf(MakeBox("ftyp", {Text("ZQVC"), Words({0x01001FFF}), Text("mp42iso2")}));
    EXPECT_EQ(TextOf(fields.fields), "major_brand=ZQVC minor_version=01001FFF");
    ASSERT_EQ(fields.rows.size(), 2U);
    EXPECT_EQ(TextOf(fields.rows[0]), "compatible_brand=mp42");
}

TEST(BoxFields, WidthsOfTheFragmentIndexStandInItsLengths) {
    // traf_number 1 byte, trun_number 2, sample_number 3.
    const BoxFields fields = FieldsOf(MakeBox(
        "tfra", {Words({0, 1, 0x06, 1, 90, 1234}), Number(1, 1), Number(0x0203, 2), Number(0x040506, 3)}));
    ASSERT_EQ(fields.rows.size(), 1U);
    EXPECT_EQ(TextOf(fields.rows[0]),
              "time=90 moof_offset=1234 traf_number=1 trun_number=515 sample_number=263430");
}

TEST(BoxFields, EditsHaveASignedTime) {
    const BoxFields fields = FieldsOf(MakeBox("elst", {Words({0, 1, 300, 0xFFFFFFFF, 0x00010000})}));
    ASSERT_EQ(fields.rows.size(), 1U);
    EXPECT_EQ(TextOf(fields.rows[0]), "segment_duration=300 media_time=-1 media_rate=1");
}

TEST(BoxFields, ParameterSetsAreShownOneByOne) {
    const Data avcc = {1, 100, 0, 40, 0xFF, 0xE1, 0, 2, 0x67, 0x64, 2, 0, 1, 0x68, 0, 1, 0x69};
    EXPECT_EQ(
        TextOf(FieldsOf(MakeBox("avcC", {avcc})).fields),
        "configurationVersion=1 AVCProfileIndication=100 profile_compatibility=00 AVCLevelIndication=40 "
        "lengthSizeMinusOne=3 sequenceParameterSetNALUnit=6764 pictureParameterSetNALUnit=68 "
        "pictureParameterSetNALUnit=69");
}

TEST(BoxFields, ATypeMeansWhatItsParentMakesOfIt) {
    const Data entry = MakeBox("tmcd", {Data(6, 0), Number(1, 2), Words({0, 0x0B, 30000, 1001}), {30, 0}});
    EXPECT_EQ(
        TextOf(FieldsOf(entry, FourCc("stsd")).fields),
        "data_reference_index=1 flags=0000000B timescale=30000 frame_duration=1001 number_of_frames=30");
    EXPECT_TRUE(FieldsOf(entry, FourCc("tref")).fields.empty());
}

TEST(BoxFields, LanguageIsThreeLetters) {
    EXPECT_EQ(
        TextOf(FieldsOf(MakeBox("mdhd", {Words({0, 1, 2, 48000, 4, 0x15C70000})})).fields),
        "version=0 flags=000000 creation_time=1 modification_time=2 timescale=48000 duration=4 language=eng");
}

TEST(BoxFields, ElementaryStreamsAreTakenApart) {
    const Data es = {0x03, 0x19, 0, 0, 0,    0x04, 0x11, 0x40, 0x15, 0,    6,    0,    0,   1,
                     0xF4, 0,    0, 1, 0xE9, 0xC0, 0x05, 0x02, 0x11, 0x90, 0x06, 0x01, 0x02};
    EXPECT_EQ(
        TextOf(FieldsOf(MakeBox("esds", {Words({0}), es})).fields),
        "version=0 flags=000000 objectTypeIndication=40 streamType=5 bufferSizeDB=1536 maxBitrate=128000 "
        "avgBitrate=125376 DecoderSpecificInfo=1190");
}

class EveryLayout : public testing::TestWithParam<BoxLayout> {};

/// Whatever the bytes are, reading ends, and stays inside of the box.
TEST_P(EveryLayout, BearsBoxesOfEveryLength) {
    const BoxLayout layout = GetParam();
    const std::uint32_t parent = layout.parent.empty()
                                     ? 0
                                     : static_cast<std::uint32_t>(ReadBigEndian(
                                           reinterpret_cast<const unsigned char*>(layout.parent.data()), 4));
    for (const int filler : {0x00, 0x01, 0x7F, 0xFF}) {
        Data boxes;
        for (std::size_t size = 0; size < 130; ++size) {
            const Data payload(size, static_cast<unsigned char>(filler));
            boxes = byte_file::Join({boxes, MakeBox(std::string(layout.type), {payload})});
        }
        const ByteFile bytes(boxes);
        const InputFile file(bytes.Path());
        BoxCursor cursor(file, 0, file.Size());
        while (const auto box = cursor.Next()) {
            const BoxFields fields = ReadBoxFields(file, *box, parent, 1000);
            EXPECT_LE(fields.rows.size(), box->PayloadSize());
            EXPECT_LE(fields.rowCount, box->PayloadSize());
        }
    }
}

INSTANTIATE_TEST_SUITE_P(All, EveryLayout, testing::ValuesIn(BoxLayouts()),
                         [](const testing::TestParamInfo<BoxLayout>& instance) {
                             std::string name(instance.param.type);
                             std::replace(name.begin(), name.end(), ' ', '_');
                             return name + std::to_string(instance.index);
                         });

}  // namespace
}  // namespace clipfile
