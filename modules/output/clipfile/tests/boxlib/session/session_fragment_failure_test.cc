// The Nth operation of a host fails, for every N of the sealing, measuring and writing of a fragmented
// recording. What failed is tried again, and in the end the file is the same as without a failure.
#include "boxlib/core/box.h"
#include "boxlib/model/entry_model.h"
#include "boxlib/model/session_model.h"
#include "boxlib/sample/sample_group_model.h"
#include "boxlib/support/fixture.h"
#include "boxlib/support/track_fixture.h"

namespace {

enum class Failure { kNone, kAllocation, kWrite, kShortWrite, kSeek, kCopy };

// One recording, of which the Nth operation of one kind fails once.
class Attempt {
 public:
    Attempt(Failure failure, uint64_t n) : failure_(failure), left_(n) {
        const MbxCallbacks callbacks = host_.callbacks();
        EXPECT_EQ(MbxCreateContext(&callbacks, &context_), MBX_OK);
        MbxSessionConfig config = {};
        config.options.mehd_mode = 1;
        config.options.tfdt_mode = 1;
        EXPECT_EQ(MbxSessionCreate(context_, &config, &session_), MBX_OK);
    }

    Attempt(const Attempt&) = delete;
    Attempt& operator=(const Attempt&) = delete;

    ~Attempt() {
        EXPECT_EQ(MbxSessionDestroy(session_), MBX_OK);
        EXPECT_EQ(MbxDestroyContext(context_), MBX_OK);
        EXPECT_TRUE(host_.live.empty()) << host_.live.size() << " blocks leaked";
    }

    void run() {
        createTracks();
        enterChunk(1, 3);
        enterChunk(2, 2);
        perform([&] { return MbxSealFirstFragment(session_); });
        writeFragment(1, {{1, 2}, {2, 2}, {1, 3}, {2, 1}});
        writeFragment(2, {{1, 4}});
        writeFragment(3, {{2, 5}, {1, 520}});  // more rows than the scratch holds
        write([&](MbxFile* target, uint64_t* size) {
            return MbxWriteMoov(session_, target, file_.bytes.size(), size);
        });
        write([&](MbxFile* target, uint64_t* size) {
            return MbxWriteMfra(session_, target, file_.bytes.size(), size);
        });
    }

    const Bytes& bytes() const { return file_.bytes; }
    bool hasFailed() const { return hasFailed_; }

 private:
    void createTracks() {
        ASSERT_EQ(MbxCreateMovie(session_, 1000), MBX_OK);
        for (uint32_t number = 1; number <= 2; number++) {
            MbxTrackParams params = TrackParams(number, 1000);
            params.auxEnabled = number == 2 ? 1 : 0;
            params.trickEnabled = number == 2 ? 1 : 0;
            const MbxMetaEntryParams entry = {1};
            uint32_t index = 0;
            ASSERT_EQ(MbxAddMetaTrack(session_, &params, &index), MBX_OK);
            ASSERT_EQ(MbxAddDataReference(session_, number, nullptr, 0, &index), MBX_OK);
            ASSERT_EQ(MbxAddMetaEntry(session_, number, &entry, &index), MBX_OK);
        }
    }

    void enterChunk(uint32_t track, uint32_t samples) {
        const uint8_t auxiliary[] = {0xA0, 0xA1, 0xA2};
        for (uint32_t i = 0; i < samples; i++) {
            MbxSampleInfo sample = {};
            sample.size = i + 1;
            sample.offset = entered_;
            sample.duration = i + track;
            sample.isSync = i == 0 ? 1 : 0;
            sample.dependency = static_cast<uint8_t>(i);
            sample.compositionOffset = static_cast<int32_t>(i);
            sample.descriptionIndex = 1;
            sample.auxOffset = UINT32_MAX - entered_;
            sample.auxSize = static_cast<uint8_t>(i % 4);
            sample.auxData = auxiliary;
            ASSERT_EQ(MbxAddSample(session_, track, &sample, 1), MBX_OK);
        }
        ASSERT_EQ(MbxEndChunk(session_, track), MBX_OK);
        entered_ += 1000;
    }

