#pragma once

#include <memory>
#include <string>

#include "mp4/Mp4Muxer.h"

namespace clipfileModule {

/// Makes muxers by the name of the kind of file.
class Mp4MuxerFactory {
 public:
    virtual ~Mp4MuxerFactory() = default;

    /// A new muxer for "normal" or "fragment". False for any other `type`, which leaves `muxer` as it was.
    bool Create(const std::string& type, std::shared_ptr<Mp4Muxer>& muxer) const;
};

}  // namespace clipfileModule
