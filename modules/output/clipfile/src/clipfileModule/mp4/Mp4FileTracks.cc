// What stands in a file: its profile, its tracks, edits and times.

#include <algorithm>
#include <cstddef>
#include <iterator>

#include "common/Log.h"
#include "mp4/FrameNumber.h"
#include "mp4/InputStreamInfo.h"
#include "mp4/Mp4File.h"
#include "mp4/MuxerRoutine.h"

namespace clipfileModule {

namespace {

constexpr std::uint32_t kNormalProfile = 0x20000000;

// Contract: profile-before-tracks. Identifiers that the profile names before the tracks exist.
constexpr std::uint32_t kVideoTrackId = 1;
constexpr std::uint32_t kAudioTrackId = 2;

constexpr std::uint16_t kAudioChannels = 2;

/// A reference to this very file.
MbxStatus addOwnFile(MbxSession* session, std::uint32_t track, std::uint32_t& index) {
    return MbxAddDataReference(session, track, "", 0, &index);
}

}  // namespace

MbxStatus Mp4File::createUuidProf() {
    MUXER_ROUTINE(routine);
    MUXER_STEP(routine, createFprf());
    MUXER_STEP(routine, createAprf());
    MUXER_STEP(routine, createVprf());
    std::uint64_t size = 0;
    MUXER_STEP(routine, MbxWriteProfile(m_session.get(), m_file.get(), m_position, &size));
    m_position += size;
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createFprf() {
    MUXER_ROUTINE(routine);
    m_fprf = kNormalProfile;
    MUXER_STEP(routine, MbxCreateProfile(m_session.get(), m_fprf));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createAprf() {
    MUXER_ROUTINE(routine);
    // Contract: always-aac-lc. Constants, whatever the stream carries.
    m_aprf = {{
        kAudioTrackId,
        MBX_CODE_MP4A,
        // Contract: profile-numbers. This one, and 00030000 below; readers of the box know what they mean.
        553,
        0,
        125,  // average rate in kbit/s
        128,  // maximum rate in kbit/s
        m_info.audio_track_timescale,
        kAudioChannels,
    }};
    MUXER_STEP(routine, MbxAddAudioProfile(m_session.get(), &m_aprf));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createVprf() {
    MUXER_ROUTINE(routine);
    const auto rate = static_cast<std::uint16_t>(m_info.video_average_framerate);
    const auto fraction = static_cast<std::uint16_t>(m_info.video_average_framerate_point);
    // Contract: bit-rate-as-given. In the host's unit.
    m_vprf = {
        {kVideoTrackId, MBX_CODE_AVC1, m_info.video_codec_specific_information, 0x00030000,
         m_info.video_average_bitrate, m_info.video_max_bitrate},
        {{rate, fraction},                                     // average
         {rate, fraction},                                     // maximum
         {m_info.video_size_width, m_info.video_size_height},  // in pixels
         {1, 1}},                                              // pixel aspect ratio
    };
    MUXER_STEP(routine, MbxAddVideoProfile(m_session.get(), &m_vprf));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createMoov() {
    MUXER_ROUTINE(routine);
    MUXER_STEP(routine, MbxCreateMovie(m_session.get(), m_info.video_track_timescale));
    MUXER_STEP(routine, createVideoTrack());
    MUXER_STEP(routine, createAudioTrack());
    MUXER_STEP(routine, createTimcdTrack());
    MUXER_STEP(routine, createRtmtaTrack());
    return routine.Return(MBX_OK);
}

MbxTrackParams Mp4File::trackParams(TrackSlot slot, std::uint32_t trackId, std::uint32_t timescale) const {
    MbxTrackParams params = {};
    params.noEditList = hasEdit(slot) ? 0 : 1;
    params.trackId = trackId;
    params.timescale = timescale;
    params.language = MBX_LANGUAGE_ENGLISH;
    params.enable_mode = MBX_ENABLE_ALL;
    return params;
}

MbxStatus Mp4File::createVideoTrack() {
    MUXER_ROUTINE(routine);
    MbxSession* const session = m_session.get();
    std::uint32_t& track = m_track_ids[kVideoTrack];
    std::uint32_t& entry = m_entry_indexes[kVideoTrack];

    MbxTrackParams params = trackParams(kVideoTrack, m_vprf.words[0], m_info.video_track_timescale);
    params.width = m_info.video_size_width;
    params.height = m_info.video_size_height;
    MUXER_STEP(routine, MbxAddVideoTrack(session, &params, &track));

    MbxVisualEntryParams visual = {};
    // Contract: always-avc1. Nothing looks at the codec.
    visual.kind = MBX_ENTRY_AVC1;
    MUXER_STEP(routine, addOwnFile(session, track, visual.dataReferenceIndex));
    visual.width = m_info.video_size_width;
    visual.height = m_info.video_size_height;
    visual.horizontalResolution = 72;
    visual.verticalResolution = 72;
    MUXER_STEP(routine, MbxAddVideoEntry(session, track, &visual, &entry));

    const nal_access::NalUnit& sps = m_stream.sps;
    const nal_access::NalUnit& pps = m_stream.pps;
    // Contract: short-set-counts-as-missing. Such a set came from a broken stream.
    MUXER_STEP(routine, sps.data != nullptr && sps.size >= kMinimumSpsSize ? MBX_OK : MBX_ERR_INVALID_ARG);
    MbxAvcConfigParams config = {};
    config.configurationVersion = 1;
    config.AVCProfileIndication = sps.data.get()[1];
    config.profile_compatibility = sps.data.get()[2];
    config.AVCLevelIndication = sps.data.get()[3];
    config.lengthSizeMinusOne = 3;
    MUXER_STEP(routine, MbxSetAvcConfig(session, track, entry, &config));
    MUXER_STEP(routine, MbxAddAvcSps(session, track, entry, sps.data.get(), sps.size));
    MUXER_STEP(routine, MbxAddAvcPps(session, track, entry, pps.data.get(), pps.size));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createAudioTrack() {
    MUXER_ROUTINE(routine);
    MbxSession* const session = m_session.get();
    std::uint32_t& track = m_track_ids[kAudioTrack];
    std::uint32_t& entry = m_entry_indexes[kAudioTrack];

    const MbxTrackParams params = trackParams(kAudioTrack, m_aprf.words[0], m_info.audio_track_timescale);
    MUXER_STEP(routine, MbxAddSoundTrack(session, &params, &track));

    MbxAudioEntryParams audio = {};
    MUXER_STEP(routine, addOwnFile(session, track, audio.dataReferenceIndex));
    audio.channelCount = kAudioChannels;
    audio.sampleSize = 16;
    MUXER_STEP(routine, MbxAddSoundEntry(session, track, &audio, &entry));

    // Contract: always-aac-lc. AudioSpecificConfig (ISO/IEC 14496-3 1.6.2.1): AAC LC, 48 kHz, stereo.
    static constexpr std::uint8_t kAacLc48Stereo[] = {0x11, 0x90};
    MbxEsdsParams esds = {};
    esds.objectTypeIndication = 0x40;  // ISO/IEC 14496-3
    esds.streamType = 5;               // audio
    esds.bufferSizeDB = 1536;
    esds.maxBitrate = 128000;
    esds.avgBitrate = 125376;
    esds.decoderSpecificInfo = kAacLc48Stereo;
    esds.decoderSpecificInfoSize = sizeof kAacLc48Stereo;
    MUXER_STEP(routine, MbxSetEsds(session, track, entry, &esds));
    return routine.Return(MBX_OK);
}

// Contract: track-names-misspelled. The log shows this name and that of the metadata track so.
MbxStatus Mp4File::createTimcdTrack() {
    MUXER_ROUTINE(routine);
    MbxSession* const session = m_session.get();
    std::uint32_t& track = m_track_ids[kTimecodeTrack];
    std::uint32_t& entry = m_entry_indexes[kTimecodeTrack];

    std::uint32_t trackId = 0;
    MUXER_STEP(routine, MbxGetNextTrackId(session, &trackId));
    MbxTrackParams params = trackParams(kTimecodeTrack, trackId, m_info.video_track_timescale);
    if (!isExact()) {
        // Contract: timecode-size-in-trex. The one sample comes when the file is closed, and its fragment
        // leaves the size to `trex`. A file that is cut off before its `moov` is written again has to tell it
        // too: readers refuse a whole file for a sample of no size. With exact rules the fragment tells it
        // itself.
        params.fragmentDefaults[MBX_DEFAULT_SIZE] = kTimecodeSize;
    }
    MUXER_STEP(routine, MbxAddTimecodeTrack(session, &params, &track));

    MbxTimecodeEntryParams timecode = {};
    MUXER_STEP(routine, addOwnFile(session, track, timecode.dataReferenceIndex));
    timecode.flags = m_info.tmcd_m_data_type_it;
    timecode.timescale = m_info.video_track_timescale;
    timecode.frameDuration = m_info.video_sample_duration;
    timecode.frameCount = static_cast<std::uint8_t>(m_info.timecode_numFrames);
    MUXER_STEP(routine, MbxAddTimecodeEntry(session, track, &timecode, &entry));

    // Contract: usage-items-differ. Other tracks get their enable mode and zeros.
    static constexpr std::uint8_t kUsage[] = {0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00, 0xFF, 0xFF};
    MbxMetadataItemParams item = {};
    item.type = MBX_USAGE_TYPE;
    item.language = MBX_LANGUAGE_UNDETERMINED;
    item.data = kUsage;
    item.dataSize = sizeof kUsage;
    MUXER_STEP(routine, MbxAddTrackMetadata(session, track, &item));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createRtmtaTrack() {
    MUXER_ROUTINE(routine);
    MbxSession* const session = m_session.get();
    std::uint32_t& track = m_track_ids[kMetaTrack];
    std::uint32_t& entry = m_entry_indexes[kMetaTrack];

    std::uint32_t trackId = 0;
    MUXER_STEP(routine, MbxGetNextTrackId(session, &trackId));
    const MbxTrackParams params = trackParams(kMetaTrack, trackId, m_info.video_track_timescale);
    MUXER_STEP(routine, MbxAddMetaTrack(session, &params, &track));

    // The metadata describes the video.
    const MbxTrackReferenceParams reference = {MBX_REFERENCE_CDSC, m_vprf.words[0]};
    std::uint32_t target = 0;
    MUXER_STEP(routine, MbxAddTrackReference(session, track, &reference, &target));

    // Contract: metadata-entry-of-its-own. `rtmd`, none of the standard's.
    MbxMetaEntryParams meta = {};
    MUXER_STEP(routine, addOwnFile(session, track, meta.dataReferenceIndex));
    MUXER_STEP(routine, MbxAddMetaEntry(session, track, &meta, &entry));
    return routine.Return(MBX_OK);
}

MbxStatus Mp4File::createElst() {
    MUXER_ROUTINE(routine);
    for (std::size_t index = 0; index < m_track_ids.size(); ++index) {
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "index = %d.", static_cast<int>(index));
        if (hasEdit(static_cast<TrackSlot>(index))) {
            MUXER_STEP(routine, MbxAddEdit(m_session.get(), m_track_ids[index], 0));
        }
    }
    if (m_hidden_count != 0) {
        MUXER_STEP(routine, MbxSetEditDuration(m_session.get(), m_track_ids[kVideoTrack], shownDuration()));
    }
    return routine.Return(MBX_OK);
}

std::uint64_t Mp4File::shownDuration() const {
    return (m_video_count - std::min(m_video_count, m_hidden_count)) * m_info.video_sample_duration;
}

MbxStatus Mp4File::updateTimestamp() {
    MUXER_ROUTINE(routine);
    const LocalTime opened = localOpenTime();
    const MbxDate date = {
        static_cast<std::uint16_t>(opened.year),   static_cast<std::uint16_t>(opened.month),
        static_cast<std::uint16_t>(opened.day),    static_cast<std::uint16_t>(opened.hour),
        static_cast<std::uint16_t>(opened.minute), static_cast<std::uint16_t>(opened.second),
    };
    std::uint64_t seconds = 0;
    // Contract: local-time-as-utc. Files show the time of the place where they were recorded.
    const MbxStatus converted = MbxToMp4Time(m_context.get(), &date, &seconds);
    // Contract: one-time-failure-counts. There is no other.
    MUXER_STEP(routine, converted == MBX_ERR_INVALID_ARG ? converted : MBX_OK);
    MUXER_STEP(routine, MbxSetMovieTimes(m_session.get(), 0, MBX_TIME_ALL, seconds, seconds));
    return routine.Return(MBX_OK);
}

}  // namespace clipfileModule
