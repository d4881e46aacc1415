#pragma once

#include <sched.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "endtoend/LoadedModule.h"
#include "endtoend/NumberedStream.h"
#include "support/FakeHost.h"
#include "support/LogLines.h"
#include "support/ReorderedStream.h"
#include "support/TempDir.h"

/// Keeps this thread and all that it starts on one processor, which another thread uses up, while it lives.
class LoadedCore {
 public:
    LoadedCore() {
        if (sched_getaffinity(0, sizeof before_, &before_) != 0) {
            throw std::runtime_error("sched_getaffinity");
        }
        cpu_set_t one;
        CPU_ZERO(&one);
        for (int cpu = 0; cpu < CPU_SETSIZE; ++cpu) {
            if (CPU_ISSET(cpu, &before_)) {
                CPU_SET(cpu, &one);
                break;
            }
        }
        if (sched_setaffinity(0, sizeof one, &one) != 0) {
            throw std::runtime_error("sched_setaffinity");
        }
        spinner_ = std::thread([this] {
            while (!done_.load(std::memory_order_relaxed)) {
            }
        });
    }
    ~LoadedCore() {
        done_ = true;
        spinner_.join();
        sched_setaffinity(0, sizeof before_, &before_);
    }
    LoadedCore(const LoadedCore&) = delete;
    LoadedCore& operator=(const LoadedCore&) = delete;

 private:
    cpu_set_t before_ = {};
    std::atomic<bool> done_ = false;
    std::thread spinner_;
};

/// How a host pushes.
struct Delivery {
    stream_units::FrameRate rate = stream_units::kRate25;
    bool videoFirst = false;
    std::uint64_t audioLateMilliSec = 0;
    /// Against real time.
    double speed = 1;
    /// Pictures come in decoding order, in such groups; in the order in which they are shown where it is
    /// empty.
    reordered_stream::Pattern pattern = {};
};

/// A live source and the built library, which records as the record flag says, with exact rules. A source
/// does not wait: what finds the module's queues full is lost.
class LiveHost {
 public:
    /// `texts` are start parameters in the place of what the host would say, or beside it.
    explicit LiveHost(const Delivery& delivery, const std::map<std::string, std::string>& texts = {})
        : delivery_(delivery), stream(delivery.rate) {
        host_.texts = texts;
        host_.texts.insert({{"-outputPath", directory.Path().string()},
                            {"-filePrefix", "Cam"},
                            {"-outputMode", "sync"},
                            {"-recordRules", "exact"}});
        host_.numbers["-encodedFPS"] = static_cast<int>(delivery.rate.key);
        if (!delivery.pattern.empty()) {
            host_.texts["-pictureOrder"] = "decoding";
            pictures = reordered_stream::MakePictures(delivery.pattern, NumberedStream::kGroupOfPictures,
                                                      kMostReordered);
        }
        log.OnLine([this](const CapturedLine& line) {
            takenVideo_ += line.text.starts_with("ST: [V]") ? 1 : 0;
            takenAudio_ += line.text.starts_with("ST: [A]") ? 1 : 0;
        });
        if (!module_.Module().Initialize(&host_)) {
            throw std::runtime_error("the module does not start");
        }
        next_ = std::chrono::steady_clock::now();
    }
    ~LiveHost() { End(); }
    LiveHost(const LiveHost&) = delete;
    LiveHost& operator=(const LiveHost&) = delete;

