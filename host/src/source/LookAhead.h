#pragma once

#include <chrono>

#include "source/Input.h"

namespace receiver {

/// The beginning of an input, which is looked at before it is decided what becomes of its streams.
struct Beginning {
    /// Of all streams that are read, in the order in which they came.
    Packets packets;
    /// When the first picture came.
    std::chrono::steady_clock::time_point arrived;
};

/// Reads the first second of pictures, and on until the clocks of RTP's media are tied to each other. `audio`
/// may be null. Throws like `Input::Read`.
Beginning LookAhead(Input& input, const AVStream& video, const AVStream* audio);

/// The length of the audio frame in a packet of `size` bytes, in ticks of 90000.
std::int64_t AudioDuration(const AVStream& stream, int size);

}  // namespace receiver
