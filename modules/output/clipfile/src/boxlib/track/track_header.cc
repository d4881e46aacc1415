#include "boxlib/track/track_header.h"

#include "boxlib/model/version.h"
#include "boxlib/track/media.h"

// ---- tkhd ----

MbxStatus MbxBuildTkhd(MbxContext* context, const MbxOptions* options, const MbxTrackInMovie* track,
                       MbxTkhdBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    if (track->track->header.flags > 0xFFFFFF) return MBX_ERR_INVALID_ARG;
    box->values = track->track->header;
    if ((box->values.fieldsSet & MBX_TRACK_DURATION) == 0) {
        MBX_TRY(MbxComputeTrackDuration(track, &box->values.duration));
    }
    MBX_TRY(MbxChooseTimeVersion(options, box->values.creationTime, box->values.modificationTime,
                                 box->values.duration, &box->version));
    return MbxMeasureBox(context, options, box, MbxWriteTkhdPayload);
}

// 8.3.2 Track Header Box
MbxStatus MbxWriteTkhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTkhdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxTrackHeader& values = box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, values.flags);
    MbxPutByVersion(&bytes, box->version, values.creationTime);  // unsigned int(64 or 32) creation_time
    MbxPutByVersion(&bytes, box->version,
                    values.modificationTime);                // unsigned int(64 or 32) modification_time
    MbxPut32(&bytes, values.trackId);                        // unsigned int(32) track_ID
    MbxPutZeros(&bytes, 4);                                  // unsigned int(32) reserved
    MbxPutByVersion(&bytes, box->version, values.duration);  // unsigned int(64 or 32) duration
    MbxPutZeros(&bytes, 8);                                  // unsigned int(32)[2] reserved
    MbxPut16(&bytes, static_cast<uint16_t>(values.layer));   // int(16) layer
    MbxPut16(&bytes, static_cast<uint16_t>(values.alternateGroup));          // int(16) alternate_group
    MbxPut16(&bytes, values.volume);                                         // int(16) volume
    MbxPutZeros(&bytes, 2);                                                  // unsigned int(16) reserved
    for (const uint32_t element : values.matrix) MbxPut32(&bytes, element);  // int(32)[9] matrix
    MbxPut32(&bytes, values.width);                                          // unsigned int(32) width
    MbxPut32(&bytes, values.height);                                         // unsigned int(32) height
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteTkhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTkhdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("tkhd"), box, MbxWriteTkhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeTkhd(MbxContext* context, MbxTkhdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxComputeTrackDuration(const MbxTrackInMovie* track, uint64_t* duration) {
    if (MbxAnyNull(track, duration)) return MBX_ERR_INVALID_ARG;
    const MbxEditList* editList = track->track->editList;
    if (editList == nullptr || editList->edits.first == nullptr) {
        uint64_t media = 0;
        MBX_TRY(MbxComputeMediaDuration(track->track, &media));
        return MbxRescale(media, track->track->mediaHeader.timescale, track->movieTimescale, duration);
    }
    uint64_t sum = 0;
    for (const MbxEdit* edit = editList->edits.first; edit != nullptr; edit = edit->next) {
        if (edit->segmentDuration > UINT64_MAX - sum) return MBX_ERR_OVERFLOW;
        sum += edit->segmentDuration;
    }
    *duration = sum;
    return MBX_OK;
}

// ---- edts, elst ----

MbxStatus MbxBuildEdts(MbxContext* context, const MbxOptions* options, const MbxEditList* editList,
                       MbxEdtsBox* box) {
    if (MbxAnyNull(context, options, editList, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->elst, editList, MbxBuildElst, MbxFreeElst));
    return MbxMeasureBox(context, options, box, MbxWriteEdtsPayload);
}

// 8.6.5 Edit Box
MbxStatus MbxWriteEdtsPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxEdtsBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteElstBox(context, options, file, position + count, box->elst, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteEdtsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxEdtsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("edts"), box, MbxWriteEdtsPayload,
                               written, accumulated);
}

