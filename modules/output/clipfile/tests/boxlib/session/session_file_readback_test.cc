// Files that the session wrote through the callbacks of the C library, read back by ffprobe and MediaInfo.
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>

#include "boxlib/core/bytes.h"
#include "boxlib/support/fixture.h"

namespace {

namespace fs = std::filesystem;

constexpr uint32_t kTimescale = 30000;
constexpr uint32_t kMetaDuration = 5000;
constexpr uint64_t kMaxChunk = 9;

// The samples as functions of their number, from 0. Nothing needs to be kept, however many there are.
uint32_t videoSize(uint64_t i) {
    return static_cast<uint32_t>(5 + i % 7);
}
uint32_t videoDuration(uint64_t i) {
    return i % 11 == 3 ? 1002 : 1001;
}
int32_t videoOffset(uint64_t i) {
    return static_cast<int32_t>(i % 3 * 1001);
}
bool videoIsSync(uint64_t i) {
    return i % 12 == 0;
}
uint64_t videoChunkLength(uint64_t chunk) {
    return 1 + chunk % kMaxChunk;
}
// One metadata sample follows each chunk of video.
uint32_t metaSize(uint64_t i) {
    return static_cast<uint32_t>(1 + i % 5);
}

// Lines of a program's output, one after the other.
class Reader {
 public:
    explicit Reader(const std::string& command) : pipe_(popen(command.c_str(), "r")) {}
    Reader(const Reader&) = delete;
    Reader& operator=(const Reader&) = delete;
    ~Reader() {
        if (pipe_ != nullptr) pclose(pipe_);
    }

    bool next(char* line, int size) { return pipe_ != nullptr && std::fgets(line, size, pipe_) != nullptr; }

    // Closes the output and tells whether the program found no fault.
    bool succeeded() { return pclose(std::exchange(pipe_, nullptr)) == 0; }

 private:
    FILE* pipe_;
};

std::vector<std::string> linesOf(const std::string& command) {
    Reader reader(command);
    std::vector<std::string> lines;
    for (char line[256]; reader.next(line, sizeof(line));) {
        lines.emplace_back(line);
        while (!lines.back().empty() && lines.back().back() == '\n') lines.back().pop_back();
    }
    EXPECT_TRUE(reader.succeeded()) << command;
    while (!lines.empty() && lines.back().empty()) lines.pop_back();
    return lines;
}

class SessionReadBackTest : public testing::TestWithParam<uint64_t> {
 protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "mbx_session_XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder = pattern;
        path = (folder / "clip.MP4").string();
        MbxStdioCallbacks(&callbacks);
        ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
        ASSERT_EQ(MbxCreateContext(&callbacks, &context), MBX_OK);
        MbxSessionConfig config = {};
        config.options.chunk_offset_mode = 2;
        ASSERT_EQ(MbxSessionCreate(context, &config, &session), MBX_OK);
    }

    void TearDown() override {
        EXPECT_EQ(MbxSessionDestroy(session), MBX_OK);
        EXPECT_EQ(MbxDestroyContext(context), MBX_OK);
        closeFile();
        fs::remove_all(folder);
    }

    void closeFile() {
        if (file == nullptr) return;
        EXPECT_EQ(std::fclose(file->stream), 0);
        std::free(file);
        file = nullptr;
    }

    // Tracks 1 (avc1) and 2 (rtmd), without edits, so that readers show the media's own times.
    void addTracks() {
        MbxTrackParams params = {};
        params.noEditList = 1;
        params.trackId = 1;
        params.width = 320;
        params.height = 240;
        params.timescale = kTimescale;
        params.language = 0x55C4;  // und
        params.enable_mode = 1;
        uint32_t number = 0;
        ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
        params.trackId = 2;
        ASSERT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
        for (uint32_t track = 1; track <= 2; track++) {
            ASSERT_EQ(MbxAddDataReference(session, track, nullptr, 0, &number), MBX_OK);
        }
        const MbxVisualEntryParams visual = {2, 1, 320, 240, 72, 0, 72, 0};
        ASSERT_EQ(MbxAddVideoEntry(session, 1, &visual, &number), MBX_OK);
        // Baseline profile, level 3, 320 x 240 (ISO/IEC 14496-10 7.3.2.1.1 and 7.3.2.2).
        const uint8_t sps[] = {0x67, 0x42, 0xC0, 0x1E, 0xD9, 0x01, 0x41, 0xFA, 0x10};
        const uint8_t pps[] = {0x68, 0xCB, 0x83, 0xCB, 0x20};
        const MbxAvcConfigParams avc = {1, 0x42, 0xC0, 0x1E, 3, 0, 0, 0, 0};
        ASSERT_EQ(MbxSetAvcConfig(session, 1, 1, &avc), MBX_OK);
        ASSERT_EQ(MbxAddAvcSps(session, 1, 1, sps, sizeof(sps)), MBX_OK);
        ASSERT_EQ(MbxAddAvcPps(session, 1, 1, pps, sizeof(pps)), MBX_OK);
        const MbxMetaEntryParams meta = {1};
        ASSERT_EQ(MbxAddMetaEntry(session, 2, &meta, &number), MBX_OK);
    }

