#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "buffer/StreamBuffer.h"
#include "support/ControllerRecorder.h"
#include "support/FileOutputRecorder.h"
#include "support/StreamBufferPeer.h"
#include "support/StreamUnits.h"

/// A recording with recorders at both of its ends, and a stream to push into it.
///
/// The chunk thread makes one pass for each unit that finds it waiting, once a pass could do anything; a unit
/// that comes while it works wakes nobody. What waits for the chunk thread therefore keeps the stream
/// running.
class BufferHarness {
 public:
    explicit BufferHarness(stream_units::StreamClock streamClock = {}, std::int64_t start = 0,
                           std::int64_t stop = -1)
        : clock(streamClock),
          buffer(std::make_shared<clipfileModule::StreamBuffer>(&controller, start, stop)) {
        settings.framerate = clock.rate.key;
        settings.fileType = "normal";
        settings.outputPath = "out";
        settings.bitrate = 60000;
        settings.width = 64;
        settings.height = 48;
    }
    ~BufferHarness() {
        buffer->Stop();
        controller.Clear();
    }
    BufferHarness(const BufferHarness&) = delete;
    BufferHarness& operator=(const BufferHarness&) = delete;

    void Start() { buffer->Start(settings); }

    /// Pushes video frame `nextVideo` with its metadata unit and the audio that begins before the next frame.
    /// Every `gop`th frame is an IDR frame.
    void PushFrame() {
        PushAudioBefore(nextVideo + 1);
        buffer->PushMeta(clock.Meta(nextVideo, metaFields));
        buffer->PushVideo(
            clock.Video(nextVideo, nextVideo % gop == 0 ? stream_units::kIdr : stream_units::kPicture));
        ++nextVideo;
    }
    void PushFrames(std::uint64_t count) {
        for (std::uint64_t i = 0; i < count; ++i) {
            PushFrame();
        }
    }
    /// Pushes the audio that begins before video frame `frame`.
    void PushAudioBefore(std::uint64_t frame) {
        for (; nextAudio < clock.AudioBefore(frame); ++nextAudio) {
            buffer->PushAudio(clock.Audio(nextAudio));
        }
    }
    /// Waits until the caches hold that many units.
    [[nodiscard]] bool WaitForCached(std::size_t video, std::size_t audio, std::size_t meta) const {
        const std::array<std::size_t, 3> expected = {video, audio, meta};
        const auto deadline = std::chrono::steady_clock::now() + LogCapture::kDeadline;
        while (clipfileModule::StreamBufferPeer::Cached(*buffer) != expected) {
            if (std::chrono::steady_clock::now() > deadline) {
                return false;
            }
            std::this_thread::yield();
        }
        return true;
    }
    /// Runs the stream until `done`, checked while the recording works. False when it never comes.
    template <typename Done>
    [[nodiscard]] bool RunUntil(Done done, std::uint64_t maxFrames = 3000) {
        for (std::uint64_t i = 0; i < maxFrames; ++i) {
            if (done(std::chrono::milliseconds(i < 100 ? 1 : 20))) {
                return true;
            }
            PushFrame();
        }
        return done(std::chrono::seconds(10));
    }
    /// Runs the stream until the file output got `count` chunks.
    [[nodiscard]] bool RunUntilChunks(std::size_t count, std::size_t output = 0) {
        while (nextVideo < 8 * count + 8) {
            PushFrame();
        }
        return RunUntil(
            [&](std::chrono::milliseconds wait) { return recorder.WaitForChunks(count, output, wait); });
    }
    /// Sends audio frames alone, from `frame` on, until `done`: no picture ends the wait for the IDR frame.
    template <typename Done>
    [[nodiscard]] bool RunAudioUntil(std::uint64_t frame, Done done) {
        for (int i = 0; i < 500; ++i) {
            if (done(std::chrono::milliseconds(20))) {
                return true;
            }
            buffer->PushAudio(clock.Audio(frame++));
        }
        return done(std::chrono::seconds(10));
    }
    /// Runs the stream until the line was logged.
    [[nodiscard]] bool RunUntilText(const LogCapture& log, const std::string& text) {
        return RunUntil([&](std::chrono::milliseconds wait) { return log.WaitForText(text, 1, wait); });
    }
    /// Pushes metadata units until the line was logged: each makes a pass.
    [[nodiscard]] bool NudgeUntilText(const LogCapture& log, const std::string& text) {
        for (int i = 0; i < 200; ++i) {
            if (log.WaitForText(text, 1, std::chrono::milliseconds(20))) {
                return true;
            }
            buffer->PushMeta(clock.Meta(nextVideo++));
        }
        return false;
    }

    std::vector<std::shared_ptr<clipfileModule::ChunkData>> Chunks(std::size_t output = 0) const {
        return recorder.At(output).chunks;
    }

    stream_units::StreamClock clock;
    clipfileModule::OutputSettings settings;
    FileOutputRecorder recorder;
    ControllerRecorder controller;
    std::shared_ptr<clipfileModule::StreamBuffer> buffer;
    stream_units::MetaFields metaFields;
    std::uint64_t gop = 12;
    std::uint64_t nextVideo = 0;
    std::uint64_t nextAudio = 0;
};

/// The numbers of the samples in a list of `medium` ('V', 'A' or 'M').
inline std::vector<std::uint64_t> NumbersOf(
    char medium, const std::vector<std::shared_ptr<nal_access::SampleData>>& samples) {
    std::vector<std::uint64_t> numbers;
    for (const auto& sample : samples) {
        numbers.push_back(stream_units::NumberOf(medium, *sample).value());
    }
    return numbers;
}

/// `count` numbers from `first` on.
inline std::vector<std::uint64_t> Range(std::uint64_t first, std::uint64_t count) {
    std::vector<std::uint64_t> numbers(count);
    for (std::uint64_t i = 0; i < count; ++i) {
        numbers[i] = first + i;
    }
    return numbers;
}
