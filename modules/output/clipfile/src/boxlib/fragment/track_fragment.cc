#include "boxlib/fragment/track_fragment.h"

#include "boxlib/core/row_table.h"

namespace {

MbxStatus buildRuns(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                    const MbxTrafParams& params, MbxTrafBox* box) {
    MbxSampleCursor cursor;
    MbxStartCursor(params.track, params.segment, &cursor);
    uint64_t position = box->tfhd->values.baseDataOffset;
    const MbxTrunParams run = {&box->tfhd->values, &cursor, &position};
    const auto build = [&](MbxTrunBox* trun) { return MbxBuildTrun(context, scratch, options, &run, trun); };
    for (uint32_t i = 0; i < params.segment->chunks.chunkCount; i++) {
        MBX_TRY(MbxMakeListItem(context, &box->trun, build, MbxFreeTrun));
    }
    *params.runningBase = position;
    return MBX_OK;
}

MbxStatus buildAuxiliary(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                         const MbxSampleSegment& segment, MbxTrafBox* box) {
    const MbxSencParams bytes = {0, &segment.auxSizes};
    MBX_TRY(MbxMakeBox(context, options, &box->senc, &bytes, MbxBuildSenc, MbxFreeSenc));
    const MbxTfhdValues& tfhd = box->tfhd->values;
    const bool hasBase = (tfhd.flags & MBX_TFHD_BASE_DATA_OFFSET) != 0;
    const MbxSaioParams offsets = {{}, hasBase ? tfhd.baseDataOffset : 0, &segment.auxOffsets};
    const auto buildSaio = [&](MbxSaioBox* saio) {
        return MbxBuildSaio(context, scratch, options, &offsets, saio);
    };
    MBX_TRY(MbxMakeChild(context, &box->saio, buildSaio, MbxFreeSaio));
    const MbxSaizParams sizes = {{}, &segment.auxSizes};
    const auto buildSaiz = [&](MbxSaizBox* saiz) {
        return MbxBuildSaiz(context, scratch, options, &sizes, saiz);
    };
    return MbxMakeChild(context, &box->saiz, buildSaiz, MbxFreeSaiz);
}

MbxStatus buildGroups(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                      const MbxSampleSegment& segment, MbxTrafBox* box) {
    for (const MbxSampleGroupParams* group = segment.sampleGroups.first; group != nullptr;
         group = group->next) {
        const auto build = [&](MbxSbgpBox* sbgp) {
            return MbxBuildSbgp(context, scratch, options, group, sbgp);
        };
        MBX_TRY(MbxMakeListItem(context, &box->sbgp, build, MbxFreeSbgp));
    }
    const MbxGroupDescriptionParams* descriptions = segment.groupDescriptions.first;
    for (; descriptions != nullptr; descriptions = descriptions->next) {
        const auto build = [&](MbxSgpdBox* sgpd) {
            return MbxBuildSgpd(context, scratch, options, descriptions, sgpd);
        };
        MBX_TRY(MbxMakeListItem(context, &box->sgpd, build, MbxFreeSgpd));
    }
    if (segment.subSamples.first == nullptr) return MBX_OK;
    const auto build = [&](MbxSubsBox* subs) {
        return MbxBuildSubs(context, scratch, options, segment.subSamples.first, subs);
    };
    return MbxMakeChild(context, &box->subs, build, MbxFreeSubs);
}

}  // namespace

MbxStatus MbxBuildTraf(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTrafParams* params, MbxTrafBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    const MbxTrack& track = *params->track;
    const MbxSampleSegment& segment = *params->segment;
    const MbxTfhdParams tfhd = {params->track, params->segment, *params->runningBase};
    MBX_TRY(MbxMakeBox(context, options, &box->tfhd, &tfhd, MbxBuildTfhd, MbxFreeTfhd));
    if (options->tfdt_mode == MBX_TFDT_ALWAYS) {
        const MbxTfdtParams tfdt = {segment.firstDecodeTime};
        MBX_TRY(MbxMakeBox(context, options, &box->tfdt, &tfdt, MbxBuildTfdt, MbxFreeTfdt));
    }
    if (track.trickEnabled != 0) {
        MBX_TRY(MbxMakeBox(context, options, &box->trik, &segment.trickBytes, MbxBuildTrik, MbxFreeTrik));
    }
    MBX_TRY(buildRuns(context, scratch, options, *params, box));
    if (segment.avcConfig != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->avcn, segment.avcConfig, MbxBuildAvcn, MbxFreeAvcn));
    }
    if (track.auxEnabled != 0 && segment.auxSizes.count != 0) {
        MBX_TRY(buildAuxiliary(context, scratch, options, segment, box));
    }
    MBX_TRY(buildGroups(context, scratch, options, segment, box));
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteTrafPayload));
}

// 8.8.6 Track Fragment Box
MbxStatus MbxWriteTrafPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxTrafBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    // Writes the boxes of a list that take the scratch.
    const auto writeEach = [&](const auto* first, auto writeBox, uint64_t* count) {
        return MbxWriteEach(first, position, count, [&](const auto* item, uint64_t at, uint64_t* counter) {
            return writeBox(context, scratch, options, file, at, item, nullptr, counter);
        });
    };
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteTfhdBox(context, options, file, position + count, box->tfhd, nullptr, &count));
    MBX_TRY(MbxWriteTfdtBox(context, options, file, position + count, box->tfdt, nullptr, &count));
    MBX_TRY(MbxWriteTrikBox(context, options, file, position + count, box->trik, nullptr, &count));
    MBX_TRY(writeEach(box->trun.first, MbxWriteTrunBox, &count));
    MBX_TRY(MbxWriteAvcnBox(context, options, file, position + count, box->avcn, nullptr, &count));
    MBX_TRY(MbxWriteSencBox(context, options, file, position + count, box->senc, nullptr, &count));
    MBX_TRY(MbxWriteSaioBox(context, scratch, options, file, position + count, box->saio, nullptr, &count));
    MBX_TRY(MbxWriteSaizBox(context, scratch, options, file, position + count, box->saiz, nullptr, &count));
    MBX_TRY(writeEach(box->sbgp.first, MbxWriteSbgpBox, &count));
    MBX_TRY(writeEach(box->sgpd.first, MbxWriteSgpdBox, &count));
    MBX_TRY(MbxWriteSubsBox(context, scratch, options, file, position + count, box->subs, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrafBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTrafBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("traf"), box,
                       MbxWithScratch(scratch, MbxWriteTrafPayload), written, accumulated);
}

MbxStatus MbxFreeTraf(MbxContext* context, MbxTrafBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeTfhd(context, box->tfhd));
        MBX_TRY(MbxFreeTfdt(context, box->tfdt));
        MBX_TRY(MbxFreeTrik(context, box->trik));
        MBX_TRY(MbxFreeList(context, &box->trun, MbxFreeTrun));
        MBX_TRY(MbxFreeAvcn(context, box->avcn));
        MBX_TRY(MbxFreeSenc(context, box->senc));
        MBX_TRY(MbxFreeSaio(context, box->saio));
        MBX_TRY(MbxFreeSaiz(context, box->saiz));
        MBX_TRY(MbxFreeList(context, &box->sbgp, MbxFreeSbgp));
        MBX_TRY(MbxFreeList(context, &box->sgpd, MbxFreeSgpd));
        return MbxFreeSubs(context, box->subs);
    });
}
