// Session operations at file level: file type, profile, media data headers.
#include "boxlib/metadata/profile.h"
#include "boxlib/model/session_model.h"
#include "boxlib/movie/file.h"

namespace {

// A `mdat` header has a size of its own, so a payload that leaves no room for the header cannot be told.
bool fitsWithHeader(uint64_t payloadSize) {
    return payloadSize < UINT64_MAX - 15;
}

}  // namespace

MbxStatus MbxCreateFileType(MbxSession* session, uint32_t majorBrand, uint32_t minorVersion) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    if (session->ftyp == nullptr) MBX_TRY(MbxNew(session->context, &session->ftyp));
    session->ftyp->majorBrand = majorBrand;
    session->ftyp->minorVersion = minorVersion;
    return MBX_OK;
}

MbxStatus MbxAddCompatibleBrand(MbxSession* session, uint32_t brand) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    if (session->ftyp == nullptr) return MBX_ERR_BAD_STATE;
    return MbxAddBrand(session->context, session->ftyp, brand);
}

MbxStatus MbxWriteFileType(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size) {
    if (MbxAnyNull(session, size)) return MBX_ERR_INVALID_ARG;
    if (session->ftyp == nullptr) return MBX_ERR_BAD_STATE;
    MbxContext* context = session->context;
    const MbxOptions* options = &session->config;
    return MbxWriteTemporary<MbxFtypBox>(
        context, file, size,
        [&](MbxFtypBox* box) { return MbxBuildFtyp(context, options, session->ftyp, box); },
        [&](const MbxFtypBox* box) {
            return MbxWriteFtypBox(context, options, MBX_SELECT_FTYP, file, position, box, nullptr, nullptr);
        },
        MbxFreeFtyp);
}

MbxStatus MbxCreateProfile(MbxSession* session, uint32_t format) {
    if (session == nullptr) return MBX_ERR_INVALID_ARG;
    if (session->profile == nullptr) MBX_TRY(MbxNew(session->context, &session->profile));
    session->profile->format = format;
    return MBX_OK;
}

MbxStatus MbxAddAudioProfile(MbxSession* session, const MbxAudioProfile* profile) {
    if (MbxAnyNull(session, profile)) return MBX_ERR_INVALID_ARG;
    if (session->profile == nullptr) return MBX_ERR_BAD_STATE;
    return MbxAddProfileEntry(session->context, session->profile, MbxCode("APRF"), profile->words, 8);
}

MbxStatus MbxAddVideoProfile(MbxSession* session, const MbxVideoProfile* profile) {
    if (MbxAnyNull(session, profile)) return MBX_ERR_INVALID_ARG;
    if (session->profile == nullptr) return MBX_ERR_BAD_STATE;
    uint32_t values[10];
    for (uint32_t i = 0; i < 6; i++) values[i] = profile->words[i];
    for (uint32_t i = 0; i < 4; i++) {
        values[6 + i] = static_cast<uint32_t>(profile->pairs[i][0]) << 16 | profile->pairs[i][1];
    }
    return MbxAddProfileEntry(session->context, session->profile, MbxCode("VPRF"), values, 10);
}

MbxStatus MbxWriteProfile(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size) {
    if (MbxAnyNull(session, size)) return MBX_ERR_INVALID_ARG;
    MbxContext* context = session->context;
    const MbxOptions* options = &session->config;
    return MbxWriteTemporary<MbxProfBox>(
        context, file, size,
        [&](MbxProfBox* box) { return MbxBuildProf(context, options, session->profile, box); },
        [&](const MbxProfBox* box) {
            return MbxWriteProfBox(context, options, file, position, box, nullptr, nullptr);
        },
        MbxFreeProf);
}

MbxStatus MbxWriteMdatHeader(MbxSession* session, MbxFile* file, uint64_t position, uint32_t type,
                             uint64_t payloadSize, uint64_t* headerSize) {
    if (MbxAnyNull(session, headerSize) || !fitsWithHeader(payloadSize)) return MBX_ERR_INVALID_ARG;
    uint64_t total = 0;
    MBX_TRY(MbxBoxTotalSize(session->context, &session->config, payloadSize, &total));
    return MbxWriteBoxHeader(session->context, &session->config, file, position, total, type, headerSize,
                             nullptr);
}

MbxStatus MbxWriteWideMdatHeader(MbxSession* session, uint32_t form, MbxFile* file, uint64_t position,
                                 uint32_t type, uint64_t payloadSize, uint64_t* headerSize) {
    if (MbxAnyNull(session, headerSize) || type != MbxCode("mdat")) return MBX_ERR_INVALID_ARG;
    return MbxWriteStandaloneHeader(session->context, form, file, position, payloadSize, type, headerSize,
                                    nullptr);
}
