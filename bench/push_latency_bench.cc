// What a live host sees: the time that each push takes, at the pace of a stream of 60 frames a second and 60
// Mb/s, while one recording takes the units. Runs for ten seconds of stream.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "controller/Controller.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/StreamUnits.h"

namespace {

using std::chrono::steady_clock;

constexpr std::uint64_t kSeconds = 10;
constexpr std::uint64_t kFrames = 60 * kSeconds;
constexpr std::uint64_t kAudioFrames = 48000 * kSeconds / 1024;
constexpr std::size_t kPictureBytes = 60'000'000 / 8 / 60;

/// Pushes `units` at their times, each `interval` behind the one before, and gives how long each push took.
std::vector<double> pushAtPace(const std::vector<std::shared_ptr<StreamData>>& units,
                               steady_clock::time_point begin, std::chrono::nanoseconds interval,
                               const std::function<void(const std::shared_ptr<StreamData>&)>& push) {
    std::vector<double> microseconds;
    microseconds.reserve(units.size());
    for (std::size_t i = 0; i < units.size(); ++i) {
        std::this_thread::sleep_until(begin + interval * static_cast<std::int64_t>(i));
        const auto before = steady_clock::now();
        push(units[i]);
        microseconds.push_back(
            std::chrono::duration<double, std::micro>(steady_clock::now() - before).count());
    }
    return microseconds;
}

void report(benchmark::State& state, const std::string& medium, std::vector<double> microseconds) {
    std::sort(microseconds.begin(), microseconds.end());
    const std::size_t last = microseconds.size() - 1;
    state.counters[medium + " median us"] = microseconds[last / 2];
    state.counters[medium + " p99.9 us"] = microseconds[last * 999 / 1000];
    state.counters[medium + " max us"] = microseconds[last];
}

void BM_PushLatency(benchmark::State& state) {
    FakeRegistry registry;
    registry.Set("MP4OutputPath", "bench");
    FileOutputRecorder outputs;
    outputs.SetChunkHook([](std::size_t, const auto&) {});
    FakeHost host;
    host.numbers["-encodedFPS"] = 60000;
    clipfileModule::Controller controller;
    controller.Initialize(&host);
    controller.BufferingStart();

    const stream_units::StreamClock clock{stream_units::kFrameRates[7]};
    std::vector<std::shared_ptr<StreamData>> video;
    std::vector<std::shared_ptr<StreamData>> audio;
    std::vector<std::shared_ptr<StreamData>> meta;
    for (std::uint64_t n = 0; n < kFrames; ++n) {
        stream_units::Bytes payload =
            stream_units::VideoPayload(n, n % 60 == 0 ? stream_units::kIdr : stream_units::kPicture);
        payload.resize(kPictureBytes, 0x5A);
        video.push_back(stream_units::MakeUnit(payload, clock.VideoRtp(n), clock.VideoMilliSec(n)));
        meta.push_back(clock.Meta(n));
    }
    for (std::uint64_t n = 0; n < kAudioFrames; ++n) {
        audio.push_back(clock.Audio(n));
    }

    for (auto _ : state) {
        std::vector<double> audioTimes;
        std::vector<double> metaTimes;
        const auto begin = steady_clock::now() + std::chrono::milliseconds(10);
        const std::chrono::nanoseconds frame(1'000'000'000 / 60);
        std::thread audioThread([&] {
            audioTimes = pushAtPace(audio, begin, std::chrono::nanoseconds(1'000'000'000LL * 1024 / 48000),
                                    [&](const auto& unit) { controller.PushAudio(unit); });
        });
        std::thread metaThread([&] {
            metaTimes = pushAtPace(meta, begin, frame, [&](const auto& unit) { controller.PushMeta(unit); });
        });
        std::vector<double> videoTimes =
            pushAtPace(video, begin, frame, [&](const auto& unit) { controller.PushVideo(unit); });
        audioThread.join();
        metaThread.join();
        report(state, "video", std::move(videoTimes));
        report(state, "audio", std::move(audioTimes));
        report(state, "meta", std::move(metaTimes));
    }
    state.counters["chunks"] = static_cast<double>(outputs.Outputs().at(0).chunkCount);
    controller.Uninitialize();
}
BENCHMARK(BM_PushLatency)->Iterations(1)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace
