#pragma once

#include <cstdint>
#include <string>
#include <vector>

/// What a shared library tells the loader: its exports and the libraries that it needs. Reads 64-bit files of
/// this machine's byte order.
class ElfImage {
 public:
    struct Symbol {
        std::string name;
        /// STT_FUNC, STT_OBJECT, ...
        unsigned char type = 0;
        /// STB_GLOBAL, STB_WEAK, ...
        unsigned char binding = 0;
    };

    /// Throws std::runtime_error when the file cannot be read as a shared library.
    explicit ElfImage(const std::string& path);

    /// The symbols of the dynamic table that the library defines and that others can see, in table order.
    const std::vector<Symbol>& Exports() const { return exports_; }
    /// The names of the libraries that the loader has to bring, in their order.
    const std::vector<std::string>& Needed() const { return needed_; }

 private:
    template <typename Record>
    Record recordAt(std::uint64_t offset) const;
    std::string textAt(std::uint64_t table, std::uint64_t offset) const;

    std::vector<char> bytes_;
    std::vector<Symbol> exports_;
    std::vector<std::string> needed_;
};
