#include "support/FakeMuxer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <string_view>
#include <utility>

#include "mp4/Mp4MuxerFactory.h"
#include "platform/PlatformInterface.h"

using clipfileModule::ChunkData;
using clipfileModule::InputStreamInfo;
using clipfileModule::Mp4Muxer;
using clipfileModule::OutputSettings;

struct FakeMuxers::State {
    mutable std::mutex mutex;
    mutable std::condition_variable changed;
    // Guarded by mutex:
    Hooks hooks;
    std::uint64_t boxSize = 0;
    std::uint64_t chunkDuration = 8000;
    bool fifo = false;
    std::vector<std::string> calls;
    std::vector<File> files;
    std::size_t muxers = 0;

    void Add(const std::string& call) {
        const std::lock_guard lock(mutex);
        calls.push_back(call);
        changed.notify_all();
    }
    Hooks GetHooks() const {
        const std::lock_guard lock(mutex);
        return hooks;
    }
};

namespace {

std::mutex currentMutex;
std::shared_ptr<FakeMuxers::State> current;

std::shared_ptr<FakeMuxers::State> getCurrent() {
    const std::lock_guard lock(currentMutex);
    return current;
}

class FakeMuxer : public Mp4Muxer {
 public:
    FakeMuxer(std::shared_ptr<FakeMuxers::State> state, std::size_t number, std::string type)
        : state_(std::move(state)), number_(std::to_string(number)), type_(std::move(type)) {}
    ~FakeMuxer() override {
        if (file_ >= 0) {
            ::close(file_);
        }
        state_->Add(number_ + " gone");
    }
    FakeMuxer(const FakeMuxer&) = delete;
    FakeMuxer& operator=(const FakeMuxer&) = delete;

    bool Initialize() override {
        state_->Add(number_ + " Initialize");
        const auto hook = state_->GetHooks().initialize;
        return !hook || hook();
    }
    bool Uninitialize() override {
        state_->Add(number_ + " Uninitialize");
        const auto hook = state_->GetHooks().uninitialize;
        return !hook || hook();
    }
    bool Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) override {
        FakeMuxers::File file{type_, stream, text(timecode) + (dropFrame ? " DF" : ""), ""};
        bool fifo = false;
        {
            const std::lock_guard lock(state_->mutex);
            file.path = clipfileModule::GetPlatform().NativePath(
                stream.outputPath + "\\" + std::to_string(state_->files.size() + 1) + ".txt");
            state_->files.push_back(file);
            fifo = state_->fifo;
        }
        state_->Add(number_ + " Open");
        const auto hook = state_->GetHooks().open;
        if (hook && !hook()) {
            return false;
        }
        if (fifo) {
            // Opened for reading too, so that opening does not wait for a reader.
            file_ = mkfifo(file.path.c_str(), 0600) == 0 ? ::open(file.path.c_str(), O_RDWR) : -1;
        } else {
            file_ = ::open(file.path.c_str(), O_CREAT | O_EXCL | O_WRONLY, 0600);
        }
        return file_ >= 0 && write("open\n");
    }
    bool Write(const std::shared_ptr<ChunkData>& chunk) override {
        const std::uint64_t number = chunk->firstVideo->rtp_timestamp;
        state_->Add(number_ + " Write " + std::to_string(number));
        const auto hook = state_->GetHooks().write;
        if (hook && !hook(number)) {
            return false;
        }
        duration_ += chunkDuration();
        return write("chunk " + std::to_string(number) + " " + std::to_string(chunk->size) + "\n" +
                     std::string(chunk->size, '.') + "\n");
    }
    bool WriteTmcd(const unsigned char* timecode) override {
        state_->Add(number_ + " WriteTmcd");
        const auto hook = state_->GetHooks().writeTmcd;
        return (!hook || hook()) && write("tmcd " + text(timecode) + "\n");
    }
    std::uint64_t GetWrittenSize() override { return size_; }
    std::uint64_t GetBoxSize() override {
        const std::lock_guard lock(state_->mutex);
        return state_->boxSize;
    }
    std::uint64_t GetDuration() override { return duration_; }
    std::uint64_t MinutesToDuration(std::uint64_t minutes) override { return 25000 * 60 * minutes; }
    bool Close() override {
        state_->Add(number_ + " Close");
        const auto hook = state_->GetHooks().close;
        const bool result = (!hook || hook()) && write("closed\n");
        ::close(std::exchange(file_, -1));
        return result;
    }
    bool IsOpen() override { return file_ >= 0; }
    void AddFileRecord(std::uint64_t /*value*/, const std::string& /*first*/,
                       const std::string& /*second*/) override {
        state_->Add(number_ + " AddFileRecord");
    }

