// The file's profile: the `uuid` box `PROF` behind `ftyp`, and the boxes in it. These are this system's own.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

struct MbxFprfBox {
    uint64_t size;
    uint32_t format;
};

// The record of `APRF`, `VPRF`, `BPRF` and `PPRF`, which differ in their number of values.
struct MbxProfileEntryBox {
    uint64_t size;
    uint32_t code;
    uint32_t values[10];
    MbxProfileEntryBox* next;
};

struct MbxPrexBox {
    uint64_t size;
    const MbxProfileExtra* extra;  // borrowed
    MbxPrexBox* next;
};

struct MbxProfBox {
    uint64_t size;
    MbxFprfBox* fprf;  // null without a profile, and then nothing follows
    MbxList<MbxProfileEntryBox> entries;
    MbxList<MbxPrexBox> extras;
};

// Without a profile (null) the box holds an entry count of 0. MBX_ERR_INTERNAL for an unknown code in the
// list.
MbxStatus MbxBuildProf(MbxContext* context, const MbxOptions* options, const MbxProfile* profile,
                       MbxProfBox* box);
MbxStatus MbxWriteProfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxProfBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteProfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeProf(MbxContext* context, MbxProfBox* box);

MbxStatus MbxBuildFprf(MbxContext* context, const MbxOptions* options, const MbxProfile* profile,
                       MbxFprfBox* box);
MbxStatus MbxWriteFprfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFprfBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteFprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFprfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeFprf(MbxContext* context, MbxFprfBox* box);

// Each of the four is MBX_ERR_INTERNAL for an entry or record of another code.
MbxStatus MbxBuildAprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box);
MbxStatus MbxWriteAprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteAprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeAprf(MbxContext* context, MbxProfileEntryBox* box);

MbxStatus MbxBuildVprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box);
MbxStatus MbxWriteVprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteVprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeVprf(MbxContext* context, MbxProfileEntryBox* box);

MbxStatus MbxBuildBprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box);
MbxStatus MbxWriteBprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteBprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeBprf(MbxContext* context, MbxProfileEntryBox* box);

MbxStatus MbxBuildPprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box);
MbxStatus MbxWritePprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWritePprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreePprf(MbxContext* context, MbxProfileEntryBox* box);

MbxStatus MbxBuildPrex(MbxContext* context, const MbxOptions* options, const MbxProfileExtra* extra,
                       MbxPrexBox* box);
MbxStatus MbxWritePrexPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxPrexBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWritePrexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxPrexBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreePrex(MbxContext* context, MbxPrexBox* box);

// Appends an entry to the profile's list.
MbxStatus MbxAddProfileEntry(MbxContext* context, MbxProfile* profile, uint32_t code, const uint32_t* values,
                             uint32_t count);

// Releases the record with its lists; null is allowed.
MbxStatus MbxFreeProfile(MbxContext* context, MbxProfile* profile);
