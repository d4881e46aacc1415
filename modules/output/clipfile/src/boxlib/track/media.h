// The media of a track: `mdia` with `mdhd`, `hdlr` and `minf`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"
#include "boxlib/sample/data_reference.h"
#include "boxlib/sample/sample_table.h"
#include "boxlib/track/media_header.h"

struct MbxMdhdBox {
    uint64_t size;
    uint32_t version;
    MbxMediaHeader values;
};

struct MbxHdlrBox {
    uint64_t size;
    const MbxHandler* handler;  // borrowed
};

struct MbxMinfBox {
    uint64_t size;
    MbxMediaInformationBox* mediaInformation;
    MbxDinfBox* dinf;
    MbxStblBox* stbl;
};

struct MbxMdiaBox {
    uint64_t size;
    MbxMdhdBox* mdhd;
    MbxHdlrBox* hdlr;
    MbxMinfBox* minf;
};

MbxStatus MbxBuildMdia(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMdiaBox* box);
MbxStatus MbxWriteMdiaPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMdiaBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMdiaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdiaBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMdia(MbxContext* context, MbxMdiaBox* box);

// The duration is computed unless it was given.
MbxStatus MbxBuildMdhd(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMdhdBox* box);
MbxStatus MbxWriteMdhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMdhdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMdhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdhdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMdhd(MbxContext* context, MbxMdhdBox* box);

MbxStatus MbxBuildHdlr(MbxContext* context, const MbxOptions* options, const MbxHandler* handler,
                       MbxHdlrBox* box);
MbxStatus MbxWriteHdlrPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxHdlrBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteHdlrBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxHdlrBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeHdlr(MbxContext* context, MbxHdlrBox* box);

MbxStatus MbxBuildMinf(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMinfBox* box);
MbxStatus MbxWriteMinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMinfBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMinfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMinf(MbxContext* context, MbxMinfBox* box);

// The track's media duration in its own ticks: the one given, else the decode time that its first sample
// segment reaches, 0 without one. MBX_ERR_OVERFLOW beyond 64 bits.
MbxStatus MbxComputeMediaDuration(const MbxTrack* track, uint64_t* duration);
