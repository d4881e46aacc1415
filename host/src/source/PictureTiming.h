#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "source/AnnexB.h"

namespace receiver {

/// Reads from H.264's picture timing messages (ITU-T H.264 D.1.3) whether frames are counted by the
/// drop-frame rule, of which a decoder tells only at the frames in front of which numbers were dropped, one
/// in 1800; and from its parameter sets how far pictures are reordered.
class PictureTiming {
 public:
    /// Enters the parameter sets and messages of an access unit or of out-of-band data.
    void Look(const std::vector<NalUnit>& units);
    /// As the last message told.
    bool DropFrame() const { return dropFrame_; }
    /// Pictures that may be decoded in front of one that is shown before all of them, as the last parameter
    /// set told (`max_num_reorder_frames`, E.2.1). Nothing where it did not.
    std::optional<std::uint32_t> ReorderFrames() const {
        return layout_ ? layout_->reorderFrames : std::nullopt;
    }

 private:
    /// What of a sequence parameter set decides how a message is written (E.1.1, E.1.2).
    struct Layout {
        /// Lengths in bits, 0 when there are no delays.
        unsigned int cpbRemovalDelay = 0;
        unsigned int dpbOutputDelay = 0;
        bool pictureStructure = false;
        std::optional<std::uint32_t> reorderFrames = {};
    };

    static std::optional<Layout> LayoutOf(std::span<const unsigned char> parameterSet);
    void LookAtMessages(std::span<const unsigned char> message);
    void LookAtTiming(std::span<const unsigned char> payload);

    std::optional<Layout> layout_;
    bool dropFrame_ = false;
};

}  // namespace receiver
