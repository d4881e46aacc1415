#pragma once

#include "source/Input.h"

namespace receiver {

/// Corrects the stamp of the first picture among `packets`, the beginning of a stream, where it is at odds
/// with those behind it, which agree. Pictures that are missing behind the first one look the same but for
/// the sound, which goes on: where there is none, nobody knows. `audio` may be null.
void MendFirstStamp(const Packets& packets, const AVStream& video, const AVStream* audio);

}  // namespace receiver
