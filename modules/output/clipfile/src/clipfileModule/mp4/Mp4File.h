#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <string>
#include <vector>

#include "boxlib/mbx.h"
#include "boxlib/mbx_stdio.h"
#include "mp4/FrameNumber.h"
#include "mp4/Mp4Muxer.h"
#include "platform/PlatformInterface.h"

namespace clipfileModule {

class MuxerRoutine;

/// What the kinds of file share, and the normal file. The file is modelled by the box library; sample bytes
/// go past it.
///
/// Sources: Mp4File.cc has the life of the file, Mp4FileTracks.cc what stands in it, Mp4FileSamples.cc the
/// samples.
class Mp4File : public Mp4Muxer {
 public:
    Mp4File() = default;
    Mp4File(const Mp4File&) = delete;
    Mp4File& operator=(const Mp4File&) = delete;

    bool Initialize() override;
    bool Uninitialize() override;
    bool Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) override;
    bool Write(const std::shared_ptr<ChunkData>& chunk) override;
    bool WriteTmcd(const unsigned char* timecode) override;
    std::uint64_t GetWrittenSize() override;
    std::uint64_t GetBoxSize() override;
    std::uint64_t GetDuration() override;
    std::uint64_t MinutesToDuration(std::uint64_t minutes) override;
    bool Close() override;
    bool IsOpen() override;
    void AddFileRecord(std::uint64_t value, const std::string& first, const std::string& second) override;

    /// Closes a file that is still open as it stands.
    ~Mp4File() override;

 protected:
    void FillSessionConfig(MbxSessionConfig& config) override;
    MbxStatus createFprf() override;
    std::uint32_t IsFragmentOpen() override;
    MbxStatus writeSampleInfo(const InputStreamInfo& info, const ChunkData& chunk) override;
    void Reset() override;

    /// Places of the tracks in `m_track_ids` and `m_entry_indexes`.
    enum TrackSlot : std::size_t { kVideoTrack, kAudioTrack, kTimecodeTrack, kMetaTrack, kTrackCount };

    /// Takes over what the file is made from and chooses its name. False when no free name can be told;
    /// nothing was created then.
    bool chooseFile(const OutputSettings& stream, const unsigned char* timecode);
    /// Creates the chosen file with what stands before its samples, and the movie in memory, as steps of
    /// `routine`. A failure leaves the file open.
    MbxStatus createFile(MuxerRoutine& routine, bool dropFrame);
    /// Flushes and closes the file. `MBX_ERR_IO` when bytes did not reach the system; the file is closed all
    /// the same.
    MbxStatus closeFile();

    bool inDecodingOrder() const { return m_stream.pictureOrder == PictureOrder::kDecoding; }
    /// With exact rules, which the host asks for, some steps differ.
    bool isExact() const { return m_stream.recordRules == RecordRules::kExact; }

    /// Whether a track gets an edit. One without shows all of its media.
    virtual bool hasEdit(TrackSlot /*track*/) const { return true; }
    /// Adds the edit of each track, which spans what the track's tables hold by now, less pictures that are
    /// not shown.
    MbxStatus createElst();
    /// Ticks of video that are shown.
    std::uint64_t shownDuration() const;
    /// Sets all times to that of `Open`.
    MbxStatus updateTimestamp();

    /// Puts the bytes of the timecode sample, which is entered already, where they belong: at once, at the
    /// file's position.
    virtual MbxStatus storeTimecode(const std::array<std::uint8_t, kTimecodeSize>& bytes);
    /// Writes the bytes of a chunk at the file's position in one call, in the order of the tables.
    MbxStatus writeSample(const ChunkData& chunk);
    MbxStatus seekTo(std::uint64_t position);

    OutputSettings m_stream;
    /// Without directory.
    std::string m_filename;
    MbxCallbacks m_callbacks = {};
    struct DestroyContext {
        void operator()(MbxContext* context) const;
    };
    std::unique_ptr<MbxContext, DestroyContext> m_context;
    MbxSessionConfig m_session_config = {};
    struct DestroySession {
        void operator()(MbxSession* session) const;
    };
    std::unique_ptr<MbxSession, DestroySession> m_session;
    struct CloseCell {
        void operator()(MbxFile* file) const;
    };
    /// Null when closed.
    std::unique_ptr<MbxFile, CloseCell> m_file;
    /// The next byte to write, with everything before it complete.
    std::uint64_t m_position = 0;
    /// Bytes of samples entered since the last `mdat` header.
    std::uint64_t m_payload = 0;
    std::uint64_t m_mdat_position = 0;
    std::uint32_t m_fprf = 0;
    MbxAudioProfile m_aprf = {};
    MbxVideoProfile m_vprf = {};
    /// Numbers of the tracks in the movie, and of their sample entries.
    std::array<std::uint32_t, kTrackCount> m_track_ids = {};
    std::array<std::uint32_t, kTrackCount> m_entry_indexes = {};
    InputStreamInfo m_info;
    /// The time of `Open`, in units of 100 ns since 1970.
    std::int64_t m_open_ticks = 0;
    /// Samples written.
    std::uint64_t m_video_count = 0;
    /// Of these pictures, those that others need and that nobody is to see.
    std::uint64_t m_hidden_count = 0;
    std::uint64_t m_audio_count = 0;
    std::uint64_t m_meta_count = 0;
    /// In ticks of the video's time scale.
    std::uint64_t m_video_duration = 0;
    struct FileRecord {
        std::uint64_t value;
        std::string first;
        std::string second;
    };
    std::list<FileRecord> m_records;
    /// The bytes of a chunk on their way to the file.
    std::unique_ptr<unsigned char[]> m_chunk_bytes;
    std::uint64_t m_chunk_capacity = 0;

 private:
    using Samples = std::vector<std::shared_ptr<nal_access::SampleData>>;
    /// How the samples of one list enter the tables.
    struct SamplePass {
        const Samples& samples;
        TrackSlot track;
        std::uint32_t duration;  // of each sample, in ticks of the track's time scale
        bool alwaysSync;
        std::uint64_t& counter;
        /// As in `ChunkData`.
        const std::vector<std::int32_t>* shownLater = nullptr;
    };

    bool createFilename(const std::array<unsigned char, 4>& timecode);
    LocalTime localOpenTime() const;

    MbxStatus createFtyp();
    MbxStatus createUuidProf();
    MbxStatus createAprf();
    MbxStatus createVprf();
    MbxStatus createMoov();
    MbxTrackParams trackParams(TrackSlot slot, std::uint32_t trackId, std::uint32_t timescale) const;
    MbxStatus createVideoTrack();
    MbxStatus createAudioTrack();
    MbxStatus createTimcdTrack();
    MbxStatus createRtmtaTrack();
    // Steps of `Open` and of `Close`.
    MbxStatus beginMdat(MuxerRoutine& routine);
    MbxStatus completeFile(MuxerRoutine& routine);

    /// A part of `routine`, under whose name each sample is logged.
    MbxStatus enterSamples(const MuxerRoutine& routine, const SamplePass& pass);
    MbxStatus writeTmcd(const unsigned char* timecode);
    MbxStatus writeBytes(const void* data, std::uint64_t size);
};

}  // namespace clipfileModule
