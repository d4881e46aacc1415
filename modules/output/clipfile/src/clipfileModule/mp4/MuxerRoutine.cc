#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

MuxerRoutine::MuxerRoutine(const char* file, const char* function, int line)
    : file_(file), function_(function), line_(line) {
    Logger::Put(LOG_PRIORITY_DETAIL, file_, function_, line_, "start.");
}

MuxerRoutine::~MuxerRoutine() {
    if (!ended_) {
        Logger::Put(LOG_PRIORITY_DETAIL, file_, function_, line_, "end. ret = %d.", result_);
    }
}

bool MuxerRoutine::Failed(MbxStatus status, const char* file, int line) const {
    if (status == MBX_OK) {
        return false;
    }
    // Contract: error-line-is-ours. Changes with every edit of the source.
    Logger::Put(LOG_PRIORITY_ERROR, file, function_, line, "error. error_line = %d, result = %d.", line,
                static_cast<int>(status));
    return true;
}

MbxStatus MuxerRoutine::Return(MbxStatus result) {
    result_ = static_cast<int>(result);
    return result;
}

bool MuxerRoutine::Return(bool result) {
    result_ = result ? 1 : 0;
    return result;
}

bool MuxerRoutine::ReturnNotOpen() {
    ended_ = true;
    Logger::Put(LOG_PRIORITY_TRACE, file_, function_, line_, "end. file not open.");
    return false;
}

}  // namespace clipfileModule
