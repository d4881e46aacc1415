// `stbl`: what `moov` reports about a track's samples.
#pragma once

#include "boxlib/entry/sample_description.h"
#include "boxlib/model/model.h"
#include "boxlib/sample/auxiliary_information.h"
#include "boxlib/sample/sample_group.h"
#include "boxlib/sample/sample_layout.h"
#include "boxlib/sample/sample_times.h"

struct MbxStblBox {
    uint64_t size;
    MbxStsdBox* stsd;
    MbxSttsBox* stts;
    MbxCttsBox* ctts;  // null for none, as are stss and sdtp
    MbxStscBox* stsc;
    MbxStszBox* stsz;
    MbxStcoBox* stco;  // one of the two
    MbxCo64Box* co64;
    MbxStssBox* stss;
    MbxSdtpBox* sdtp;
    MbxSaioBox* saio;  // null without auxiliary information, as is saiz
    MbxSaizBox* saiz;
    MbxList<MbxSbgpBox> sampleGroups;
    MbxList<MbxSgpdBox> groupDescriptions;
};

// Takes all tables from the track's first segment; without one they are empty. MBX_ERR_BAD_STATE when an
// offset needs 64 bits in chunk_offset_mode 0.
MbxStatus MbxBuildStbl(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxStblBox* box);
MbxStatus MbxWriteStblPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxStblBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteStblBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStblBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStbl(MbxContext* context, MbxStblBox* box);
