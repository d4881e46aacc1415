#include "AnnexBReader.h"

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
    // The third byte tells how far the next candidate can be: mostly three bytes on.
    for (std::size_t last = from + 2; last < stream_.size();) {
        if (stream_[last] > 1) {
            last += 3;
        } else if (stream_[last] == 1 && stream_[last - 1] == 0 && stream_[last - 2] == 0) {
            return last - 2;
        } else {
            ++last;
        }
    }
    return stream_.size();
}

}  // namespace nal_access
