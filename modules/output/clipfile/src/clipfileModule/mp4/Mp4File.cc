#include "mp4/Mp4File.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ratio>

#include "common/Log.h"
#include "mp4/FileAccess.h"
#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

namespace {

constexpr std::uint32_t kBrand = MbxCode("ZQVC");
constexpr std::uint32_t kMinorVersion = 0x01001FFF;

/// Names that are tried for one timecode. In a day's directory no recorder leaves as many: with a file for
/// each 0.32 s, the shortest distance of two points where sound and picture are in step, it is 270,000.
constexpr std::uint64_t kMostNames = 300000;

using Ticks = std::chrono::duration<std::int64_t, std::ratio<1, 10000000>>;

}  // namespace

void Mp4File::DestroyContext::operator()(MbxContext* context) const {
    static_cast<void>(MbxDestroyContext(context));
}

void Mp4File::DestroySession::operator()(MbxSession* session) const {
    static_cast<void>(MbxSessionDestroy(session));
}

void Mp4File::CloseCell::operator()(MbxFile* file) const {
    if (file->stream != nullptr) {
        std::fclose(file->stream);
    }
    std::free(file);
}

Mp4File::~Mp4File() = default;

bool Mp4File::Initialize() {
    MUXER_ROUTINE(routine);
    Reset();
    m_callbacks = GetFileAccess().callbacks;
    FillSessionConfig(m_session_config);
    MbxContext* context = nullptr;
    if (MUXER_FAILED(routine, MbxCreateContext(&m_callbacks, &context))) {
        return routine.Return(false);
    }
    m_context.reset(context);
    MbxSession* session = nullptr;
    if (MUXER_FAILED(routine, MbxSessionCreate(context, &m_session_config, &session))) {
        return routine.Return(false);
    }
    m_session.reset(session);
    return routine.Return(true);
}

bool Mp4File::Uninitialize() {
    MUXER_ROUTINE(routine);
    m_session.reset();
    m_context.reset();
    m_callbacks = {};
    return routine.Return(true);
}

void Mp4File::FillSessionConfig(MbxSessionConfig& config) {
    config = {};
    // Contract: wide-offsets-always. Also where 32 bits would do.
    config.options.chunk_offset_mode = MBX_OFFSETS_64;
}

void Mp4File::Reset() {
    m_stream = {};
    m_filename.clear();
    m_file.reset();
    m_session.reset();
    m_context.reset();
    m_callbacks = {};
    m_session_config = {};
    m_position = 0;
    m_payload = 0;
    m_mdat_position = 0;
    m_fprf = 0;
    m_aprf = {};
    m_vprf = {};
    m_track_ids = {};
    m_entry_indexes = {};
    m_info = {};
    m_open_ticks = 0;
    m_video_count = 0;
    m_hidden_count = 0;
    m_audio_count = 0;
    m_meta_count = 0;
    m_video_duration = 0;
    m_records.clear();
    m_chunk_bytes.reset();
    m_chunk_capacity = 0;
}

bool Mp4File::Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) {
    MUXER_ROUTINE(routine);
    if (!chooseFile(stream, timecode)) {
        return routine.Return(false);
    }
    if (createFile(routine, dropFrame) != MBX_OK || beginMdat(routine) != MBX_OK) {
        // Contract: failed-file-stays. Nothing is removed.
        MUXER_FAILED(routine, closeFile());
        return routine.Return(false);
    }
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: FILE CREATE. (%s)", m_filename.c_str());
    return routine.Return(true);
}

bool Mp4File::chooseFile(const OutputSettings& stream, const unsigned char* timecode) {
    m_open_ticks = std::chrono::duration_cast<Ticks>(GetPlatform().Now().time_since_epoch()).count();
    std::array<unsigned char, 4> first = {};
    if (timecode != nullptr) {
        first = {timecode[0], timecode[1], timecode[2], timecode[3]};
    } else {
        // Contract: name-of-the-clock. The timecode sample is 0 all the same.
        const LocalTime now = localOpenTime();
        first = {static_cast<unsigned char>(now.hour), static_cast<unsigned char>(now.minute),
                 static_cast<unsigned char>(now.second), 0};
    }
    m_stream = stream;
    return createFilename(first);
}

bool Mp4File::createFilename(const std::array<unsigned char, 4>& timecode) {
    MUXER_ROUTINE(routine);
    char base[32];
    std::snprintf(base, sizeof base, "%02u_%02u_%02u_%02u", timecode[0], timecode[1], timecode[2],
                  timecode[3]);
    std::string suffix;
    for (std::uint64_t counter = 1;;) {
        const std::string filename = base + suffix + ".MP4";
        int error = GetPlatform().TestExistence(m_stream.outputPath + "\\" + filename);
        if (error == kNoSuchPath) {
            m_filename = filename;
            CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: out_filename = \"%s\"", filename.c_str());
            return routine.Return(true);
        }
        if (error == 0 && isExact() && counter == kMostNames) {
            // A system that has a file of every name will never say otherwise.
            error = EEXIST;
        }
        if (error != 0) {
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "errno = %d.", error);
            return routine.Return(false);
        }
        // Contract: names-counted-without-end. Each file looks at all names before it.
        ++counter;
        suffix = "(" + std::to_string(counter) + ")";
    }
}

