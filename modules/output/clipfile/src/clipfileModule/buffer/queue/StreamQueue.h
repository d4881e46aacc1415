#pragma once

#include <atomic>
#include <deque>
#include <functional>
#include <memory>
#include <queue>
#include <thread>

#include "StreamData.h"
#include "buffer/queue/BlockingQueue.h"

namespace clipfileModule {

/// The queue type of the whole program: stream units, oldest first.
using StreamDataQueue =
    BlockingQueue<std::shared_ptr<StreamData>,
                  std::queue<std::shared_ptr<StreamData>, std::deque<std::shared_ptr<StreamData>>>>;

/// A bounded queue with a worker thread that hands each unit to a handler.
///
/// Life: construction, `Start`, any number of pushes on `queue`, `Stop` or `Finish`. One of these must have
/// run before destruction.
class StreamQueue {
 public:
    StreamQueue(std::uint64_t capacity, bool dropWhenFull);
    virtual ~StreamQueue();

    /// Starts the worker. `handler` runs on the worker, one unit at a time, for every unit whose `size` is
    /// not 0. Throws `std::system_error` when no thread can be started.
    void Start(std::function<void(std::shared_ptr<StreamData>&)> handler);
    /// Ends and joins the worker. Units that still wait are not handled. Returns also when the queue is full,
    /// when producers wait in `Push` (their pushes then fail) and when there is no worker. Throws
    /// `std::system_error` when the worker cannot be joined, as by itself.
    void Stop();

    /// As `Stop`, but the worker first handles the units that wait.
    void Finish();

    /// Producers push here directly.
    StreamDataQueue queue;

 private:
    void run();
    void join();

    std::unique_ptr<std::thread> thread;
    std::function<void(std::shared_ptr<StreamData>&)> handler;
    std::atomic<bool> running = false;
};

}  // namespace clipfileModule
