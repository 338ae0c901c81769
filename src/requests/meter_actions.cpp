#include "requests/meter_actions.h"

#include "requests/request_frame.h"

namespace varnel::detail {

// Both answer to the trace name their common handler always had.
std::int32_t clearMeter(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& status) {
    Request req(owner, "doAction", udtMeterRec, &status);
    return req.run([&]() -> std::int32_t {
        if (!req.readPort(deviceInfo) || !req.readIdentity(deviceInfo)) return req.complete(ME_BAD_PARAMETER);
        req.session.initMeter(udtMeterRec);
        if (std::int32_t c = req.checkMeter()) return c;
        if (std::int32_t r = req.compareIdentity()) return req.complete(r);

        std::shared_ptr<MeterModel> meter = req.session.Meter();
        // Every erase is one stage of 0-100, whatever an earlier request left.
        owner.resetPercentage();
        owner.PercentLimit(100);
        std::int32_t result = ME_SUCCESS;
        {
            ProgressTimer timer;
            if (!meter) {
                req.fail(ME_FAIL);
                result = ME_FAIL;
            } else if (!req.session.clearMeter()) {
                // A failed erase is never a success, even when the transport left no code behind.
                const std::int32_t e = req.session.LastError();
                result = e != 0 ? e : ME_FAIL;
                req.fail(result);
            }
        }
        owner.resetPercentage();
        meter.reset();
        if (result != ME_SUCCESS) req.close();
        return req.complete(result);
    });
}

std::int32_t closeMeter(RequestContext& owner, METER_REC& udtMeterRec) {
    Request req(owner, "doAction", udtMeterRec, nullptr);
    return req.run([&]() -> std::int32_t {
        if (req.session.MeterClose(udtMeterRec)) return ME_SUCCESS;
        return req.session.LastError();
    });
}

}  // namespace varnel::detail
