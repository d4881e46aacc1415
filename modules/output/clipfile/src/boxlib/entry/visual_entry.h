// Sample entries of pictures: kinds 1 `mp4v`, 2 `avc1`, 11 `hvc1`.
#pragma once

#include "boxlib/entry/codec_config.h"
#include "boxlib/entry/elementary_stream.h"
#include "boxlib/entry/visual_config.h"
#include "boxlib/protection/protection.h"

struct MbxVisualEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
    MbxAvcCBox* avcC;  // kind 2
    MbxHvcCBox* hvcC;  // kind 11
    MbxEsdsBox* esds;
    Mbx3ddsBox* stereo;
    MbxRinfBox* rinf;
    MbxList<MbxSinfBox> sinf;
};

// `entry` is borrowed. MBX_ERR_BAD_STATE for kind 2 or 11 without its configuration, MBX_ERR_INTERNAL for a
// kind that is not visual.
MbxStatus MbxBuildVisualEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                              MbxVisualEntryBox* box);
MbxStatus MbxWriteVisualEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                     uint64_t position, const MbxVisualEntryBox* box, uint64_t* written,
                                     uint64_t* accumulated);
MbxStatus MbxWriteVisualEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                 uint64_t position, const MbxVisualEntryBox* box, uint64_t* written,
                                 uint64_t* accumulated);
MbxStatus MbxFreeVisualEntry(MbxContext* context, MbxVisualEntryBox* box);
