#pragma once

#include <string>

namespace receiver {

/// Why nothing can be reached at that address of a source, whoever answers there, as a sentence without its
/// beginning and without secrets: "99999 is no port: ports go from 1 to 65535". Empty when nothing speaks
/// against it. Names that cannot be resolved and schemes that nobody knows are found when it is opened.
std::string AddressMistake(const std::string& url);

}  // namespace receiver
