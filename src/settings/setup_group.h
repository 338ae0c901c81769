// The interface every settings group implements, and what all groups share:
// a private copy of the session's meter record and the transport to call.
#pragma once

#include <cstdint>
#include <memory>

#include "contracts/meter_link.h"
#include "contracts/transport.h"
#include "varnel/records.h"

namespace varnel::detail {

// Group numbers under which MeterSettings keeps each group.
enum enmSettingGroups : std::int32_t {
    eGroupClock = 0,
    eGroupGeneral = 1,
    eGroupInsulins = 2,
    eGroupOralMeds = 3,
    eGroupSchedule = 4,
    eGroupTargets = 5,
};

// A meter's settings group. Its own initialise/readFromMeter/saveToMeter give
// 0 or the transport's error code; the ISetupGroup_ members report failure as true.
class ISetupGroup {
public:
    virtual ~ISetupGroup() = default;

    // Takes a copy of the session's meter record (not refreshed afterwards) and
    // starts the group's values afresh; always false.
    bool initialise(const MeterLink& link);
    // 0, or the record copy's Error_code when the transport failed.
    virtual std::int16_t readFromMeter() = 0;
    virtual std::int16_t saveToMeter() = 0;

    // The interface's view of the same operations: false means success.
    bool ISetupGroup_initialise(const MeterLink& link);
    bool ISetupGroup_readFromMeter();
    bool ISetupGroup_saveToMeter();

    // Class text recorded in the error trace.
    virtual const char* className() const = 0;

    // The group's record copy, as the transport last left it.
    const METER_REC& meterRec() const { return rec_; }

protected:
    // What a group clears when it is initialised, beyond taking the record.
    virtual void clearValues() {}
    // The transport taken by initialise; a missing-object error before that.
    Transport& transport();
    // 0 for a transport success, otherwise the record copy's Error_code (the
    // returned code itself when the transport left Error_code at 0).
    std::int16_t outcome(std::int16_t returned) const;

    METER_REC rec_{};

private:
    std::shared_ptr<Transport> transport_;
};

}  // namespace varnel::detail
