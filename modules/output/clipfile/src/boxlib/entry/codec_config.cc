#include "boxlib/entry/codec_config.h"

#include "boxlib/core/bits.h"

namespace {

MbxStatus writeAvcExtension(MbxContext* context, MbxFile* file, const MbxAvcConfig& config,
                            uint64_t* accumulated) {
    uint32_t extensions = 0;
    MBX_TRY(MbxListCountUpTo(&config.sequenceExtensions, UINT8_MAX, &extensions));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut8(&bytes, config.values.chroma_format | 0xFCU);            // bit(6) reserved, unsigned int(2)
    MbxPut8(&bytes, config.values.bit_depth_luma_minus8 | 0xF8U);    // bit(5) reserved, unsigned int(3)
    MbxPut8(&bytes, config.values.bit_depth_chroma_minus8 | 0xF8U);  // bit(5) reserved, unsigned int(3)
    MbxPut8(&bytes, extensions);  // unsigned int(8) numOfSequenceParameterSetExt
    MBX_TRY(MbxWriteComposed(context, file, &bytes, accumulated));
    return MbxWriteParameterSets(context, file, &config.sequenceExtensions, accumulated);
}

MbxStatus writeHvcArray(MbxContext* context, MbxFile* file, const MbxHvcCArray& array,
                        uint64_t* accumulated) {
    uint32_t nalUnits = 0;
    MBX_TRY(MbxListCountUpTo(&array.nalUnits, UINT16_MAX, &nalUnits));
    uint64_t head = 0;
    MbxPutBits(&head, 1, array.completeness);  // bit(1) array_completeness
    MbxPutBits(&head, 1, 0);                   // bit(1) reserved = 0
    MbxPutBits(&head, 6, array.nalType);       // unsigned int(6) NAL_unit_type
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut(&bytes, head, 1);
    MbxPut16(&bytes, nalUnits);  // unsigned int(16) numNalus
    MBX_TRY(MbxWriteComposed(context, file, &bytes, accumulated));
    return MbxWriteParameterSets(context, file, &array.nalUnits, accumulated);
}

MbxStatus freeParameterSet(MbxContext* context, MbxParameterSet* set) {
    return MbxFreeBox(context, set, [&] {
        MbxBufferRelease(context, &set->bytes);
        return MBX_OK;
    });
}

MbxStatus freeHvcArray(MbxContext* context, MbxHvcCArray* array) {
    return MbxFreeBox(context, array,
                      [&] { return MbxFreeList(context, &array->nalUnits, freeParameterSet); });
}

MbxStatus appendParameterSet(MbxContext* context, MbxList<MbxParameterSet>* sets, const uint8_t* data,
                             uint64_t size) {
    return MbxMakeListItem(
        context, sets,
        [&](MbxParameterSet* set) { return MbxBufferAssign(context, 0, &set->bytes, data, size); },
        freeParameterSet);
}

// The configuration of an `avc1` entry that has one.
MbxStatus requireAvcConfig(MbxContext* context, MbxSampleEntry* entry, MbxAvcConfig** config) {
    if (MbxAnyNull(context, entry)) return MBX_ERR_INVALID_ARG;
    if (entry->kind != MBX_ENTRY_AVC1 || entry->visual.avcConfig == nullptr) return MBX_ERR_BAD_STATE;
    *config = entry->visual.avcConfig;
    return MBX_OK;
}

bool fitsFields(const MbxHvcCValues& values) {
    return values.general_profile_space < 4 && values.general_tier_flag < 2 &&
           values.general_profile_idc < 32 && values.min_spatial_segmentation_idc < 0x1000 &&
           values.parallelismType < 4 && values.chromaFormat < 4 && values.bitDepthLumaMinus8 < 8 &&
           values.bitDepthChromaMinus8 < 8 && values.constantFrameRate < 4 && values.numTemporalLayers < 8 &&
           values.temporalIdNested < 2 && values.lengthSizeMinusOne < 4;
}

}  // namespace

MbxStatus MbxBuildAvcC(MbxContext* context, const MbxOptions* options, const MbxAvcConfig* config,
                       MbxAvcCBox* box) {
    if (MbxAnyNull(context, options, config, box)) return MBX_ERR_INVALID_ARG;
    box->config = config;
    return MbxMeasureBox(context, options, box, MbxWriteAvcCPayload);
}

