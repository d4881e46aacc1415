// The records of user metadata: putting, timing and releasing them.
#include "boxlib/entry/sample_entry.h"
#include "boxlib/metadata/user_metadata.h"

namespace {

MbxStatus freeItem(MbxContext* context, MbxMetadataItem* item) {
    return MbxFreeBox(context, item, [&] {
        MbxBufferRelease(context, &item->data);
        return MBX_OK;
    });
}

MbxStatus freeTrack(MbxContext* context, MbxMetadataTrack* track) {
    return MbxFreeBox(context, track, [&] {
        MBX_TRY(MbxFreeList(context, &track->dataEntries, MbxFreeDataEntry));
        MBX_TRY(MbxReleaseSampleEntries(context, &track->sampleEntries));
        return MbxFreeList(context, &track->entries, [](MbxContext* owner, MbxMetadataTrackEntry* entry) {
            return MbxFreeBox(owner, entry);
        });
    });
}

}  // namespace

bool MbxHasUserMetadata(const MbxUserMetadata* lists) {
    return lists->items.first != nullptr || lists->fileItems.first != nullptr ||
           lists->tracks.first != nullptr;
}

MbxStatus MbxPutMetadataItem(MbxContext* context, MbxList<MbxMetadataItem>* list,
                             const MbxMetadataItemParams* params, uint32_t* count) {
    if (MbxAnyNull(context, list, params, count)) return MBX_ERR_INVALID_ARG;
    if (params->flag > 1 || params->language > 0x7FFF || params->dataSize > MBX_METADATA_DATA_LIMIT ||
        (params->dataSize != 0 && params->data == nullptr)) {
        return MBX_ERR_INVALID_ARG;
    }
    MbxMetadataItem* found = nullptr;
    const auto isSame = [params](const MbxMetadataItem& item) {
        return item.type == params->type && item.language == params->language &&
               item.encoding == params->encoding;
    };
    MBX_TRY(MbxListFind(list->first, isSame, &found, nullptr));

    const auto fill = [&](MbxMetadataItem* item) {
        item->type = params->type;
        item->language = params->language;
        item->encoding = params->encoding;
        // Contract: replacing-releases-first. Without memory the old data is gone.
        MBX_TRY(MbxBufferAssign(context, 0, &item->data, params->data, params->dataSize));
        item->flag = params->flag;
        return MBX_OK;
    };
    const MbxStatus status = found != nullptr ? fill(found) : MbxMakeListItem(context, list, fill, freeItem);
    return status == MBX_OK ? MbxListCount(list->first, count) : status;
}

MbxStatus MbxSetMetadataTrackTimes(MbxMetadataTrack* track, uint32_t selector, uint64_t creation,
                                   uint64_t modification) {
    if ((selector & MBX_TIME_METADATA_CREATION) != 0) {
        // Contract: metadata-times-narrow. In every mode.
        if (creation > UINT32_MAX) return MBX_ERR_BAD_STATE;
        track->header.creationTime = creation;
    }
    if ((selector & MBX_TIME_METADATA_MODIFICATION) != 0) {
        if (modification > UINT32_MAX) return MBX_ERR_BAD_STATE;
        track->header.modificationTime = modification;
    }
    return MBX_OK;
}

MbxStatus MbxReleaseUserMetadata(MbxContext* context, MbxUserMetadata* lists) {
    MBX_TRY(MbxFreeList(context, &lists->items, freeItem));
    MBX_TRY(MbxFreeList(context, &lists->fileItems, freeItem));
    return MbxFreeList(context, &lists->tracks, freeTrack);
}
