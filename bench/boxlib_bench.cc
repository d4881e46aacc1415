// What the box library costs: entering samples, the memory that they take, and measuring and writing `moov`
// and the fragments that follow it, also after many of them.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "boxlib/core/context.h"
#include "boxlib/mbx.h"
#include "boxlib/mbx_stdio.h"

namespace {

constexpr std::uint32_t kSamplesPerChunk = 8;

/// Stands in for a file: what is written goes to memory at the position sought.
struct Target {
    std::vector<std::uint8_t> bytes;
    std::uint64_t position = 0;
};

Target* targetOf(MbxFile* file) {
    return reinterpret_cast<Target*>(file);
}

MbxStatus seekTarget(MbxFile* file, std::int64_t offset, std::uint32_t) {
    targetOf(file)->position = static_cast<std::uint64_t>(offset);
    return MBX_OK;
}

MbxStatus writeTarget(MbxFile* file, const void* data, std::uint64_t size, std::uint64_t* count) {
    Target* target = targetOf(file);
    if (size > target->bytes.size() - target->position) return MBX_ERR_IO;
    std::memcpy(target->bytes.data() + target->position, data, size);
    target->position += size;
    *count = size;
    return MBX_OK;
}

/// A benchmark has no one to report to: a failure ends the program.
void check(MbxStatus status) {
    if (status != MBX_OK) std::abort();
}

/// A movie whose tracks take samples. The quota is out of reach and makes the context count its memory.
class Movie {
 public:
    Movie() {
        MbxCallbacks callbacks = {};
        MbxStdioCallbacks(&callbacks);
        callbacks.seek = seekTarget;
        callbacks.write = writeTarget;
        check(MbxCreateContext(&callbacks, &m_context));
        MbxSessionConfig config = {};
        config.memory_quota = std::uint64_t{1} << 40;
        config.options.chunk_offset_mode = 2;
        check(MbxSessionCreate(m_context, &config, &m_session));
        check(MbxCreateMovie(m_session, 60000));
    }
    ~Movie() {
        check(MbxSessionDestroy(m_session));
        check(MbxDestroyContext(m_context));
    }
    Movie(const Movie&) = delete;
    Movie& operator=(const Movie&) = delete;

    std::uint32_t addVideo() {
        const MbxTrackParams params = trackParams(60000);
        std::uint32_t track = 0;
        std::uint32_t index = 0;
        check(MbxAddVideoTrack(m_session, &params, &track));
        check(MbxAddDataReference(m_session, track, nullptr, 0, &index));
        const MbxVisualEntryParams entry = {1, 1, 1920, 1080, 72, 0, 72, 0};
        check(MbxAddVideoEntry(m_session, track, &entry, &index));
        return track;
    }

    std::uint32_t addSound() {
        const MbxTrackParams params = trackParams(48000);
        std::uint32_t track = 0;
        std::uint32_t index = 0;
        check(MbxAddSoundTrack(m_session, &params, &track));
        check(MbxAddDataReference(m_session, track, nullptr, 0, &index));
        const MbxAudioEntryParams entry = {1, 2, 16};
        check(MbxAddSoundEntry(m_session, track, &entry, &index));
        return track;
    }

    std::uint32_t addMeta() {
        const MbxTrackParams params = trackParams(60000);
        std::uint32_t track = 0;
        std::uint32_t index = 0;
        check(MbxAddMetaTrack(m_session, &params, &track));
        check(MbxAddDataReference(m_session, track, nullptr, 0, &index));
        const MbxMetaEntryParams entry = {1};
        check(MbxAddMetaEntry(m_session, track, &entry, &index));
        return track;
    }

    MbxSession* session() { return m_session; }
    std::uint64_t usedBytes() const { return m_context->class1_used; }

 private:
    MbxTrackParams trackParams(std::uint32_t timescale) {
        MbxTrackParams params = {};
        params.trackId = ++m_lastTrackId;
        params.timescale = timescale;
        params.language = 0x55C4;
        params.enable_mode = 1;
        return params;
    }

