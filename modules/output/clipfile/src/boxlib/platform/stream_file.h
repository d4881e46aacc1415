// What the stdio of systems has in forms of its own: files locked against other writers, and positions of 64
// bits. Each system has a folder beside this file, which alone includes headers of that system.
#pragma once

#include <cstdint>
#include <cstdio>

// Opens the file at `path`, a native one, for reading and writing; creates it, or truncates it once it is
// locked against other writers. A file system without locks protects nothing, but can be written to. Null
// when the file cannot be opened or another writer holds it, which leaves it untouched.
std::FILE* MbxOpenStream(const char* path);

// `origin`: SEEK_SET, SEEK_CUR or SEEK_END. False when the stream cannot be positioned.
bool MbxSeekStream(std::FILE* stream, int64_t offset, int origin);

// Negative when the position cannot be told.
int64_t MbxTellStream(std::FILE* stream);
