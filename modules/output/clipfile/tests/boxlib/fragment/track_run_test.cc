#include "boxlib/fragment/track_run.h"

#include "boxlib/core/row_table.h"
#include "boxlib/support/fragment_sample.h"
#include "boxlib/support/registry.h"

namespace {

const FragmentSample kSample;

const BoxRegistration kTrun =
    RegisterBox<MbxTrunBox>({.name = "Trun",
                             .code = "trun",
                             .parents = "traf",
                             .clause = "ISO/IEC 14496-12 8.8.8",
                             .presence = Presence::kMandatory,
                             .golden = FragmentSample::Trun(),
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxTrunBox* box) {
                                     const MbxTfhdValues defaults = {0, 10, 0x1000, 1, 10, 5, 0x00010000};
                                     MbxSampleCursor cursor;
                                     MbxStartCursor(&kSample.track, &kSample.segment, &cursor);
                                     uint64_t position = 0x1000;
                                     const MbxTrunParams params = {&defaults, &cursor, &position};
                                     return MbxBuildTrun(context, nullptr, options, &params, box);
                                 },
                             .write = MbxWithScratch(nullptr, MbxWriteTrunBox),
                             .free = MbxFreeTrun});

class TrackRunTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
    }

    // Samples of the default size and duration, all sync samples but those that differ.
    void addSamples(const std::vector<MbxSampleInfo>& samples, uint64_t offset = 1000) {
        for (MbxSampleInfo info : samples) {
            info.offset = offset;
            ASSERT_EQ(add(info), MBX_OK);
        }
        ASSERT_EQ(endChunk(), MBX_OK);
    }

    static MbxSampleInfo withDependency(uint8_t dependency) {
        MbxSampleInfo info = sample();
        info.dependency = dependency;
        return info;
    }

    static MbxSampleInfo withOffset(int32_t offset) {
        MbxSampleInfo info = sample();
        info.compositionOffset = offset;
        return info;
    }

    // Starts to read the runs back.
    void rewind(uint64_t base = 1000) {
        defaults.baseDataOffset = base;
        position = base;
        MbxStartCursor(track, track->segments.first, &cursor);
    }

    // The next run as bytes, without its header.
    MbxStatus next(Bytes* bytes) {
        MbxTrunBox* box = nullptr;
        const MbxTrunParams params = {&defaults, &cursor, &position};
        const auto build = [&](MbxTrunBox* made) {
            return MbxBuildTrun(context, &session.scratch, &options, &params, made);
        };
        MBX_TRY(MbxMakeChild(context, &box, build, MbxFreeTrun));
        MemoryFile target;
        EXPECT_EQ(MbxWriteTrunBox(context, &session.scratch, &options, &target, 0, box, nullptr, nullptr),
                  MBX_OK);
        EXPECT_EQ(target.bytes.size(), box->size);
        *bytes = Bytes(target.bytes.begin() + 8, target.bytes.end());
        return MbxFreeTrun(context, box);
    }

    Bytes next() {
        Bytes bytes;
        EXPECT_EQ(next(&bytes), MBX_OK);
        return bytes;
    }

    Bytes only(const std::vector<MbxSampleInfo>& samples) {
        addSamples(samples);
        rewind();
        return next();
    }

    MbxTrack* track = nullptr;
    MbxTfhdValues defaults = {0, 10, 0, 1, 10, 100, 0};  // duration 10, size 100, sync samples
    MbxSampleCursor cursor = {};
    uint64_t position = 0;
};

TEST_F(TrackRunTest, EqualSamplesOfTheDefaultsHaveOnlyADataOffsetAndNoRows) {
    EXPECT_BYTES(only({sample(), sample(), sample()}), Hex("00 000001 00000003 00000000"));
    EXPECT_EQ(position, 1300U);
}

TEST_F(TrackRunTest, ADurationThatDiffersIsListedForAll) {
    EXPECT_BYTES(only({sample(), sample(100, 11)}), Hex("00 000101 00000002 00000000 0000000A 0000000B"));
}

TEST_F(TrackRunTest, ASizeThatDiffersIsListedForAll) {
    EXPECT_BYTES(only({sample(), sample(7)}), Hex("00 000201 00000002 00000000 00000064 00000007"));
    EXPECT_EQ(position, 1107U);
}

TEST_F(TrackRunTest, ASyncSampleBeforeOthersHasFirstSampleFlagsAlone) {
    defaults.defaultSampleFlags = 0x00010000;
    EXPECT_BYTES(only({sample(100, 10, 1), sample(100, 10, 0), sample(100, 10, 0)}),
                 Hex("00 000005 00000003 00000000 00000000"));
}

TEST_F(TrackRunTest, FlagsThatDifferOnTheSecondSampleAreListedAndClearFirstSampleFlags) {
    defaults.defaultSampleFlags = 0x00010000;
    EXPECT_BYTES(only({sample(100, 10, 1), sample(100, 10, 1), sample(100, 10, 0)}),
                 Hex("00 000401 00000003 00000000 00000000 00000000 00010000"));
}

