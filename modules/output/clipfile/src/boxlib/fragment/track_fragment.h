// `traf`: the samples of one track in one fragment.
#pragma once

#include "boxlib/fragment/track_fragment_header.h"
#include "boxlib/sample/auxiliary_information.h"
#include "boxlib/sample/sample_group.h"

// What a track fragment is made from. Building moves the running base to the end of its data.
struct MbxTrafParams {
    const MbxTrack* track;
    const MbxSampleSegment* segment;
    uint64_t* runningBase;
};

struct MbxTrafBox {
    uint64_t size;
    MbxTfhdBox* tfhd;
    MbxTfdtBox* tfdt;  // null unless tfdt_mode is 1
    MbxTrikBox* trik;  // null on a track without trick play bytes
    MbxList<MbxTrunBox> trun;
    MbxAvcnBox* avcn;  // null unless the fragment has an AVC configuration of its own
    MbxSencBox* senc;  // null without auxiliary information, as are the two that follow
    MbxSaioBox* saio;
    MbxSaizBox* saiz;
    MbxList<MbxSbgpBox> sbgp;
    MbxList<MbxSgpdBox> sgpd;
    MbxSubsBox* subs;  // null without sub-samples
    MbxTrafBox* next;
};

// `traf`, mandatory where it stands in a list; the segment has at least one chunk. One `trun` per chunk.
MbxStatus MbxBuildTraf(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTrafParams* params, MbxTrafBox* box);
MbxStatus MbxWriteTrafPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxTrafBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteTrafBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTrafBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeTraf(MbxContext* context, MbxTrafBox* box);
