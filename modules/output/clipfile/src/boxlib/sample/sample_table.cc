#include "boxlib/sample/sample_table.h"

namespace {

// `ctts` says nothing when all offsets are 0, which is one run.
bool needsCtts(const MbxCompositionList& offsets) {
    const MbxRun* first = MbxBlockListFirst<MbxRun>(&offsets.runs.list);
    return first != nullptr && (first->value != 0 || first != offsets.runs.last);
}

// Without `stss` all samples are sync samples. A track with none has one without entries.
bool needsStss(const MbxSampleSegment& segment) {
    const bool allSync = segment.syncSamples.list.first == nullptr && segment.syncSamples.syncCount != 0;
    return !allSync && segment.sizes.count != 0;
}

bool needsSdtp(const MbxDependencyList& dependencies) {
    if (dependencies.first != nullptr && *dependencies.first != 0) return true;
    if (dependencies.second == nullptr) return false;
    return *dependencies.second != 0 || dependencies.list.first != nullptr;
}

MbxStatus buildTables(MbxContext* context, const MbxOptions* options, const MbxSampleSegment& segment,
                      MbxStblBox* box) {
    MBX_TRY(MbxMakeBox(context, options, &box->stts, &segment.durations, MbxBuildStts, MbxFreeStts));
    if (needsCtts(segment.compositionOffsets)) {
        MBX_TRY(
            MbxMakeBox(context, options, &box->ctts, &segment.compositionOffsets, MbxBuildCtts, MbxFreeCtts));
    }
    MBX_TRY(MbxMakeBox(context, options, &box->stsc, &segment.chunks, MbxBuildStsc, MbxFreeStsc));
    MBX_TRY(MbxMakeBox(context, options, &box->stsz, &segment.sizes, MbxBuildStsz, MbxFreeStsz));
    uint32_t width = 0;
    MBX_TRY(MbxChooseOffsetWidth(options, &segment.chunkOffsets, &width));
    if (width == 8) {
        MBX_TRY(MbxMakeBox(context, options, &box->co64, &segment.chunkOffsets, MbxBuildCo64, MbxFreeCo64));
    } else {
        MBX_TRY(MbxMakeBox(context, options, &box->stco, &segment.chunkOffsets, MbxBuildStco, MbxFreeStco));
    }
    if (needsStss(segment)) {
        MBX_TRY(MbxMakeBox(context, options, &box->stss, &segment.syncSamples, MbxBuildStss, MbxFreeStss));
    }
    if (needsSdtp(segment.dependencies)) {
        MBX_TRY(MbxMakeBox(context, options, &box->sdtp, &segment.dependencies, MbxBuildSdtp, MbxFreeSdtp));
    }
    return MBX_OK;
}

// In `stbl` the rows of these tables and of the groups always have an allocation of their own.
MbxStatus buildAuxiliary(MbxContext* context, const MbxOptions* options, const MbxSampleSegment& segment,
                         MbxStblBox* box) {
    const MbxSaioParams offsets = {{}, 0, &segment.auxOffsets};
    const auto buildSaio = [&](MbxSaioBox* saio) {
        return MbxBuildSaio(context, nullptr, options, &offsets, saio);
    };
    MBX_TRY(MbxMakeChild(context, &box->saio, buildSaio, MbxFreeSaio));
    const MbxSaizParams sizes = {{}, &segment.auxSizes};
    const auto buildSaiz = [&](MbxSaizBox* saiz) {
        return MbxBuildSaiz(context, nullptr, options, &sizes, saiz);
    };
    return MbxMakeChild(context, &box->saiz, buildSaiz, MbxFreeSaiz);
}

MbxStatus buildGroups(MbxContext* context, const MbxOptions* options, const MbxSampleSegment& segment,
                      MbxStblBox* box) {
    for (const MbxSampleGroupParams* group = segment.sampleGroups.first; group != nullptr;
         group = group->next) {
        const auto build = [&](MbxSbgpBox* made) {
            return MbxBuildSbgp(context, nullptr, options, group, made);
        };
        MBX_TRY(MbxMakeListItem(context, &box->sampleGroups, build, MbxFreeSbgp));
    }
    for (const MbxGroupDescriptionParams* description = segment.groupDescriptions.first;
         description != nullptr; description = description->next) {
        const auto build = [&](MbxSgpdBox* made) {
            return MbxBuildSgpd(context, nullptr, options, description, made);
        };
        MBX_TRY(MbxMakeListItem(context, &box->groupDescriptions, build, MbxFreeSgpd));
    }
    return MBX_OK;
}

}  // namespace

