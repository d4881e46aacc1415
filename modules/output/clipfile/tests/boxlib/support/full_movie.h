// A movie with a track of every handler that the library knows, small enough to be built thousands of times.
#pragma once

#include "boxlib/support/memory_host.h"

// Fills a new session with file type, profile, movie, tracks, entries with their configuration, references,
// user metadata, edits, times and samples. Ends at the first status that is not MBX_OK.
MbxStatus BuildFullMovie(MbxSession* session);

// Writes `ftyp`, `uuid`, an `mdat` of samples that are left out, and `moov`, each measured first.
// MBX_ERR_INTERNAL when a box has another size than measured.
MbxStatus WriteFullMovie(MbxSession* session, MbxFile* file);

// The number of its tracks.
constexpr uint32_t kFullMovieTracks = 9;
