#pragma once

#include <algorithm>
#include <memory>
#include <string>

#include "LogCapture.h"
#include "controller/Controller.h"
#include "support/FakeHost.h"
#include "support/WaitUntil.h"

namespace clipfileModule {

/// Returns true once the event thread of a running controller answers posts and has ended the drain of the
/// last one: behind that it waits. `log` must have captured the controller's life, and nobody else may post.
[[nodiscard]] inline bool settleEventLoop(Controller& controller, FakeHost& host, const LogCapture& log) {
    // An event that is posted before the thread first waits lies until the next post. The number sets this
    // status apart from those of earlier lives with the same host.
    const FakeHost::StatusMap settled = {{"settled", std::to_string(host.Transmissions().size())}};
    const auto isDelivered = [&] {
        const auto sent = host.Transmissions();
        return std::find(sent.begin(), sent.end(), settled) != sent.end();
    };
    std::size_t posts = log.Count(LOG_PRIORITY_TRACE, "clipfileModule::Controller::PostEvent", "end.");
    if (!waitUntil([&] {
            controller.PostEvent(std::make_shared<TransferStatusNotifyEvent>(settled));
            ++posts;
            return isDelivered();
        })) {
        return false;
    }
    return log.WaitFor([&](const auto& lines) {
        std::size_t dispatched = 0;
        bool drained = false;
        for (const CapturedLine& line : lines) {
            if (line.function == "clipfileModule::Controller::dispatchEvent" && line.text == "end.") {
                ++dispatched;
                drained = false;
            } else if (line.text == "end. no event.") {
                drained = true;
            }
        }
        return dispatched == posts && drained;
    });
}

}  // namespace clipfileModule
