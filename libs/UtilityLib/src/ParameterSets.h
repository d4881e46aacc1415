#pragma once

#include <vector>

#include "AnnexBReader.h"

namespace nal_access {

/// The parameter sets of one IDR slice. A set that is not in the access unit is empty.
struct ActiveParameterSets {
    Bytes sequence;
    Bytes picture;
};

/// Looks for the first IDR slice with first_mb_in_slice 0 among the NAL units of an access unit. True when
/// there is one; `sets` then holds the sets before it that it refers to by its identifiers. When the picture
/// parameter set is missing the slice leads to no sequence parameter set; the last one before it is given.
bool FindIdrParameterSets(const std::vector<Bytes>& nals, ActiveParameterSets& sets);

/// Tells which parameter sets a file's video samples can do without. A reader of the file knows those of the
/// sample entry, which are the sets of the first IDR picture.
class ParameterSetFilter {
 public:
    /// Takes note of an access unit; call it before `IsRedundant` on the unit's sets.
    void Observe(const std::vector<Bytes>& nals);
    /// True for a parameter set equal to one of the first IDR picture, as long as no other set has taken over
    /// one of their identifiers: after that a reader can need each of them again, and none is redundant.
    bool IsRedundant(Bytes nal) const;

 private:
    std::vector<unsigned char> sequence_;
    std::vector<unsigned char> picture_;
    bool replaced_ = false;
};

}  // namespace nal_access
