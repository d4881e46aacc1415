#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace receiver {

/// A stretch of a text.
struct TextSpan {
    std::size_t begin = 0;
    std::size_t end = 0;

    friend bool operator==(const TextSpan&, const TextSpan&) = default;
};

/// Where user names, passwords and keys stand in an address, or in a message that holds addresses: in front
/// of a host's '@', and as the values of parameters that are called so. In ascending order. Works on text of
/// any length; in doubt something harmless is taken for a secret.
std::vector<TextSpan> CredentialsIn(std::string_view text);

/// The text as it may be shown: hosts without users, and "..." for each of the values.
std::string WithoutCredentials(std::string_view text);

}  // namespace receiver
