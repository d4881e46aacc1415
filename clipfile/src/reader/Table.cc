#include "reader/Table.h"

#include <algorithm>
#include <stdexcept>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

constexpr std::size_t kWindowSize = 32 * 1024;

}  // namespace

Table MakeTable(const Box& box, std::uint64_t skipped, std::uint64_t rowCount, std::uint32_t rowSize) {
    const std::uint64_t room = box.PayloadSize() < skipped ? 0 : box.PayloadSize() - skipped;
    if (rowCount > room / rowSize) {
        throw FormatError(box.offset, "'" + FourCcText(box.type) + "' at " + std::to_string(box.offset) +
                                          " counts " + std::to_string(rowCount) + " rows and has room for " +
                                          std::to_string(room / rowSize) + ".");
    }
    return {box.Payload() + skipped, rowCount, rowSize};
}

const unsigned char* TableReader::Row(std::uint64_t number) {
    if (number >= table_.rowCount) {
        throw std::out_of_range("row of a table");
    }
    const std::uint64_t inWindow = table_.rowSize == 0 ? 0 : window_.size() / table_.rowSize;
    if (number < first_ || number - first_ >= inWindow) {
        const std::uint64_t rows =
            std::min<std::uint64_t>(kWindowSize / table_.rowSize, table_.rowCount - number);
        window_ = file_.Read(table_.offset + number * table_.rowSize,
                             static_cast<std::size_t>(rows * table_.rowSize));
        first_ = number;
    }
    return &window_[static_cast<std::size_t>((number - first_) * table_.rowSize)];
}

}  // namespace clipfile
