#include "support/Senders.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <thread>
#include <vector>

namespace endtoend {
namespace {

std::string textOf(const std::filesystem::path& file) {
    std::ifstream in(file);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

std::vector<std::string> rtpCommand(const std::filesystem::path& material, const FreePorts& ports) {
    const auto address = [&](int offset) {
        return "rtp://127.0.0.1:" + std::to_string(ports.First() + offset) + "?pkt_size=1200";
    };
    return {"ffmpeg", "-v",  "error", "-nostdin", "-re", "-i",  material.string(),
            "-map",   "0:v", "-c",    "copy",     "-f",  "rtp", address(0),
            "-map",   "0:a", "-c",    "copy",     "-f",  "rtp", address(2)};
}

/// Waits until one of `tables` (of /proc/net) has a line with `text`.
bool waitForSocket(const std::vector<const char*>& tables, const std::string& text) {
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    while (std::chrono::steady_clock::now() < deadline) {
        for (const char* const table : tables) {
            if (textOf(table).find(text) != std::string::npos) {
                return true;
            }
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return false;
}

std::string hexadecimal(std::uint16_t port) {
    std::array<char, 8> name{};
    std::snprintf(name.data(), name.size(), ":%04X ", port);
    return name.data();
}

/// What GStreamer's RTSP server is told to do: the media as they are, parameter sets with every IDR frame.
constexpr const char* kRtspServer = R"(
import gi, sys
gi.require_version('Gst', '1.0')
gi.require_version('GstRtspServer', '1.0')
from gi.repository import GLib, Gst, GstRtspServer
Gst.init(None)
server = GstRtspServer.RTSPServer()
server.set_address('127.0.0.1')
server.set_service(sys.argv[2])
factory = GstRtspServer.RTSPMediaFactory()
factory.set_launch('( filesrc location=%s ! qtdemux name=demux '
                   'demux.video_0 ! queue ! rtph264pay name=pay0 pt=96 config-interval=-1 '
                   'demux.audio_0 ! queue ! rtpmp4gpay name=pay1 pt=97 )' % sys.argv[1])
server.get_mount_points().add_factory('/live', factory)
server.attach(None)
GLib.MainLoop().run()
)";

}  // namespace

std::unique_ptr<Process> ServeHttp(const std::filesystem::path& material, const std::string& url) {
    return std::make_unique<Process>(std::vector<std::string>{"ffmpeg", "-v", "error", "-nostdin", "-re",
                                                              "-i", material.string(), "-map", "0", "-c",
                                                              "copy", "-f", "mpegts", "-listen", "1", url});
}

std::unique_ptr<Process> ServeRtsp(const std::filesystem::path& material, std::uint16_t port) {
    // The bindings belong to the system's own Python, which need not be the first of the path.
    auto server = std::make_unique<Process>(std::vector<std::string>{
        "/usr/bin/python3", "-c", kRtspServer, material.string(), std::to_string(port)});
    if (!WaitUntilListening(port)) {
        throw std::runtime_error("the RTSP server: " + server->AllText());
    }
    return server;
}

std::unique_ptr<Process> SendTransportStream(const std::filesystem::path& material, const std::string& url) {
    return std::make_unique<Process>(std::vector<std::string>{"ffmpeg", "-v", "error", "-nostdin", "-re",
                                                              "-i", material.string(), "-map", "0", "-c",
                                                              "copy", "-copyinkf", "-f", "mpegts", url});
}

std::unique_ptr<Process> PublishRtmp(const std::filesystem::path& material, const std::string& url) {
    return std::make_unique<Process>(std::vector<std::string>{
        "ffmpeg", "-v", "error", "-nostdin", "-re", "-i", material.string(), "-c", "copy", "-f", "flv", url});
}

std::unique_ptr<Process> WriteHls(const std::filesystem::path& material,
                                  const std::filesystem::path& folder) {
    return std::make_unique<Process>(std::vector<std::string>{
        "ffmpeg", "-v", "error", "-nostdin", "-re", "-i", material.string(), "-c", "copy", "-f", "hls",
        "-hls_time", "1", "-hls_list_size", "4", (folder / "live.m3u8").string()});
}

std::unique_ptr<Process> ServeFolder(const std::filesystem::path& folder, std::uint16_t port) {
    auto server = std::make_unique<Process>(
        std::vector<std::string>{"/usr/bin/python3", "-m", "http.server", std::to_string(port), "--bind",
                                 "127.0.0.1", "--directory", folder.string()});
    if (!WaitUntilListening(port)) {
        throw std::runtime_error("the web server: " + server->AllText());
    }
    return server;
}

void SendDatagrams(const std::vector<Bytes>& datagrams, std::uint16_t port, std::chrono::nanoseconds length) {
    const int file = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const auto begin = std::chrono::steady_clock::now();
    for (std::size_t number = 0; number < datagrams.size(); ++number) {
        std::this_thread::sleep_until(begin + length * number / datagrams.size());
        sendto(file, datagrams[number].data(), datagrams[number].size(), 0,
               reinterpret_cast<const sockaddr*>(&address), sizeof address);
    }
    close(file);
}

void SendFile(const std::filesystem::path& transportStream, std::uint16_t port,
              std::chrono::nanoseconds length) {
    constexpr std::size_t kSize = std::size_t{7} * 188;
    const std::string bytes = textOf(transportStream);
    std::vector<Bytes> datagrams;
    for (std::size_t at = 0; at < bytes.size(); at += kSize) {
        const std::string part = bytes.substr(at, kSize);
        datagrams.emplace_back(part.begin(), part.end());
    }
    SendDatagrams(datagrams, port, length);
}

std::unique_ptr<Process> SendRtp(const std::filesystem::path& material, const FreePorts& ports) {
    return std::make_unique<Process>(rtpCommand(material, ports));
}

void WriteSessionDescription(const std::filesystem::path& material, const FreePorts& ports,
                             const std::filesystem::path& description) {
    std::vector<std::string> command = rtpCommand(material, ports);
    // Of no packet: the description alone.
    command.insert(command.begin() + 4, {"-t", "0.01"});
    command.insert(command.end(), {"-sdp_file", description.string()});
    const Outcome outcome = RunProgram(command);
    if (outcome.code != 0) {
        throw std::runtime_error("ffmpeg: " + outcome.errors);
    }
}

bool WaitUntilListening(std::uint16_t port) {
    // Local address, no remote one, and the state LISTEN.
    return waitForSocket({"/proc/net/tcp"}, hexadecimal(port) + "00000000:0000 0A");
}

bool WaitUntilBound(std::uint16_t port) {
    return waitForSocket({"/proc/net/udp", "/proc/net/udp6"}, hexadecimal(port));
}

bool TakePackets(std::uint16_t port, int count) {
    const int file = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const auto patience = std::chrono::duration_cast<std::chrono::milliseconds>(kPatience);
    const bool bound = bind(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    std::array<char, 2048> packet{};
    pollfd wait{file, POLLIN, 0};
    while (bound && count > 0 && poll(&wait, 1, static_cast<int>(patience.count())) == 1) {
        count -= recv(file, packet.data(), packet.size(), 0) > 0 ? 1 : 0;
    }
    close(file);
    return count == 0;
}

}  // namespace endtoend
