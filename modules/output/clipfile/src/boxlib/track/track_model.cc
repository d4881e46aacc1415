// The records of tracks: making, identifying, editing, timing and releasing them.
#include "boxlib/entry/sample_entry.h"
#include "boxlib/sample/sample_segment.h"
#include "boxlib/track/track.h"

namespace {

constexpr uint32_t kNoFixedMode = UINT32_MAX - 1;  // not a mode: the parameter decides
constexpr uint32_t kIdentityMatrix[9] = {0x00010000, 0, 0, 0, 0x00010000, 0, 0, 0, 0x40000000};

// Where a header's timescale comes from.
enum class Timescale { kParameter, kMovie, kOne };

struct HandlerRow {
    uint32_t handler;
    const char* name;  // stored with its terminator
    uint64_t nameSize;
    uint32_t enableMode;
    uint32_t mediaHeader;
    uint32_t mediaFieldsSet;
    Timescale timescale;
    bool hasSize;
    int16_t layer;
    uint16_t volume;  // 8.8
    bool hasUsageEntry;
};

template <uint64_t size>
constexpr HandlerRow row(uint32_t handler, const char (&name)[size], uint32_t enableMode,
                         uint32_t mediaHeader, uint32_t mediaFieldsSet, Timescale timescale, bool hasSize,
                         int16_t layer, uint16_t volume, bool hasUsageEntry) {
    return {handler,   name,    size,  enableMode, mediaHeader,  mediaFieldsSet,
            timescale, hasSize, layer, volume,     hasUsageEntry};
}

// Contract: tracks-without-operation. `subt`, `odsm`, `BKDT`, `PKDT`, `GRAP`.
constexpr HandlerRow kHandlers[] = {
    row(MBX_HANDLER_VIDEO, "Video Media Handler", kNoFixedMode, MbxCode("vmhd"), 20, Timescale::kParameter,
        true, 0, 0, true),
    row(MBX_HANDLER_SOUND, "Sound Media Handler", 1, MbxCode("smhd"), 20, Timescale::kParameter, false, 0,
        0x0100, true),
    row(MBX_HANDLER_SUBTITLE, "", 1, MbxCode("sthd"), 20, Timescale::kParameter, true, -1, 0, false),
    row(MBX_HANDLER_META, "Timed Metadata Media Handler", 16, MbxCode("nmhd"), 20, Timescale::kParameter,
        false, 0, 0, true),
    // Contract: timecode-with-nmhd. Not `gmhd`.
    row(MBX_HANDLER_TIMECODE, "Time Code Media Handler", 1, MbxCode("nmhd"), 20, Timescale::kParameter, false,
        0, 0, false),
    row(MBX_HANDLER_OBJECT_DESCRIPTOR, "ObjectDescriptor Media Handler", 1, MbxCode("nmhd"), 0,
        Timescale::kMovie, false, 0, 0, true),
    row(MBX_HANDLER_BOOK, "Book Media Handler", 1, MbxCode("nmhd"), 16, Timescale::kOne, false, 0, 0, true),
    row(MBX_HANDLER_PACKED_DATA, "Packed Data Media Handler", 1, MbxCode("nmhd"), 16, Timescale::kOne, false,
        0, 0, true),
    row(MBX_HANDLER_GRAPHICS, "Graphics Media Handler", 8, MbxCode("nmhd"), 20, Timescale::kParameter, true,
        -1, 0, true),
};

// Contract: track-id-ranges. 1 to 639 and 1024 to 63487.
bool isOrdinaryTrackId(uint32_t id) {
    return (id >= 1 && id <= MBX_TRACK_ID_LOW_END) ||
           (id >= MBX_TRACK_ID_HIGH_BEGIN && id <= MBX_TRACK_ID_HIGH_END);
}

bool isTrackIdInUse(const MbxMovie* movie, uint32_t id) {
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->header.trackId == id) return true;
    }
    return false;
}

