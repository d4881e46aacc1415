#include "buffer/queue/StreamQueue.h"

#include <utility>

namespace clipfileModule {

StreamQueue::StreamQueue(std::uint64_t capacity, bool dropWhenFull) : queue(capacity, dropWhenFull) {}

StreamQueue::~StreamQueue() = default;

void StreamQueue::Start(std::function<void(std::shared_ptr<StreamData>&)> unitHandler) {
    handler = std::move(unitHandler);
    running = true;
    thread = std::make_unique<std::thread>(&StreamQueue::run, this);
}

void StreamQueue::Stop() {
    running = false;
    // Contract: closed-queues. A stop unit would have to wait for room in a full queue whose worker may have
    // gone.
    queue.Close();
    join();
}

void StreamQueue::Finish() {
    queue.Finish();
    join();
}

void StreamQueue::join() {
    if (thread != nullptr && thread->joinable()) {
        thread->join();
    }
}

void StreamQueue::run() {
    while (running) {
        std::shared_ptr<StreamData> unit = queue.Pop();
        if (unit == nullptr) {
            // The queue was closed, or finished and is empty.
            break;
        }
        if (unit->size != 0) {
            handler(unit);
        }
    }
}

}  // namespace clipfileModule
