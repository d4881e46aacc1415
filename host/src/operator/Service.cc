#include "operator/Service.h"

#include <systemd/sd-daemon.h>

#include <cstdint>

namespace receiver {

Service::Service() {
    std::uint64_t interval = 0;
    if (sd_watchdog_enabled(0, &interval) > 0) {
        // Half of it is what the manual advises.
        interval_ = std::chrono::microseconds(interval / 2);
    }
}

void Service::Ready() {
    sd_notify(0, "READY=1");
}

void Service::Alive(const std::string& state) {
    const Clock::time_point now = Clock::now();
    std::string message;
    if (interval_.count() > 0 && now - told_ >= interval_) {
        told_ = now;
        message = "WATCHDOG=1\n";
    }
    if (state != state_) {
        state_ = state;
        message += "STATUS=" + state;
    }
    if (!message.empty()) {
        sd_notify(0, message.c_str());
    }
}

void Service::Stopping() {
    sd_notify(0, "STOPPING=1");
}

}  // namespace receiver