    void writeBytes(const Bytes& bytes) {
        uint64_t count = 0;
        ASSERT_EQ(callbacks.seek(file, static_cast<int64_t>(position), 0), MBX_OK);
        ASSERT_EQ(callbacks.write(file, bytes.data(), bytes.size(), &count), MBX_OK);
        position += bytes.size();
    }

    // Enters one sample that stands behind the payload so far and adds its bytes: for video one NAL unit of
    // filler data with its length.
    void addSample(uint32_t track, const MbxSampleInfo& sample, Bytes* payload) {
        ASSERT_EQ(MbxAddSample(session, track, &sample, 0), MBX_OK);
        const size_t begin = payload->size();
        payload->resize(begin + sample.size, 0xFF);
        if (track == 1) {
            MbxStore32(payload->data() + begin, sample.size - 4);
            (*payload)[begin + 4] = 0x0C;
        }
    }

    // Writes the whole file as a recorder does: headers, then the payload, then `moov`, then the size of
    // `mdat`.
    void writeFile(uint64_t samples) {
        uint64_t size = 0;
        ASSERT_EQ(MbxCreateFileType(session, MbxCode("mp42"), 0), MBX_OK);
        ASSERT_EQ(MbxAddCompatibleBrand(session, MbxCode("mp42")), MBX_OK);
        ASSERT_EQ(MbxCreateProfile(session, 0), MBX_OK);
        ASSERT_EQ(MbxCreateMovie(session, kTimescale), MBX_OK);
        ASSERT_NO_FATAL_FAILURE(addTracks());
        ASSERT_EQ(MbxWriteFileType(session, file, 0, &size), MBX_OK);
        position = size;
        ASSERT_EQ(MbxWriteProfile(session, file, position, &size), MBX_OK);
        position += size;
        const uint64_t mdat = position;
        ASSERT_EQ(MbxWriteWideMdatHeader(session, 1, file, mdat, MbxCode("mdat"), 0, &size), MBX_OK);
        position += size;
        firstOffset = position;

        Bytes payload;
        for (uint64_t i = 0, chunk = 0; i < samples; chunk++) {
            const uint64_t end = std::min(samples, i + videoChunkLength(chunk));
            for (; i < end; i++) {
                MbxSampleInfo sample = {};
                sample.size = videoSize(i);
                sample.offset = position + payload.size();
                sample.duration = videoDuration(i);
                sample.isSync = videoIsSync(i) ? 1 : 0;
                sample.compositionOffset = videoOffset(i);
                sample.descriptionIndex = 1;
                ASSERT_NO_FATAL_FAILURE(addSample(1, sample, &payload));
            }
            ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
            MbxSampleInfo sample = {};
            sample.size = metaSize(chunk);
            sample.offset = position + payload.size();
            sample.duration = kMetaDuration;
            sample.isSync = 1;
            sample.descriptionIndex = 1;
            ASSERT_NO_FATAL_FAILURE(addSample(2, sample, &payload));
            ASSERT_EQ(MbxEndChunk(session, 2), MBX_OK);
            if (payload.size() < 1 << 20 && i < samples) continue;
            ASSERT_NO_FATAL_FAILURE(writeBytes(payload));
            payload.clear();
        }
        ASSERT_EQ(MbxWriteMoov(session, file, position, &size), MBX_OK);
        ASSERT_EQ(
            MbxWriteWideMdatHeader(session, 1, file, mdat, MbxCode("mdat"), position - firstOffset, &size),
            MBX_OK);
        closeFile();
        ASSERT_EQ(MbxWriteMoov(session, nullptr, position, &size), MBX_OK);
        ASSERT_EQ(fs::file_size(path), position + size);
    }

    std::string quoted() const { return "'" + path + "'"; }

    MbxCallbacks callbacks = {};
    MbxContext* context = nullptr;
    MbxSession* session = nullptr;
    MbxFile* file = nullptr;
    fs::path folder;
    std::string path;
    uint64_t position = 0;
    uint64_t firstOffset = 0;  // of the first sample
};

