#include "verify/Verification.h"

#include <gtest/gtest.h>

#include "inspect/Inspection.h"
#include "reader/BigEndian.h"
#include "reader/TimecodeCount.h"
#include "support/BoxFinder.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using test_stream::Data;
using test_stream::MakePlainStream;
using Sentences = std::vector<std::string>;

class VerificationTest : public testing::TestWithParam<const char*> {
 protected:
    void record(const std::string& name, const test_stream::Stream& stream, const char* type = "normal",
                bool close = true) const {
        test_stream::Record(path(name), {type, clipfileModule::RecordRules::kExact, close}, stream);
    }
    std::filesystem::path path(const std::string& name = kName) const { return folder_.Path() / name; }
    Sentences defects(bool deep = false) const { return VerifyFile(path(), {.deep = deep}).defects; }
    /// Writes a number over the bytes of a box, `at` bytes behind its header.
    void patch(const std::string& box, std::size_t at, std::uint64_t value, std::size_t width) const {
        Data bytes = test_stream::ReadAll(path());
        const auto found = box_finder::Find(bytes, box);
        for (std::size_t i = 0; i < width; ++i) {
            bytes[found.offset + found.header + at + i] =
                static_cast<unsigned char>(value >> 8 * (width - 1 - i));
        }
        test_stream::WriteAll(path(), bytes);
    }

    static constexpr const char* kName = "01_02_03_04.MP4";
    TempDir folder_;
};

INSTANTIATE_TEST_SUITE_P(Kinds, VerificationTest, testing::Values("normal", "fragment"),
                         [](const auto& instance) { return std::string(instance.param); });

TEST_P(VerificationTest, NothingIsWrongWithAClosedRecording) {
    for (const std::size_t chunks : {1U, 32U, 33U, 70U}) {
        record(kName, MakePlainStream(chunks), GetParam());
        EXPECT_EQ(defects(), Sentences()) << chunks;
    }
}

TEST_F(VerificationTest, NothingIsWrongWithItsSamples) {
    for (const char* const type : {"normal", "fragment"}) {
        record(kName, test_stream::MakeCodedStream(34), type);
        EXPECT_EQ(defects(true), Sentences()) << type;
    }
}

TEST_P(VerificationTest, NothingIsWrongByTheRulesThatAreKept) {
    test_stream::Record(path(), {GetParam(), clipfileModule::RecordRules::kKept, true}, MakePlainStream(40));
    EXPECT_EQ(defects(), Sentences());
}

TEST_P(VerificationTest, NothingIsWrongWithReorderedPicturesOfWhichTheLastAreNotShown) {
    for (const std::size_t chunks : {2U, 34U}) {
        test_stream::Stream stream = MakePlainStream(chunks);
        stream.settings.pictureOrder = clipfileModule::PictureOrder::kDecoding;
        for (const auto& chunk : stream.chunks) {
            // I0 P4 B2 b1 b3 P7 B6 b5, each at least when it is decoded.
            chunk->shownLater = {2, 5, 2, 0, 1, 4, 2, 0};
        }
        // P7 and B6 lie behind the end. Two pictures last 3.1 audio frames.
        clipfileModule::ChunkData& last = *stream.chunks.back();
        last.hiddenVideo = 2;
        last.meta.resize(last.meta.size() - 2);
        last.audio.resize(last.audio.size() - 3);
        record(kName, stream, GetParam());
        EXPECT_EQ(defects(), Sentences()) << chunks;
        const Inspection inspection = Inspect(InputFile(path()));
        EXPECT_EQ(inspection.tracks[0].samples, 8 * chunks);
        EXPECT_EQ(inspection.tracks[0].shown, 8 * chunks - 2);
        EXPECT_EQ(inspection.tracks[0].start, 0);
        EXPECT_NEAR(inspection.tracks[0].Seconds(), static_cast<double>(8 * chunks - 2) * 1.001 / 30, 1e-9);
    }
}

TEST_F(VerificationTest, AnUnfinishedFileIsTold) {
    record(kName, MakePlainStream(2), "normal", false);
    EXPECT_EQ(defects(),
              Sentences{"It is not closed. The length of its samples and 'moov' were never written."});
}