 protected:
    // File output cannot reach what follows.
    void FillSessionConfig(MbxSessionConfig& /*config*/) override {}
    MbxStatus createFprf() override { return {}; }
    std::uint32_t IsFragmentOpen() override { return 0; }
    MbxStatus writeSampleInfo(const InputStreamInfo& /*info*/, const ChunkData& /*chunk*/) override {
        return {};
    }
    void Reset() override {}

 private:
    static std::string text(const unsigned char* timecode) {
        if (timecode == nullptr) {
            return "none";
        }
        char digits[32];
        std::snprintf(digits, sizeof digits, "%02d:%02d:%02d:%02d", timecode[0], timecode[1], timecode[2],
                      timecode[3]);
        return digits;
    }
    std::uint64_t chunkDuration() const {
        const std::lock_guard lock(state_->mutex);
        return state_->chunkDuration;
    }
    bool write(std::string_view bytes) {
        size_ += bytes.size();
        while (!bytes.empty()) {
            const ssize_t count = ::write(file_, bytes.data(), bytes.size());
            if (count < 0) {
                return false;
            }
            bytes.remove_prefix(static_cast<std::size_t>(count));
        }
        return true;
    }

    const std::shared_ptr<FakeMuxers::State> state_;
    const std::string number_;
    const std::string type_;
    int file_ = -1;
    std::uint64_t size_ = 0;
    std::uint64_t duration_ = 0;
};

}  // namespace

FakeMuxers::FakeMuxers() : state_(std::make_shared<State>()) {
    const std::lock_guard lock(currentMutex);
    current = state_;
}

FakeMuxers::~FakeMuxers() {
    const std::lock_guard lock(currentMutex);
    current.reset();
}

void FakeMuxers::SetHooks(const std::function<void(Hooks&)>& change) {
    const std::lock_guard lock(state_->mutex);
    change(state_->hooks);
}

void FakeMuxers::SetBoxSize(std::uint64_t bytes) {
    const std::lock_guard lock(state_->mutex);
    state_->boxSize = bytes;
}

void FakeMuxers::SetChunkDuration(std::uint64_t ticks) {
    const std::lock_guard lock(state_->mutex);
    state_->chunkDuration = ticks;
}

void FakeMuxers::SetFifo() {
    const std::lock_guard lock(state_->mutex);
    state_->fifo = true;
}

std::vector<std::string> FakeMuxers::Calls() const {
    const std::lock_guard lock(state_->mutex);
    return state_->calls;
}

std::vector<FakeMuxers::File> FakeMuxers::Files() const {
    const std::lock_guard lock(state_->mutex);
    return state_->files;
}

bool FakeMuxers::WaitForCall(const std::string& call, std::chrono::milliseconds deadline) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, deadline, [&] {
        return std::find(state_->calls.begin(), state_->calls.end(), call) != state_->calls.end();
    });
}

namespace clipfileModule {

bool Mp4MuxerFactory::Create(const std::string& type, std::shared_ptr<Mp4Muxer>& muxer) const {
    const std::shared_ptr<FakeMuxers::State> state = getCurrent();
    if (state == nullptr) {
        return false;
    }
    const auto hook = state->GetHooks().create;
    if (hook ? !hook(type) : type != "normal" && type != "fragment") {
        return false;
    }
    std::size_t number = 0;
    {
        const std::lock_guard lock(state->mutex);
        number = ++state->muxers;
    }
    state->Add("create " + std::to_string(number) + " " + type);
    muxer = std::make_shared<FakeMuxer>(state, number, type);
    return true;
}

}  // namespace clipfileModule
