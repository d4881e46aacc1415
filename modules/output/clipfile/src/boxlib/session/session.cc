// Making and releasing a session.
#include "boxlib/metadata/profile.h"
#include "boxlib/model/session_model.h"
#include "boxlib/movie/file.h"
#include "boxlib/movie/movie.h"

MbxStatus MbxSessionCreate(MbxContext* context, const MbxSessionConfig* config, MbxSession** session) {
    if (context == nullptr || config == nullptr || session == nullptr) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxSetQuota(context, 0, config->memory_quota, 0, sizeof(MbxSession)));
    MbxSession* made = nullptr;
    MBX_TRY(MbxNew(context, &made));
    const MbxStatus status = MbxScratchInit(context, MBX_MEMORY_CLASS, MBX_SCRATCH_SIZE, &made->scratch);
    if (status != MBX_OK) {
        MbxFree(context, made);
        return status;
    }
    made->context = context;
    made->config = config->options;
    *session = made;
    return MBX_OK;
}

MbxStatus MbxSessionDestroy(MbxSession* session) {
    if (session == nullptr) return MBX_OK;
    MbxContext* context = session->context;
    MBX_TRY(MbxFreeFileType(context, session->ftyp));
    MBX_TRY(MbxFreeProfile(context, session->profile));
    MBX_TRY(MbxFreeMovie(context, session->movie));
    MbxScratchRelease(context, &session->scratch);
    MbxFree(context, session);
    return MBX_OK;
}