TEST_F(VerificationTest, ANameWithAnotherTimecodeIsTold) {
    record("01_02_03_05.MP4", MakePlainStream(2));
    EXPECT_EQ(VerifyFile(path("01_02_03_05.MP4")).defects, Sentences{"Its timecode is 01:02:03;04."});
}

TEST_F(VerificationTest, TablesThatNameOtherBytesAreTold) {
    record(kName, MakePlainStream(2));
    // A sample size of the video track's first picture, one byte longer.
    patch("moov/trak/mdia/minf/stbl/stsz", 12, 25, 4);
    EXPECT_EQ(defects(), Sentences{"Its samples have 2563 bytes and its data 2562."});
}

TEST_F(VerificationTest, TablesThatNameBytesBeyondTheFileAreTold) {
    record(kName, MakePlainStream(2));
    patch("moov/trak/mdia/minf/stbl/co64", 8, 1000000, 8);
    const Sentences found = defects();
    EXPECT_EQ(found.front(), "It has no picture.");
    EXPECT_TRUE(std::any_of(found.begin(), found.end(), [](const std::string& sentence) {
        return sentence == "The tables of track 1 name bytes beyond the end of the file.";
    }));
}

TEST_F(VerificationTest, AProfileOfAnotherPictureIsTold) {
    record(kName, MakePlainStream(1));
    // Width in VPRF: behind version, six numbers and two rates.
    const Data bytes = test_stream::ReadAll(path());
    Data changed = bytes;
    changed[168] = 0x05;  // 1920 is 0780
    test_stream::WriteAll(path(), changed);
    EXPECT_EQ(defects(), Sentences{"Its profile says 1408x1080 and its video track 1920x1080."});
}

TEST_F(VerificationTest, AFragmentOutOfOrderIsTold) {
    record(kName, MakePlainStream(40), "fragment");
    patch("moof/mfhd", 4, 7, 4);
    const auto moof = box_finder::Find(test_stream::ReadAll(path()), "moof");
    EXPECT_EQ(defects(),
              Sentences{"The fragment at " + std::to_string(moof.offset) + " has number 7 instead of 1."});
}

TEST_F(VerificationTest, ALengthOfAllFragmentsThatIsWrongIsTold) {
    record(kName, MakePlainStream(40), "fragment");
    patch("moov/mvex/mehd", 4, 5, 4);
    ASSERT_EQ(defects().size(), 1U);
    EXPECT_TRUE(defects().front().starts_with("'mehd' says 5 ticks"));
}

TEST_F(VerificationTest, MissingMetadataIsTold) {
    test_stream::Stream stream = MakePlainStream(2);
    stream.chunks.back()->meta.pop_back();
    record(kName, stream);
    EXPECT_EQ(defects(), Sentences{"It has 16 pictures and 15 units of metadata."});
}

TEST_F(VerificationTest, AudioOutOfStepIsTold) {
    test_stream::Stream stream = MakePlainStream(2);
    stream.chunks.back()->audio.resize(11);
    record(kName, stream);
    // 24 of 25 frames, 512.0 ms, against 16 pictures, 533.9 ms.
    EXPECT_EQ(defects(), Sentences{"Audio ends 21.9 ms before the pictures."});
}

TEST_F(VerificationTest, ATimecodeThatJumpsIsToldAndWhereWhenAllIsRead) {
    test_stream::Stream stream = MakePlainStream(2);
    auto& units = stream.chunks.back()->meta;
    for (std::size_t i = 4; i < units.size(); ++i) {
        const auto frames = static_cast<std::uint8_t>(10 + i);
        const Data unit = test_stream::MakeUnit(true, {2, 0, 0, frames, true});
        units[i] = std::make_shared<nal_access::SampleData>(unit, 0, 0, true);
    }
    record(kName, stream);
    EXPECT_EQ(defects(),
              Sentences{"The timecode of its last picture is 02:00:00;17, and by count it would be "
                        "01:02:03;19."});
    const Sentences all = defects(true);
    EXPECT_TRUE(std::any_of(all.begin(), all.end(), [](const std::string& sentence) {
        return sentence.starts_with("The timecode does not go on with unit 13, at ");
    }));
}

