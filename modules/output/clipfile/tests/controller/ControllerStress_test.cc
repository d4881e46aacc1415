// The module's controller under random schedules: three threads push while commands, notifications and faults
// arrive, through several lives. CLIPFILE_STRESS_SEED repeats a schedule, CLIPFILE_STRESS_SECONDS sets how
// long it runs.

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <set>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "LogSink.h"
#include "QxModuleStatus.h"
#include "controller/Controller.h"
#include "message_handler/QxMessageHandler.h"
#include "support/ChunkFollower.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/SeededDelays.h"
#include "support/StreamPushers.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using std::chrono::steady_clock;

std::uint64_t numberFromEnvironment(const char* name, std::uint64_t otherwise) {
    const char* text = std::getenv(name);
    return text != nullptr ? std::stoull(text) : otherwise;
}

/// Counts whatever leaves units out: flushes and full queues of the module, by its log, and pauses of the
/// source. A recording during which the count of these changed may have gaps; any other is complete.
class LossWatch : public LogSinkInterface {
 public:
    void OnLine(const LogLine& line) override {
        const std::string_view function = line.function != nullptr ? line.function : "";
        const bool flushes = function == "clipfileModule::Controller::BufferingStop" ||
                             function == "clipfileModule::Controller::OnRetartStream";
        // The flush itself lies between the two lines, and a recording may start in between.
        if (flushes && line.text == "start.") {
            ++losses_;
            ++flushing_;
        } else if (flushes && line.text == "end.") {
            ++losses_;
            --flushing_;
        } else if (line.text.find("queue overflow") != std::string_view::npos) {
            ++losses_;
        } else if (line.text == "OP: CHANGE STATE stop -> wait_state.") {
            // Recordings start one at a time, each right after its file output was made.
            const std::lock_guard lock(mutex_);
            atStart_.push_back(flushing_ == 0 ? losses_.load() : kNever);
        }
    }
    /// Units are left out for a reason that no line tells.
    void Lose() { ++losses_; }
    /// True when nothing was dropped since the recording with this output started.
    bool Complete(std::size_t output) const {
        const std::lock_guard lock(mutex_);
        return output < atStart_.size() && atStart_[output] == losses_ && flushing_ == 0;
    }

 private:
    static constexpr std::uint64_t kNever = ~std::uint64_t{0};

    std::atomic<std::uint64_t> losses_ = 0;
    std::atomic<int> flushing_ = 0;
    mutable std::mutex mutex_;
    std::vector<std::uint64_t> atStart_;
};

/// A host whose answers may take time, during which others come to it. Notes what must not happen: a status
/// behind a 7.
class WatchedHost : public FakeHost {
 public:
    WatchedHost(LossWatch& losses, std::uint64_t seed)
        : losses_(losses), random_(static_cast<std::uint32_t>(seed)) {}
    int GetStatus() override {
        const int status = FakeHost::GetStatus();
        // Slow to answer whom it notifies, and not those who push.
        if (std::this_thread::get_id() == notifier_) {
            std::this_thread::sleep_for(std::chrono::microseconds(random_() % 5000));
        }
        return status;
    }
    void SetStatus(int status, int cause) override {
        if (failed_) {
            ++late_;
        }
        FakeHost::SetStatus(status, cause);
        if (status == QxStatus::kFailed) {
            // The module drops from now on what is pushed, without a line.
            losses_.Lose();
            failed_ = true;
        }
    }
    bool Failed() const { return failed_; }
    /// Statuses behind a 7.
    int Late() const { return late_; }

 private:
    LossWatch& losses_;
    const std::thread::id notifier_ = std::this_thread::get_id();
    /// Used by the notifying thread alone.
    std::minstd_rand random_;
    std::atomic<bool> failed_ = false;
    std::atomic<int> late_ = 0;
};

