#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "control/Preview.h"

namespace receiver {

/// A small picture as a file of JPEG.
struct PreviewPicture {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> jpeg;
};

/// Decodes an IDR access unit (Annex B, with its parameter sets) and scales it to a width, with square
/// pixels. Throws `ReceiverError` (`kInternal`) for one that can't be decoded.
PreviewPicture MakePreviewPicture(const unsigned char* unit, std::size_t size, int width);

/// The highest sample of each channel in dBFS, from the second one of AAC frames with ADTS headers on;
/// silence is -120. Frames that can't be decoded are left out. Empty without a frame.
std::vector<double> PeaksOf(const std::vector<Preview::Material::AudioFrame>& frames);

/// RFC 4648 4.
std::string Base64(const std::vector<std::uint8_t>& bytes);

}  // namespace receiver