    // Gives the open segment of the first track what no operation enters.
    void describe() {
        MbxSampleSegment* segment = session_->movie->tracks.first->segments.last;
        MbxSampleGroupParams* group = nullptr;
        ASSERT_EQ(MbxNew(context_, &group), MBX_OK);
        MbxListAppend(&segment->sampleGroups, group);
        group->groupingType = MbxCode("roll");
        group->rows.capacity = 1;
        ASSERT_EQ(MbxBlockListAppend(context_, &group->rows, MbxSampleGroupRow{5, 1}), MBX_OK);
        MbxGroupDescriptionParams* descriptions = nullptr;
        ASSERT_EQ(MbxNew(context_, &descriptions), MBX_OK);
        MbxListAppend(&segment->groupDescriptions, descriptions);
        descriptions->groupingType = MbxCode("roll");
        descriptions->hasRawEntries = 1;
        MbxGroupDescription* description = nullptr;
        ASSERT_EQ(MbxNew(context_, &description), MBX_OK);
        MbxListAppend(&descriptions->entries, description);
        ASSERT_EQ(MbxBufferAssign(context_, 0, &description->raw, "ab", 2), MBX_OK);
        MbxSubSampleParams* subSamples = nullptr;
        ASSERT_EQ(MbxNew(context_, &subSamples), MBX_OK);
        MbxListAppend(&segment->subSamples, subSamples);
        subSamples->sampleDelta = 1;
        MbxSubSample* subSample = nullptr;
        ASSERT_EQ(MbxNew(context_, &subSample), MBX_OK);
        MbxListAppend(&subSamples->subSamples, subSample);
        ASSERT_EQ(MbxNew(context_, &segment->avcConfig), MBX_OK);
        segment->avcConfig->values = {1, 0x64, 0, 0x28, 3, 0, 0, 0, 0};
    }

    struct Chunk {
        uint32_t track;
        uint32_t samples;
    };

    void writeFragment(uint32_t fragment, const std::vector<Chunk>& chunks) {
        if (fragment == 1) describe();
        for (const Chunk& chunk : chunks) enterChunk(chunk.track, chunk.samples);
        perform([&] { return MbxSealFragment(session_); });
        ASSERT_EQ(MbxShiftFragmentOffsets(session_, fragment, 0, 0, 100), MBX_OK);
        ASSERT_EQ(MbxSetFragmentBase(session_, fragment, file_.bytes.size()), MBX_OK);
        write([&](MbxFile* target, uint64_t* size) {
            return MbxWriteMoof(session_, target, fragment, file_.bytes.size(), size);
        });
        ASSERT_EQ(MbxReleaseFragment(session_, fragment), MBX_OK);
    }

    // Measures and writes to the end of the file.
    template <typename Write>
    void write(Write&& call) {
        uint64_t measured = 0;
        perform([&] { return call(nullptr, &measured); });
        uint64_t written = 0;
        const MemoryFile before = file_;
        const auto onto = [&] {
            file_.bytes = before.bytes;  // what a failure left behind is written over
            return call(&file_, &written);
        };
        perform(onto);
        EXPECT_EQ(written, measured);
        EXPECT_EQ(file_.bytes.size(), before.bytes.size() + measured);
    }

    // Operations so far of the kind that is to fail, and where the number of the failing one is set.
    std::pair<uint64_t, uint64_t*> counter() {
        switch (failure_) {
            case Failure::kAllocation:
                return {host_.allocations, &host_.failAllocation};
            case Failure::kWrite:
                return {file_.writes, &file_.failWrite};
            case Failure::kShortWrite:
                return {file_.writes, &file_.shortWrite};
            case Failure::kSeek:
                return {file_.seeks, &file_.failSeek};
            case Failure::kCopy:
                return {host_.copies, &host_.failCopy};
            case Failure::kNone:
                break;
        }
        return {0, &ignored_};
    }

