#pragma once

// Linking FailingThreads.cc puts a pthread_create before that of the system, in the whole program.

/// While it lives, one start of a thread fails with EAGAIN, as where the system has no more to give: the one
/// that is the `number`th from now on, counted from 1 over all threads of the process. One at a time.
class FailingThreads {
 public:
    explicit FailingThreads(int number);
    ~FailingThreads();
    FailingThreads(const FailingThreads&) = delete;
    FailingThreads& operator=(const FailingThreads&) = delete;

    /// True once a start has failed.
    bool HasFailed() const;
};
