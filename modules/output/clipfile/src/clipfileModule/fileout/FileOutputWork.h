#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>

#include "buffer/chunk/ChunkData.h"
#include "common/Mutex.h"
#include "common/OutputSettings.h"
#include "common/RecursiveTimedMutex.h"
#include "fileout/FileOutput.h"
#include "fileout/OwnerLink.h"
#include "mp4/Mp4Muxer.h"

namespace clipfileModule {

/// Everything that the file output thread works on. The thread and its `FileOutput` own it together, and the
/// one that lets go last destroys it.
struct FileOutput::Work {
    // Contract: opening-ignores-boxes. A write leaves room for them, an open does not.
    /// Free space in bytes that must be there before a file is opened, and beyond the file's closing boxes
    /// before a chunk is written: 150 MiB.
    static constexpr std::uint64_t minFreeSpaceOpen = 157286400;
    static constexpr std::uint64_t minFreeSpaceWrite = 157286400;
    /// Added in the size log line, in bytes: 200 MiB.
    static constexpr std::uint64_t fileSizeMargin = 209715200;

    /// How far beyond its length a file waits for an IDR frame, in minutes.
    static constexpr std::uint64_t idrWaitMinutes = 2;

    Work(ControllerInterface* controller, StreamBufferInterface* streamBuffer, const std::string& fileType)
        : owner(controller, streamBuffer), type(fileType) {}
    Work(const Work&) = delete;
    Work& operator=(const Work&) = delete;
    /// Releases a muxer that is still there with the file that it may have open. The muxer of a thread that
    /// was given up goes this way.
    ~Work() {
        if (muxer != nullptr) {
            muxer->Uninitialize();
        }
    }

    bool IsFileOpen() const { return muxer != nullptr && muxer->IsOpen(); }
    /// Completes the open file and closes it.
    bool CloseFile() {
        unsigned char timecode[4] = {};
        owner.GetFileTimecode(timecode);
        // Contract: timecode-result-unread. The file is closed all the same.
        muxer->WriteTmcd(timecode);
        return muxer->Close();
    }

    /// Cut when the thread is given up: it then ends at the next step, without a word.
    OwnerLink owner;

    // Constant after construction, and from `Start` on.
    const std::string type;
    OutputSettings settings;

    Mutex chunkMutex;
    /// The waiting chunks.
    std::deque<std::shared_ptr<ChunkData>> chunks GUARDED_BY(chunkMutex);
    /// Set by the thread once it holds `threadLock`.
    bool started GUARDED_BY(chunkMutex) = false;
    /// True while the thread is to go on taking chunks. Changes under `chunkMutex`.
    std::atomic<bool> running = false;
    /// Signalled for each chunk, by `Stop`, and when the thread has started.
    std::condition_variable chunkCondition;

    /// Held by the thread for its whole run. Made new in each `Start`.
    std::shared_ptr<RecursiveTimedMutex> threadLock;

    // Used by the thread while it runs, else by `FileOutput`; never again by `FileOutput` when the thread was
    // given up.
    /// The muxer of the current file.
    std::shared_ptr<Mp4Muxer> muxer;
    /// The chunk written last.
    std::shared_ptr<ChunkData> lastChunk;
    /// Video samples handed to muxers since `Start`, in all files.
    std::uint64_t writtenVideoSamples = 0;
};

}  // namespace clipfileModule
