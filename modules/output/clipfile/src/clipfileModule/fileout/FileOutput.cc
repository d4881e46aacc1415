#include "fileout/FileOutput.h"

#include <chrono>
#include <map>
#include <mutex>
#include <utility>

#include "QxModuleStatus.h"
#include "common/Event.h"
#include "common/JoinThread.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "fileout/FileOutputWork.h"

namespace clipfileModule {

namespace {

// Contract: stop-waits-3500-ms. How long `Stop` waits for the thread; not to be configured.
constexpr std::chrono::milliseconds stopWaitMilliSec(3500);
// Contract: half-a-second-for-a-host. How long it then waits for a host's call that the thread is in.
constexpr std::chrono::milliseconds kOwnerCallWait(500);

}  // namespace

FileOutput::FileOutput() : work(std::make_shared<Work>(nullptr, nullptr, std::string())) {}

FileOutput::~FileOutput() = default;

bool FileOutput::Initialize(ControllerInterface* owner, StreamBufferInterface* streamBuffer,
                            const std::string& fileType) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    controller = owner;
    buffer = streamBuffer;
    type = fileType;
    work = std::make_shared<Work>(owner, streamBuffer, fileType);
    // Contract: first-muxer-unused. Each file gets a new one.
    const bool result = createMp4FileObject(*work);
    return scope.Return("func_result", result);
}

bool FileOutput::Uninitialize() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    work->running = false;
    leaveWork();
    // Contract: delete-until-true. It is true the first time.
    while (!deleteMp4FileObject(*work)) {
    }
    return scope.Return("func_result", true);
}

void FileOutput::Start(const OutputSettings& outputSettings) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    leaveWork();
    work->settings = outputSettings;
    work->lastChunk.reset();
    work->writtenVideoSamples = 0;
    work->threadLock = std::make_shared<RecursiveTimedMutex>();
    MutexLock lock(work->chunkMutex);
    work->chunks.clear();
    work->started = false;
    work->running = true;
    thread = std::make_shared<std::thread>([shared = work] { outputThread(*shared); });
    // Contract: writer-handshake. A `Stop` that took the thread's lock before it does would wait for ever.
    while (!work->started) {
        lock.Wait(work->chunkCondition);
    }
}

void FileOutput::Stop() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    {
        // Either the thread sees the flag before it waits, or it waits and gets the signal below.
        MutexLock lock(work->chunkMutex);
        work->running = false;
    }
    if (thread == nullptr) {
        return;
    }
    work->chunkCondition.notify_one();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "wait thread start...");
    std::unique_lock lock(*work->threadLock, std::chrono::steady_clock::now() + stopWaitMilliSec);
    if (lock.owns_lock()) {
        JoinThread(*thread);
        lock.unlock();
    } else {
        work->owner.Cut(kOwnerCallWait);
        // Contract: time-out-line-is-trace. The one fault whose line is no error.
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "wait thread timeout...");
        controller->SetStatus(QxStatus::kFailed, QxFailure::kWriterHangs);
        // Contract: writer-given-up. A thread cannot be ended from outside without harm.
        GetPlatform().GiveUp(*thread);
        thread.reset();
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "terminate thread...");
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "wait thread end...");
}

void FileOutput::leaveWork() {
    if (work->owner.IsCut()) {
        work = std::make_shared<Work>(controller, buffer, type);
    }
}

std::size_t FileOutput::PushChunk(const std::shared_ptr<ChunkData>& chunk) {
    MutexLock lock(work->chunkMutex);
    work->chunks.push_back(chunk);
    work->chunkCondition.notify_one();
    return work->chunks.size();
}

void FileOutput::outputThread(Work& work) {
    const std::shared_ptr<RecursiveTimedMutex> threadLock = work.threadLock;
    std::unique_lock run(*threadLock);
    {
        MutexLock lock(work.chunkMutex);
        work.started = true;
    }
    work.chunkCondition.notify_all();

    // Contract: output-means-a-writer. No file is open yet.
    notifyTransferStatus(work, QxStatusMap::kOutput);
    const LogonToken token = useNetDrive(work);
    const auto takeChunks = [&work](bool wait) {
        std::deque<std::shared_ptr<ChunkData>> taken;
        MutexLock lock(work.chunkMutex);
        // Contract: writer-wait-tests-first. No signal is lost.
        if (wait && work.chunks.empty() && work.running) {
            lock.Wait(work.chunkCondition);
        }
        taken.swap(work.chunks);
        return taken;
    };
    bool failed = false;
    while (!failed && work.running) {
        std::deque<std::shared_ptr<ChunkData>> taken = takeChunks(true);
        failed = !taken.empty() && outputFile(work, taken);
    }
    if (!failed) {
        // What `Stop` left.
        std::deque<std::shared_ptr<ChunkData>> taken = takeChunks(false);
        outputFile(work, taken);
    }
    if (!work.owner.IsCut() && work.IsFileOpen() && !work.CloseFile() && !work.owner.IsCut()) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file close error.");
        work.owner.SetStatus(QxStatus::kFailed, QxFailure::kFileClose);
    }
    if (token != kNoLogon) {
        GetPlatform().CloseLogon(token);
    }
    if (work.owner.IsCut()) {
        // Nobody else uses it any more; its file is closed as it stands.
        work.muxer->Uninitialize();
        work.muxer.reset();
    }
    // Contract: standby-while-recording. Others may still write.
    notifyTransferStatus(work, QxStatusMap::kStandby);
    run.unlock();
    if (!work.owner.IsCut()) {
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "end.");
    }
}

