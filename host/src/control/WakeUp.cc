#include "control/WakeUp.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace receiver {

WakeUp::WakeUp() : descriptor_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (descriptor_ < 0) {
        throw std::system_error(errno, std::generic_category(), "no event descriptor");
    }
}

WakeUp::~WakeUp() {
    close(descriptor_);
}

void WakeUp::Signal() const {
    // It fails only where it has been signalled 2^64 times without being taken.
    static_cast<void>(eventfd_write(descriptor_, 1));
}

void WakeUp::Take() const {
    eventfd_t count = 0;
    static_cast<void>(eventfd_read(descriptor_, &count));
}

}  // namespace receiver
