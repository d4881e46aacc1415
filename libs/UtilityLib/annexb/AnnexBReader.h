#pragma once

#include <cstddef>
#include <span>

namespace nal_access {

using Bytes = std::span<const unsigned char>;

/// Walks the NAL units of a byte stream (ISO/IEC 14496-10 Annex B), with start codes of 3 or 4 bytes. One
/// walk is linear in the size of the stream.
class AnnexBReader {
 public:
    /// `stream` must outlive the reader and what it returns. Bytes before the first start code are skipped.
    explicit AnnexBReader(Bytes stream);

    /// The next NAL unit, with its header byte, without start code and without the zero bytes that trail it.
    /// Never empty. False at the end of the stream.
    bool Next(Bytes& nal);

    /// All that stands behind the last start code found: it begins with the header byte of the next NAL unit,
    /// whose end nobody has looked for. Empty at the end of the stream.
    Bytes Rest() const { return position_ < stream_.size() ? stream_.subspan(position_) : Bytes(); }

 private:
    std::size_t FindStartCode(std::size_t from) const;

    static constexpr std::size_t kStartCodeSize = 3;

    Bytes stream_;
    /// Behind the last start code found; beyond the stream when there is none left.
    std::size_t position_;
};

}  // namespace nal_access
