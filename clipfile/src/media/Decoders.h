#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <vector>

#include "media/ParameterSets.h"
#include "reader/InputFile.h"

namespace clipfile {

/// Finds the ends of AAC frames that stand side by side without headers, by decoding them (libavcodec). AAC
/// LC, 48 kHz, stereo, as recordings describe their audio.
class AudioFrameFinder {
 public:
    AudioFrameFinder();
    ~AudioFrameFinder();

    /// Sizes of the frames at the front of `bytes` that decode, up to the first that does not. Behind the
    /// last frame of a run other bytes may happen to decode as well: the caller knows better where a run
    /// ends.
    std::vector<std::size_t> Find(Bytes bytes);

 private:
    struct Decoder;
    /// Size of the one frame at the front of `bytes`, which decodes.
    std::size_t FindEnd(Bytes bytes);

    std::unique_ptr<Decoder> decoder_;
};

/// Whether the sets of an IDR picture, in the form of a sample, allow pictures to be decoded in another order
/// than they are shown in (`max_num_reorder_frames`, ITU-T H.264 E.2.1).
bool AllowReordering(const ParameterSets& sets, Bytes picture);

/// Whether a picture, an IDR picture in the form of a sample, decodes with these sets to the given size.
bool DecodesWith(const ParameterSets& sets, Bytes picture, int width, int height);

}  // namespace clipfile
