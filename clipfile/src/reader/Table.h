#pragma once

#include <cstdint>
#include <vector>

#include "reader/Box.h"

namespace clipfile {

/// Rows of one size that stand side by side in a file.
struct Table {
    std::uint64_t offset = 0;
    std::uint64_t rowCount = 0;
    std::uint32_t rowSize = 0;
};

/// The table of `rowCount` rows that begins `skipped` bytes into the payload of `box`. Throws `FormatError`
/// when the box has no room for it.
Table MakeTable(const Box& box, std::uint64_t skipped, std::uint64_t rowCount, std::uint32_t rowSize);

/// Reads rows on demand, some kilobytes at a time, so that a table of any length takes the same memory.
class TableReader {
 public:
    TableReader(const InputFile& file, const Table& table) : file_(file), table_(table) {}

    /// Goes over to another table of the file.
    void Reset(const Table& table) {
        table_ = table;
        window_.clear();
    }
    std::uint64_t RowCount() const { return table_.rowCount; }
    /// The bytes of a row, from 0. Valid until the next call.
    const unsigned char* Row(std::uint64_t number);

 private:
    const InputFile& file_;
    Table table_;
    std::uint64_t first_ = 0;
    std::vector<unsigned char> window_;
};

}  // namespace clipfile
