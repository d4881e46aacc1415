// The whole module, driven by a byte stream that is decoded into the calls of a host: units that are right
// and units that are not, record commands, notifications, clocks that jump, parameters. However it is used,
// it ends when it is told to, no status follows status 7, no thread is left, and the files of a life that did
// not fail are closed and can be read.

#include <fuzzer/FuzzedDataProvider.h>
#include <stdlib.h>

#include <chrono>
#include <iterator>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "Expect.h"
#include "QxModuleHostInterface.h"
#include "QxModuleStatus.h"
#include "TemporaryFolder.h"
#include "controller/Mp4FileOutput.h"
#include "reader/Recording.h"
#include "reader/RecordingSamples.h"
#include "support/StreamUnits.h"

namespace {

using stream_units::Bytes;

/// With all that recordings which wait for their first picture may hold.
constexpr std::ptrdiff_t kMostThreads = 200;
constexpr std::size_t kMostSteps = 100;

std::ptrdiff_t Threads() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/task"),
                         std::filesystem::directory_iterator());
}

class Host final : public QxModuleHostInterface {
 public:
    explicit Host(FuzzedDataProvider& input, const std::filesystem::path& folder) {
        texts_["-outputPath"] = folder.string();
        texts_["-filePrefix"] =
            input.ConsumeBool() ? "CAM1" : input.ConsumeBytesAsString(input.ConsumeIntegralInRange(0, 9));
        texts_["-fileType"] = input.PickValueInArray({"normal", "fragment", "other"});
        texts_["-outputMode"] = input.PickValueInArray({"sync", "sync", "on", "off"});
        texts_["-naluType"] = input.PickValueInArray({"normal", "direct"});
        texts_["-recordRules"] = input.PickValueInArray({"exact", "exact", "kept"});
        numbers_["-encodedFPS"] = input.PickValueInArray({25000, 29970, 50000, 59940, 1, 0});
        numbers_["-encodedWidth"] = input.PickValueInArray({1920, 64, 0, -1});
        numbers_["-encodedHeight"] = 48;
        isExact_ = texts_["-recordRules"] == "exact";
    }

    bool IsExact() const { return isExact_; }
    bool HasFailed() const {
        const std::lock_guard lock(mutex_);
        return status_ == QxStatus::kFailed;
    }

    // QxModuleHostInterface
    void SetStatus(int status, int) override {
        const std::lock_guard lock(mutex_);
        Expect(status_ != QxStatus::kFailed, "no status follows status 7");
        status_ = status;
    }
    int GetStatus() override {
        const std::lock_guard lock(mutex_);
        return status_;
    }
    void GetParameter(std::string key, int& value, int defaultValue) override {
        const auto found = numbers_.find(key);
        value = found == numbers_.end() ? defaultValue : found->second;
    }
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override {
        const auto found = texts_.find(key);
        value = found == texts_.end() ? defaultValue : found->second;
    }
    int SendTransmissionStatus(const std::map<std::string, std::string>&) override { return 0; }

 private:
    std::map<std::string, std::string> texts_;
    std::map<std::string, int> numbers_;
    bool isExact_ = false;
    mutable std::mutex mutex_;
    int status_ = QxStatus::kNone;
};

/// From `Initialize` to `Uninitialize`.
class Life {
 public:
    Life(FuzzedDataProvider& input, clipfileModule::Mp4FileOutput& module, Host& host)
        : input_(input), module_(module), host_(host) {
        module_.GetStreamInterface(&stream_);
        module_.GetNotifyInterface(&notify_);
    }

    void Run() {
        Expect(module_.Initialize(&host_), "a module with an output path starts");
        module_.Execute();
        for (std::size_t i = 0; i < kMostSteps && input_.remaining_bytes() != 0; ++i) {
            Step();
        }
        if (host_.IsExact()) {
            Expect(Threads() < kMostThreads, "recordings that wait are bounded");
        }
        Expect(module_.Uninitialize(), "a module ends when it is told to");
    }

 private:
    void Step();
    /// As a host that does all that it has to.
    void PushFrames(int count);
    /// Whatever bytes there are.
    void PushBytes();
    void Notify();
    void Jump();

    std::shared_ptr<StreamData> At(std::shared_ptr<StreamData> unit, std::uint64_t rtpOffset) const {
        unit->rtp_timestamp += rtpOffset;
        unit->timestamp += timeOffset_;
        return unit;
    }

    FuzzedDataProvider& input_;
    clipfileModule::Mp4FileOutput& module_;
    Host& host_;
    QxModuleStreamInterface* stream_ = nullptr;
    QxModuleNotifyInterface* notify_ = nullptr;
    stream_units::StreamClock clock_;
    std::uint64_t frame_ = 0;
    std::uint64_t sounds_ = 0;
    bool records_ = true;
    std::uint64_t videoOffset_ = 0;
    std::uint64_t audioOffset_ = 0;
    std::uint64_t timeOffset_ = 0;
};

void Life::Step() {
    switch (input_.ConsumeIntegralInRange(0, 11)) {
        case 0:
            return PushBytes();
        case 1:
            records_ = !records_;
            return;
        case 2:
            return Notify();
        case 3:
            return Jump();
        case 4:
            // So that what was pushed may get somewhere.
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
            return;
        default:
            return PushFrames(input_.ConsumeIntegralInRange(1, 24));
    }
}

