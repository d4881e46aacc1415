// `trak`, and the records of a track: its making, edits, references and times.
#pragma once

#include "boxlib/metadata/user_metadata.h"
#include "boxlib/sample/auxiliary_information.h"
#include "boxlib/track/media.h"
#include "boxlib/track/track_header.h"

struct MbxTrakBox {
    uint64_t size;
    MbxTkhdBox* tkhd;
    MbxSencBox* senc;  // null for none, as are the next two and userMetadata
    MbxTrefBox* tref;
    MbxEdtsBox* edts;
    MbxMdiaBox* mdia;
    MbxUserMetadataBox* userMetadata;
    MbxTrakBox* next;
};

MbxStatus MbxBuildTrak(MbxContext* context, const MbxOptions* options, const MbxTrackInMovie* track,
                       MbxTrakBox* box);
MbxStatus MbxWriteTrakPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxTrakBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteTrakBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrakBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTrak(MbxContext* context, MbxTrakBox* box);

// ---- Records ----

// A new track of a handler: `vide`, `soun`, `subt`, `meta`, `tmcd`, `odsm`, `BKDT`, `PKDT` or `GRAP`.
struct MbxHandlerRequest {
    uint32_t handler;
    MbxTrackParams params;
};

// Ordinary tracks have identifiers 1 to 639 and 1024 to 63487.
constexpr uint32_t MBX_TRACK_ID_LOW_END = 639;
constexpr uint32_t MBX_TRACK_ID_HIGH_BEGIN = 1024;
constexpr uint32_t MBX_TRACK_ID_HIGH_END = 63487;
// Metadata tracks of the movie have identifiers up to 65535.
constexpr uint32_t MBX_METADATA_TRACK_ID_END = 65535;

// Appends a track to the movie; `trackIndex` receives the new number of tracks. MBX_ERR_INVALID_ARG for a
// null argument, a timescale of 0 or a language of 32768 or more (of handlers too that take neither), an
// identifier outside the ordinary ranges or in use, or an unknown enable_mode. MBX_ERR_INTERNAL for an
// unknown handler, MBX_ERR_BAD_STATE once the movie is sealed.
MbxStatus MbxCreateTrack(MbxContext* context, MbxMovie* movie, const MbxHandlerRequest* request,
                         uint32_t* trackIndex);

// The `tkhd` flags of an enable_mode. MBX_ERR_INVALID_ARG for an unknown one.
MbxStatus MbxEnableModeFlags(uint32_t enableMode, uint32_t* flags);

// The next free identifier of an ordinary track, as MbxGetNextTrackId gives it.
MbxStatus MbxFindNextTrackId(const MbxMovie* movie, uint32_t* trackId);

// Adds a reference; `index` receives the target's 1-based place in the group of its type. A target that is
// there already is not added again. MBX_ERR_INVALID_ARG for the track itself and for a target that does not
// exist.
MbxStatus MbxAddTrackReference(MbxContext* context, const MbxMovie* movie, MbxTrack* track,
                               const MbxTrackReferenceParams* request, uint32_t* index);

// Appends an edit over the track's media at rate 1. MBX_ERR_BAD_STATE in time_version_mode 0 and 2 when the
// duration exceeds 32 bits or the media time the signed 32-bit range.
MbxStatus MbxTrackAddEdit(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                          MbxTrack* track, uint32_t fromZero);

// Overwrites the duration of the track's last edit, in ticks of the movie. MBX_ERR_BAD_STATE without edits,
// and in time_version_mode 0 and 2 for more than 32 bits.
MbxStatus MbxTrackSetEditDuration(const MbxOptions* options, MbxTrack* track, uint64_t duration);

// Sets those of the two times that the bits `creationBit` and the next one of `selector` name, and the same
// two bits from `creationField` on in `fieldsSet`. MBX_ERR_BAD_STATE for a time above 32 bits in
// time_version_mode 0 and 2.
struct MbxTimePair {
    uint32_t creationBit;    // of MbxTimeSelector
    uint32_t creationField;  // of the header's field bits
    uint64_t* creationTime;
    uint64_t* modificationTime;
    uint32_t* fieldsSet;
};
MbxStatus MbxSetTimePair(const MbxOptions* options, const MbxTimePair& pair, uint32_t selector,
                         uint64_t creation, uint64_t modification);

// Sets the times of `tkhd` and `mdhd` that `selector` names.
MbxStatus MbxSetTrackTimes(const MbxOptions* options, MbxTrack* track, uint32_t selector, uint64_t creation,
                           uint64_t modification);

// Releases a track with all that it holds; null is allowed.
MbxStatus MbxFreeTrack(MbxContext* context, MbxTrack* track);
