// Decoder configuration of H.264 and H.265 entries (ISO/IEC 14496-15): `avcC` and `hvcC`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/entry_model.h"

struct MbxAvcCBox {
    uint64_t size;
    const MbxAvcConfig* config;
};

struct MbxHvcCBox {
    uint64_t size;
    const MbxHvcCParams* params;
};

// `avcC`, mandatory in `avc1`. `config` is borrowed. MBX_ERR_OVERFLOW for more than 31 sequence, 255 picture
// or 255 extension parameter sets, MBX_ERR_INTERNAL for a set above 65535 bytes.
MbxStatus MbxBuildAvcC(MbxContext* context, const MbxOptions* options, const MbxAvcConfig* config,
                       MbxAvcCBox* box);
MbxStatus MbxWriteAvcCPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAvcCBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteAvcCBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAvcCBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeAvcC(MbxContext* context, MbxAvcCBox* box);

// `hvcC`, mandatory in `hvc1`. `params` is borrowed. MBX_ERR_OVERFLOW for more than 255 arrays or 65535 NAL
// units in one, MBX_ERR_INTERNAL for a NAL unit above 65535 bytes.
MbxStatus MbxBuildHvcC(MbxContext* context, const MbxOptions* options, const MbxHvcCParams* params,
                       MbxHvcCBox* box);
MbxStatus MbxWriteHvcCPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxHvcCBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteHvcCBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxHvcCBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeHvcC(MbxContext* context, MbxHvcCBox* box);

// Writes 16-bit length and bytes of each set, where the stream stands. MBX_ERR_INTERNAL for a length above
// 65535.
MbxStatus MbxWriteParameterSets(MbxContext* context, MbxFile* file, const MbxList<MbxParameterSet>* sets,
                                uint64_t* accumulated);

// What the session's operations of the same names do to an entry. MBX_ERR_INVALID_ARG for a null argument, a
// value out of its range or a length without a pointer, MBX_ERR_BAD_STATE for an entry of another kind; a
// call that fails leaves the entry as it was. Sets and NAL units need the configuration to be set before
// (MBX_ERR_BAD_STATE).
MbxStatus MbxEntrySetAvcConfig(MbxContext* context, MbxSampleEntry* entry, const MbxAvcConfigParams* params);
MbxStatus MbxEntryAddAvcSps(MbxContext* context, MbxSampleEntry* entry, const uint8_t* data, uint64_t size);
MbxStatus MbxEntryAddAvcPps(MbxContext* context, MbxSampleEntry* entry, const uint8_t* data, uint64_t size);
MbxStatus MbxEntrySetHvcConfig(MbxContext* context, MbxSampleEntry* entry, const MbxHvcCValues* params);
MbxStatus MbxEntryAddHvcNalUnit(MbxContext* context, MbxSampleEntry* entry, uint8_t nalType,
                                uint8_t completeness, const uint8_t* data, uint64_t size);

// Release a configuration with its sets. MBX_ERR_INVALID_ARG for a null context; a null record is MBX_OK.
MbxStatus MbxFreeAvcConfig(MbxContext* context, MbxAvcConfig* config);
MbxStatus MbxFreeHvcConfig(MbxContext* context, MbxHvcCParams* params);
