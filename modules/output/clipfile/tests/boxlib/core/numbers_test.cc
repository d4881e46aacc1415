#include <random>

#include "boxlib/support/fixture.h"

namespace {

// The compiler's own 128-bit integers, which ISO C++ does not have.
__extension__ using Wide = unsigned __int128;

void expectRescaled(uint64_t value, uint64_t divisor, uint64_t multiplier) {
    uint64_t result = 0;
    const MbxStatus status = MbxRescale(value, divisor, multiplier, &result);
    if (divisor == 0) {
        ASSERT_EQ(status, MBX_ERR_INVALID_ARG);
        return;
    }
    const Wide quotient = static_cast<Wide>(value) * multiplier / divisor;
    if (quotient > UINT64_MAX) {
        ASSERT_EQ(status, MBX_ERR_OVERFLOW) << value << " * " << multiplier << " / " << divisor;
    } else {
        ASSERT_EQ(status, MBX_OK) << value << " * " << multiplier << " / " << divisor;
        ASSERT_EQ(result, static_cast<uint64_t>(quotient))
            << value << " * " << multiplier << " / " << divisor;
    }
}

TEST(RescaleTest, TruncatesTheQuotient) {
    uint64_t result = 0;
    EXPECT_EQ(MbxRescale(1001, 30000, 48000, &result), MBX_OK);
    EXPECT_EQ(result, 1601U);  // 1601.6
    EXPECT_EQ(MbxRescale(2, 3, 1, &result), MBX_OK);
    EXPECT_EQ(result, 0U);
}

TEST(RescaleTest, RefusesADivisorOfZeroAndANullResult) {
    uint64_t result = 5;
    EXPECT_EQ(MbxRescale(1, 0, 1, &result), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxRescale(1, 1, 1, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(result, 5U);
}

TEST(RescaleTest, ResultOfAllOnesFitsAndOneAboveOverflows) {
    uint64_t result = 0;
    EXPECT_EQ(MbxRescale(UINT64_MAX, 7, 7, &result), MBX_OK);
    EXPECT_EQ(result, UINT64_MAX);
    result = 5;
    EXPECT_EQ(MbxRescale(1ULL << 63, 7, 14, &result), MBX_ERR_OVERFLOW);  // 2^64
    EXPECT_EQ(result, 5U);
    EXPECT_EQ(MbxRescale(UINT64_MAX, 1, UINT64_MAX, &result), MBX_ERR_OVERFLOW);
}

TEST(RescaleTest, AgreesWithWideArithmeticAtAllBoundaries) {
    std::vector<uint64_t> values = {0, 1, 2, 3, 10, 90000, 48000, 24000, 1001};
    for (int bit = 8; bit < 64; bit += 4) {
        for (const int delta : {-1, 0, 1}) values.push_back((1ULL << bit) + static_cast<uint64_t>(delta));
    }
    for (int bit = 61; bit < 64; bit++) values.push_back((1ULL << bit) - 1);
    values.push_back(UINT64_MAX);
    values.push_back(UINT64_MAX - 1);
    for (const uint64_t value : values) {
        for (const uint64_t divisor : values) {
            for (const uint64_t multiplier : values) {
                expectRescaled(value, divisor, multiplier);
                if (HasFatalFailure()) return;
            }
        }
    }
}

TEST(RescaleTest, AgreesWithWideArithmeticForAMillionRandomInputs) {
    std::mt19937_64 random(20261120);
    const auto ofAnyWidth = [&random] { return random() >> (random() % 64); };
    for (int i = 0; i < 1000000; i++) {
        expectRescaled(ofAnyWidth(), ofAnyWidth(), ofAnyWidth());
        if (HasFatalFailure()) return;
    }
}

class TimeTest : public BoxTest {
 protected:
    MbxStatus seconds(MbxDate date, uint64_t* result) { return MbxToMp4Time(context, &date, result); }
};

TEST_F(TimeTest, EpochIsZero) {
    uint64_t result = 5;
    EXPECT_EQ(seconds({1904, 1, 1, 0, 0, 0}, &result), MBX_OK);
    EXPECT_EQ(result, 0U);
}

TEST_F(TimeTest, KnownDates) {
    const struct {
        MbxDate date;
        uint64_t seconds;
    } kCases[] = {
        {{1970, 1, 1, 0, 0, 0}, 2082844800},          // the epoch of Unix
        {{2000, 2, 29, 12, 30, 15}, 3034672215ULL},   // 951827415 s after it
        {{2026, 11, 20, 23, 59, 60}, 3878064000ULL},  // the leap second is the next day's first
        {{2040, 2, 6, 6, 28, 15}, UINT32_MAX},
        {{2040, 2, 6, 6, 28, 16}, 1ULL << 32},
        {{65535, 12, 31, 23, 59, 59}, 2008031990399ULL},  // the last second of day 23241111
    };
    for (const auto& c : kCases) {
        uint64_t result = 0;
        EXPECT_EQ(seconds(c.date, &result), MBX_OK) << c.date.year;
        EXPECT_EQ(result, c.seconds) << c.date.year;
    }
}

TEST_F(TimeTest, RefusesFieldsOutOfRange) {
    const MbxDate kBad[] = {
        {1903, 12, 31, 0, 0, 0}, {0, 1, 1, 0, 0, 0},     {2026, 0, 1, 0, 0, 0},  {2026, 13, 1, 0, 0, 0},
        {2026, 1, 0, 0, 0, 0},   {2026, 1, 32, 0, 0, 0}, {2026, 1, 1, 24, 0, 0}, {2026, 1, 1, 0, 60, 0},
        {2026, 1, 1, 0, 0, 61},  {2026, 4, 31, 0, 0, 0}, {1905, 2, 29, 0, 0, 0}, {1900, 2, 29, 0, 0, 0},
        {2100, 2, 29, 0, 0, 0},  {2024, 2, 30, 0, 0, 0},
    };
    uint64_t result = 5;
    for (const MbxDate& date : kBad) EXPECT_EQ(seconds(date, &result), MBX_ERR_INVALID_ARG) << date.year;
    EXPECT_EQ(result, 5U);
}

TEST_F(TimeTest, TwentyNinthOfFebruary1905IsRefused) {
    uint64_t result = 0;
    EXPECT_EQ(seconds({1905, 2, 29, 0, 0, 0}, &result), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(seconds({1904, 2, 29, 0, 0, 0}, &result), MBX_OK);
    EXPECT_EQ(result, 59 * 86400U);
}

TEST_F(TimeTest, RefusesNullArguments) {
    const MbxDate date = {2026, 1, 1, 0, 0, 0};
    uint64_t result = 0;
    EXPECT_EQ(MbxToMp4Time(nullptr, &date, &result), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxToMp4Time(context, nullptr, &result), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxToMp4Time(context, &date, nullptr), MBX_ERR_INVALID_ARG);
}

// A calendar that only knows what the next day is.
struct Day {
    uint16_t year = 1904;
    uint16_t month = 1;
    uint16_t day = 1;

    int length() const {
        if (month == 4 || month == 6 || month == 9 || month == 11) return 30;
        if (month != 2) return 31;
        if (year % 400 == 0) return 29;
        if (year % 100 == 0) return 28;
        return year % 4 == 0 ? 29 : 28;
    }

    void next() {
        day++;
        if (day <= length()) return;
        day = 1;
        month++;
        if (month <= 12) return;
        month = 1;
        year++;
    }
};

TEST_F(TimeTest, AgreesWithDaysCountedOneByOneForThreeMillionDays) {
    std::mt19937 random(1904);
    Day day;
    for (uint64_t count = 0; count < 3000000; count++, day.next()) {
        const auto hour = static_cast<uint16_t>(random() % 24);
        const auto minute = static_cast<uint16_t>(random() % 60);
        const auto second = static_cast<uint16_t>(random() % 61);
        uint64_t result = 0;
        ASSERT_EQ(seconds({day.year, day.month, day.day, hour, minute, second}, &result), MBX_OK);
        ASSERT_EQ(result, count * 86400 + hour * 3600U + minute * 60U + second)
            << day.year << '-' << day.month << '-' << day.day;
    }
    EXPECT_GT(day.year, 10000);
}

TEST_F(TimeTest, DayBeyondEachMonthsLengthIsRefused) {
    for (uint16_t year = 1904; year < 2404; year++) {
        for (uint16_t month = 1; month <= 12; month++) {
            const Day first = {year, month, 1};
            for (uint16_t day = 28; day <= 32; day++) {
                uint64_t result = 0;
                ASSERT_EQ(seconds({year, month, day, 0, 0, 0}, &result),
                          day <= first.length() ? MBX_OK : MBX_ERR_INVALID_ARG)
                    << year << '-' << month << '-' << day;
            }
        }
    }
}

}  // namespace
