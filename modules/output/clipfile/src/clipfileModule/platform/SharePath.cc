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

/// Where shares come from each IPv6 address has a name, since a colon cannot stand in a path there.
constexpr std::string_view kLiteralDomain = ".ipv6-literal.net";

bool endsWith(std::string_view text, std::string_view end) {
    return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

bool isHexadecimal(char c) {
    return isDigit(c) || (c >= 'A' && c <= 'F') || (c >= 'a' && c <= 'f');
}

/// An IPv6 address as RFC 4291 2.2 writes it, without a dotted part, and with a zone (RFC 4007 11.2) of plain
/// characters.
bool isAddress(std::string_view text) {
    const std::string_view address = text.substr(0, text.find('%'));
    const std::string_view zone = text.substr(std::min(address.size() + 1, text.size()));
    return address.find(':') != std::string_view::npos &&
           std::all_of(address.begin(), address.end(), [](char c) { return c == ':' || isHexadecimal(c); }) &&
           (zone.empty() ? address.size() == text.size()
                         : std::all_of(zone.begin(), zone.end(), isUnreserved));
}

/// The address that such a name stands for: '-' for ':', and 's' in front of the zone.
std::string addressOf(std::string_view name) {
    std::string address(name.substr(0, name.size() - kLiteralDomain.size()));
    const std::size_t zone = std::min(address.find('s'), address.size());
    std::replace(address.begin(), address.begin() + static_cast<std::ptrdiff_t>(zone), '-', ':');
    if (zone < address.size()) {
        address[zone] = '%';
    }
    return address;
}

std::string nameOf(std::string address) {
    const std::size_t zone = std::min(address.find('%'), address.size());
    std::replace(address.begin(), address.begin() + static_cast<std::ptrdiff_t>(zone), ':', '-');
    if (zone < address.size()) {
        address[zone] = 's';
    }
    return address.append(kLiteralDomain);
}

/// A server as a path writes it.
struct Authority {
    std::string_view host;
    bool inBrackets = false;
    std::string_view port = kDefaultPort;
};

/// False when it cannot be taken apart.
bool split(std::string_view text, Authority& result) {
    result.inBrackets = text.front() == '[';
    const std::size_t begin = result.inBrackets ? 1 : 0;
    const std::size_t end = text.find(result.inBrackets ? ']' : ':');
    if (result.inBrackets && end == std::string_view::npos) {
        return false;
    }
    result.host = text.substr(begin, end - begin);
    const std::string_view rest = text.substr(std::min(end, text.size() - begin) + begin);
    if (!rest.empty()) {
        result.port = rest.substr(1);
    }
    return (rest.empty() || rest.front() == ':') && !result.port.empty() &&
           std::all_of(result.port.begin(), result.port.end(), isDigit);
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
    Authority authority;
    if (parts.size() < 2 || !split(parts[0], authority)) {
        return false;
    }
    std::string server(authority.host);
    std::string name = server;
    if (authority.inBrackets || endsWith(server, kLiteralDomain)) {
        server = authority.inBrackets ? server : addressOf(server);
        if (!isAddress(server)) {
            return false;
        }
        // libsmbclient does not know the brackets.
        name = nameOf(server);
    } else if (server.empty() || !std::all_of(server.begin(), server.end(), isUnreserved)) {
        return false;
    }
    result.server_ = server;
    result.port_ = authority.port;
    result.shareUrl_ = "smb://" + name + ':' + result.port_ + '/' + percentEncoded(parts[1]);
    result.url_ = result.shareUrl_;
    for (std::size_t i = 2; i < parts.size(); ++i) {
        result.url_ += '/' + percentEncoded(parts[i]);
    }
    return true;
}

}  // namespace clipfileModule