bool hasMetadataTrack(const MbxMovie* movie, uint32_t id) {
    for (const MbxMetadataTrack* t = movie->userMetadata.tracks.first; t != nullptr; t = t->next) {
        if (t->header.trackId == id) return true;
    }
    return false;
}

MbxStatus findFreeTrackId(const MbxMovie* movie, uint32_t begin, uint32_t end, uint32_t* trackId) {
    for (uint32_t id = begin; id <= end; id++) {
        if (isTrackIdInUse(movie, id)) continue;
        *trackId = id;
        return MBX_OK;
    }
    return MBX_ERR_NOT_FOUND;
}

MbxStatus addUsageItem(MbxContext* context, MbxTrack* track, uint32_t enableMode) {
    uint8_t data[8] = {};  // unsigned int(32) enable mode, unsigned int(8), reserved, unsigned int(16)
    MbxStore32(data, enableMode);
    const MbxMetadataItemParams item = {
        .type = MBX_USAGE_TYPE,
        .flag = 0,
        .language = MBX_LANGUAGE_UNDETERMINED,
        .encoding = 0,
        .data = data,
        .dataSize = sizeof(data),
    };
    uint32_t count = 0;
    return MbxPutMetadataItem(context, &track->userMetadata.items, &item, &count);
}

void fillFragmentDefaults(const MbxTrackParams& params, MbxTrack* track) {
    track->defaults = {params.fragmentDefaults[MBX_DEFAULT_DESCRIPTION],
                       params.fragmentDefaults[MBX_DEFAULT_DURATION],
                       params.fragmentDefaults[MBX_DEFAULT_SIZE], params.fragmentDefaults[MBX_DEFAULT_FLAGS]};
    for (uint32_t i = 0; i < 4; i++) {
        if (params.fragmentDefaults[i] != 0) track->defaultsMask |= 1U << i;
        track->defaultsForced[i] = params.defaultsForced[i];
    }
    for (uint32_t i = 0; i < 3; i++) track->perSampleForced[i] = params.perSampleForced[i];
    track->fragmentIndex.capacity = MBX_BLOCK_CAPACITY;
}

MbxStatus fillTrack(MbxContext* context, const MbxMovie* movie, const HandlerRow& handler,
                    const MbxTrackParams& params, uint32_t enableMode, uint32_t flags, MbxTrack* track) {
    track->header.fieldsSet = MBX_TRACK_ID;
    track->header.flags = flags;
    track->header.trackId = params.trackId;
    track->header.layer = handler.layer;
    track->header.volume = handler.volume;
    for (uint32_t i = 0; i < 9; i++) track->header.matrix[i] = kIdentityMatrix[i];
    if (handler.hasSize) {
        track->header.fieldsSet |=
            MBX_TRACK_WIDTH | MBX_TRACK_WIDTH_FRACTION | MBX_TRACK_HEIGHT | MBX_TRACK_HEIGHT_FRACTION;
        track->header.width = static_cast<uint32_t>(params.width) << 16 | params.widthFraction;
        track->header.height = static_cast<uint32_t>(params.height) << 16 | params.heightFraction;
    }

    track->mediaHeader.fieldsSet = handler.mediaFieldsSet;
    switch (handler.timescale) {
        case Timescale::kParameter:
            track->mediaHeader.timescale = params.timescale;
            break;
        case Timescale::kMovie:
            track->mediaHeader.timescale = movie->header.timescale;
            break;
        case Timescale::kOne:
            track->mediaHeader.timescale = 1;
            break;
    }
    track->mediaHeader.language = handler.handler == MBX_HANDLER_OBJECT_DESCRIPTOR ? MBX_LANGUAGE_UNDETERMINED
                                                                                   : params.language & 0x7FFF;

    track->handler.type = handler.handler;
    MBX_TRY(MbxBufferAssign(context, 1, &track->handler.name, handler.name, handler.nameSize));
    track->mediaInformation.code = handler.mediaHeader;
    if (handler.handler == MBX_HANDLER_SOUND) track->sampleEntries.version = params.stsdVersion;
    track->auxEnabled = params.auxEnabled;
    track->trickEnabled = params.trickEnabled;
    fillFragmentDefaults(params, track);
    // Contract: edts-without-edits. Written even with no edit in it.
    if (params.noEditList == 0) MBX_TRY(MbxNew(context, &track->editList));
    if (params.noUsageEntry == 0 && handler.hasUsageEntry) MBX_TRY(addUsageItem(context, track, enableMode));
    return MBX_OK;
}

