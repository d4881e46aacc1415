// Sample groups and sub-samples as a segment keeps them. No session operation fills them: whoever needs them
// hangs them on the segment's lists, which own them from then on.
#pragma once

#include "boxlib/model/sample_model.h"

struct MbxSampleGroupRow {
    uint32_t sampleCount;
    uint32_t groupDescriptionIndex;
};

// One `sbgp`.
struct MbxSampleGroupParams {
    uint32_t version;  // 1: with a grouping type parameter
    uint32_t flags;    // low 24 bits
    uint32_t groupingType;
    uint32_t groupingTypeParameter;
    MbxBlockList rows;  // of MbxSampleGroupRow
    MbxSampleGroupParams* next;
};

// One entry of `sgpd`, of which each form uses its part.
struct MbxGroupDescription {
    MbxBuffer raw;                        // with hasRawEntries: the entry's bytes
    uint32_t isEncrypted;                 // `seig`: low 24 bits
    uint8_t ivSize;                       // `seig`: in bytes
    uint8_t keyId[16];                    // `seig`
    uint8_t levelIndependentlyDecodable;  // `tele`: below 2
    MbxGroupDescription* next;
};

// One `sgpd`.
struct MbxGroupDescriptionParams {
    uint32_t groupingType;
    uint32_t hasRawEntries;  // 0: the grouping type says what the entries hold
    MbxList<MbxGroupDescription> entries;
    MbxGroupDescriptionParams* next;
};

struct MbxSubSample {
    uint32_t size;  // in bytes
    uint8_t priority;
    uint8_t discardable;
    MbxSubSample* next;
};

// The sub-samples of one sample.
struct MbxSubSampleParams {
    uint32_t sampleDelta;  // samples since the previous entry
    MbxList<MbxSubSample> subSamples;
    MbxSubSampleParams* next;
};

// Releases the groups, descriptions and sub-samples of a segment. Safe to call twice.
MbxStatus MbxReleaseSampleGroups(MbxContext* context, MbxSampleSegment* segment);