    MbxContext* m_context = nullptr;
    MbxSession* m_session = nullptr;
    std::uint32_t m_lastTrackId = 0;
};

/// A sample as a live stream gives it; with `varies` each has a size of its own.
MbxSampleInfo sampleAt(std::uint64_t number, bool varies) {
    MbxSampleInfo sample = {};
    sample.size = varies ? 20000 + static_cast<std::uint32_t>(number * 2654435761U >> 20) : 20000;
    sample.offset = number * 40000;
    sample.duration = 1000;
    sample.isSync = number % 32 == 0 ? 1 : 0;
    sample.descriptionIndex = 1;
    return sample;
}

/// An item is one sample, its part of closing a chunk included. `state.range(0)`: sizes vary.
void BM_AddSample(benchmark::State& state) {
    constexpr std::uint64_t kSamples = 1000000;
    const bool varies = state.range(0) != 0;
    std::uint64_t taken = 0;
    for (auto _ : state) {
        state.PauseTiming();
        {
            Movie movie;
            const std::uint32_t track = movie.addVideo();
            const std::uint64_t before = movie.usedBytes();
            MbxSession* session = movie.session();
            state.ResumeTiming();
            for (std::uint64_t number = 0; number < kSamples; ++number) {
                const MbxSampleInfo sample = sampleAt(number, varies);
                check(MbxAddSample(session, track, &sample, 0));
                if ((number + 1) % kSamplesPerChunk == 0) check(MbxEndChunk(session, track));
            }
            state.PauseTiming();
            taken = movie.usedBytes() - before;
        }
        state.ResumeTiming();
    }
    state.SetItemsProcessed(static_cast<std::int64_t>(kSamples) * state.iterations());
    state.counters["bytes_per_million"] = static_cast<double>(taken);
}
BENCHMARK(BM_AddSample)->ArgName("varies")->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

/// 60 pictures and metadata units a second, audio at 48 kHz, 450 chunks a track and minute.
void addMinutes(Movie* movie, std::uint64_t minutes) {
    const std::uint64_t chunks = 450 * minutes;
    const std::uint64_t audioSamples = minutes * 60 * 48000 / 1024;
    const std::uint32_t video = movie->addVideo();
    const std::uint32_t sound = movie->addSound();
    const std::uint32_t meta = movie->addMeta();
    MbxSession* session = movie->session();
    std::uint64_t audio = 0;
    for (std::uint64_t chunk = 0; chunk < chunks; ++chunk) {
        for (std::uint64_t i = 0; i < kSamplesPerChunk; ++i) {
            const std::uint64_t number = chunk * kSamplesPerChunk + i;
            const MbxSampleInfo picture = sampleAt(number, true);
            check(MbxAddSample(session, video, &picture, 0));
            MbxSampleInfo unit = sampleAt(number, false);
            unit.isSync = 1;
            check(MbxAddSample(session, meta, &unit, 0));
        }
        for (; audio < (chunk + 1) * audioSamples / chunks; ++audio) {
            MbxSampleInfo frame = sampleAt(audio, true);
            frame.duration = 1024;
            frame.isSync = 1;
            check(MbxAddSample(session, sound, &frame, 0));
        }
        for (const std::uint32_t track : {video, sound, meta}) check(MbxEndChunk(session, track));
    }
}

constexpr std::uint64_t kTwoHours = 120;

/// What is done before each chunk of a normal file: `moov` is measured, after so many minutes.
void BM_SpaceCheck(benchmark::State& state) {
    Movie movie;
    addMinutes(&movie, static_cast<std::uint64_t>(state.range(0)));
    std::uint64_t size = 0;
    for (auto _ : state) {
        check(MbxWriteMoov(movie.session(), nullptr, 0, &size));
        benchmark::DoNotOptimize(size);
    }
    state.counters["moov_bytes"] = static_cast<double>(size);
}
BENCHMARK(BM_SpaceCheck)
    ->ArgName("minutes")
    ->Arg(1)
    ->Arg(10)
    ->Arg(60)
    ->Arg(120)
    ->Arg(480)
    ->Arg(1440)
    ->Unit(benchmark::kMicrosecond);

/// `state.range(0)` 0: measured alone. 1: measured and written, to memory.
void BM_WriteMoov(benchmark::State& state) {
    Movie movie;
    addMinutes(&movie, kTwoHours);
    std::uint64_t size = 0;
    check(MbxWriteMoov(movie.session(), nullptr, 0, &size));
    Target target;
    target.bytes.resize(size);
    auto* file = state.range(0) != 0 ? reinterpret_cast<MbxFile*>(&target) : nullptr;
    for (auto _ : state) {
        check(MbxWriteMoov(movie.session(), file, 0, &size));
        benchmark::DoNotOptimize(target.bytes.data());
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(size) * state.iterations());
    state.counters["moov_bytes"] = static_cast<double>(size);
}
BENCHMARK(BM_WriteMoov)->ArgName("written")->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

/// What copying as many bytes as that `moov` has costs: the measure for the above.
void BM_CopyMoovBytes(benchmark::State& state) {
    Movie movie;
    addMinutes(&movie, kTwoHours);
    std::uint64_t size = 0;
    check(MbxWriteMoov(movie.session(), nullptr, 0, &size));
    std::vector<std::uint8_t> source(size, 1);
    std::vector<std::uint8_t> destination(size);
    for (auto _ : state) {
        std::copy(source.begin(), source.end(), destination.begin());
        benchmark::DoNotOptimize(destination.data());
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(size) * state.iterations());
}
BENCHMARK(BM_CopyMoovBytes)->Unit(benchmark::kMillisecond);

/// Adds up what the steps of a loop take, in nanoseconds.
class StepTimer {
 public:
    void end(double* step) {
        const Clock::time_point now = Clock::now();
        *step += std::chrono::duration<double, std::nano>(now - m_begin).count();
        m_begin = now;
    }

