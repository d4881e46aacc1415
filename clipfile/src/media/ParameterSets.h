#pragma once

#include <vector>

namespace clipfile {

/// The sets that a decoder needs for the pictures of a recording: NAL units without start code. A file gets
/// them in its `moov`, on closing.
struct ParameterSets {
    std::vector<unsigned char> sps;
    std::vector<unsigned char> pps;
};

}  // namespace clipfile
