// What one unit of the stream costs on its way from a recording's push to the chunk that holds it.

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

#include "buffer/StreamBuffer.h"
#include "support/ControllerRecorder.h"
#include "support/FileOutputRecorder.h"
#include "support/StreamUnits.h"

namespace {

using clipfileModule::ChunkData;
using clipfileModule::OutputSettings;
using clipfileModule::StreamBuffer;

/// A unit that shares its payload with all others of its kind, as a host's would be its own.
std::shared_ptr<StreamData> unitOf(const StreamData& kind, std::uint64_t rtp, std::uint64_t milliSec) {
    auto unit = std::make_shared<StreamData>(kind);
    unit->rtp_timestamp = rtp;
    unit->timestamp = milliSec;
    return unit;
}

/// 60 frames a second; `state.range(0)` recordings of `state.range(1)` bytes a picture. An item is one unit
/// in one recording. Times are per frame: one video and one metadata unit, and 0.78 audio units.
void BM_UnitsToChunks(benchmark::State& state) {
    const auto recordings = static_cast<std::size_t>(state.range(0));
    const auto pictureSize = static_cast<std::size_t>(state.range(1));
    stream_units::StreamClock clock;
    clock.rate = stream_units::kFrameRates[7];

    auto idrBytes = stream_units::VideoPayload(0, stream_units::kIdr);
    idrBytes.resize(idrBytes.size() + pictureSize, 0x55);
    auto pictureBytes = stream_units::VideoPayload(1, stream_units::kPicture);
    pictureBytes.resize(pictureBytes.size() + pictureSize, 0x55);
    const auto idr = stream_units::MakeUnit(idrBytes, 0, 0);
    const auto picture = stream_units::MakeUnit(pictureBytes, 0, 0);
    const auto audio = stream_units::MakeUnit(stream_units::Bytes(300, 0x21), 0, 0);
    const auto meta = stream_units::MetaUnit(0, 0, 0, {true, stream_units::Timecode{1, 2, 3, 4, false}});

    FileOutputRecorder recorder;
    recorder.SetChunkHook(
        [](std::size_t, const std::shared_ptr<ChunkData>& chunk) { benchmark::DoNotOptimize(chunk->size); });
    ControllerRecorder controller;
    OutputSettings settings;
    settings.framerate = clock.rate.key;
    settings.fileType = "normal";
    std::vector<std::shared_ptr<StreamBuffer>> buffers;
    for (std::size_t i = 0; i < recordings; ++i) {
        buffers.push_back(std::make_shared<StreamBuffer>(&controller, 0, -1));
        buffers.back()->Start(settings);
    }

    std::uint64_t frame = 0;
    std::uint64_t audioFrame = 0;
    const auto pushFrame = [&] {
        for (; audioFrame < clock.AudioBefore(frame + 1); ++audioFrame) {
            const auto unit = unitOf(*audio, clock.AudioRtp(audioFrame), clock.AudioMilliSec(audioFrame));
            for (const auto& buffer : buffers) {
                buffer->PushAudio(unit);
            }
        }
        const auto metaUnit = unitOf(*meta, clock.VideoRtp(frame), clock.VideoMilliSec(frame));
        const auto videoUnit =
            unitOf(frame % 60 == 0 ? *idr : *picture, clock.VideoRtp(frame), clock.VideoMilliSec(frame));
        for (const auto& buffer : buffers) {
            buffer->PushMeta(metaUnit);
            buffer->PushVideo(videoUnit);
        }
        ++frame;
    };
    /// All recordings have cut what was pushed, but for some frames that fill no chunk yet.
    const auto settle = [&](std::uint64_t backlog) {
        for (std::size_t i = 0; i < recordings; ++i) {
            while (frame > backlog &&
                   !recorder.WaitForChunks((frame - backlog) / 8, i, std::chrono::milliseconds(1))) {
                pushFrame();
            }
        }
    };
    for (auto _ : state) {
        pushFrame();
        if (frame % 64 == 0) {
            settle(200);
        }
    }
    settle(32);
    for (const auto& buffer : buffers) {
        buffer->Stop();
    }
    if (!controller.Calls().empty()) {
        state.SkipWithError("a recording failed");
    }
    state.SetItemsProcessed(static_cast<std::int64_t>((2 * frame + audioFrame) * recordings));
    state.SetBytesProcessed(static_cast<std::int64_t>(frame * pictureSize * recordings));
}

/// Small pictures show the cost of the road; 125,000 bytes are 60 Mb/s.
BENCHMARK(BM_UnitsToChunks)
    ->ArgNames({"recordings", "bytes"})
    ->ArgsProduct({{1, 2, 4}, {100, 125000}})
    ->MeasureProcessCPUTime()
    ->UseRealTime();

}  // namespace
