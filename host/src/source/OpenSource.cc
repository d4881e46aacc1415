#include <utility>

#include "common/ReceiverError.h"
#include "source/QueuedSource.h"
#include "source/TestPicture.h"

namespace receiver {
namespace {

/// Units that a file or the test picture is read ahead: two seconds and more at any rate.
constexpr std::size_t kFileAhead = 250;

}  // namespace

std::unique_ptr<SourceInterface> OpenSource(const SourceOptions& options, SourceListenerInterface& listener,
                                            bool (* /*stop*/)()) {
    libav::CollectMessages();
    auto interrupt = std::make_shared<Interrupt>();
    if (options.url == "test:") {
        return std::make_unique<QueuedSource>(std::make_unique<TestPicture>(options), std::move(interrupt),
                                              Pacer::ForFile(options.speed), kFileAhead, listener);
    }
    throw ReceiverError(ExitCode::kSourceUnavailable,
                        "'" + options.url + "' is no address that can be opened");
}

}  // namespace receiver
