#include "boxlib/support/full_movie.h"

#include "boxlib/entry/sample_entry.h"
#include "boxlib/model/session_model.h"
#include "boxlib/movie/movie.h"

namespace {

constexpr uint64_t kMdatPosition = 0x200;
constexpr uint64_t kPayloadSize = 0x10000;

const uint8_t kParameterSet[] = {0x67, 0x64, 0x00, 0x29};

MbxTrackParams trackParams(uint32_t trackId, uint32_t timescale) {
    MbxTrackParams params = {};
    params.trackId = trackId;
    params.width = 1920;
    params.height = 1080;
    params.timescale = timescale;
    params.language = 0x15C7;  // eng
    params.enable_mode = 1;
    return params;
}

MbxStatus addFileLevel(MbxSession* session) {
    const MbxAudioProfile audio = {{2, MbxCode("mp4a"), 553, 0, 125, 128, 48000, 2}};
    const MbxVideoProfile video = {{1, MbxCode("avc1"), 0x00640029, 0x00030000, 5000, 8000},
                                   {{29, 97}, {30, 0}, {1920, 1080}, {1, 1}}};
    MBX_TRY(MbxCreateFileType(session, MbxCode("mp42"), 1));
    MBX_TRY(MbxAddCompatibleBrand(session, MbxCode("mp42")));
    MBX_TRY(MbxAddCompatibleBrand(session, MbxCode("isom")));
    MBX_TRY(MbxCreateProfile(session, 0x10000000));
    MBX_TRY(MbxAddAudioProfile(session, &audio));
    return MbxAddVideoProfile(session, &video);
}

MbxStatus addVideoEntries(MbxSession* session, uint32_t track) {
    MbxVisualEntryParams params = {MBX_ENTRY_AVC1, 1, 1920, 1080, 72, 0, 72, 0};
    uint32_t entry = 0;
    MBX_TRY(MbxAddVideoEntry(session, track, &params, &entry));
    const MbxAvcConfigParams avc = {1, 100, 0, 41, 3, 1, 1, 0, 0};
    MBX_TRY(MbxSetAvcConfig(session, track, entry, &avc));
    MBX_TRY(MbxAddAvcSps(session, track, entry, kParameterSet, sizeof(kParameterSet)));
    MBX_TRY(MbxAddAvcPps(session, track, entry, kParameterSet, sizeof(kParameterSet)));

    params.kind = MBX_ENTRY_HVC1;
    MBX_TRY(MbxAddVideoEntry(session, track, &params, &entry));
    MbxHvcCValues hevc = {};
    hevc.configurationVersion = 1;
    MBX_TRY(MbxSetHvcConfig(session, track, entry, &hevc));
    MBX_TRY(MbxAddHvcNalUnit(session, track, entry, 32, 1, kParameterSet, sizeof(kParameterSet)));

    params.kind = MBX_ENTRY_MP4V;
    MBX_TRY(MbxAddVideoEntry(session, track, &params, &entry));
    MbxEsdsParams esds = {};
    esds.objectTypeIndication = 0x20;
    esds.streamType = 4;
    esds.decoderSpecificInfo = kParameterSet;
    esds.decoderSpecificInfoSize = sizeof(kParameterSet);
    return MbxSetEsds(session, track, entry, &esds);
}

MbxStatus addSoundEntry(MbxSession* session, uint32_t track) {
    const MbxAudioEntryParams params = {1, 2, 16};
    uint32_t entry = 0;
    MBX_TRY(MbxAddSoundEntry(session, track, &params, &entry));
    const uint8_t lowComplexity[] = {0x11, 0x90};
    MbxEsdsParams esds = {};
    esds.objectTypeIndication = 0x40;
    esds.streamType = 5;
    esds.decoderSpecificInfo = lowComplexity;
    esds.decoderSpecificInfoSize = sizeof(lowComplexity);
    return MbxSetEsds(session, track, entry, &esds);
}

// Tracks 1 to 4, which the session makes.
MbxStatus addSessionTracks(MbxSession* session) {
    const MbxTimecodeEntryParams timecode = {1, 1, 30000, 1001, 30, {}};
    const MbxMetaEntryParams meta = {1};
    uint32_t track = 0;
    uint32_t entry = 0;
    MbxTrackParams params = trackParams(1, 30000);
    params.auxEnabled = 1;
    params.trickEnabled = 1;
    MBX_TRY(MbxAddVideoTrack(session, &params, &track));
    MBX_TRY(MbxAddDataReference(session, track, nullptr, 0, &entry));
    MBX_TRY(addVideoEntries(session, track));

    params = trackParams(2, 48000);
    MBX_TRY(MbxAddSoundTrack(session, &params, &track));
    MBX_TRY(MbxAddDataReference(session, track, nullptr, 0, &entry));
    MBX_TRY(addSoundEntry(session, track));

    params = trackParams(3, 30000);
    MBX_TRY(MbxAddTimecodeTrack(session, &params, &track));
    MBX_TRY(MbxAddDataReference(session, track, "clip.mp4", 8, &entry));
    MBX_TRY(MbxAddTimecodeEntry(session, track, &timecode, &entry));

    params = trackParams(4, 30000);
    MBX_TRY(MbxAddMetaTrack(session, &params, &track));
    MBX_TRY(MbxAddDataReference(session, track, nullptr, 0, &entry));
    return MbxAddMetaEntry(session, track, &meta, &entry);
}

// Tracks 5 to 9, of the handlers without a session operation.
MbxStatus addOtherTracks(MbxSession* session) {
    const MbxBtrtParams bitrate = {1, 2, 3};
    const struct {
        uint32_t handler;
        uint32_t kind;
        uint32_t code;
    } kTracks[] = {
        {MbxCode("subt"), MBX_ENTRY_TEXT, MbxCode("stpp")},
        {MbxCode("odsm"), MBX_ENTRY_SYSTEMS, MbxCode("mp4s")},
        {MbxCode("BKDT"), MBX_ENTRY_PLAIN, MbxCode("BKDT")},
        {MbxCode("PKDT"), MBX_ENTRY_PLAIN2, MbxCode("PKDT")},
        {MbxCode("GRAP"), MBX_ENTRY_GRAPHICS, MbxCode("GRAP")},
    };
    uint32_t trackId = 5;
    for (const auto& row : kTracks) {
        const MbxHandlerRequest request = {row.handler, trackParams(trackId++, 30000)};
        uint32_t track = 0;
        uint32_t index = 0;
        MBX_TRY(MbxCreateTrack(session->context, session->movie, &request, &track));
        MBX_TRY(MbxAddDataReference(session, track, nullptr, 0, &index));
        MbxSampleEntryRequest entry = {};
        entry.kind = row.kind;
        entry.code = row.code;
        entry.dataReferenceIndex = 1;
        entry.texts[0] = "urn:a";
        entry.textSizes[0] = 6;
        entry.btrt = &bitrate;
        MbxSampleEntryList* list = &session->movie->tracks.last->sampleEntries;
        MBX_TRY(MbxAddSampleEntry(session->context, list, &entry, &index));
    }
    return MBX_OK;
}

// Two chunks a track. Sizes, times, sync samples and dependencies vary, so that every table is written.
MbxStatus addSamples(MbxSession* session, uint32_t track) {
    const uint8_t aux[] = {1, 2, 3};
    for (uint32_t i = 0; i < 8; i++) {
        MbxSampleInfo sample = {};
        sample.size = 100 + i;
        sample.offset = 1000 * i;
        sample.duration = 1000 + i;
        sample.isSync = i % 4 == 0 ? 1 : 0;
        sample.dependency = static_cast<uint8_t>(i % 3 * 16);
        sample.compositionOffset = track == 1 ? static_cast<int32_t>(i % 3 * 1000) : 0;
        sample.descriptionIndex = 1;
        sample.auxSize = static_cast<uint8_t>(i % 3);
        sample.auxData = aux;
        sample.pictureType = 1;
        MBX_TRY(MbxAddSample(session, track, &sample, 0));
        if (i == 2 || i == 7) MBX_TRY(MbxEndChunk(session, track));
    }
    return MBX_OK;
}

MbxStatus writeMeasured(MbxStatus (*write)(MbxSession*, MbxFile*, uint64_t, uint64_t*), MbxSession* session,
                        MbxFile* file, uint64_t* position) {
    uint64_t measured = 0;
    uint64_t written = 0;
    MBX_TRY(write(session, nullptr, *position, &measured));
    MBX_TRY(write(session, file, *position, &written));
    *position += written;
    return written == measured ? MBX_OK : MBX_ERR_INTERNAL;
}

}  // namespace

