// MPEG-4 descriptors (ISO/IEC 14496-1 7.2.2): a header with tag and size, and a body that may hold
// descriptors.
#pragma once

#include "boxlib/core/stream.h"

// Tags of ISO/IEC 14496-1 table 1, and of ISO/IEC 14496-14 3.1.2.
enum MbxDescriptorTag : uint32_t {
    MBX_TAG_ES_DESCRIPTOR = 3,
    MBX_TAG_DECODER_CONFIG = 4,
    MBX_TAG_DECODER_SPECIFIC_INFO = 5,
    MBX_TAG_SL_CONFIG = 6,
    MBX_TAG_ES_ID_INC = 14,
    MBX_TAG_INITIAL_OBJECT = 16,
};

// Writes a descriptor. `body(file, position, accumulated)` writes what stands behind the header, beginning
// where the stream stands; run with a null file it tells the size that the header carries.
template <typename Body>
MbxStatus MbxWriteDescriptor(MbxContext* context, MbxFile* file, uint64_t position, uint32_t tag, Body&& body,
                             uint64_t* accumulated) {
    uint64_t bodySize = 0;
    MBX_TRY(body(nullptr, 0, &bodySize));
    uint64_t count = 0;
    MBX_TRY(MbxWriteDescriptorHeader(context, file, position, bodySize, tag, nullptr, &count));
    MBX_TRY(body(file, position + count, &count));
    return MbxReportBytes(count, nullptr, accumulated);
}
