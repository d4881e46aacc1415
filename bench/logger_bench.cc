// What a log line costs its caller. Nearly every line of a running recorder is disabled.

#include <benchmark/benchmark.h>

#include <cstdlib>

#include "Logger.h"

namespace {

/// The first line reads these; with them the threshold is the default and the disk does not matter.
const bool configured = setenv("QX_LOG", "/dev/null", 1) == 0 && unsetenv("QX_LOG_PRIORITY") == 0;

void PutLine(benchmark::State& state, _LogPriority priority) {
    if (!configured) {
        state.SkipWithError("the environment cannot be set");
    }
    Logger::Put(LOG_PRIORITY_ERROR, nullptr, nullptr, 0, "the log is open");
    int number = 0;
    for (auto _ : state) {
        Logger::Put(priority, "modules/output/clipfile/src/clipfileModule/controller/Controller.cc",
                    "clipfileModule::Controller::PushVideo", 100, "ST: [V]\t%d", ++number);
    }
    state.SetItemsProcessed(state.iterations());
}

/// Aim: at most 5 ns.
void BM_DisabledLine(benchmark::State& state) {
    PutLine(state, LOG_PRIORITY_TRACE);
}
BENCHMARK(BM_DisabledLine)->Threads(1)->Threads(2);

/// Formatting and queueing. Faster than the log's thread writes, so that the queue overflows, as when a disk
/// hangs.
void BM_EnabledLine(benchmark::State& state) {
    PutLine(state, LOG_PRIORITY_WARNING);
}
BENCHMARK(BM_EnabledLine)->Threads(1)->Threads(2);

}  // namespace
