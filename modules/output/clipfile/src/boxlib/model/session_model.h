// The session: the tree of one output file.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// Size of the session's scratch: rows that fit are composed in it without an allocation.
constexpr uint64_t MBX_SCRATCH_SIZE = 8192;

// Top-level `free` and `skip` data and the like: nothing fills them.
struct MbxFileLists {};

// Item and fragment index lists at file level: nothing fills them.
struct MbxIndexLists {};

struct MbxSession {
    MbxContext* context;
    MbxOptions config;
    MbxFileType* ftyp;
    MbxFileLists fileLists;
    MbxProfile* profile;
    MbxMovie* movie;
    MbxIndexLists indexLists;
    MbxScratch scratch;
};

// The checks that the public operations share: MBX_ERR_INVALID_ARG for a null session, MBX_ERR_BAD_STATE
// without a movie.
MbxStatus MbxRequireMovie(const MbxSession* session);

// The same, and the track with that 1-based number: MBX_ERR_INVALID_ARG for 0, MBX_ERR_NOT_FOUND beyond the
// list.
MbxStatus MbxRequireTrack(const MbxSession* session, uint32_t index, MbxTrack** track);
