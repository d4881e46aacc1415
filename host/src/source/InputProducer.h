#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>

#include "common/ReceiverError.h"
#include "source/Connection.h"
#include "source/Interrupt.h"
#include "source/ProducerInterface.h"
#include "source/StopCheck.h"

namespace receiver {

/// Seconds that an attempt listens for a sender.
inline constexpr double kListeningPatience = 60;

/// The units of an address: of one connection after the other, since a live source that was lost is tried
/// again, after pauses that grow, until it is back or somebody stops.
class InputProducer final : public ProducerInterface {
 public:
    /// Opens the source, which may take `patience` seconds to answer. `stop` is asked until this returns.
    /// Throws `ReceiverError`, of it `SourceAbsent` where a later attempt may succeed, and `Stopped`.
    InputProducer(const SourceOptions& options, double patience, std::shared_ptr<Interrupt> interrupt,
                  const StopCheck& stop);

    const SourceDescription& Description() const override { return description_; }
    bool Produce(Batch& batch) override;
    SourceCounts Counts() const override;
    /// Files and servers of files.
    bool Recorded() const { return recorded_; }

 private:
    using Clock = std::chrono::steady_clock;

    /// One attempt, or one packet of the present connection. False at the end. Throws `ReceiverError` for a
    /// connection that cannot be recorded any further.
    bool Step();
    void Lose(const std::string& reason);
    /// Ends a connection that cannot be recorded any further.
    void Fail(const ReceiverError& error);
    void Drop();
    /// Keeps the counts of the connection, which is over.
    void KeepCounts();
    void TryAgain();
    /// Tells why an attempt failed.
    void TellFailure(const ReceiverError& error);
    std::string NextAttempt() const;
    void Change(const std::string& reason);
    /// Goes on with `connection`, `passed` ticks after the last picture. `changed`: as another source, even
    /// if it looks the same.
    void GoOn(std::unique_ptr<Connection> connection, std::int64_t passed, bool changed);
    void EndWith(const ReceiverError& error);
    void Publish();

    const SourceOptions options_;
    const std::shared_ptr<Interrupt> interrupt_;
    std::unique_ptr<Connection> connection_;
    SourceDescription description_;
    bool recorded_ = false;
    UnitAssembler assembler_;
    /// When the present connection began, and when the source last gave a picture.
    Clock::time_point connected_;
    Clock::time_point lastPicture_;
    Clock::time_point lost_;
    /// Which pause comes next.
    std::size_t attempts_ = 0;
    /// When the last attempt began and when one was told of; where a sender is waited for.
    Clock::time_point tried_;
    Clock::time_point told_;
    std::uint64_t damagedBefore_ = 0;
    std::uint64_t earlyBefore_ = 0;
    /// Ends the source when all that came before it has been handed over.
    std::optional<ReceiverError> end_;

    std::atomic<std::uint64_t> lostFrames_{0};
    std::atomic<std::uint64_t> silentFrames_{0};
    std::atomic<std::uint64_t> damaged_{0};
    std::atomic<std::uint64_t> reconnections_{0};
    std::atomic<std::uint64_t> changes_{0};
    std::atomic<bool> away_{false};
    std::atomic<std::uint64_t> earlyPictures_{0};
};

}  // namespace receiver