/// The way into the module, which must take no unit whose push begins when the host has status 7.
class WatchedIntake : public QxModuleStreamInterface {
 public:
    WatchedIntake(QxModuleStreamInterface& stream, const WatchedHost& host) : stream_(stream), host_(host) {}
    void PushReserved(const std::shared_ptr<StreamData>& unit) override { stream_.PushReserved(unit); }
    void PushVideo(const std::shared_ptr<StreamData>& unit) override {
        push(&QxModuleStreamInterface::PushVideo, unit);
    }
    void PushAudio(const std::shared_ptr<StreamData>& unit) override {
        push(&QxModuleStreamInterface::PushAudio, unit);
    }
    void PushMeta(const std::shared_ptr<StreamData>& unit) override {
        push(&QxModuleStreamInterface::PushMeta, unit);
    }
    /// Units that were taken behind a 7.
    int Taken() const { return taken_; }

 private:
    void push(void (QxModuleStreamInterface::*operation)(const std::shared_ptr<StreamData>&),
              const std::shared_ptr<StreamData>& unit) {
        const bool failed = host_.Failed();
        const long holders = unit.use_count();
        (stream_.*operation)(unit);
        taken_ += failed && unit.use_count() > holders ? 1 : 0;
    }

    QxModuleStreamInterface& stream_;
    const WatchedHost& host_;
    std::atomic<int> taken_ = 0;
};

/// Checks the chunks of every recording as they come: eight pictures each with their audio and metadata, from
/// an IDR frame on, in order, and where the module dropped nothing without a gap.
class ChunkJudge {
 public:
    explicit ChunkJudge(const LossWatch& losses) : losses_(losses) {}

    void Take(std::size_t output, const ChunkData& chunk) {
        // Asked before the chunk is looked at: a loss that comes now does not excuse it.
        const bool complete = !exact_ && losses_.Complete(output);
        const std::lock_guard lock(mutex_);
        State& state = states_[output];
        if (!state.begun && (chunk.video.empty() || !chunk.video.front()->GetSync())) {
            fault(output, "begins without an IDR frame");
        }
        if (!exact_ && (chunk.video.size() != 8 || chunk.audio.size() != 15 || chunk.meta.size() != 8)) {
            fault(output, "has a chunk of another size");
        }
        follow(output, 'V', chunk.video, state.next[0], complete);
        follow(output, 'A', chunk.audio, state.next[1], complete);
        follow(output, 'M', chunk.meta, state.next[2], complete);
        state.begun = true;
        ++chunks_;
        complete_ += complete ? 1 : 0;
    }
    /// Recordings by exact rules begin with units of the past, end with a shorter chunk and are in order. Set
    /// while there is none.
    void SetExact(bool exact) { exact_ = exact; }
    std::set<std::string> Faults() const {
        const std::lock_guard lock(mutex_);
        return faults_;
    }
    std::uint64_t Chunks() const { return chunks_; }
    std::uint64_t CompleteChunks() const { return complete_; }

 private:
    struct State {
        bool begun = false;
        std::optional<std::uint64_t> next[3];
    };

    void follow(std::size_t output, char medium,
                const std::vector<std::shared_ptr<nal_access::SampleData>>& samples,
                std::optional<std::uint64_t>& next, bool complete) {
        for (const auto& sample : samples) {
            // A flush spares the one unit that a queue thread has in hand, and a recording that starts then
            // gets it.
            const bool alone = next && second_.insert({output, medium}).second;
            const std::optional<std::uint64_t> number = stream_units::NumberOf(medium, *sample);
            if (!number || (next && *number < *next)) {
                fault(output, std::string("is out of order in ") + medium);
            } else if (complete && next && !alone && *number != *next) {
                fault(output, std::string("has a gap in ") + medium + " before " + std::to_string(*number));
            }
            next = number.value_or(0) + 1;
        }
    }
    void fault(std::size_t output, const std::string& what) {
        faults_.insert("recording " + std::to_string(output) + " " + what);
    }

    const LossWatch& losses_;
    std::atomic<bool> exact_ = false;
    mutable std::mutex mutex_;
    std::map<std::size_t, State> states_;
    std::set<std::string> faults_;
    /// The recordings and media of which the second unit has come.
    std::set<std::pair<std::size_t, char>> second_;
    std::atomic<std::uint64_t> chunks_ = 0;
    std::atomic<std::uint64_t> complete_ = 0;
};

