#include "AnnexBReader.h"

#include <cstring>

namespace nal_access {

AnnexBReader::AnnexBReader(Bytes stream) : stream_(stream), position_(FindStartCode(0) + kStartCodeSize) {}

bool AnnexBReader::Next(Bytes& nal) {
    while (position_ <= stream_.size()) {
        const std::size_t end = FindStartCode(position_);
        Bytes found = stream_.subspan(position_, end - position_);
        position_ = end + kStartCodeSize;
        while (!found.empty() && found.back() == 0) {
            found = found.first(found.size() - 1);
        }
        if (!found.empty()) {
            nal = found;
            return true;
        }
    }
    return false;
}

/// The place of the next 00 00 01, or the end of the stream.
std::size_t AnnexBReader::FindStartCode(std::size_t from) const {
    // A byte of 1 is as rare as any other in coded pictures, and the C library looks for it with vectors.
    for (std::size_t at = from + 2; at < stream_.size();) {
        const void* const found = std::memchr(&stream_[at], 1, stream_.size() - at);
        if (found == nullptr) {
            break;
        }
        const auto last = static_cast<std::size_t>(static_cast<const unsigned char*>(found) - stream_.data());
        if (stream_[last - 1] == 0 && stream_[last - 2] == 0) {
            return last - 2;
        }
        at = last + 1;
    }
    return stream_.size();
}

}  // namespace nal_access
