#include "source/QueuedSource.h"

#include <algorithm>
#include <chrono>
#include <utility>

namespace receiver {
namespace {

/// After so long without a unit the reader looks after its other business.
constexpr std::chrono::milliseconds kIdle{100};
/// Bytes that may wait for the reader.
constexpr std::size_t kQueueBytes = std::size_t{64} << 20;
/// Units of a recorded source that must wait before the reader, who found none, goes on: two threads that
/// hand over unit by unit would wake each other for each.
constexpr std::size_t kRefill = 24;

Pacer::Duration TimeOf(const SourceUnit& unit) {
    const std::int64_t clock = unit.medium == Medium::kAudio ? kAudioClock : kVideoClock;
    return std::chrono::microseconds(unit.time / clock * 1000000 + unit.time % clock * 1000000 / clock);
}

}  // namespace

QueuedSource::QueuedSource(std::unique_ptr<ProducerInterface> producer, std::shared_ptr<Interrupt> interrupt,
                           Pacer pacer, std::size_t capacity, SourceListenerInterface& listener)
    : producer_(std::move(producer)),
      interrupt_(std::move(interrupt)),
      capacity_(capacity),
      refill_(pacer.Live() ? 1 : std::min(kRefill, capacity)),
      resume_(pacer.Live() ? capacity - 1 : capacity / 2),
      resumeBytes_(pacer.Live() ? kQueueBytes - 1 : kQueueBytes / 2),
      listener_(listener),
      pacer_(pacer),
      description_(producer_->Description()),
      thread_([this] { Run(); }) {}

QueuedSource::~QueuedSource() {
    Stop();
    thread_.join();
}

void QueuedSource::Stop() {
    interrupt_->Stop();
    const std::lock_guard lock(mutex_);
    stopped_ = true;
    arrived_.notify_one();
    room_.notify_one();
}

std::size_t QueuedSource::Queued() const {
    const std::lock_guard lock(mutex_);
    return queue_.size();
}

void QueuedSource::Run() {
    std::exception_ptr failure;
    try {
        bool more = true;
        while (more && !interrupt_->Stopped()) {
            Batch batch;
            more = producer_->Produce(batch);
            std::unique_lock lock(mutex_);
            for (auto& item : batch) {
                if (const auto* const unit = std::get_if<SourceUnit>(&item)) {
                    queued_ += unit->size;
                }
                queue_.push_back(std::move(item));
            }
            if (queue_.size() >= refill_) {
                arrived_.notify_one();
            }
            full_ = queue_.size() >= capacity_ || queued_ >= kQueueBytes;
            room_.wait(lock, [this] { return stopped_ || !full_; });
        }
    } catch (...) {
        failure = std::current_exception();
    }
    const std::lock_guard lock(mutex_);
    // The reader alone has it from now on.
    failure_ = std::move(failure);
    ended_ = true;
    arrived_.notify_one();
}

SourceInterface::Result QueuedSource::Read(SourceUnit& unit) {
    const auto deadline = std::chrono::steady_clock::now() + kIdle;
    std::unique_lock lock(mutex_);
    for (;;) {
        if (queue_.empty()) {
            arrived_.wait_until(lock, deadline,
                                [this] { return stopped_ || ended_ || queue_.size() >= refill_; });
        }
        if (stopped_) {
            return Result::kStopped;
        }
        if (queue_.empty()) {
            if (failure_) {
                std::rethrow_exception(std::exchange(failure_, nullptr));
            }
            return ended_ ? Result::kEnd : Result::kIdle;
        }
        if (const auto* const notice = std::get_if<std::string>(&queue_.front())) {
            const std::string sentence = *notice;
            DropFront();
            lock.unlock();
            listener_.OnNotice(sentence);
            lock.lock();
            continue;
        }
        if (auto* const description = std::get_if<SourceDescription>(&queue_.front())) {
            description_ = std::move(*description);
            DropFront();
            return Result::kChanged;
        }
        SourceUnit& front = std::get<SourceUnit>(queue_.front());
        const Pacer::Duration time = TimeOf(front);
        const auto now = std::chrono::steady_clock::now();
        const auto due = pacer_.Due(time, now);
        if (due > now) {
            const bool soon = due <= deadline;
            if (arrived_.wait_until(lock, soon ? due : deadline, [this] { return stopped_; })) {
                return Result::kStopped;
            }
            if (!soon) {
                return Result::kIdle;
            }
        }
        unit = std::move(front);
        queued_ -= unit.size;
        DropFront();
        pacer_.Taken(time, std::chrono::steady_clock::now());
        return Result::kUnit;
    }
}

void QueuedSource::DropFront() {
    queue_.pop_front();
    const bool room = queue_.size() <= resume_ && queued_ <= resumeBytes_;
    if (full_ && (room || queue_.empty())) {
        full_ = false;
        room_.notify_one();
    }
}

}  // namespace receiver
