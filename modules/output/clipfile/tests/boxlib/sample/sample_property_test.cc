// Random recordings over all values of the configuration words: an independent reader gets back exactly the
// samples, times, flags and offsets that were entered, or the library refused with the status that the values
// call for.
#include <random>

#include "boxlib/mbx.h"
#include "boxlib/support/IsoReader.h"
#include "boxlib/support/fixture.h"
#include "boxlib/support/track_fixture.h"

namespace {

using Random = std::mt19937;

constexpr uint32_t kMovieTimescale = 1000;

uint32_t below(Random* random, uint32_t limit) {
    return std::uniform_int_distribution<uint32_t>(0, limit - 1)(*random);
}

bool oneIn(Random* random, uint32_t count) {
    return below(random, count) == 0;
}

// How a track's samples are drawn.
struct TrackPlan {
    uint32_t timescale = 0;
    bool constantSize = false;
    bool constantDuration = false;
    uint32_t longest = 0;    // duration
    uint32_t syncEvery = 0;  // 0: none, 1: all
    bool dependencies = false;
    uint32_t compositionOffsets = 0;  // 0: none, 1: positive, 2: signed
    bool randomAccess = false;
};

TrackPlan drawPlan(Random* random) {
    TrackPlan plan;
    plan.timescale = 1 + below(random, 90000);
    plan.constantSize = oneIn(random, 3);
    plan.constantDuration = oneIn(random, 2);
    plan.longest = oneIn(random, 4) ? UINT32_MAX : 2000;
    plan.syncEvery = below(random, 4);
    plan.dependencies = oneIn(random, 3);
    plan.compositionOffsets = below(random, 3);
    plan.randomAccess = !oneIn(random, 3);
    return plan;
}

MbxSampleInfo drawSample(Random* random, const TrackPlan& plan, uint32_t number) {
    MbxSampleInfo sample = {};
    sample.size = plan.constantSize ? 17 : below(random, 40);
    sample.duration = plan.constantDuration ? plan.longest / 2 : below(random, plan.longest);
    sample.isSync = plan.syncEvery != 0 && number % plan.syncEvery == 0;
    sample.dependency = static_cast<uint8_t>(plan.dependencies ? below(random, 256) : 0);
    if (plan.compositionOffsets != 0 && oneIn(random, 2)) {
        sample.compositionOffset = static_cast<int32_t>(below(random, 1000));
        if (plan.compositionOffsets == 2) sample.compositionOffset -= 500;
    }
    return sample;
}

// A sample as it was entered, with its place in the file once that is known.
struct Entered {
    iso::Sample sample;
    bool randomAccess = false;
};

struct EnteredTrack {
    TrackPlan plan;
    std::vector<Entered> samples;
    uint64_t decodeEnd = 0;
    uint64_t firstSegmentEnd = 0;
};

// One recording from start to end.
class Recording {
 public:
    Recording(const MbxOptions& options, uint32_t seed) : random_(seed) {
        const MbxCallbacks callbacks = host_.callbacks();
        EXPECT_EQ(MbxCreateContext(&callbacks, &context_), MBX_OK);
        const MbxSessionConfig config = {0, options};
        EXPECT_EQ(MbxSessionCreate(context_, &config, &session_), MBX_OK);
        options_ = options;
    }

    Recording(const Recording&) = delete;
    Recording& operator=(const Recording&) = delete;

    ~Recording() {
        EXPECT_EQ(MbxSessionDestroy(session_), MBX_OK);
        EXPECT_EQ(MbxDestroyContext(context_), MBX_OK);
        EXPECT_TRUE(host_.live.empty());
    }

