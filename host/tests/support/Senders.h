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

/// ffmpeg as a web server that gives `material` to the first who asks for `url`, at the material's own speed.
std::unique_ptr<Process> ServeHttp(const std::filesystem::path& material, const std::string& url);

/// GStreamer's RTSP server, giving the movie file `material` to everybody who asks for
/// rtsp://127.0.0.1:`port`/live. Returns when it listens. Throws std::runtime_error with its words when it
/// does not.
std::unique_ptr<Process> ServeRtsp(const std::filesystem::path& material, std::uint16_t port);

/// ffmpeg, sending the video to the first of `ports` and the audio to the third.
std::unique_ptr<Process> SendRtp(const std::filesystem::path& material, const FreePorts& ports);

/// Has ffmpeg write the session description of what `SendRtp` is about to send. Throws std::runtime_error
/// with ffmpeg's words when that fails.
void WriteSessionDescription(const std::filesystem::path& material, const FreePorts& ports,
                             const std::filesystem::path& description);

/// Waits until a program listens at that TCP port of an IPv4 address. False when none does.
bool WaitUntilListening(std::uint16_t port);

/// Waits until a program has bound that UDP port, so that nothing sent from now on is lost. False when none
/// does.
bool WaitUntilBound(std::uint16_t port);

/// Takes packets that come to that UDP port of this machine, which must be free, and gives it back when there
/// were so many. False when they do not come.
bool TakePackets(std::uint16_t port, int count);

}  // namespace endtoend