bool FileOutput::outputFile(Work& work, std::deque<std::shared_ptr<ChunkData>>& deque) {
    bool limitReached = false;
    std::uint64_t excess = 0;
    // Contract: box-size-of-the-old-file. Holds for the first chunk behind a rotation too.
    std::uint64_t boxSize = 0;
    while (!deque.empty()) {
        const std::shared_ptr<ChunkData> chunk = std::move(deque.front());
        deque.pop_front();
        if (work.owner.IsCut()) {
            return true;
        }
        if (work.IsFileOpen()) {
            boxSize = work.muxer->GetBoxSize();
            // Contract: file-size-in-minutes. Bytes are only logged.
            const std::uint64_t size = Work::fileSizeMargin + work.muxer->GetWrittenSize() + boxSize;
            const std::uint64_t limit = work.muxer->MinutesToDuration(work.settings.maxFileSize);
            const std::uint64_t written = work.muxer->GetDuration();
            limitReached = written >= limit;
            excess = limitReached ? written - limit : 0;
            CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "file size. %llu\t%llu\t%llu\t%llu.",
                         static_cast<unsigned long long>(limit), static_cast<unsigned long long>(written),
                         static_cast<unsigned long long>(size), static_cast<unsigned long long>(boxSize));
        } else if (!newFile(work, chunk)) {
            return true;
        }
        if (limitReached) {
            // Contract: rotation-at-cadence. A file ends only where audio and video are in step.
            if (work.lastChunk == nullptr || !work.lastChunk->sync) {
                CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "mp4 file over. no a/v sync. %d",
                             static_cast<int>(work.writtenVideoSamples));
            } else if (waitsForIdrFrame(work, *chunk, excess)) {
                CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "mp4 file over. no idr frame. %d",
                             static_cast<int>(work.writtenVideoSamples));
            } else {
                CLIPFILE_LOG(LOG_PRIORITY_TRACE, "mp4 file over %lld min.",
                             static_cast<long long>(work.settings.maxFileSize));
                CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: FILE ROTATION.");
                if (!newFile(work, chunk)) {
                    return true;
                }
            }
        }

        std::uint64_t freeSpace = 0;
        const int error = GetPlatform().AvailableSpace(work.settings.outputPath, freeSpace);
        if (work.owner.IsCut()) {
            return true;
        }
        if (error != 0) {
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "disk size could not be obtained. error = %d.", error);
            work.owner.SetStatus(QxStatus::kFailed, QxFailure::kFreeSpaceUnknown);
            return true;
        }
        // Contract: unmeasured-boxes-are-cause-23. The closing boxes must still find room. What could not be
        // measured counts 2^64 - 1 bytes, which no disk has: the sum must not run over.
        if (freeSpace < Work::minFreeSpaceWrite || freeSpace - Work::minFreeSpaceWrite < boxSize) {
            // Contract: free-space-two-spellings. "freespace" for a chunk, "free space" for a file.
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "no disk freespace. %llu.",
                         static_cast<unsigned long long>(freeSpace));
            work.owner.SetStatus(QxStatus::kFailed, QxFailure::kDiskFull);
            return true;
        }

        // Contract: written-samples-run-on. Across files.
        work.writtenVideoSamples += chunk->video.size();
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "write chunk. %d", static_cast<int>(work.writtenVideoSamples));
        const bool written = work.muxer->Write(chunk);
        if (work.owner.IsCut()) {
            return true;
        }
        if (!written) {
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file write error.");
            work.owner.SetStatus(QxStatus::kFailed, QxFailure::kFileWrite);
            return true;
        }
        work.lastChunk = chunk;
    }
    return false;
}

bool FileOutput::waitsForIdrFrame(const Work& work, const ChunkData& chunk, std::uint64_t excess) {
    // Pictures in front of the first IDR frame could not be decoded in the file that begins here. A stream
    // whose IDR frames never meet the cadence must not make one endless file, though.
    return work.settings.recordRules == RecordRules::kExact &&
           (chunk.video.empty() || !chunk.video.front()->GetSync()) &&
           excess < work.muxer->MinutesToDuration(Work::idrWaitMinutes);
}

void FileOutput::notifyTransferStatus(Work& work, const std::string& value) {
    work.owner.PostEvent(std::make_shared<TransferStatusNotifyEvent>(
        std::map<std::string, std::string>{{QxStatusMap::kFileOutput, value}}));
}

}  // namespace clipfileModule
