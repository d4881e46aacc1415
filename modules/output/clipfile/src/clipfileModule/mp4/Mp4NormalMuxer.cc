#include "mp4/Mp4NormalMuxer.h"

namespace clipfileModule {

Mp4NormalMuxer::~Mp4NormalMuxer() = default;

}  // namespace clipfileModule
