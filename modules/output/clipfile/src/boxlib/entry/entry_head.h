// What every sample entry begins with.
#pragma once

#include "boxlib/core/bytes.h"
#include "boxlib/model/entry_model.h"

// ISO/IEC 14496-12 8.5.2, SampleEntry
inline void MbxPutEntryHead(MbxBytes* bytes, const MbxSampleEntry* entry) {
    MbxPutZeros(bytes, 6);                       // const unsigned int(8)[6] reserved = 0
    MbxPut16(bytes, entry->dataReferenceIndex);  // unsigned int(16) data_reference_index
}

// The code that an entry's box is written with. MbxWriteBox refuses a null record.
template <typename Box>
uint32_t MbxEntryCode(const Box* box) {
    return box != nullptr ? box->entry->code : 0;
}
