#pragma once

#include "mp4/Mp4File.h"

namespace clipfileModule {

/// Writes a file whose index stands behind its samples: `ftyp`, `uuid`, `mdat`, `moov`. Until it is closed
/// the file has no index.
class Mp4NormalMuxer : public Mp4File {
 public:
    ~Mp4NormalMuxer() override;
};

}  // namespace clipfileModule
