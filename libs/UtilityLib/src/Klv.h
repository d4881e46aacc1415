#pragma once

#include <cstdint>
#include <optional>

#include "AnnexBReader.h"

namespace nal_access {

/// One packet of a metadata payload.
struct KlvPacket {
    Bytes label;
    Bytes value;
};

/// Walks the packets of a metadata payload: a byte 01, a 16-byte universal label, a BER length in short or
/// long form, the value (SMPTE ST 336).
class KlvReader {
 public:
    /// `payload` must outlive the reader and what it returns.
    explicit KlvReader(Bytes payload) : rest_(payload) {}

    /// The next packet. False at the end of the payload, and for good at the first byte that is not 01, at a
    /// length in a form that ST 336 does not have, and at a packet that runs past the payload.
    bool Next(KlvPacket& packet);

 private:
    Bytes rest_;
};

/// One item of a local set.
struct KlvItem {
    std::uint16_t tag;
    Bytes value;
};

/// Walks the items of a local set: 2-byte tag, 2-byte length, value.
class LocalSetReader {
 public:
    /// A packet whose label is not that of a local set has no items.
    explicit LocalSetReader(const KlvPacket& packet);

    /// The next item. False at the end of the set and at an item that runs past it.
    bool Next(KlvItem& item);

 private:
    Bytes rest_;
};

/// The identifier of a local set, which is its first item E000 of 16 bytes. Nothing for other packets.
std::optional<Bytes> SetIdentifier(const KlvPacket& packet);

/// True when a packet of the payload is a local set with this identifier.
bool HasSet(Bytes payload, Bytes identifier);

}  // namespace nal_access
