#include "boxlib/fragment/fragment_index.h"

#include "boxlib/core/row_table.h"
#include "boxlib/model/version.h"
#include "boxlib/sample/sample_segment.h"

MbxStatus MbxMovieWriteMfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                            const MbxMovie* movie, MbxFile* file, uint64_t position, uint64_t* size) {
    if (MbxAnyNull(context, options, movie, size)) return MBX_ERR_INVALID_ARG;
    return MbxWriteTemporary<MbxMfraBox>(
        context, file, size,
        [&](MbxMfraBox* box) { return MbxBuildMfra(context, scratch, options, movie, box); },
        [&](const MbxMfraBox* box) {
            return MbxWriteMfraBox(context, scratch, options, file, position, box, nullptr, nullptr);
        },
        MbxFreeMfra);
}

namespace {

// What rows need to know of a fragment.
struct FragmentPlace {
    uint64_t moofOffset;
    uint32_t trafNumber;
};

// Tells it for all segments of a track, in one walk over them: rows are many. To be freed by the caller.
MbxStatus locateFragments(MbxContext* context, const MbxTfraParams& params, FragmentPlace** places) {
    const uint32_t count = params.track->segmentCount;
    MBX_TRY(MbxNewArray(context, count, places));
    FragmentPlace* place = *places;
    const MbxSampleSegment* own = params.track->segments.first;
    for (; own != nullptr; own = own->next) *place++ = {own->fragmentOffset, 1};
    for (const MbxTrack* track = params.movie->tracks.first; track != params.track; track = track->next) {
        const MbxSampleSegment* segment = track->segments.first;
        for (uint32_t i = 0; i < count && segment != nullptr; i++, segment = segment->next) {
            if (MbxSegmentHasSamples(segment)) (*places)[i].trafNumber++;
        }
    }
    return MBX_OK;
}

// Calls `visit(row, place)` for every row of the track. MBX_ERR_NOT_FOUND for a row of a fragment that it
// lacks.
template <typename Visit>
MbxStatus forEachRow(const MbxTfraParams& params, const FragmentPlace* places, Visit&& visit) {
    for (const MbxBlock* block = params.track->fragmentIndex.first; block != nullptr; block = block->next) {
        const auto* rows = MbxBlockEntries<MbxFragmentIndexEntry>(block);
        for (uint32_t i = 0; i < block->count; i++) {
            if (rows[i].fragmentIndex >= params.track->segmentCount) return MBX_ERR_NOT_FOUND;
            visit(rows[i], places[rows[i].fragmentIndex]);
        }
    }
    return MBX_OK;
}

// Bytes less one of a field that holds numbers up to `largest`.
uint32_t lengthSize(uint32_t largest) {
    if (largest < 1U << 8) return 0;
    if (largest < 1U << 16) return 1;
    return largest < 1U << 24 ? 2 : 3;
}

template <typename Number>
void raise(Number* largest, Number value) {
    if (value > *largest) *largest = value;
}

// The largest of everything that decides the form of the box.
MbxStatus chooseForm(const MbxOptions* options, const FragmentPlace* places, MbxTfraBox* box) {
    MbxFragmentIndexEntry largest = {};
    uint32_t trafNumber = 0;
    MBX_TRY(
        forEachRow(box->params, places, [&](const MbxFragmentIndexEntry& row, const FragmentPlace& place) {
            raise(&largest.time, row.time);
            raise(&largest.fragmentIndex, row.fragmentIndex);
            raise(&largest.trunNumber, row.trunNumber);
            raise(&largest.sampleNumber, row.sampleNumber);
            raise(&trafNumber, place.trafNumber);
        }));
    box->trafLength = lengthSize(trafNumber);
    box->trunLength = lengthSize(largest.trunNumber);
    box->sampleLength = lengthSize(largest.sampleNumber);
    return MbxChooseIndexVersion(options, largest.time, places[largest.fragmentIndex].moofOffset,
                                 &box->version);
}

}  // namespace

MbxStatus MbxBuildTfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTfraParams* params, MbxTfraBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    FragmentPlace* places = nullptr;
    MBX_TRY(locateFragments(context, *params, &places));
    const MbxStatus status = chooseForm(options, places, box);
    MbxFree(context, places);
    MBX_TRY(status);
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteTfraPayload));
}

