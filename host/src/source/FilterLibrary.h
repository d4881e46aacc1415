#pragma once

// In front of FFmpeg's headers, which want its macros.
#include <cstdint>

extern "C" {
#include <libavfilter/avfilter.h>
#include <libavfilter/buffersink.h>
#include <libavfilter/buffersrc.h>
}

namespace receiver::libav {

/// The functions of libavfilter that are used, under their names without its prefix. It is loaded when
/// something is filtered for the first time: it brings thirty libraries and 12 MB along, and a source that is
/// recorded as it is needs none of them.
struct FilterLibrary {
    decltype(&avfilter_graph_alloc) graphAlloc;
    decltype(&avfilter_graph_free) graphFree;
    decltype(&avfilter_graph_parse2) graphParse;
    decltype(&avfilter_graph_config) graphConfig;
    decltype(&avfilter_graph_get_filter) graphGetFilter;
    decltype(&avfilter_inout_free) inoutFree;
    decltype(&av_buffersink_get_frame) sinkGetFrame;
    decltype(&av_buffersink_get_time_base) sinkGetTimeBase;
    decltype(&av_buffersrc_add_frame) sourceAddFrame;
    decltype(&av_buffersrc_close) sourceClose;

    /// From any thread. Throws `ReceiverError` (`kInternal`) when it is not installed or not the version that
    /// this program was built for.
    static const FilterLibrary& Get();
};

}  // namespace receiver::libav