TEST_F(TrackRunTest, DependenciesStandInTheFlagsAboveTheSyncBit) {
    EXPECT_BYTES(
        only({withDependency(0x20), withDependency(0x14), withDependency(0x14), withDependency(0xFF)}),
        Hex("00 000401 00000004 00000000 02000000 01400000 01400000 0FF00000"));
}

TEST_F(TrackRunTest, NoSyncSampleAtAllMakesAllNonSync) {
    EXPECT_BYTES(only({sample(100, 10, 0), sample(100, 10, 0)}),
                 Hex("00 000401 00000002 00000000 00010000 00010000"));
}

TEST_F(TrackRunTest, OneCompositionOffsetListsAll) {
    EXPECT_BYTES(only({withOffset(0), withOffset(3), withOffset(-1)}),
                 Hex("00 000801 00000003 00000000 00000000 00000003 FFFFFFFF"));
}

TEST_F(TrackRunTest, RowsHoldDurationSizeFlagsAndOffsetInThisOrder) {
    MbxSampleInfo info = sample(7, 11, 0);
    info.compositionOffset = 5;
    EXPECT_BYTES(only({sample(), info}), Hex("00 000F01 00000002 00000000"
                                             "0000000A 00000064 00000000 00000000"
                                             "0000000B 00000007 00010000 00000005"));
}

TEST_F(TrackRunTest, ForcedFieldsAreListedForAllSamples) {
    addSamples({sample(), sample()});
    const std::vector<Bytes> expected = {Hex("00 000101 00000002 00000000 0000000A 0000000A"),
                                         Hex("00 000201 00000002 00000000 00000064 00000064"),
                                         Hex("00 000401 00000002 00000000 00000000 00000000")};
    for (size_t i = 0; i < 3; i++) {
        for (size_t word = 0; word < 3; word++) track->perSampleForced[word] = word == i ? 1 : 0;
        rewind();
        EXPECT_BYTES(next(), expected[i]);
    }
}

TEST_F(TrackRunTest, VersionComesFromTheModeOrFromSignedOffsets) {
    addSamples({sample()});
    options.trun_version_mode = 1;
    rewind();
    EXPECT_BYTES(next(), Hex("01 000001 00000001 00000000"));
    options.trun_version_mode = 2;
    rewind();
    EXPECT_BYTES(next(), Hex("00 000001 00000001 00000000"));
    track->segments.first->compositionOffsets.signedOffsets = 1;
    rewind();
    EXPECT_BYTES(next(), Hex("01 000001 00000001 00000000"));
}

TEST_F(TrackRunTest, DataOffsetsCountFromTheBase) {
    addSamples({sample()}, 1000);
    addSamples({sample()}, 1500);
    addSamples({sample()}, 900);
    rewind();
    EXPECT_BYTES(next(), Hex("00 000001 00000001 00000000"));
    EXPECT_BYTES(next(), Hex("00 000001 00000001 000001F4"));
    EXPECT_BYTES(next(), Hex("00 000001 00000001 FFFFFF9C"));
    EXPECT_EQ(position, 1000U);
}

TEST_F(TrackRunTest, DataOffsetIsLeftOutWhereTheRunFollowsTheOneBeforeUnlessTheModeIsZero) {
    options.trun_offset_mode = 1;
    addSamples({sample()}, 1000);
    addSamples({sample()}, 1100);
    addSamples({sample()}, 1201);
    rewind();
    EXPECT_BYTES(next(), Hex("00 000000 00000001"));
    EXPECT_BYTES(next(), Hex("00 000000 00000001"));
    EXPECT_BYTES(next(), Hex("00 000001 00000001 000000C9"));
}

TEST_F(TrackRunTest, ARunThatGoesBackToTheBaseHasADataOffset) {
    options.trun_offset_mode = 1;
    addSamples({sample()}, 1000);
    addSamples({sample()}, 1000);  // a reader without an offset would go on at 1100
    rewind();
    EXPECT_BYTES(next(), Hex("00 000000 00000001"));
    EXPECT_BYTES(next(), Hex("00 000001 00000001 00000000"));
}

TEST_F(TrackRunTest, ANegativeCompositionOffsetAloneIsListed) {
    EXPECT_BYTES(only({withOffset(0), withOffset(-1)}), Hex("00 000801 00000002 00000000 00000000 FFFFFFFF"));
}

TEST_F(TrackRunTest, ARun2To31BytesBehindTheBaseOverflowsInBaseOffsetMode0AndPassesInMode1) {
    addSamples({sample()}, 1000 + 0x80000000ULL);
    rewind();
    Bytes bytes;
    EXPECT_EQ(next(&bytes), MBX_ERR_OVERFLOW);
    options.base_offset_mode = 1;
    rewind();
    EXPECT_BYTES(next(), Hex("00 000001 00000001 80000000"));
}

