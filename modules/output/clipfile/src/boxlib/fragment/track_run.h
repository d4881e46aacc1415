// `trun`: the samples of one chunk of a fragment, told by where they differ from the defaults of their
// `tfhd`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/sample/sample_cursor.h"

// Bits of the flags of `tfhd` (ISO/IEC 14496-12 8.8.7).
enum MbxTfhdFlag : uint32_t {
    MBX_TFHD_BASE_DATA_OFFSET = 0x000001,
    MBX_TFHD_DESCRIPTION_INDEX = 0x000002,
    MBX_TFHD_DURATION = 0x000008,
    MBX_TFHD_SIZE = 0x000010,
    MBX_TFHD_FLAGS = 0x000020,
    MBX_TFHD_BASE_IS_MOOF = 0x020000,
};

// The defaults of a track fragment, in effect whether `tfhd` carries them or `trex` does.
struct MbxTfhdValues {
    uint32_t flags;  // MbxTfhdFlag bits
    uint32_t trackId;
    uint64_t baseDataOffset;  // what the offsets of the runs count from
    uint32_t sampleDescriptionIndex;
    uint32_t defaultSampleDuration;
    uint32_t defaultSampleSize;
    uint32_t defaultSampleFlags;
};

// Bits of the flags of `trun` (ISO/IEC 14496-12 8.8.8).
enum MbxTrunFlag : uint32_t {
    MBX_TRUN_DATA_OFFSET = 0x000001,
    MBX_TRUN_FIRST_FLAGS = 0x000004,
    MBX_TRUN_DURATION = 0x000100,
    MBX_TRUN_SIZE = 0x000200,
    MBX_TRUN_FLAGS = 0x000400,
    MBX_TRUN_COMPOSITION_OFFSET = 0x000800,
};

// What the next run is made from. Building moves cursor and position on, so that the next run can be built.
struct MbxTrunParams {
    const MbxTfhdValues* defaults;
    MbxSampleCursor* cursor;  // at the first sample of the chunk
    uint64_t* position;       // just behind the data of the run before; at first the base data offset
};

struct MbxTrunBox {
    uint64_t size;
    MbxTfhdValues defaults;
    MbxSampleCursor cursor;  // where the run begins: rows are made from the tables whenever they are written
    uint64_t position;
    MbxTrunBox* next;
};

// `trun`, mandatory where it stands in a list. MBX_ERR_NOT_FOUND when a table of the segment holds fewer
// samples than its chunks; MBX_ERR_OVERFLOW in base_offset_mode 0 for a run further than 2^31 - 1 ahead of
// the base, or 2^31 behind. The rows are composed in the scratch when they fit in it.
MbxStatus MbxBuildTrun(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTrunParams* params, MbxTrunBox* box);
MbxStatus MbxWriteTrunPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxTrunBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteTrunBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTrunBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeTrun(MbxContext* context, MbxTrunBox* box);
