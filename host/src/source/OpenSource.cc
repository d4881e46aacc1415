#include <chrono>
#include <optional>
#include <thread>
#include <utility>

#include "source/Address.h"
#include "source/InputProducer.h"
#include "source/QueuedSource.h"
#include "source/TestPicture.h"

namespace receiver {
namespace {

/// Units that a file or the test picture is read ahead: two seconds and more at any rate.
constexpr std::size_t kFileAhead = 250;
/// Units of a live source that may wait for the reader: 15 seconds and more.
constexpr std::size_t kLiveAhead = 2000;
/// How many times real time a live source's units come when a burst has been held back somewhere: slow enough
/// for the module's queues of 50 units.
constexpr double kBurst = 8;

/// Between two attempts at a source that is called.
constexpr std::chrono::seconds kPause{2};
/// How often `stop` is asked meanwhile.
constexpr std::chrono::milliseconds kAsk{50};

using Clock = std::chrono::steady_clock;

/// Throws `Stopped`.
void WaitUntil(Clock::time_point time, bool (*stop)()) {
    while (Clock::now() < time) {
        if (stop != nullptr && stop()) {
            throw Stopped();
        }
        std::this_thread::sleep_for(kAsk);
    }
}

/// Opens the source, and waits for a live one until it is there.
std::unique_ptr<InputProducer> Await(const SourceOptions& options,
                                     const std::shared_ptr<Interrupt>& interrupt,
                                     SourceListenerInterface& listener, bool (*stop)()) {
    const bool listens = Listens(options.url);
    std::optional<Clock::time_point> told;
    for (;;) {
        const auto tried = Clock::now();
        try {
            return std::make_unique<InputProducer>(
                options, told && listens ? kListeningPatience : options.timeout, interrupt, stop);
        } catch (const SourceAbsent& absence) {
            if (!options.reconnect) {
                throw;
            }
            const auto now = Clock::now();
            if (!told || now - *told >= kTellEvery) {
                listener.OnNotice(std::string(absence.what()) + "; waiting for it");
                told = now;
            }
        }
        WaitUntil(listens ? tried + kPause : Clock::now() + kPause, stop);
    }
}

}  // namespace

std::unique_ptr<SourceInterface> OpenSource(const SourceOptions& options, SourceListenerInterface& listener,
                                            bool (*stop)()) {
    libav::CollectMessages();
    auto interrupt = std::make_shared<Interrupt>();
    if (options.url == "test:") {
        return std::make_unique<QueuedSource>(std::make_unique<TestPicture>(options), std::move(interrupt),
                                              Pacer::ForFile(options.speed), kFileAhead, listener);
    }
    try {
        auto producer = Await(options, interrupt, listener, stop);
        const bool recorded = producer->Recorded();
        return std::make_unique<QueuedSource>(
            std::move(producer), std::move(interrupt),
            recorded ? Pacer::ForFile(options.speed) : Pacer::ForLive(kBurst),
            recorded ? kFileAhead : kLiveAhead, listener);
    } catch (const Stopped&) {
        return nullptr;
    }
}

}  // namespace receiver
