// Whole files, byte for byte, at each frame rate.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <memory>
#include <string>
#include <vector>

#include "boxlib/support/IsoReader.h"
#include "mp4/Mp4MuxerFactory.h"
#include "support/FakePlatform.h"
#include "support/GoldenFile.h"
#include "support/MuxerStream.h"
#include "support/TempDir.h"

namespace clipfileModule {
namespace {

using namespace golden;
using muxer_stream::ChunkShape;
using muxer_stream::MakeChunk;

// ---- The normal file: two chunks.

const ChunkShape kFirstChunk = {{5, 5, 5, 5, 5, 5, 5, 5}, {6, 6, 7}, {20, 9, 9, 9, 9, 9, 9, 9}, 0};
const ChunkShape kSecondChunk = {{5, 5, 5, 5, 5, 5, 5, 5}, {6, 6}, {9, 9, 9, 9, 15, 9, 9, 9}, 4};

// Where things stand: `ftyp` 28 bytes, `uuid` 148, header of `mdat` 16, and from 192 on the samples: chunk 1
// with metadata 40, audio 19, video 83; chunk 2 with metadata 40, audio 12, video 78; the timecode 4.
constexpr std::uint32_t kNormalPayload = 276;

Bytes normalMoov(const RateRow& row) {
    const std::uint32_t length = 16 * row.duration;
    const Bytes video =
        Stts(1, U32(16) + U32(row.duration)) +  //
        Stsc(1, U32(1) + U32(8) + U32(1)) +     //
        Stsz(0, 16, U32(20) + Repeat(7, U32(9)) + Repeat(4, U32(9)) + U32(15) + Repeat(3, U32(9))) +
        Co64(2, U64(192 + 59) + U64(192 + 194)) +  //
        Stss(2, U32(1) + U32(13));
    const Bytes audio =
        Stts(1, U32(5) + U32(1024)) + Stsc(2, U32(1) + U32(3) + U32(1) + U32(2) + U32(2) + U32(1)) +
        Stsz(0, 5, U32(6) + U32(6) + U32(7) + U32(6) + U32(6)) + Co64(2, U64(192 + 40) + U64(192 + 182));
    const Bytes timecode = Stts(1, U32(1) + U32(length)) +      // one sample for the whole file
                           Stsc(1, U32(1) + U32(1) + U32(1)) +  //
                           Stsz(4, 1) + Co64(1, U64(192 + 272));
    const Bytes meta = Stts(1, U32(16) + U32(row.duration)) +  //
                       Stsc(1, U32(1) + U32(8) + U32(1)) +     //
                       Stsz(5, 16) + Co64(2, U64(192) + U64(192 + 142));
    return Box("moov", Mvhd(row, length) + VideoTrak(row, {length, length}, video) +
                           AudioTrak({row.audio5, 5 * 1024}, audio) +
                           TimecodeTrak(row, {length, length}, timecode) +
                           MetaTrak(row, {length, length}, meta));
}

Bytes normalFile(const RateRow& row) {
    return Ftyp() + UuidProf(row, 0x20000000) +
           // The 16-byte form of the header: size 1, type, largesize.
           U32(1) + Text("mdat") + U64(16 + kNormalPayload) +   //
           muxer_stream::BytesOf(*MakeChunk(kFirstChunk, 1)) +  //
           muxer_stream::BytesOf(*MakeChunk(kSecondChunk, 2)) + U32(row.frameNumber) + normalMoov(row);
}

// ---- The fragmented file: 32 chunks in `moov`, two in one fragment, of which the second has no audio and no
// ---- sync picture.

const ChunkShape kFragmentChunk = {{5, 5, 5, 5, 5, 5, 5, 5}, {6, 7}, {12, 9, 9, 9, 9, 9, 9, 9}, 0};
const ChunkShape kLastChunk = {{5, 5, 5, 5, 5, 5, 5, 5}, {}, {9, 9, 9, 9, 9, 9, 9, 9}, -1};

// A plain chunk has metadata 40, audio 12, video 75.
constexpr std::uint32_t kPlainSize = 127;

Bytes offsets(std::uint32_t first) {
    Bytes rows;
    for (std::uint32_t i = 0; i < 32; ++i) {
        rows = rows + U32(first + i * kPlainSize);
    }
    return rows;
}

/// 8.8.3
Bytes trex(std::uint32_t trackId, std::uint32_t duration, std::uint32_t size, std::uint32_t flags) {
    return FullBox("trex", 0, 0, U32(trackId) + U32(1) + U32(duration) + U32(size) + U32(flags));
}

/// `payload` is where the samples begin. With exact rules there are no edits.
Bytes fragmentMoov(const RateRow& row, RecordRules rules, std::uint32_t payload) {
    const bool hasEdits = rules == RecordRules::kKept;
    const std::uint32_t length = 256 * row.duration;
    Bytes sync;
    for (std::uint32_t i = 0; i < 32; ++i) {
        sync = sync + U32(1 + 8 * i);
    }
    const Bytes video = Stts(1, U32(256) + U32(row.duration)) + Stsc(1, U32(1) + U32(8) + U32(1)) +
                        Stsz(0, 256, Repeat(32, U32(12) + Repeat(7, U32(9)))) +
                        Stco(32, offsets(payload + 52)) + Stss(32, sync);
    const Bytes audio = Stts(1, U32(64) + U32(1024)) + Stsc(1, U32(1) + U32(2) + U32(1)) + Stsz(6, 64) +
                        Stco(32, offsets(payload + 40));
    const Bytes timecode = Stts(0, {}) + Stsc(0, {}) + Stsz(0, 0) + Stco(0, {});
    const Bytes meta = Stts(1, U32(256) + U32(row.duration)) + Stsc(1, U32(1) + U32(8) + U32(1)) +
                       Stsz(5, 256) + Stco(32, offsets(payload));
    const Bytes mvex = Box("mvex", FullBox("mehd", 0, 0, U32(272 * row.duration)) +  //
                                       trex(1, row.duration, 12, 0x00010000) +       //
                                       trex(2, 1024, 6, 0) +                         //
                                       trex(3, 272 * row.duration, 4, 0) +           //
                                       trex(4, row.duration, 5, 0));
    return Box("moov", Mvhd(row, length) + VideoTrak(row, {length, length, hasEdits}, video) +
                           AudioTrak({row.audio64, 64 * 1024, hasEdits}, audio) +
                           TimecodeTrak(row, {0, 0, hasEdits}, timecode) +
                           MetaTrak(row, {length, length, hasEdits}, meta) + mvex);
}

/// 8.8.7, with the base data offset alone.
Bytes tfhd(std::uint32_t trackId, std::uint32_t base) {
    return FullBox("tfhd", 0, 0x000001, U32(trackId) + U64(base));
}

/// 8.8.7, with the base data offset and all four defaults.
Bytes tfhdWithDefaults(std::uint32_t trackId, std::uint32_t base, std::uint32_t duration, std::uint32_t size,
                       std::uint32_t flags) {
    return FullBox("tfhd", 0, 0x00003B,
                   U32(trackId) + U64(base) + U32(1) + U32(duration) + U32(size) + U32(flags));
}

/// `payload` is where the fragment's samples begin: chunk 33 with metadata 40, audio 13, video 75; chunk 34
/// with metadata 40, video 72; the timecode 4. With exact rules the timecode's track, which has no sample in
/// `moov`, states its defaults here.
Bytes fragmentMoof(const RateRow& row, RecordRules rules, std::uint32_t payload) {
    const Bytes video = tfhd(1, payload + 53) +
                        FullBox("trun", 0, 0x000205,      // data offset, first flags, sizes
                                U32(8) + U32(0) + U32(0)  // count, data_offset, first_sample_flags
                                    + U32(12) + Repeat(7, U32(9))) +
                        FullBox("trun", 0, 0x000201, U32(8) + U32(115) + Repeat(8, U32(9)));
    const Bytes audio =
        tfhd(2, payload + 40) + FullBox("trun", 0, 0x000201, U32(2) + U32(0) + U32(6) + U32(7));
    const Bytes timecode =
        (rules == RecordRules::kExact ? tfhdWithDefaults(3, payload + 240, 272 * row.duration, 4, 0)
                                      : tfhd(3, payload + 240)) +
        FullBox("trun", 0, 0x000001, U32(1) + U32(0));
    const Bytes meta = tfhd(4, payload) + FullBox("trun", 0, 0x000001, U32(8) + U32(0)) +
                       FullBox("trun", 0, 0x000001, U32(8) + U32(128));
    return Box("moof", FullBox("mfhd", 0, 0, U32(1)) + Box("traf", video) + Box("traf", audio) +
                           Box("traf", timecode) + Box("traf", meta));
}

/// 8.8.10: a row each chunk, in the 64-bit form; numbers of `traf`, `trun` and sample in a byte each.
Bytes tfra(std::uint32_t trackId, std::uint32_t count, const Bytes& rows) {
    return FullBox("tfra", 1, 0, U32(trackId) + U32(0) + U32(count) + rows);
}
Bytes tfraRow(std::uint64_t time, std::uint64_t moof, int traf, int trun) {
    return U64(time) + U64(moof) + U8(static_cast<std::uint64_t>(traf)) +
           U8(static_cast<std::uint64_t>(trun)) + U8(1);
}

Bytes fragmentMfra(const RateRow& row, std::uint32_t moof) {
    const std::uint64_t first = 256ULL * row.duration;
    const std::uint64_t second = 264ULL * row.duration;
    const Bytes tables = tfra(1, 2, tfraRow(first, moof, 1, 1) + tfraRow(second, moof, 1, 2)) +
                         tfra(2, 1, tfraRow(64 * 1024, moof, 2, 1)) +
                         tfra(4, 2, tfraRow(first, moof, 4, 1) + tfraRow(second, moof, 4, 2));
    return Box("mfra", tables + FullBox("mfro", 0, 0, U32(8 + tables.size() + 16)));
}

Bytes fragmentFile(const RateRow& row, RecordRules rules) {
    Bytes samples;
    for (unsigned char i = 0; i < 32; ++i) {
        samples = samples + muxer_stream::BytesOf(*MakeChunk(muxer_stream::kPlainChunk, i));
    }
    const auto moovSize = static_cast<std::uint32_t>(fragmentMoov(row, rules, 0).size());
    const auto moofSize = static_cast<std::uint32_t>(fragmentMoof(row, rules, 0).size());
    const std::uint32_t payload = 176 + moovSize + 8;
    const std::uint32_t moof = payload + 32 * kPlainSize;
    return Ftyp() + UuidProf(row, 0x30000000) + fragmentMoov(row, rules, payload) + Box("mdat", samples) +
           fragmentMoof(row, rules, moof + moofSize + 8) +
           // With the kept rules the timecode sample has a place and no value.
           Box("mdat", muxer_stream::BytesOf(*MakeChunk(kFragmentChunk, 32)) +
                           muxer_stream::BytesOf(*MakeChunk(kLastChunk, 33)) +
                           U32(rules == RecordRules::kExact ? row.frameNumber : 0)) +
           fragmentMfra(row, moof);
}

// ---- The comparison.

/// Tells where two files part, so that the place can be found in the description.
void expectSameFile(const Bytes& actual, const Bytes& expected) {
    const auto [at, other] = std::mismatch(actual.begin(), actual.end(), expected.begin(), expected.end());
    if (at == actual.end() && other == expected.end()) {
        return;
    }
    const auto offset = at - actual.begin();
    const auto from = std::max<std::ptrdiff_t>(0, offset - 24);
    const auto excerpt = [&](const Bytes& bytes) {
        std::string text;
        const auto end = std::min<std::ptrdiff_t>(static_cast<std::ptrdiff_t>(bytes.size()), offset + 24);
        for (auto i = from; i < end; ++i) {
            char hex[8];
            std::snprintf(hex, sizeof hex, i == offset ? "[%02X] " : "%02X ",
                          bytes[static_cast<std::size_t>(i)]);
            text += hex;
        }
        return text;
    };
    ADD_FAILURE() << "files of " << actual.size() << " and expected " << expected.size()
                  << " bytes part at offset " << offset << ":\n  " << excerpt(actual) << "\nexpected:\n  "
                  << excerpt(expected);
}

class WholeFile : public ::testing::TestWithParam<RateRow> {
 protected:
    void open(const std::string& type, RecordRules rules = RecordRules::kKept) {
        muxer_stream::StopTheClock(platform);
        ASSERT_TRUE(Mp4MuxerFactory().Create(type, muxer));
        ASSERT_TRUE(muxer->Initialize());
        OutputSettings settings = muxer_stream::MakeSettings(directory, GetParam().key);
        settings.recordRules = rules;
        ASSERT_TRUE(muxer->Open(settings, kTimecode, /*dropFrame=*/true));
    }
    /// 34 chunks.
    void writeFragments() {
        for (unsigned char i = 0; i < 32; ++i) {
            ASSERT_TRUE(muxer->Write(MakeChunk(muxer_stream::kPlainChunk, i)));
        }
        ASSERT_TRUE(muxer->Write(MakeChunk(kFragmentChunk, 32)));
        ASSERT_TRUE(muxer->Write(MakeChunk(kLastChunk, 33)));
    }
    void close() {
        ASSERT_TRUE(muxer->WriteTmcd(kTimecode));
        ASSERT_TRUE(muxer->Close());
        ASSERT_TRUE(muxer->Uninitialize());
    }
    Bytes file() const { return muxer_stream::ReadFile(directory.Path() / "01_02_03_04.MP4"); }
    /// What a reader that knows the standard alone makes of the file: `counts` samples in the four tracks,
    /// with times that run on without a gap.
    static void expectMovie(const iso::Movie& movie, const std::array<std::size_t, 4>& counts,
                            std::size_t edits = 1) {
        const RateRow& row = GetParam();
        const std::array<std::uint32_t, 4> timescales = {row.timescale, 48000, row.timescale, row.timescale};
        const std::array<std::uint64_t, 4> durations = {row.duration, 1024, counts[0] * row.duration,
                                                        row.duration};
        const std::array<const char*, 4> entries = {"avc1", "mp4a", "tmcd", "rtmd"};
        const std::array<const char*, 4> handlers = {"vide", "soun", "tmcd", "meta"};
        ASSERT_EQ(movie.tracks.size(), 4U);
        EXPECT_EQ(movie.timescale, row.timescale);
        EXPECT_EQ(movie.nextTrackId, 5U);
        for (std::size_t i = 0; i < 4; ++i) {
            const iso::Track& track = movie.tracks[i];
            EXPECT_EQ(track.trackId, i + 1);
            EXPECT_EQ(track.flags, 7U);
            EXPECT_EQ(track.handler, handlers[i]);
            EXPECT_EQ(track.entryTypes, std::vector<std::string>{entries[i]});
            EXPECT_EQ(track.timescale, timescales[i]);
            EXPECT_EQ(track.language, 0x15C7);
            EXPECT_EQ(track.edits.size(), edits);
            ASSERT_EQ(track.samples.size(), counts[i]) << entries[i];
            for (std::size_t n = 0; n < counts[i]; ++n) {
                EXPECT_EQ(track.samples[n].decodeTime, n * durations[i]);
                EXPECT_EQ(track.samples[n].duration, durations[i]);
                EXPECT_EQ(track.samples[n].compositionOffset, 0);
                EXPECT_EQ(track.samples[n].descriptionIndex, 1U);
            }
        }
        if (movie.fragmented) {
            EXPECT_EQ(movie.fragmentDuration, counts[0] * row.duration);
        }
    }

