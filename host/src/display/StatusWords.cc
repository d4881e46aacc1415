#include "display/StatusWords.h"

#include <map>
#include <utility>

#include "QxModuleStatus.h"

namespace receiver {
namespace {

const std::map<std::pair<int, int>, const char*>& Words() {
    static const std::map<std::pair<int, int>, const char*> words{
        {{QxStatus::kNone, QxStatus::kNoCause}, "starting"},
        {{QxStatus::kBufferingStopped, QxStatus::kNoCause}, "buffering has stopped"},
        {{QxStatus::kBufferingStarted, QxStatus::kNoCause}, "buffering"},
        {{QxStatus::kStreamFault, QxStreamFault::kFileTooSlow},
         "the disk is too slow: more than 48 chunks wait for it"},
        {{QxStatus::kStreamFault, QxStreamFault::kVideoBufferFull},
         "more than 600 video units wait for the other media"},
        {{QxStatus::kStreamFault, QxStreamFault::kAudioBufferFull},
         "more than 900 audio units wait for the other media"},
        {{QxStatus::kStreamFault, QxStreamFault::kMetaBufferFull},
         "more than 600 metadata units wait for the other media"},
        {{QxStatus::kStreamFault, QxStreamFault::kOffline}, "the host went offline while a recording ran"},
        {{QxStatus::kFailed, QxFailure::kInitialize},
         "no output path is set, or there is no memory or no thread"},
        {{QxStatus::kFailed, QxFailure::kLogon}, "the credentials for a share were refused"},
        {{QxStatus::kFailed, QxFailure::kFreeSpaceUnknown},
         "the free space of the output path cannot be read"},
        {{QxStatus::kFailed, QxFailure::kDiskFull}, "the disk is full: less than 150 MiB are free"},
        {{QxStatus::kFailed, QxFailure::kDirectory}, "the dated directory cannot be made"},
        {{QxStatus::kFailed, QxFailure::kFileOpen}, "a file cannot be created"},
        {{QxStatus::kFailed, QxFailure::kFileWrite},
         "a chunk could not be written, or a recording failed before its first chunk"},
        {{QxStatus::kFailed, QxFailure::kFileClose}, "a file could not be completed, or the disk hangs"},
    };
    return words;
}

}  // namespace

std::string StatusWords(const ModuleStatus& status) {
    const auto found = Words().find({status.status, status.cause});
    if (found != Words().end()) {
        return found->second;
    }
    return "status " + std::to_string(status.status) + ", cause " + std::to_string(status.cause);
}

}  // namespace receiver
