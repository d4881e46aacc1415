#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "support/FreePorts.h"
#include "support/Klv.h"
#include "support/Process.h"

namespace endtoend {

/// ffmpeg, sending `material` at its own speed, as a transport stream to `url` (UDP, SRT). Pictures in front
/// of the first IDR frame are sent too.
std::unique_ptr<Process> SendTransportStream(const std::filesystem::path& material, const std::string& url);

/// ffmpeg, publishing `material` at its own speed by RTMP to `url`.
std::unique_ptr<Process> PublishRtmp(const std::filesystem::path& material, const std::string& url);

/// ffmpeg, writing `material` at its own speed as segments of about a second into `folder`, with the playlist
/// live.m3u8.
std::unique_ptr<Process> WriteHls(const std::filesystem::path& material, const std::filesystem::path& folder);

/// A web server that gives the files of `folder` to everybody. Returns when it listens. Throws
/// std::runtime_error with its words when it does not.
std::unique_ptr<Process> ServeFolder(const std::filesystem::path& folder, std::uint16_t port);

/// Sends datagrams to a port of this machine, the first one now, and spread evenly over that time.
void SendDatagrams(const std::vector<Bytes>& datagrams, std::uint16_t port, std::chrono::nanoseconds length);

/// Sends a transport stream byte for byte in datagrams of seven packets.
void SendFile(const std::filesystem::path& transportStream, std::uint16_t port,
              std::chrono::nanoseconds length);

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
