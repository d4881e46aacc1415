// Stream primitives and box headers. A null file only measures: nothing is touched, and the counts come out
// as if it had been written.
//
// `written` receives the bytes of the call, `accumulated` is raised by them; either may be null, and both are
// left alone on failure.
#pragma once

#include "boxlib/core/buffer.h"
#include "boxlib/core/bytes.h"

// Bytes that MbxWriteZeros writes at once.
constexpr uint64_t MBX_ZERO_CHUNK = 524288;

// Moves to an absolute position. MBX_ERR_IO when the callback fails.
MbxStatus MbxSeek(MbxContext* context, MbxFile* file, uint64_t position);

// Writes where the stream stands. MBX_ERR_IO when the callback fails or moves fewer bytes than asked.
MbxStatus MbxWriteBytes(MbxContext* context, MbxFile* file, const void* data, uint64_t length,
                        uint64_t* written, uint64_t* accumulated);

// Writes the bytes of a buffer where the stream stands.
MbxStatus MbxWriteBuffer(MbxContext* context, MbxFile* file, const MbxBuffer* buffer, uint64_t* accumulated);

// Writes a composed buffer where the stream stands. MBX_ERR_INTERNAL when something did not fit it.
MbxStatus MbxWriteComposed(MbxContext* context, MbxFile* file, const MbxBytes* bytes, uint64_t* accumulated);

// The two stores that end every payload and box writer. Always MBX_OK.
MbxStatus MbxReportBytes(uint64_t count, uint64_t* written, uint64_t* accumulated);

// A whole payload that is one composed buffer: seek, write, report.
MbxStatus MbxWriteFixedPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxBytes* bytes,
                               uint64_t* written, uint64_t* accumulated);

// Seeks and writes the header of a box of `size` bytes in the form that box_size_mode asks for.
// MBX_ERR_INVALID_ARG for a null context or options or an unknown mode, MBX_ERR_BAD_STATE for a size above 32
// bits in mode 0.
MbxStatus MbxWriteBoxHeader(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                            uint64_t size, uint32_t type, uint64_t* written, uint64_t* accumulated);

// The size on file of a box with that payload, header included.
MbxStatus MbxBoxTotalSize(MbxContext* context, const MbxOptions* options, uint64_t payloadSize,
                          uint64_t* total);

// The header of a box that has no record in the tree. `form` has a numbering of its own: 0 stands for
// box_size_mode 0, 1 for 2, 2 for 1; MBX_ERR_INTERNAL for another. MBX_ERR_INVALID_ARG for a payload of
// 2^64 - 16 bytes or more.
MbxStatus MbxWriteStandaloneHeader(MbxContext* context, uint32_t form, MbxFile* file, uint64_t position,
                                   uint64_t payloadSize, uint32_t type, uint64_t* written,
                                   uint64_t* accumulated);

// The 6-byte header of user metadata items: 16-bit size, 32-bit type. MBX_ERR_INTERNAL for a size above
// 65535.
MbxStatus MbxWriteShortHeader(MbxContext* context, MbxFile* file, uint64_t position, uint64_t size,
                              uint32_t type, uint64_t* written, uint64_t* accumulated);

// The size on file of such an item. MBX_ERR_INTERNAL above 65535.
MbxStatus MbxShortTotalSize(MbxContext* context, uint64_t payloadSize, uint64_t* total);

// An MPEG-4 descriptor header (ISO/IEC 14496-1 8.3.3): tag, then the size in as few 7-bit groups as it needs.
// `total` receives header and payload, `accumulated` is raised by the header alone. MBX_ERR_OVERFLOW for a
// size of 2^28 or more.
MbxStatus MbxWriteDescriptorHeader(MbxContext* context, MbxFile* file, uint64_t position,
                                   uint64_t payloadSize, uint32_t tag, uint64_t* total,
                                   uint64_t* accumulated);

// A uuid kept as four words.
MbxStatus MbxWriteUuid(MbxContext* context, MbxFile* file, uint64_t position, const uint32_t words[4],
                       uint64_t* written, uint64_t* accumulated);

// Writes `count` zero bytes, MBX_ZERO_CHUNK at a time. With a file `written` and `accumulated` receive the
// bytes of the last write only, so nothing may be placed behind them by count; measured, they receive all of
// `count`.
MbxStatus MbxWriteZeros(MbxContext* context, MbxFile* file, uint64_t position, uint64_t count,
                        uint64_t* written, uint64_t* accumulated);
