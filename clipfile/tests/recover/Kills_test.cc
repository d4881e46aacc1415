// A program that records with the built module is killed in the middle of its work, and what it leaves is
// recovered.

#include <gtest/gtest.h>

#include <chrono>
#include <fstream>
#include <random>
#include <string_view>

#include "common/ToolError.h"
#include "endtoend/CodedStream.h"
#include "endtoend/RecordedFiles.h"
#include "endtoend/RecorderProgress.h"
#include "recover/Recovery.h"
#include "support/ChildProcess.h"
#include "support/CodedMedia.h"
#include "support/SharedMemory.h"
#include "support/TempDir.h"
#include "support/WaitUntil.h"

namespace clipfile {
namespace {

namespace fs = std::filesystem;
using FileBytes = std::vector<std::uint8_t>;

constexpr std::uint64_t kPicturesInChunk = 8;
/// Of a file of one minute, up to the first point in step.
constexpr std::uint64_t kPicturesInFile = 1504;
/// Each seed has so many.
constexpr int kKills = 25;
struct Plan {
    const char* fileType;
    std::uint32_t seed;
    /// Frames after which the first kill may come. The first 32 chunks of a fragmented file are in memory.
    std::uint64_t begin;

    friend void PrintTo(const Plan& plan, std::ostream* out) {
        *out << plan.fileType << ", seed " << plan.seed;
    }
};

class KillsTest : public testing::TestWithParam<Plan> {
 protected:
    KillsTest() : media_(MakeCodedMedia(directory_, 25, 1, 64, 128)), stream_(directory_.Path()) {
        std::ofstream(directory_.Path() / "settings.ini") << "[Qx/Other/MP4FileOut]\nMP4MaxFileSize=1\n";
        setenv("QX_SETTINGS", (directory_.Path() / "settings.ini").c_str(), 1);
    }

