#include "ElfImage.h"

#include <elf.h>

#include <algorithm>
#include <cstring>
#include <fstream>
#include <stdexcept>

ElfImage::ElfImage(const std::string& path) {
    std::ifstream file(path, std::ios::binary | std::ios::ate);
    bytes_.resize(file ? static_cast<std::size_t>(file.tellg()) : 0);
    file.seekg(0);
    file.read(bytes_.data(), static_cast<std::streamsize>(bytes_.size()));
    const auto header = recordAt<Elf64_Ehdr>(0);
    if (std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0 || header.e_ident[EI_CLASS] != ELFCLASS64 ||
        header.e_type != ET_DYN) {
        throw std::runtime_error(path + " is no 64-bit shared library");
    }
    const auto section = [&](std::uint64_t index) {
        return recordAt<Elf64_Shdr>(header.e_shoff + index * header.e_shentsize);
    };
    for (std::uint64_t index = 0; index < header.e_shnum; ++index) {
        const Elf64_Shdr table = section(index);
        const std::uint64_t end = table.sh_offset + table.sh_size;
        if (table.sh_type == SHT_DYNSYM) {
            const std::uint64_t texts = section(table.sh_link).sh_offset;
            for (std::uint64_t at = table.sh_offset; at < end; at += sizeof(Elf64_Sym)) {
                const auto symbol = recordAt<Elf64_Sym>(at);
                const auto binding = static_cast<unsigned char>(ELF64_ST_BIND(symbol.st_info));
                const auto visibility = ELF64_ST_VISIBILITY(symbol.st_other);
                if (symbol.st_shndx != SHN_UNDEF && binding != STB_LOCAL && visibility != STV_HIDDEN &&
                    visibility != STV_INTERNAL) {
                    const auto type = static_cast<unsigned char>(ELF64_ST_TYPE(symbol.st_info));
                    exports_.push_back({textAt(texts, symbol.st_name), type, binding});
                }
            }
        } else if (table.sh_type == SHT_DYNAMIC) {
            const std::uint64_t texts = section(table.sh_link).sh_offset;
            for (std::uint64_t at = table.sh_offset; at < end; at += sizeof(Elf64_Dyn)) {
                const auto entry = recordAt<Elf64_Dyn>(at);
                if (entry.d_tag == DT_NULL) {
                    break;
                }
                if (entry.d_tag == DT_NEEDED) {
                    needed_.push_back(textAt(texts, entry.d_un.d_val));
                }
            }
        }
    }
}

template <typename Record>
Record ElfImage::recordAt(std::uint64_t offset) const {
    Record record;
    if (offset > bytes_.size() || bytes_.size() - offset < sizeof(record)) {
        throw std::runtime_error("the library ends within a table");
    }
    std::memcpy(&record, bytes_.data() + offset, sizeof(record));
    return record;
}

std::string ElfImage::textAt(std::uint64_t table, std::uint64_t offset) const {
    if (table > bytes_.size() || offset > bytes_.size() - table) {
        throw std::runtime_error("a name lies outside the library");
    }
    const auto begin = bytes_.begin() + static_cast<std::ptrdiff_t>(table + offset);
    return {begin, std::find(begin, bytes_.end(), '\0')};
}
