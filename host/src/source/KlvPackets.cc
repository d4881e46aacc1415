#include "source/KlvPackets.h"

#include <algorithm>
#include <array>

namespace receiver {
namespace {

/// The beginning of each SMPTE universal label (ST 298).
constexpr std::array<unsigned char, 4> kLabel{0x06, 0x0E, 0x2B, 0x34};
constexpr std::size_t kLabelSize = 16;
/// metadata_service_id, sequence_number, flags, AU_cell_data_length
constexpr std::size_t kCellHeader = 5;

bool BeginsWithLabel(std::span<const unsigned char> bytes) {
    return bytes.size() > kLabelSize && std::equal(kLabel.begin(), kLabel.end(), bytes.begin());
}

/// The size of the packet at the beginning of `bytes`, 0 when it is none or runs past them.
std::size_t PacketSize(std::span<const unsigned char> bytes) {
    if (!BeginsWithLabel(bytes)) {
        return 0;
    }
    std::size_t header = kLabelSize + 1;
    std::uint64_t length = bytes[kLabelSize];
    if (length >= 0x80) {
        const std::size_t digits = length - 0x80;
        if (digits == 0 || digits > 8 || header + digits > bytes.size()) {
            return 0;
        }
        length = 0;
        for (std::size_t at = 0; at < digits; ++at) {
            length = length << 8 | bytes[header + at];
        }
        header += digits;
    }
    return length > bytes.size() - header ? 0 : header + static_cast<std::size_t>(length);
}

std::string TextOf(std::span<const unsigned char> bytes) {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

}  // namespace

void KlvPackets::Split(std::span<const unsigned char> bytes, std::vector<std::string>& packets) {
    while (!bytes.empty()) {
        const std::size_t size = PacketSize(bytes);
        if (size == 0) {
            ++damaged_;
            return;
        }
        packets.push_back(TextOf(bytes.first(size)));
        bytes = bytes.subspan(size);
    }
}

std::vector<std::string> KlvPackets::Take(std::span<const unsigned char> payload) {
    std::vector<std::string> packets;
    if (BeginsWithLabel(payload)) {
        Split(payload, packets);
        return packets;
    }
    while (!payload.empty()) {
        if (payload.size() < kCellHeader) {
            ++damaged_;
            break;
        }
        // cell_fragment_indication: 11 whole, 10 first, 00 middle, 01 last
        const unsigned int fragment = payload[2] >> 6U;
        const std::size_t length = static_cast<std::size_t>(payload[3]) << 8 | payload[4];
        if (length > payload.size() - kCellHeader) {
            ++damaged_;
            partial_.clear();
            break;
        }
        const auto data = payload.subspan(kCellHeader, length);
        if ((fragment & 2U) != 0) {
            damaged_ += partial_.empty() ? 0 : 1;
            partial_.clear();
        }
        partial_ += TextOf(data);
        if ((fragment & 1U) != 0) {
            const std::string whole = std::move(partial_);
            partial_.clear();
            Split({reinterpret_cast<const unsigned char*>(whole.data()), whole.size()}, packets);
        }
        payload = payload.subspan(kCellHeader + length);
    }
    return packets;
}

}  // namespace receiver