MbxStatus MbxBuildStbl(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxStblBox* box) {
    static constexpr MbxSampleSegment kEmpty = {};
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    const MbxSampleSegment& segment = track->segments.first != nullptr ? *track->segments.first : kEmpty;
    const auto buildStsd = [&](MbxStsdBox* stsd) {
        return MbxBuildStsd(context, options, track->mediaHeader.timescale, &track->sampleEntries, stsd);
    };
    MBX_TRY(MbxMakeChild(context, &box->stsd, buildStsd, MbxFreeStsd));
    MBX_TRY(buildTables(context, options, segment, box));
    if (track->auxEnabled != 0 && segment.auxSizes.count != 0) {
        MBX_TRY(buildAuxiliary(context, options, segment, box));
    }
    MBX_TRY(buildGroups(context, options, segment, box));
    return MbxMeasureBox(context, options, box, MbxWriteStblPayload);
}

// 8.5.1 Sample Table Box
MbxStatus MbxWriteStblPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxStblBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteStsdBox(context, options, file, position + count, box->stsd, nullptr, &count));
    MBX_TRY(MbxWriteSttsBox(context, options, file, position + count, box->stts, nullptr, &count));
    MBX_TRY(MbxWriteCttsBox(context, options, file, position + count, box->ctts, nullptr, &count));
    MBX_TRY(MbxWriteStscBox(context, options, file, position + count, box->stsc, nullptr, &count));
    MBX_TRY(MbxWriteStszBox(context, options, file, position + count, box->stsz, nullptr, &count));
    MBX_TRY(MbxWriteStcoBox(context, options, file, position + count, box->stco, nullptr, &count));
    MBX_TRY(MbxWriteCo64Box(context, options, file, position + count, box->co64, nullptr, &count));
    MBX_TRY(MbxWriteStssBox(context, options, file, position + count, box->stss, nullptr, &count));
    MBX_TRY(MbxWriteSdtpBox(context, options, file, position + count, box->sdtp, nullptr, &count));
    MBX_TRY(MbxWriteSaioBox(context, nullptr, options, file, position + count, box->saio, nullptr, &count));
    MBX_TRY(MbxWriteSaizBox(context, nullptr, options, file, position + count, box->saiz, nullptr, &count));
    MBX_TRY(MbxWriteEach(box->sampleGroups.first, position, &count,
                         [&](const MbxSbgpBox* group, uint64_t at, uint64_t* counter) {
                             return MbxWriteSbgpBox(context, nullptr, options, file, at, group, nullptr,
                                                    counter);
                         }));
    MBX_TRY(MbxWriteEach(box->groupDescriptions.first, position, &count,
                         [&](const MbxSgpdBox* group, uint64_t at, uint64_t* counter) {
                             return MbxWriteSgpdBox(context, nullptr, options, file, at, group, nullptr,
                                                    counter);
                         }));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteStblBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStblBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("stbl"), box, MbxWriteStblPayload, written,
                       accumulated);
}

MbxStatus MbxFreeStbl(MbxContext* context, MbxStblBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeStsd(context, box->stsd));
        MBX_TRY(MbxFreeStts(context, box->stts));
        MBX_TRY(MbxFreeCtts(context, box->ctts));
        MBX_TRY(MbxFreeStsc(context, box->stsc));
        MBX_TRY(MbxFreeStsz(context, box->stsz));
        MBX_TRY(MbxFreeStco(context, box->stco));
        MBX_TRY(MbxFreeCo64(context, box->co64));
        MBX_TRY(MbxFreeStss(context, box->stss));
        MBX_TRY(MbxFreeSdtp(context, box->sdtp));
        MBX_TRY(MbxFreeSaio(context, box->saio));
        MBX_TRY(MbxFreeSaiz(context, box->saiz));
        MBX_TRY(MbxFreeList(context, &box->sampleGroups, MbxFreeSbgp));
        return MbxFreeList(context, &box->groupDescriptions, MbxFreeSgpd);
    });
}
