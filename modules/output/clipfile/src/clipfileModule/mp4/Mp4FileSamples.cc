// The road of every byte into `mdat`: sample tables, sample bytes, and the timecode sample.

#include <cstring>
#include <memory>
#include <new>

#include "common/Log.h"
#include "mp4/FrameNumber.h"
#include "mp4/Mp4File.h"
#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

namespace {

// Contract: timecode-line-reversed. The line shows the stored bytes as a number of this machine.
std::uint32_t reverseBytes(std::uint32_t value) {
    return value << 24 | (value & 0xFF00U) << 8 | (value >> 8 & 0xFF00U) | value >> 24;
}

}  // namespace

bool Mp4File::Write(const std::shared_ptr<ChunkData>& chunk) {
    MUXER_ROUTINE(routine);
    if (!IsOpen()) {
        return routine.ReturnNotOpen();
    }
    // Contract: failed-chunk-stays-in-tables. Nothing takes it back.
    if (MUXER_FAILED(routine, writeSampleInfo(m_info, *chunk)) ||
        MUXER_FAILED(routine, writeSample(*chunk))) {
        return routine.Return(false);
    }
    return routine.Return(true);
}

MbxStatus Mp4File::writeSampleInfo(const InputStreamInfo& info, const ChunkData& chunk) {
    MUXER_ROUTINE(routine);
    if (!chunk.meta.empty()) {
        CLIPFILE_LOG(LOG_PRIORITY_SAMPLE, "write rtmeta ----------.");
        MUXER_STEP(routine, enterSamples(routine, {chunk.meta, kMetaTrack, info.video_sample_duration, true,
                                                   m_meta_count}));
    }
    if (!chunk.audio.empty()) {
        CLIPFILE_LOG(LOG_PRIORITY_SAMPLE, "write audio  ----------.");
        MUXER_STEP(routine, enterSamples(routine, {chunk.audio, kAudioTrack, info.audio_sample_duration, true,
                                                   m_audio_count}));
    }
    if (!chunk.video.empty()) {
        CLIPFILE_LOG(LOG_PRIORITY_SAMPLE, "write video  ----------.");
        MUXER_STEP(routine, enterSamples(routine, {chunk.video, kVideoTrack, info.video_sample_duration,
                                                   false, m_video_count, &chunk.shownLater}));
        m_hidden_count = chunk.hiddenVideo;
    }
    m_video_duration += chunk.video.size() * info.video_sample_duration;
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::enterSamples(const MuxerRoutine& routine, const SamplePass& pass) {
    std::uint32_t randomAccess = IsFragmentOpen();
    if (randomAccess != MBX_NO_INDEX_ROW && inDecodingOrder()) {
        randomAccess = MBX_INDEX_ROW_OF_PRESENTATION;
    }
    const std::uint32_t track = m_track_ids[pass.track];
    const bool isReordered = pass.shownLater != nullptr && inDecodingOrder();
    for (std::size_t i = 0; i < pass.samples.size(); ++i) {
        const auto& data = pass.samples[i];
        MbxSampleInfo sample = {};
        sample.size = static_cast<std::uint32_t>(data->GetDataSize());
        sample.offset = m_payload;
        // Contract: gaps-close-up. Samples are counted, their timestamps are only logged.
        sample.duration = pass.duration;
        if (isReordered) {
            sample.compositionOffset = pass.shownLater->at(i) * static_cast<std::int32_t>(pass.duration);
        }
        sample.isSync = pass.alwaysSync || data->GetSync() ? 1 : 0;
        sample.descriptionIndex = m_entry_indexes[pass.track];
        if (const MbxStatus status = MbxAddSample(m_session.get(), track, &sample, randomAccess);
            status != MBX_OK) {
            return status;
        }
        randomAccess = MBX_NO_INDEX_ROW;
        m_payload += sample.size;
        ++pass.counter;
        const unsigned long long end = pass.counter * pass.duration;
        Logger::Put(LOG_PRIORITY_SAMPLE, __FILE__, routine.Function(), __LINE__,
                    "%d\t%d\t%llu\t%llu\t%llu\t%d\t%d.", static_cast<int>(pass.counter),
                    static_cast<int>(sample.isSync), end,
                    static_cast<unsigned long long>(data->GetRtpTimestamp()),
                    static_cast<unsigned long long>(data->GetTimestamp()), static_cast<int>(sample.size),
                    static_cast<int>(sample.duration));
    }
    return MbxEndChunk(m_session.get(), track);
}

MbxStatus Mp4File::writeSample(const ChunkData& chunk) {
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "write sample begin.");
    const Samples* const lists[] = {&chunk.meta, &chunk.audio, &chunk.video};
    std::uint64_t total = 0;
    for (const Samples* const list : lists) {
        for (const auto& data : *list) {
            total += data->GetDataSize();
        }
    }
    // Not cleared, since the samples fill it, and kept: memory of that size given back at each chunk would
    // make the allocator tidy up each time.
    if (total > m_chunk_capacity) {
        m_chunk_bytes.reset(new (std::nothrow) unsigned char[total]);
        m_chunk_capacity = m_chunk_bytes != nullptr ? total : 0;
    }
    unsigned char* const buffer = total != 0 ? m_chunk_bytes.get() : nullptr;
    if (buffer != nullptr) {
        unsigned char* next = buffer;
        for (const Samples* const list : lists) {
            for (const auto& data : *list) {
                if (data->GetDataSize() != 0) {
                    std::memcpy(next, data->GetData(), data->GetDataSize());
                    next += data->GetDataSize();
                }
            }
        }
    }
    const MbxStatus status = writeBytes(buffer, total);
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "write sample end.");
    return status;
}

