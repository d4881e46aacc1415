#include "fileout/FileWriter.h"

#include <map>
#include <utility>

#include "common/Event.h"
#include "common/Log.h"

namespace clipfileModule {

FileWriter::FileWriter(ControllerInterface* controller, StreamBufferInterface* buffer,
                       const std::string& fileType)
    : owner_(controller, buffer), type_(fileType) {}

FileWriter::~FileWriter() {
    if (muxer_ != nullptr) {
        muxer_->Uninitialize();
    }
}

std::shared_ptr<std::thread> FileWriter::Start(const std::shared_ptr<FileWriter>& writer,
                                               const OutputSettings& outputSettings) {
    writer->settings_ = outputSettings;
    writer->lastChunk_.reset();
    writer->writtenVideoSamples_ = 0;
    writer->threadLock_ = std::make_shared<RecursiveTimedMutex>();
    MutexLock lock(writer->chunkMutex_);
    writer->chunks_.clear();
    writer->started_ = false;
    writer->running_ = true;
    auto thread = std::make_shared<std::thread>([writer] { writer->outputThread(); });
    // Contract: writer-handshake. A `Stop` that took the thread's lock before it does would wait for ever.
    while (!writer->started_) {
        lock.Wait(writer->chunkCondition_);
    }
    return thread;
}

void FileWriter::Finish() {
    {
        // Either the thread sees the flag before it waits, or it waits and gets the signal below.
        MutexLock lock(chunkMutex_);
        running_ = false;
    }
    chunkCondition_.notify_one();
}

std::unique_lock<RecursiveTimedMutex> FileWriter::WaitForEnd(std::chrono::milliseconds wait) {
    return {*threadLock_, std::chrono::steady_clock::now() + wait};
}

std::size_t FileWriter::Push(const std::shared_ptr<ChunkData>& chunk) {
    MutexLock lock(chunkMutex_);
    chunks_.push_back(chunk);
    chunkCondition_.notify_one();
    return chunks_.size();
}

void FileWriter::outputThread() {
    const std::shared_ptr<RecursiveTimedMutex> threadLock = threadLock_;
    std::unique_lock run(*threadLock);
    {
        MutexLock lock(chunkMutex_);
        started_ = true;
    }
    chunkCondition_.notify_all();

    // Contract: output-means-a-writer. No file is open yet.
    notifyTransferStatus(QxStatusMap::kOutput);
    const LogonToken token = useNetDrive();
    bool hasFailed = false;
    while (!hasFailed && running_) {
        std::deque<std::shared_ptr<ChunkData>> taken = takeChunks(true);
        hasFailed = !taken.empty() && outputFile(taken);
    }
    if (!hasFailed) {
        // What `Finish` left.
        std::deque<std::shared_ptr<ChunkData>> taken = takeChunks(false);
        outputFile(taken);
    }
    if (!IsGivenUp() && isFileOpen()) {
        failed(closeFile(), QxFailure::kFileClose,
               [] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file close error."); });
    }
    if (token != kNoLogon) {
        GetPlatform().CloseLogon(token);
    }
    if (IsGivenUp()) {
        // Nobody else uses it any more; its file is closed as it stands.
        muxer_->Uninitialize();
        muxer_.reset();
    }
    // Contract: standby-while-recording. Others may still write.
    notifyTransferStatus(QxStatusMap::kStandby);
    run.unlock();
    if (!IsGivenUp()) {
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "end.");
    }
}

std::deque<std::shared_ptr<ChunkData>> FileWriter::takeChunks(bool wait) {
    std::deque<std::shared_ptr<ChunkData>> taken;
    MutexLock lock(chunkMutex_);
    // Contract: writer-wait-tests-first. No signal is lost.
    if (wait && chunks_.empty() && running_) {
        lock.Wait(chunkCondition_);
    }
    taken.swap(chunks_);
    return taken;
}

bool FileWriter::outputFile(std::deque<std::shared_ptr<ChunkData>>& deque) {
    bool limitReached = false;
    std::uint64_t excess = 0;
    // Contract: box-size-of-the-old-file. Holds for the first chunk behind a rotation too.
    std::uint64_t boxSize = 0;
    while (!deque.empty()) {
        const std::shared_ptr<ChunkData> chunk = std::move(deque.front());
        deque.pop_front();
        if (IsGivenUp()) {
            return true;
        }
        if (isFileOpen()) {
            boxSize = muxer_->GetBoxSize();
            // Contract: file-size-in-minutes. Bytes are only logged.
            const std::uint64_t size = fileSizeMargin + muxer_->GetWrittenSize() + boxSize;
            const std::uint64_t limit = muxer_->MinutesToDuration(settings_.maxFileSize);
            const std::uint64_t written = muxer_->GetDuration();
            limitReached = written >= limit;
            excess = limitReached ? written - limit : 0;
            CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "file size. %llu\t%llu\t%llu\t%llu.",
                         static_cast<unsigned long long>(limit), static_cast<unsigned long long>(written),
                         static_cast<unsigned long long>(size), static_cast<unsigned long long>(boxSize));
        } else if (!newFile(chunk)) {
            return true;
        }
        if (limitReached) {
            // Contract: rotation-at-cadence. A file ends only where audio and video are in step.
            if (lastChunk_ == nullptr || (!lastChunk_->sync && !endsOutOfStep(*chunk, excess))) {
                CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "mp4 file over. no a/v sync. %d",
                             static_cast<int>(writtenVideoSamples_));
            } else if (waitsForIdrFrame(*chunk, excess)) {
                CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "mp4 file over. no idr frame. %d",
                             static_cast<int>(writtenVideoSamples_));
            } else {
                if (settings_.pictureOrder == PictureOrder::kDecoding && !startsWithIdrFrame(*chunk)) {
                    CLIPFILE_LOG(LOG_PRIORITY_WARNING,
                                 "no idr frame comes. the next file begins without one.");
                }
                CLIPFILE_LOG(LOG_PRIORITY_TRACE, "mp4 file over %lld min.",
                             static_cast<long long>(settings_.maxFileSize));
                CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: FILE ROTATION.");
                if (!newFile(chunk)) {
                    return true;
                }
            }
        }

        std::uint64_t freeSpace = 0;
        const int error = GetPlatform().AvailableSpace(settings_.outputPath, freeSpace);
        if (failed(error == 0, QxFailure::kFreeSpaceUnknown, [&] {
                CLIPFILE_LOG(LOG_PRIORITY_ERROR, "disk size could not be obtained. error = %d.", error);
            })) {
            return true;
        }
        // Contract: unmeasured-boxes-are-cause-23. The closing boxes must still find room. What could not be
        // measured counts 2^64 - 1 bytes, which no disk has: the sum must not run over.
        const bool hasRoom = freeSpace >= minFreeSpaceWrite && freeSpace - minFreeSpaceWrite >= boxSize;
        if (failed(hasRoom, QxFailure::kDiskFull, [&] {
                if (boxSize == Mp4Muxer::kUnmeasured && settings_.recordRules == RecordRules::kExact) {
                    CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 box size could not be measured.");
                } else {
                    // Contract: free-space-two-spellings. "freespace" for a chunk, "free space" for a file.
                    CLIPFILE_LOG(LOG_PRIORITY_ERROR, "no disk freespace. %llu.",
                                 static_cast<unsigned long long>(freeSpace));
                }
            })) {
            return true;
        }

        // Contract: written-samples-run-on. Across files.
        writtenVideoSamples_ += chunk->video.size();
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "write chunk. %d", static_cast<int>(writtenVideoSamples_));
        if (failed(muxer_->Write(chunk), QxFailure::kFileWrite,
                   [] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file write error."); })) {
            return true;
        }
        lastChunk_ = chunk;
    }
    return false;
}

