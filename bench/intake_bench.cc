// What the intake costs the host's threads.

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <thread>

#include "QxModuleHostInterface.h"
#include "buffer/queue/StreamQueue.h"
#include "controller/Controller.h"

namespace {

/// A host that records nothing: mode "off" and status 0.
class BenchHost : public QxModuleHostInterface {
 public:
    void SetStatus(int, int) override {}
    int GetStatus() override { return 0; }
    void GetParameter(std::string, int& value, int defaultValue) override { value = defaultValue; }
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override {
        value = key == "-outputMode" ? "off" : key == "-outputPath" ? "bench" : defaultValue;
    }
    int SendTransmissionStatus(const std::map<std::string, std::string>&) override { return 0; }
};

std::shared_ptr<StreamData> makeUnit() {
    static const unsigned char byte = 0;
    auto unit = std::make_shared<StreamData>();
    unit->size = 1;
    unit->payload = &byte;
    return unit;
}

/// One push and one pop of a queue with room, on one thread.
void BM_QueuePushPop(benchmark::State& state) {
    clipfileModule::StreamDataQueue queue(50, true);
    const std::shared_ptr<StreamData> unit = makeUnit();
    for (auto _ : state) {
        queue.Push(unit);
        benchmark::DoNotOptimize(queue.Pop());
    }
}
BENCHMARK(BM_QueuePushPop);

/// A unit that finds the queue full.
void BM_QueuePushDropped(benchmark::State& state) {
    clipfileModule::StreamDataQueue queue(50, true);
    const std::shared_ptr<StreamData> unit = makeUnit();
    while (queue.Push(unit)) {
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(queue.Push(unit));
    }
}
BENCHMARK(BM_QueuePushDropped);

/// `PushVideo` up to its return to the host, with the queue thread taking the units at the same time. Units
/// go in runs of 32, and each run starts with an empty queue, so that none is dropped.
void BM_PushVideo(benchmark::State& state) {
    constexpr std::int64_t kRun = 32;
    BenchHost host;
    clipfileModule::Controller controller;
    controller.Initialize(&host);
    const std::shared_ptr<StreamData> unit = makeUnit();
    for (auto _ : state) {
        const auto begin = std::chrono::steady_clock::now();
        for (std::int64_t i = 0; i < kRun; ++i) {
            controller.PushVideo(unit);
        }
        const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - begin;
        state.SetIterationTime(elapsed.count());
        // The queue thread holds a reference to each unit that still waits.
        while (unit.use_count() > 1) {
            std::this_thread::yield();
        }
    }
    state.counters["push"] = benchmark::Counter(static_cast<double>(state.iterations() * kRun),
                                                benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
    controller.Uninitialize();
}
BENCHMARK(BM_PushVideo)->UseManualTime()->Unit(benchmark::kNanosecond);

}  // namespace