    void run() {
        createTracks();
        const uint32_t fragments = oneIn(&random_, 4) ? 0 : 1 + below(&random_, 4);
        const uint64_t payload = enterSegment(0, 0);
        placeFirst(payload);
        for (EnteredTrack& track : tracks_) track.firstSegmentEnd = track.decodeEnd;
        if (fragments != 0) {
            ASSERT_EQ(MbxSealFirstFragment(session_), MBX_OK);
        }
        for (uint32_t i = 1; i <= fragments && !refused_; i++) {
            const uint64_t size = enterSegment(i, 0);
            ASSERT_EQ(MbxSealFragment(session_), MBX_OK);
            writeFragment(i, size);
        }
        if (refused_) return;
        fragments_ = fragments;
        if (oneIn(&random_, 4)) {
            EXPECT_EQ(MbxReleaseFragment(session_, 0), fragments != 0 ? MBX_OK : MBX_ERR_BAD_STATE);
        }
        writeMoov();
        if (refused_) return;
        writeMfra();
        if (refused_) return;
        compare();
    }

    bool refused() const { return refused_; }

 private:
    void createTracks() {
        ASSERT_EQ(MbxCreateMovie(session_, kMovieTimescale), MBX_OK);
        tracks_.resize(1 + below(&random_, 3));
        for (uint32_t i = 0; i < tracks_.size(); i++) {
            TrackPlan& plan = tracks_[i].plan;
            plan = drawPlan(&random_);
            MbxTrackParams params = TrackParams(i + 1, plan.timescale);
            for (uint32_t& word : params.defaultsForced) word = below(&random_, 2);
            for (uint32_t& word : params.perSampleForced) word = below(&random_, 2);
            if (oneIn(&random_, 3)) params.fragmentDefaults[0] = 2;
            if (oneIn(&random_, 3)) params.fragmentDefaults[1] = 7;
            if (oneIn(&random_, 3)) params.fragmentDefaults[2] = 17;
            if (oneIn(&random_, 3)) params.fragmentDefaults[3] = 0x00010000;
            const MbxMetaEntryParams entry = {1};
            uint32_t number = 0;
            ASSERT_EQ(MbxAddMetaTrack(session_, &params, &number), MBX_OK);
            ASSERT_EQ(MbxAddDataReference(session_, number, nullptr, 0, &number), MBX_OK);
            for (int n = 0; n < 2; n++) ASSERT_EQ(MbxAddMetaEntry(session_, i + 1, &entry, &number), MBX_OK);
            if (plan.compositionOffsets == 2) {
                ASSERT_EQ(MbxSetSignedOffsets(session_, i + 1, 1), MBX_OK);
            }
        }
    }

    // Enters chunks of all tracks in random order, with gaps between some of them; returns the bytes that
    // they span.
    uint64_t enterSegment(uint32_t fragment, uint64_t payload) {
        std::vector<uint32_t> chunks(tracks_.size());
        std::vector<uint32_t> descriptions(tracks_.size());
        std::vector<uint32_t> truns(tracks_.size(), 0);
        for (uint32_t i = 0; i < tracks_.size(); i++) {
            chunks[i] = oneIn(&random_, 3) ? 0 : 1 + below(&random_, 3);
            descriptions[i] = 1 + below(&random_, 2);
        }
        std::vector<uint32_t> order;
        for (uint32_t i = 0; i < tracks_.size(); i++) order.insert(order.end(), chunks[i], i);
        std::shuffle(order.begin(), order.end(), random_);
        for (const uint32_t i : order) {
            if (oneIn(&random_, 4)) payload += below(&random_, 50);
            // A fragment tells one sample description for all of its chunks.
            if (fragment == 0) descriptions[i] = 1 + below(&random_, 2);
            payload = enterChunk(i, fragment, descriptions[i], ++truns[i], payload);
        }
        return payload;
    }

