#include "ParameterSets.h"

#include <algorithm>
#include <optional>

#include "NalSyntax.h"

namespace nal_access {

namespace {

bool AreEqual(Bytes a, Bytes b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end());
}

/// True when `nal` can be used in the place of `first`, a set of the same type.
bool HasIdentifierOf(Bytes nal, Bytes first) {
    if (TypeOf(nal) == NalType::kSequenceParameterSet) {
        const auto id = ReadSequenceParameterSetId(nal);
        return !id || id == ReadSequenceParameterSetId(first);
    }
    const auto ids = ReadPictureParameterSetIds(nal);
    const auto firstIds = ReadPictureParameterSetIds(first);
    return !ids || !firstIds || ids->pictureParameterSet == firstIds->pictureParameterSet;
}

}  // namespace

bool FindIdrParameterSets(const std::vector<Bytes>& nals, ActiveParameterSets& sets) {
    sets = {};
    std::optional<SliceHeader> slice;
    const auto idr = std::find_if(nals.begin(), nals.end(), [&](Bytes nal) {
        if (TypeOf(nal) != NalType::kIdrSlice) {
            return false;
        }
        slice = ReadSliceHeader(nal);
        return slice && slice->firstMacroblock == 0;
    });
    if (idr == nals.end()) {
        return false;
    }
    // Of several sets with one identifier the last before the slice is the one in force.
    std::optional<std::uint32_t> sequenceId;
    for (auto nal = nals.begin(); nal != idr; ++nal) {
        if (TypeOf(*nal) == NalType::kPictureParameterSet) {
            const auto ids = ReadPictureParameterSetIds(*nal);
            if (ids && ids->pictureParameterSet == slice->pictureParameterSet) {
                sets.picture = *nal;
                sequenceId = ids->sequenceParameterSet;
            }
        }
    }
    for (auto nal = nals.begin(); nal != idr; ++nal) {
        if (TypeOf(*nal) == NalType::kSequenceParameterSet) {
            const auto id = ReadSequenceParameterSetId(*nal);
            if (id && (!sequenceId || id == sequenceId)) {
                sets.sequence = *nal;
            }
        }
    }
    return true;
}

void ParameterSetFilter::Observe(const std::vector<Bytes>& nals) {
    if (replaced_) {
        return;
    }
    if (sequence_.empty()) {
        ActiveParameterSets sets;
        if (!FindIdrParameterSets(nals, sets) || sets.sequence.empty() || sets.picture.empty()) {
            return;
        }
        sequence_.assign(sets.sequence.begin(), sets.sequence.end());
        picture_.assign(sets.picture.begin(), sets.picture.end());
    }
    for (const Bytes nal : nals) {
        const NalType type = TypeOf(nal);
        if (type == NalType::kSequenceParameterSet || type == NalType::kPictureParameterSet) {
            const Bytes first = type == NalType::kSequenceParameterSet ? sequence_ : picture_;
            if (!AreEqual(nal, first) && HasIdentifierOf(nal, first)) {
                replaced_ = true;
            }
        }
    }
}

bool ParameterSetFilter::IsRedundant(Bytes nal) const {
    return !replaced_ && !sequence_.empty() && (AreEqual(nal, sequence_) || AreEqual(nal, picture_));
}

}  // namespace nal_access
