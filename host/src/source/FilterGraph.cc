#include "source/FilterGraph.h"

#include <new>

extern "C" {
#include <libavfilter/buffersink.h>
#include <libavfilter/buffersrc.h>
}

#include "common/ReceiverError.h"

namespace receiver {

FilterGraph::FilterGraph(const std::string& chain, bool video) : graph_(avfilter_graph_alloc()) {
    if (!graph_) {
        throw std::bad_alloc();
    }
    // A slice for each thread gains little here and takes the encoder's time.
    graph_->nb_threads = 1;
    const std::string whole = chain + (video ? ",buffersink@out" : ",abuffersink@out");
    AVFilterInOut* inputs = nullptr;
    AVFilterInOut* outputs = nullptr;
    const int result = avfilter_graph_parse2(graph_.get(), whole.c_str(), &inputs, &outputs);
    avfilter_inout_free(&inputs);
    avfilter_inout_free(&outputs);
    libav::Check(result, "make a chain of filters");
    libav::Check(avfilter_graph_config(graph_.get(), nullptr), "set up a chain of filters");
    sink_ = avfilter_graph_get_filter(graph_.get(), video ? "buffersink@out" : "abuffersink@out");
    if (sink_ == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "cannot find the end of a chain of filters");
    }
}

bool FilterGraph::Pull(AVFrame& frame) {
    const int result = av_buffersink_get_frame(sink_, &frame);
    if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
        return false;
    }
    libav::Check(result, "filter a frame");
    return true;
}

AVFilterContext* FilterGraph::SourceOf(const char* name) {
    AVFilterContext* const source = avfilter_graph_get_filter(graph_.get(), name);
    if (source == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "cannot find the beginning of a chain of filters");
    }
    return source;
}

void FilterGraph::Feed(const char* name, AVFrame& frame) {
    libav::Check(av_buffersrc_add_frame(SourceOf(name), &frame), "filter a frame");
}

void FilterGraph::End(const char* name, std::int64_t pts) {
    libav::Check(av_buffersrc_close(SourceOf(name), pts, 0), "filter a frame");
}

AVRational FilterGraph::TimeBase() const {
    return av_buffersink_get_time_base(sink_);
}

}  // namespace receiver
