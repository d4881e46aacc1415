// Session operations on the movie and its tracks.
#include "boxlib/model/session_model.h"
#include "boxlib/movie/movie.h"
#include "boxlib/sample/sample_store.h"

MbxStatus MbxCreateMovie(MbxSession* session, uint32_t timescale) {
    if (session == nullptr || timescale == 0) return MBX_ERR_INVALID_ARG;
    if (session->movie != nullptr) return MBX_ERR_BAD_STATE;
    return MbxNewMovie(session->context, timescale, &session->movie);
}

namespace {

MbxStatus addTrack(MbxSession* session, uint32_t handler, const MbxTrackParams* params, uint32_t* track) {
    if (MbxAnyNull(session, params, track)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    const MbxHandlerRequest request = {handler, *params};
    return MbxCreateTrack(session->context, session->movie, &request, track);
}

}  // namespace

MbxStatus MbxAddVideoTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track) {
    return addTrack(session, MBX_HANDLER_VIDEO, params, track);
}

MbxStatus MbxAddSoundTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track) {
    return addTrack(session, MBX_HANDLER_SOUND, params, track);
}

MbxStatus MbxAddTimecodeTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track) {
    return addTrack(session, MBX_HANDLER_TIMECODE, params, track);
}

MbxStatus MbxAddMetaTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track) {
    return addTrack(session, MBX_HANDLER_META, params, track);
}

MbxStatus MbxGetNextTrackId(MbxSession* session, uint32_t* trackId) {
    if (MbxAnyNull(session, trackId)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    return MbxFindNextTrackId(session->movie, trackId);
}

MbxStatus MbxAddDataReference(MbxSession* session, uint32_t track, const char* location, uint64_t length,
                              uint32_t* index) {
    if (MbxAnyNull(session, index) || (location == nullptr && length != 0)) return MBX_ERR_INVALID_ARG;
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    const MbxDataEntryParams params = {
        .code = MbxCode("url "),
        .name = nullptr,
        .nameLength = 0,
        .location = location,
        .locationLength = length,
    };
    return MbxAddDataEntry(session->context, &found->dataEntries, &params, index);
}

MbxStatus MbxAddTrackMetadata(MbxSession* session, uint32_t track, const MbxMetadataItemParams* item) {
    if (MbxAnyNull(session, item)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    MbxUserMetadata* lists = &session->movie->userMetadata;
    if (track != 0) {
        MbxTrack* found = nullptr;
        MBX_TRY(MbxRequireTrack(session, track, &found));
        lists = &found->userMetadata;
    }
    uint32_t count = 0;
    return MbxPutMetadataItem(session->context, &lists->items, item, &count);
}

MbxStatus MbxAddTrackReference(MbxSession* session, uint32_t track, const MbxTrackReferenceParams* params,
                               uint32_t* index) {
    if (MbxAnyNull(session, params, index)) return MBX_ERR_INVALID_ARG;
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    return MbxAddTrackReference(session->context, session->movie, found, params, index);
}

MbxStatus MbxAddEdit(MbxSession* session, uint32_t track, uint32_t fromZero) {
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    return MbxTrackAddEdit(session->context, &session->config, session->movie, found, fromZero);
}

MbxStatus MbxSetEditDuration(MbxSession* session, uint32_t track, uint64_t duration) {
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    return MbxTrackSetEditDuration(&session->config, found, duration);
}

MbxStatus MbxSetMovieTimes(MbxSession* session, uint32_t track, uint32_t selector, uint64_t creation,
                           uint64_t modification) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxSetMovieTimes(session->context, &session->config, session->movie, track, selector, creation,
                            modification);
}

// Contract: operations-for-others. The module's offsets are never below 0.
MbxStatus MbxSetSignedOffsets(MbxSession* session, uint32_t track, uint32_t signedOffsets) {
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    return MbxTrackSetSignedOffsets(session->context, found, signedOffsets);
}

MbxStatus MbxWriteMoov(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size) {
    if (MbxAnyNull(session, size)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    for (const MbxTrack* track = session->movie->tracks.first; track != nullptr; track = track->next) {
        if (track->segments.last != nullptr && track->segments.last->chunks.samplesInChunk != 0) {
            return MBX_ERR_BAD_STATE;
        }
    }
    MbxContext* context = session->context;
    const MbxOptions* options = &session->config;
    return MbxWriteTemporary<MbxMoovBox>(
        context, file, size,
        [&](MbxMoovBox* box) { return MbxBuildMoov(context, options, session->movie, box); },
        [&](const MbxMoovBox* box) {
            return MbxWriteMoovBox(context, options, file, position, box, nullptr, nullptr);
        },
        MbxFreeMoov);
}
