// The registry of boxes: one row per box, which registry_test.cc walks. Every box proves the properties that
// all share, and one without a row, or a row without golden bytes, fails.
//
// A family's test file adds its rows, one per box:
//
//     const BoxRegistration kMvhd = RegisterBox<MbxMvhdBox>({
//         .name = "Mvhd", .code = "mvhd", .parents = "moov", .clause = "ISO/IEC 14496-12 8.2.2",
//         .presence = Presence::kMandatory,
//         .golden = Hex("..."),
//         .build = [](MbxContext* context, const MbxOptions* options, MbxMvhdBox* box) {
//             const MbxMvhdParams params = {...};
//             return MbxBuildMvhd(context, options, &params, box);
//         },
//         .write = MbxWriteMvhdBox, .free = MbxFreeMvhd});
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "boxlib/core/box.h"
#include "boxlib/support/fixture.h"

enum class Presence {
    kMandatory,  // writing a null record is MBX_ERR_INVALID_ARG
    kOptional,   // a null record is an absent box
};

// A box of some record type, with the type erased. Function members may be lambdas or the library's
// functions.
struct BoxRow {
    std::string name;     // as in the four functions: "Mvhd" for MbxBuildMvhd
    std::string code;     // "mvhd", or "uuid"
    std::string parents;  // codes of the boxes that hold it; "file" for the top level
    std::string clause;   // where its layout is told
    Presence presence = Presence::kMandatory;
    Bytes golden;  // the whole sample box in box_size_mode 0, by hand from the clause
    // Builds the sample record; all that it allocates beside the record must be owned by it.
    std::function<MbxStatus(MbxContext*, const MbxOptions*, void*)> build;
    std::function<MbxStatus(MbxContext*, const MbxOptions*, MbxFile*, uint64_t, const void*, uint64_t*,
                            uint64_t*)>
        write;
    std::function<MbxStatus(MbxContext*, void*)> free;
    size_t recordSize = 0;
};

// All rows, in order of registration.
std::vector<BoxRow>& BoxRows();

struct BoxRegistration {
    explicit BoxRegistration(BoxRow row) { BoxRows().push_back(std::move(row)); }
};

// What a family's test file writes down about a box.
template <typename Box>
struct BoxDescription {
    std::string name;
    std::string code;
    std::string parents;
    std::string clause;
    Presence presence = Presence::kMandatory;
    Bytes golden;
    std::function<MbxStatus(MbxContext*, const MbxOptions*, Box*)> build;
    // As MbxWriteBox is called: a lambda where the box's writer takes more.
    std::function<MbxStatus(MbxContext*, const MbxOptions*, MbxFile*, uint64_t, const Box*, uint64_t*,
                            uint64_t*)>
        write;
    std::function<MbxStatus(MbxContext*, Box*)> free;
};

template <typename Box>
BoxRegistration RegisterBox(BoxDescription<Box> box) {
    static_assert(offsetof(Box, size) == 0 && sizeof(Box::size) == 8, "a box record begins with its size");
    BoxRow row;
    row.name = std::move(box.name);
    row.code = std::move(box.code);
    row.parents = std::move(box.parents);
    row.clause = std::move(box.clause);
    row.presence = box.presence;
    row.golden = std::move(box.golden);
    row.build = [build = std::move(box.build)](MbxContext* context, const MbxOptions* options, void* record) {
        return build(context, options, static_cast<Box*>(record));
    };
    row.write = [write = std::move(box.write)](MbxContext* context, const MbxOptions* options, MbxFile* file,
                                               uint64_t position, const void* record, uint64_t* written,
                                               uint64_t* accumulated) {
        return write(context, options, file, position, static_cast<const Box*>(record), written, accumulated);
    };
    row.free = [free = std::move(box.free)](MbxContext* context, void* record) {
        return free(context, static_cast<Box*>(record));
    };
    row.recordSize = sizeof(Box);
    return BoxRegistration(std::move(row));
}
