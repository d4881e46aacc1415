#include "mp4/Mp4FragmentMuxer.h"

#include <cstdio>
#include <utility>
#include <vector>

#include "common/Log.h"
#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

namespace {

constexpr std::uint32_t kFragmentProfile = 0x30000000;

/// The edit of a file that may still grow, in ticks of the movie: longer than any part of it in `moov`, and
/// than any file whose `moov` can be written again.
constexpr std::uint64_t kOpenEdit = 0xFFFFFFFF;

}  // namespace

Mp4FragmentMuxer::~Mp4FragmentMuxer() = default;

void Mp4FragmentMuxer::FillSessionConfig(MbxSessionConfig& config) {
    config = {};
    // Contract: fragment-below-4-gib. All other modes 0: sizes and `stco` of 32 bits.
    // Contract: fragments-without-tfdt. And with absolute offsets.
    config.options.mehd_mode = MBX_MEHD_BY_VALUE;
}

void Mp4FragmentMuxer::Reset() {
    Mp4File::Reset();
    m_first = true;
    m_chunk_count = 0;
    m_sequence = 1;
    m_moov_position = 0;
    m_estimate = 0;
    m_pending.clear();
    m_flush.reset();
    m_moov_size = 0;
}

MbxStatus Mp4FragmentMuxer::createFprf() {
    MUXER_ROUTINE(routine);
    m_fprf = kFragmentProfile;
    MUXER_STEP(routine, MbxCreateProfile(m_session.get(), m_fprf));
    return routine.Return(MBX_OK);
}

std::uint32_t Mp4FragmentMuxer::IsFragmentOpen() {
    // Contract: index-rows-of-any-sample. The first of each chunk, sync sample or not.
    return m_first && !m_flush ? 0 : 1;
}

// Contract: fragmented-without-file-lines. No "OP: FILE CREATE" here, no "OP: FILE CLOSE" below.
bool Mp4FragmentMuxer::Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) {
    MUXER_ROUTINE(routine);
    if (!chooseFile(stream, timecode)) {
        return routine.Return(false);
    }
    if (createFile(routine, dropFrame) != MBX_OK || MUXER_FAILED(routine, seekTo(m_position))) {
        MUXER_FAILED(routine, closeFile());
        return routine.Return(false);
    }
    return routine.Return(true);
}

bool Mp4FragmentMuxer::Write(const std::shared_ptr<ChunkData>& chunk) {
    MUXER_ROUTINE(routine);
    if (!IsOpen()) {
        routine.ReturnNotOpen();
        // Contract: not-open-in-two-ways. A normal file logs one line less.
        MUXER_FAILED(routine, MBX_ERR_INTERNAL);
        return false;
    }
    ++m_chunk_count;
    if (MUXER_FAILED(routine, writeSampleInfo(m_info, *chunk))) {
        return routine.Return(false);
    }
    m_pending.push_back(chunk);
    m_estimate += m_chunk_estimate;
    if (m_chunk_count % m_chunks_per_fragment == 0 && MUXER_FAILED(routine, closeMovie())) {
        return routine.Return(false);
    }
    return routine.Return(true);
}

MbxStatus Mp4FragmentMuxer::closeMovie() {
    MUXER_ROUTINE(routine);
    const bool carriesOn = m_flush.has_value();
    MUXER_STEP(routine, m_first ? closeMoov() : closeMoof());
    m_first = false;
    if (carriesOn && !m_pending.empty()) {
        // What came since the failure is a fragment of its own.
        MUXER_STEP(routine, closeMoof());
    }
    return routine.Return(MBX_OK);
}

MbxStatus Mp4FragmentMuxer::closeMoov() {
    MUXER_ROUTINE(routine);
    const std::uint64_t position = m_position;
    return endFlush(writeMoovAndMdat(routine), position);
}

