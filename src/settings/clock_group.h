// Group 0: the meter's clock, in the transport's seconds.
#pragma once

#include <cstdint>

#include "settings/setup_group.h"
#include "util/date_time.h"

namespace varnel::detail {

class Group_Clock : public ISetupGroup {
public:
    // The meter's clock as the transport counts it (local meter time).
    std::int32_t ClockInSeconds = 0;

    std::int16_t readFromMeter() override;
    std::int16_t saveToMeter() override;
    const char* className() const override { return "Group_Clock"; }

    // Raises an error when the transport cannot convert the clock; readClockTime reports it instead.
    DateTime ClockTime();
    void setClockTime(const DateTime& clock);
    // The clock as a date-time: 0, or the conversion's failure code (clock then untouched).
    std::int16_t readClockTime(DateTime& clock);

    // Date-time to transport seconds.
    std::int32_t getSecondsFor(const DateTime& clock);
    // Transport seconds to date-time; the year goes through the two-digit window
    // (00-29 as 2000-2029, 30-99 as 1930-1999).
    DateTime getTimeForSec(std::int32_t seconds);
    // The same, giving back the conversion's failure code instead of raising it.
    std::int16_t timeForSec(std::int32_t seconds, DateTime& time);

private:
    std::int16_t convertTime(std::int32_t seconds, DateTime& time);
};

}  // namespace varnel::detail
