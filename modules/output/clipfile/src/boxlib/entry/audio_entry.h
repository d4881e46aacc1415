// The sample entry of sound: kind 3 `mp4a`.
#pragma once

#include "boxlib/entry/audio_config.h"
#include "boxlib/entry/elementary_stream.h"
#include "boxlib/protection/protection.h"

struct MbxAudioEntryBox {
    uint64_t size;
    uint32_t version;
    uint32_t sampleRate;  // 16.16
    const MbxSampleEntry* entry;
    MbxSratBox* srat;
    MbxEsdsBox* esds;
    MbxDdtsBox* ddts;
    MbxDac3Box* dac3;
    MbxDec3Box* dec3;
    MbxFcfgBox* fcfg;
    MbxList<MbxSinfBox> sinf;
};

// `version` is that of `stsd`; the sample rate is `timescale`, that of the track, unless the entry has one of
// its own. `entry` is borrowed. MBX_ERR_BAD_STATE for a timescale above 65535 that would be the sample rate.
MbxStatus MbxBuildAudioEntry(MbxContext* context, const MbxOptions* options, uint32_t timescale,
                             uint32_t version, const MbxSampleEntry* entry, MbxAudioEntryBox* box);
MbxStatus MbxWriteAudioEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                    uint64_t position, const MbxAudioEntryBox* box, uint64_t* written,
                                    uint64_t* accumulated);
MbxStatus MbxWriteAudioEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                uint64_t position, const MbxAudioEntryBox* box, uint64_t* written,
                                uint64_t* accumulated);
MbxStatus MbxFreeAudioEntry(MbxContext* context, MbxAudioEntryBox* box);
