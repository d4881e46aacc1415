// Reads an ISO base media file back, for tests: written from ISO/IEC 14496-12 alone, it shares nothing with
// the library that writes. It is strict: what does not parse to the last byte of every box that it knows, or
// contradicts itself, throws IsoError with the place.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace iso {

class IsoError : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

// A box (4.2). The children of those that hold boxes only are read too.
struct Box {
    std::string type;
    uint64_t position = 0;    // of the header, in the file
    uint64_t headerSize = 0;  // 8 or 16 bytes
    uint64_t size = 0;        // header included
    std::vector<Box> children;

    // The only child of that type; null for none. Throws when there are more.
    const Box* find(const std::string& childType) const;
    // The same, but it must be there.
    const Box& get(const std::string& childType) const;
    std::vector<const Box*> all(const std::string& childType) const;
    // Types of the children, in order, with spaces between.
    std::string childTypes() const;
};

// One sample as the tables tell it. Times are in ticks of the track.
struct Sample {
    uint64_t offset = 0;  // in the file
    uint32_t size = 0;
    uint64_t decodeTime = 0;
    uint32_t duration = 0;
    int64_t compositionOffset = 0;
    bool isSync = false;
    uint8_t dependency = 0;  // the byte of `sdtp`
    uint32_t descriptionIndex = 0;
    uint32_t fragment = 0;  // sequence number of its `moof`; 0 for `moov`
    uint64_t moofPosition = 0;
    uint32_t trafNumber = 0;  // 1-based, as are the two that follow; 0 in `moov`
    uint32_t trunNumber = 0;
    uint32_t sampleNumber = 0;
};

struct Edit {
    uint64_t segmentDuration = 0;
    int64_t mediaTime = 0;
    int16_t rateInteger = 0;
    int16_t rateFraction = 0;
};

// One row of `tfra`.
struct IndexEntry {
    uint64_t time = 0;
    uint64_t moofPosition = 0;
    uint32_t trafNumber = 0;
    uint32_t trunNumber = 0;
    uint32_t sampleNumber = 0;
};

struct Track {
    uint32_t trackId = 0;
    uint32_t flags = 0;  // of `tkhd`
    uint64_t duration = 0;
    std::string handler;
    uint32_t timescale = 0;
    uint64_t mediaDuration = 0;
    uint16_t language = 0;
    std::vector<std::string> entryTypes;  // of `stsd`
    std::vector<Edit> edits;
    std::vector<Sample> samples;  // of `moov`, then of every fragment
    std::vector<IndexEntry> index;
};

struct Movie {
    uint32_t timescale = 0;
    uint64_t duration = 0;
    uint32_t nextTrackId = 0;
    bool fragmented = false;                   // there is an `mvex`
    std::optional<uint64_t> fragmentDuration;  // `mehd`
    std::vector<Track> tracks;
    std::vector<uint32_t> fragments;  // sequence numbers, in the order of the file
    bool indexed = false;             // there is an `mfra`

    const Track& track(uint32_t trackId) const;
};

// The boxes of a file, in order.
std::vector<Box> ReadBoxes(const std::vector<uint8_t>& file);

// `moov`, every `moof`, and `mfra`.
Movie ReadMovie(const std::vector<uint8_t>& file);

}  // namespace iso
