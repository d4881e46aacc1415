#include "source/QueuedSource.h"

#include <chrono>
#include <utility>

namespace receiver {
namespace {

/// After so long without a unit the reader looks after its other business.
constexpr std::chrono::milliseconds kIdle{100};
/// Bytes that may wait for the reader.
constexpr std::size_t kQueueBytes = std::size_t{64} << 20;

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
    changed_.notify_all();
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
            changed_.notify_all();
            changed_.wait(
                lock, [this] { return stopped_ || (queue_.size() < capacity_ && queued_ < kQueueBytes); });
        }
    } catch (...) {
        failure = std::current_exception();
    }
    const std::lock_guard lock(mutex_);
    // The reader alone has it from now on.
    failure_ = std::move(failure);
    ended_ = true;
    changed_.notify_all();
}

SourceInterface::Result QueuedSource::Read(SourceUnit& unit) {
    const auto deadline = std::chrono::steady_clock::now() + kIdle;
    std::unique_lock lock(mutex_);
    for (;;) {
        changed_.wait_until(lock, deadline, [this] { return stopped_ || ended_ || !queue_.empty(); });
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
            queue_.pop_front();
            lock.unlock();
            listener_.OnNotice(sentence);
            lock.lock();
            continue;
        }
        if (auto* const description = std::get_if<SourceDescription>(&queue_.front())) {
            description_ = std::move(*description);
            queue_.pop_front();
            return Result::kChanged;
        }
        SourceUnit& front = std::get<SourceUnit>(queue_.front());
        const Pacer::Duration time = TimeOf(front);
        const auto due = pacer_.Due(time, std::chrono::steady_clock::now());
        if (due > deadline) {
            changed_.wait_until(lock, deadline, [this] { return stopped_; });
            return stopped_ ? Result::kStopped : Result::kIdle;
        }
        if (changed_.wait_until(lock, due, [this] { return stopped_; })) {
            return Result::kStopped;
        }
        queued_ -= front.size;
        unit = std::move(front);
        queue_.pop_front();
        pacer_.Taken(time, std::chrono::steady_clock::now());
        changed_.notify_all();
        return Result::kUnit;
    }
}

}  // namespace receiver
