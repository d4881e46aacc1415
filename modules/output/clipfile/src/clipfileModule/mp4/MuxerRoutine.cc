#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

namespace {

// What the last line calls the result.
constexpr const char* kResult = "ret";

}  // namespace

MuxerRoutine::MuxerRoutine(LogScope& scope) : scope_(scope) {
    scope_.Return(kResult, 0);
}

bool MuxerRoutine::Failed(MbxStatus status, const char* file, int line) const {
    if (status == MBX_OK) {
        return false;
    }
    // Contract: error-line-is-ours. Changes with every edit of the source.
    Logger::Put(LOG_PRIORITY_ERROR, file, Function(), line, "error. error_line = %d, result = %d.", line,
                static_cast<int>(status));
    return true;
}

MbxStatus MuxerRoutine::Return(MbxStatus result) {
    return scope_.Return(kResult, result);
}

bool MuxerRoutine::Return(bool result) {
    return scope_.Return(kResult, result);
}

bool MuxerRoutine::ReturnNotOpen() {
    scope_.EndAs(LOG_PRIORITY_TRACE, "end. file not open.");
    return false;
}

}  // namespace clipfileModule