MbxStatus MbxFreeEdts(MbxContext* context, MbxEdtsBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeElst(context, box->elst); });
}

MbxStatus MbxBuildElst(MbxContext* context, const MbxOptions* options, const MbxEditList* editList,
                       MbxElstBox* box) {
    if (MbxAnyNull(context, options, editList, box)) return MBX_ERR_INVALID_ARG;
    box->editList = editList;
    MBX_TRY(MbxChooseEditVersion(options, editList->edits.first, &box->version));
    return MbxMeasureBox(context, options, box, MbxWriteElstPayload);
}

// 8.6.6 Edit List Box
MbxStatus MbxWriteElstPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxElstBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    uint32_t editCount = 0;
    MBX_TRY(MbxListCount(box->editList->edits.first, &editCount));
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPut32(&bytes, editCount);  // unsigned int(32) entry_count
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxEdit* edit = box->editList->edits.first; edit != nullptr; edit = edit->next) {
        MbxBeginBytes(context, &bytes);
        MbxPutByVersion(&bytes, box->version,
                        edit->segmentDuration);  // unsigned int(64 or 32) segment_duration
        MbxPutByVersion(&bytes, box->version,
                        static_cast<uint64_t>(edit->mediaTime));      // int(64 or 32) media_time
        MbxPut16(&bytes, static_cast<uint16_t>(edit->rateInteger));   // int(16) media_rate_integer
        MbxPut16(&bytes, static_cast<uint16_t>(edit->rateFraction));  // int(16) media_rate_fraction
        MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteElstBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxElstBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("elst"), box, MbxWriteElstPayload, written,
                       accumulated);
}

MbxStatus MbxFreeElst(MbxContext* context, MbxElstBox* box) {
    return MbxFreeBox(context, box);
}

// ---- tref ----

MbxStatus MbxBuildTref(MbxContext* context, const MbxOptions* options,
                       const MbxList<MbxReferenceGroup>* groups, MbxTrefBox* box) {
    if (MbxAnyNull(context, options, groups, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBoxes(context, options, &box->groups, groups->first, MbxBuildTrefGroup, MbxFreeTrefGroup));
    return MbxMeasureBox(context, options, box, MbxWriteTrefPayload);
}

// 8.3.3 Track Reference Box
MbxStatus MbxWriteTrefPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxTrefBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->groups.first, MbxWriteTrefGroupBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrefBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrefBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("tref"), box, MbxWriteTrefPayload,
                               written, accumulated);
}

MbxStatus MbxFreeTref(MbxContext* context, MbxTrefBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeList(context, &box->groups, MbxFreeTrefGroup); });
}

MbxStatus MbxBuildTrefGroup(MbxContext* context, const MbxOptions* options, const MbxReferenceGroup* group,
                            MbxTrefGroupBox* box) {
    if (MbxAnyNull(context, options, group, box)) return MBX_ERR_INVALID_ARG;
    if (group->type == 0) return MBX_ERR_INTERNAL;
    box->group = group;
    return MbxMeasureBox(context, options, box, MbxWriteTrefGroupPayload);
}

// 8.3.3 TrackReferenceTypeBox
MbxStatus MbxWriteTrefGroupPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                   const MbxTrefGroupBox* box, uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    for (const MbxReferenceTarget* target = box->group->targets.first; target != nullptr;
         target = target->next) {
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut32(&bytes, target->trackId);  // unsigned int(32) track_IDs[]
        MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrefGroupBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxTrefGroupBox* box, uint64_t* written,
                               uint64_t* accumulated) {
    if (box == nullptr) return MBX_ERR_INVALID_ARG;
    return MbxWriteBox(context, options, file, position, box->group->type, box, MbxWriteTrefGroupPayload,
                       written, accumulated);
}

MbxStatus MbxFreeTrefGroup(MbxContext* context, MbxTrefGroupBox* box) {
    return MbxFreeBox(context, box);
}