/// One run of the module under a seeded schedule.
class Stress {
 public:
    explicit Stress(std::uint64_t seed) : random_(seed), seed_(seed) {
        registry_.Set("MP4OutputPath", "out");
        LogSinks::Add(losses_, LOG_PRIORITY_TRACE);
        outputs_.SetThreaded();
        outputs_.SetChunkHook([this](std::size_t output, const std::shared_ptr<ChunkData>& chunk) {
            judge_.Take(output, *chunk);
        });
    }
    ~Stress() { LogSinks::Remove(losses_.get()); }

    /// One life of the module, from `Initialize` to `Uninitialize`.
    void Live(steady_clock::time_point end) {
        WatchedHost host(*losses_, seed_ + lives_);
        host.texts["-outputMode"] = pick(2) == 0 ? "on" : "sync";
        host.texts["-naluType"] = pick(2) == 0 ? "normal" : "direct";
        const bool exact = pick(3) == 0;
        host.texts["-recordRules"] = exact ? "exact" : "kept";
        judge_.SetExact(exact);
        host.numbers["-encodedFPS"] = 25000;
        note("life in mode " + host.texts["-outputMode"] + " by rules " + host.texts["-recordRules"]);
        outputs_.SetQueueSize(0);
        Controller controller;
        QxMessageHandler handler(&controller);
        ControllerPeer peer(controller);
        ASSERT_TRUE(controller.Initialize(&host));
        controller.Execute();
        WatchedIntake intake(controller, host);
        {
            // A host that pushes no faster than the module takes it, so that nothing is dropped for that.
            StreamPushers pushers(intake, clock_, seed_ + lives_,
                                  [&](std::size_t medium) { return peer.Queue(medium).Size() < 30; });
            const std::uint64_t steps = 5 + pick(40);
            for (std::uint64_t i = 0; i < steps && steady_clock::now() < end; ++i) {
                letTheStreamRun(pushers);
                step(handler, controller, pushers);
            }
            for (const FakeHost::Status& status : host.Statuses()) {
                statuses_.insert(status);
            }
            // Some lives end with full queues and a stream that ran to the last moment.
        }
        note("end");
        controller.Uninitialize();
        lateStatuses_ += host.Late();
        takenUnits_ += intake.Taken();
        failedLives_ += host.Failed() ? 1 : 0;
        clock_.startMilliSec += 1000000;
        clock_.videoRtp += 90000000;
        clock_.audioRtp += 48000000;
        ++lives_;
    }

    ChunkJudge& Judge() { return judge_; }
    const std::set<FakeHost::Status>& Statuses() const { return statuses_; }
    std::uint64_t Lives() const { return lives_; }
    std::uint64_t FailedLives() const { return failedLives_; }
    /// Statuses that followed a 7, and units that were taken behind one.
    int LateStatuses() const { return lateStatuses_; }
    int TakenUnits() const { return takenUnits_; }
    std::string Trace() const {
        std::string trace = "seed " + std::to_string(seed_) + ":";
        for (const std::string& entry : schedule_) {
            trace += "\n  " + entry;
        }
        return trace;
    }
    bool EveryOutputWasEnded() const {
        for (const auto& output : outputs_.Outputs()) {
            if (output.calls.back() != "Uninitialize") {
                return false;
            }
        }
        return true;
    }

 private:
    std::uint64_t pick(std::uint64_t count) { return random_() % count; }
    void note(std::string entry) { schedule_.push_back(std::move(entry)); }

