// A recording under a random schedule: three threads push, commands and faults arrive, events restart it.
// CLIPFILE_STRESS_SEED repeats a schedule.

#include <gtest/gtest.h>

#include <condition_variable>
#include <cstdlib>
#include <deque>
#include <iostream>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/ChunkFollower.h"
#include "support/SeededDelays.h"
#include "support/StreamPushers.h"

namespace clipfileModule {
namespace {

constexpr std::chrono::seconds kDuration{4};

/// Runs the events of recordings as the controller does: one at a time, on a thread of its own.
class EventRunner {
 public:
    explicit EventRunner(const OutputSettings& settings) : settings_(settings), thread_([this] { run(); }) {}
    ~EventRunner() {
        {
            const std::lock_guard lock(mutex_);
            ended_ = true;
            changed_.notify_one();
        }
        thread_.join();
    }
    void Post(std::shared_ptr<Event> event) {
        const std::lock_guard lock(mutex_);
        events_.push_back(std::move(event));
        changed_.notify_one();
    }

 private:
    void run() {
        std::unique_lock lock(mutex_);
        while (true) {
            changed_.wait(lock, [this] { return ended_ || !events_.empty(); });
            if (events_.empty()) {
                return;
            }
            const std::shared_ptr<Event> event = std::move(events_.front());
            events_.pop_front();
            lock.unlock();
            if (const auto restart = std::dynamic_pointer_cast<RestartStreamingEvent>(event)) {
                restart->buffer->Stop();
                restart->buffer->Start(settings_);
            } else if (const auto removal = std::dynamic_pointer_cast<RemoveStreamingEvent>(event)) {
                removal->buffer->Stop();
            }
            lock.lock();
        }
    }

    const OutputSettings settings_;
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::shared_ptr<Event>> events_;
    bool ended_ = false;
    std::thread thread_;
};

/// Whether threads linger at their locks, and the rules of the records.
class StreamBufferStress : public ::testing::TestWithParam<std::tuple<bool, RecordRules>> {};

TEST_P(StreamBufferStress, EndsWithEveryRecordingInOrderAndComplete) {
    const char* given = std::getenv("CLIPFILE_STRESS_SEED");
    const std::uint64_t seed = given != nullptr ? std::stoull(given) : std::random_device()();
    // Printed at once, so that a run that does not end shows it too.
    std::cout << "seed " << seed << std::endl;
    std::mt19937_64 random(seed);
    std::vector<std::string> schedule;
    std::optional<SeededDelays> delays;
    const auto [delayed, rules] = GetParam();
    if (delayed) {
        delays.emplace(seed);
    }

    BufferHarness harness;
    harness.settings.recordRules = rules;
    harness.recorder.SetThreaded();
    std::mutex mutex;
    std::map<std::size_t, std::unique_ptr<ChunkFollower>> followers;
    harness.recorder.SetChunkHook([&](std::size_t output, const std::shared_ptr<ChunkData>& chunk) {
        ChunkFollower* follower = nullptr;
        {
            const std::lock_guard lock(mutex);
            auto& entry = followers[output];
            if (entry == nullptr) {
                entry = std::make_unique<ChunkFollower>();
            }
            follower = entry.get();
        }
        follower->Take(*chunk);
    });
    {
        EventRunner events(harness.settings);
        harness.controller.SetEventHook([&](std::shared_ptr<Event> event) { events.Post(std::move(event)); });
        StreamPushers pushers(*harness.buffer, harness.clock, seed, [](std::size_t) { return true; });
        const auto end = std::chrono::steady_clock::now() + kDuration;
        while (std::chrono::steady_clock::now() < end) {
            // Let the stream go on, now for nothing, now for some chunks.
            const std::uint64_t until = pushers.Frame() + (random() % 3 == 0 ? 0 : random() % 60);
            const auto patience = std::chrono::steady_clock::now() + std::chrono::milliseconds(200);
            while (pushers.Frame() < until && std::chrono::steady_clock::now() < patience) {
                std::this_thread::yield();
            }
            const std::string at = " at frame " + std::to_string(pushers.Frame());
            switch (random() % 8) {
                case 0:
                case 1:
                case 2:
                    schedule.push_back("start" + at);
                    harness.buffer->Start(harness.settings);
                    break;
                case 3:
                    schedule.push_back("stop" + at);
                    harness.buffer->Stop();
                    break;
                case 4: {
                    schedule.push_back("two stops" + at);
                    std::thread other([&] { harness.buffer->Stop(); });
                    harness.buffer->Stop();
                    other.join();
                    break;
                }
                case 5:
                    schedule.push_back("end of record" + at);
                    if (random() % 2 == 0) {
                        harness.buffer->SetEndTimestamp(
                            static_cast<std::int64_t>(harness.clock.VideoRtp(pushers.Frame())));
                    }
                    harness.buffer->SetStopTimestamp(
                        static_cast<std::int64_t>(harness.clock.VideoRtp(pushers.Frame())));
                    break;
                case 6:
                    schedule.push_back("slow file output" + at);
                    harness.recorder.SetQueueSize(49);
                    break;
                default:
                    schedule.push_back("fast file output" + at);
                    harness.recorder.SetQueueSize(0);
                    break;
            }
        }
        harness.buffer->Stop();
    }
    harness.controller.SetEventHook(nullptr);
    harness.buffer->Stop();

    std::string trace = "seed " + std::to_string(seed) + ":";
    for (const std::string& step : schedule) {
        trace += "\n  " + step;
    }
    SCOPED_TRACE(trace);
    std::size_t chunks = 0;
    for (const auto& [output, follower] : followers) {
        for (const ChunkFollower::Record& record : follower->Records()) {
            ++chunks;
            ASSERT_TRUE(record.inOrder) << "output " << output;
            if (rules == RecordRules::kExact) {
                // The last chunks of a record, at its end and at a stop, may be shorter.
                ASSERT_LE(record.video, 8u);
                ASSERT_LE(record.audio, 15u);
                ASSERT_LE(record.meta, 8u);
                continue;
            }
            ASSERT_EQ(record.video, 8u);
            ASSERT_EQ(record.audio, 15u);
            ASSERT_EQ(record.meta, 8u);
        }
    }
    EXPECT_GT(chunks, 0u);
    for (const auto& output : harness.recorder.Outputs()) {
        ASSERT_EQ(output.calls.front(), "Initialize");
        ASSERT_EQ(output.calls.back(), "Uninitialize");
        ASSERT_EQ(output.calls.at(output.calls.size() - 2), "Stop");
    }
}

INSTANTIATE_TEST_SUITE_P(Schedule, StreamBufferStress,
                         ::testing::Combine(::testing::Bool(),
                                            ::testing::Values(RecordRules::kKept, RecordRules::kExact)),
                         [](const auto& tested) {
                             return std::string(std::get<0>(tested.param) ? "WithDelays" : "Plain") +
                                    (std::get<1>(tested.param) == RecordRules::kExact ? "Exact" : "Kept");
                         });

}  // namespace
}  // namespace clipfileModule