MbxStatus Mp4FragmentMuxer::writeMoovAndMdat(MuxerRoutine& routine) {
    MbxSession* const session = m_session.get();
    if (!m_flush) {
        if (isExact()) {
            MUXER_STEP(routine, forceLateDefaults());
        }
        MUXER_STEP(routine, MbxSealFirstFragment(session));
        beginFlush();
    }
    if (hasEdit(kVideoTrack) && !m_flush->hasEdits) {
        MUXER_STEP(routine, createElst());
        MUXER_STEP(routine, setExactEdit(kOpenEdit));
        m_flush->hasEdits = true;
    }
    MUXER_STEP(routine, updateTimestamp());

    std::uint64_t moovSize = 0;
    std::uint64_t headerSize = 0;
    MUXER_STEP(routine, MbxWriteMoov(session, nullptr, 0, &moovSize));
    MUXER_STEP(routine, measureMdatHeader(headerSize));
    const std::uint64_t payloadPosition = m_position + moovSize + headerSize;
    MUXER_STEP(routine, MbxShiftChunkOffsets(session, 0, 0,
                                             static_cast<std::int64_t>(payloadPosition - m_flush->shift)));
    m_flush->shift = payloadPosition;

    m_moov_position = m_position;
    MUXER_STEP(routine, MbxWriteMoov(session, m_file.get(), m_moov_position, &m_moov_size));
    m_position += m_moov_size;
    return writeMdat(routine);
}

MbxStatus Mp4FragmentMuxer::closeMoof() {
    MUXER_ROUTINE(routine);
    const std::uint64_t position = m_position;
    return endFlush(writeMoofAndMdat(routine), position);
}

MbxStatus Mp4FragmentMuxer::writeMoofAndMdat(MuxerRoutine& routine) {
    MbxSession* const session = m_session.get();
    if (!m_flush) {
        MUXER_STEP(routine, MbxSealFragment(session));
        beginFlush();
    }
    std::uint64_t moofSize = 0;
    std::uint64_t headerSize = 0;
    MUXER_STEP(routine, MbxWriteMoof(session, nullptr, m_sequence, 0, &moofSize));
    MUXER_STEP(routine, measureMdatHeader(headerSize));
    const std::uint64_t payloadPosition = m_position + moofSize + headerSize;
    MUXER_STEP(routine, MbxShiftFragmentOffsets(session, m_sequence, 0, 0,
                                                static_cast<std::int64_t>(payloadPosition - m_flush->shift)));
    m_flush->shift = payloadPosition;
    MUXER_STEP(routine, MbxSetFragmentBase(session, m_sequence, m_position));

    MUXER_STEP(routine, MbxWriteMoof(session, m_file.get(), m_sequence, m_position, &moofSize));
    m_position += moofSize;
    if (!isExact()) {
        // Contract: failed-flush-shifts-twice. Released before its samples are written, so that a second try
        // finds empty tables.
        MUXER_STEP(routine, MbxReleaseFragment(session, m_sequence));
    }
    if (const MbxStatus status = writeMdat(routine); status != MBX_OK) {
        return status;
    }
    if (isExact()) {
        MUXER_STEP(routine, MbxReleaseFragment(session, m_sequence));
    }
    ++m_sequence;
    return routine.Return(MBX_OK);
}

void Mp4FragmentMuxer::beginFlush() {
    m_flush = Flush{std::exchange(m_pending, {}), std::exchange(m_payload, 0), 0, false};
}

MbxStatus Mp4FragmentMuxer::endFlush(MbxStatus status, std::uint64_t position) {
    if (status == MBX_OK || !m_flush) {
        return status;
    }
    if (isExact()) {
        m_position = position;
        return status;
    }
    // Contract: failed-flush-shifts-twice. The position stays where the failure left it, and the next try
    // seals and shifts once more.
    m_pending.splice(m_pending.begin(), m_flush->chunks);
    m_payload += m_flush->payload;
    m_flush.reset();
    return status;
}

MbxStatus Mp4FragmentMuxer::setExactEdit(std::uint64_t duration) {
    return isExact() && hasEdit(kVideoTrack)
               ? MbxSetEditDuration(m_session.get(), m_track_ids[kVideoTrack], duration)
               : MBX_OK;
}

