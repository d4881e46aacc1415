#include "control/EventQueue.h"

#include <iterator>
#include <utility>

namespace receiver {

EventQueue::EventQueue(std::function<void()> added)
    : added_(std::move(added)),
      stream_([this](std::string line) { Put(std::move(line)); }),
      display_(stream_) {}

std::vector<std::string> EventQueue::Take() {
    const std::lock_guard lock(mutex_);
    std::vector<std::string> taken;
    if (dropped_ != 0) {
        taken.push_back(JsonRemark(std::exchange(dropped_, 0)));
    }
    std::move(waiting_.begin(), waiting_.end(), std::back_inserter(taken));
    waiting_.clear();
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