    void letTheStreamRun(const StreamPushers& pushers) {
        const std::uint64_t kind = pick(16);
        const std::uint64_t frames = kind == 0 ? 700 : kind < 6 ? 0 : pick(90);
        const std::uint64_t until = pushers.Frame() + frames;
        const auto patience = steady_clock::now() + std::chrono::milliseconds(500);
        while (pushers.Frame() < until && steady_clock::now() < patience) {
            std::this_thread::yield();
        }
    }
    void step(QxMessageHandler& handler, Controller& controller, StreamPushers& pushers) {
        const std::string at = " at frame " + std::to_string(pushers.Frame());
        switch (pick(14)) {
            case 0:
            case 1:
                note("online" + at);
                handler.NotifyOnlineStatus();
                break;
            case 2:
                note("offline" + at);
                handler.NotifyOfflineStatus();
                break;
            case 3: {
                note("connect" + at);
                QxInputOutputConnectRequest request;
                request.framerate = pick(2) == 0 ? 25000 : 50000;
                request.width = 1280;
                request.height = 720;
                handler.NotifyInputOutputConnectRequest(&request);
                break;
            }
            case 4: {
                note("disconnect" + at);
                QxInputOutputDisconnectionRequest request;
                request.connectionKind = static_cast<std::uint32_t>(1 + pick(2));
                handler.NotifyInputOutputDisconnectionRequest(&request);
                break;
            }
            case 5:
            case 6:
            case 7:
                note("record flag turns" + at);
                pushers.recFlag = !pushers.recFlag;
                break;
            case 8:
                note("file output turns slow" + at);
                outputs_.SetQueueSize(49);
                break;
            case 9:
                note("file output turns fast" + at);
                outputs_.SetQueueSize(0);
                break;
            case 10:
                note("audio turns" + at);
                pushers.muteAudio = !pushers.muteAudio;
                break;
            case 11:
                note("metadata turns" + at);
                pushers.muteMeta = !pushers.muteMeta;
                break;
            case 12:
                note("IDR frames turn" + at);
                pushers.muteIdr = !pushers.muteIdr;
                break;
            default:
                note("status is posted" + at);
                controller.Execute();
                break;
        }
    }

    std::mt19937_64 random_;
    const std::uint64_t seed_;
    stream_units::StreamClock clock_;
    FakeRegistry registry_;
    FileOutputRecorder outputs_;
    const std::shared_ptr<LossWatch> losses_ = std::make_shared<LossWatch>();
    ChunkJudge judge_{*losses_};
    std::vector<std::string> schedule_;
    std::set<FakeHost::Status> statuses_;
    std::uint64_t lives_ = 0;
    std::uint64_t failedLives_ = 0;
    int lateStatuses_ = 0;
    int takenUnits_ = 0;
};

class ControllerStress : public testing::TestWithParam<bool> {};

TEST_P(ControllerStress, EndsWithEveryRecordingInOrderAndComplete) {
    const std::uint64_t seed = numberFromEnvironment("CLIPFILE_STRESS_SEED", std::random_device()());
    // Printed at once, so that a run that does not end shows it too.
    std::cout << "seed " << seed << std::endl;
    const auto end =
        steady_clock::now() + std::chrono::seconds(numberFromEnvironment("CLIPFILE_STRESS_SECONDS", 5));
    std::optional<SeededDelays> delays;
    if (GetParam()) {
        delays.emplace(seed);
    }
    Stress stress(seed);
    // A busy machine may need longer until one chunk was checked.
    while (steady_clock::now() < end || stress.Judge().CompleteChunks() == 0) {
        stress.Live(std::max(end, steady_clock::now() + std::chrono::seconds(2)));
    }
    SCOPED_TRACE(stress.Trace());
    EXPECT_TRUE(stress.Judge().Faults().empty()) << testing::PrintToString(stress.Judge().Faults());
    EXPECT_EQ(stress.LateStatuses(), 0);
    EXPECT_EQ(stress.TakenUnits(), 0);
    EXPECT_TRUE(stress.EveryOutputWasEnded());
    EXPECT_GT(stress.Judge().CompleteChunks(), 0U);
    std::cout << stress.Lives() << " lives, " << stress.FailedLives() << " of them ended with 7, "
              << stress.Judge().Chunks() << " chunks, " << stress.Judge().CompleteChunks()
              << " of them checked for gaps, statuses " << testing::PrintToString(stress.Statuses())
              << std::endl;
}

INSTANTIATE_TEST_SUITE_P(Schedule, ControllerStress, testing::Values(false, true),
                         [](const auto& param) { return param.param ? "WithDelays" : "Plain"; });

}  // namespace
}  // namespace clipfileModule