MbxStatus Mp4File::createFile(MuxerRoutine& routine, bool dropFrame) {
    const std::string path = m_stream.outputPath + "\\" + m_filename;
    MbxFile* file = nullptr;
    MUXER_STEP(routine, GetFileAccess().open(path.c_str(), 0, &file));
    m_file.reset(file);

    m_info.MakeInputStreamInfo(m_stream);
    if (!dropFrame) {
        // Contract: drop-frame-needs-both. The rate's bit is a permission; the flag decides.
        m_info.tmcd_m_data_type_it &= ~MBX_TIMECODE_DROP_FRAME;
    }
    MUXER_STEP(routine, createFtyp());
    MUXER_STEP(routine, createUuidProf());
    MUXER_STEP(routine, createMoov());
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createFtyp() {
    MUXER_ROUTINE(routine);
    MUXER_STEP(routine, MbxCreateFileType(m_session.get(), kBrand, kMinorVersion));
    for (const std::uint32_t brand : {kBrand, MbxCode("mp42"), MbxCode("iso2")}) {
        MUXER_STEP(routine, MbxAddCompatibleBrand(m_session.get(), brand));
    }
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteFileType(m_session.get(), m_file.get(), m_position, &size));
    m_position += size;
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::beginMdat(MuxerRoutine& routine) {
    m_mdat_position = m_position;
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteWideMdatHeader(m_session.get(), MBX_MDAT_HEADER_64, m_file.get(),
                                               m_mdat_position, MBX_BOX_MDAT, 0, &size));
    m_position += size;
    MUXER_STEP(routine, seekTo(m_position));
    return routine.Return(MBX_OK);
}

std::uint64_t Mp4File::GetWrittenSize() {
    return m_position + m_payload;
}

std::uint64_t Mp4File::GetBoxSize() {
    MUXER_ROUTINE(routine);
    std::uint64_t size = 0;
    const MbxStatus status = MbxWriteMoov(m_session.get(), nullptr, 0, &size);
    static_cast<void>(routine.Return(status));
    // Contract: box-size-failure-0-or-max. 0 here, 2^64 - 1 in a fragmented file.
    return MUXER_FAILED(routine, status) ? (isExact() ? kUnmeasured : 0) : size;
}

std::uint64_t Mp4File::GetDuration() {
    return m_video_duration;
}

std::uint64_t Mp4File::MinutesToDuration(std::uint64_t minutes) {
    return m_info.video_track_timescale * minutes * 60;
}

bool Mp4File::IsOpen() {
    return m_file != nullptr;
}

// Contract: file-record-unused. It has no caller.
void Mp4File::AddFileRecord(std::uint64_t value, const std::string& first, const std::string& second) {
    m_records.push_back({value, first, second});
}

bool Mp4File::Close() {
    MUXER_ROUTINE(routine);
    if (!IsOpen()) {
        return routine.ReturnNotOpen();
    }
    // Contract: file-close-told-early. Also of a file that then cannot be closed.
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: FILE CLOSE. (%s)", m_filename.c_str());
    const bool completed = completeFile(routine) == MBX_OK;
    const bool closed = !MUXER_FAILED(routine, closeFile());
    return routine.Return(completed && closed);
}

MbxStatus Mp4File::completeFile(MuxerRoutine& routine) {
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteWideMdatHeader(m_session.get(), MBX_MDAT_HEADER_64, m_file.get(),
                                               m_mdat_position, MBX_BOX_MDAT, m_payload, &size));
    // Samples were entered with their distance from the start of the payload.
    MUXER_STEP(routine, MbxShiftChunkOffsets(m_session.get(), 0, 0, static_cast<std::int64_t>(m_position)));
    m_position += m_payload;
    MUXER_STEP(routine, createElst());
    MUXER_STEP(routine, updateTimestamp());
    MUXER_STEP(routine, MbxWriteMoov(m_session.get(), m_file.get(), m_position, &size));
    m_position += size;
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::closeFile() {
    if (m_file == nullptr) {
        return MBX_OK;
    }
    const bool flushed = std::fflush(m_file->stream) == 0;
    const bool closed = std::fclose(m_file->stream) == 0;
    m_file->stream = nullptr;
    m_file.reset();
    return flushed && closed ? MBX_OK : MBX_ERR_IO;
}

MbxStatus Mp4File::seekTo(std::uint64_t position) {
    return m_callbacks.seek(m_file.get(), static_cast<std::int64_t>(position), MBX_SEEK_START) == MBX_OK
               ? MBX_OK
               : MBX_ERR_IO;
}

LocalTime Mp4File::localOpenTime() const {
    // The system's clock may tick coarser than ours, and its time has whole seconds in any case.
    const std::chrono::seconds sinceEpoch(m_open_ticks / Ticks::period::den);
    return GetPlatform().ToLocalTime(std::chrono::system_clock::time_point(sinceEpoch));
}

}  // namespace clipfileModule
