// Choice of version 0 or 1 for boxes whose fields are 32 or 64 bits wide, by time_version_mode.
//
// Modes are told by their numbers (MbxTimeVersionMode). The choosers do not agree with each other at the
// edges. Files in the field depend on each as it is.
#pragma once

#include "boxlib/core/list.h"

struct MbxEdit;

// `mvhd`, `tkhd`, `mdhd`. Modes 0 and 2: version 0, and MBX_ERR_BAD_STATE only when all three values exceed
// 32 bits; a single one that does is cut. Mode 1: version 1 when any does. Mode 3: version 1.
// MBX_ERR_INTERNAL for another mode.
MbxStatus MbxChooseTimeVersion(const MbxOptions* options, uint64_t creation, uint64_t modification,
                               uint64_t duration, uint32_t* version);

// `elst`, over all edits from `first` on. Modes 0 and 2: version 0, and MBX_ERR_BAD_STATE only once both a
// segment duration above 32 bits and a media time outside the signed 32-bit range were seen, in whichever
// edits. Mode 1: version 1 when either was. Mode 3: version 1. MBX_ERR_INTERNAL for another mode.
MbxStatus MbxChooseEditVersion(const MbxOptions* options, const MbxEdit* first, uint32_t* version);

// `tfra`, on its largest time and its last `moof` offset. Mode 0: version 1. Mode 1: version 1 when either
// exceeds 32 bits. Mode 3: version 1. Mode 2 and any other: version 0, MBX_ERR_BAD_STATE when either exceeds.
MbxStatus MbxChooseIndexVersion(const MbxOptions* options, uint64_t time, uint64_t offset, uint32_t* version);

// `tfdt`, `saio`, `subs`, whose caller tells whether a value of the table `needsWide`. Mode 1: version 1 when
// it does. Mode 3: version 1. Any other: version 0, MBX_ERR_BAD_STATE when it does.
MbxStatus MbxChooseValueVersion(const MbxOptions* options, bool needsWide, uint32_t* version);
