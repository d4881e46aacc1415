#include "source/InputProducer.h"

#include <algorithm>
#include <utility>

#include "common/ReceiverError.h"
#include "source/Address.h"
#include "source/AwaitSource.h"

namespace receiver {
namespace {

std::unique_ptr<Connection> Connect(const SourceOptions& options, double patience,
                                    const std::shared_ptr<Interrupt>& interrupt, const StopCheck& stop,
                                    const SourceDescription* before) {
    try {
        return std::make_unique<Connection>(
            std::make_unique<Input>(options.url, options.timeout, patience, interrupt, stop), options,
            before);
    } catch (const SourceLost& loss) {
        const std::string sentence = "the source was opened and lost at once: " + std::string(loss.what());
        if (IsLive(options.url)) {
            throw SourceAbsent(sentence);
        }
        throw ReceiverError(ExitCode::kSourceUnavailable, sentence);
    }
}

std::int64_t Ticks(std::chrono::steady_clock::duration time) {
    return std::chrono::duration_cast<std::chrono::microseconds>(time).count() * 9 / 100;
}

}  // namespace

InputProducer::InputProducer(const SourceOptions& options, double patience,
                             std::shared_ptr<Interrupt> interrupt, const StopCheck& stop)
    : options_(options),
      interrupt_(std::move(interrupt)),
      connection_(Connect(options_, patience, interrupt_, stop, nullptr)),
      description_(connection_->Description()),
      recorded_(connection_->Recorded()),
      assembler_(description_.frameRate),
      pauses_(Listens(options_.url)),
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
        more = Step();
    } catch (const ReceiverError& error) {
        Fail(error);
    }
    Publish();
    Batch made = assembler_.Take();
    std::move(made.begin(), made.end(), std::back_inserter(batch));
    return more;
}

bool InputProducer::Step() {
    bool more = true;
    try {
        if (!connection_) {
            TryAgain();
        } else {
            const std::int64_t before = assembler_.LastPicture();
            more = connection_->Pump();
            const std::int64_t last = assembler_.LastPicture();
            if (last != before) {
                // What the libraries held back came with the picture before.
                lastPicture_ = connection_->Flushing() && before >= 0
                                   ? lastPicture_ + std::chrono::microseconds((last - before) * 100 / 9)
                                   : Clock::now();
            }
            if (!more && recorded_) {
                connection_->Finish();
            } else if (!more) {
                Lose("the connection has ended");
                more = options_.reconnect;
            }
        }
    } catch (const FormatChanged& change) {
        try {
            Change(change.what());
        } catch (const Stopped&) {
            more = false;
        }
    } catch (const SourceLost& loss) {
        Lose(loss.what());
        if (!options_.reconnect || recorded_) {
            end_.emplace(ExitCode::kSourceUnavailable, "the source was lost: " + std::string(loss.what()));
        }
    } catch (const Stopped&) {
        more = false;
    }
    return more;
}

void InputProducer::Lose(const std::string& reason) {
    connection_->Finish();
    Drop();
    if (options_.reconnect && !recorded_) {
        assembler_.AddNotice("the source was lost: " + reason + NextAttempt());
        told_ = lost_;
    }
}

void InputProducer::Fail(const ReceiverError& error) {
    if (connection_) {
        // What its decoders and encoders hold cannot be relied on any more.
        assembler_.Finish();
        Drop();
    }
    EndWith(error);
}

void InputProducer::Drop() {
    lost_ = Clock::now();
    pauses_.Lost(lost_ - connected_);
    KeepCounts();
    connection_.reset();
}

void InputProducer::KeepCounts() {
    damagedBefore_ += connection_->Damaged();
    earlyBefore_ += connection_->EarlyPictures();
}

