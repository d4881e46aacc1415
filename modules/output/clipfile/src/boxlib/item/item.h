// Items of a movie: `xml `, `iloc`, `idat`, and `meta` that holds them (ISO/IEC 14496-12 8.11).
#pragma once

#include "boxlib/model/item_model.h"
#include "boxlib/track/media.h"

struct MbxXmlBox {
    uint64_t size;
    const MbxXmlParams* params;
};

struct MbxIlocBox {
    uint64_t size;
    const MbxIlocParams* params;
};

struct MbxIdatBox {
    uint64_t size;
    const MbxIdatParams* params;
};

struct MbxMetaBox {
    uint64_t size;
    MbxHdlrBox* hdlr;
    MbxXmlBox* xml;  // null for none, as are the following
    MbxIlocBox* iloc;
    MbxIdatBox* idat;
};

// `xml `, optional. `params` is borrowed, as in the following.
MbxStatus MbxBuildXml(MbxContext* context, const MbxOptions* options, const MbxXmlParams* params,
                      MbxXmlBox* box);
MbxStatus MbxWriteXmlPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxXmlBox* box,
                             uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteXmlBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxXmlBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeXml(MbxContext* context, MbxXmlBox* box);

// `iloc`, optional. MBX_ERR_OVERFLOW for more than 65535 items or extents of one, MBX_ERR_INTERNAL for a size
// other than 0, 4 and 8. Values are cut to the size of their field.
MbxStatus MbxBuildIloc(MbxContext* context, const MbxOptions* options, const MbxIlocParams* params,
                       MbxIlocBox* box);
MbxStatus MbxWriteIlocPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIlocBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteIlocBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIlocBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeIloc(MbxContext* context, MbxIlocBox* box);

// `idat`, optional.
MbxStatus MbxBuildIdat(MbxContext* context, const MbxOptions* options, const MbxIdatParams* params,
                       MbxIdatBox* box);
MbxStatus MbxWriteIdatPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIdatBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteIdatBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIdatBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeIdat(MbxContext* context, MbxIdatBox* box);

// `meta`, optional in `moov`. MBX_ERR_INVALID_ARG without a handler.
MbxStatus MbxBuildMeta(MbxContext* context, const MbxOptions* options, const MbxMetaParams* params,
                       MbxMetaBox* box);
MbxStatus MbxWriteMetaPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMetaBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMetaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetaBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMeta(MbxContext* context, MbxMetaBox* box);
