#pragma once

#include "boxlib/mbx_types.h"
#include "common/LogScope.h"

namespace clipfileModule {

/// One run of a muxer's routine as the log shows it: "start." on entry, a line for each step that failed, and
/// "end. ret = %d." on exit with what the routine returns.
class MuxerRoutine {
 public:
    explicit MuxerRoutine(LogScope& scope);
    MuxerRoutine(const MuxerRoutine&) = delete;
    MuxerRoutine& operator=(const MuxerRoutine&) = delete;

    /// The name under which the routine logs, for lines of its parts.
    const char* Function() const { return scope_.Function(); }

    /// True for a step that failed, which is logged as one of the routine, with the place where it stands.
    bool Failed(MbxStatus status, const char* file, int line) const;
    /// Notes the result for the last line, and passes it on.
    MbxStatus Return(MbxStatus result);
    bool Return(bool result);
    /// Ends a run that found no open file, with a line of its own in the place of the last one; false.
    bool ReturnNotOpen();

 private:
    LogScope& scope_;
};

}  // namespace clipfileModule

/// Defines `routine` for the function around it.
#define MUXER_ROUTINE(routine)                             \
    CLIPFILE_LOG_SCOPE(routineScope, LOG_PRIORITY_DETAIL); \
    ::clipfileModule::MuxerRoutine routine(routineScope)

/// Runs a step of a routine; true when it failed, which is logged.
#define MUXER_FAILED(routine, step) ((routine).Failed((step), __FILE__, __LINE__))

/// Runs a step of a routine that returns a status; a failure is logged and ends the routine with it.
#define MUXER_STEP(routine, step)                                                              \
    do {                                                                                       \
        if (const MbxStatus status_ = (step); (routine).Failed(status_, __FILE__, __LINE__)) { \
            return (routine).Return(status_);                                                  \
        }                                                                                      \
    } while (false)
