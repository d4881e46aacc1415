#include "platform/SharePath.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>
#include <vector>

namespace clipfileModule {

namespace {

/// Direct TCP, without NetBIOS.
constexpr std::string_view kDefaultPort = "445";

// By hand: the functions of the C library follow the locale of the host.
bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

bool isUnreserved(char c) {
    return isDigit(c) || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
           std::string_view("-._~").find(c) != std::string_view::npos;
}

std::string percentEncoded(std::string_view text) {
    constexpr std::string_view kHexadecimal = "0123456789ABCDEF";
    std::string encoded;
    for (const char c : text) {
        if (isUnreserved(c)) {
            encoded += c;
        } else {
            const auto octet = static_cast<unsigned char>(c);
            encoded += '%';
            encoded += kHexadecimal[octet >> 4U];
            encoded += kHexadecimal[octet & 15U];
        }
    }
    return encoded;
}

std::vector<std::string_view> partsOf(std::string_view path) {
    std::vector<std::string_view> parts;
    while (!path.empty()) {
        const std::size_t length = std::min(path.find_first_of("\\/"), path.size());
        if (length != 0) {
            parts.push_back(path.substr(0, length));
        }
        path.remove_prefix(std::min(length + 1, path.size()));
    }
    return parts;
}

}  // namespace

bool IsSharePath(const std::string& path) {
    return path.compare(0, 2, "\\\\") == 0;
}

bool SharePath::Parse(const std::string& path, SharePath& result) {
    if (!IsSharePath(path)) {
        return false;
    }
    const std::vector<std::string_view> parts = partsOf(path);
    if (parts.size() < 2) {
        return false;
    }
    const std::size_t colon = std::min(parts[0].find(':'), parts[0].size());
    const std::string_view server = parts[0].substr(0, colon);
    const std::string_view port = colon == parts[0].size() ? kDefaultPort : parts[0].substr(colon + 1);
    if (server.empty() || !std::all_of(server.begin(), server.end(), isUnreserved) || port.empty() ||
        !std::all_of(port.begin(), port.end(), isDigit)) {
        return false;
    }
    result.server_ = server;
    result.port_ = port;
    result.shareUrl_ = "smb://" + result.server_ + ':' + result.port_ + '/' + percentEncoded(parts[1]);
    result.url_ = result.shareUrl_;
    for (std::size_t i = 2; i < parts.size(); ++i) {
        result.url_ += '/' + percentEncoded(parts[i]);
    }
    return true;
}

}  // namespace clipfileModule
