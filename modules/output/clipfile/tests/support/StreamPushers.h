#pragma once

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <random>
#include <thread>
#include <utility>
#include <vector>

#include "QxModuleStreamInterface.h"
#include "support/StreamUnits.h"

/// Pushes the three media of one numbered stream from a thread each while it lives, in step within a few
/// frames, with seeded pauses. Media can be muted: their units are then left out, as by a source that stopped
/// giving them.
class StreamPushers {
 public:
    /// `mayPush(medium)` holds a medium back while it is false: 0 video, 1 audio, 2 metadata.
    StreamPushers(QxModuleStreamInterface& stream, const stream_units::StreamClock& clock, std::uint64_t seed,
                  std::function<bool(std::size_t)> mayPush)
        : stream_(stream), clock_(clock), mayPush_(std::move(mayPush)) {
        for (std::size_t medium = 0; medium < kMediumCount; ++medium) {
            threads_.emplace_back([this, medium, seed] { run(medium, seed + medium + 1); });
        }
    }
    ~StreamPushers() {
        done_ = true;
        for (std::thread& thread : threads_) {
            thread.join();
        }
    }
    StreamPushers(const StreamPushers&) = delete;
    StreamPushers& operator=(const StreamPushers&) = delete;

    /// Video frames passed so far, pushed or muted.
    std::uint64_t Frame() const { return frames_[0]; }

    std::atomic<bool> recFlag = false;
    std::atomic<bool> muteAudio = false;
    std::atomic<bool> muteMeta = false;
    /// No IDR frames: pictures that no recording can start with.
    std::atomic<bool> muteIdr = false;

 private:
    static constexpr std::size_t kMediumCount = 3;
    static constexpr std::uint64_t kGroupOfPictures = 10;
    static constexpr std::uint64_t kMaximalLead = 6;

    void run(std::size_t medium, std::uint64_t seed) {
        std::minstd_rand random(static_cast<std::uint32_t>(seed));
        std::atomic<std::uint64_t>& frame = frames_[medium];
        while (!done_) {
            const std::uint64_t slowest = std::min({frames_[0].load(), frames_[1].load(), frames_[2].load()});
            if (frame > slowest + kMaximalLead || !mayPush_(medium)) {
                std::this_thread::yield();
                continue;
            }
            push(medium, frame);
            ++frame;
            if (random() % 16 == 0) {
                std::this_thread::sleep_for(std::chrono::microseconds(random() % 200));
            }
        }
    }
    void push(std::size_t medium, std::uint64_t n) {
        if (medium == 0) {
            const bool idr = n % kGroupOfPictures == 0 && !muteIdr;
            stream_.PushVideo(clock_.Video(n, idr ? stream_units::kIdr : stream_units::kPicture));
        } else if (medium == 1) {
            for (std::uint64_t k = clock_.AudioBefore(n); k < clock_.AudioBefore(n + 1) && !muteAudio; ++k) {
                stream_.PushAudio(
                    stream_units::AudioUnit(audioNumber_++, clock_.AudioRtp(k), clock_.AudioMilliSec(k)));
            }
        } else if (!muteMeta) {
            const stream_units::Timecode timecode{1, 2, 3, static_cast<unsigned char>(n % 25), false};
            stream_.PushMeta(stream_units::MetaUnit(metaNumber_++, clock_.VideoRtp(n),
                                                    clock_.VideoMilliSec(n), {recFlag.load(), timecode}));
        }
    }

    QxModuleStreamInterface& stream_;
    const stream_units::StreamClock clock_;
    const std::function<bool(std::size_t)> mayPush_;
    // Each used by its medium's thread alone: what is muted takes no number, so that a gap is always a loss.
    std::uint64_t audioNumber_ = 0;
    std::uint64_t metaNumber_ = 0;
    std::atomic<bool> done_ = false;
    std::array<std::atomic<std::uint64_t>, kMediumCount> frames_ = {};
    std::vector<std::thread> threads_;
};
