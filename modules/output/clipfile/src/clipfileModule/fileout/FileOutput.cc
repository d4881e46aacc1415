#include "fileout/FileOutput.h"

#include <chrono>
#include <mutex>

#include "QxModuleStatus.h"
#include "common/JoinThread.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "fileout/FileWriter.h"
#include "platform/PlatformInterface.h"

namespace clipfileModule {

namespace {

// Contract: stop-waits-3500-ms. How long `Stop` waits for the thread; not to be configured.
constexpr std::chrono::milliseconds stopWaitMilliSec(3500);
// Contract: half-a-second-for-a-host. How long it then waits for a host's call that the thread is in.
constexpr std::chrono::milliseconds kOwnerCallWait(500);

}  // namespace

FileOutput::FileOutput() : writer(std::make_shared<FileWriter>(nullptr, nullptr, std::string())) {}

FileOutput::~FileOutput() = default;

bool FileOutput::Initialize(ControllerInterface* owner, StreamBufferInterface* streamBuffer,
                            const std::string& fileType) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    controller = owner;
    buffer = streamBuffer;
    type = fileType;
    writer = std::make_shared<FileWriter>(owner, streamBuffer, fileType);
    // Contract: first-muxer-unused. Each file gets a new one.
    return scope.Return("func_result", writer->createMp4FileObject());
}

bool FileOutput::Uninitialize() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    writer->Finish();
    leaveWriter();
    // Contract: delete-until-true. It is true the first time.
    while (!writer->deleteMp4FileObject()) {
    }
    return scope.Return("func_result", true);
}

void FileOutput::Start(const OutputSettings& outputSettings) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    leaveWriter();
    thread = FileWriter::Start(writer, outputSettings);
}

void FileOutput::Stop() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    writer->Finish();
    if (thread == nullptr) {
        return;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "wait thread start...");
    if (std::unique_lock ended = writer->WaitForEnd(stopWaitMilliSec); ended.owns_lock()) {
        JoinThread(*thread);
    } else {
        writer->GiveUp(kOwnerCallWait);
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

void FileOutput::leaveWriter() {
    if (writer->IsGivenUp()) {
        writer = std::make_shared<FileWriter>(controller, buffer, type);
    }
}

std::size_t FileOutput::PushChunk(const std::shared_ptr<ChunkData>& chunk) {
    return writer->Push(chunk);
}

}  // namespace clipfileModule