MbxStatus freeReferenceGroup(MbxContext* context, MbxReferenceGroup* group) {
    return MbxFreeBox(context, group, [&] {
        return MbxFreeList(context, &group->targets, [](MbxContext* owner, MbxReferenceTarget* target) {
            return MbxFreeBox(owner, target);
        });
    });
}

MbxStatus freeEditList(MbxContext* context, MbxEditList* editList) {
    return MbxFreeBox(context, editList, [&] {
        return MbxFreeList(context, &editList->edits,
                           [](MbxContext* owner, MbxEdit* edit) { return MbxFreeBox(owner, edit); });
    });
}

bool hasNarrowTimes(const MbxOptions* options) {
    return options->time_version_mode == MBX_TIMES_32 || options->time_version_mode == MBX_TIMES_32_WITH_TFRA;
}

// Rescales a presentation time, which may be negative, towards zero.
MbxStatus rescaleSigned(int64_t value, uint64_t divisor, uint64_t multiplier, int64_t* result) {
    const bool isNegative = value < 0;
    const uint64_t magnitude = isNegative ? 0 - static_cast<uint64_t>(value) : static_cast<uint64_t>(value);
    uint64_t rescaled = 0;
    MBX_TRY(MbxRescale(magnitude, divisor, multiplier, &rescaled));
    if (rescaled > INT64_MAX) return MBX_ERR_OVERFLOW;
    *result = isNegative ? -static_cast<int64_t>(rescaled) : static_cast<int64_t>(rescaled);
    return MBX_OK;
}

}  // namespace

// Contract: enable-modes. Seven numbers for three sets of flags.
MbxStatus MbxEnableModeFlags(uint32_t enableMode, uint32_t* flags) {
    switch (enableMode) {
        case MBX_ENABLE_NONE:
        case UINT32_MAX:
            *flags = 0;
            return MBX_OK;
        case MBX_ENABLE_ALL:
        case 8:
        case 16:
            *flags = 7;  // enabled, in movie, in preview
            return MBX_OK;
        case MBX_ENABLE_HIDDEN:
        case 6:
            *flags = 6;  // in movie, in preview
            return MBX_OK;
        default:
            return MBX_ERR_INVALID_ARG;
    }
}

MbxStatus MbxCreateTrack(MbxContext* context, MbxMovie* movie, const MbxHandlerRequest* request,
                         uint32_t* trackIndex) {
    if (MbxAnyNull(context, movie, request, trackIndex)) return MBX_ERR_INVALID_ARG;
    const HandlerRow* handler = nullptr;
    for (const HandlerRow& candidate : kHandlers) {
        if (candidate.handler == request->handler) handler = &candidate;
    }
    if (handler == nullptr) return MBX_ERR_INTERNAL;

    const MbxTrackParams& params = request->params;
    if (params.timescale == 0 || params.language > 0x7FFF) return MBX_ERR_INVALID_ARG;
    if (!isOrdinaryTrackId(params.trackId) || isTrackIdInUse(movie, params.trackId))
        return MBX_ERR_INVALID_ARG;
    const uint32_t enableMode =
        handler->enableMode == kNoFixedMode ? params.enable_mode : handler->enableMode;
    uint32_t flags = 0;
    MBX_TRY(MbxEnableModeFlags(enableMode, &flags));
    // It would have no segment for the fragments before it, and count its own from the wrong number.
    if (movie->fragmentCount != 0) return MBX_ERR_BAD_STATE;

    MBX_TRY(MbxMakeListItem(
        context, &movie->tracks,
        [&](MbxTrack* track) {
            return fillTrack(context, movie, *handler, params, enableMode, flags, track);
        },
        MbxFreeTrack));
    return MbxListCount(movie->tracks.first, trackIndex);
}

