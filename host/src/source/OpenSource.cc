#include <memory>
#include <utility>

#include "source/Address.h"
#include "source/AwaitSource.h"
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

/// Opens the source, and waits for a live one until it is there, unless that is not wanted.
std::unique_ptr<InputProducer> Open(const SourceOptions& options, const std::shared_ptr<Interrupt>& interrupt,
                                    SourceListenerInterface& listener, const StopCheck& stop) {
    const bool listens = Listens(options.url);
    std::unique_ptr<InputProducer> producer;
    const auto attempt = [&](bool told) {
        producer = std::make_unique<InputProducer>(
            options, told && listens ? kListeningPatience : options.timeout, interrupt, stop);
    };
    if (options.reconnect) {
        SteadyWaitClock clock(stop);
        AwaitSource(listens, attempt, listener, clock);
    } else {
        attempt(false);
    }
    return producer;
}

}  // namespace

std::unique_ptr<SourceInterface> OpenSource(const SourceOptions& options, SourceListenerInterface& listener,
                                            const StopCheck& stop) {
    libav::CollectMessages();
    auto interrupt = std::make_shared<Interrupt>();
    if (options.url == "test:") {
        return std::make_unique<QueuedSource>(std::make_unique<TestPicture>(options), std::move(interrupt),
                                              Pacer::ForFile(options.speed), kFileAhead, listener);
    }
    try {
        auto producer = Open(options, interrupt, listener, stop);
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