    uint64_t enterChunk(uint32_t index, uint32_t fragment, uint32_t description, uint32_t trun,
                        uint64_t payload) {
        EnteredTrack& track = tracks_[index];
        // A long one makes a number in the index that needs two bytes.
        const uint32_t count = oneIn(&random_, 100) ? 250 + below(&random_, 20) : 1 + below(&random_, 6);
        const uint64_t offset = payload;
        if (index == 0 && fragment == 0 && trun == 1) firstChunkSize_ = count;
        for (uint32_t i = 0; i < count; i++) {
            MbxSampleInfo sample =
                drawSample(&random_, track.plan, static_cast<uint32_t>(track.samples.size()));
            sample.offset = offset;
            sample.descriptionIndex = description;
            Entered entered;
            entered.randomAccess = track.plan.randomAccess && (i == 0 || oneIn(&random_, 4));
            EXPECT_EQ(MbxAddSample(session_, index + 1, &sample, entered.randomAccess), MBX_OK);
            entered.sample.offset = payload;
            entered.sample.size = sample.size;
            entered.sample.decodeTime = track.decodeEnd;
            entered.sample.duration = sample.duration;
            entered.sample.compositionOffset = sample.compositionOffset;
            entered.sample.isSync = sample.isSync != 0;
            entered.sample.dependency = sample.dependency;
            entered.sample.descriptionIndex = description;
            entered.sample.fragment = fragment;
            if (fragment != 0) {
                entered.sample.trunNumber = trun;
                entered.sample.sampleNumber = i + 1;
            }
            track.samples.push_back(entered);
            track.decodeEnd += sample.duration;
            payload += sample.size;
        }
        EXPECT_EQ(MbxEndChunk(session_, index + 1), MBX_OK);
        return payload;
    }

    // Moves what was entered of a fragment to its place.
    void place(uint32_t fragment, uint64_t moofPosition, uint64_t dataPosition) {
        uint32_t traf = 0;
        for (EnteredTrack& track : tracks_) {
            bool present = false;
            for (Entered& entered : track.samples) {
                if (entered.sample.fragment != fragment) continue;
                if (!present && fragment != 0) traf++;
                present = true;
                entered.sample.offset += dataPosition;
                entered.sample.moofPosition = moofPosition;
                entered.sample.trafNumber = traf;
            }
        }
    }

    // Writes the header of an `mdat` and leaves room for its payload.
    void writeMdat(uint64_t payload) {
        uint64_t header = 0;
        ASSERT_EQ(MbxWriteMdatHeader(session_, &file_, file_.bytes.size(), MbxCode("mdat"), payload, &header),
                  MBX_OK);
        file_.bytes.resize(file_.bytes.size() + payload);
    }

    uint64_t mdatHeader(uint64_t payload) {
        uint64_t header = 0;
        EXPECT_EQ(MbxWriteMdatHeader(session_, nullptr, 0, MbxCode("mdat"), payload, &header), MBX_OK);
        return header;
    }

    void placeFirst(uint64_t payload) {
        const uint64_t data = mdatHeader(payload);
        writeMdat(payload);
        ASSERT_EQ(MbxShiftChunkOffsets(session_, 0, 0, static_cast<int64_t>(data)), MBX_OK);
        place(0, 0, data);
        // One chunk far away, as in a file of many gigabytes.
        if (!oneIn(&random_, 4) || firstChunkSize_ == 0) return;
        constexpr int64_t kFar = 1LL << 32;
        ASSERT_EQ(MbxShiftChunkOffsets(session_, 1, 1, kFar), MBX_OK);
        isFar_ = true;
        for (size_t i = 0; i < firstChunkSize_; i++) tracks_[0].samples[i].sample.offset += kFar;
    }