// ISO/IEC 14496-15 5.2.4.1 AVC Decoder Configuration Record
MbxStatus MbxWriteAvcCPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAvcCBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxAvcConfig& config = *box->config;
    uint32_t sequenceSets = 0;
    uint32_t pictureSets = 0;
    // Contract: sets-counted-at-build. The 32nd was taken.
    MBX_TRY(MbxListCountUpTo(&config.sequenceSets, 31, &sequenceSets));
    MBX_TRY(MbxListCountUpTo(&config.pictureSets, UINT8_MAX, &pictureSets));

    MbxBytes head;
    MbxBeginBytes(context, &head);
    MbxPut8(&head, config.values.configurationVersion);        // unsigned int(8) configurationVersion
    MbxPut8(&head, config.values.AVCProfileIndication);        // unsigned int(8) AVCProfileIndication
    MbxPut8(&head, config.values.profile_compatibility);       // unsigned int(8) profile_compatibility
    MbxPut8(&head, config.values.AVCLevelIndication);          // unsigned int(8) AVCLevelIndication
    MbxPut8(&head, config.values.lengthSizeMinusOne | 0xFCU);  // bit(6) reserved, unsigned int(2)
    MbxPut8(&head, sequenceSets | 0xE0U);  // bit(3) reserved, unsigned int(5) numOfSequenceParameterSets
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &head, &count));
    MBX_TRY(MbxWriteParameterSets(context, file, &config.sequenceSets, &count));

    MbxBytes middle;
    MbxBeginBytes(context, &middle);
    MbxPut8(&middle, pictureSets);  // unsigned int(8) numOfPictureParameterSets
    MBX_TRY(MbxWriteComposed(context, file, &middle, &count));
    MBX_TRY(MbxWriteParameterSets(context, file, &config.pictureSets, &count));
    if (config.values.hasExtension != 0) MBX_TRY(writeAvcExtension(context, file, config, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteAvcCBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAvcCBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("avcC"), box, MbxWriteAvcCPayload, written,
                       accumulated);
}

MbxStatus MbxFreeAvcC(MbxContext* context, MbxAvcCBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildHvcC(MbxContext* context, const MbxOptions* options, const MbxHvcCParams* params,
                       MbxHvcCBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteHvcCPayload);
}

