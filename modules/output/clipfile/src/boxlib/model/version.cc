#include "boxlib/model/version.h"

#include "boxlib/model/model.h"

namespace {

bool isWide(uint64_t value) {
    return value > UINT32_MAX;
}

// What the time boxes and `elst` share: they differ in what makes version 1 needed and what is refused.
MbxStatus chooseLoosely(const MbxOptions* options, bool any, bool refused, uint32_t* version) {
    switch (options->time_version_mode) {
        case MBX_TIMES_32:
        case MBX_TIMES_32_WITH_TFRA:
            if (refused) return MBX_ERR_BAD_STATE;
            *version = 0;
            return MBX_OK;
        case MBX_TIMES_BY_VALUE:
            *version = any ? 1 : 0;
            return MBX_OK;
        case MBX_TIMES_64:
            *version = 1;
            return MBX_OK;
        default:
            // Contract: unknown-time-mode. The other two choosers take it for mode 2.
            return MBX_ERR_INTERNAL;
    }
}

}  // namespace

// Contract: loose-time-version. Refused only when all three are wide; one that is cut passes.
MbxStatus MbxChooseTimeVersion(const MbxOptions* options, uint64_t creation, uint64_t modification,
                               uint64_t duration, uint32_t* version) {
    if (options == nullptr || version == nullptr) return MBX_ERR_INVALID_ARG;
    return chooseLoosely(options, isWide(creation) || isWide(modification) || isWide(duration),
                         isWide(creation) && isWide(modification) && isWide(duration), version);
}

// Contract: loose-edit-version. Refused only when durations and times are wide.
MbxStatus MbxChooseEditVersion(const MbxOptions* options, const MbxEdit* first, uint32_t* version) {
    if (options == nullptr || version == nullptr) return MBX_ERR_INVALID_ARG;
    bool wideDuration = false;
    bool wideTime = false;
    for (const MbxEdit* edit = first; edit != nullptr; edit = edit->next) {
        wideDuration |= isWide(edit->segmentDuration);
        wideTime |= edit->mediaTime > INT32_MAX || edit->mediaTime < INT32_MIN;
    }
    return chooseLoosely(options, wideDuration || wideTime, wideDuration && wideTime, version);
}

MbxStatus MbxChooseIndexVersion(const MbxOptions* options, uint64_t time, uint64_t offset,
                                uint32_t* version) {
    if (options == nullptr || version == nullptr) return MBX_ERR_INVALID_ARG;
    // Contract: tfra-version-1. Mode 0 is not "as mode 2" here.
    if (options->time_version_mode == MBX_TIMES_32) {
        *version = 1;
        return MBX_OK;
    }
    return MbxChooseValueVersion(options, isWide(time) || isWide(offset), version);
}

MbxStatus MbxChooseValueVersion(const MbxOptions* options, bool needsWide, uint32_t* version) {
    if (options == nullptr || version == nullptr) return MBX_ERR_INVALID_ARG;
    switch (options->time_version_mode) {
        case MBX_TIMES_BY_VALUE:
            *version = needsWide ? 1 : 0;
            return MBX_OK;
        case MBX_TIMES_64:
            *version = 1;
            return MBX_OK;
        default:
            if (needsWide) return MBX_ERR_BAD_STATE;
            *version = 0;
            return MBX_OK;
    }
}