MbxStatus MbxFindNextTrackId(const MbxMovie* movie, uint32_t* trackId) {
    uint32_t highest = 0;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->header.trackId > highest) highest = track->header.trackId;
    }
    if (highest >= MBX_TRACK_ID_HIGH_END) {
        if (findFreeTrackId(movie, 1, MBX_TRACK_ID_LOW_END, trackId) == MBX_OK) return MBX_OK;
        return findFreeTrackId(movie, MBX_TRACK_ID_HIGH_BEGIN, MBX_TRACK_ID_HIGH_END, trackId);
    }
    const bool isBetween = highest >= MBX_TRACK_ID_LOW_END && highest < MBX_TRACK_ID_HIGH_BEGIN;
    *trackId = isBetween ? MBX_TRACK_ID_HIGH_BEGIN : highest + 1;
    return MBX_OK;
}

MbxStatus MbxAddTrackReference(MbxContext* context, const MbxMovie* movie, MbxTrack* track,
                               const MbxTrackReferenceParams* request, uint32_t* index) {
    if (MbxAnyNull(context, movie, track, request, index)) return MBX_ERR_INVALID_ARG;
    const uint32_t target = request->trackId;
    const bool isMetadata = target > MBX_TRACK_ID_HIGH_END && target <= MBX_METADATA_TRACK_ID_END;
    const bool exists = isMetadata ? hasMetadataTrack(movie, target) : isTrackIdInUse(movie, target);
    if (target == track->header.trackId || !exists) return MBX_ERR_INVALID_ARG;

    const auto isOfType = [request](const MbxReferenceGroup& group) { return group.type == request->type; };
    const auto isTarget = [target](const MbxReferenceTarget& entry) { return entry.trackId == target; };
    const auto addTarget = [&](MbxReferenceGroup* group) {
        return MbxMakeListItem(
            context, &group->targets,
            [target](MbxReferenceTarget* entry) {
                entry->trackId = target;
                return MBX_OK;
            },
            [](MbxContext* owner, MbxReferenceTarget* entry) { return MbxFreeBox(owner, entry); });
    };

    MbxReferenceGroup* group = nullptr;
    MBX_TRY(MbxListFind(track->references.first, isOfType, &group, nullptr));
    if (group == nullptr) {
        const auto fill = [&](MbxReferenceGroup* made) {
            made->type = request->type;
            return addTarget(made);
        };
        MBX_TRY(MbxMakeListItem(context, &track->references, fill, freeReferenceGroup));
        *index = 1;
        return MBX_OK;
    }
    MbxReferenceTarget* found = nullptr;
    MBX_TRY(MbxListFind(group->targets.first, isTarget, &found, nullptr));
    if (found == nullptr) MBX_TRY(addTarget(group));
    return MbxListFind(group->targets.first, isTarget, &found, index);
}

