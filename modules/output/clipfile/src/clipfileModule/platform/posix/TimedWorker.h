#pragma once

#include <pthread.h>
#include <signal.h>

#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <thread>
#include <utility>

#include "common/Mutex.h"

namespace clipfileModule {

/// A thread that works on a `Resource` for another one, which waits for each job, but never longer than a
/// limit. For libraries whose calls wait for a network as long as they like. The thread makes the resource,
/// uses it and destroys it; no signal of the process is handled on it.
///
/// A job that passes the limit, or returns ETIMEDOUT by itself, is the last: every later one fails at once,
/// and the thread is left with the resource, which it cleans up when that job has returned. So a job owns all
/// that it uses. The code must stay in memory until then.
///
/// One thread at a time calls the operations.
template <typename Resource>
class TimedWorker {
 public:
    /// Returns an error number, 0 for success.
    using Job = std::function<int(Resource&)>;

    /// Throws `std::system_error` when no thread can be started. `make` is called on the new thread.
    TimedWorker(std::function<std::unique_ptr<Resource>()> make, std::chrono::milliseconds jobLimit,
                std::chrono::milliseconds endLimit)
        : jobLimit_(jobLimit), endLimit_(endLimit) {
        sigset_t all;
        sigset_t before;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before);
        try {
            thread_ = std::thread([state = state_, made = std::move(make)] { work(*state, made()); });
        } catch (...) {
            pthread_sigmask(SIG_SETMASK, &before, nullptr);
            throw;
        }
        pthread_sigmask(SIG_SETMASK, &before, nullptr);
    }
    /// Waits for the resource's end up to the limit; not at all when a job has passed its own.
    ~TimedWorker() {
        bool ended = false;
        {
            MutexLock lock(state_->mutex);
            state_->ending = true;
            state_->changed.notify_all();
            const auto deadline = std::chrono::steady_clock::now() + endLimit_;
            while (!timedOut_ && !state_->ended && lock.WaitUntil(state_->changed, deadline)) {
            }
            ended = state_->ended;
        }
        if (ended) {
            thread_.join();
        } else {
            thread_.detach();
        }
    }
    TimedWorker(const TimedWorker&) = delete;
    TimedWorker& operator=(const TimedWorker&) = delete;

    /// The result of `job`, or ETIMEDOUT when it has not returned within the limit or an earlier one did not.
    int Run(Job job) {
        if (timedOut_) {
            return ETIMEDOUT;
        }
        MutexLock lock(state_->mutex);
        state_->job = std::move(job);
        state_->changed.notify_all();
        const auto deadline = std::chrono::steady_clock::now() + jobLimit_;
        while (state_->job && lock.WaitUntil(state_->changed, deadline)) {
        }
        timedOut_ = state_->job || state_->result == ETIMEDOUT;
        return timedOut_ ? ETIMEDOUT : state_->result;
    }

 private:
    struct State {
        Mutex mutex;
        std::condition_variable changed;
        /// Empty when there is none in work.
        Job job GUARDED_BY(mutex);
        int result GUARDED_BY(mutex) = 0;
        bool ending GUARDED_BY(mutex) = false;
        bool ended GUARDED_BY(mutex) = false;
    };

    static void work(State& state, std::unique_ptr<Resource> resource) {
        MutexLock lock(state.mutex);
        for (;;) {
            while (!state.job && !state.ending) {
                lock.Wait(state.changed);
            }
            if (!state.job) {
                break;
            }
            const Job job = state.job;
            lock.Unlock();
            const int result = job(*resource);
            lock.Lock();
            state.result = result;
            state.job = nullptr;
            state.changed.notify_all();
        }
        lock.Unlock();
        resource.reset();
        lock.Lock();
        state.ended = true;
        state.changed.notify_all();
    }

    const std::chrono::milliseconds jobLimit_;
    const std::chrono::milliseconds endLimit_;
    const std::shared_ptr<State> state_ = std::make_shared<State>();
    std::thread thread_;
    bool timedOut_ = false;
};

}  // namespace clipfileModule
