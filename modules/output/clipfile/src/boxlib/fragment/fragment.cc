#include "boxlib/fragment/fragment.h"

#include "boxlib/core/row_table.h"

MbxStatus MbxMovieShiftFragmentOffsets(MbxContext* context, const MbxOptions* options, MbxMovie* movie,
                                       uint32_t fragment, uint32_t track, uint32_t chunk, int64_t delta) {
    if (MbxAnyNull(context, options, movie)) return MBX_ERR_INVALID_ARG;
    const MbxStatus status = MbxApplyOffsetDelta(context, 1, track, fragment, chunk, delta, &movie->tracks);
    // Contract: offset-overflow-forgiven. Offsets that count from `moof` may lie behind it.
    return status == MBX_ERR_OVERFLOW && options->base_offset_mode != MBX_BASE_EXPLICIT ? MBX_OK : status;
}

MbxStatus MbxMovieSetFragmentBase(MbxContext* context, MbxMovie* movie, uint32_t fragment,
                                  uint64_t position) {
    if (MbxAnyNull(context, movie) || fragment == 0) return MBX_ERR_INVALID_ARG;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        MbxSampleSegment* segment = MbxFindSegment(track, fragment);
        if (segment == nullptr) return MBX_ERR_NOT_FOUND;
        segment->fragmentOffset = position;
    }
    return MBX_OK;
}

namespace {

// Takes the defaults that nobody gave from the segment that has just been sealed, which is the first one with
// samples: one before it would have given them.
// Contract: late-track-defaults. A track without samples gets the same as one whose samples say nothing, and
// learns later: a `moov` that is written already says otherwise.
void deriveDefaults(MbxTrack* track) {
    if (track->defaultsDone != 0) return;
    MbxSampleDefaults derived = {1, 0, 0, MBX_SAMPLE_NON_SYNC};
    if (track->sealedSegment->sizes.count != 0) {
        derived = MbxSegmentDefaults(track->sealedSegment, derived);
        track->defaultsDone = 1;
    }
    const auto isGiven = [&](MbxSampleDefault which) { return (track->defaultsMask >> which & 1) != 0; };
    if (!isGiven(MBX_DEFAULT_DESCRIPTION)) track->defaults.descriptionIndex = derived.descriptionIndex;
    if (!isGiven(MBX_DEFAULT_DURATION)) track->defaults.duration = derived.duration;
    if (!isGiven(MBX_DEFAULT_SIZE)) track->defaults.size = derived.size;
    if (!isGiven(MBX_DEFAULT_FLAGS)) track->defaults.flags = derived.flags;
}

MbxStatus seal(MbxContext* context, MbxMovie* movie) {
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->segments.last != nullptr && track->segments.last->chunks.samplesInChunk != 0) {
            return MBX_ERR_BAD_STATE;
        }
    }
    MBX_TRY(MbxAppendSegments(context, movie));
    for (MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) deriveDefaults(track);
    movie->fragmentCount++;
    return MBX_OK;
}

// Fragments before the open one are sealed.
MbxStatus requireSealed(const MbxMovie* movie, uint32_t fragment) {
    if (fragment < movie->fragmentCount) return MBX_OK;
    return fragment == movie->fragmentCount ? MBX_ERR_BAD_STATE : MBX_ERR_NOT_FOUND;
}

MbxStatus releaseFragment(MbxContext* context, MbxMovie* movie, uint32_t fragment) {
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        MbxSampleSegment* segment = MbxFindSegment(track, fragment);
        if (segment != nullptr) MBX_TRY(MbxReleaseSegment(context, segment));
    }
    return MBX_OK;
}

}  // namespace

MbxStatus MbxMovieSealFirstFragment(MbxContext* context, MbxMovie* movie) {
    if (MbxAnyNull(context, movie)) return MBX_ERR_INVALID_ARG;
    return movie->fragmentCount == 0 ? seal(context, movie) : MBX_ERR_BAD_STATE;
}

MbxStatus MbxMovieSealFragment(MbxContext* context, MbxMovie* movie) {
    if (MbxAnyNull(context, movie)) return MBX_ERR_INVALID_ARG;
    return movie->fragmentCount != 0 ? seal(context, movie) : MBX_ERR_BAD_STATE;
}

