#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>

#include "support/FreePorts.h"
#include "support/Process.h"

namespace endtoend {

/// ffmpeg, sending `material` at its own speed, as a transport stream to `url` (UDP, SRT).
std::unique_ptr<Process> SendTransportStream(const std::filesystem::path& material, const std::string& url);

/// ffmpeg, sending the video to the first of `ports` and the audio to the third.
std::unique_ptr<Process> SendRtp(const std::filesystem::path& material, const FreePorts& ports);

/// Has ffmpeg write the session description of what `SendRtp` is about to send. Throws std::runtime_error
/// with ffmpeg's words when that fails.
void WriteSessionDescription(const std::filesystem::path& material, const FreePorts& ports,
                             const std::filesystem::path& description);

/// Waits until a program has bound that UDP port, so that nothing sent from now on is lost. False when none
/// does.
bool WaitUntilBound(std::uint16_t port);

}  // namespace endtoend
