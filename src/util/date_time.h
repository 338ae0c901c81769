// A date-time with whole-second precision, counted from the serial day 0
// (30 December 1899), the day numbering the documents' date ranges use.
#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string>

namespace varnel::detail {

class DateTime {
public:
    DateTime() = default;  // day 0, midnight

    // From a serial day number; the fraction is the time of day.
    static DateTime fromSerial(double days);
    // From calendar parts; nothing when any part is out of its range (30 February included).
    static std::optional<DateTime> fromParts(int year, int month, int day, int hour = 0, int minute = 0,
                                             int second = 0);
    // From seconds since day 0.
    static DateTime fromSeconds(std::int64_t seconds) { return DateTime(seconds); }

    double serial() const { return static_cast<double>(seconds_) / 86400.0; }
    std::int64_t seconds() const { return seconds_; }
    // Whole serial day number (the date without the time).
    std::int32_t dayNumber() const;

    int year() const;
    int month() const;  // 1-12
    int day() const;    // 1-31
    int hour() const;
    int minute() const;
    int second() const;

    DateTime datePart() const { return DateTime(std::int64_t(dayNumber()) * 86400); }
    DateTime addSeconds(std::int64_t s) const { return DateTime(seconds_ + s); }

    auto operator<=>(const DateTime&) const = default;

private:
    explicit DateTime(std::int64_t seconds) : seconds_(seconds) {}
    std::int64_t seconds_ = 0;
};

// True when year/month/day name a real calendar day.
bool isValidCalendarDate(int year, int month, int day);

}  // namespace varnel::detail
