// The process dies in the middle of a recording. What is on disk then?

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "endtoend/CodedStream.h"
#include "endtoend/RecordedFiles.h"
#include "endtoend/RecorderProgress.h"
#include "support/ChildProcess.h"
#include "support/CodedMedia.h"
#include "support/SharedMemory.h"
#include "support/TempDir.h"
#include "support/WaitUntil.h"

namespace {

namespace fs = std::filesystem;
using Bytes = std::vector<std::uint8_t>;

/// The first point in step at or after one minute of 25 frames a second, chunks of 8 pictures.
constexpr std::uint64_t kPicturesPerFile = 1504;
/// 32 chunks.
constexpr std::uint64_t kPicturesPerFragment = 256;

/// Pictures that a recorder which pushes as fast as the disk takes them may have under way: 56 units in use,
/// of which 48 stand for chunks of 8, and one chunk that has just been given to the system or not.
constexpr std::uint64_t kMostUnderWay = 8 * 48 + 8 + 8;

/// What a walk over the boxes of a file finds, by their sizes alone.
struct Walk {
    /// End of the last `mdat` that stands whole behind a whole `moov` or `moof`; 0 for none.
    std::uint64_t wholeEnd = 0;
    bool isClosed = false;  // there is a whole `mfra`
};

Walk walk(const Bytes& file) {
    Walk found;
    std::string before;
    for (std::uint64_t at = 0; at + 8 <= file.size();) {
        std::uint64_t size = 0;
        for (std::uint64_t i = 0; i < 4; ++i) {
            size = size << 8 | file[at + i];
        }
        if (size < 8 || size > file.size() - at) {
            break;
        }
        const auto name = file.begin() + static_cast<std::ptrdiff_t>(at) + 4;
        const std::string type(name, name + 4);
        at += size;
        if (type == "mdat" && (before == "moov" || before == "moof")) {
            found.wholeEnd = at;
        }
        found.isClosed = found.isClosed || type == "mfra";
        before = type;
    }
    return found;
}

class Kill : public ::testing::Test {
 protected:
    Kill() : media_(MakeCodedMedia(directory_, 25, 1, 64, 128)), stream_(directory_.Path()) {
        std::ofstream(directory_.Path() / "settings.ini") << "[Qx/Other/MP4FileOut]\nMP4MaxFileSize=1\n";
        setenv("QX_SETTINGS", (directory_.Path() / "settings.ini").c_str(), 1);
    }

    /// Records, and kills the recorder a moment after it has pushed `frames`. Returns the frames pushed at
    /// its death.
    std::uint64_t recordAndKill(const TempDir& run, const char* fileType, std::uint64_t frames,
                                std::chrono::microseconds moment) {
        const SharedMemory<RecorderProgress> progress(run.Path() / "progress");
        fs::create_directory(run.Path() / "out");
        ChildProcess recorder({RECORDER, directory_.Path().string(), (run.Path() / "out").string(), fileType,
                               (run.Path() / "progress").string()});
        EXPECT_TRUE(waitUntil([&] { return progress->frames >= frames; }));
        const auto due = std::chrono::steady_clock::now() + moment;
        EXPECT_TRUE(waitUntil([&] { return std::chrono::steady_clock::now() >= due; }));
        EXPECT_TRUE(recorder.Kill());
        return progress->frames;
    }
    /// Compares all that the whole part of a file holds with the stream from picture `begin` on. Returns the
    /// number of its pictures.
    std::uint64_t compare(const RecordedFile& file, std::uint64_t begin) {
        std::uint64_t n = begin;
        for (const iso::Sample& sample : file.Samples(kRecordedVideo)) {
            auto& coded = *media_.video[n % media_.video.size()];
            const Bytes expected(coded.GetData(), coded.GetData() + coded.GetDataSize());
            EXPECT_EQ(file.BytesOf(sample), expected) << "picture " << n;
            ++n;
        }
        std::uint64_t m = begin;
        for (const iso::Sample& sample : file.Samples(kRecordedMeta)) {
            EXPECT_EQ(file.BytesOf(sample), stream_.Numbers().MetaSample(m, true)) << "metadata " << m;
            ++m;
        }
        EXPECT_EQ(n, m);
        return n - begin;
    }
    /// The pictures that ffprobe gets from a file, as "position,size".
    std::vector<std::string> probe(const fs::path& path) {
        const ProgramResult probed =
            RunProgram(directory_,
                       "ffprobe -v quiet -select_streams v -show_entries packet=pos,size "
                       "-of default=nw=1:nk=1 '" +
                           path.string() + "'");
        EXPECT_EQ(probed.exitCode, 0);
        std::vector<std::string> packets;
        std::istringstream in(probed.output);
        for (std::string size, position; std::getline(in, size) && std::getline(in, position);) {
            packets.push_back(position + "," + size);
        }
        return packets;
    }
    /// The pictures that ffmpeg decodes from the first `count` packets of a file.
    std::uint64_t decode(const fs::path& path, std::uint64_t count) {
        const ProgramResult decoded =
            RunProgram(directory_, "ffmpeg -v error -i '" + path.string() + "' -map 0:v -frames:v " +
                                       std::to_string(count) + " -f framecrc -");
        EXPECT_EQ(decoded.exitCode, 0) << decoded.errors;
        std::istringstream in(decoded.output);
        std::uint64_t pictures = 0;
        for (std::string line; std::getline(in, line);) {
            pictures += line.starts_with("0,") ? 1 : 0;
        }
        return pictures;
    }
    static std::size_t fileCount(const fs::path& root) {
        std::size_t count = 0;
        for (const auto& entry : fs::recursive_directory_iterator(root)) {
            count += entry.path().extension() == ".MP4" ? 1 : 0;
        }
        return count;
    }

