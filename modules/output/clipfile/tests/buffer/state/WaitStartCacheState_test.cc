#include "buffer/state/WaitStartCacheState.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

#include "LogCapture.h"
#include "buffer/state/FakeStreamBuffer.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kDump;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kExecute[] = "clipfileModule::WaitStartCacheState::Execute";

class WaitStartCacheStateTest : public ::testing::Test {
 protected:
    std::shared_ptr<CacheState> execute(const std::shared_ptr<StreamData>& unit, const char* mediaType) {
        return state.Execute(unit, queue, mediaType);
    }

    FakeStreamBuffer buffer;
    WaitStartCacheState state{&buffer};
    std::shared_ptr<StreamQueue> queue = std::make_shared<StreamQueue>(20, false);
    LogCapture log;
};

std::shared_ptr<StreamData> video(std::uint64_t milliSec,
                                  const stream_units::VideoParts& parts = stream_units::kIdr) {
    return stream_units::VideoUnit(7, milliSec * 90, milliSec, parts);
}
std::shared_ptr<StreamData> audio(std::uint64_t milliSec) {
    return stream_units::AudioUnit(7, milliSec * 48, milliSec);
}
std::shared_ptr<StreamData> meta(std::uint64_t milliSec) {
    return stream_units::MetaUnit(7, milliSec * 90, milliSec);
}

TEST_F(WaitStartCacheStateTest, HasNameAndNumber) {
    EXPECT_EQ(state.GetName(), "wait_state");
    EXPECT_EQ(state.GetId(), kWaitStartState);
    state.OnEnter();
    state.OnExit();
    EXPECT_THAT(buffer.calls, IsEmpty());
    EXPECT_TRUE(state.CanFinish(queue->queue));
}