TEST_F(VerificationTest, SamplesThatAreBrokenAreToldWhenAllIsRead) {
    record(kName, test_stream::MakeCodedStream(2));
    Data bytes = test_stream::ReadAll(path());
    const auto mdat = box_finder::Find(bytes, "mdat");
    const std::size_t audio = mdat.offset + 16 + 8 * 116;
    std::fill_n(bytes.begin() + static_cast<std::ptrdiff_t>(audio), 20, static_cast<unsigned char>(0xFF));
    // The second unit's block.
    bytes[mdat.offset + 16 + 116 + 60] = 0;
    test_stream::WriteAll(path(), bytes);
    EXPECT_EQ(defects(), Sentences());
    EXPECT_EQ(defects(true), (Sentences{"Audio does not decode: frame 1, at " + std::to_string(audio) + ".",
                                        "The recorder's block does not end unit 2, at " +
                                            std::to_string(mdat.offset + 16 + 116) + "."}));
}

TEST_P(VerificationTest, EveryCutIsTold) {
    record(kName, MakePlainStream(33), GetParam());
    const Data whole = test_stream::ReadAll(path());
    for (std::size_t size = whole.size() - 1; size > 192; size = size * 9 / 10) {
        test_stream::WriteAll(path(), Data(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size)));
        EXPECT_FALSE(defects(true).empty()) << size;
    }
}

/// A file that goes on from `first` at 29.97 frames a second.
class NeighboursTest : public VerificationTest {
 protected:
    /// A file of `chunks` chunks whose timecode begins with the frame `first` of the day.
    Verification piece(const std::string& name, std::int64_t first, std::size_t chunks) const {
        record(kName, MakePlainStream(chunks));
        Verification file = VerifyFile(path());
        file.path = path(name);
        file.inspection.start = TimecodeOf(first, 30, true);
        return file;
    }
    static Sentences between(Verification a, Verification b) {
        std::vector<Verification> files = {std::move(b), std::move(a)};
        VerifyNeighbours(files);
        EXPECT_TRUE(files[0].defects.empty());
        return files[1].defects;
    }
};

TEST_F(NeighboursTest, AFileThatIsGoneOnFromEndsWhereSoundAndPictureMeet) {
    // 640 pictures and 1001 audio frames.
    EXPECT_EQ(between(piece("a.MP4", 0, 80), piece("b.MP4", 640, 1)), Sentences());
    EXPECT_EQ(between(piece("a.MP4", 0, 79), piece("b.MP4", 632, 1)),
              Sentences{"Sound and picture do not end together, and b.MP4 goes on with them."});
}

TEST_F(NeighboursTest, AFewMissingPicturesAreToldAndAPauseIsNone) {
    EXPECT_EQ(between(piece("a.MP4", 0, 80), piece("b.MP4", 647, 1)),
              Sentences{"7 pictures are missing between it and b.MP4."});
    EXPECT_EQ(between(piece("a.MP4", 0, 80), piece("b.MP4", 671, 1)), Sentences());
}

TEST_F(NeighboursTest, AFileGoesOnInTheFolderOfTheNextDay) {
    // At 29.97 frames a second with drop frame a day has 2589408 frames.
    EXPECT_EQ(between(piece("out/20261231/M/a.MP4", 2589408 - 640, 80), piece("out/20270101/M/b.MP4", 7, 1)),
              Sentences{"7 pictures are missing between it and b.MP4."});
    EXPECT_EQ(between(piece("out/20261231/M/a.MP4", 2589408 - 640, 80), piece("out/20270102/M/b.MP4", 7, 1)),
              Sentences());
    EXPECT_EQ(between(piece("out/20261231/M/a.MP4", 2589408 - 640, 80), piece("out/20270101/N/b.MP4", 7, 1)),
              Sentences());
}

TEST_F(NeighboursTest, ADayThatWasRecordedMuchLaterIsNotGoneOnWith) {
    Verification next = piece("out/20270101/M/b.MP4", 7, 1);
    next.inspection.recording.movie->creationTime += 24 * 60 * 60;
    EXPECT_EQ(between(piece("out/20261231/M/a.MP4", 2589408 - 640, 80), next), Sentences());
}

TEST_F(NeighboursTest, TimecodesThatComeTwiceAreTold) {
    EXPECT_EQ(between(piece("a.MP4", 0, 2), piece("b.MP4", 13, 1)),
              Sentences{"Its last 3 pictures have timecodes of b.MP4."});
}

}  // namespace
}  // namespace clipfile
