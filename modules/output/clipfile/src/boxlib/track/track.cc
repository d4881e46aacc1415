#include "boxlib/track/track.h"

MbxStatus MbxBuildTrak(MbxContext* context, const MbxOptions* options, const MbxTrackInMovie* track,
                       MbxTrakBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    const MbxTrack* source = track->track;
    MBX_TRY(MbxMakeBox(context, options, &box->mdia, source, MbxBuildMdia, MbxFreeMdia));
    if (source->references.first != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->tref, &source->references, MbxBuildTref, MbxFreeTref));
    }
    if (source->editList != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->edts, source->editList, MbxBuildEdts, MbxFreeEdts));
    }
    MBX_TRY(MbxMakeBox(context, options, &box->tkhd, track, MbxBuildTkhd, MbxFreeTkhd));
    if (MbxHasUserMetadata(&source->userMetadata)) {
        MBX_TRY(MbxMakeBox(context, options, &box->userMetadata, &source->userMetadata, MbxBuildUserMetadata,
                           MbxFreeUserMetadata));
    }
    const MbxSampleSegment* segment = source->segments.first;
    if (source->auxEnabled != 0 && segment != nullptr && segment->auxSizes.count != 0) {
        const MbxSencParams params = {0, &segment->auxSizes};
        MBX_TRY(MbxMakeBox(context, options, &box->senc, &params, MbxBuildSenc, MbxFreeSenc));
    }
    return MbxMeasureBox(context, options, box, MbxWriteTrakPayload);
}

// 8.3.1 Track Box
MbxStatus MbxWriteTrakPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxTrakBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteTkhdBox(context, options, file, position + count, box->tkhd, nullptr, &count));
    MBX_TRY(MbxWriteSencBox(context, options, file, position + count, box->senc, nullptr, &count));
    MBX_TRY(MbxWriteTrefBox(context, options, file, position + count, box->tref, nullptr, &count));
    MBX_TRY(MbxWriteEdtsBox(context, options, file, position + count, box->edts, nullptr, &count));
    MBX_TRY(MbxWriteMdiaBox(context, options, file, position + count, box->mdia, nullptr, &count));
    MBX_TRY(MbxWriteUserMetadataBox(context, options, file, position + count, box->userMetadata, nullptr,
                                    &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrakBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrakBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("trak"), box, MbxWriteTrakPayload, written,
                       accumulated);
}

MbxStatus MbxFreeTrak(MbxContext* context, MbxTrakBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeTkhd(context, box->tkhd));
        MBX_TRY(MbxFreeSenc(context, box->senc));
        MBX_TRY(MbxFreeTref(context, box->tref));
        MBX_TRY(MbxFreeEdts(context, box->edts));
        MBX_TRY(MbxFreeMdia(context, box->mdia));
        return MbxFreeUserMetadata(context, box->userMetadata);
    });
}
