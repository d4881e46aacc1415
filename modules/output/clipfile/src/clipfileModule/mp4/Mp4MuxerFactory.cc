#include "mp4/Mp4MuxerFactory.h"

namespace clipfileModule {

bool Mp4MuxerFactory::Create(const std::string& /*type*/, std::shared_ptr<Mp4Muxer>& /*muxer*/) const {
    // There is no muxer of any type yet, and nothing may look as if it recorded.
    return false;
}

}  // namespace clipfileModule
