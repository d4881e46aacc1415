#include "support/Senders.h"

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

}  // namespace

std::unique_ptr<Process> SendTransportStream(const std::filesystem::path& material, const std::string& url) {
    return std::make_unique<Process>(std::vector<std::string>{"ffmpeg", "-v", "error", "-nostdin", "-re",
                                                              "-i", material.string(), "-map", "0", "-c",
                                                              "copy", "-f", "mpegts", url});
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

bool WaitUntilBound(std::uint16_t port) {
    std::array<char, 8> name{};
    std::snprintf(name.data(), name.size(), ":%04X ", port);
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    while (std::chrono::steady_clock::now() < deadline) {
        if (textOf("/proc/net/udp").find(name.data()) != std::string::npos ||
            textOf("/proc/net/udp6").find(name.data()) != std::string::npos) {
            return true;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return false;
}

}  // namespace endtoend