    TempDir directory_;
    const CodedMedia media_;
    const CodedStream stream_;
};

class KillFragmented : public Kill, public ::testing::WithParamInterface<std::uint32_t> {
 protected:
    static constexpr int kKills = 5;

    /// Examines what a kill left behind and returns the pictures that can be read.
    std::uint64_t examine(const TempDir& run, bool decoded) {
        std::uint64_t readable = 0;
        const std::size_t files = fileCount(run.Path() / "out");
        for (std::size_t i = 0; i < files; ++i) {
            const bool isLast = i + 1 == files;
            const std::uint64_t begin = i * kPicturesPerFile;
            const fs::path path = FindRecording(run.Path() / "out", stream_.Numbers().FileName(begin));
            SCOPED_TRACE(path);
            Bytes bytes = ReadWholeFile(path);
            const Walk found = walk(bytes);
            if (found.wholeEnd == 0) {
                // Only a file whose first fragment was still to come has nothing to read.
                EXPECT_TRUE(isLast);
                continue;
            }
            EXPECT_TRUE(isLast || found.isClosed);
            bytes.resize(found.wholeEnd);
            const RecordedFile file(std::move(bytes));
            const std::uint64_t pictures = compare(file, begin);
            readable += pictures;
            EXPECT_TRUE(!found.isClosed || pictures == kPicturesPerFile) << pictures;
            EXPECT_TRUE(found.isClosed || pictures % kPicturesPerFragment == 0 ||
                        pictures == kPicturesPerFile)
                << pictures;

            const std::vector<std::string> packets = probe(path);
            const auto& samples = file.Samples(kRecordedVideo);
            // Beyond the last whole fragment ffprobe may find the beginning of the next one.
            EXPECT_GE(packets.size(), samples.size());
            EXPECT_LE(packets.size(), samples.size() + (found.isClosed ? 0 : kPicturesPerFragment));
            for (std::size_t n = 0; n < std::min(packets.size(), samples.size()); ++n) {
                EXPECT_EQ(packets[n],
                          std::to_string(samples[n].offset) + "," + std::to_string(samples[n].size));
            }
            if (decoded) {
                EXPECT_EQ(decode(path, pictures), pictures);
            }
        }
        return readable;
    }
};

TEST_P(KillFragmented, EveryFileIsReadableUpToItsLastWholeFragment) {
    std::minstd_rand random(GetParam());
    std::vector<std::uint64_t> costs;
    for (int kill = 0; kill < kKills; ++kill) {
        const std::uint64_t frames = 1 + random() % 2200;
        const std::chrono::microseconds moment(random() % 3000);
        std::ostringstream point;
        point << "seed " << GetParam() << ", kill " << kill << ": " << moment.count() << " us after frame "
              << frames;
        SCOPED_TRACE(point.str());
        const TempDir run;
        const std::uint64_t pushed = recordAndKill(run, "fragment", frames, moment);
        const std::uint64_t readable = examine(run, kill == 0);
        std::cout << point.str() << ", " << pushed << " pushed, " << readable << " readable\n";
        EXPECT_LE(readable, pushed);
        costs.push_back(pushed - readable);
    }
    EXPECT_LE(*std::max_element(costs.begin(), costs.end()), kMostUnderWay);
}

INSTANTIATE_TEST_SUITE_P(Seeds, KillFragmented, ::testing::Range(std::uint32_t{1}, std::uint32_t{11}));

TEST_F(Kill, ANormalFileThatWasNotClosedHasItsSamplesAndNoIndex) {
    for (const std::uint64_t frames : {300, 700, 1100}) {
        const TempDir run;
        recordAndKill(run, "normal", frames, std::chrono::microseconds(0));
        const fs::path path = FindRecording(run.Path() / "out", stream_.Numbers().FileName(0));
        EXPECT_EQ(fileCount(run.Path() / "out"), 1U);
        const ProgramResult probed = RunProgram(directory_, "ffprobe -v error '" + path.string() + "'");
        EXPECT_NE(probed.exitCode, 0);
        EXPECT_NE(probed.errors.find("moov atom not found"), std::string::npos) << probed.errors;

        // An `mdat` in the long form that says that it is empty, and behind it the samples of each chunk.
        const Bytes bytes = ReadWholeFile(path);
        const std::string header("\0\0\0\1mdat\0\0\0\0\0\0\0\x10", 16);
        const std::string text(bytes.begin(), bytes.end());
        EXPECT_EQ(text.find(header), 176U);
        std::uint64_t units = 0;
        for (std::size_t at = 0; (at = text.find(stream_units::Mark('M', units), at)) != std::string::npos;
             ++units) {
        }
        EXPECT_GE(units + kMostUnderWay, frames);
    }
}

}  // namespace
