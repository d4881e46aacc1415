#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "reader/Box.h"

namespace clipfile {

/// A field of a box by its name in the standard.
struct Field {
    std::string name;
    std::variant<std::uint64_t, std::int64_t, double, std::string> value;
};

/// The fields of a box, without those of its children.
struct BoxFields {
    std::vector<Field> fields;
    /// The first rows of its table.
    std::vector<std::vector<Field>> rows;
    /// Rows that the box has, by its count and by its room.
    std::uint64_t rowCount = 0;
    /// Fields are missing at the end of the box.
    bool isCut = false;
};

/// The fields of `box`, which stands in a box of type `parent` (0 at the top), and at most `maxRows` rows of
/// its table. Nothing for a box whose layout is not known.
BoxFields ReadBoxFields(const InputFile& file, const Box& box, std::uint32_t parent, std::size_t maxRows);

/// The value for people: numbers in decimal, the rest as it is.
std::string FieldText(const Field& field);

/// How the fields of a box lie, in the notation that BoxFields.cc tells. For tests that go through all.
struct BoxLayout {
    std::string_view type;
    /// The box around it, where that decides; empty for any.
    std::string_view parent;
    std::string_view fields;
};
const std::vector<BoxLayout>& BoxLayouts();

}  // namespace clipfile
