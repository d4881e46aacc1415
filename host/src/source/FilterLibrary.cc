#include "source/FilterLibrary.h"

#include <dlfcn.h>

#include <string>

extern "C" {
#include <libavutil/macros.h>
}

#include "common/ReceiverError.h"

namespace receiver::libav {
namespace {

constexpr const char* kFile = "libavfilter.so." AV_STRINGIFY(LIBAVFILTER_VERSION_MAJOR);

[[noreturn]] void Refuse() {
    const char* const reason = dlerror();
    throw ReceiverError(ExitCode::kInternal, std::string("cannot load ") + kFile +
                                                 (reason != nullptr ? ": " : "") +
                                                 (reason != nullptr ? reason : "") +
                                                 "; it is needed to convert pictures or sound");
}

template <typename Function>
void Find(void* library, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(library, name));
    if (function == nullptr) {
        Refuse();
    }
}

FilterLibrary Load() {
    void* const handle = dlopen(kFile, RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (handle == nullptr) {
        Refuse();
    }
    FilterLibrary library = {};
    Find(handle, "avfilter_graph_alloc", library.graphAlloc);
    Find(handle, "avfilter_graph_free", library.graphFree);
    Find(handle, "avfilter_graph_parse2", library.graphParse);
    Find(handle, "avfilter_graph_config", library.graphConfig);
    Find(handle, "avfilter_graph_get_filter", library.graphGetFilter);
    Find(handle, "avfilter_inout_free", library.inoutFree);
    Find(handle, "av_buffersink_get_frame", library.sinkGetFrame);
    Find(handle, "av_buffersink_get_time_base", library.sinkGetTimeBase);
    Find(handle, "av_buffersrc_add_frame", library.sourceAddFrame);
    Find(handle, "av_buffersrc_close", library.sourceClose);
    return library;
}

}  // namespace

const FilterLibrary& FilterLibrary::Get() {
    static const FilterLibrary library = Load();
    return library;
}

}  // namespace receiver::libav