MbxStatus Mp4FragmentMuxer::forceLateDefaults() {
    MUXER_ROUTINE(routine);
    static constexpr std::uint32_t kAll[4] = {1, 1, 1, 1};
    const std::pair<TrackSlot, std::uint64_t> samples[] = {{kVideoTrack, m_video_count},
                                                           {kAudioTrack, m_audio_count},
                                                           {kTimecodeTrack, 0},  // when the file is closed
                                                           {kMetaTrack, m_meta_count}};
    for (const auto& [track, count] : samples) {
        if (count == 0) {
            MUXER_STEP(routine, MbxForceDefaults(m_session.get(), m_track_ids[track], kAll));
        }
    }
    return routine.Return(MBX_OK);
}

MbxStatus Mp4FragmentMuxer::measureMdatHeader(std::uint64_t& size) {
    return MbxWriteMdatHeader(m_session.get(), nullptr, 0, MBX_BOX_MDAT, 0, &size);
}

MbxStatus Mp4FragmentMuxer::writeMdat(MuxerRoutine& routine) {
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteMdatHeader(m_session.get(), m_file.get(), m_position, MBX_BOX_MDAT,
                                           m_flush->payload, &size));
    m_position += size;
    MUXER_STEP(routine, seekTo(m_position));
    for (const auto& chunk : m_flush->chunks) {
        MUXER_STEP(routine, writeSample(*chunk));
    }
    // Contract: fragments-flushed. A process that dies keeps what it has given to the system.
    MUXER_STEP(routine, std::fflush(m_file->stream) == 0 ? MBX_OK : MBX_ERR_IO);
    m_position += m_flush->payload;
    m_flush.reset();
    return routine.Return(MBX_OK);
}

MbxStatus Mp4FragmentMuxer::storeTimecode(const std::array<std::uint8_t, kTimecodeSize>& bytes) {
    if (!isExact()) {
        return Mp4File::storeTimecode(bytes);
    }
    // The sample was entered behind those of the chunks that wait: its bytes wait behind theirs.
    const auto chunk = std::make_shared<ChunkData>();
    chunk->meta.push_back(std::make_shared<nal_access::SampleData>(
        std::vector<unsigned char>(bytes.begin(), bytes.end()), 0, 0, true));
    m_pending.push_back(chunk);
    return MBX_OK;
}

std::uint64_t Mp4FragmentMuxer::GetWrittenSize() {
    return Mp4File::GetWrittenSize() + (m_flush ? m_flush->payload : 0);
}

std::uint64_t Mp4FragmentMuxer::GetBoxSize() {
    MUXER_ROUTINE(routine);
    if (!m_first) {
        return m_tail_estimate + m_estimate;
    }
    std::uint64_t size = 0;
    const MbxStatus status = MbxWriteMoov(m_session.get(), nullptr, 0, &size);
    static_cast<void>(routine.Return(status));
    return MUXER_FAILED(routine, status) ? kUnmeasured : size + m_estimate;
}

bool Mp4FragmentMuxer::Close() {
    MUXER_ROUTINE(routine);
    if (!IsOpen()) {
        routine.ReturnNotOpen();
        MUXER_FAILED(routine, MBX_ERR_INTERNAL);
        return false;
    }
    const bool completed = completeFragments(routine) == MBX_OK;
    const bool closed = !MUXER_FAILED(routine, closeFile());
    return routine.Return(completed && closed);
}

MbxStatus Mp4FragmentMuxer::completeFragments(MuxerRoutine& routine) {
    // Contract: fragment-of-a-timecode. Behind a multiple of 32 chunks it holds nothing else.
    MUXER_STEP(routine, closeMovie());
    MUXER_STEP(routine, setExactEdit(shownDuration()));

    // Contract: moov-size-checked. The file's whole length is known only now. Where it needs more bits than
    // it got room for, writing it would run over the samples behind.
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteMoov(m_session.get(), nullptr, 0, &size));
    MUXER_STEP(routine, size == m_moov_size ? MBX_OK : MBX_ERR_INTERNAL);
    // Contract: edits-span-moov. Edits stand as they were first written.
    MUXER_STEP(routine, MbxWriteMoov(m_session.get(), m_file.get(), m_moov_position, &size));

    MUXER_STEP(routine, MbxWriteMfra(m_session.get(), m_file.get(), m_position, &size));
    m_position += size;
    return routine.Return(MBX_OK);
}

}  // namespace clipfileModule