void Life::PushFrames(int count) {
    for (int i = 0; i < count; ++i, ++frame_) {
        const stream_units::VideoParts& parts = frame_ % 8 == 0 ? stream_units::kIdr : stream_units::kPicture;
        const stream_units::Timecode timecode{1, 2, static_cast<unsigned char>(frame_ / 25 % 60),
                                              static_cast<unsigned char>(frame_ % 25), false};
        stream_->PushMeta(At(clock_.Meta(frame_, {records_, timecode}), videoOffset_));
        stream_->PushVideo(At(clock_.Video(frame_, parts), videoOffset_));
        for (; sounds_ < clock_.AudioBefore(frame_ + 1); ++sounds_) {
            stream_->PushAudio(At(clock_.Audio(sounds_), audioOffset_));
        }
    }
    std::this_thread::sleep_for(std::chrono::microseconds(300));
}

void Life::PushBytes() {
    Bytes bytes = input_.ConsumeBytes<unsigned char>(input_.ConsumeIntegralInRange<std::size_t>(0, 80));
    const int medium = input_.ConsumeIntegralInRange(0, 4);
    if (medium == 3) {
        // A picture in front of which a parameter set has grown.
        Bytes picture = {0, 0, 1, static_cast<unsigned char>(input_.ConsumeBool() ? 0x67 : 0x68)};
        picture.resize(
            picture.size() + input_.PickValueInArray<std::size_t>({0, 3, 200, 65534, 65535, 70000}), 0x42);
        stream_units::Append(picture, stream_units::VideoPayload(frame_, stream_units::kIdr));
        bytes = picture;
    } else if (medium == 4) {
        // One that is right but for a byte.
        bytes = stream_units::VideoPayload(frame_, stream_units::kIdr);
        bytes[input_.ConsumeIntegralInRange<std::size_t>(0, bytes.size() - 1)] =
            input_.ConsumeIntegral<unsigned char>();
    }
    // No bytes are somewhere too.
    bytes.reserve(1);
    auto unit = stream_units::MakeUnit(bytes, clock_.VideoRtp(frame_), clock_.VideoMilliSec(frame_));
    if (input_.ConsumeIntegralInRange(0, 15) == 0) {
        unit->payload = nullptr;
    }
    if (medium == 0) {
        stream_->PushAudio(At(unit, audioOffset_));
    } else if (medium == 1) {
        stream_->PushMeta(At(unit, videoOffset_));
    } else {
        stream_->PushVideo(At(unit, videoOffset_));
    }
}

void Life::Notify() {
    switch (input_.ConsumeIntegralInRange(0, 5)) {
        case 0: {
            QxInputOutputConnectRequest request;
            request.framerate =
                input_.PickValueInArray<std::uint32_t>({25000, 50000, 59940, 23980, 0, 4000000000});
            request.width = input_.ConsumeIntegral<std::uint32_t>();
            request.height = 48;
            request.properties["filePrefix"] = "CAM2";
            notify_->NotifyInputOutputConnectRequest(&request);
            return;
        }
        case 1: {
            const QxInputOutputDisconnectionRequest request{
                input_.ConsumeIntegralInRange<std::uint32_t>(0, 2)};
            notify_->NotifyInputOutputDisconnectionRequest(&request);
            return;
        }
        case 2:
            notify_->NotifyOfflineStatus();
            return;
        default:
            notify_->NotifyOnlineStatus();
            return;
    }
}

void Life::Jump() {
    const std::uint64_t distance = input_.ConsumeBool() ? input_.ConsumeIntegral<std::uint64_t>()
                                                        : input_.ConsumeIntegral<std::uint16_t>();
    switch (input_.ConsumeIntegralInRange(0, 4)) {
        case 0:
            videoOffset_ += distance;
            return;
        case 1:
            audioOffset_ += distance;
            return;
        case 2:
            timeOffset_ += distance;
            return;
        case 3:
            frame_ += distance % 1000;
            return;
        default:
            // All clocks together, as of a source that begins anew.
            videoOffset_ = distance * 90;
            audioOffset_ = distance * 48;
            timeOffset_ = distance;
            return;
    }
}

/// Everything that a file says of its samples can be read, and lies in it.
void Read(const std::filesystem::path& path) {
    const clipfile::InputFile file(path);
    const clipfile::Recording recording = clipfile::ReadRecording(file);
    Expect(recording.completion == clipfile::Completion::kClosed,
           "a file of a life that did not fail is closed");
    for (std::size_t track = 0; track < recording.movie->tracks.size(); ++track) {
        clipfile::RecordingSamples samples(file, recording, track);
        while (const auto sample = samples.Next()) {
            Expect(sample->offset <= file.Size() && sample->size <= file.Size() - sample->offset,
                   "samples lie in their file");
        }
    }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    setenv("QX_LOG_PRIORITY", "0", 1);
    return setenv("QX_SETTINGS", "/dev/null", 1);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const TemporaryFolder folder("/dev/shm");
    FuzzedDataProvider input(data, size);
    clipfileModule::Mp4FileOutput module;
    for (int lives = 0; lives < 3 && (lives == 0 || input.remaining_bytes() != 0); ++lives) {
        const std::ptrdiff_t threads = Threads();
        Host host(input, folder.Path());
        Life(input, module, host).Run();
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
        while (Threads() > threads && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        Expect(Threads() <= threads, "no thread is left behind a life");
        for (const auto& entry : std::filesystem::recursive_directory_iterator(folder.Path())) {
            if (entry.is_regular_file() && !host.HasFailed()) {
                Read(entry.path());
            }
        }
        folder.Clear();
    }
    return 0;
}
