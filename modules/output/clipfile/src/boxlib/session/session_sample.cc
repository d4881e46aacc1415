// Session operations on samples.
#include "boxlib/model/session_model.h"
#include "boxlib/sample/sample_segment.h"
#include "boxlib/sample/sample_store.h"

MbxStatus MbxAddSample(MbxSession* session, uint32_t track, const MbxSampleInfo* sample,
                       uint32_t randomAccess) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    return MbxAddSample(session->context, session, track, sample, randomAccess);
}

MbxStatus MbxEndChunk(MbxSession* session, uint32_t track) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    return MbxEndChunk(session->context, session, track);
}

MbxStatus MbxShiftChunkOffsets(MbxSession* session, uint32_t track, uint32_t chunk, int64_t delta) {
    MBX_TRY(MbxRequireMovie(session));
    return MbxApplyOffsetDelta(session->context, 0, track, 0, chunk, delta, &session->movie->tracks);
}