TEST_F(TrackRunTest, AFarRunOverflowsInBaseOffsetMode0AndIsCutInTheOthers) {
    struct Case {
        uint64_t base, offset;
        MbxStatus status;
        std::string cut;
    };
    constexpr uint64_t kBase = 0x200000000;
    for (const Case& c : {Case{kBase, kBase + 0x7FFFFFFF, MBX_OK, "7FFFFFFF"},
                          Case{kBase, kBase + 0x80000000, MBX_ERR_OVERFLOW, "80000000"},
                          Case{kBase, kBase - 0x80000000, MBX_OK, "80000000"},
                          Case{kBase, kBase - 0x80000001, MBX_ERR_OVERFLOW, "7FFFFFFF"},
                          Case{kBase, 0, MBX_ERR_OVERFLOW, "00000000"}}) {
        ASSERT_EQ(MbxFreeSegments(context, track), MBX_OK);
        addSamples({sample()}, c.offset);
        for (const uint32_t mode : {0U, 1U, 2U}) {
            options.base_offset_mode = mode;
            rewind(c.base);
            Bytes bytes;
            EXPECT_EQ(next(&bytes), mode == 0 ? c.status : MBX_OK) << c.offset << " " << mode;
            if (mode == 0) continue;
            EXPECT_BYTES(bytes, Hex("00 000001 00000001" + c.cut));
        }
    }
}

TEST_F(TrackRunTest, RunsCrossBlocksOfAllTables) {
    std::vector<MbxSampleInfo> samples;
    for (uint32_t i = 0; i < 2500; i++) {
        MbxSampleInfo info = sample(i + 1, i + 2, i % 2);
        info.dependency = static_cast<uint8_t>(i);
        info.compositionOffset = static_cast<int32_t>(i + 3);
        samples.push_back(info);
    }
    Bytes expected = Hex("00 000F01 000009C4 00000000");
    for (uint32_t i = 0; i < 2500; i++) {
        expected = expected + Words({i + 2, i + 1, (i & 0xFF) << 20 | (i % 2 == 1 ? 0 : 0x10000), i + 3});
    }
    EXPECT_EQ(only(samples), expected);
}

TEST_F(TrackRunTest, RowsUseTheScratchUpTo8192BytesAndABlockBeyond) {
    // 2047, 2048 and 2049 rows of 4 bytes: 8188, 8192 and 8196.
    for (const uint32_t count : {2047U, 2048U, 2049U}) {
        ASSERT_EQ(MbxFreeSegments(context, track), MBX_OK);
        std::vector<MbxSampleInfo> samples(count - 1, sample());
        samples.push_back(sample(7));
        addSamples(samples);
        rewind();
        const uint64_t before = host.allocations;
        const Bytes bytes = next();
        EXPECT_EQ(host.allocations - before,
                  count > 2048 ? 3U : 1U);  // the record; rows measured and written
        EXPECT_EQ(bytes.size(), 12 + count * 4);
        EXPECT_BYTES(Bytes(bytes.end() - 8, bytes.end()), Hex("00000064 00000007"));
    }
}

TEST_F(TrackRunTest, ATableThatRunsOutIsNotFound) {
    addSamples({sample(), sample(7, 11)});
    MbxSampleSegment* segment = track->segments.first;
    const auto status = [&] {
        rewind();
        Bytes bytes;
        return next(&bytes);
    };
    segment->durations.last->count--;
    segment->durations.list.current->count = 1;
    EXPECT_EQ(status(), MBX_ERR_NOT_FOUND);
    segment->durations.list.current->count = 2;
    segment->durations.last->count = 1;
    EXPECT_EQ(status(), MBX_OK);
    segment->sizes.list.current->count = 1;
    EXPECT_EQ(status(), MBX_ERR_NOT_FOUND);
    segment->sizes.list.current->count = 2;
    segment->compositionOffsets.runs.last->count = 1;
    EXPECT_EQ(status(), MBX_ERR_NOT_FOUND);
    segment->compositionOffsets.runs.last->count = 2;
    segment->dependencies.runCount = 0;
    EXPECT_EQ(status(), MBX_ERR_NOT_FOUND);
    segment->dependencies.runCount = 1;
    segment->chunkOffsets.list.current->count = 0;
    EXPECT_EQ(status(), MBX_ERR_NOT_FOUND);
    segment->chunkOffsets.list.current->count = 1;
    EXPECT_EQ(status(), MBX_OK);
    Bytes bytes;
    EXPECT_EQ(next(&bytes), MBX_ERR_NOT_FOUND);  // no further chunk
}

TEST_F(TrackRunTest, AUniformSizeRunsOutToo) {
    addSamples({sample(), sample()});
    track->segments.first->sizes.count = 1;
    rewind();
    Bytes bytes;
    EXPECT_EQ(next(&bytes), MBX_ERR_NOT_FOUND);
}

TEST_F(TrackRunTest, BuildRefusesNullArguments) {
    MbxTrunBox box = {};
    const MbxTrunParams params = {&defaults, &cursor, &position};
    EXPECT_EQ(MbxBuildTrun(nullptr, nullptr, &options, &params, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTrun(context, nullptr, nullptr, &params, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTrun(context, nullptr, &options, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTrun(context, nullptr, &options, &params, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
