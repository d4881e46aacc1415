#include "buffer/IdrPicture.h"

#include <cstddef>

#include "AnnexBReader.h"

namespace clipfileModule {

namespace {

// nal_unit_type (ITU-T H.264 table 7-1): slices, whole and in partitions, are 1 to 5, the last that of an IDR
// picture.
constexpr unsigned int kTypeMask = 0x1F;
constexpr unsigned int kFirstSliceType = 1;
constexpr unsigned int kIdrSliceType = 5;

}  // namespace

bool IsIdrPicture(const StreamData& unit) {
    if (unit.payload == nullptr) {
        return false;
    }
    nal_access::AnnexBReader reader({unit.payload, static_cast<std::size_t>(unit.size)});
    nal_access::Bytes nal;
    do {
        const nal_access::Bytes rest = reader.Rest();
        const unsigned int type = rest.empty() ? 0 : rest.front() & kTypeMask;
        if (type >= kFirstSliceType && type <= kIdrSliceType) {
            return type == kIdrSliceType;
        }
    } while (reader.Next(nal));
    return false;
}

}  // namespace clipfileModule
