// Session operations on fragments.
#include "boxlib/fragment/fragment.h"
#include "boxlib/fragment/fragment_index.h"
#include "boxlib/model/session_model.h"

MbxStatus MbxForceDefaults(MbxSession* session, uint32_t track, const uint32_t forced[4]) {
    if (MbxAnyNull(session, forced)) return MBX_ERR_INVALID_ARG;
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    for (uint32_t i = 0; i < 4; i++) {
        if (forced[i] > 1) return MBX_ERR_INVALID_ARG;
    }
    for (uint32_t i = 0; i < 4; i++) found->defaultsForced[i] = forced[i];
    return MBX_OK;
}

MbxStatus MbxShiftFragmentOffsets(MbxSession* session, uint32_t fragment, uint32_t track, uint32_t chunk,
                                  int64_t delta) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieShiftFragmentOffsets(session->context, &session->config, session->movie, fragment, track,
                                        chunk, delta);
}

MbxStatus MbxSetFragmentBase(MbxSession* session, uint32_t fragment, uint64_t position) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieSetFragmentBase(session->context, session->movie, fragment, position);
}

MbxStatus MbxSealFirstFragment(MbxSession* session) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieSealFirstFragment(session->context, session->movie);
}

MbxStatus MbxSealFragment(MbxSession* session) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieSealFragment(session->context, session->movie);
}

MbxStatus MbxReleaseFragment(MbxSession* session, uint32_t fragment) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieReleaseFragment(session->context, session->movie, fragment);
}

MbxStatus MbxWriteMoof(MbxSession* session, MbxFile* file, uint32_t fragment, uint64_t position,
                       uint64_t* size) {
    if (MbxAnyNull(session, size)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieWriteMoof(session->context, &session->scratch, &session->config, session->movie, file,
                             fragment, position, size);
}

MbxStatus MbxWriteMfra(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size) {
    if (MbxAnyNull(session, size)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireMovie(session));
    return MbxMovieWriteMfra(session->context, &session->scratch, &session->config, session->movie, file,
                             position, size);
}
