#include "buffer/state/CacheState.h"

#include "common/Log.h"

namespace clipfileModule {

namespace {

constexpr std::uint64_t kBytesPerLine = 32;

}  // namespace

CacheState::CacheState(const char* stateName, CacheStateId stateId, StreamBufferInterface* owner)
    : name(stateName), id(stateId), buffer(owner) {}

// Contract: state-operations-unused. This one has no caller, and `OnExit` does nothing in any state.
bool CacheState::CanFinish(const StreamDataQueue& /*queue*/) {
    return true;
}

void CacheState::dump(const char* text, const unsigned char* data, std::uint64_t size) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "%s, size = %d.", text, static_cast<int>(size));
    if (size == 0) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "none");
        return;
    }
    static constexpr char kDigits[] = "0123456789abcdef";
    std::string line;
    for (std::uint64_t i = 0; i < size; ++i) {
        line += kDigits[data[i] >> 4];
        line += kDigits[data[i] & 0x0F];
        line += ' ';
        if ((i + 1) % kBytesPerLine == 0) {
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "%s", line.c_str());
            line.clear();
        }
    }
    if (!line.empty()) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "%s", line.c_str());
    }
}

}  // namespace clipfileModule