 private:
    using Clock = std::chrono::steady_clock;
    Clock::time_point m_begin = Clock::now();
};

/// One fragment of 32 chunks on three tracks, as the fragment muxer takes it to the file: sealed, measured,
/// placed, written to memory, released. An item is one sample; entering them is not counted. The counters are
/// nanoseconds per sample, as a whole and by step.
void BM_Fragment(benchmark::State& state) {
    constexpr std::uint64_t kChunks = 32;
    constexpr std::uint64_t kAudioPerChunk = 6;
    Movie movie;
    MbxSession* session = movie.session();
    const std::uint32_t video = movie.addVideo();
    const std::uint32_t sound = movie.addSound();
    const std::uint32_t meta = movie.addMeta();
    Target target;
    target.bytes.resize(std::size_t{1} << 20);
    auto* file = reinterpret_cast<MbxFile*>(&target);
    std::uint64_t number = 0;
    std::uint64_t samples = 0;
    const auto enter = [&](std::uint32_t track, std::uint64_t count, bool varies, bool onlySync) {
        for (std::uint64_t i = 0; i < count; ++i) {
            MbxSampleInfo sample = sampleAt(number++, varies);
            if (onlySync) sample.isSync = 1;
            check(MbxAddSample(session, track, &sample, i == 0 ? 1 : 0));
        }
        check(MbxEndChunk(session, track));
        samples += count;
    };
    const auto enterFragment = [&] {
        for (std::uint64_t chunk = 0; chunk < kChunks; ++chunk) {
            enter(video, kSamplesPerChunk, true, false);
            enter(sound, kAudioPerChunk, true, true);
            enter(meta, kSamplesPerChunk, false, true);
        }
    };
    enterFragment();
    check(MbxSealFirstFragment(session));
    samples = 0;
    double seal = 0;
    double measure = 0;
    double place = 0;
    double write = 0;
    double release = 0;
    std::uint32_t fragment = 0;
    for (auto _ : state) {
        state.PauseTiming();
        number = 0;
        enterFragment();
        state.ResumeTiming();
        std::uint64_t size = 0;
        StepTimer timer;
        check(MbxSealFragment(session));
        timer.end(&seal);
        check(MbxWriteMoof(session, nullptr, ++fragment, 0, &size));
        timer.end(&measure);
        check(MbxShiftFragmentOffsets(session, fragment, 0, 0, static_cast<std::int64_t>(size) + 8));
        check(MbxSetFragmentBase(session, fragment, 0));
        timer.end(&place);
        check(MbxWriteMoof(session, file, fragment, 0, &size));
        timer.end(&write);
        check(MbxReleaseFragment(session, fragment));
        timer.end(&release);
        benchmark::DoNotOptimize(target.bytes.data());
    }
    state.SetItemsProcessed(static_cast<std::int64_t>(samples));
    const auto perSample = [&](double ns) { return ns / static_cast<double>(samples); };
    state.counters["ns_per_sample"] = perSample(seal + measure + place + write + release);
    state.counters["seal"] = perSample(seal);
    state.counters["measure"] = perSample(measure);
    state.counters["place"] = perSample(place);
    state.counters["write"] = perSample(write);
    state.counters["release"] = perSample(release);
}
BENCHMARK(BM_Fragment)->Unit(benchmark::kMicrosecond);

/// The seal alone after 50,000 fragments, which are 2.5 days at 59.94 frames a second. `state.range(0)`:
/// beside the track with samples there is one that has had none yet, as the timecode track until its file is
/// closed.
void BM_SealAfterManyFragments(benchmark::State& state) {
    constexpr int kFragments = 50000;
    Movie movie;
    MbxSession* session = movie.session();
    const std::uint32_t video = movie.addVideo();
    if (state.range(0) != 0) static_cast<void>(movie.addMeta());
    std::uint64_t number = 0;
    std::uint32_t fragment = 0;
    const auto enterChunk = [&] {
        const MbxSampleInfo sample = sampleAt(number++, false);
        check(MbxAddSample(session, video, &sample, 0));
        check(MbxEndChunk(session, video));
    };
    const auto release = [&] { check(MbxReleaseFragment(session, ++fragment)); };
    enterChunk();
    check(MbxSealFirstFragment(session));
    for (int i = 0; i < kFragments; ++i) {
        enterChunk();
        check(MbxSealFragment(session));
        release();
    }
    for (auto _ : state) {
        enterChunk();
        double seal = 0;
        StepTimer timer;
        check(MbxSealFragment(session));
        timer.end(&seal);
        release();
        state.SetIterationTime(seal / 1e9);
    }
}
// The fragments stay in memory, so that the number of runs is given.
BENCHMARK(BM_SealAfterManyFragments)
    ->ArgName("empty_track")
    ->Arg(0)
    ->Arg(1)
    ->UseManualTime()
    ->Iterations(1000);

}  // namespace