    /// Pushes frames up to `end` at the pace of the source, with the record flag as given.
    void PushUntil(std::uint64_t end, bool recFlag) {
        for (; frame < end; ++frame) {
            std::this_thread::sleep_until(next_);
            next_ += std::chrono::nanoseconds(
                static_cast<std::int64_t>(1e9 * static_cast<double>(delivery_.rate.duration) /
                                          static_cast<double>(delivery_.rate.timescale) / delivery_.speed));
            pushFrame(recFlag);
        }
    }
    /// Pushes frames until lines that begin with `prefix` came `count` times.
    void PushUntilLine(const std::string& prefix, std::size_t count, bool recFlag) {
        const Deadline deadline;
        while (countPrefix(log, prefix) < count) {
            deadline.Check();
            PushUntil(frame + 1, recFlag);
        }
    }
    /// Pushes pictures and sound alone, as fast as the recording takes them, until it is started again. The
    /// sound must be in step with the pictures.
    void StarveOfMetadata() {
        static constexpr std::uint64_t kAhead = 30;
        const auto restarted = [this] { return countPrefix(log, "OP: REC RESTART.") > 0; };
        const Deadline deadline;
        if (!waitForPrefix(log, "ST: [V]\t" + std::to_string(stream.clock.VideoRtp(frame - 1)))) {
            throw std::runtime_error("a picture was lost");
        }
        takenVideo_ = 0;
        takenAudio_ = 0;
        std::uint64_t video = 0;
        std::uint64_t audio = 0;
        for (; !restarted(); ++frame) {
            ++video;
            audio += pushAudio(frame);
            module_.Stream().PushVideo(stream.Video(frame));
            while (!restarted() && (video > takenVideo_ + kAhead || audio > takenAudio_ + kAhead)) {
                deadline.Check();
                std::this_thread::yield();
            }
        }
        next_ = std::chrono::steady_clock::now();
    }
    /// Ends the module's life, so that its files are complete.
    void End() {
        if (!ended_) {
            ended_ = true;
            module_.Module().Uninitialize();
        }
    }
    /// True when the module was too slow for the source.
    bool HasLostUnits() const { return countPrefix(log, "queue overflow") > 0; }

 private:
    class Deadline {
     public:
        void Check() const {
            if (std::chrono::steady_clock::now() > end_) {
                throw std::runtime_error("the module does not come to what it should do");
            }
        }

     private:
        const std::chrono::steady_clock::time_point end_ =
            std::chrono::steady_clock::now() + LogCapture::kDeadline;
    };

    std::shared_ptr<StreamData> picture() const {
        auto unit = stream.Video(frame);
        if (!pictures.empty()) {
            unit->presentation_timestamp = stream.clock.VideoRtp(
                pictures.at(frame).shown + reordered_stream::DelayOf(delivery_.pattern));
        }
        return unit;
    }
    void pushFrame(bool recFlag) {
        if (delivery_.videoFirst) {
            module_.Stream().PushVideo(picture());
            pushAudio(frame);
            module_.Stream().PushMeta(stream.Meta(frame, recFlag));
        } else {
            module_.Stream().PushMeta(stream.Meta(frame, recFlag));
            pushAudio(frame);
            module_.Stream().PushVideo(picture());
        }
    }
    /// Pushes the sound that is due with a frame, and returns the number of units.
    std::uint64_t pushAudio(std::uint64_t dueWith) {
        const std::uint64_t late =
            (delivery_.audioLateMilliSec * delivery_.rate.timescale + 1000 * delivery_.rate.duration - 1) /
            (1000 * delivery_.rate.duration);
        const std::uint64_t until = dueWith < late ? 0 : stream.clock.AudioBefore(dueWith + 1 - late);
        const std::uint64_t first = nextAudio_;
        for (; nextAudio_ < until; ++nextAudio_) {
            module_.Stream().PushAudio(stream.Audio(nextAudio_));
        }
        return nextAudio_ - first;
    }

    /// Far more than are pushed in any time that a test waits.
    static constexpr std::uint64_t kMostReordered = 100000;

    const Delivery delivery_;
    std::atomic<std::uint64_t> takenVideo_ = 0;
    std::atomic<std::uint64_t> takenAudio_ = 0;

 public:
    LogCapture log{LOG_PRIORITY_TRACE};
    const TempDir directory;
    const NumberedStream stream;
    /// The next one to be pushed.
    std::uint64_t frame = 0;
    /// Where the pictures are shown, if they are reordered.
    std::vector<reordered_stream::Picture> pictures;

 private:
    FakeHost host_;
    LoadedModule module_;
    std::chrono::steady_clock::time_point next_;
    std::uint64_t nextAudio_ = 0;
    bool ended_ = false;
};
