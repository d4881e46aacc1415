#pragma once

#include <cstddef>

#include "QxModuleStatus.h"

namespace clipfileModule {

// Contract: sixteen-for-eight. A late unit still finds its place.
/// Video units that must be cached before a chunk is cut.
inline constexpr std::size_t kMinimumVideoUnits = 16;

/// What a pass of the chunk thread ends with: the causes of status 6, or one of three that are none.
enum PassResult : int {
    kGoOn = 0,
    /// The record has reached its end.
    kRecordEnded = 1,
    /// There is no thread that could write it.
    kWriterMissing = 2,
    kFileTooSlow = QxStreamFault::kFileTooSlow,
    kVideoBufferFull = QxStreamFault::kVideoBufferFull,
    kAudioBufferFull = QxStreamFault::kAudioBufferFull,
    kMetaBufferFull = QxStreamFault::kMetaBufferFull,
};

}  // namespace clipfileModule
