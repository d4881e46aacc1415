// The Nth operation of a host fails, for every N of the building and writing of a full movie.
#include "boxlib/model/session_model.h"

#include "boxlib/support/fixture.h"
#include "boxlib/support/full_movie.h"

namespace {

// One life of a host, a context and a session.
struct Attempt {
    MemoryHost host;
    MemoryFile file;
    MbxSessionConfig config = {};
    MbxContext* context = nullptr;
    MbxSession* session = nullptr;

    MbxStatus build() {
        const MbxCallbacks callbacks = host.callbacks();
        MbxStatus status = MbxCreateContext(&callbacks, &context);
        if (status == MBX_OK) status = MbxSessionCreate(context, &config, &session);
        if (status == MBX_OK) status = BuildFullMovie(session);
        isBuilt = status == MBX_OK;
        return status;
    }

    MbxStatus run() {
        const MbxStatus status = build();
        return status == MBX_OK ? WriteFullMovie(session, &file) : status;
    }

    // What a failed call left is valid: `moov` is refused, or it has the size that was measured.
    void expectUsable() {
        host.failAllocation = 0;
        host.failCopy = 0;
        if (session == nullptr) return;
        EXPECT_EQ(MbxSetQuota(context, 0, 0, 0, 0), MBX_OK);
        uint64_t measured = 0;
        const MbxStatus status = MbxWriteMoov(session, nullptr, 0, &measured);
        EXPECT_TRUE(status == MBX_OK || (status == MBX_ERR_BAD_STATE && !isBuilt)) << status;
        if (status != MBX_OK) return;
        MemoryFile target;
        uint64_t written = 0;
        EXPECT_EQ(MbxWriteMoov(session, &target, 0, &written), MBX_OK);
        EXPECT_EQ(written, measured);
        EXPECT_EQ(target.bytes.size(), measured);
    }

    // A complete movie writes the whole file when it is tried again.
    void expectWrites(const Bytes& expected) {
        if (!isBuilt) return;
        MemoryFile target;
        EXPECT_EQ(WriteFullMovie(session, &target), MBX_OK);
        EXPECT_BYTES(target.bytes, expected);
    }

    void destroy() {
        EXPECT_EQ(MbxSessionDestroy(session), MBX_OK);
        EXPECT_EQ(MbxDestroyContext(context), MBX_OK);
        EXPECT_TRUE(host.live.empty()) << host.live.size() << " blocks leaked";
        EXPECT_EQ(host.liveBytes, 0U);
    }

    bool isBuilt = false;
};

class SessionFailureTest : public testing::Test {
 protected:
    void SetUp() override {
        Attempt attempt;
        ASSERT_EQ(attempt.run(), MBX_OK);
        whole = attempt.file.bytes;
        writes = attempt.file.writes;
        seeks = attempt.file.seeks;
        allocations = attempt.host.allocations;
        copies = attempt.host.copies;
        peaks = attempt.host.peaks;
        contextSize = peaks.front();  // the first block
        attempt.destroy();
    }

    // Runs once for each number, with `arm` making the operation of that number fail, until nothing fails.
    // Returns how many attempts failed.
    template <typename Arm>
    uint64_t sweep(MbxStatus expected, Arm&& arm) {
        for (uint64_t n = 1;; n++) {
            SCOPED_TRACE(testing::Message() << "operation " << n);
            Attempt attempt;
            arm(&attempt, n);
            const MbxStatus status = attempt.run();
            if (status == MBX_OK) {
                EXPECT_BYTES(attempt.file.bytes, whole);
            } else {
                EXPECT_EQ(status, expected);
                attempt.expectUsable();
                attempt.expectWrites(whole);
            }
            attempt.destroy();
            if (status == MBX_OK || HasFailure()) return n - 1;
        }
    }