namespace {

MbxStatus composeRows(const MbxTfraBox& box, const FragmentPlace* places, uint8_t* data) {
    const uint32_t width = box.version == 1 ? 8 : 4;
    MbxRowBytes rows = {data};
    return forEachRow(box.params, places, [&](const MbxFragmentIndexEntry& row, const FragmentPlace& place) {
        MbxAppend(&rows, row.time, width);                         // unsigned int(64) or (32) time
        MbxAppend(&rows, place.moofOffset, width);                 // unsigned int(64) or (32) moof_offset
        MbxAppend(&rows, place.trafNumber, box.trafLength + 1);    // traf_number
        MbxAppend(&rows, row.trunNumber, box.trunLength + 1);      // trun_number
        MbxAppend(&rows, row.sampleNumber, box.sampleLength + 1);  // sample_number
    });
}

}  // namespace

// 8.8.10 Track Fragment Random Access Box
MbxStatus MbxWriteTfraPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxTfraBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint32_t entries = 0;
    MBX_TRY(MbxBlockListCount(&box->params.track->fragmentIndex, &entries));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPut32(&bytes, box->params.track->header.trackId);  // unsigned int(32) track_ID
    // unsigned int(26) reserved, unsigned int(2) length_size_of_traf_num, _trun_num, _sample_num
    MbxPut32(&bytes, box->trafLength << 4 | box->trunLength << 2 | box->sampleLength);
    MbxPut32(&bytes, entries);  // unsigned int(32) number_of_entry

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    FragmentPlace* places = nullptr;
    MBX_TRY(locateFragments(context, box->params, &places));
    const uint64_t rowSize =
        (box->version == 1 ? 19 : 11) + box->trafLength + box->trunLength + box->sampleLength;
    const MbxStatus status = MbxWriteRows(
        context, scratch, file, entries, rowSize,
        [&](uint8_t* data) { return composeRows(*box, places, data); }, &count);
    MbxFree(context, places);
    MBX_TRY(status);
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTfraBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTfraBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("tfra"), box,
                       MbxWithScratch(scratch, MbxWriteTfraPayload), written, accumulated);
}

MbxStatus MbxFreeTfra(MbxContext* context, MbxTfraBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMfro(MbxContext* context, const MbxOptions* options, const MbxMfroParams* params,
                       MbxMfroBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteMfroPayload);
}

// 8.8.11 Movie Fragment Random Access Offset Box
MbxStatus MbxWriteMfroPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMfroBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, box->params.parentSize);  // unsigned int(32) size, of the enclosing box
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMfroBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMfroBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mfro"), box, MbxWriteMfroPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMfro(MbxContext* context, MbxMfroBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxSetMfroParentSize(MbxMfroBox* box, uint64_t size) {
    if (box == nullptr) return MBX_ERR_INVALID_ARG;
    if (size > UINT32_MAX) return MBX_ERR_BAD_STATE;
    box->params.parentSize = static_cast<uint32_t>(size);
    return MBX_OK;
}

MbxStatus MbxBuildMfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxMovie* params, MbxMfraBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    for (const MbxTrack* track = params->tracks.first; track != nullptr; track = track->next) {
        if (track->fragmentIndex.first == nullptr) continue;
        const MbxTfraParams tfra = {params, track};
        MBX_TRY(MbxMakeListItem(
            context, &box->tfra,
            [&](MbxTfraBox* item) { return MbxBuildTfra(context, scratch, options, &tfra, item); },
            MbxFreeTfra));
    }
    const MbxMfroParams unknown = {0};
    MBX_TRY(MbxMakeBox(context, options, &box->mfro, &unknown, MbxBuildMfro, MbxFreeMfro));
    MBX_TRY(MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteMfraPayload)));
    // The field has a fixed width, so that the size holds with its value.
    return MbxSetMfroParentSize(box->mfro, box->size);
}

// 8.8.9 Movie Fragment Random Access Box
MbxStatus MbxWriteMfraPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxMfraBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    const auto writeTfra = [&](const MbxTfraBox* tfra, uint64_t at, uint64_t* counter) {
        return MbxWriteTfraBox(context, scratch, options, file, at, tfra, nullptr, counter);
    };
    MBX_TRY(MbxWriteEach(box->tfra.first, position, &count, writeTfra));
    MBX_TRY(MbxWriteMfroBox(context, options, file, position + count, box->mfro, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMfraBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxMfraBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mfra"), box,
                       MbxWithScratch(scratch, MbxWriteMfraPayload), written, accumulated);
}

MbxStatus MbxFreeMfra(MbxContext* context, MbxMfraBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeList(context, &box->tfra, MbxFreeTfra));
        return MbxFreeMfro(context, box->mfro);
    });
}
