#include "util/date_time.h"

#include <chrono>
#include <cmath>

namespace varnel::detail {

namespace {

using namespace std::chrono;

constexpr sys_days kDayZero = sys_days(year{1899} / December / 30);

std::int64_t floorDiv(std::int64_t a, std::int64_t b) {
    std::int64_t q = a / b;
    return (a % b != 0 && ((a < 0) != (b < 0))) ? q - 1 : q;
}

year_month_day civil(std::int32_t dayNumber) { return year_month_day(kDayZero + days(dayNumber)); }

}  // namespace

bool isValidCalendarDate(int y, int m, int d) {
    if (m < 1 || m > 12 || d < 1 || d > 31) return false;
    return year_month_day(std::chrono::year(y), std::chrono::month(static_cast<unsigned>(m)),
                          std::chrono::day(static_cast<unsigned>(d)))
        .ok();
}

DateTime DateTime::fromSerial(double days) { return DateTime(static_cast<std::int64_t>(std::llround(days * 86400.0))); }

std::optional<DateTime> DateTime::fromParts(int y, int mo, int d, int h, int mi, int s) {
    if (!isValidCalendarDate(y, mo, d) || h < 0 || h > 23 || mi < 0 || mi > 59 || s < 0 || s > 59) return std::nullopt;
    sys_days date = year_month_day(std::chrono::year(y), std::chrono::month(static_cast<unsigned>(mo)),
                                   std::chrono::day(static_cast<unsigned>(d)));
    std::int64_t dayNumber = (date - kDayZero).count();
    return DateTime(dayNumber * 86400 + h * 3600 + mi * 60 + s);
}

std::int32_t DateTime::dayNumber() const { return static_cast<std::int32_t>(floorDiv(seconds_, 86400)); }

int DateTime::year() const { return int(civil(dayNumber()).year()); }
int DateTime::month() const { return int(unsigned(civil(dayNumber()).month())); }
int DateTime::day() const { return int(unsigned(civil(dayNumber()).day())); }
int DateTime::hour() const { return int((seconds_ - std::int64_t(dayNumber()) * 86400) / 3600); }
int DateTime::minute() const { return int((seconds_ - std::int64_t(dayNumber()) * 86400) / 60 % 60); }
int DateTime::second() const { return int((seconds_ - std::int64_t(dayNumber()) * 86400) % 60); }

}  // namespace varnel::detail
