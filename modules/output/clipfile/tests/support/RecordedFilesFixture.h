#pragma once

// A file output with the real muxers, on files that can be made to fail; what it records is read back by a
// reader that shares nothing with them.

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <iterator>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "boxlib/support/IsoReader.h"
#include "support/FaultyFiles.h"
#include "support/FileOutputFixture.h"
#include "support/MuxerStream.h"

/// Files that this process holds open.
inline std::size_t CountOpenFiles() {
    return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {}));
}

/// At 25 frames a second, 1920 x 1080. Chunk `number` begins with the timecode 01:02:03 and that many frames.
class RecordedFilesFixture : public FileOutputFixture {
 protected:
    using Bytes = muxer_stream::Bytes;
    using ChunkShape = muxer_stream::ChunkShape;

    explicit RecordedFilesFixture(_LogPriority highest = LOG_PRIORITY_SAMPLE) : FileOutputFixture(highest) {
        settings = muxer_stream::MakeSettings(dir, 25000);
        settings.filePrefix = "Cam";
        settings.maxFileSize = 120;
    }
    ~RecordedFilesFixture() override { EndOutput(); }

    void Push(unsigned char number, bool sync = false, const ChunkShape& shape = kShortChunk) {
        chunks.push_back(muxer_stream::MakeChunk(shape, number));
        chunks.back()->sync = sync;
        chunks.back()->firstVideo = std::make_shared<StreamData>();
        chunks.back()->firstVideo->rtp_timestamp = number;
        output->PushChunk(chunks.back());
    }

    /// Ends the thread in order, as the base does, once it has next to nothing left to write: it is given up
    /// after 3.5 s, which a slow machine needs for hundreds of chunks.
    void Finish() {
        const auto done = [this] {
            // Up to 32 wait in a fragment, and the writer keeps the one that it wrote last. One that has
            // failed keeps what it has not taken.
            return std::none_of(chunks.begin(),
                                chunks.end() - std::min<std::ptrdiff_t>(33, std::ssize(chunks)),
                                [](const auto& chunk) { return chunk.use_count() > 1; }) ||
                   !Statuses().empty();
        };
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        while (!done() && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        FileOutputFixture::Finish();
    }

    /// Paths of all files under the output path, sorted, as "20261120/Cam/01_02_03_00.MP4".
    std::vector<std::string> Files() const { return FilesUnder(dir.Path()); }
    static std::vector<std::string> FilesUnder(const std::filesystem::path& root) {
        std::vector<std::string> files;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
            if (!entry.is_directory()) {
                files.push_back(entry.path().lexically_relative(root).string());
            }
        }
        std::sort(files.begin(), files.end());
        return files;
    }
    Bytes File(const std::string& path) const { return muxer_stream::ReadFile(dir.Path() / path); }

    /// Checks that `file` is complete and that its tracks hold the samples of `count` chunks from `first` on,
    /// in order and byte for byte, and as timecode `timecodeFrame`.
    void ExpectHolds(const Bytes& file, std::size_t first, std::size_t count,
                     std::uint32_t timecodeFrame) const {
        const iso::Movie movie = iso::ReadMovie(file);
        ASSERT_EQ(movie.tracks.size(), 4u);
        std::vector<Bytes> video;
        std::vector<Bytes> audio;
        std::vector<Bytes> meta;
        std::vector<bool> sync;
        for (std::size_t i = first; i < first + count; ++i) {
            append(chunks.at(i)->video, video);
            append(chunks.at(i)->audio, audio);
            append(chunks.at(i)->meta, meta);
            for (const auto& sample : chunks.at(i)->video) {
                sync.push_back(sample->GetSync());
            }
        }
        EXPECT_EQ(samplesOf(file, movie.track(1)), video);
        EXPECT_EQ(samplesOf(file, movie.track(2)), audio);
        EXPECT_EQ(samplesOf(file, movie.track(4)), meta);
        for (std::size_t i = 0; i < sync.size(); ++i) {
            EXPECT_EQ(movie.track(1).samples.at(i).isSync, sync[i]) << i;
            EXPECT_EQ(movie.track(1).samples.at(i).decodeTime, 1000 * i);
        }
        const iso::Track& timecode = movie.track(3);
        ASSERT_EQ(timecode.samples.size(), 1u);
        EXPECT_EQ(timecode.samples[0].duration, 1000 * video.size());
        const Bytes value = {
            static_cast<unsigned char>(timecodeFrame >> 24), static_cast<unsigned char>(timecodeFrame >> 16),
            static_cast<unsigned char>(timecodeFrame >> 8), static_cast<unsigned char>(timecodeFrame)};
        EXPECT_EQ(samplesOf(file, timecode), std::vector<Bytes>{value});
        EXPECT_EQ(movie.fragmented, fragmented());
        EXPECT_EQ(movie.indexed, fragmented());
    }
    /// The same for a file that begins with the first of the chunks.
    void ExpectHolds(const Bytes& file, std::size_t first, std::size_t count) const {
        ExpectHolds(file, first, count, FirstFrame(first));
    }
    void ExpectHolds(const std::string& path, std::size_t first, std::size_t count) const {
        SCOPED_TRACE(path);
        ExpectHolds(File(path), first, count);
    }
    /// The value of the timecode sample of a file that begins with a chunk. In fragmented files its place
    /// holds none.
    std::uint32_t FirstFrame(std::size_t chunk) const {
        constexpr std::uint32_t kAt010203 = (3600 + 2 * 60 + 3) * 25;
        return fragmented()
                   ? 0
                   : kAt010203 + static_cast<std::uint32_t>(chunks.at(chunk)->firstVideo->rtp_timestamp);
    }

    /// Runs `action` on the writer's thread when a routine of the muxers begins for the `nth` time.
    void AtRoutine(const std::string& name, int nth, std::function<void()> action) {
        log.OnLine([=, seen = std::make_shared<int>(0)](const CapturedLine& line) {
            const bool isRoutine = line.text == "start." && line.function &&
                                   line.function->starts_with("clipfileModule::Mp4") &&
                                   line.function->ends_with("::" + name);
            if (isRoutine && ++*seen == nth) {
                action();
            }
        });
    }
    /// The next operation fails, with all after it if wanted.
    void FailNext(FaultyFiles::Operation operation, bool andAllAfter = false) {
        faults.FailAt(operation, faults.Count(operation) + 1, andAllAfter);
    }

    /// Two pictures, an audio frame, two units of metadata: 37 bytes.
    static inline const ChunkShape kShortChunk = {{5, 5}, {6}, {12, 9}, 0};

    FaultyFiles faults;
    /// All that were pushed.
    std::vector<std::shared_ptr<clipfileModule::ChunkData>> chunks;

 private:
    bool fragmented() const { return settings.fileType == "fragment"; }
    static void append(const std::vector<std::shared_ptr<nal_access::SampleData>>& samples,
                       std::vector<Bytes>& to) {
        for (const auto& sample : samples) {
            to.emplace_back(sample->GetData(), sample->GetData() + sample->GetDataSize());
        }
    }
    static std::vector<Bytes> samplesOf(const Bytes& file, const iso::Track& track) {
        std::vector<Bytes> samples;
        for (const iso::Sample& sample : track.samples) {
            EXPECT_LE(sample.offset + sample.size, file.size());
            const auto begin = file.begin() + static_cast<std::ptrdiff_t>(sample.offset);
            samples.emplace_back(begin, begin + static_cast<std::ptrdiff_t>(sample.size));
        }
        return samples;
    }
};
