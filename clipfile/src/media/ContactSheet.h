#pragma once

#include <cstdint>
#include <vector>

#include "media/ParameterSets.h"
#include "reader/InputFile.h"

namespace clipfile {

/// Small pictures side by side, row by row.
class ContactSheet {
 public:
    /// Pixels of a small picture.
    struct Cell {
        int width = 0;
        int height = 0;
    };

    /// Black, until pictures are added.
    ContactSheet(int columns, int rows, Cell cell);

    /// Decodes a picture, an IDR picture in the form of a sample, and puts it behind those before. False when
    /// it does not decode, and the place stays for the next one, or when the sheet is full.
    bool Add(const ParameterSets& sets, Bytes picture);
    /// The sheet as a PNG file. Throws `std::bad_alloc`.
    std::vector<unsigned char> Png() const;

 private:
    int columns_;
    int rows_;
    Cell cell_;
    int count_ = 0;
    std::vector<std::uint8_t> pixels_;  // three bytes each
};

}  // namespace clipfile