    void writeFragment(uint32_t fragment, uint64_t payload) {
        const uint64_t position = file_.bytes.size();
        const bool absolute = options_.base_offset_mode == 0;
        const bool wideTime = decodeTimeIsWide(fragment);
        uint64_t size = 0;
        uint64_t shifted = 0;
        // A data offset that was left out can come to be needed by the shift itself.
        for (int i = 0; i < 3; i++) {
            const MbxStatus status = MbxWriteMoof(session_, nullptr, fragment, 0, &size);
            if (wideTime) {
                EXPECT_EQ(status, MBX_ERR_BAD_STATE);
                refused_ = true;
                return;
            }
            ASSERT_EQ(status, MBX_OK);
            const uint64_t target = (absolute ? position : 0) + size + mdatHeader(payload);
            const auto delta = static_cast<int64_t>(target - shifted);
            ASSERT_EQ(MbxShiftFragmentOffsets(session_, fragment, 0, 0, delta), MBX_OK);
            shifted = target;
        }
        refuseFarRun(fragment);
        ASSERT_EQ(MbxSetFragmentBase(session_, fragment, position), MBX_OK);
        uint64_t written = 0;
        ASSERT_EQ(MbxWriteMoof(session_, &file_, fragment, position, &written), MBX_OK);
        ASSERT_EQ(written, size);
        ASSERT_EQ(file_.bytes.size(), position + size);
        if (oneIn(&random_, 2)) {
            ASSERT_EQ(MbxReleaseFragment(session_, fragment), MBX_OK);
        }
        place(fragment, position, position + size + mdatHeader(payload));
        writeMdat(payload);
    }

    // A run out of reach of the base data offset is refused where `tfhd` carries one, and taken once it is
    // back.
    void refuseFarRun(uint32_t fragment) {
        uint32_t runs = 0;
        for (const Entered& entered : tracks_[0].samples) {
            if (entered.sample.fragment == fragment) runs = entered.sample.trunNumber;
        }
        if (runs < 2 || !oneIn(&random_, 4)) return;
        constexpr int64_t kOutOfReach = 1LL << 31;
        const MbxStatus expected = options_.base_offset_mode == 0 ? MBX_ERR_OVERFLOW : MBX_OK;
        uint64_t size = 0;
        ASSERT_EQ(MbxShiftFragmentOffsets(session_, fragment, 1, runs, kOutOfReach), MBX_OK);
        ASSERT_EQ(MbxWriteMoof(session_, nullptr, fragment, 0, &size), expected);
        ASSERT_EQ(MbxShiftFragmentOffsets(session_, fragment, 1, runs, -kOutOfReach), MBX_OK);
    }

    bool narrowTimes() const { return options_.time_version_mode == 0 || options_.time_version_mode == 2; }

    // Whether a `tfdt` of the fragment has a time that the mode cannot carry.
    bool decodeTimeIsWide(uint32_t fragment) const {
        if (options_.tfdt_mode != 1 || !narrowTimes()) return false;
        for (const EnteredTrack& track : tracks_) {
            for (const Entered& entered : track.samples) {
                if (entered.sample.fragment != fragment) continue;
                if (entered.sample.decodeTime > UINT32_MAX) return true;
                break;
            }
        }
        return false;
    }

    // In the middle of the file: fragments stand before it, which they may.
    void writeMoov() {
        uint64_t duration = 0;
        for (const EnteredTrack& track : tracks_) {
            duration = std::max(duration, rescale(track.decodeEnd, track.plan.timescale));
        }
        const bool wideDuration = fragments_ != 0 && options_.mehd_mode == 2 && duration > UINT32_MAX;
        const bool wideOffset = isFar_ && options_.chunk_offset_mode == 0;
        uint64_t measured = 0;
        const MbxStatus status = MbxWriteMoov(session_, nullptr, 0, &measured);
        if (wideDuration || wideOffset) {
            EXPECT_EQ(status, MBX_ERR_BAD_STATE);
            refused_ = true;
            return;
        }
        ASSERT_EQ(status, MBX_OK);
        const uint64_t position = file_.bytes.size();
        uint64_t written = 0;
        ASSERT_EQ(MbxWriteMoov(session_, &file_, position, &written), MBX_OK);
        ASSERT_EQ(written, measured);
        ASSERT_EQ(file_.bytes.size(), position + measured);
    }