MbxStatus MbxMovieReleaseFragment(MbxContext* context, MbxMovie* movie, uint32_t fragment) {
    if (MbxAnyNull(context, movie)) return MBX_ERR_INVALID_ARG;
    if (fragment != 0) {
        MBX_TRY(requireSealed(movie, fragment));
        return releaseFragment(context, movie, fragment);
    }
    if (movie->fragmentCount < 2) return MBX_ERR_BAD_STATE;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->segmentCount < 3) continue;
        MbxSampleSegment* segment = track->segments.first->next;
        for (; segment != track->segments.last; segment = segment->next) {
            MBX_TRY(MbxReleaseSegment(context, segment));
        }
    }
    return MBX_OK;
}

MbxStatus MbxMovieWriteMoof(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                            const MbxMovie* movie, MbxFile* file, uint32_t fragment, uint64_t position,
                            uint64_t* size) {
    if (MbxAnyNull(context, options, movie, size) || fragment == 0) return MBX_ERR_INVALID_ARG;
    MBX_TRY(requireSealed(movie, fragment));
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        const MbxSampleSegment* segment = MbxFindSegment(track, fragment);
        if (segment != nullptr && segment->sizes.count != 0 && segment->chunks.chunkCount == 0) {
            return MBX_ERR_BAD_STATE;
        }
    }
    const MbxMoofParams params = {movie, fragment};
    return MbxWriteTemporary<MbxMoofBox>(
        context, file, size,
        [&](MbxMoofBox* box) { return MbxBuildMoof(context, scratch, options, &params, box); },
        [&](const MbxMoofBox* box) {
            return MbxWriteMoofBox(context, scratch, options, file, position, box, nullptr, nullptr);
        },
        MbxFreeMoof);
}

MbxStatus MbxBuildMfhd(MbxContext* context, const MbxOptions* options, const MbxMfhdParams* params,
                       MbxMfhdBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteMfhdPayload);
}

// 8.8.5 Movie Fragment Header Box
MbxStatus MbxWriteMfhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMfhdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, box->params.sequenceNumber);  // unsigned int(32) sequence_number
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMfhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMfhdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mfhd"), box, MbxWriteMfhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMfhd(MbxContext* context, MbxMfhdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMoof(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxMoofParams* params, MbxMoofBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    const MbxMfhdParams mfhd = {params->fragment};
    MBX_TRY(MbxMakeBox(context, options, &box->mfhd, &mfhd, MbxBuildMfhd, MbxFreeMfhd));
    uint64_t runningBase = 0;  // the first byte of `moof`
    for (const MbxTrack* track = params->movie->tracks.first; track != nullptr; track = track->next) {
        const MbxSampleSegment* segment = MbxFindSegment(track, params->fragment);
        if (segment == nullptr || segment->chunks.chunkCount == 0) continue;
        const MbxTrafParams traf = {track, segment, &runningBase};
        MBX_TRY(MbxMakeListItem(
            context, &box->traf,
            [&](MbxTrafBox* item) { return MbxBuildTraf(context, scratch, options, &traf, item); },
            MbxFreeTraf));
    }
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteMoofPayload));
}

// 8.8.4 Movie Fragment Box
MbxStatus MbxWriteMoofPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxMoofBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMfhdBox(context, options, file, position + count, box->mfhd, nullptr, &count));
    const auto writeTraf = [&](const MbxTrafBox* traf, uint64_t at, uint64_t* counter) {
        return MbxWriteTrafBox(context, scratch, options, file, at, traf, nullptr, counter);
    };
    MBX_TRY(MbxWriteEach(box->traf.first, position, &count, writeTraf));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMoofBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxMoofBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("moof"), box,
                       MbxWithScratch(scratch, MbxWriteMoofPayload), written, accumulated);
}

MbxStatus MbxFreeMoof(MbxContext* context, MbxMoofBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMfhd(context, box->mfhd));
        return MbxFreeList(context, &box->traf, MbxFreeTraf);
    });
}