MbxStatus BuildFullMovie(MbxSession* session) {
    MBX_TRY(addFileLevel(session));
    MBX_TRY(MbxCreateMovie(session, 30000));
    MBX_TRY(addSessionTracks(session));
    MBX_TRY(addOtherTracks(session));

    const uint8_t title[] = {'c', 'l', 'i', 'p'};
    const MbxMetadataItemParams item = {1, 0, 0x15C7, 1, title, sizeof(title)};
    const MbxTrackReferenceParams timecode = {MbxCode("tmcd"), 3};
    const MbxTrackReferenceParams described = {MbxCode("cdsc"), 1};
    uint32_t index = 0;
    MBX_TRY(MbxAddTrackMetadata(session, 0, &item));
    MBX_TRY(MbxAddTrackMetadata(session, 1, &item));
    MBX_TRY(MbxAddTrackReference(session, 1, &timecode, &index));
    MBX_TRY(MbxAddTrackReference(session, 4, &described, &index));
    for (uint32_t track = 1; track <= kFullMovieTracks; track++) {
        MBX_TRY(addSamples(session, track));
        MBX_TRY(MbxAddEdit(session, track, 0));
    }
    MBX_TRY(MbxShiftChunkOffsets(session, 0, 0, kMdatPosition + 16));
    return MbxSetMovieTimes(session, 0, UINT32_MAX, 3800000000, 3800000001);
}

MbxStatus WriteFullMovie(MbxSession* session, MbxFile* file) {
    uint64_t position = 0;
    uint64_t header = 0;
    MBX_TRY(writeMeasured(MbxWriteFileType, session, file, &position));
    MBX_TRY(writeMeasured(MbxWriteProfile, session, file, &position));
    if (position > kMdatPosition) return MBX_ERR_INTERNAL;
    MBX_TRY(MbxWriteWideMdatHeader(session, 1, file, kMdatPosition, MbxCode("mdat"), kPayloadSize, &header));
    position = kMdatPosition + header + kPayloadSize;
    return writeMeasured(MbxWriteMoov, session, file, &position);
}
