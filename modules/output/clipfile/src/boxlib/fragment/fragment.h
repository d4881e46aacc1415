// The fragment engine: sealing what was entered, placing it, writing it as `moof`, releasing it; and `moof`
// with `mfhd`.
//
// A fragment is open while samples arrive, then sealed, placed (offsets shifted, base set), written and
// released, in this order. Fragment numbers are 1-based; number 0 is what `moov` reports.
#pragma once

#include "boxlib/fragment/track_fragment.h"
#include "boxlib/sample/sample_segment.h"

// ---- The session's operations on fragments
// -------------------------------------------------------------------------
//
// What the operations of the same names do to the movie. MBX_ERR_INVALID_ARG for a null argument.

MbxStatus MbxMovieShiftFragmentOffsets(MbxContext* context, const MbxOptions* options, MbxMovie* movie,
                                       uint32_t fragment, uint32_t track, uint32_t chunk, int64_t delta);
MbxStatus MbxMovieSetFragmentBase(MbxContext* context, MbxMovie* movie, uint32_t fragment, uint64_t position);

// Nothing changes on failure.
MbxStatus MbxMovieSealFirstFragment(MbxContext* context, MbxMovie* movie);
MbxStatus MbxMovieSealFragment(MbxContext* context, MbxMovie* movie);

MbxStatus MbxMovieReleaseFragment(MbxContext* context, MbxMovie* movie, uint32_t fragment);

// In base_offset_mode 0 the chunk offsets of a fragment are positions in the file; in modes 1 and 2 they
// count from the first byte of its `moof`.
MbxStatus MbxMovieWriteMoof(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                            const MbxMovie* movie, MbxFile* file, uint32_t fragment, uint64_t position,
                            uint64_t* size);

// ---- Boxes
// ---------------------------------------------------------------------------------------------------------

struct MbxMfhdParams {
    uint32_t sequenceNumber;
};

struct MbxMoofParams {
    const MbxMovie* movie;
    uint32_t fragment;
};

struct MbxMfhdBox {
    uint64_t size;
    MbxMfhdParams params;
};

struct MbxMoofBox {
    uint64_t size;
    MbxMfhdBox* mfhd;
    MbxList<MbxTrafBox> traf;
};

// `mfhd`, mandatory.
MbxStatus MbxBuildMfhd(MbxContext* context, const MbxOptions* options, const MbxMfhdParams* params,
                       MbxMfhdBox* box);
MbxStatus MbxWriteMfhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMfhdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMfhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMfhdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMfhd(MbxContext* context, MbxMfhdBox* box);

// `moof`, mandatory. A track without a chunk in the fragment has no `traf`.
MbxStatus MbxBuildMoof(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxMoofParams* params, MbxMoofBox* box);
MbxStatus MbxWriteMoofPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxMoofBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMoofBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxMoofBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeMoof(MbxContext* context, MbxMoofBox* box);
