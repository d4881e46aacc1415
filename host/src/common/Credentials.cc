#include "common/Credentials.h"

#include <algorithm>
#include <array>

namespace receiver {
namespace {

constexpr std::string_view kScheme = "://";

/// What stands between "://" and the '@' in front of the host (RFC 3986 3.2.1).
TextSpan UserIn(std::string_view text, std::size_t begin) {
    const std::string_view rest = text.substr(begin);
    const std::string_view authority = rest.substr(0, rest.find_first_of("/?#"));
    std::size_t end = authority.rfind('@');
    if (end == std::string_view::npos) {
        // A password that holds one of these characters is no valid one, and secret all the same: what
        // follows the colon is no port then.
        const std::size_t colon = authority.starts_with('[') ? std::string_view::npos : authority.find(':');
        if (colon != std::string_view::npos &&
            authority.find_first_not_of("0123456789", colon + 1) != std::string_view::npos) {
            end = rest.rfind('@');
        }
    }
    return {begin, end == std::string_view::npos ? begin : begin + end};
}

bool IsNamePart(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' || c == '-';
}

/// True when the name that ends at `end` is that of a secret: "passphrase", "auth_token", "streamKey".
bool NamesSecret(std::string_view text, std::size_t end) {
    std::size_t begin = end;
    while (begin > 0 && IsNamePart(text[begin - 1])) {
        --begin;
    }
    std::string name(text.substr(begin, end - begin));
    std::transform(name.begin(), name.end(), name.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
    constexpr std::array<std::string_view, 5> kSecrets{"pass", "pwd", "secret", "token", "key"};
    return std::any_of(kSecrets.begin(), kSecrets.end(),
                       [&name](std::string_view part) { return name.find(part) != std::string::npos; });
}

}  // namespace

std::vector<TextSpan> CredentialsIn(std::string_view text) {
    std::vector<TextSpan> found;
    std::size_t at = 0;
    while ((at = text.find_first_of(":=", at)) != std::string_view::npos) {
        TextSpan span{at + 1, at + 1};
        if (text[at] == '=' && NamesSecret(text, at)) {
            span.end = std::min(text.find('&', at), text.size());
        } else if (text.substr(at).starts_with(kScheme)) {
            span = UserIn(text, at + kScheme.size());
        }
        if (span.begin < span.end) {
            found.push_back(span);
        }
        at = span.end;
    }
    return found;
}

std::string WithoutCredentials(std::string_view text) {
    std::string shown;
    std::size_t at = 0;
    for (const TextSpan& span : CredentialsIn(text)) {
        shown.append(text.substr(at, span.begin - at));
        const bool inFrontOfHost = text.substr(span.end).starts_with('@');
        shown.append(inFrontOfHost ? "" : "...");
        at = span.end + (inFrontOfHost ? 1 : 0);
    }
    return shown.append(text.substr(at));
}

}  // namespace receiver
