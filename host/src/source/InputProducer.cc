#include "source/InputProducer.h"

#include <algorithm>
#include <array>
#include <utility>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

/// Seconds before each attempt; the last one repeats.
constexpr std::array<int, 5> kPauses{1, 2, 4, 8, 15};
/// A connection that has held so long was a good one, and the pauses begin anew behind it.
constexpr std::chrono::seconds kGood{30};

std::unique_ptr<Connection> Connect(const SourceOptions& options, const std::shared_ptr<Interrupt>& interrupt,
                                    bool (*stop)(), const SourceDescription* before) {
    try {
        return std::make_unique<Connection>(
            std::make_unique<Input>(options.url, options.timeout, interrupt, stop), options, before);
    } catch (const SourceLost& loss) {
        throw ReceiverError(ExitCode::kSourceUnavailable,
                            "the source was opened and lost at once: " + std::string(loss.what()));
    }
}

}  // namespace

InputProducer::InputProducer(const SourceOptions& options, std::shared_ptr<Interrupt> interrupt,
                             bool (*stop)())
    : options_(options),
      interrupt_(std::move(interrupt)),
      connection_(Connect(options_, interrupt_, stop, nullptr)),
      description_(connection_->Description()),
      recorded_(connection_->Recorded()),
      assembler_(description_.frameRate),
      connected_(Clock::now()),
      lastPicture_(connected_) {
    connection_->Begin(assembler_, 0);
}

bool InputProducer::Produce(Batch& batch) {
    if (end_) {
        throw ReceiverError(*end_);
    }
    // Not before the units that came last are on their way.
    away_ = connection_ == nullptr;
    bool more = true;
    try {
        if (!connection_) {
            TryAgain();
        } else {
            const std::int64_t before = assembler_.LastPicture();
            more = connection_->Pump();
            if (assembler_.LastPicture() != before) {
                lastPicture_ = Clock::now();
            }
            if (!more && !recorded_) {
                Lose("the connection has ended");
                more = options_.reconnect;
            }
        }
    } catch (const SourceLost& loss) {
        Lose(loss.what());
        if (!options_.reconnect || recorded_) {
            end_.emplace(ExitCode::kSourceUnavailable, "the source was lost: " + std::string(loss.what()));
        }
    } catch (const Stopped&) {
        more = false;
    }
    Publish();
    Batch made = assembler_.Take();
    std::move(made.begin(), made.end(), std::back_inserter(batch));
    return more;
}

void InputProducer::Lose(const std::string& reason) {
    const auto now = Clock::now();
    if (now - connected_ > kGood) {
        attempts_ = 0;
    }
    assembler_.Finish();
    if (options_.reconnect && !recorded_) {
        assembler_.AddNotice("the source was lost: " + reason + "; trying again in " +
                             std::to_string(kPauses[attempts_]) + " s");
    }
    damagedBefore_ += connection_->Damaged();
    connection_.reset();
    lost_ = now;
}

void InputProducer::TryAgain() {
    if (interrupt_->Wait(std::chrono::seconds(kPauses[attempts_]))) {
        throw Stopped();
    }
    attempts_ = std::min(attempts_ + 1, kPauses.size() - 1);
    try {
        connection_ = Connect(options_, interrupt_, nullptr, &description_);
    } catch (const SourceChanged&) {
        throw;
    } catch (const ReceiverError& error) {
        assembler_.AddNotice(std::string(error.what()) + "; trying again in " +
                             std::to_string(kPauses[attempts_]) + " s");
        return;
    }
    connected_ = Clock::now();
    ++reconnections_;
    using std::chrono::duration_cast;
    const auto away = duration_cast<std::chrono::seconds>(connected_ - lost_).count();
    assembler_.AddNotice("the source is back after " + std::to_string(away) + " s");
    // Time went on while the source was away.
    const auto passed = duration_cast<std::chrono::microseconds>(connected_ - lastPicture_).count() * 9 / 100;
    connection_->Begin(assembler_, std::max(assembler_.End(), assembler_.LastPicture() + passed));
}

void InputProducer::Publish() {
    lostFrames_ = assembler_.LostFrames();
    damaged_ = damagedBefore_ + (connection_ ? connection_->Damaged() : 0);
}

SourceCounts InputProducer::Counts() const {
    return {lostFrames_, damaged_, reconnections_, away_};
}

}  // namespace receiver
