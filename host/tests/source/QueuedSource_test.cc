#include "source/QueuedSource.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <stdexcept>
#include <thread>
#include <vector>

#include "support/WaitUntil.h"

namespace receiver {
namespace {

constexpr std::size_t kCapacity = 100;

/// Makes numbered pictures one by one, as many as it is allowed to.
class Pictures final : public ProducerInterface {
 public:
    struct Script {
        /// Pictures that may be made, and after which the source is over, or fails.
        std::atomic<int> allowed{0};
        int last = 1000000;
        bool fails = false;
        /// Each picture comes with so many sentences behind it.
        int notices = 0;
        std::atomic<int> made{0};
        /// How often a picture was asked for.
        std::atomic<int> calls{0};
    };

    Pictures(std::shared_ptr<Script> script, std::shared_ptr<Interrupt> interrupt)
        : script_(std::move(script)), interrupt_(std::move(interrupt)) {}

    const SourceDescription& Description() const override { return description_; }
    SourceCounts Counts() const override { return {}; }
    bool Produce(Batch& batch) override {
        ++script_->calls;
        while (script_->made == script_->allowed) {
            if (interrupt_->Wait(std::chrono::milliseconds(1))) {
                return false;
            }
        }
        SourceUnit unit;
        unit.time = script_->made * std::int64_t{90};
        batch.emplace_back(std::move(unit));
        for (int n = 0; n < script_->notices; ++n) {
            batch.emplace_back(std::string("a sentence"));
        }
        if (++script_->made == script_->last && script_->fails) {
            throw std::runtime_error("the source broke");
        }
        return script_->made != script_->last;
    }

 private:
    const std::shared_ptr<Script> script_;
    const std::shared_ptr<Interrupt> interrupt_;
    const SourceDescription description_;
};

class QueuedSourceTest : public ::testing::Test, public SourceListenerInterface {
 protected:
    void OnNotice(const std::string& /*sentence*/) override {}

    std::unique_ptr<QueuedSource> Open(Pacer pacer) {
        auto interrupt = std::make_shared<Interrupt>();
        return std::make_unique<QueuedSource>(std::make_unique<Pictures>(script_, interrupt), interrupt,
                                              pacer, kCapacity, *this);
    }
    /// Reads past the moments in which nothing came.
    static SourceInterface::Result ReadNext(QueuedSource& source, SourceUnit& unit) {
        auto result = SourceInterface::Result::kIdle;
        while (result == SourceInterface::Result::kIdle) {
            result = source.Read(unit);
        }
        return result;
    }
    /// Reads that many units and expects them in order.
    static void ExpectUnits(QueuedSource& source, int from, int count) {
        SourceUnit unit;
        for (int n = from; n < from + count; ++n) {
            ASSERT_EQ(ReadNext(source, unit), SourceInterface::Result::kUnit);
            EXPECT_EQ(unit.time, n * 90);
        }
    }

    const std::shared_ptr<Pictures::Script> script_ = std::make_shared<Pictures::Script>();
};

/// No unit of the test comes before it is due at this speed.
constexpr double kFast = 1e6;

TEST_F(QueuedSourceTest, ALiveUnitIsHandedOverThoughNoOtherFollows) {
    const auto source = Open(Pacer::ForLive(kFast));
    script_->allowed = 1;
    ExpectUnits(*source, 0, 1);
    script_->allowed = 2;
    ExpectUnits(*source, 1, 1);
}

TEST_F(QueuedSourceTest, UnitsOfAFileThatStaysBehindAreHandedOverToo) {
    const auto source = Open(Pacer::ForFile(kFast));
    script_->allowed = 3;
    ExpectUnits(*source, 0, 3);
}

TEST_F(QueuedSourceTest, TheLastUnitsOfAFileComeBeforeItsEnd) {
    const auto source = Open(Pacer::ForFile(kFast));
    script_->last = 205;
    script_->allowed = 1000;
    ExpectUnits(*source, 0, 205);
    SourceUnit unit;
    EXPECT_EQ(ReadNext(*source, unit), SourceInterface::Result::kEnd);
}

TEST_F(QueuedSourceTest, TheLastUnitsComeBeforeTheFailure) {
    const auto source = Open(Pacer::ForFile(kFast));
    script_->last = 7;
    script_->fails = true;
    script_->allowed = 1000;
    // The unit in which the source breaks is lost with it.
    ExpectUnits(*source, 0, 6);
    SourceUnit unit;
    EXPECT_THROW(ReadNext(*source, unit), std::runtime_error);
    EXPECT_EQ(source->Read(unit), SourceInterface::Result::kEnd);
}

TEST_F(QueuedSourceTest, AProducerOfAFileThatIsAheadGoesOnWhenHalfWasTaken) {
    const auto source = Open(Pacer::ForFile(kFast));
    script_->allowed = 100;
    ASSERT_TRUE(WaitUntil([&] { return source->Queued() == kCapacity; }));
    script_->allowed = 1000;
    ExpectUnits(*source, 0, 49);
    EXPECT_EQ(script_->calls, 100);
    ExpectUnits(*source, 49, 1);
    ASSERT_TRUE(WaitUntil([&] { return source->Queued() == kCapacity; }));
    EXPECT_EQ(script_->made, 150);
}

TEST_F(QueuedSourceTest, ALiveProducerGoesOnAsSoonAsThereIsRoom) {
    const auto source = Open(Pacer::ForLive(kFast));
    script_->allowed = 1000;
    ASSERT_TRUE(WaitUntil([&] { return source->Queued() == kCapacity; }));
    ExpectUnits(*source, 0, 1);
    ASSERT_TRUE(WaitUntil([&] { return source->Queued() == kCapacity; }));
    EXPECT_EQ(script_->made, 101);
}

TEST_F(QueuedSourceTest, SentencesMakeRoomAsUnitsDo) {
    script_->notices = 200;
    script_->last = 3;
    const auto source = Open(Pacer::ForFile(kFast));
    script_->allowed = 3;
    ExpectUnits(*source, 0, 3);
    SourceUnit unit;
    EXPECT_EQ(ReadNext(*source, unit), SourceInterface::Result::kEnd);
}

TEST_F(QueuedSourceTest, AStopEndsTheWaitOfTheReader) {
    // Due long after the test.
    const auto source = Open(Pacer::ForFile(1e-9));
    script_->allowed = 50;
    ExpectUnits(*source, 0, 1);
    std::promise<void> reading;
    auto result = std::async(std::launch::async, [&] {
        reading.set_value();
        SourceUnit unit;
        return ReadNext(*source, unit);
    });
    reading.get_future().wait();
    source->Stop();
    EXPECT_EQ(result.get(), SourceInterface::Result::kStopped);
}

TEST_F(QueuedSourceTest, AStopEndsTheWaitOfAProducerWithoutRoom) {
    const auto source = Open(Pacer::ForFile(kFast));
    script_->allowed = 1000;
    ASSERT_TRUE(WaitUntil([&] { return source->Queued() == kCapacity; }));
    SourceUnit unit;
    source->Stop();
    EXPECT_EQ(source->Read(unit), SourceInterface::Result::kStopped);
    // The destructor waits for the producer's thread.
}

TEST_F(QueuedSourceTest, AUnitIsNotHandedOverBeforeItIsDue) {
    // The second picture, a millisecond behind the first, is due after 1000 s.
    const auto source = Open(Pacer::ForFile(1e-6));
    script_->allowed = 50;
    ExpectUnits(*source, 0, 1);
    SourceUnit unit;
    EXPECT_EQ(source->Read(unit), SourceInterface::Result::kIdle);
}

}  // namespace
}  // namespace receiver
