// The callbacks of a host with the C library: files through stdio, memory through malloc.
//
// Nothing in the library needs this; a host may install its own table instead.
#pragma once

#include <cstdio>

#include "boxlib/mbx_types.h"

// The cell behind the opaque handle. Whoever opened it flushes and closes the stream and releases the cell
// with free(); the library never does.
struct MbxFile {
    std::FILE* stream;
};

// Creates the file or truncates it, for reading and writing with 64-bit positions. `path` is UTF-8; `unused`
// is ignored. The file is locked against other writers that use advisory locks (flock) before anything is
// truncated, until the stream is closed; on a file system without locks it is opened all the same.
// MBX_ERR_INVALID_ARG for a null argument or a path that is not UTF-8, MBX_ERR_NO_MEMORY, MBX_ERR_IO when the
// file cannot be opened or another writer holds it, which leaves it untouched.
MbxStatus MbxOpenFile(const char* path, uint32_t unused, MbxFile** file);

// Fills the table with the routines below and with null `user_data`.
void MbxStdioCallbacks(MbxCallbacks* callbacks);

// The I/O callbacks. MBX_ERR_INVALID_ARG for a null file, stream, buffer or result and for an origin above 2.
// `size` counts as a signed 32-bit number: a call moves at most 2^31 - 1 bytes and is MBX_ERR_IO beyond.
// MBX_ERR_IO when fewer bytes than asked were moved (`count` tells how many), or when the stream cannot be
// positioned.
MbxStatus MbxStdioRead(MbxFile* file, void* buffer, uint64_t size, uint64_t* count);
MbxStatus MbxStdioWrite(MbxFile* file, const void* buffer, uint64_t size, uint64_t* count);
MbxStatus MbxStdioSeek(MbxFile* file, int64_t offset, uint32_t origin);
MbxStatus MbxStdioTell(MbxFile* file, uint64_t* position);
// Leaves the stream where it stood.
MbxStatus MbxStdioSize(MbxFile* file, uint64_t* length);
