#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <memory>
#include <string>

#include "buffer/ChunkData.h"
#include "buffer/state/StreamBufferInterface.h"
#include "common/Mutex.h"
#include "controller/ControllerInterface.h"
#include "controller/OutputSettings.h"

namespace clipfileModule {

/// Takes the finished chunks of one recording and keeps disk time away from the stream path.
///
/// Life: `Initialize`, `Start` at the first IDR frame, any number of chunks, `Stop`, `Uninitialize`. A
/// recording that saw no IDR frame is stopped without having been started.
class FileOutput {
 public:
    FileOutput();
    virtual ~FileOutput();

    /// Remembers whom to serve. `owner` and `streamBuffer` outlive this object; `fileType` chooses the
    /// muxer. False when no muxer can be made, which has then been logged and reported as status 7, cause 2.
    bool Initialize(ControllerInterface* owner, StreamBufferInterface* streamBuffer,
                    const std::string& fileType);
    /// Releases what `Initialize` made. Always true.
    bool Uninitialize();
    /// Begins to take chunks, for files as `outputSettings` says.
    void Start(const OutputSettings& outputSettings);
    /// Writes the chunks that still wait, closes the file and returns when that is done.
    void Stop();
    /// Appends a chunk and returns the number of chunks that now wait. Called by the chunk thread of
    /// `StreamBuffer`; never waits for a disk.
    std::size_t PushChunk(const std::shared_ptr<ChunkData>& chunk) EXCLUDES(chunkMutex);

 private:
    /// Constant after `Initialize`. Not owned.
    ControllerInterface* controller = nullptr;
    StreamBufferInterface* buffer = nullptr;
    std::string type;

    OutputSettings settings;

    Mutex chunkMutex;
    std::deque<std::shared_ptr<ChunkData>> chunks GUARDED_BY(chunkMutex);
    std::condition_variable chunkCondition;
};

}  // namespace clipfileModule
