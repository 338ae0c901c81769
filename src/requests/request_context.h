// What a request needs from the DllWrapper it runs in: the meter session, the
// progress stage that maps the session's percentages, and the client's events.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "contracts/transport.h"
#include "session/meter_dll.h"

namespace varnel::detail {

class RequestContext {
public:
    explicit RequestContext(std::shared_ptr<Transport> transport);
    // The session reports progress through this object.
    RequestContext(const RequestContext&) = delete;
    RequestContext& operator=(const RequestContext&) = delete;

    // End of the current progress stage, 0-100.
    std::int16_t PercentLimit() const { return upperLimit_; }
    // Opens the stage that ends at x percent (0 changes nothing); after
    // resetPercentage the first stage starts at 0, later ones where the last ended.
    void PercentLimit(std::int16_t x);
    void resetPercentage();
    // Maps the session's percentage into the current stage and raises onProgress;
    // nothing for 0 or below, nor when the scaling overflows 16 bits.
    void RaiseProgress(std::int16_t percent);
    void raiseComplete();

    MeterDll session;
    std::function<void(std::int16_t&)> onProgress;
    std::function<void()> onComplete;

private:
    std::int16_t upperLimit_ = 100;
    std::int16_t lowerLimit_ = 0;  // -1: the next stage starts at 0
};

}  // namespace varnel::detail
