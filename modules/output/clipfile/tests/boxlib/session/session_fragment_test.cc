#include "boxlib/model/session_model.h"
#include "boxlib/support/fixture.h"
#include "boxlib/support/track_fixture.h"

namespace {

class SessionFragmentTest : public SessionTest {
 protected:
    void SetUp() override {
        SessionTest::SetUp();
        config.options.mehd_mode = 1;
        CreateSession();
    }

    void createTrack() {
        ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
        const MbxTrackParams params = TrackParams(7, 1000);
        const MbxMetaEntryParams entry = {1};
        uint32_t number = 0;
        ASSERT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
        ASSERT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_OK);
        ASSERT_EQ(MbxAddMetaEntry(session, 1, &entry, &number), MBX_OK);
    }

    void addChunk(uint64_t offset, uint32_t randomAccess) {
        MbxSampleInfo sample = {};
        sample.size = 16;
        sample.offset = offset;
        sample.duration = 100;
        sample.isSync = 1;
        sample.descriptionIndex = 1;
        ASSERT_EQ(MbxAddSample(session, 1, &sample, randomAccess), MBX_OK);
        ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    }

    // One fragment behind what `moov` reports, sealed and with a row in the index, written with one word of
    // the configuration changed.
    struct Outcome {
        MbxStatus moov, moof, mfra;
        Bytes fragment;
    };

    Outcome outcomeOf(uint32_t MbxOptions::*word, uint32_t value) {
        const MbxOptions original = session->config;
        session->config.*word = value;
        Outcome outcome = {};
        MemoryFile target;
        outcome.moov = MbxWriteMoov(session, nullptr, 0, &size);
        outcome.moof = MbxWriteMoof(session, &target, 1, 0, &size);
        outcome.mfra = MbxWriteMfra(session, nullptr, 0, &size);
        outcome.fragment = target.bytes;
        session->config = original;
        return outcome;
    }

    uint64_t size = 0;
};