TEST_F(WaitStartCacheStateTest, DropsUnitsOfEveryMediumBeforeTheStart) {
    buffer.start = 90000;
    EXPECT_EQ(execute(video(999), "video"), nullptr);
    EXPECT_EQ(execute(audio(999), "audio"), nullptr);
    EXPECT_EQ(execute(meta(999), "meta"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST_F(WaitStartCacheStateTest, TakesUnitsAtTheStart) {
    buffer.start = 90089;  // less than a millisecond past 1000, which the division cuts off
    const auto unit = audio(1000);
    EXPECT_EQ(execute(unit, "audio"), nullptr);
    EXPECT_EQ(queue->queue.Pop(), unit);
    EXPECT_NE(execute(video(1000), "video"), nullptr);
}

TEST_F(WaitStartCacheStateTest, InDecodingOrderAPictureCountsFromWhenItIsShown) {
    WaitStartCacheState decoding(&buffer, RecordRules::kExact, PictureOrder::kDecoding);
    buffer.start = 90000;
    buffer.stop = 99000;
    const auto execute = [&](std::uint64_t milliSec, std::uint64_t shown) {
        const auto unit = video(milliSec);
        unit->presentation_timestamp = 90 * shown;
        const std::shared_ptr<CacheState> next = decoding.Execute(unit, queue, "video");
        return next == nullptr ? 0 : next->GetId();
    };
    EXPECT_EQ(execute(920, 999), 0);
    EXPECT_EQ(execute(920, 1000), kStartState);
    EXPECT_EQ(execute(1020, 1099), kStartState);
    EXPECT_EQ(execute(1020, 1100), kEndSyncRecState);
}

TEST_F(WaitStartCacheStateTest, TheStartIsTestedBeforeTheStop) {
    buffer.start = 180000;
    buffer.stop = 90000;
    EXPECT_EQ(execute(audio(1500), "audio"), nullptr);
    EXPECT_THAT(log.Lines(), IsEmpty());
    EXPECT_NE(execute(audio(2000), "audio"), nullptr);
}

TEST_F(WaitStartCacheStateTest, AUnitOfAnyMediumPastTheStopCancelsTheRecord) {
    buffer.start = 900;
    buffer.stop = 90000;
    const std::pair<const char*, std::shared_ptr<StreamData>> cases[] = {
        {"video", video(1001)}, {"audio", audio(1001)}, {"meta", meta(1001)}};
    for (const auto& [mediaType, unit] : cases) {
        log.Clear();
        const std::shared_ptr<CacheState> next = execute(unit, mediaType);
        ASSERT_NE(next, nullptr) << mediaType;
        EXPECT_EQ(next->GetId(), kEndSyncRecState);
        EXPECT_THAT(log.Texts(), ElementsAre("OP: REC CANCEL. RTPTS = 900. -> 90000"));
        EXPECT_TRUE(log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: REC CANCEL. RTPTS = 900. -> 90000"));
        EXPECT_EQ(log.Lines()[0].line, 0);
        EXPECT_FALSE(log.Lines()[0].file.has_value());
    }
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_THAT(buffer.calls, IsEmpty()) << "the removal is asked for on entry of the next state";
}

TEST_F(WaitStartCacheStateTest, AUnitAtTheStopIsStillTaken) {
    buffer.stop = 90000;
    EXPECT_EQ(execute(audio(1000), "audio"), nullptr);
    EXPECT_FALSE(queue->queue.Size() == 0);
    EXPECT_EQ(execute(video(1000), "video")->GetId(), kStartState);
}

TEST_F(WaitStartCacheStateTest, AnOpenRecordFromZeroDropsNoUnit) {
    const std::uint64_t times[] = {0, 1, 1ULL << 32, 1ULL << 57,
                                   std::numeric_limits<std::uint64_t>::max() / 90};
    for (const std::uint64_t time : times) {
        const auto unit = stream_units::AudioUnit(0, 0, time);
        EXPECT_EQ(execute(unit, "audio"), nullptr);
        EXPECT_EQ(queue->queue.Pop(), unit) << time;
    }
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST_F(WaitStartCacheStateTest, TimestampsAboveAllThatTicksCanHoldEndEvenAnOpenRecord) {
    const auto next =
        execute(stream_units::AudioUnit(0, 0, std::numeric_limits<std::uint64_t>::max() / 90 + 1), "audio");
    ASSERT_NE(next, nullptr);
    EXPECT_THAT(log.Texts(), ElementsAre("OP: REC CANCEL. RTPTS = 0. -> -1"));
}

TEST_F(WaitStartCacheStateTest, ANegativeStartLiesAboveEveryTimestamp) {
    buffer.start = -90;
    EXPECT_EQ(execute(audio(1ULL << 40), "audio"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
}

TEST_F(WaitStartCacheStateTest, AudioAndMetadataAreQueuedWhileVideoWaits) {
    const auto sound = audio(1000);
    const auto data = meta(1000);
    EXPECT_EQ(execute(sound, "audio"), nullptr);
    EXPECT_EQ(execute(data, "meta"), nullptr);
    EXPECT_EQ(queue->queue.Pop(), sound);
    EXPECT_EQ(queue->queue.Pop(), data);
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST_F(WaitStartCacheStateTest, VideoThatIsNoIdrFrameIsDropped) {
    EXPECT_EQ(execute(video(1000, stream_units::kPicture), "video"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_THAT(log.Texts(LOG_PRIORITY_TRACE), IsEmpty());
}

TEST_F(WaitStartCacheStateTest, ParameterSetsWithoutAnIdrSliceStartNothing) {
    EXPECT_EQ(execute(video(1000, {false, true, true}), "video"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
}

TEST_F(WaitStartCacheStateTest, AnIdrFrameWithoutSpsIsLoggedAndDropped) {
    EXPECT_EQ(execute(video(1000, {true, false, true}), "video"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_EQ(log.Count(LOG_PRIORITY_NOTICE, kExecute, "sps nal unit size is 0."), 1u);
    EXPECT_FALSE(log.Contains("pps nal unit size is 0."));
    EXPECT_EQ(log.Find("sps nal unit size is 0.")->file,
              "modules/output/clipfile/src/clipfileModule/buffer/state/WaitStartCacheState.cc");
}

TEST_F(WaitStartCacheStateTest, AnIdrFrameWithoutPpsIsLoggedAndDropped) {
    EXPECT_EQ(execute(video(1000, {true, true, false}), "video"), nullptr);
    EXPECT_TRUE(queue->queue.Size() == 0);
    EXPECT_EQ(log.Count(LOG_PRIORITY_NOTICE, kExecute, "pps nal unit size is 0."), 1u);
    EXPECT_FALSE(log.Contains("sps nal unit size is 0."));
}

TEST_F(WaitStartCacheStateTest, AnIdrFrameWithoutEitherSetLogsTheSpsAlone) {
    EXPECT_EQ(execute(video(1000, {true, false, false}), "video"), nullptr);
    EXPECT_TRUE(log.Contains("sps nal unit size is 0."));
    EXPECT_FALSE(log.Contains("pps nal unit size is 0."));
}

TEST_F(WaitStartCacheStateTest, TheNextIdrFrameTriesAgain) {
    EXPECT_EQ(execute(video(1000, {true, true, false}), "video"), nullptr);
    EXPECT_EQ(execute(video(1040, {true, false, true}), "video"), nullptr);
    EXPECT_EQ(execute(video(1080), "video")->GetId(), kStartState);
}

TEST_F(WaitStartCacheStateTest, AnIdrFrameWithBothSetsLeadsToTheStartState) {
    const auto idr = video(1000);
    const std::shared_ptr<CacheState> next = execute(idr, "video");
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(next->GetId(), kStartState);
    EXPECT_TRUE(queue->queue.Size() == 0) << "the frame reaches the cache on entry of the state";
    // The sets as they were sent: Baseline profile, level 3.0, 64 x 48 pixels; picture set 0 of sequence 0.
    EXPECT_THAT(log.Texts(), ElementsAre("IDR received. sps dump., size = 7.", "67 42 c0 1e da 11 e4 ",
                                         "IDR received. pps dump., size = 4.", "68 ce 38 80 ",
                                         "OP: IDR FRAME RECV. RTPTS = 90000."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kDump, "IDR received. sps dump., size = 7."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kDump, "IDR received. pps dump., size = 4."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: IDR FRAME RECV. RTPTS = 90000."));

    next->OnEnter();
    EXPECT_THAT(buffer.calls, ElementsAre("SetVideoSequenceHeader"));
    EXPECT_EQ(buffer.lastUnit, idr);
    EXPECT_EQ(buffer.lastSps.size, 7u);
    EXPECT_EQ(buffer.lastPps.size, 4u);
}

TEST_F(WaitStartCacheStateTest, RtpTimestampsAreShownAsSignedNumbers) {
    auto idr = stream_units::VideoUnit(0, 1ULL << 63, 1000, stream_units::kIdr);
    EXPECT_NE(execute(idr, "video"), nullptr);
    EXPECT_THAT(log.Texts(LOG_PRIORITY_OPERATOR),
                Contains("OP: IDR FRAME RECV. RTPTS = -9223372036854775808."));
}

class ExactWaitStartCacheStateTest : public WaitStartCacheStateTest {
 protected:
    std::shared_ptr<CacheState> executeExact(const std::shared_ptr<StreamData>& unit, const char* mediaType) {
        return exact.Execute(unit, queue, mediaType);
    }

    WaitStartCacheState exact{&buffer, RecordRules::kExact};
};

TEST_F(ExactWaitStartCacheStateTest, KeepsTheAudioThatAnIdrFrameOnTheStartNeeds) {
    buffer.start = 90000;
    EXPECT_EQ(executeExact(audio(988), "audio"), nullptr);
    EXPECT_EQ(queue->queue.Size(), 0u);
    // Half a frame of 1024 samples is 10.67 ms.
    EXPECT_EQ(executeExact(audio(989), "audio"), nullptr);
    EXPECT_EQ(queue->queue.Size(), 1u);
    EXPECT_EQ(executeExact(meta(999), "meta"), nullptr);
    EXPECT_EQ(executeExact(video(999), "video"), nullptr);
    EXPECT_EQ(queue->queue.Size(), 1u);
    EXPECT_EQ(executeExact(video(1000), "video")->GetId(), kStartState);
}

TEST_F(ExactWaitStartCacheStateTest, APictureAtTheStopCancelsTheRecord) {
    buffer.start = 900;
    buffer.stop = 90000;
    EXPECT_EQ(executeExact(video(999, stream_units::kPicture), "video"), nullptr);
    const std::shared_ptr<CacheState> next = executeExact(video(1000), "video");
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(next->GetId(), kEndSyncRecState);
    EXPECT_THAT(log.Texts(), ElementsAre("OP: REC CANCEL. RTPTS = 900. -> 90000"));
}

TEST_F(ExactWaitStartCacheStateTest, TheEndHoldsWhateverStopIsSet) {
    buffer.stop = 180000;
    buffer.end = 90000;
    EXPECT_EQ(executeExact(video(1000), "video")->GetId(), kEndSyncRecState);
    EXPECT_THAT(log.Texts(), ElementsAre("OP: REC CANCEL. RTPTS = 0. -> 90000"));
}

TEST_F(ExactWaitStartCacheStateTest, OtherMediaThatOvertookThePicturesDoNotCancelTheRecord) {
    buffer.end = 90000;
    // A queue of 50 pictures and the one in hand last 2.13 s at 23.98 frames a second.
    EXPECT_EQ(executeExact(audio(3200), "audio"), nullptr);
    EXPECT_EQ(executeExact(meta(3200), "meta"), nullptr);
    EXPECT_EQ(queue->queue.Size(), 2u);
    EXPECT_EQ(executeExact(video(999), "video")->GetId(), kStartState);
}

/// An IDR frame whose parameter sets have these sizes, with their headers.
std::shared_ptr<StreamData> idrWithSets(std::size_t spsSize, std::size_t ppsSize) {
    stream_units::Bytes payload;
    for (const auto& [set, size] :
         {std::pair{stream_units::Sps(), spsSize}, std::pair{stream_units::Pps(), ppsSize}}) {
        stream_units::Append(payload, {0, 0, 0, 1});
        stream_units::Append(payload, set);
        payload.insert(payload.end(), size - set.size(), 0x55);
    }
    stream_units::Append(payload, {0, 0, 1});
    stream_units::Append(payload, stream_units::Slice(true, 7));
    return stream_units::MakeUnit(payload, 90000, 1000);
}

TEST_F(ExactWaitStartCacheStateTest, AParameterSetThatNoFileCanHoldIsRefusedWithALine) {
    EXPECT_EQ(executeExact(idrWithSets(65536, 100), "video"), nullptr);
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_NOTICE, kExecute, "sps nal unit size is 65536."));
    log.Clear();
    EXPECT_EQ(executeExact(idrWithSets(100, 65536), "video"), nullptr);
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_NOTICE, kExecute, "pps nal unit size is 65536."));
    EXPECT_EQ(executeExact(idrWithSets(65535, 65535), "video")->GetId(), kStartState);
}

TEST_F(WaitStartCacheStateTest, WithKeptRulesAParameterSetThatNoFileCanHoldIsTaken) {
    EXPECT_EQ(execute(idrWithSets(65536, 65536), "video")->GetId(), kStartState);
}

TEST_F(ExactWaitStartCacheStateTest, WithoutPicturesTheOtherMediaCancelTheRecordALittleLater) {
    buffer.end = 90000;
    EXPECT_EQ(executeExact(audio(3999), "audio"), nullptr);
    EXPECT_EQ(executeExact(audio(4000), "audio")->GetId(), kEndSyncRecState);
    EXPECT_EQ(executeExact(meta(4000), "meta")->GetId(), kEndSyncRecState);
}

}  // namespace
}  // namespace clipfileModule
