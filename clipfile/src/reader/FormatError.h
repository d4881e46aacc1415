#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

namespace clipfile {

/// The bytes of a file are not what their place calls for. `what()` is one whole sentence.
class FormatError : public std::runtime_error {
 public:
    FormatError(std::uint64_t offset, const std::string& sentence)
        : std::runtime_error(sentence), offset_(offset) {}
    /// Where in the file.
    std::uint64_t Offset() const { return offset_; }

 private:
    std::uint64_t offset_;
};

}  // namespace clipfile
