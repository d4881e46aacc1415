#include "reader/Box.h"

#include <algorithm>
#include <array>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

constexpr std::uint64_t kSmallHeader = 8;
constexpr std::uint64_t kLargeHeader = 16;

bool IsPlainContainer(std::uint32_t type) {
    static constexpr std::uint32_t kTypes[] = {
        FourCc("moov"), FourCc("trak"), FourCc("edts"), FourCc("mdia"), FourCc("minf"), FourCc("dinf"),
        FourCc("stbl"), FourCc("mvex"), FourCc("moof"), FourCc("traf"), FourCc("mfra"), FourCc("udta"),
        FourCc("tref"), FourCc("sinf"), FourCc("schi"), FourCc("gmhd"), FourCc("ilst")};
    return std::find(std::begin(kTypes), std::end(kTypes), type) != std::end(kTypes);
}

/// Bytes of fields in a sample entry of `stsd`, or nothing when they are not known.
std::optional<std::uint64_t> EntryFields(std::uint32_t type) {
    switch (type) {
        case FourCc("avc1"):
        case FourCc("avc3"):
        case FourCc("hvc1"):
        case FourCc("hev1"):
        case FourCc("mp4v"):
            return 78;  // VisualSampleEntry, 12.1.3.2
        case FourCc("mp4a"):
            return 28;  // AudioSampleEntry, 12.2.3.2
        default:
            return std::nullopt;
    }
}

/// `meta` is a full box here and a plain one in QuickTime files, whose first child comes at once.
std::uint64_t MetaFields(const InputFile& file, const Box& box) {
    if (box.PayloadSize() < 8) {
        return box.PayloadSize();
    }
    std::array<unsigned char, 8> head = {};
    file.Read(box.Payload(), head);
    return ReadU32(&head[4]) == FourCc("hdlr") ? 0 : 4;
}

/// Bytes of fields in a `uuid` box of the recorder's own, or nothing for others.
std::optional<std::uint64_t> ExtendedTypeFields(const InputFile& file, const Box& box) {
    static constexpr std::array<unsigned char, 12> kFamily = {0x21, 0xD2, 0x4F, 0xCE, 0xBB, 0x88,
                                                              0x69, 0x5C, 0xFA, 0xC9, 0xC7, 0x40};
    std::array<unsigned char, 16> type = {};
    if (box.PayloadSize() < type.size()) {
        return std::nullopt;
    }
    file.Read(box.Payload(), type);
    if (!std::equal(kFamily.begin(), kFamily.end(), &type[4])) {
        return std::nullopt;
    }
    switch (ReadU32(type.data())) {
        case FourCc("PROF"):
            return 24;  // usertype, version, flags, entry_count
        case FourCc("USMT"):
            return 16;  // usertype
        default:
            return std::nullopt;
    }
}

bool Walk(const InputFile& file, BoxCursor cursor, std::uint32_t parent, int depth,
          const std::function<bool(const TreeItem&)>& visit) {
    while (const auto box = cursor.Next()) {
        if (!visit({*box, depth, {}})) {
            return false;
        }
        const auto fields = depth + 1 < kMaxDepth ? ChildrenOffset(file, *box, parent) : std::nullopt;
        if (fields && !Walk(file, Children(file, *box, *fields), box->type, depth + 1, visit)) {
            return false;
        }
    }
    if (cursor.Fault().empty()) {
        return true;
    }
    Box rest;
    rest.offset = cursor.Position();
    return visit({rest, depth, cursor.Fault()});
}

}  // namespace

std::optional<Box> BoxCursor::Next() {
    if (position_ >= end_ || !fault_.empty()) {
        return std::nullopt;
    }
    const std::uint64_t room = end_ - position_;
    const auto fail = [&](const std::string& what) {
        fault_ = what + " at " + std::to_string(position_) + ".";
        return std::nullopt;
    };
    if (room < kSmallHeader) {
        return fail("Too few bytes for a box");
    }
    std::array<unsigned char, kLargeHeader> head = {};
    file_.Read(position_, std::span(head).first(std::min(room, kLargeHeader)));
    Box box;
    box.offset = position_;
    box.size = ReadU32(head.data());
    box.type = ReadU32(&head[4]);
    box.headerSize = kSmallHeader;
    if (box.size == 1) {
        if (room < kLargeHeader) {
            return fail("Too few bytes for a box of 64-bit size");
        }
        box.headerSize = kLargeHeader;
        box.size = ReadU64(&head[8]);
    } else if (box.size == 0) {
        box.size = room;
    }
    if (box.size < box.headerSize) {
        return fail("No box: its size would be " + std::to_string(box.size) + " bytes,");
    }
    box.end = box.size > room ? end_ : position_ + box.size;
    position_ = box.end;
    return box;
}

std::optional<Box> FindBox(const InputFile& file, std::uint64_t begin, std::uint64_t end,
                           std::uint32_t type) {
    BoxCursor cursor(file, begin, end);
    while (const auto box = cursor.Next()) {
        if (box->type == type) {
            return box;
        }
    }
    return std::nullopt;
}

std::optional<Box> FindChild(const InputFile& file, const Box& parent, std::uint32_t type) {
    return FindBox(file, parent.Payload(), parent.end, type);
}

Box RequireChild(const InputFile& file, const Box& parent, std::uint32_t type) {
    const auto box = FindChild(file, parent, type);
    if (!box) {
        throw FormatError(parent.offset, "'" + FourCcText(parent.type) + "' at " +
                                             std::to_string(parent.offset) + " lacks '" + FourCcText(type) +
                                             "'.");
    }
    return *box;
}

BoxCursor Children(const InputFile& file, const Box& parent, std::uint64_t skipped) {
    return {file, parent.Payload() + std::min(skipped, parent.PayloadSize()), parent.end};
}

std::optional<std::uint64_t> ChildrenOffset(const InputFile& file, const Box& box, std::uint32_t parent) {
    if (parent == FourCc("stsd")) {
        return EntryFields(box.type);
    }
    if (IsPlainContainer(box.type)) {
        // Track references hold identifiers, not boxes.
        return parent == FourCc("tref") ? std::nullopt : std::optional<std::uint64_t>(0);
    }
    switch (box.type) {
        case FourCc("stsd"):
        case FourCc("dref"):
            return 8;  // version, flags, entry_count
        case FourCc("uuid"):
            return ExtendedTypeFields(file, box);
        case FourCc("meta"):
            return MetaFields(file, box);
        default:
            return std::nullopt;
    }
}

void WalkTree(const InputFile& file, const std::function<bool(const TreeItem&)>& visit) {
    Walk(file, BoxCursor(file, 0, file.Size()), 0, 0, visit);
}

}  // namespace clipfile
