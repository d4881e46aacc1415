#pragma once

#include <memory>
#include <string>

#include "source/FilterLibrary.h"
#include "source/Libav.h"

namespace receiver {

/// A chain of libavfilter from sources within it, or from one that is fed, to one end.
class FilterGraph {
 public:
    /// `chain` as FFmpeg's programs write it, from its sources on ("testsrc2=size=64x64,format=yuv420p").
    /// `fed` names a source of the chain that `Feed` feeds, without arguments of its own: "buffer@in=...".
    /// `video` tells what comes out. Throws `ReceiverError` (`kInternal`).
    FilterGraph(const std::string& chain, bool video);

    /// The next frame, into an empty `frame`. False when the chain has none (yet).
    bool Pull(AVFrame& frame);
    /// Gives a frame to the source `name` of the chain, and takes over its reference.
    void Feed(const char* name, AVFrame& frame);
    /// Tells the source `name` that nothing follows, and when its last frame was over.
    void End(const char* name, std::int64_t pts);
    AVRational TimeBase() const;

 private:
    AVFilterContext* SourceOf(const char* name);

    struct Free {
        decltype(&avfilter_graph_free) function;
        void operator()(AVFilterGraph* graph) const { function(&graph); }
    };

    const libav::FilterLibrary& library_;
    std::unique_ptr<AVFilterGraph, Free> graph_;
    AVFilterContext* sink_ = nullptr;
};

}  // namespace receiver
