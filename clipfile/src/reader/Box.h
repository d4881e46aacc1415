#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "reader/InputFile.h"

namespace clipfile {

/// A box of a file (ISO/IEC 14496-12 4.2). It never reaches beyond what holds it.
struct Box {
    std::uint32_t type = 0;
    std::uint64_t offset = 0;
    /// Bytes of size and type: 8 or 16.
    std::uint64_t headerSize = 0;
    /// Bytes of the whole box as its header tells them; 0 became the rest of the file.
    std::uint64_t size = 0;
    /// Where the box ends: `offset` + `size`, or where what holds it ends when that comes first.
    std::uint64_t end = 0;

    std::uint64_t Payload() const { return offset + headerSize; }
    std::uint64_t PayloadSize() const { return end - Payload(); }
    /// The box is longer than what holds it.
    bool IsTorn() const { return size > end - offset; }
};

/// Goes through the boxes that stand side by side in a part of a file.
class BoxCursor {
 public:
    BoxCursor(const InputFile& file, std::uint64_t begin, std::uint64_t end)
        : file_(file), position_(begin), end_(end) {}

    /// The next box. Nothing at the end, behind a torn box, and where the bytes are no header of a box;
    /// `Fault` then tells.
    std::optional<Box> Next();
    /// Where the next box would begin.
    std::uint64_t Position() const { return position_; }
    /// What stopped the walk before the end, as a sentence, or empty.
    const std::string& Fault() const { return fault_; }

 private:
    const InputFile& file_;
    std::uint64_t position_;
    std::uint64_t end_;
    std::string fault_;
};

/// The box of this type among those in a part of a file.
std::optional<Box> FindBox(const InputFile& file, std::uint64_t begin, std::uint64_t end, std::uint32_t type);
std::optional<Box> FindChild(const InputFile& file, const Box& parent, std::uint32_t type);
/// The same for a child that has to be there. Throws `FormatError` where it is not.
Box RequireChild(const InputFile& file, const Box& parent, std::uint32_t type);

/// The first child that counts, in a box whose payload begins with `skipped` bytes of fields.
BoxCursor Children(const InputFile& file, const Box& parent, std::uint64_t skipped = 0);

/// How deep `WalkTree` goes. The deepest box of our files stands at 8.
inline constexpr int kMaxDepth = 16;

/// Bytes of fields before the children of `box`, or nothing for a box that holds no boxes. `parent` is the
/// type of the box around it, 0 at the top.
std::optional<std::uint64_t> ChildrenOffset(const InputFile& file, const Box& box, std::uint32_t parent);

/// What `WalkTree` meets: a box and how deep it stands, 0 at the top; or, with `fault` not empty, bytes from
/// `box.offset` on that are no boxes.
struct TreeItem {
    Box box;
    int depth = 0;
    std::string fault;
};

/// Visits all boxes in the order of the file, parents first, until `visit` returns false.
void WalkTree(const InputFile& file, const std::function<bool(const TreeItem&)>& visit);

}  // namespace clipfile
