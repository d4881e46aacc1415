#include "boxlib/fragment/movie_extends.h"

MbxStatus MbxComputeFragmentDuration(const MbxMovie* movie, uint64_t* duration) {
    if (MbxAnyNull(movie, duration)) return MBX_ERR_INVALID_ARG;
    uint64_t largest = 0;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        const MbxSampleSegment* last = track->segments.last;
        if (last == nullptr) continue;
        if (last->decodeDuration > UINT64_MAX - last->firstDecodeTime) return MBX_ERR_OVERFLOW;
        uint64_t end = 0;
        MBX_TRY(MbxRescale(last->firstDecodeTime + last->decodeDuration, track->mediaHeader.timescale,
                           movie->header.timescale, &end));
        if (end > largest) largest = end;
    }
    *duration = largest;
    return MBX_OK;
}

MbxStatus MbxFreeLevels(MbxContext* context, MbxMovie* movie) {
    return MbxFreeList(context, &movie->levels,
                       [](MbxContext* owner, MbxLevel* level) { return MbxFreeBox(owner, level); });
}

MbxStatus MbxBuildMehd(MbxContext* context, const MbxOptions* options, const MbxMehdParams* params,
                       MbxMehdBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    const bool needsWide = params->fragmentDuration > UINT32_MAX;
    if (options->mehd_mode == MBX_MEHD_32 && needsWide) return MBX_ERR_BAD_STATE;
    box->version = options->mehd_mode == MBX_MEHD_64 || needsWide ? 1 : 0;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteMehdPayload);
}

// 8.8.2 Movie Extends Header Box
MbxStatus MbxWriteMehdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMehdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    // unsigned int(64) or (32) fragment_duration
    MbxPutByVersion(&bytes, box->version, box->params.fragmentDuration);
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMehdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMehdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("mehd"), box, MbxWriteMehdPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMehd(MbxContext* context, MbxMehdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildTrex(MbxContext* context, const MbxOptions* options, const MbxTrexParams* params,
                       MbxTrexBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteTrexPayload);
}

// 8.8.3 Track Extends Box
MbxStatus MbxWriteTrexPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTrexBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxSampleDefaults& defaults = box->params.defaults;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, box->params.trackId);        // unsigned int(32) track_ID
    MbxPut32(&bytes, defaults.descriptionIndex);  // unsigned int(32) default_sample_description_index
    MbxPut32(&bytes, defaults.duration);          // unsigned int(32) default_sample_duration
    MbxPut32(&bytes, defaults.size);              // unsigned int(32) default_sample_size
    MbxPut32(&bytes, defaults.flags);             // unsigned int(32) default_sample_flags
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteTrexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrexBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("trex"), box, MbxWriteTrexPayload, written,
                       accumulated);
}

MbxStatus MbxFreeTrex(MbxContext* context, MbxTrexBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildLeva(MbxContext* context, const MbxOptions* options, const MbxLevel* params,
                       MbxLevaBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->levels = params;
    return MbxMeasureBox(context, options, box, MbxWriteLevaPayload);
}

namespace {

MbxStatus composeLevel(const MbxLevel& level, MbxBytes* bytes) {
    MbxPut32(bytes, level.trackId);  // unsigned int(32) track_id
    // unsigned int(1) padding_flag, unsigned int(7) assignment_type
    MbxPut8(bytes, static_cast<uint32_t>(level.paddingFlag << 7 | (level.assignmentType & 0x7F)));
    switch (level.assignmentType) {
        case 0:
            MbxPut32(bytes, level.groupingType);  // unsigned int(32) grouping_type
            return MBX_OK;
        case 1:
            MbxPut32(bytes, level.groupingType);           // unsigned int(32) grouping_type
            MbxPut32(bytes, level.groupingTypeParameter);  // unsigned int(32) grouping_type_parameter
            return MBX_OK;
        case 2:
        case 3:
            return MBX_OK;
        case 4:
            MbxPut32(bytes, level.subTrackId);  // unsigned int(32) sub_track_id
            return MBX_OK;
        default:
            return MBX_ERR_INTERNAL;
    }
}

}  // namespace

// 8.8.13 Level Assignment Box
MbxStatus MbxWriteLevaPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxLevaBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint32_t levels = 0;
    MBX_TRY(MbxListCount(box->levels, &levels));
    // Contract: leva-count-cut. Checked against 16 bits, written with 8.
    if (levels > UINT16_MAX) return MBX_ERR_OVERFLOW;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut8(&bytes,
            levels);  // unsigned int(8) level_count, cut from the count that was checked against 16 bits

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxLevel* level = box->levels; level != nullptr; level = level->next) {
        MbxBeginBytes(context, &bytes);
        MBX_TRY(composeLevel(*level, &bytes));
        MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteLevaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxLevaBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("leva"), box, MbxWriteLevaPayload,
                               written, accumulated);
}

MbxStatus MbxFreeLeva(MbxContext* context, MbxLevaBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMvex(MbxContext* context, const MbxOptions* options, const MbxMovie* params,
                       MbxMvexBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    if (options->mehd_mode != MBX_MEHD_NONE) {
        MbxMehdParams mehd = {};
        MBX_TRY(MbxComputeFragmentDuration(params, &mehd.fragmentDuration));
        MBX_TRY(MbxMakeBox(context, options, &box->mehd, &mehd, MbxBuildMehd, MbxFreeMehd));
    }
    for (const MbxTrack* track = params->tracks.first; track != nullptr; track = track->next) {
        const MbxTrexParams trex = {track->header.trackId, track->defaults};
        MBX_TRY(MbxMakeListItem(
            context, &box->trex,
            [&](MbxTrexBox* item) { return MbxBuildTrex(context, options, &trex, item); }, MbxFreeTrex));
    }
    if (params->levels.first != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->leva, params->levels.first, MbxBuildLeva, MbxFreeLeva));
    }
    return MbxMeasureBox(context, options, box, MbxWriteMvexPayload);
}

// 8.8.1 Movie Extends Box
MbxStatus MbxWriteMvexPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMvexBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMehdBox(context, options, file, position + count, box->mehd, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->trex.first, MbxWriteTrexBox, &count));
    MBX_TRY(MbxWriteLevaBox(context, options, file, position + count, box->leva, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMvexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMvexBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("mvex"), box, MbxWriteMvexPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMvex(MbxContext* context, MbxMvexBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMehd(context, box->mehd));
        MBX_TRY(MbxFreeList(context, &box->trex, MbxFreeTrex));
        return MbxFreeLeva(context, box->leva);
    });
}
