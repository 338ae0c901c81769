// Group 4: the meter's meal schedule, seven segment start times in quarter hours.
#pragma once

#include <array>
#include <cstdint>

#include "settings/setup_group.h"
#include "util/date_time.h"

namespace varnel::detail {

class Group_Schedule : public ISetupGroup {
public:
    // The meter's schedule selection; 0 means no segment times are written.
    std::int32_t ScheduleType = 0;

    std::int16_t readFromMeter() override;
    std::int16_t readScheduleFromMeter();
    // Writes the selection, then (unless it is 0) the changed segments, 0 for the others.
    std::int16_t saveToMeter() override;
    std::int16_t saveScheduleTypeToMeter();
    const char* className() const override { return "Group_Schedule"; }

    std::int32_t Count() const { return kSegments; }
    // Start of segment 1-7 as a time of day; 1800-01-01 00:00:00 for any other segment.
    DateTime ScheduleTime(std::int32_t segment) const;
    // Keeps hour and quarter hour (later minutes and seconds are dropped) and marks the segment changed.
    void setScheduleTime(std::int32_t segment, const DateTime& time);
    bool ScheduleTimeChanged(std::int32_t segment) const;

private:
    static constexpr std::int32_t kSegments = 7;

    std::array<std::int16_t, kSegments> quarters_{};
    std::array<bool, kSegments> changed_{};
};

}  // namespace varnel::detail
