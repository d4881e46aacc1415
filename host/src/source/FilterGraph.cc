#include "source/FilterGraph.h"

#include <new>

#include "common/ReceiverError.h"

namespace receiver {

FilterGraph::FilterGraph(const std::string& chain, bool video)
    : library_(libav::FilterLibrary::Get()), graph_(library_.graphAlloc(), Free{library_.graphFree}) {
    if (!graph_) {
        throw std::bad_alloc();
    }
    // A slice for each thread gains little here and takes the encoder's time.
    graph_->nb_threads = 1;
    const std::string whole = chain + (video ? ",buffersink@out" : ",abuffersink@out");
    AVFilterInOut* inputs = nullptr;
    AVFilterInOut* outputs = nullptr;
    const int result = library_.graphParse(graph_.get(), whole.c_str(), &inputs, &outputs);
    library_.inoutFree(&inputs);
    library_.inoutFree(&outputs);
    libav::Check(result, "make a chain of filters");
    libav::Check(library_.graphConfig(graph_.get(), nullptr), "set up a chain of filters");
    sink_ = library_.graphGetFilter(graph_.get(), video ? "buffersink@out" : "abuffersink@out");
    if (sink_ == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "cannot find the end of a chain of filters");
    }
}

bool FilterGraph::Pull(AVFrame& frame) {
    const int result = library_.sinkGetFrame(sink_, &frame);
    if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
        return false;
    }
    libav::Check(result, "filter a frame");
    return true;
}

AVFilterContext* FilterGraph::SourceOf(const char* name) {
    AVFilterContext* const source = library_.graphGetFilter(graph_.get(), name);
    if (source == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "cannot find the beginning of a chain of filters");
    }
    return source;
}

void FilterGraph::Feed(const char* name, AVFrame& frame) {
    libav::Check(library_.sourceAddFrame(SourceOf(name), &frame), "filter a frame");
}

void FilterGraph::End(const char* name, std::int64_t pts) {
    libav::Check(library_.sourceClose(SourceOf(name), pts, 0), "filter a frame");
}

AVRational FilterGraph::TimeBase() const {
    return library_.sinkGetTimeBase(sink_);
}

}  // namespace receiver
