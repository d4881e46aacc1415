#include "options/AddressCheck.h"

#include <charconv>
#include <cstdint>
#include <string_view>

#include "common/Credentials.h"
#include "source/Address.h"

namespace receiver {
namespace {

constexpr std::uint32_t kLastPort = 65535;
/// What SRT makes a key of.
constexpr std::size_t kShortestPassphrase = 10;
constexpr std::size_t kLongestPassphrase = 79;

/// What stands behind the colon of the host; empty without one.
std::string_view PortOf(std::string_view url) {
    url.remove_prefix(url.find("://") + 3);
    std::string_view host = url.substr(0, url.find_first_of("/?#"));
    if (host.starts_with('[')) {
        const std::size_t end = host.find(']');
        host.remove_prefix(end == std::string_view::npos ? host.size() : end);
    }
    const std::size_t colon = host.rfind(':');
    return colon == std::string_view::npos ? std::string_view() : host.substr(colon + 1);
}

std::string PortMistake(const std::string& url) {
    const std::string shown = WithoutCredentials(url);
    const std::string_view text = PortOf(shown);
    std::uint32_t port = 0;
    const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), port);
    const bool number = error == std::errc() && stop == text.data() + text.size();
    if (text.empty() || (number && port >= 1 && port <= kLastPort)) {
        return {};
    }
    return std::string(text) + " is no port: ports go from 1 to " + std::to_string(kLastPort);
}

std::string PassphraseMistake(std::string_view url) {
    constexpr std::string_view kName = "passphrase=";
    const std::size_t options = url.find('?');
    std::size_t at = options;
    while (at != std::string_view::npos && !url.substr(at + 1).starts_with(kName)) {
        at = url.find('&', at + 1);
    }
    if (at == std::string_view::npos) {
        return {};
    }
    const std::string_view value = url.substr(at + 1 + kName.size());
    const std::size_t length = value.substr(0, value.find('&')).size();
    if (length >= kShortestPassphrase && length <= kLongestPassphrase) {
        return {};
    }
    return "the passphrase has " + std::to_string(length) + (length == 1 ? " character" : " characters") +
           ", and SRT takes " + std::to_string(kShortestPassphrase) + " to " +
           std::to_string(kLongestPassphrase);
}

}  // namespace

std::string AddressMistake(const std::string& url) {
    const std::string scheme = SchemeOf(url);
    if (scheme.empty() || scheme == "file") {
        return {};
    }
    std::string mistake = PortMistake(url);
    return mistake.empty() && scheme == "srt" ? PassphraseMistake(url) : mistake;
}

}  // namespace receiver