    Bytes whole;
    uint64_t writes = 0;
    uint64_t seeks = 0;
    uint64_t allocations = 0;
    uint64_t copies = 0;
    uint64_t contextSize = 0;
    std::vector<uint64_t> peaks;
};

TEST_F(SessionFailureTest, TheMovieHasATrackOfEveryHandlerWithAllItsTables) {
    const char* kBoxes[] = {"ftyp", "uuid", "mdat", "moov", "mvhd", "trak", "tkhd", "tref", "edts",
                            "elst", "mdia", "mdhd", "hdlr", "minf", "vmhd", "smhd", "sthd", "nmhd",
                            "dinf", "dref", "url ", "stbl", "stsd", "avc1", "avcC", "hvc1", "hvcC",
                            "mp4v", "esds", "mp4a", "tmcd", "rtmd", "stpp", "btrt", "mp4s", "stts",
                            "ctts", "stsc", "stsz", "stco", "stss", "sdtp", "saiz", "saio", "vide",
                            "soun", "meta", "subt", "odsm", "BKDT", "PKDT", "GRAP", "USMT", "PROF"};
    for (const std::string code : kBoxes) {
        EXPECT_NE(std::search(whole.begin(), whole.end(), code.begin(), code.end()), whole.end()) << code;
    }
}

TEST_F(SessionFailureTest, NthAllocationRefusedIsNoMemory) {
    EXPECT_EQ(
        sweep(MBX_ERR_NO_MEMORY, [](Attempt* attempt, uint64_t n) { attempt->host.failAllocation = n; }),
        allocations);
    EXPECT_GT(allocations, 300U);
}

TEST_F(SessionFailureTest, NthWriteFailingIsAnIoErrorWhateverItsStatus) {
    const auto arm = [](Attempt* attempt, uint64_t n) {
        attempt->file.failWrite = n;
        attempt->file.failure = n % 2 == 0 ? MBX_ERR_NO_MEMORY : MBX_ERR_INTERNAL;
    };
    EXPECT_EQ(sweep(MBX_ERR_IO, arm), writes);
    EXPECT_GT(writes, 300U);
}

TEST_F(SessionFailureTest, NthWriteShortIsAnIoError) {
    EXPECT_EQ(sweep(MBX_ERR_IO, [](Attempt* attempt, uint64_t n) { attempt->file.shortWrite = n; }), writes);
}

TEST_F(SessionFailureTest, NthSeekFailingIsAnIoError) {
    EXPECT_EQ(sweep(MBX_ERR_IO, [](Attempt* attempt, uint64_t n) { attempt->file.failSeek = n; }), seeks);
    EXPECT_GT(seeks, 100U);
}

TEST_F(SessionFailureTest, NthCopyRefusedIsABrokenInvariant) {
    EXPECT_EQ(sweep(MBX_ERR_INTERNAL, [](Attempt* attempt, uint64_t n) { attempt->host.failCopy = n; }),
              copies);
    EXPECT_GT(copies, 20U);
}

// Each amount that the memory in use rose to is a quota that just suffices up to there; one byte less does
// not.
TEST_F(SessionFailureTest, QuotaOneByteTooSmallIsNoMemory) {
    ASSERT_GT(peaks.size(), 100U);
    for (size_t i = 1; i < peaks.size(); i++) {
        const uint64_t quota = peaks[i] - contextSize;
        SCOPED_TRACE(testing::Message() << "quota " << quota);
        Attempt attempt;
        attempt.config.memory_quota = quota - 1;
        EXPECT_EQ(attempt.run(), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(attempt.host.peakBytes, peaks[i - 1]) << "another allocation was refused";
        attempt.expectUsable();
        attempt.expectWrites(whole);
        attempt.destroy();
        if (HasFailure()) return;
    }
    Attempt attempt;
    attempt.config.memory_quota = peaks.back() - contextSize;
    EXPECT_EQ(attempt.run(), MBX_OK);
    EXPECT_BYTES(attempt.file.bytes, whole);
    attempt.destroy();
}

TEST_F(SessionFailureTest, QuotaBelowTheSessionItselfIsAnInvalidArgument) {
    Attempt attempt;
    attempt.config.memory_quota = sizeof(MbxSession) - 1;
    EXPECT_EQ(attempt.run(), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(attempt.session, nullptr);
    attempt.destroy();
}

}  // namespace