    static uint64_t rescale(uint64_t value, uint32_t timescale) {
        return value / timescale * kMovieTimescale + value % timescale * kMovieTimescale / timescale;
    }

    void writeMfra() {
        bool wide = false;
        for (const EnteredTrack& track : tracks_) {
            for (const Entered& entered : track.samples) {
                wide |= isIndexed(entered) && entered.sample.decodeTime > UINT32_MAX;
            }
        }
        const uint64_t position = file_.bytes.size();
        uint64_t size = 0;
        const MbxStatus status = MbxWriteMfra(session_, &file_, position, &size);
        if (wide && options_.time_version_mode == 2) {
            EXPECT_EQ(status, MBX_ERR_BAD_STATE);
            refused_ = true;
            return;
        }
        ASSERT_EQ(status, MBX_OK);
        ASSERT_EQ(file_.bytes.size(), position + size);
    }

    static bool isIndexed(const Entered& entered) {
        return entered.randomAccess && entered.sample.fragment != 0;
    }

    // A duration as a header of version 0 holds it: these choosers cut it without a word.
    uint64_t cut(uint64_t duration) const { return narrowTimes() ? duration & UINT32_MAX : duration; }

    void compare() {
        const iso::Movie movie = iso::ReadMovie(file_.bytes);
        EXPECT_EQ(movie.timescale, kMovieTimescale);
        EXPECT_EQ(movie.nextTrackId, tracks_.size() + 1);
        EXPECT_EQ(movie.fragmented, fragments_ != 0);
        EXPECT_EQ(movie.fragments.size(), fragments_);
        EXPECT_EQ(movie.fragmentDuration.has_value(), fragments_ != 0 && options_.mehd_mode != 0);
        ASSERT_EQ(movie.tracks.size(), tracks_.size());
        uint64_t longest = 0;
        uint64_t fragmentDuration = 0;
        for (size_t i = 0; i < tracks_.size(); i++) {
            const EnteredTrack& entered = tracks_[i];
            const iso::Track& track = movie.tracks[i];
            EXPECT_EQ(track.trackId, i + 1);
            EXPECT_EQ(track.timescale, entered.plan.timescale);
            EXPECT_EQ(track.mediaDuration, cut(entered.firstSegmentEnd));
            const uint64_t duration = rescale(entered.firstSegmentEnd, entered.plan.timescale);
            longest = std::max(longest, duration);
            fragmentDuration = std::max(fragmentDuration, rescale(entered.decodeEnd, entered.plan.timescale));
            compareSamples(track, entered);
            compareIndex(track, entered);
        }
        EXPECT_EQ(movie.duration, cut(longest));
        EXPECT_EQ(movie.fragmentDuration.value_or(fragmentDuration), fragmentDuration);
    }

    static void compareSamples(const iso::Track& track, const EnteredTrack& entered) {
        ASSERT_EQ(track.samples.size(), entered.samples.size());
        for (size_t i = 0; i < track.samples.size(); i++) {
            SCOPED_TRACE("sample " + std::to_string(i) + " of track " + std::to_string(track.trackId));
            const iso::Sample& read = track.samples[i];
            const iso::Sample& expected = entered.samples[i].sample;
            ASSERT_EQ(read.offset, expected.offset);
            ASSERT_EQ(read.size, expected.size);
            ASSERT_EQ(read.decodeTime, expected.decodeTime);
            ASSERT_EQ(read.duration, expected.duration);
            ASSERT_EQ(read.compositionOffset, expected.compositionOffset);
            ASSERT_EQ(read.isSync, expected.isSync);
            ASSERT_EQ(read.dependency, expected.dependency);
            ASSERT_EQ(read.descriptionIndex, expected.descriptionIndex);
            ASSERT_EQ(read.fragment, expected.fragment);
            ASSERT_EQ(read.moofPosition, expected.moofPosition);
            ASSERT_EQ(read.trafNumber, expected.trafNumber);
            ASSERT_EQ(read.trunNumber, expected.trunNumber);
            ASSERT_EQ(read.sampleNumber, expected.sampleNumber);
        }
    }