bool Mp4File::WriteTmcd(const unsigned char* timecode) {
    MUXER_ROUTINE(routine);
    if (!IsOpen()) {
        return routine.ReturnNotOpen();
    }
    return routine.Return(!MUXER_FAILED(routine, writeTmcd(timecode)));
}

MbxStatus Mp4File::writeTmcd(const unsigned char* timecode) {
    MUXER_ROUTINE(routine);
    MUXER_STEP(routine, timecode != nullptr ? MBX_OK : MBX_ERR_INVALID_ARG);
    MbxSampleInfo sample = {};
    sample.size = kTimecodeSize;
    sample.offset = m_payload;
    sample.duration = static_cast<std::uint32_t>(shownDuration());
    sample.isSync = 1;
    sample.descriptionIndex = m_entry_indexes[kTimecodeTrack];
    MUXER_STEP(routine, MbxAddSample(m_session.get(), m_track_ids[kTimecodeTrack], &sample, 0));
    m_payload += kTimecodeSize;
    MUXER_STEP(routine, MbxEndChunk(m_session.get(), m_track_ids[kTimecodeTrack]));

    const bool dropFrame = (m_info.tmcd_m_data_type_it & MBX_TIMECODE_DROP_FRAME) != 0;
    const std::uint32_t value = FrameNumber(timecode, m_info.timecode_numFrames, dropFrame);
    MUXER_STEP(routine,
               storeTimecode({static_cast<std::uint8_t>(value >> 24), static_cast<std::uint8_t>(value >> 16),
                              static_cast<std::uint8_t>(value >> 8), static_cast<std::uint8_t>(value)}));
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: write tmcd  : %02d:%02d:%02d:%02d:%s", timecode[0],
                       timecode[1], timecode[2], timecode[3], dropFrame ? "DF" : "NDF");
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: write tmcd  : %lX(%d)",
                       static_cast<unsigned long>(reverseBytes(value)), static_cast<int>(value));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::storeTimecode(const std::array<std::uint8_t, kTimecodeSize>& bytes) {
    return writeBytes(bytes.data(), bytes.size());
}

MbxStatus Mp4File::writeBytes(const void* data, std::uint64_t size) {
    // Contract: empty-chunk-is-a-fault. Without a sample there is no data.
    if (m_file == nullptr || data == nullptr) {
        return MBX_ERR_INVALID_ARG;
    }
    std::uint64_t written = 0;
    const MbxStatus status = m_callbacks.write(m_file.get(), data, size, &written);
    return status == MBX_OK && written == size ? MBX_OK : MBX_ERR_IO;
}

std::uint32_t Mp4File::IsFragmentOpen() {
    return 0;
}

}  // namespace clipfileModule
