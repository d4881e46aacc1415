#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <utility>

#include "common/Mutex.h"

namespace clipfileModule {

/// A bounded first-in first-out queue between threads. `Q` is the container adaptor that holds the items.
///
/// Any thread may call any operation. A queue that was closed takes nothing more and lets nobody wait; one
/// that was finished does the same once it is empty. It must outlive every operation on it.
template <typename T, typename Q>
class BlockingQueue {
 public:
    /// `capacity` is the number of items that fill the queue. With `dropWhenFull` a push into a full queue
    /// fails at once; without it the push waits for room.
    BlockingQueue(std::uint64_t itemCapacity, bool drop)
        : capacity(itemCapacity), dropWhenFull(drop), flushPredicate([](T) { return true; }) {}

    /// True when the item went in, false when it was dropped: the queue is full and `dropWhenFull`, finished
    /// or closed.
    bool Push(T item) {
        {
            MutexLock lock(mutex);
            while (queue.size() >= capacity && !finished) {
                if (dropWhenFull) {
                    return false;
                }
                lock.Wait(notFull);
            }
            if (finished) {
                return false;
            }
            queue.push(std::move(item));
        }
        // Who is woken wants the lock: it is free by then.
        notEmpty.notify_one();
        return true;
    }

    /// Waits for an item and takes it from the front. Gives a default `T` once the queue is closed, whatever
    /// it still holds, and once it is finished and empty.
    T Pop() {
        T item{};
        {
            MutexLock lock(mutex);
            while (queue.empty() && !finished) {
                lock.Wait(notEmpty);
            }
            if (closed || queue.empty()) {
                return item;
            }
            item = std::move(queue.front());
            queue.pop();
        }
        notFull.notify_one();
        return item;
    }

    /// Flushes the queue: removes the items for which the flush predicate holds, which is all of them unless
    /// `SetFlushPredicate` said otherwise; those kept stay in their order. Throws `std::bad_function_call`
    /// without a predicate.
    void Clear() {
        MutexLock lock(mutex);
        Q kept;
        while (!queue.empty()) {
            const bool flushed = flushPredicate(queue.front());
            if (!flushed) {
                kept.push(std::move(queue.front()));
            }
            queue.pop();
        }
        queue = std::move(kept);
        // Contract: flush-wakes-all. Several producers may wait, and there is room for all of them.
        notFull.notify_all();
    }

    void SetFlushPredicate(std::function<bool(T)> predicate) {
        MutexLock lock(mutex);
        flushPredicate = std::move(predicate);
    }

    /// Ends the traffic: wakes everyone who waits; from now on a push fails and a pop gives a default `T`.
    void Close() {
        MutexLock lock(mutex);
        closed = true;
        finished = true;
        notFull.notify_all();
        notEmpty.notify_all();
    }

    /// As `Close`, but what waits in the queue can still be popped.
    void Finish() {
        MutexLock lock(mutex);
        finished = true;
        notFull.notify_all();
        notEmpty.notify_all();
    }

    /// Number of items that wait.
    std::size_t Size() const {
        MutexLock lock(mutex);
        return queue.size();
    }

 private:
    Q queue GUARDED_BY(mutex);
    const std::uint64_t capacity;
    const bool dropWhenFull;
    mutable Mutex mutex;
    std::condition_variable notFull;
    std::condition_variable notEmpty;
    std::function<bool(T)> flushPredicate GUARDED_BY(mutex);
    /// Nothing goes in any more, and with `closed` nothing comes out.
    bool finished GUARDED_BY(mutex) = false;
    bool closed GUARDED_BY(mutex) = false;
};

}  // namespace clipfileModule
