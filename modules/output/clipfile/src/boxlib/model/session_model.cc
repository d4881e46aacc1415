#include "boxlib/model/session_model.h"

MbxStatus MbxRequireMovie(const MbxSession* session) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    return session->movie != nullptr ? MBX_OK : MBX_ERR_BAD_STATE;
}

MbxStatus MbxRequireTrack(const MbxSession* session, uint32_t index, MbxTrack** track) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxListRequire(session->movie->tracks.first, index, track);
}