bool FileWriter::startsWithIdrFrame(const ChunkData& chunk) {
    return !chunk.video.empty() && chunk.video.front()->GetSync();
}

bool FileWriter::waitsForIdrFrame(const ChunkData& chunk, std::uint64_t excess) const {
    // Pictures in front of the first IDR frame could not be decoded in the file that begins here. A stream
    // whose IDR frames never meet the cadence must not make one endless file, though.
    if (startsWithIdrFrame(chunk)) {
        return false;
    }
    if (settings_.pictureOrder == PictureOrder::kDecoding) {
        // Where the order is not closed, pictures of one file would be shown in the middle of the other.
        return !lastChunk_->isOrderClosed || excess < muxer_->MinutesToDuration(2 * idrWaitMinutes);
    }
    return settings_.recordRules == RecordRules::kExact && excess < muxer_->MinutesToDuration(idrWaitMinutes);
}

bool FileWriter::endsOutOfStep(const ChunkData& chunk, std::uint64_t excess) const {
    // Less than an audio frame out of step is better than one endless file.
    return settings_.pictureOrder == PictureOrder::kDecoding && !waitsForIdrFrame(chunk, excess) &&
           excess >= muxer_->MinutesToDuration(idrWaitMinutes);
}

void FileWriter::notifyTransferStatus(const std::string& value) {
    owner_.PostEvent(std::make_shared<TransferStatusNotifyEvent>(
        std::map<std::string, std::string>{{QxStatusMap::kFileOutput, value}}));
}

bool FileWriter::closeFile() {
    unsigned char timecode[4] = {};
    owner_.GetFileTimecode(timecode);
    // Contract: timecode-result-unread. The file is closed all the same.
    muxer_->WriteTmcd(timecode);
    return muxer_->Close();
}

}  // namespace clipfileModule