// What is expected of the next packet of a track, walked along with the reader.
struct Cursor {
    uint64_t index = 0;
    uint64_t chunk = 0;
    uint64_t inChunk = 0;
    uint64_t decodeTime = 0;
    uint64_t offset = 0;
};

std::string expectedVideo(Cursor* at) {
    const uint64_t i = at->index++;
    const unsigned long long presentation = at->decodeTime + static_cast<uint64_t>(videoOffset(i));
    char row[160];
    std::snprintf(row, sizeof(row), "0,%llu,%llu,%u,%llu,%s", presentation,
                  static_cast<unsigned long long>(at->decodeTime), videoSize(i),
                  static_cast<unsigned long long>(at->offset), videoIsSync(i) ? "K_" : "__");
    at->decodeTime += videoDuration(i);
    at->offset += videoSize(i);
    if (++at->inChunk == videoChunkLength(at->chunk)) {
        at->offset += metaSize(at->chunk);
        at->chunk++;
        at->inChunk = 0;
    }
    return row;
}

std::string expectedMeta(Cursor* at, uint64_t samples) {
    // The chunk of video that this sample follows.
    for (uint64_t k = 0; k < videoChunkLength(at->chunk) && at->inChunk < samples; k++) {
        at->offset += videoSize(at->inChunk++);
    }
    char row[160];
    std::snprintf(row, sizeof(row), "1,%llu,%llu,%u,%llu,K_", static_cast<unsigned long long>(at->decodeTime),
                  static_cast<unsigned long long>(at->decodeTime), metaSize(at->chunk),
                  static_cast<unsigned long long>(at->offset));
    at->decodeTime += kMetaDuration;
    at->offset += metaSize(at->chunk);
    at->chunk++;
    at->index++;
    return row;
}

uint64_t chunksOf(uint64_t samples) {
    uint64_t chunks = 0;
    for (uint64_t i = 0; i < samples; i += videoChunkLength(chunks++)) {
    }
    return chunks;
}

TEST_P(SessionReadBackTest, SamplesComeBackAsEntered) {
    const uint64_t samples = GetParam();
    ASSERT_NO_FATAL_FAILURE(writeFile(samples));

    // The packets as the file's tables give them: nothing is parsed, guessed or decoded.
    Reader reader(
        "ffprobe -v quiet -fflags +noparse+nofillin -show_entries "
        "packet=stream_index,pts,dts,size,pos,flags -of csv=p=0 " +
        quoted() + " </dev/null");
    Cursor video{.offset = firstOffset};
    Cursor meta{.offset = firstOffset};
    for (char line[256]; reader.next(line, sizeof(line));) {
        std::string row(line);
        while (!row.empty() && (row.back() == '\n' || row.back() == ',')) row.pop_back();
        ASSERT_TRUE(row.starts_with("0,") || row.starts_with("1,")) << row;
        ASSERT_EQ(row, row[0] == '0' ? expectedVideo(&video) : expectedMeta(&meta, samples));
    }
    EXPECT_TRUE(reader.succeeded());
    EXPECT_EQ(video.index, samples);
    EXPECT_EQ(meta.index, chunksOf(samples));

    EXPECT_EQ(linesOf("ffprobe -v quiet -fflags +noparse+nofillin -show_entries "
                      "stream=codec_tag_string,width,height,time_base,nb_frames -of csv=p=0 " +
                      quoted() + " </dev/null"),
              (std::vector<std::string>{"avc1,320,240,1/30000," + std::to_string(samples),
                                        "rtmd,1/30000," + std::to_string(chunksOf(samples))}));
}

TEST_P(SessionReadBackTest, AnotherReaderFindsTheTracksAndNoFault) {
    const uint64_t samples = GetParam();
    ASSERT_NO_FATAL_FAILURE(writeFile(samples));
    uint64_t bytes = 0;
    for (uint64_t i = 0; i < samples; i++) bytes += videoSize(i);
    EXPECT_EQ(
        linesOf("mediainfo --Output='Video;%ID% %Format% %FrameCount% %StreamSize% %Width% %Height%\\n' " +
                quoted()),
        std::vector<std::string>{"1 AVC " + std::to_string(samples) + " " + std::to_string(bytes) +
                                 " 320 240"});
    EXPECT_EQ(
        linesOf("mediainfo --Output='General;%Format% %IsTruncated%%ConformanceErrors%\\n' " + quoted()),
        std::vector<std::string>{"MPEG-4 "});
}

INSTANTIATE_TEST_SUITE_P(Counts, SessionReadBackTest, testing::Values(1, 1000001));

}  // namespace
