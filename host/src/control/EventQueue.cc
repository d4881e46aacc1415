#include "control/EventQueue.h"

#include <iterator>
#include <utility>

namespace receiver {

EventQueue::EventQueue(std::function<void()> added)
    : added_(std::move(added)),
      stream_([this](std::string line) { Put(std::move(line)); }),
      display_(stream_) {}

std::vector<std::string> EventQueue::Take() {
    std::deque<std::string> come;
    std::uint64_t dropped = 0;
    {
        // The thread that tells events must not wait for one of lower priority that copies them.
        const std::lock_guard lock(mutex_);
        come.swap(waiting_);
        dropped = std::exchange(dropped_, 0);
    }
    std::vector<std::string> taken;
    if (dropped != 0) {
        taken.push_back(JsonRemark(dropped));
    }
    std::move(come.begin(), come.end(), std::back_inserter(taken));
    return taken;
}

void EventQueue::Put(std::string line) {
    {
        const std::lock_guard lock(mutex_);
        waiting_.push_back(std::move(line));
        if (waiting_.size() > kBound) {
            waiting_.pop_front();
            ++dropped_;
        }
    }
    added_();
}

}  // namespace receiver