    /// Kills the recorder a moment after it has pushed so many frames.
    void recordAndKill(const fs::path& folder, const char* fileType, std::uint64_t frames,
                       std::chrono::microseconds moment) const {
        const SharedMemory<RecorderProgress> progress(folder / "progress");
        fs::create_directory(folder / "out");
        ChildProcess recorder({RECORDER, directory_.Path().string(), (folder / "out").string(), fileType,
                               (folder / "progress").string()});
        ASSERT_TRUE(waitUntil([&] { return progress->frames >= frames; }));
        const auto due = std::chrono::steady_clock::now() + moment;
        ASSERT_TRUE(waitUntil([&] { return std::chrono::steady_clock::now() >= due; }));
        ASSERT_TRUE(recorder.Kill());
    }
    /// The first file of a recording that went on to the second one.
    void recordUncut(const fs::path& target) const {
        const TempDir run;
        recordAndKill(run.Path(), GetParam().fileType, kPicturesInFile + 600, {});
        fs::copy_file(FindRecording(run.Path(), stream_.Numbers().FileName(0)), target);
    }
    /// Pictures in the chunks that stand whole in a file: another one follows each.
    std::uint64_t picturesInWholeChunks(const FileBytes& bytes, std::uint64_t begin) const {
        const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
        std::uint64_t units = 0;
        for (std::size_t at = 0;
             (at = text.find(stream_units::Mark('M', begin + units), at)) != std::string_view::npos;
             ++units) {
        }
        return units == 0 ? 0 : (units - 1) / kPicturesInChunk * kPicturesInChunk;
    }
    /// Compares all samples with those of the stream from picture `begin` on, and returns how many pictures
    /// there are.
    std::uint64_t compare(const RecordedFile& file, std::uint64_t begin) const {
        std::uint64_t pictures = begin;
        for (const iso::Sample& sample : file.Samples(kRecordedVideo)) {
            EXPECT_EQ(file.BytesOf(sample), bytesOf(media_.video, pictures)) << "picture " << pictures;
            ++pictures;
        }
        std::uint64_t units = begin;
        for (const iso::Sample& sample : file.Samples(kRecordedMeta)) {
            EXPECT_EQ(file.BytesOf(sample), stream_.Numbers().MetaSample(units, true)) << "unit " << units;
            ++units;
        }
        EXPECT_EQ(pictures, units);
        const auto& audio = file.Samples(kRecordedAudio);
        const std::uint64_t first = firstAudio(file, begin);
        for (std::uint64_t i = 0; i < audio.size(); ++i) {
            EXPECT_EQ(file.BytesOf(audio[i]), bytesOf(media_.audio, first + i)) << "audio frame " << i;
        }
        return pictures - begin;
    }
    /// Without exact rules sound begins up to a chunk from the pictures.
    std::uint64_t firstAudio(const RecordedFile& file, std::uint64_t begin) const {
        constexpr std::uint64_t kChunk = 16;
        const auto& audio = file.Samples(kRecordedAudio);
        const std::uint64_t expected = stream_.Numbers().clock.AudioBefore(begin);
        for (std::uint64_t at = expected; at < expected + kChunk && !audio.empty(); ++at) {
            if (file.BytesOf(audio[0]) == bytesOf(media_.audio, at)) {
                return at;
            }
        }
        return expected;
    }
    static FileBytes bytesOf(const std::vector<std::shared_ptr<nal_access::SampleData>>& list,
                             std::uint64_t n) {
        nal_access::SampleData& sample = *list[n % list.size()];
        return {sample.GetData(), sample.GetData() + sample.GetDataSize()};
    }
    void expectDecoded(const fs::path& file) const {
        const ProgramResult result = RunProgram(
            directory_, "ffmpeg -v error -xerror -i '" + file.string() + "' -map 0:v -map 0:a -f null -");
        EXPECT_EQ(result.exitCode, 0);
        EXPECT_EQ(result.errors, "");
    }
    /// Recovers the last file of a recording and returns the number of its pictures.
    std::uint64_t recover(const fs::path& folder, const fs::path& like, fs::path& written) const {
        std::uint64_t begin = 0;
        for (std::uint64_t next = kPicturesInFile; exists(folder, next); next += kPicturesInFile) {
            begin = next;
        }
        const fs::path file = FindRecording(folder / "out", stream_.Numbers().FileName(begin));
        const std::uint64_t expected = picturesInWholeChunks(ReadWholeFile(file), begin);
        try {
            const RecoveryResult result = RecoverFile(file, {like, {}, false});
            written = result.isRecovered ? result.written : file;
        } catch (const ToolError& error) {
            EXPECT_EQ(expected, 0U) << error.what();
            return 0;
        }
        const std::uint64_t pictures = compare(RecordedFile(written), begin);
        EXPECT_GE(pictures, expected);
        return pictures;
    }
    bool exists(const fs::path& folder, std::uint64_t begin) const {
        const auto entries = fs::recursive_directory_iterator(folder / "out");
        return std::any_of(fs::begin(entries), fs::end(entries), [&](const auto& entry) {
            return entry.path().filename() == stream_.Numbers().FileName(begin);
        });
    }

    TempDir directory_;
    const CodedMedia media_;
    const CodedStream stream_;
};

INSTANTIATE_TEST_SUITE_P(Seeds, KillsTest,
                         testing::Values(Plan{"normal", 1, 30}, Plan{"normal", 2, 30},
                                         Plan{"fragment", 3, 320}, Plan{"fragment", 4, 320}),
                         [](const auto& instance) {
                             return std::string(instance.param.fileType) +
                                    std::to_string(instance.param.seed);
                         });

TEST_P(KillsTest, EveryWholeChunkIsInTheRecoveredFile) {
    const fs::path like = directory_.Path() / "like.MP4";
    recordUncut(like);
    EXPECT_EQ(compare(RecordedFile(like), 0), kPicturesInFile);
    std::mt19937 random(GetParam().seed);
    std::uint64_t pictures = 0;
    for (int kill = 0; kill < kKills; ++kill) {
        const std::uint64_t frames = GetParam().begin + random() % 300;
        const std::chrono::microseconds moment(random() % 3000);
        SCOPED_TRACE("kill " + std::to_string(kill) + ", " + std::to_string(moment.count()) +
                     " us after frame " + std::to_string(frames));
        const TempDir run;
        recordAndKill(run.Path(), GetParam().fileType, frames, moment);
        fs::path written;
        const std::uint64_t recovered = recover(run.Path(), like, written);
        pictures += recovered;
        if (recovered != 0 && kill % 12 == 0) {
            expectDecoded(written);
        }
    }
    EXPECT_GT(pictures, 0U);
}

}  // namespace
}  // namespace clipfile
