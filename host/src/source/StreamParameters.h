#pragma once

#include "source/Libav.h"

namespace receiver {

/// Renews what a container has told of a stream at its beginning by `packet`, with which it goes on as
/// another one: by new parameters that come with the packet, and by what it shows itself. False where both
/// tell nothing, as of audio that cannot be decoded.
bool RenewParameters(AVStream& stream, const AVPacket& packet);

}  // namespace receiver
