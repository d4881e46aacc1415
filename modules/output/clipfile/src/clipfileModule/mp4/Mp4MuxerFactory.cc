#include "mp4/Mp4MuxerFactory.h"

#include <functional>
#include <map>

#include "mp4/Mp4FragmentMuxer.h"
#include "mp4/Mp4NormalMuxer.h"

namespace clipfileModule {

bool Mp4MuxerFactory::Create(const std::string& type, std::shared_ptr<Mp4Muxer>& muxer) const {
    const std::map<std::string, std::function<std::shared_ptr<Mp4Muxer>()>> makers = {
        {"normal", [] { return std::make_shared<Mp4NormalMuxer>(); }},
        {"fragment", [] { return std::make_shared<Mp4FragmentMuxer>(); }},
    };
    const auto maker = makers.find(type);
    if (maker == makers.end()) {
        return false;
    }
    muxer = maker->second();
    return true;
}

}  // namespace clipfileModule
