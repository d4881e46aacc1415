#include "boxlib/fragment/track_fragment_header.h"

#include "boxlib/model/version.h"

namespace {

// The first chunk's offset is where the data of the fragment begins.
MbxStatus chooseBase(const MbxOptions* options, const MbxTfhdParams& params, MbxTfhdValues* values) {
    const MbxSampleSegment& segment = *params.segment;
    switch (options->base_offset_mode) {
        case MBX_BASE_EXPLICIT: {
            values->flags |= MBX_TFHD_BASE_DATA_OFFSET;
            values->baseDataOffset = segment.overrides.baseDataOffset;
            if ((segment.overridesSet & MBX_OVERRIDE_BASE_OFFSET) != 0) return MBX_OK;
            const auto* first = MbxBlockListFirst<uint64_t>(&segment.chunkOffsets.list);
            if (first == nullptr) return MBX_ERR_NOT_FOUND;
            values->baseDataOffset = *first;
            return MBX_OK;
        }
        case MBX_BASE_RUNS_ON:
            values->baseDataOffset = params.runningBase;
            return MBX_OK;
        case MBX_BASE_MOOF:
            values->flags |= MBX_TFHD_BASE_IS_MOOF;
            values->baseDataOffset = 0;
            return MBX_OK;
        default:
            return MBX_ERR_INVALID_ARG;
    }
}

// Takes over one default: the override if there is one, else the segment's. Flagged when it is forced or
// differs from what `trex` says.
MbxStatus chooseDefault(uint32_t forced, bool overridden, uint32_t given, uint32_t ofSegment, uint32_t ofTrex,
                        uint32_t flag, uint32_t* value, uint32_t* flags) {
    if (forced > 1) return MBX_ERR_INVALID_ARG;
    *value = overridden ? given : ofSegment;
    if (forced == 1 || *value != ofTrex) *flags |= flag;
    return MBX_OK;
}

MbxStatus chooseValues(const MbxOptions* options, const MbxTfhdParams& params, MbxTfhdValues* values) {
    const MbxTrack& track = *params.track;
    const MbxSampleDefaults& trex = track.defaults;
    const MbxSampleDefaults first = MbxSegmentDefaults(params.segment, trex);
    const MbxSegmentOverrides& given = params.segment->overrides;
    const uint32_t set = params.segment->overridesSet;
    values->trackId = track.header.trackId;
    MBX_TRY(chooseBase(options, params, values));
    MBX_TRY(chooseDefault(track.defaultsForced[MBX_DEFAULT_DESCRIPTION],
                          (set & MBX_OVERRIDE_DESCRIPTION) != 0, given.descriptionIndex,
                          first.descriptionIndex, trex.descriptionIndex, MBX_TFHD_DESCRIPTION_INDEX,
                          &values->sampleDescriptionIndex, &values->flags));
    MBX_TRY(chooseDefault(track.defaultsForced[MBX_DEFAULT_DURATION], (set & MBX_OVERRIDE_DURATION) != 0,
                          given.duration, first.duration, trex.duration, MBX_TFHD_DURATION,
                          &values->defaultSampleDuration, &values->flags));
    MBX_TRY(chooseDefault(track.defaultsForced[MBX_DEFAULT_SIZE], (set & MBX_OVERRIDE_SIZE) != 0, given.size,
                          first.size, trex.size, MBX_TFHD_SIZE, &values->defaultSampleSize, &values->flags));
    return chooseDefault(track.defaultsForced[MBX_DEFAULT_FLAGS], (set & MBX_OVERRIDE_FLAGS) != 0,
                         given.flags, first.flags, trex.flags, MBX_TFHD_FLAGS, &values->defaultSampleFlags,
                         &values->flags);
}

}  // namespace

MbxStatus MbxBuildTfhd(MbxContext* context, const MbxOptions* options, const MbxTfhdParams* params,
                       MbxTfhdBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(chooseValues(options, *params, &box->values));
    return MbxMeasureBox(context, options, box, MbxWriteTfhdPayload);
}

// 8.8.7 Track Fragment Header Box
MbxStatus MbxWriteTfhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTfhdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxTfhdValues& values = box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, values.flags);
    MbxPut32(&bytes, values.trackId);  // unsigned int(32) track_ID
    if ((values.flags & MBX_TFHD_BASE_DATA_OFFSET) != 0) {
        MbxPut64(&bytes, values.baseDataOffset);  // unsigned int(64) base_data_offset
    }
    if ((values.flags & MBX_TFHD_DESCRIPTION_INDEX) != 0) {
        MbxPut32(&bytes, values.sampleDescriptionIndex);  // unsigned int(32) sample_description_index
    }
    if ((values.flags & MBX_TFHD_DURATION) != 0) {
        MbxPut32(&bytes, values.defaultSampleDuration);  // unsigned int(32) default_sample_duration
    }
    if ((values.flags & MBX_TFHD_SIZE) != 0) {
        MbxPut32(&bytes, values.defaultSampleSize);  // unsigned int(32) default_sample_size
    }
    if ((values.flags & MBX_TFHD_FLAGS) != 0) {
        MbxPut32(&bytes, values.defaultSampleFlags);  // unsigned int(32) default_sample_flags
    }
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteTfhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTfhdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("tfhd"), box, MbxWriteTfhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeTfhd(MbxContext* context, MbxTfhdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildTfdt(MbxContext* context, const MbxOptions* options, const MbxTfdtParams* params,
                       MbxTfdtBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxChooseValueVersion(options, params->baseMediaDecodeTime > UINT32_MAX, &box->version));
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteTfdtPayload);
}

// 8.8.12 Track Fragment Decode Time Box
MbxStatus MbxWriteTfdtPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTfdtBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    // unsigned int(64) or (32) baseMediaDecodeTime
    MbxPutByVersion(&bytes, box->version, box->params.baseMediaDecodeTime);
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteTfdtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTfdtBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("tfdt"), box, MbxWriteTfdtPayload,
                               written, accumulated);
}

MbxStatus MbxFreeTfdt(MbxContext* context, MbxTfdtBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildTrik(MbxContext* context, const MbxOptions* options, const MbxBlockList* params,
                       MbxTrikBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->bytes = params;
    return MbxMeasureBox(context, options, box, MbxWriteTrikPayload);
}

// Trick Play Box
MbxStatus MbxWriteTrikPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTrikBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxBlock* block = box->bytes->first; block != nullptr; block = block->next) {
        // unsigned int(2) pic_type, unsigned int(6) dependency_level, per sample
        MBX_TRY(MbxWriteBytes(context, file, block->data, block->count, nullptr, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrikBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrikBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("trik"), box, MbxWriteTrikPayload,
                               written, accumulated);
}

MbxStatus MbxFreeTrik(MbxContext* context, MbxTrikBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildAvcn(MbxContext* context, const MbxOptions* options, const MbxAvcConfig* params,
                       MbxAvcnBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxBuildAvcC(context, options, params, &box->avcC));
    return MbxMeasureBox(context, options, box, MbxWriteAvcnPayload);
}

// AVC NAL Unit Storage Box: ISO/IEC 14496-15 5.2.4.1, AVCDecoderConfigurationRecord
MbxStatus MbxWriteAvcnPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAvcnBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    return MbxWriteAvcCPayload(context, file, position, &box->avcC, written, accumulated);
}

MbxStatus MbxWriteAvcnBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAvcnBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("avcn"), box, MbxWriteAvcnPayload,
                               written, accumulated);
}

MbxStatus MbxFreeAvcn(MbxContext* context, MbxAvcnBox* box) {
    return MbxFreeBox(context, box);
}
