#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <thread>

#include "buffer/chunk/ChunkData.h"
#include "common/ControllerInterface.h"
#include "common/OutputSettings.h"
#include "common/StreamBufferInterface.h"
#include "platform/PlatformInterface.h"

namespace clipfileModule {

/// Takes the finished chunks of one recording and keeps disk time away from the stream path: a thread of its
/// own opens files in dated directories, writes them through a muxer, begins a new one when the length in
/// minutes is reached and audio and video are in step, and reports faults as status 7.
///
/// Life: `Initialize`, `Start` at the first IDR frame, any number of chunks, `Stop`, `Uninitialize`. A
/// recording that saw no IDR frame is stopped without having been started. One thread at a time calls these;
/// `PushChunk` may run beside `Stop`.
///
/// A thread that hangs in a file operation is given up by `Stop`. It works on `Work` alone, which it owns
/// together with this object, so it may go on at any later time without reaching this object, the stream
/// buffer or the controller. Sources: FileOutput.cc has the thread, OutputTarget.cc what it does to get a
/// file.
class FileOutput {
 public:
    FileOutput();
    /// `Stop` must have run.
    virtual ~FileOutput();
    FileOutput(const FileOutput&) = delete;
    FileOutput& operator=(const FileOutput&) = delete;

    /// Remembers whom to serve and makes the first muxer. `owner` and `streamBuffer` live until `Stop` has
    /// returned; `fileType` chooses the muxer, "normal" or "fragment", and any other counts as "normal".
    /// False when the muxer cannot be initialised, which has then been reported as status 7, cause 2.
    bool Initialize(ControllerInterface* owner, StreamBufferInterface* streamBuffer,
                    const std::string& fileType);
    /// Releases the muxer. Always true.
    bool Uninitialize();
    /// Starts the thread, for files as `outputSettings` says, and returns once it runs. Throws
    /// `std::system_error` when no thread can be started.
    void Start(const OutputSettings& outputSettings);
    /// Lets the thread write the chunks that still wait and close the file, and returns when that is done. A
    /// thread that has not finished after 3500 ms is given up: that is reported as status 7, cause 27, and
    /// its file stays without closing boxes. Throws `std::system_error` on the thread itself, which a host
    /// can bring here out of a status; the thread ends then all the same, and the next `Stop` joins it.
    void Stop();
    /// Appends a chunk and returns the number of chunks that now wait. Called by the chunk thread of
    /// `StreamBuffer`; never waits for a disk.
    std::size_t PushChunk(const std::shared_ptr<ChunkData>& chunk);

 private:
    struct Work;

    /// Leaves what a thread that was given up works on to that thread.
    void leaveWork();

    // What follows runs on the file output thread, or when there is none.
    static void outputThread(Work& work);
    /// Writes the chunks of `deque`. True on a failure, which has been reported.
    static bool outputFile(Work& work, std::deque<std::shared_ptr<ChunkData>>& deque);
    /// True when a file that is `excess` ticks past its length must go on with `chunk`, since a new one could
    /// not be decoded from there.
    static bool waitsForIdrFrame(const Work& work, const ChunkData& chunk, std::uint64_t excess);
    static void notifyTransferStatus(Work& work, const std::string& value);
    /// Closes the file in work, if any, and opens the one that begins with `chunk`. False on a failure, which
    /// has been reported; no file is open then.
    static bool newFile(Work& work, const std::shared_ptr<ChunkData>& chunk);
    /// `path` becomes the directory for files that begin now, which exists then. False, with `path` left
    /// alone, when it cannot be made.
    static bool makeOutputPath(Work& work, const OutputSettings& settings, std::string& path);
    static bool createOutputDirectory(Work& work, const std::string& path);
    /// Puts the thread under the credentials for a share, when the output path is one and there are any.
    /// Returns the token to close at the thread's end, or `kNoLogon`.
    static LogonToken useNetDrive(Work& work);
    static bool createMp4FileObject(Work& work);
    static bool deleteMp4FileObject(Work& work);

    /// Not owned. Constant after `Initialize`.
    ControllerInterface* controller = nullptr;
    StreamBufferInterface* buffer = nullptr;
    std::string type;
    /// Null until the first `Start` and after a thread was given up.
    std::shared_ptr<std::thread> thread;
    /// Never null. A new one when the thread of the old one was given up.
    std::shared_ptr<Work> work;
};

}  // namespace clipfileModule
