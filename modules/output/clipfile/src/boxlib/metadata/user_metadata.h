// Typed metadata of the movie and of tracks: the `uuid` box `USMT` with `MTDT`, `MTDF`, and its metadata
// tracks `MTSM` with `MTHD` and `MDST`. These are this system's own.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/entry/sample_description.h"
#include "boxlib/model/model.h"
#include "boxlib/sample/data_reference.h"

// The record of `MTDT` and `MTDF`.
struct MbxMetadataItemsBox {
    uint64_t size;
    const MbxMetadataItem* first;  // borrowed, as are the items behind it
};

struct MbxMthdBox {
    uint64_t size;
    MbxMetadataTrackHeader values;
};

struct MbxMdstBox {
    uint64_t size;
    const MbxMetadataTrackEntry* first;  // borrowed, as are the entries behind it
};

struct MbxMtsmBox {
    uint64_t size;
    MbxMthdBox* mthd;
    MbxDinfBox* dinf;
    MbxStsdBox* stsd;
    MbxMdstBox* mdst;
    MbxMtsmBox* next;
};

struct MbxUserMetadataBox {
    uint64_t size;
    MbxMetadataItemsBox* mtdf;  // null without such items, as is the next
    MbxMetadataItemsBox* mtdt;
    MbxList<MbxMtsmBox> tracks;
};

// `USMT`. Optional: it is absent where all lists are empty.
MbxStatus MbxBuildUserMetadata(MbxContext* context, const MbxOptions* options, const MbxUserMetadata* lists,
                               MbxUserMetadataBox* box);
MbxStatus MbxWriteUserMetadataPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                      uint64_t position, const MbxUserMetadataBox* box, uint64_t* written,
                                      uint64_t* accumulated);
MbxStatus MbxWriteUserMetadataBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                  uint64_t position, const MbxUserMetadataBox* box, uint64_t* written,
                                  uint64_t* accumulated);
MbxStatus MbxFreeUserMetadata(MbxContext* context, MbxUserMetadataBox* box);

// MBX_ERR_OVERFLOW for more than 65535 items, MBX_ERR_INTERNAL for an item above 65535 bytes. The two boxes
// differ in that `MTDF` never carries an item's flag. Both are optional.
MbxStatus MbxBuildMtdt(MbxContext* context, const MbxOptions* options, const MbxList<MbxMetadataItem>* items,
                       MbxMetadataItemsBox* box);
MbxStatus MbxWriteMtdtPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMtdtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMtdt(MbxContext* context, MbxMetadataItemsBox* box);

MbxStatus MbxBuildMtdf(MbxContext* context, const MbxOptions* options, const MbxList<MbxMetadataItem>* items,
                       MbxMetadataItemsBox* box);
MbxStatus MbxWriteMtdfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMtdfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMtdf(MbxContext* context, MbxMetadataItemsBox* box);

// Optional.
MbxStatus MbxBuildMtsm(MbxContext* context, const MbxOptions* options, const MbxMetadataTrack* track,
                       MbxMtsmBox* box);
MbxStatus MbxWriteMtsmPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMtsmBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMtsmBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMtsmBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMtsm(MbxContext* context, MbxMtsmBox* box);

// The version is the record's own.
MbxStatus MbxBuildMthd(MbxContext* context, const MbxOptions* options, const MbxMetadataTrackHeader* header,
                       MbxMthdBox* box);
MbxStatus MbxWriteMthdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMthdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMthdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMthdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMthd(MbxContext* context, MbxMthdBox* box);

MbxStatus MbxBuildMdst(MbxContext* context, const MbxOptions* options,
                       const MbxList<MbxMetadataTrackEntry>* entries, MbxMdstBox* box);
MbxStatus MbxWriteMdstPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMdstBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMdstBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdstBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMdst(MbxContext* context, MbxMdstBox* box);

// Most data that one item carries: 65535 less its header, flag, language and encoding.
constexpr uint64_t MBX_METADATA_DATA_LIMIT = 65525;

// Whether any of the three lists holds something.
bool MbxHasUserMetadata(const MbxUserMetadata* lists);

// Puts an item: one of the same type, language and encoding is given the new flag and data, otherwise it is
// appended. `count` receives the length of the list. MBX_ERR_INVALID_ARG, before anything is allocated, for a
// null argument, a flag of 2 or more, a language of 32768 or more, data above the limit, or a length without
// data. The list is as before after a failure, but a replaced item has lost its data.
MbxStatus MbxPutMetadataItem(MbxContext* context, MbxList<MbxMetadataItem>* list,
                             const MbxMetadataItemParams* params, uint32_t* count);

// Sets the times that the MBX_TIME_METADATA bits of `selector` name. MBX_ERR_BAD_STATE for a time above 32
// bits, whatever the mode.
MbxStatus MbxSetMetadataTrackTimes(MbxMetadataTrack* track, uint32_t selector, uint64_t creation,
                                   uint64_t modification);

// Releases what the lists hold.
MbxStatus MbxReleaseUserMetadata(MbxContext* context, MbxUserMetadata* lists);
