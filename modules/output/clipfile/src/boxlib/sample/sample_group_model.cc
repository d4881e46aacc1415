#include "boxlib/sample/sample_group_model.h"

#include "boxlib/core/box.h"

namespace {

MbxStatus freeGroup(MbxContext* context, MbxSampleGroupParams* group) {
    return MbxFreeBox(context, group, [&] {
        MbxBlockListRelease(context, &group->rows);
        return MBX_OK;
    });
}

MbxStatus freeDescription(MbxContext* context, MbxGroupDescription* description) {
    return MbxFreeBox(context, description, [&] {
        MbxBufferRelease(context, &description->raw);
        return MBX_OK;
    });
}

MbxStatus freeDescriptions(MbxContext* context, MbxGroupDescriptionParams* descriptions) {
    return MbxFreeBox(context, descriptions,
                      [&] { return MbxFreeList(context, &descriptions->entries, freeDescription); });
}

MbxStatus freeSubSample(MbxContext* context, MbxSubSample* subSample) {
    return MbxFreeBox(context, subSample);
}

MbxStatus freeSubSamples(MbxContext* context, MbxSubSampleParams* entry) {
    return MbxFreeBox(context, entry,
                      [&] { return MbxFreeList(context, &entry->subSamples, freeSubSample); });
}

}  // namespace

MbxStatus MbxReleaseSampleGroups(MbxContext* context, MbxSampleSegment* segment) {
    MBX_TRY(MbxFreeList(context, &segment->sampleGroups, freeGroup));
    MBX_TRY(MbxFreeList(context, &segment->groupDescriptions, freeDescriptions));
    return MbxFreeList(context, &segment->subSamples, freeSubSamples);
}
