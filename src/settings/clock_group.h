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

    DateTime ClockTime();
    void setClockTime(const DateTime& clock);

    // Date-time to transport seconds.
    std::int32_t getSecondsFor(const DateTime& clock);
    // Transport seconds to date-time; the year goes through the two-digit window
    // (00-29 as 2000-2029, 30-99 as 1930-1999).
    DateTime getTimeForSec(std::int32_t seconds);
};

}  // namespace varnel::detail