    FakePlatform platform;
    TempDir directory;
    std::shared_ptr<Mp4Muxer> muxer;
};

TEST_P(WholeFile, ANormalFileIsAsDescribed) {
    open("normal");
    ASSERT_TRUE(muxer->Write(MakeChunk(kFirstChunk, 1)));
    ASSERT_TRUE(muxer->Write(MakeChunk(kSecondChunk, 2)));
    close();
    expectSameFile(file(), normalFile(GetParam()));
    expectMovie(iso::ReadMovie(file()), {16, 5, 1, 16});
}

TEST_P(WholeFile, ANormalFileIsTheSameWithExactRules) {
    open("normal", RecordRules::kExact);
    ASSERT_TRUE(muxer->Write(MakeChunk(kFirstChunk, 1)));
    ASSERT_TRUE(muxer->Write(MakeChunk(kSecondChunk, 2)));
    close();
    expectSameFile(file(), normalFile(GetParam()));
}

TEST_P(WholeFile, AFragmentedFileIsAsDescribed) {
    open("fragment");
    writeFragments();
    close();
    expectSameFile(file(), fragmentFile(GetParam(), RecordRules::kKept));
    expectMovie(iso::ReadMovie(file()), {272, 66, 1, 272});
}

TEST_P(WholeFile, AFragmentedFileWithExactRulesIsAsDescribed) {
    open("fragment", RecordRules::kExact);
    writeFragments();
    close();
    expectSameFile(file(), fragmentFile(GetParam(), RecordRules::kExact));
    expectMovie(iso::ReadMovie(file()), {272, 66, 1, 272}, /*edits=*/0);
}

INSTANTIATE_TEST_SUITE_P(Rates, WholeFile, ::testing::ValuesIn(kRates),
                         [](const auto& rate) { return std::to_string(rate.param.key); });

}  // namespace
}  // namespace clipfileModule
