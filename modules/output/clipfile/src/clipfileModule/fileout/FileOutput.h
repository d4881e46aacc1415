#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <thread>

#include "buffer/chunk/ChunkData.h"
#include "common/ControllerInterface.h"
#include "common/OutputSettings.h"
#include "common/StreamBufferInterface.h"

namespace clipfileModule {

class FileWriter;

/// Keeps disk time away from the stream path: hands the finished chunks of one recording to a `FileWriter`,
/// which has a thread of its own, and gives that up when it hangs.
///
/// Life: `Initialize`, `Start` at the first IDR frame, any number of chunks, `Stop`, `Uninitialize`. A
/// recording that saw no IDR frame is stopped without having been started. One thread at a time calls these;
/// `PushChunk` may run beside `Stop`.
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
    /// Takes a new writer in the place of one that was given up, which stays its thread's own.
    void leaveWriter();

    /// Not owned. Constant after `Initialize`.
    ControllerInterface* controller = nullptr;
    StreamBufferInterface* buffer = nullptr;
    std::string type;
    /// Null until the first `Start` and after a thread was given up.
    std::shared_ptr<std::thread> thread;
    /// Never null. The thread's too.
    std::shared_ptr<FileWriter> writer;
};

}  // namespace clipfileModule
