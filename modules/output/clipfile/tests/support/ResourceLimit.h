#pragma once

#include <sys/resource.h>

#include <csignal>

/// A limit of this process that tests lower for a while, so that the system itself refuses.
class ResourceLimit {
 public:
    /// `resource`: RLIMIT_FSIZE, RLIMIT_NOFILE. Lowers nothing yet.
    explicit ResourceLimit(int resource) : resource_(resource), handler_(std::signal(SIGXFSZ, SIG_IGN)) {
        getrlimit(resource_, &before_);
    }
    ~ResourceLimit() {
        Restore();
        std::signal(SIGXFSZ, handler_);
    }
    ResourceLimit(const ResourceLimit&) = delete;
    ResourceLimit& operator=(const ResourceLimit&) = delete;

    void Set(rlim_t value) const {
        const rlimit limit{value, before_.rlim_max};
        setrlimit(resource_, &limit);
    }
    void Restore() const { setrlimit(resource_, &before_); }

 private:
    const int resource_;
    rlimit before_ = {};
    void (*const handler_)(int);
};
