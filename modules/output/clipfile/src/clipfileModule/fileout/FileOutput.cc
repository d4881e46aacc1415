#include "fileout/FileOutput.h"

#include "common/Log.h"

namespace clipfileModule {

FileOutput::FileOutput() = default;

FileOutput::~FileOutput() = default;

bool FileOutput::Initialize(ControllerInterface* owner, StreamBufferInterface* streamBuffer,
                            const std::string& fileType) {
    controller = owner;
    buffer = streamBuffer;
    type = fileType;
    // There is no muxer of any type yet, so nothing may look as if it recorded.
    CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file initialize error.");
    controller->SetStatus(7, 2);
    return false;
}

bool FileOutput::Uninitialize() {
    return true;
}

void FileOutput::Start(const OutputSettings& outputSettings) {
    settings = outputSettings;
    MutexLock lock(chunkMutex);
    chunks.clear();
}

void FileOutput::Stop() {
    MutexLock lock(chunkMutex);
    chunks.clear();
}

std::size_t FileOutput::PushChunk(const std::shared_ptr<ChunkData>& chunk) {
    MutexLock lock(chunkMutex);
    chunks.push_back(chunk);
    chunkCondition.notify_one();
    return chunks.size();
}

}  // namespace clipfileModule
