#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "QxModuleStatus.h"
#include "buffer/chunk/ChunkData.h"
#include "common/ControllerInterface.h"
#include "common/Mutex.h"
#include "common/OutputSettings.h"
#include "common/RecursiveTimedMutex.h"
#include "common/StreamBufferInterface.h"
#include "fileout/OwnerLink.h"
#include "mp4/Mp4Muxer.h"
#include "platform/PlatformInterface.h"

namespace clipfileModule {

/// The writer of a recording: takes its chunks, opens files in dated directories, writes the chunks through a
/// muxer, begins a new file when the length in minutes is reached and audio and video are in step, and
/// reports faults as status 7.
///
/// The thread and its `FileOutput` own a writer together, and the one that lets go last destroys it. So a
/// thread that hangs in a file operation can be given up: it may go on at any later time without reaching its
/// `FileOutput`, the stream buffer or the controller, and ends at its next step without a word.
///
/// Sources: FileWriter.cc has the thread and the chunks, FileWriterTarget.cc what it does to get a file.
class FileWriter {
 public:
    /// `controller` and `buffer` live until the thread has ended or was given up. `fileType` chooses the
    /// muxer, "normal" or "fragment", and any other counts as "normal".
    FileWriter(ControllerInterface* controller, StreamBufferInterface* buffer, const std::string& fileType);
    FileWriter(const FileWriter&) = delete;
    FileWriter& operator=(const FileWriter&) = delete;
    /// Releases a muxer that is still there with the file that it may have open. The muxer of a thread that
    /// was given up goes this way.
    ~FileWriter();

    // While no thread runs, and by the thread. Their names are those of the log.

    /// Makes a new muxer in the place of the one that there may be. False when it cannot be initialised,
    /// which has then been reported as status 7, cause 2.
    bool createMp4FileObject();
    /// Releases the muxer. Always true.
    bool deleteMp4FileObject();

    // By the owner of the thread.

    /// Starts a thread that works on `writer`, for files as `outputSettings` says, and returns it once it
    /// runs. Throws `std::system_error` when no thread can be started.
    static std::shared_ptr<std::thread> Start(const std::shared_ptr<FileWriter>& writer,
                                              const OutputSettings& outputSettings);
    /// Lets the thread end when it has written what waits.
    void Finish();
    /// Owns the lock when the thread has ended within `wait`.
    std::unique_lock<RecursiveTimedMutex> WaitForEnd(std::chrono::milliseconds wait);
    /// Cuts what the thread has to do with others. A call of the host that it is in is waited for, for `wait`
    /// at the most.
    void GiveUp(std::chrono::milliseconds wait) { owner_.Cut(wait); }
    bool IsGivenUp() const { return owner_.IsCut(); }

    /// Appends a chunk and returns the number of chunks that now wait. From any thread; never waits for a
    /// disk.
    std::size_t Push(const std::shared_ptr<ChunkData>& chunk);

 private:
    /// The log knows the functions of this class by the name of what they are a part of.
    static constexpr char kLogClass[] = "FileOutput";

    // Contract: opening-ignores-boxes. A write leaves room for them, an open does not.
    /// Free space in bytes that must be there before a file is opened, and beyond the file's closing boxes
    /// before a chunk is written: 150 MiB.
    static constexpr std::uint64_t minFreeSpaceOpen = 157286400;
    static constexpr std::uint64_t minFreeSpaceWrite = 157286400;
    /// Added in the size log line, in bytes: 200 MiB.
    static constexpr std::uint64_t fileSizeMargin = 209715200;
    /// How far beyond its length a file waits for an IDR frame where audio and video are in step, in minutes.
    /// With pictures in decoding order it waits as long again for any IDR frame.
    static constexpr std::uint64_t idrWaitMinutes = 2;

    // What follows runs on the thread.

    void outputThread();
    /// The chunks that wait. With `wait`, waits for some, or for the end.
    std::deque<std::shared_ptr<ChunkData>> takeChunks(bool wait);
    /// Writes the chunks of `deque`. True on a failure, which has been reported.
    bool outputFile(std::deque<std::shared_ptr<ChunkData>>& deque);
    static bool startsWithIdrFrame(const ChunkData& chunk);
    /// True when a file that is `excess` ticks past its length must go on with `chunk`, since a new one could
    /// not be decoded from there. There is a chunk before it.
    bool waitsForIdrFrame(const ChunkData& chunk, std::uint64_t excess) const;
    /// True when a file that is `excess` ticks past its length may end although audio and video are not quite
    /// in step.
    bool endsOutOfStep(const ChunkData& chunk, std::uint64_t excess) const;
    void notifyTransferStatus(const std::string& value);

    /// True when a step has failed, and when the writer has been given up, which is no fault and silent.
    /// `tell` logs the fault, which is then reported as status 7 with `cause`.
    template <typename Tell>
    bool failed(bool succeeded, int cause, const Tell& tell) {
        if (IsGivenUp()) {
            return true;
        }
        if (!succeeded) {
            tell();
            owner_.SetStatus(QxStatus::kFailed, cause);
        }
        return !succeeded;
    }

    bool isFileOpen() const { return muxer_ != nullptr && muxer_->IsOpen(); }
    /// Completes the open file and closes it.
    bool closeFile();
    /// Closes the file in work, if any, and opens the one that begins with `chunk`. False on a failure, which
    /// has been reported; no file is open then.
    bool newFile(const std::shared_ptr<ChunkData>& chunk);
    /// `path` becomes the directory for files that begin now, which exists then. False, with `path` left
    /// alone, when it cannot be made.
    bool makeOutputPath(std::string& path);
    bool createOutputDirectory(const std::string& path);
    /// Puts the thread under the credentials for a share, when the output path is one and there are any.
    /// Returns the token to close at the thread's end, or `kNoLogon`.
    LogonToken useNetDrive();

    OwnerLink owner_;

    // Constant after construction, and from `Start` on.
    const std::string type_;
    OutputSettings settings_;

    Mutex chunkMutex_;
    /// The waiting chunks.
    std::deque<std::shared_ptr<ChunkData>> chunks_ GUARDED_BY(chunkMutex_);
    /// Set by the thread once it holds `threadLock_`.
    bool started_ GUARDED_BY(chunkMutex_) = false;
    /// True while the thread is to go on taking chunks. Changes under `chunkMutex_`.
    std::atomic<bool> running_ = false;
    /// Signalled for each chunk, by `Finish`, and when the thread has started.
    std::condition_variable chunkCondition_;

    /// Held by the thread for its whole run. Made new in each `Start`.
    std::shared_ptr<RecursiveTimedMutex> threadLock_;

    // Used by the thread while it runs, else by the owner; never again by the owner of one that was given up.
    /// The muxer of the current file.
    std::shared_ptr<Mp4Muxer> muxer_;
    /// The chunk written last.
    std::shared_ptr<ChunkData> lastChunk_;
    /// Video samples handed to muxers since `Start`, in all files.
    std::uint64_t writtenVideoSamples_ = 0;
};

}  // namespace clipfileModule
