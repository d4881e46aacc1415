// Sample entries of neither pictures nor sound. In each, `entry` is borrowed.
#pragma once

#include "boxlib/entry/elementary_stream.h"
#include "boxlib/entry/visual_config.h"
#include "boxlib/protection/protection.h"

struct MbxSystemsEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
    MbxEsdsBox* esds;
};

struct MbxPlainEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
};

// Either the raw tail of its entry or every `sinf`.
struct MbxMetaEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
    MbxList<MbxSinfBox> sinf;
};

struct MbxGraphicsEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
    Mbx3stpBox* step;  // kind 9
};

struct MbxTextEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
    MbxBtrtBox* btrt;
    MbxList<MbxSinfBox> sinf;
};

struct MbxTimecodeEntryBox {
    uint64_t size;
    const MbxSampleEntry* entry;
};

// Kind 4.
MbxStatus MbxBuildSystemsEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                               MbxSystemsEntryBox* box);
MbxStatus MbxWriteSystemsEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                      uint64_t position, const MbxSystemsEntryBox* box, uint64_t* written,
                                      uint64_t* accumulated);
MbxStatus MbxWriteSystemsEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                  uint64_t position, const MbxSystemsEntryBox* box, uint64_t* written,
                                  uint64_t* accumulated);
MbxStatus MbxFreeSystemsEntry(MbxContext* context, MbxSystemsEntryBox* box);

// Kinds 5 and 7.
MbxStatus MbxBuildPlainEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                             MbxPlainEntryBox* box);
MbxStatus MbxWritePlainEntryPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                    const MbxPlainEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWritePlainEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                uint64_t position, const MbxPlainEntryBox* box, uint64_t* written,
                                uint64_t* accumulated);
MbxStatus MbxFreePlainEntry(MbxContext* context, MbxPlainEntryBox* box);

// Kind 6, `rtmd`.
MbxStatus MbxBuildMetaEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                            MbxMetaEntryBox* box);
MbxStatus MbxWriteMetaEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxMetaEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated);
MbxStatus MbxWriteMetaEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxMetaEntryBox* box, uint64_t* written,
                               uint64_t* accumulated);
MbxStatus MbxFreeMetaEntry(MbxContext* context, MbxMetaEntryBox* box);

// Kinds 8 and 9. MBX_ERR_BAD_STATE for kind 9 without its `3STP`.
MbxStatus MbxBuildGraphicsEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                                MbxGraphicsEntryBox* box);
MbxStatus MbxWriteGraphicsEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                       uint64_t position, const MbxGraphicsEntryBox* box, uint64_t* written,
                                       uint64_t* accumulated);
MbxStatus MbxWriteGraphicsEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxGraphicsEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated);
MbxStatus MbxFreeGraphicsEntry(MbxContext* context, MbxGraphicsEntryBox* box);

// Kind 10.
MbxStatus MbxBuildTextEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                            MbxTextEntryBox* box);
MbxStatus MbxWriteTextEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxTextEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated);
MbxStatus MbxWriteTextEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxTextEntryBox* box, uint64_t* written,
                               uint64_t* accumulated);
MbxStatus MbxFreeTextEntry(MbxContext* context, MbxTextEntryBox* box);

// Kind 12, `tmcd`.
MbxStatus MbxBuildTimecodeEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                                MbxTimecodeEntryBox* box);
MbxStatus MbxWriteTimecodeEntryPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                       const MbxTimecodeEntryBox* box, uint64_t* written,
                                       uint64_t* accumulated);
MbxStatus MbxWriteTimecodeEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxTimecodeEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated);
MbxStatus MbxFreeTimecodeEntry(MbxContext* context, MbxTimecodeEntryBox* box);