    MbxStatus expectedStatus() const {
        if (failure_ == Failure::kAllocation) return MBX_ERR_NO_MEMORY;
        return failure_ == Failure::kCopy ? MBX_ERR_INTERNAL : MBX_ERR_IO;
    }

    // Runs a step; one that failed is run again, and nothing else may have changed.
    template <typename Step>
    void perform(Step&& step) {
        const auto [before, failAt] = counter();
        const size_t live = host_.live.size();
        *failAt = left_ != 0 ? before + left_ : 0;
        const MbxStatus status = step();
        *failAt = 0;
        const uint64_t used = counter().first - before;
        if (left_ != 0 && used >= left_) {
            EXPECT_EQ(status, expectedStatus());
            EXPECT_EQ(host_.live.size(), live);
            left_ = 0;
            hasFailed_ = true;
            ASSERT_EQ(step(), MBX_OK);
            return;
        }
        ASSERT_EQ(status, MBX_OK);
        left_ -= left_ != 0 ? used : 0;
    }

    MemoryHost host_;
    MemoryFile file_;
    MbxContext* context_ = nullptr;
    MbxSession* session_ = nullptr;
    Failure failure_;
    uint64_t left_;
    uint64_t ignored_ = 0;
    uint64_t entered_ = 0;
    bool hasFailed_ = false;
};

class SessionFragmentFailureTest : public testing::Test {
 protected:
    void SetUp() override {
        Attempt attempt(Failure::kNone, 0);
        attempt.run();
        whole = attempt.bytes();
    }

    // How many operations of that kind the steps perform, each of which failed once.
    uint64_t sweep(Failure failure) {
        for (uint64_t n = 1;; n++) {
            SCOPED_TRACE(testing::Message() << "operation " << n);
            Attempt attempt(failure, n);
            attempt.run();
            EXPECT_TRUE(attempt.bytes() == whole);
            if (!attempt.hasFailed() || HasFailure()) return n - 1;
        }
    }

    Bytes whole;
};

TEST_F(SessionFragmentFailureTest, TheRecordingHasEveryBoxOfAFragment) {
    for (const std::string code :
         {"moof", "mfhd", "traf", "tfhd", "tfdt", "trik", "trun", "avcn", "senc", "saio", "saiz",
          "sbgp", "sgpd", "subs", "moov", "mvex", "mehd", "trex", "mfra", "tfra", "mfro"}) {
        EXPECT_NE(std::search(whole.begin(), whole.end(), code.begin(), code.end()), whole.end()) << code;
    }
}

TEST_F(SessionFragmentFailureTest, NthAllocationRefusedIsNoMemoryAndTheStepWritesTheSameWhenTriedAgain) {
    EXPECT_GT(sweep(Failure::kAllocation), 200U);
}

TEST_F(SessionFragmentFailureTest, NthWriteFailingIsAnIoErrorAndTheStepWritesTheSameWhenTriedAgain) {
    EXPECT_GT(sweep(Failure::kWrite), 100U);
}

TEST_F(SessionFragmentFailureTest, NthWriteShortIsAnIoErrorAndTheStepWritesTheSameWhenTriedAgain) {
    EXPECT_GT(sweep(Failure::kShortWrite), 100U);
}

TEST_F(SessionFragmentFailureTest, NthSeekFailingIsAnIoErrorAndTheStepWritesTheSameWhenTriedAgain) {
    EXPECT_GT(sweep(Failure::kSeek), 100U);
}

TEST_F(SessionFragmentFailureTest, NthCopyRefusedIsABrokenInvariantAndTheStepWritesTheSameWhenTriedAgain) {
    EXPECT_GT(sweep(Failure::kCopy), 3U);
}

}  // namespace
