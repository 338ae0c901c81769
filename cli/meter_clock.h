// The meter clock beside the computer clock: reading it, comparing, and the warning when they disagree.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "session.h"

namespace varnel::cli {

// A calendar time without a time zone, as both clocks show it.
struct LocalTime {
    int year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0;

    // Seconds since 1970-01-01 00:00:00 of the same calendar, for differences.
    std::int64_t seconds() const;
    // "YYYY-MM-DD hh:mm:ss"
    std::string text() const;
    std::string dateText() const { return text().substr(0, 10); }
};

// Reads "YYYY-MM-DD hh:mm:ss" or "YYYY-MM-DDThh:mm:ss" exactly, a real date and time;
// nothing otherwise, with what is wrong in `why` (a wrong form, a date or time that does not exist).
std::optional<LocalTime> parseLocalTime(const std::string& text, std::string* why = nullptr);

// The computer's local time. VARNEL_NOW ("YYYY-MM-DD hh:mm:ss"), when set, stands in for
// it, so that a run can be checked against a known "now".
LocalTime computerNow();
// What is wrong with VARNEL_NOW; "" when it is unset or a real time.
std::string badStandInClock();

// The meter clock and the range of times it can hold, as the meter reports them.
struct MeterClock {
    LocalTime now, first, last;
};

// The Clock item of a settings document.
MeterClock meterClockIn(XMLWrapper& cfg);
// Reads the meter's Clock item (one settings request).
MeterClock readMeterClock(MeterSession& s);

// "none, the clocks agree" or "meter is [N days ]hh:mm:ss behind|ahead".
std::string differenceText(std::int64_t meterAhead);

// What is wrong with the meter clock compared with `computer`: it cannot hold that date,
// or it is more than 5 minutes off (with the command that fixes it); "" when nothing is.
std::string clockWarning(const MeterClock& meter, const LocalTime& computer);

// Prints clockWarning as a line on standard error. A clock that cannot be read is said
// and ends nothing: the warning only advises.
void warnAboutMeterClock(MeterSession& s);

}  // namespace varnel::cli
