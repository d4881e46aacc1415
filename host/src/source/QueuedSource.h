#pragma once

#include <condition_variable>
#include <exception>
#include <memory>
#include <mutex>
#include <thread>

#include "source/Interrupt.h"
#include "source/ProducerInterface.h"
#include "source/SourceInterface.h"
#include "timing/Pacer.h"

namespace receiver {

/// A source whose units a producer makes on a thread of this class, so that no wait of the producer (network,
/// decoder, a pause between attempts) holds up who reads; hands them over when they are due.
class QueuedSource final : public SourceInterface {
 public:
    /// `interrupt` is the one that ends the producer's waits. The producer works ahead until `capacity` units
    /// wait. `listener` must live as long as this.
    QueuedSource(std::unique_ptr<ProducerInterface> producer, std::shared_ptr<Interrupt> interrupt,
                 Pacer pacer, std::size_t capacity, SourceListenerInterface& listener);
    QueuedSource(const QueuedSource&) = delete;
    QueuedSource& operator=(const QueuedSource&) = delete;
    ~QueuedSource() override;

    /// For the reading thread.
    const SourceDescription& Description() const override { return description_; }
    Result Read(SourceUnit& unit) override;
    SourceCounts Counts() const override { return producer_->Counts(); }
    void Stop() override;

    /// Units, sentences and descriptions that wait for the reader. From any thread.
    std::size_t Queued() const;

 private:
    void Run();
    /// Takes what is in front out of the queue. Under the lock.
    void DropFront();

    const std::unique_ptr<ProducerInterface> producer_;
    const std::shared_ptr<Interrupt> interrupt_;
    const std::size_t capacity_;
    /// Units that must wait before the reader who found none goes on.
    const std::size_t refill_;
    /// The producer that had no room goes on when no more than so many wait, of so many bytes: of a live
    /// source as soon as there is any room, since the network does not wait.
    const std::size_t resume_;
    const std::size_t resumeBytes_;
    SourceListenerInterface& listener_;
    /// Of the reading thread alone.
    Pacer pacer_;
    SourceDescription description_;

    /// Guards what follows.
    mutable std::mutex mutex_;
    /// For the reader: units came, the producer ended, or a stop.
    std::condition_variable arrived_;
    /// For the producer: there is room again, or a stop.
    std::condition_variable room_;
    /// The producer waits for room.
    bool full_ = false;
    Batch queue_;
    /// Bytes of the units in the queue.
    std::size_t queued_ = 0;
    bool stopped_ = false;
    bool ended_ = false;
    /// What ended the producer, until it was thrown once.
    std::exception_ptr failure_;

    std::thread thread_;
};

}  // namespace receiver