void InputProducer::TryAgain() {
    if (interrupt_->Wait(pauses_.Next(Clock::now()))) {
        throw Stopped();
    }
    pauses_.Tried(Clock::now());
    std::unique_ptr<Connection> connection;
    try {
        connection = Connect(options_, Listens(options_.url) ? kListeningPatience : options_.timeout,
                             interrupt_, nullptr, &description_);
    } catch (const ReceiverError& error) {
        TellFailure(error);
        return;
    }
    connected_ = Clock::now();
    ++reconnections_;
    using std::chrono::duration_cast;
    const auto away = duration_cast<std::chrono::seconds>(connected_ - lost_).count();
    assembler_.AddNotice("the source is back after " + std::to_string(away) + " s");
    const std::int64_t passed = Ticks(connection->Arrived() - lastPicture_);
    GoOn(std::move(connection), passed, false);
    changedFor_.clear();
}

void InputProducer::Change(const std::string& reason) {
    // What it still gives out stands in front of that.
    const std::int64_t position = connection_->Position();
    connection_->Finish();
    ++changes_;
    KeepCounts();
    const std::int64_t passed = recorded_ ? 0 : Ticks(Clock::now() - lastPicture_);
    // What was opened anew for this and shows it again at once would do so for ever.
    const bool again = !connection_->Used() && reason == changedFor_;
    Packets unread = connection_->TakeUnread();
    std::unique_ptr<Input> input = Connection::End(std::move(connection_));
    lost_ = Clock::now();
    try {
        if (again || !input->Renew(position, std::move(unread))) {
            throw ReceiverError(ExitCode::kSourceUnsuitable, reason + ": what follows " +
                                                                 (recorded_ ? "in this file " : "") +
                                                                 "cannot be understood, and is left out");
        }
        auto connection = std::make_unique<Connection>(std::move(input), options_, nullptr);
        assembler_.AddNotice(reason + ": the recording goes on in a new file");
        GoOn(std::move(connection), passed, true);
        changedFor_ = reason;
    } catch (const SourceLost& loss) {
        EndWith(ReceiverError(ExitCode::kSourceUnavailable,
                              reason + ", and the source was lost: " + loss.what()));
    } catch (const ReceiverError& error) {
        EndWith(error);
    }
}

void InputProducer::EndWith(const ReceiverError& error) {
    if (recorded_ || !options_.reconnect) {
        end_ = error;
        return;
    }
    TellFailure(error);
}

std::string InputProducer::NextAttempt() const {
    const auto pause = std::chrono::duration_cast<std::chrono::seconds>(pauses_.Next(Clock::now()));
    return Listens(options_.url) ? "; waiting for it"
                                 : "; trying again in " + std::to_string(pause.count()) + " s";
}

void InputProducer::TellFailure(const ReceiverError& error) {
    const auto now = Clock::now();
    if (!Listens(options_.url) || now - told_ >= kTellEvery) {
        assembler_.AddNotice(error.what() + NextAttempt());
        told_ = now;
    }
}

void InputProducer::GoOn(std::unique_ptr<Connection> connection, std::int64_t passed, bool changed) {
    connection_ = std::move(connection);
    const SourceDescription& now = connection_->Description();
    const bool other = now.width != description_.width || now.height != description_.height ||
                       now.frameRate != description_.frameRate || now.reordering != description_.reordering;
    if (other && !changed) {
        assembler_.AddNotice("the source came back as " + now.summary + " and was " + description_.summary +
                             ": the recording goes on in a new file");
        ++changes_;
    }
    description_ = now;
    if (other || changed) {
        assembler_.AddChange(description_);
    }
    // Time went on while the source was away.
    connection_->Begin(assembler_, std::max<std::int64_t>(1, assembler_.LastPicture() + passed));
}

void InputProducer::Publish() {
    lostFrames_ = assembler_.LostFrames();
    silentFrames_ = assembler_.SilentFrames();
    damaged_ = damagedBefore_ + (connection_ ? connection_->Damaged() : 0);
    earlyPictures_ = earlyBefore_ + (connection_ ? connection_->EarlyPictures() : 0);
}

SourceCounts InputProducer::Counts() const {
    return {lostFrames_, damaged_, reconnections_, changes_, away_, silentFrames_, earlyPictures_};
}

}  // namespace receiver
