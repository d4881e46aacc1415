#pragma once

#include <vector>

#include "source/AnnexB.h"
#include "source/Libav.h"

namespace receiver {

/// Makes a byte stream (ITU-T H.264 annex B) of H.264's packets, whatever container they come from. A
/// packet may go through it twice.
class ByteStreamFilter {
 public:
    /// Throws `ReceiverError` (`kInternal`) for parameter sets out of band that make no sense.
    explicit ByteStreamFilter(const AVCodecParameters& parameters);

    /// The packet as byte stream, until the next call; without a byte where it makes no sense.
    AVPacket& Filter(const AVPacket& packet);
    /// What the stream was announced as, and what it is behind the filter.
    const AVCodecParameters& Source() const { return *filter_->par_in; }
    const AVCodecParameters& Stream() const { return *filter_->par_out; }
    /// The parameter sets that came out of band.
    std::vector<NalUnit> OutOfBand() const;

 private:
    libav::Owner<AVBSFContext> filter_;
    libav::Owner<AVPacket> packet_;
};

/// The bytes of a packet, which is not copied.
std::span<const unsigned char> BytesOf(const AVPacket& packet);

}  // namespace receiver
