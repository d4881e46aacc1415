#pragma once

#include "boxlib/mbx_types.h"
#include "common/Log.h"

namespace clipfileModule {

/// One run of a muxer's routine as the log shows it: "start." on entry, a line for each step that failed, and
/// "end. ret = %d." on exit with what the routine returns.
class MuxerRoutine {
 public:
    MuxerRoutine(const char* file, const char* function, int line);
    MuxerRoutine(const MuxerRoutine&) = delete;
    MuxerRoutine& operator=(const MuxerRoutine&) = delete;
    ~MuxerRoutine();

    /// The name under which the routine logs, for lines of its parts.
    const char* Function() const { return function_; }

    /// True for a step that failed, which is logged as one of the routine, with the place where it stands.
    bool Failed(MbxStatus status, const char* file, int line) const;
    /// Notes the result for the last line, and passes it on.
    MbxStatus Return(MbxStatus result);
    bool Return(bool result);
    /// Ends a run that found no open file, with a line of its own in the place of the last one; false.
    bool ReturnNotOpen();

 private:
    const char* const file_;
    const char* const function_;
    const int line_;
    int result_ = 0;
    bool ended_ = false;
};

}  // namespace clipfileModule

/// Defines `routine` for the function around it.
#define MUXER_ROUTINE(routine)                                                         \
    static constexpr ::clipfileModule::FunctionName kRoutineName(__PRETTY_FUNCTION__); \
    ::clipfileModule::MuxerRoutine routine(__FILE__, kRoutineName.text, __LINE__)

/// Runs a step of a routine; true when it failed, which is logged.
#define MUXER_FAILED(routine, step) ((routine).Failed((step), __FILE__, __LINE__))

/// Runs a step of a routine that returns a status; a failure is logged and ends the routine with it.
#define MUXER_STEP(routine, step)                                                              \
    do {                                                                                       \
        if (const MbxStatus status_ = (step); (routine).Failed(status_, __FILE__, __LINE__)) { \
            return (routine).Return(status_);                                                  \
        }                                                                                      \
    } while (false)
