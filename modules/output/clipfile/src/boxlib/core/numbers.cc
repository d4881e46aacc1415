#include "boxlib/mbx.h"

namespace {

struct Wide {
    uint64_t high;
    uint64_t low;
};

Wide multiply(uint64_t a, uint64_t b) {
    const uint64_t aLow = a & UINT32_MAX;
    const uint64_t aHigh = a >> 32;
    const uint64_t bLow = b & UINT32_MAX;
    const uint64_t bHigh = b >> 32;
    const uint64_t lowLow = aLow * bLow;
    const uint64_t highLow = aHigh * bLow + (lowLow >> 32);
    const uint64_t lowHigh = aLow * bHigh + (highLow & UINT32_MAX);
    return {aHigh * bHigh + (highLow >> 32) + (lowHigh >> 32), lowHigh << 32 | (lowLow & UINT32_MAX)};
}

bool isLeapYear(uint32_t year) {
    return year % 400 == 0 || (year % 4 == 0 && year % 100 != 0);
}

// Days of the proleptic Gregorian calendar before 1 January of `year`, which is at least 1.
uint64_t daysBeforeYear(uint32_t year) {
    const uint64_t years = year - 1;
    return years * 365 + years / 4 - years / 100 + years / 400;
}

}  // namespace

MbxStatus MbxRescale(uint64_t value, uint64_t divisor, uint64_t multiplier, uint64_t* result) {
    if (divisor == 0 || result == nullptr) return MBX_ERR_INVALID_ARG;
    const Wide dividend = multiply(value, multiplier);
    if (dividend.high == 0) {
        *result = dividend.low / divisor;
        return MBX_OK;
    }
    if (dividend.high >= divisor) return MBX_ERR_OVERFLOW;

    // Shift and subtract. The remainder stays below the divisor, so the quotient fits 64 bits.
    uint64_t remainder = dividend.high;
    uint64_t quotient = 0;
    for (int bit = 63; bit >= 0; bit--) {
        const bool carry = (remainder >> 63) != 0;
        remainder = remainder << 1 | (dividend.low >> bit & 1);
        quotient <<= 1;
        if (carry || remainder >= divisor) {
            remainder -= divisor;
            quotient |= 1;
        }
    }
    *result = quotient;
    return MBX_OK;
}

MbxStatus MbxToMp4Time(MbxContext* context, const MbxDate* date, uint64_t* seconds) {
    static constexpr uint16_t kDaysBeforeMonth[] = {0,   31,  59,  90,  120, 151, 181,
                                                    212, 243, 273, 304, 334, 365};
    if (context == nullptr || date == nullptr || seconds == nullptr) return MBX_ERR_INVALID_ARG;
    if (date->year < 1904 || date->month < 1 || date->month > 12 || date->day < 1 || date->day > 31 ||
        date->hour > 23 || date->minute > 59 || date->second > 60) {
        return MBX_ERR_INVALID_ARG;
    }
    const uint32_t leapDay = isLeapYear(date->year) ? 1 : 0;
    const uint32_t daysInMonth =
        kDaysBeforeMonth[date->month] - kDaysBeforeMonth[date->month - 1] + (date->month == 2 ? leapDay : 0);
    if (date->day > daysInMonth) return MBX_ERR_INVALID_ARG;

    uint64_t days = daysBeforeYear(date->year) - daysBeforeYear(1904);
    days += kDaysBeforeMonth[date->month - 1] + (date->month > 2 ? leapDay : 0);
    days += date->day - 1U;
    *seconds = days * 86400 + uint64_t{date->hour} * 3600 + uint64_t{date->minute} * 60 + date->second;
    return MBX_OK;
}