MbxStatus MbxTrackAddEdit(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                          MbxTrack* track, uint32_t fromZero) {
    if (MbxAnyNull(context, options, movie, track)) return MBX_ERR_INVALID_ARG;
    const uint64_t mediaTimescale = track->mediaHeader.timescale;
    const uint64_t movieTimescale = movie->header.timescale;
    uint64_t media = 0;
    uint64_t duration = 0;
    int64_t mediaTime = 0;
    MBX_TRY(MbxComputeMediaDuration(track, &media));
    MBX_TRY(MbxRescale(media, mediaTimescale, movieTimescale, &duration));
    const MbxSampleSegment* segment = track->segments.first;
    if (fromZero == 0 && segment != nullptr && segment->earliestPresentation != MBX_NO_PRESENTATION) {
        // Contract: edit-in-movie-time. The standard counts this field in media time.
        MBX_TRY(rescaleSigned(segment->earliestPresentation, mediaTimescale, movieTimescale, &mediaTime));
    }
    if (hasNarrowTimes(options)) {
        // Contract: edit-test-is-wider. One wide value is enough here.
        if (duration > UINT32_MAX || mediaTime > INT32_MAX || mediaTime < INT32_MIN) return MBX_ERR_BAD_STATE;
    }

    MbxEdit* edit = nullptr;
    MBX_TRY(MbxNew(context, &edit));
    if (track->editList == nullptr) {
        const MbxStatus status = MbxNew(context, &track->editList);
        if (status != MBX_OK) {
            MbxFree(context, edit);
            return status;
        }
    }
    edit->segmentDuration = duration;
    edit->mediaTime = mediaTime;
    edit->rateInteger = 1;
    MbxListAppend(&track->editList->edits, edit);
    return MBX_OK;
}

MbxStatus MbxTrackSetEditDuration(const MbxOptions* options, MbxTrack* track, uint64_t duration) {
    if (MbxAnyNull(options, track)) return MBX_ERR_INVALID_ARG;
    if (hasNarrowTimes(options) && duration > UINT32_MAX) return MBX_ERR_BAD_STATE;
    if (track->editList == nullptr || track->editList->edits.last == nullptr) return MBX_ERR_BAD_STATE;
    track->editList->edits.last->segmentDuration = duration;
    return MBX_OK;
}

MbxStatus MbxSetTimePair(const MbxOptions* options, const MbxTimePair& pair, uint32_t selector,
                         uint64_t creation, uint64_t modification) {
    const bool isNarrow = hasNarrowTimes(options);
    if ((selector & pair.creationBit) != 0) {
        if (isNarrow && creation > UINT32_MAX) return MBX_ERR_BAD_STATE;
        *pair.creationTime = creation;
        *pair.fieldsSet |= pair.creationField;
    }
    if ((selector & pair.creationBit << 1) != 0) {
        if (isNarrow && modification > UINT32_MAX) return MBX_ERR_BAD_STATE;
        *pair.modificationTime = modification;
        *pair.fieldsSet |= pair.creationField << 1;
    }
    return MBX_OK;
}

MbxStatus MbxSetTrackTimes(const MbxOptions* options, MbxTrack* track, uint32_t selector, uint64_t creation,
                           uint64_t modification) {
    const MbxTimePair trackTimes = {MBX_TIME_TRACK_CREATION, MBX_TRACK_CREATION, &track->header.creationTime,
                                    &track->header.modificationTime, &track->header.fieldsSet};
    const MbxTimePair mediaTimes = {MBX_TIME_MEDIA_CREATION, MBX_MEDIA_CREATION,
                                    &track->mediaHeader.creationTime, &track->mediaHeader.modificationTime,
                                    &track->mediaHeader.fieldsSet};
    MBX_TRY(MbxSetTimePair(options, trackTimes, selector, creation, modification));
    return MbxSetTimePair(options, mediaTimes, selector, creation, modification);
}

MbxStatus MbxFreeTrack(MbxContext* context, MbxTrack* track) {
    return MbxFreeBox(context, track, [&] {
        MBX_TRY(MbxFreeList(context, &track->references, freeReferenceGroup));
        MBX_TRY(freeEditList(context, track->editList));
        MbxBufferRelease(context, &track->handler.name);
        MBX_TRY(MbxFreeList(context, &track->dataEntries, MbxFreeDataEntry));
        MBX_TRY(MbxReleaseSampleEntries(context, &track->sampleEntries));
        MBX_TRY(MbxFreeSegments(context, track));
        return MbxReleaseUserMetadata(context, &track->userMetadata);
    });
}
