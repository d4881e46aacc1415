#pragma once

#include "AnnexBReader.h"

namespace nal_access {

/// The AAC frame without its ADTS header (ISO/IEC 14496-3 1.A.2), which is 7 bytes long, or 9 with CRC. A
/// frame that does not begin with a header, or whose header tells more bytes than there are, comes back as it
/// is.
Bytes WithoutAdtsHeader(Bytes frame);

}  // namespace nal_access
