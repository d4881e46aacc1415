// Sample groups and sub-samples: their boxes in `stbl` and `traf`. Rows are composed in the scratch when they
// fit in it; a null scratch makes every table allocate.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/sample/sample_group_model.h"

struct MbxSbgpBox {
    uint64_t size;
    const MbxSampleGroupParams* params;  // borrowed, as are the following
    MbxSbgpBox* next;
};

struct MbxSgpdBox {
    uint64_t size;
    const MbxGroupDescriptionParams* params;
    MbxSgpdBox* next;
};

struct MbxSubsBox {
    uint64_t size;
    uint32_t version;
    const MbxSubSampleParams* first;
};

// 8.9.2 Sample to Group Box; mandatory where it stands in a list.
MbxStatus MbxBuildSbgp(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSampleGroupParams* params, MbxSbgpBox* box);
MbxStatus MbxWriteSbgpPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSbgpBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSbgpBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSbgpBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeSbgp(MbxContext* context, MbxSbgpBox* box);

// 8.9.3 Sample Group Description Box. MBX_ERR_INTERNAL for an entry that is not raw and whose grouping type
// is neither `seig` nor `tele`.
MbxStatus MbxBuildSgpd(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxGroupDescriptionParams* params, MbxSgpdBox* box);
MbxStatus MbxWriteSgpdPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSgpdBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSgpdBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSgpdBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeSgpd(MbxContext* context, MbxSgpdBox* box);

// 8.7.7 Sub-Sample Information Box, over all entries from `params` on; optional. MBX_ERR_OVERFLOW for more
// than 65535 sub-samples in one sample, MBX_ERR_BAD_STATE for a size that the mode cannot carry.
MbxStatus MbxBuildSubs(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSubSampleParams* params, MbxSubsBox* box);
MbxStatus MbxWriteSubsPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSubsBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSubsBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSubsBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeSubs(MbxContext* context, MbxSubsBox* box);