// ISO/IEC 14496-15 8.3.3.1 HEVC Decoder Configuration Record
MbxStatus MbxWriteHvcCPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxHvcCBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxHvcCValues& values = box->params->values;
    uint32_t arrays = 0;
    MBX_TRY(MbxListCountUpTo(&box->params->arrays, UINT8_MAX, &arrays));

    uint64_t profile = 0;
    MbxPutBits(&profile, 2, values.general_profile_space);  // unsigned int(2) general_profile_space
    MbxPutBits(&profile, 1, values.general_tier_flag);      // unsigned int(1) general_tier_flag
    MbxPutBits(&profile, 5, values.general_profile_idc);    // unsigned int(5) general_profile_idc
    uint64_t layers = 0;
    MbxPutBits(&layers, 2, values.constantFrameRate);   // bit(2) constantFrameRate
    MbxPutBits(&layers, 3, values.numTemporalLayers);   // bit(3) numTemporalLayers
    MbxPutBits(&layers, 1, values.temporalIdNested);    // bit(1) temporalIdNested
    MbxPutBits(&layers, 2, values.lengthSizeMinusOne);  // unsigned int(2) lengthSizeMinusOne

    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut8(&bytes, values.configurationVersion);  // unsigned int(8) configurationVersion
    MbxPut(&bytes, profile, 1);
    MbxPut32(&bytes, values.general_profile_compatibility_flags);     // unsigned int(32)
    MbxPut48(&bytes, values.general_constraint_indicator_flags);      // unsigned int(48)
    MbxPut8(&bytes, values.general_level_idc);                        // unsigned int(8) general_level_idc
    MbxPut16(&bytes, values.min_spatial_segmentation_idc | 0xF000U);  // bit(4) reserved, unsigned int(12)
    MbxPut8(&bytes, values.parallelismType | 0xFCU);       // bit(6) reserved, unsigned int(2) parallelismType
    MbxPut8(&bytes, values.chromaFormat | 0xFCU);          // bit(6) reserved, unsigned int(2) chromaFormat
    MbxPut8(&bytes, values.bitDepthLumaMinus8 | 0xF8U);    // bit(5) reserved, unsigned int(3)
    MbxPut8(&bytes, values.bitDepthChromaMinus8 | 0xF8U);  // bit(5) reserved, unsigned int(3)
    MbxPut16(&bytes, values.avgFrameRate);                 // bit(16) avgFrameRate
    MbxPut(&bytes, layers, 1);
    MbxPut8(&bytes, arrays);  // unsigned int(8) numOfArrays
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxHvcCArray* array = box->params->arrays.first; array != nullptr; array = array->next) {
        MBX_TRY(writeHvcArray(context, file, *array, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteHvcCBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxHvcCBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("hvcC"), box, MbxWriteHvcCPayload, written,
                       accumulated);
}

MbxStatus MbxFreeHvcC(MbxContext* context, MbxHvcCBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxWriteParameterSets(MbxContext* context, MbxFile* file, const MbxList<MbxParameterSet>* sets,
                                uint64_t* accumulated) {
    for (const MbxParameterSet* set = sets->first; set != nullptr; set = set->next) {
        // Contract: long-set-is-internal. Not an overflow, as too many sets are.
        if (set->bytes.size > UINT16_MAX) return MBX_ERR_INTERNAL;
        MbxBytes length;
        MbxBeginBytes(context, &length);
        MbxPut16(&length, static_cast<uint32_t>(set->bytes.size));  // unsigned int(16) nalUnitLength
        MBX_TRY(MbxWriteComposed(context, file, &length, accumulated));
        MBX_TRY(MbxWriteBuffer(context, file, &set->bytes, accumulated));  // bit(8 * nalUnitLength) nalUnit
    }
    return MBX_OK;
}

MbxStatus MbxEntrySetAvcConfig(MbxContext* context, MbxSampleEntry* entry, const MbxAvcConfigParams* params) {
    if (MbxAnyNull(context, entry, params) || params->lengthSizeMinusOne > 3) return MBX_ERR_INVALID_ARG;
    if (params->hasExtension != 0 && (params->chroma_format > 3 || params->bit_depth_luma_minus8 > 7 ||
                                      params->bit_depth_chroma_minus8 > 7)) {
        return MBX_ERR_INVALID_ARG;
    }
    if (entry->kind != MBX_ENTRY_AVC1) return MBX_ERR_BAD_STATE;
    if (entry->visual.avcConfig == nullptr) MBX_TRY(MbxNew(context, &entry->visual.avcConfig));
    entry->visual.avcConfig->values = *params;
    return MBX_OK;
}

MbxStatus MbxEntryAddAvcSps(MbxContext* context, MbxSampleEntry* entry, const uint8_t* data, uint64_t size) {
    MbxAvcConfig* config = nullptr;
    MBX_TRY(requireAvcConfig(context, entry, &config));
    return appendParameterSet(context, &config->sequenceSets, data, size);
}

MbxStatus MbxEntryAddAvcPps(MbxContext* context, MbxSampleEntry* entry, const uint8_t* data, uint64_t size) {
    MbxAvcConfig* config = nullptr;
    MBX_TRY(requireAvcConfig(context, entry, &config));
    return appendParameterSet(context, &config->pictureSets, data, size);
}

MbxStatus MbxEntrySetHvcConfig(MbxContext* context, MbxSampleEntry* entry, const MbxHvcCValues* params) {
    if (MbxAnyNull(context, entry, params) || !fitsFields(*params)) return MBX_ERR_INVALID_ARG;
    if (entry->kind != MBX_ENTRY_HVC1) return MBX_ERR_BAD_STATE;
    if (entry->visual.hvcConfig == nullptr) MBX_TRY(MbxNew(context, &entry->visual.hvcConfig));
    entry->visual.hvcConfig->values = *params;
    return MBX_OK;
}

MbxStatus MbxEntryAddHvcNalUnit(MbxContext* context, MbxSampleEntry* entry, uint8_t nalType,
                                uint8_t completeness, const uint8_t* data, uint64_t size) {
    if (MbxAnyNull(context, entry) || nalType > 63 || completeness > 1) return MBX_ERR_INVALID_ARG;
    MbxHvcCParams* config = entry->visual.hvcConfig;
    if (entry->kind != MBX_ENTRY_HVC1 || config == nullptr) return MBX_ERR_BAD_STATE;

    MbxHvcCArray* array = nullptr;
    MBX_TRY(MbxListFind(
        config->arrays.first, [&](const MbxHvcCArray& candidate) { return candidate.nalType == nalType; },
        &array, nullptr));
    if (array != nullptr) {
        MBX_TRY(appendParameterSet(context, &array->nalUnits, data, size));
        array->completeness = completeness;
        return MBX_OK;
    }
    return MbxMakeListItem(
        context, &config->arrays,
        [&](MbxHvcCArray* made) {
            made->nalType = nalType;
            made->completeness = completeness;
            return appendParameterSet(context, &made->nalUnits, data, size);
        },
        freeHvcArray);
}

MbxStatus MbxFreeAvcConfig(MbxContext* context, MbxAvcConfig* config) {
    return MbxFreeBox(context, config, [&] {
        MBX_TRY(MbxFreeList(context, &config->sequenceSets, freeParameterSet));
        MBX_TRY(MbxFreeList(context, &config->pictureSets, freeParameterSet));
        return MbxFreeList(context, &config->sequenceExtensions, freeParameterSet);
    });
}

MbxStatus MbxFreeHvcConfig(MbxContext* context, MbxHvcCParams* params) {
    return MbxFreeBox(context, params, [&] { return MbxFreeList(context, &params->arrays, freeHvcArray); });
}
