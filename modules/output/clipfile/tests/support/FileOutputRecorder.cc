#include "support/FileOutputRecorder.h"

#include <algorithm>
#include <deque>
#include <thread>
#include <utility>

#include "fileout/FileOutput.h"

using clipfileModule::ChunkData;
using clipfileModule::OutputSettings;
using clipfileModule::StreamBufferInterface;

namespace {

FileOutputRecorder* current = nullptr;

}  // namespace

/// Asks the buffer for the timecode of every chunk, as a file output that rotates at each one.
class FileOutputRecorder::Writer {
 public:
    explicit Writer(StreamBufferInterface* buffer) : buffer_(buffer), thread_([this] { run(); }) {}
    void Push(std::shared_ptr<ChunkData> chunk) {
        const std::lock_guard lock(mutex_);
        chunks_.push_back(std::move(chunk));
        changed_.notify_one();
    }
    void Stop() {
        {
            const std::lock_guard lock(mutex_);
            stopped_ = true;
            changed_.notify_one();
        }
        thread_.join();
    }

 private:
    void run() {
        std::unique_lock lock(mutex_);
        while (true) {
            changed_.wait(lock, [this] { return stopped_ || !chunks_.empty(); });
            if (chunks_.empty()) {
                break;
            }
            const std::shared_ptr<ChunkData> chunk = std::move(chunks_.front());
            chunks_.pop_front();
            lock.unlock();
            unsigned char timecode[4] = {};
            bool dropFrame = false;
            buffer_->GetFileTimecode(timecode);
            if (buffer_->MakeFileTimecode(chunk)) {
                buffer_->GetFileTimecode(timecode, &dropFrame);
            }
            lock.lock();
        }
        unsigned char timecode[4] = {};
        buffer_->GetFileTimecode(timecode);
    }

    StreamBufferInterface* const buffer_;
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::shared_ptr<ChunkData>> chunks_;
    bool stopped_ = false;
    std::thread thread_;
};

FileOutputRecorder::FileOutputRecorder() {
    current = this;
}

FileOutputRecorder::~FileOutputRecorder() {
    current = nullptr;
}

void FileOutputRecorder::SetInitializeResult(bool result) {
    const std::lock_guard lock(mutex_);
    initializeResult_ = result;
}

void FileOutputRecorder::SetQueueSize(std::size_t size) {
    const std::lock_guard lock(mutex_);
    queueSize_ = size;
}

void FileOutputRecorder::SetChunkHook(ChunkHook hook) {
    const std::lock_guard lock(mutex_);
    chunkHook_ = std::move(hook);
}

void FileOutputRecorder::SetStartHook(std::function<void()> hook) {
    const std::lock_guard lock(mutex_);
    startHook_ = std::move(hook);
}

void FileOutputRecorder::SetStopHook(std::function<void()> hook) {
    const std::lock_guard lock(mutex_);
    stopHook_ = std::move(hook);
}

void FileOutputRecorder::SetThreaded() {
    const std::lock_guard lock(mutex_);
    threaded_ = true;
}

std::vector<FileOutputRecorder::Output> FileOutputRecorder::records() const {
    std::vector<Output> outputs;
    for (const Entry& entry : entries_) {
        outputs.push_back(entry.record);
    }
    return outputs;
}

std::vector<FileOutputRecorder::Output> FileOutputRecorder::Outputs() const {
    const std::lock_guard lock(mutex_);
    return records();
}

FileOutputRecorder::Output FileOutputRecorder::At(std::size_t index) const {
    const std::lock_guard lock(mutex_);
    return entries_.at(index).record;
}

bool FileOutputRecorder::WaitFor(const std::function<bool(const std::vector<Output>&)>& predicate,
                                 std::chrono::milliseconds deadline) const {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, deadline, [&] { return predicate(records()); });
}

bool FileOutputRecorder::WaitForChunks(std::size_t count, std::size_t index,
                                       std::chrono::milliseconds deadline) const {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, deadline, [&] {
        return index < entries_.size() && entries_[index].record.chunkCount >= count;
    });
}

FileOutputRecorder::Entry& FileOutputRecorder::find(const void* output) {
    // An address may be used again; the newest entry is the one that lives.
    return *std::find_if(entries_.rbegin(), entries_.rend(),
                         [&](const Entry& entry) { return entry.output == output; });
}

bool FileOutputRecorder::OnInitialize(const void* output, StreamBufferInterface* buffer,
                                      const std::string& type) {
    const std::lock_guard lock(mutex_);
    Entry entry{output, {}, nullptr};
    entry.record.buffer = buffer;
    entry.record.type = type;
    entry.record.calls = {"Initialize"};
    entries_.push_back(std::move(entry));
    changed_.notify_all();
    return initializeResult_;
}

void FileOutputRecorder::OnUninitialize(const void* output) {
    const std::lock_guard lock(mutex_);
    find(output).record.calls.push_back("Uninitialize");
    changed_.notify_all();
}

void FileOutputRecorder::OnStart(const void* output, const OutputSettings& settings) {
    std::function<void()> hook;
    {
        const std::lock_guard lock(mutex_);
        Entry& entry = find(output);
        entry.record.settings = settings;
        entry.record.calls.push_back("Start");
        if (threaded_) {
            entry.writer = std::make_shared<Writer>(entry.record.buffer);
        }
        hook = startHook_;
        changed_.notify_all();
    }
    if (hook) {
        hook();
    }
}

void FileOutputRecorder::OnStop(const void* output) {
    std::shared_ptr<Writer> writer;
    std::function<void()> hook;
    {
        const std::lock_guard lock(mutex_);
        Entry& entry = find(output);
        entry.record.calls.push_back("Stop");
        writer.swap(entry.writer);
        hook = stopHook_;
        changed_.notify_all();
    }
    if (hook) {
        hook();
    }
    if (writer != nullptr) {
        writer->Stop();
    }
    if (hook) {
        hook();
    }
}

std::size_t FileOutputRecorder::OnChunk(const void* output, const std::shared_ptr<ChunkData>& chunk) {
    ChunkHook hook;
    std::size_t index = 0;
    {
        const std::lock_guard lock(mutex_);
        Entry& entry = find(output);
        hook = chunkHook_;
        index = static_cast<std::size_t>(&entry - entries_.data());
        if (!hook) {
            entry.record.chunks.push_back(chunk);
        }
        if (entry.writer != nullptr) {
            entry.writer->Push(chunk);
        }
    }
    if (hook) {
        hook(index, chunk);
    }
    const std::lock_guard lock(mutex_);
    ++find(output).record.chunkCount;
    changed_.notify_all();
    return queueSize_;
}

namespace clipfileModule {

FileOutput::FileOutput() = default;
FileOutput::~FileOutput() = default;

bool FileOutput::Initialize(ControllerInterface* /*owner*/, StreamBufferInterface* streamBuffer,
                            const std::string& fileType) {
    return current->OnInitialize(this, streamBuffer, fileType);
}
bool FileOutput::Uninitialize() {
    current->OnUninitialize(this);
    return true;
}
void FileOutput::Start(const OutputSettings& outputSettings) {
    current->OnStart(this, outputSettings);
}
void FileOutput::Stop() {
    current->OnStop(this);
}
std::size_t FileOutput::PushChunk(const std::shared_ptr<ChunkData>& chunk) {
    return current->OnChunk(this, chunk);
}

}  // namespace clipfileModule