TEST_F(SessionFragmentTest, EveryOperationRefusesANullSession) {
    const uint32_t forced[4] = {};
    EXPECT_EQ(MbxForceDefaults(nullptr, 1, forced), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxShiftFragmentOffsets(nullptr, 1, 0, 0, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetFragmentBase(nullptr, 1, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSealFirstFragment(nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSealFragment(nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxReleaseFragment(nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMoof(nullptr, &file, 1, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMfra(nullptr, &file, 0, &size), MBX_ERR_INVALID_ARG);
}

TEST_F(SessionFragmentTest, EveryOperationNeedsAMovieAndAResult) {
    const uint32_t forced[4] = {};
    EXPECT_EQ(MbxForceDefaults(session, 1, forced), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxShiftFragmentOffsets(session, 1, 0, 0, 1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetFragmentBase(session, 1, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSealFirstFragment(session), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSealFragment(session), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxReleaseFragment(session, 1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxWriteMoof(session, &file, 1, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxWriteMfra(session, &file, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxWriteMoof(session, &file, 1, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMfra(session, &file, 0, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(SessionFragmentTest, AFragmentIsSealedPlacedWrittenReleasedAndIndexed) {
    createTrack();
    addChunk(0, 1);
    ASSERT_EQ(MbxSealFirstFragment(session), MBX_OK);
    addChunk(0, 1);
    ASSERT_EQ(MbxSealFragment(session), MBX_OK);
    ASSERT_EQ(MbxWriteMoof(session, nullptr, 1, 0, &size), MBX_OK);
    EXPECT_EQ(size, 76U);
    ASSERT_EQ(MbxShiftFragmentOffsets(session, 1, 0, 0, 0x100 + 76 + 8), MBX_OK);
    ASSERT_EQ(MbxSetFragmentBase(session, 1, 0x100), MBX_OK);
    ASSERT_EQ(MbxWriteMoof(session, &file, 1, 0, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000004C 'moof'"
                                 "00000010 'mfhd' 00000000 00000001"
                                 "00000034 'traf'"
                                 "00000018 'tfhd' 00000001 00000007 0000000000000154"
                                 "00000014 'trun' 00000001 00000001 00000000"));
    ASSERT_EQ(MbxReleaseFragment(session, 1), MBX_OK);
    MemoryFile index;
    ASSERT_EQ(MbxWriteMfra(session, &index, 0, &size), MBX_OK);
    EXPECT_BYTES(index.bytes, Hex("00000043 'mfra'"
                                  "0000002B 'tfra' 01000000 00000007 00000000 00000001"
                                  "0000000000000064 0000000000000100 01 01 01"
                                  "00000010 'mfro' 00000000 00000043"));
}

TEST_F(SessionFragmentTest, ATrackThatBeginsAfterMoovStatesItsDefaultsWhereTheyAreForced) {
    createTrack();
    ASSERT_EQ(MbxSealFirstFragment(session), MBX_OK);
    const uint32_t forced[4] = {1, 1, 1, 1};
    ASSERT_EQ(MbxForceDefaults(session, 1, forced), MBX_OK);
    addChunk(0x54, 0);
    ASSERT_EQ(MbxSealFragment(session), MBX_OK);
    ASSERT_EQ(MbxWriteMoof(session, &file, 1, 0, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000005C 'moof'"
                                 "00000010 'mfhd' 00000000 00000001"
                                 "00000044 'traf'"
                                 "00000028 'tfhd'"
                                 "00 00003B 00000007"  // flags: base, description, duration, size, flags
                                 "0000000000000054"    // base_data_offset
                                 "00000001"            // sample_description_index
                                 "00000064"            // default_sample_duration
                                 "00000010"            // default_sample_size
                                 "00000000"            // default_sample_flags
                                 "00000014 'trun' 00000001 00000001 00000000"));
    const uint32_t none[4] = {};
    ASSERT_EQ(MbxForceDefaults(session, 1, none), MBX_OK);
    MemoryFile plain;
    ASSERT_EQ(MbxWriteMoof(session, &plain, 1, 0, &size), MBX_OK);
    EXPECT_EQ(size, 76U);
}

TEST_F(SessionFragmentTest, ForcedDefaultsAreWordsOf0And1OfATrackThatExists) {
    createTrack();
    const uint32_t forced[4] = {1, 1, 1, 2};
    EXPECT_EQ(MbxForceDefaults(session, 1, forced), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(session->movie->tracks.first->defaultsForced[0], 0U);
    const uint32_t one[4] = {0, 0, 1, 0};
    EXPECT_EQ(MbxForceDefaults(session, 0, one), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxForceDefaults(session, 2, one), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxForceDefaults(session, 1, nullptr), MBX_ERR_INVALID_ARG);
}

// What no documented mode is: some words are refused, the others are taken for the mode next to them.
TEST_F(SessionFragmentTest, EveryWordOfTheConfigurationHasItsAnswerToAnUnknownMode) {
    createTrack();
    addChunk(0x1000, 0);
    ASSERT_EQ(MbxSealFirstFragment(session), MBX_OK);
    addChunk(0x1010, 1);
    addChunk(0x1020, 0);
    ASSERT_EQ(MbxSealFragment(session), MBX_OK);
    struct Case {
        const char* name;
        uint32_t MbxOptions::*word;
        uint32_t unknown;
        MbxStatus moov, moof, mfra;
        uint32_t taken;  // the mode that it is taken for
    };
    constexpr MbxStatus kRefused = MBX_ERR_INVALID_ARG;
    for (const Case& c :
         {Case{"box size", &MbxOptions::box_size_mode, 3, kRefused, kRefused, kRefused, 3},
          Case{"time version", &MbxOptions::time_version_mode, 4, MBX_ERR_INTERNAL, MBX_OK, MBX_OK, 2},
          Case{"chunk offset", &MbxOptions::chunk_offset_mode, 3, MBX_OK, MBX_OK, MBX_OK, 1},
          Case{"mehd", &MbxOptions::mehd_mode, 4, MBX_OK, MBX_OK, MBX_OK, 1},
          Case{"base offset", &MbxOptions::base_offset_mode, 3, MBX_OK, kRefused, MBX_OK, 3},
          Case{"trun offset", &MbxOptions::trun_offset_mode, 2, MBX_OK, MBX_OK, MBX_OK, 1},
          Case{"trun version", &MbxOptions::trun_version_mode, 2, MBX_OK, MBX_OK, MBX_OK, 0},
          Case{"tfdt", &MbxOptions::tfdt_mode, 2, MBX_OK, MBX_OK, MBX_OK, 0},
          Case{"reserved", &MbxOptions::reserved, 7, MBX_OK, MBX_OK, MBX_OK, 0}}) {
        SCOPED_TRACE(c.name);
        const Outcome outcome = outcomeOf(c.word, c.unknown);
        EXPECT_EQ(outcome.moov, c.moov);
        EXPECT_EQ(outcome.moof, c.moof);
        EXPECT_EQ(outcome.mfra, c.mfra);
        if (c.moof == MBX_OK) {
            EXPECT_BYTES(outcome.fragment, outcomeOf(c.word, c.taken).fragment);
        }
    }
}

}  // namespace
