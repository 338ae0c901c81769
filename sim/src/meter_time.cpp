// Transport seconds: whole seconds since 1 January 1970 00:00:00 of the
// meter's local time (no zones, no daylight saving), as a signed 32-bit count.
#include <cstdint>
#include <limits>

#include "simulator.h"

namespace varnel::sim {
namespace {

// Days since 1 January 1970 of a proleptic Gregorian date (era arithmetic).
std::int64_t daysFromCivil(std::int64_t y, unsigned m, unsigned d) {
    y -= m <= 2;
    const std::int64_t era = (y >= 0 ? y : y - 399) / 400;
    const unsigned yoe = static_cast<unsigned>(y - era * 400);
    const unsigned doy = (153 * (m + (m > 2 ? -3 : 9)) + 2) / 5 + d - 1;
    const unsigned doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
    return era * 146097 + static_cast<std::int64_t>(doe) - 719468;
}

bool isLeap(int y) { return (y % 4 == 0 && y % 100 != 0) || y % 400 == 0; }

int daysInMonth(int y, int m) {
    static constexpr int days[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
    return m == 2 && isLeap(y) ? 29 : days[m - 1];
}

}  // namespace

std::int32_t toSeconds(const TIME_REC& t) {
    if (t.year < 1970 || t.mon < 1 || t.mon > 12 || t.mday < 1 || t.mday > daysInMonth(t.year, t.mon) || t.hour < 0 ||
        t.hour > 23 || t.min < 0 || t.min > 59 || t.sec < 0 || t.sec > 59)
        return -1;
    const std::int64_t s =
        daysFromCivil(t.year, unsigned(t.mon), unsigned(t.mday)) * 86400 + t.hour * 3600 + t.min * 60 + t.sec;
    return s > std::numeric_limits<std::int32_t>::max() ? -1 : static_cast<std::int32_t>(s);
}

bool fromSeconds(std::int32_t seconds, TIME_REC& t) {
    if (seconds < 0) return false;
    const std::int64_t days = seconds / 86400;
    const std::int32_t rest = seconds % 86400;
    // Inverse of daysFromCivil.
    const std::int64_t z = days + 719468;
    const std::int64_t era = z / 146097;
    const unsigned doe = static_cast<unsigned>(z - era * 146097);
    const unsigned yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
    const unsigned doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
    const unsigned mp = (5 * doy + 2) / 153;
    const unsigned d = doy - (153 * mp + 2) / 5 + 1;
    const unsigned m = mp < 10 ? mp + 3 : mp - 9;
    const std::int64_t y = static_cast<std::int64_t>(yoe) + era * 400 + (m <= 2);

    t.sec = static_cast<std::int16_t>(rest % 60);
    t.min = static_cast<std::int16_t>(rest / 60 % 60);
    t.hour = static_cast<std::int16_t>(rest / 3600);
    t.mday = static_cast<std::int16_t>(d);
    t.mon = static_cast<std::int16_t>(m);
    t.year = static_cast<std::int16_t>(y);
    t.wday = static_cast<std::int16_t>((days + 4) % 7);  // 1 January 1970 was a Thursday
    t.yday = static_cast<std::int16_t>(days - daysFromCivil(y, 1, 1));
    t.isdst = 0;
    return true;
}

std::int32_t secondsOf(int year, int month, int day, int hour, int minute, int second) {
    TIME_REC t{};
    t.year = static_cast<std::int16_t>(year);
    t.mon = static_cast<std::int16_t>(month);
    t.mday = static_cast<std::int16_t>(day);
    t.hour = static_cast<std::int16_t>(hour);
    t.min = static_cast<std::int16_t>(minute);
    t.sec = static_cast<std::int16_t>(second);
    return toSeconds(t);
}

}  // namespace varnel::sim