    static void compareIndex(const iso::Track& track, const EnteredTrack& entered) {
        std::vector<const iso::Sample*> expected;
        for (const Entered& sample : entered.samples) {
            if (isIndexed(sample)) expected.push_back(&sample.sample);
        }
        ASSERT_EQ(track.index.size(), expected.size());
        for (size_t i = 0; i < expected.size(); i++) {
            ASSERT_EQ(track.index[i].time, expected[i]->decodeTime);
            ASSERT_EQ(track.index[i].moofPosition, expected[i]->moofPosition);
            ASSERT_EQ(track.index[i].trafNumber, expected[i]->trafNumber);
            ASSERT_EQ(track.index[i].trunNumber, expected[i]->trunNumber);
            ASSERT_EQ(track.index[i].sampleNumber, expected[i]->sampleNumber);
        }
    }

    MemoryHost host_;
    MbxContext* context_ = nullptr;
    MbxSession* session_ = nullptr;
    MbxOptions options_ = {};
    Random random_;
    MemoryFile file_;
    std::vector<EnteredTrack> tracks_;
    uint32_t fragments_ = 0;
    size_t firstChunkSize_ = 0;  // samples in the first chunk that `moov` reports of the first track
    bool isFar_ = false;
    bool refused_ = false;
};

std::string print(const MbxOptions& options) {
    const uint32_t words[] = {options.box_size_mode,     options.time_version_mode, options.chunk_offset_mode,
                              options.mehd_mode,         options.base_offset_mode,  options.trun_offset_mode,
                              options.trun_version_mode, options.tfdt_mode,         options.reserved};
    return testing::PrintToString(words);
}

// Box sizes and time versions, over which the tests run in parallel.
class SamplePropertyTest : public testing::TestWithParam<std::tuple<uint32_t, uint32_t>> {};

TEST_P(SamplePropertyTest, AReaderGetsBackWhatWasEnteredOverAllConfigurations) {
    uint32_t refused = 0;
    uint32_t read = 0;
    uint32_t seed = std::get<0>(GetParam()) * 1000000 + std::get<1>(GetParam()) * 100000;
    for (uint32_t rest = 0; rest < 3 * 4 * 3 * 2 * 2 * 2; rest++) {
        uint32_t digits = rest;
        const auto draw = [&](uint32_t values) {
            const uint32_t digit = digits % values;
            digits /= values;
            return digit;
        };
        MbxOptions options = {};
        options.box_size_mode = std::get<0>(GetParam());
        options.time_version_mode = std::get<1>(GetParam());
        options.chunk_offset_mode = draw(3);
        options.mehd_mode = draw(4);
        options.base_offset_mode = draw(3);
        options.trun_offset_mode = draw(2);
        options.trun_version_mode = draw(2);
        options.tfdt_mode = draw(2);
        options.reserved = rest;  // without effect
        for (int i = 0; i < 3; i++) {
            SCOPED_TRACE("seed " + std::to_string(++seed) + ", configuration " + print(options));
            Recording recording(options, seed);
            try {
                recording.run();
            } catch (const iso::IsoError& error) {
                ADD_FAILURE() << error.what();
            }
            if (testing::Test::HasFailure()) return;
            (recording.refused() ? refused : read)++;
        }
    }
    EXPECT_GT(read, 400U);
    EXPECT_GT(refused, 0U);
}

std::string nameOf(const testing::TestParamInfo<std::tuple<uint32_t, uint32_t>>& param) {
    return "BoxSize" + std::to_string(std::get<0>(param.param)) + "Time" +
           std::to_string(std::get<1>(param.param));
}

INSTANTIATE_TEST_SUITE_P(Modes, SamplePropertyTest,
                         testing::Combine(testing::Range(0U, 3U), testing::Range(0U, 4U)), nameOf);

}  // namespace
