#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace receiver {

/// Types of NAL units (ITU-T H.264 table 7-1).
inline constexpr unsigned int kNalSlice = 1;
inline constexpr unsigned int kNalIdr = 5;
inline constexpr unsigned int kNalMessages = 6;
inline constexpr unsigned int kNalSequenceParameterSet = 7;
inline constexpr unsigned int kNalPictureParameterSet = 8;
inline constexpr unsigned int kNalAccessUnitDelimiter = 9;

struct NalUnit {
    unsigned int type = 0;
    /// Where its start code begins, zero bytes before it included, and where the next one's does.
    std::size_t begin = 0;
    std::size_t end = 0;
    /// From its header byte on, without zero bytes behind it.
    std::span<const unsigned char> bytes;
};

/// The NAL units of a byte stream (ITU-T H.264 annex B), which is not copied.
std::vector<NalUnit> NalUnits(std::span<const unsigned char> stream);

/// Those up to the first slice, to which all that follows it is counted. Parameter sets and messages stand in
/// front of it (7.4.1.2.3), so nobody needs to walk through the picture for them.
std::vector<NalUnit> LeadingNalUnits(std::span<const unsigned char> stream);

/// Knows the parameter sets of a stream, each by its number, the last that came.
class ParameterSets {
 public:
    /// Enters those of an access unit or of out-of-band data, both as byte stream.
    void Learn(const std::vector<NalUnit>& units);
    /// What an access unit has to become so that an IDR frame brings both kinds of parameter sets: behind the
    /// access unit delimiter, which must come first, and before everything else. Nothing when it may stay as
    /// it is, since it is no IDR frame or has both, or when none are known.
    std::optional<std::string> Complete(std::span<const unsigned char> stream,
                                        const std::vector<NalUnit>& units) const;

 private:
    std::map<std::uint32_t, std::string> sequence_;
    std::map<std::uint32_t, std::string> picture_;
};

/// True when one of the units is of that type.
bool Contains(const std::vector<NalUnit>& units, unsigned int type);

}  // namespace receiver
