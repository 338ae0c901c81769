#include "settings/schedule_group.h"

#include <string>

#include "errors/err_propagator.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "Group_Schedule";

bool isSegment(std::int32_t segment) { return segment >= 1 && segment <= 7; }

std::size_t slotOf(std::int32_t segment) {
    if (!isSegment(segment))
        raise(errc::subscript_out_of_range, "Meal segment " + std::to_string(segment) + " is outside 1-7");
    return static_cast<std::size_t>(segment - 1);
}

}  // namespace

std::int16_t Group_Schedule::readFromMeter() {
    return guarded(kClass, "readFromMeter", [&]() -> std::int16_t {
        std::int16_t selection = 0;
        if (std::int16_t code = outcome(transport().GetScheduleSelection(rec_, selection))) return code;
        ScheduleType = selection;
        return readScheduleFromMeter();
    });
}

std::int16_t Group_Schedule::readScheduleFromMeter() {
    return guarded(kClass, "readScheduleFromMeter", [&]() -> std::int16_t {
        Transport& t = transport();
        for (std::size_t s = 0; s < quarters_.size(); ++s) {
            MEAL_SEGMENTS_TYPE segments{};
            if (std::int16_t code = outcome(t.GetMealSegments(rec_, segments))) return code;
            quarters_[s] = segments.mealSegments[s];
        }
        changed_.fill(false);
        return 0;
    });
}

std::int16_t Group_Schedule::saveToMeter() {
    return guarded(kClass, "saveToMeter", [&]() -> std::int16_t {
        if (std::int16_t code = saveScheduleTypeToMeter()) return code;
        if (ScheduleType == 0) return 0;
        MEAL_SEGMENTS_TYPE segments{};
        for (std::size_t s = 0; s < quarters_.size(); ++s)
            if (changed_[s]) segments.mealSegments[s] = quarters_[s];
        return outcome(transport().SetMealSegments(rec_, segments));
    });
}

std::int16_t Group_Schedule::saveScheduleTypeToMeter() {
    return guarded(kClass, "saveScheduleTypeToMeter",
                   [&] { return outcome(transport().SetScheduleSelection(rec_, toInt16(ScheduleType))); });
}

DateTime Group_Schedule::ScheduleTime(std::int32_t segment) const {
    if (!isSegment(segment)) return *DateTime::fromParts(1800, 1, 1);
    const int minutes = quarters_[static_cast<std::size_t>(segment - 1)] * 15;
    return DateTime::fromSeconds(std::int64_t{minutes / 60} * 3600 + (minutes % 60) * 60);
}

void Group_Schedule::setScheduleTime(std::int32_t segment, const DateTime& time) {
    guarded(kClass, "ScheduleTime", [&] {
        const std::size_t slot = slotOf(segment);
        quarters_[slot] = toInt16(time.hour() * 4 + time.minute() / 15);
        changed_[slot] = true;
    });
}

bool Group_Schedule::ScheduleTimeChanged(std::int32_t segment) const {
    return isSegment(segment) && changed_[static_cast<std::size_t>(segment - 1)];
}

}  // namespace varnel::detail
