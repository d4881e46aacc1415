// The media header of a track by its handler: `vmhd`, `smhd`, `sthd`, `nmhd`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// The record of all four. The code says which it is.
struct MbxMediaInformationBox {
    uint64_t size;
    MbxMediaInformation values;
};

// By the code of the record; MBX_ERR_INTERNAL for an unknown one.
MbxStatus MbxMakeMediaInformation(MbxContext* context, const MbxOptions* options,
                                  const MbxMediaInformation* information, MbxMediaInformationBox* box);
MbxStatus MbxWriteMediaInformation(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxMediaInformationBox* box, uint64_t* written,
                                   uint64_t* accumulated);
MbxStatus MbxFreeMediaInformation(MbxContext* context, MbxMediaInformationBox* box);

// Each of the following is MBX_ERR_INTERNAL for a record of another code.
MbxStatus MbxBuildVmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box);
MbxStatus MbxWriteVmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteVmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeVmhd(MbxContext* context, MbxMediaInformationBox* box);

MbxStatus MbxBuildSmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box);
MbxStatus MbxWriteSmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSmhd(MbxContext* context, MbxMediaInformationBox* box);

MbxStatus MbxBuildSthd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box);
MbxStatus MbxWriteSthdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSthdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSthd(MbxContext* context, MbxMediaInformationBox* box);

MbxStatus MbxBuildNmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box);
MbxStatus MbxWriteNmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteNmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeNmhd(MbxContext* context, MbxMediaInformationBox* box);
