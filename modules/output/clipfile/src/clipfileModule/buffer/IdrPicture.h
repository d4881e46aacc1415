#pragma once

#include "StreamData.h"

namespace clipfileModule {

/// True for an access unit whose first slice is of an IDR picture, as all of its slices then are (ITU-T H.264
/// 7.4.1.2.4). Looks no further than the header of that slice. False for a unit without payload.
bool IsIdrPicture(const StreamData& unit);

}  // namespace clipfileModule
