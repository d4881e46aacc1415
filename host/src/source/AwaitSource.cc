#include "source/AwaitSource.h"

#include <optional>
#include <string>
#include <thread>

#include "source/Input.h"

namespace receiver {
namespace {

/// Between two attempts at a source that is called.
constexpr std::chrono::seconds kPause{2};
/// How often `stop` is asked meanwhile.
constexpr std::chrono::milliseconds kAsk{50};

}  // namespace

void SteadyWaitClock::SleepUntil(TimePoint time) {
    while (Now() < time) {
        if (stop_ && stop_()) {
            throw Stopped();
        }
        std::this_thread::sleep_for(kAsk);
    }
}

void AwaitSource(bool listens, const std::function<void(bool told)>& attempt,
                 SourceListenerInterface& listener, WaitClockInterface& clock) {
    std::optional<WaitClockInterface::TimePoint> told;
    for (;;) {
        const auto tried = clock.Now();
        try {
            attempt(told.has_value());
            return;
        } catch (const SourceAbsent& absence) {
            const auto now = clock.Now();
            if (!told || now - *told >= kTellEvery) {
                listener.OnNotice(std::string(absence.what()) + "; waiting for it");
                told = now;
            }
        }
        clock.SleepUntil(listens ? tried + kListenEvery : clock.Now() + kPause);
    }
}

}  // namespace receiver
