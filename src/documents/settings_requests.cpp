// Until the settings documents are built, the three settings requests answer
// that they are not supported, in the status document as well.
#include "documents/settings_requests.h"

#include "component/request_frame.h"

namespace varnel::detail {

namespace {

std::int32_t notAvailable(DllWrapper::Impl& owner, const char* traceName, METER_REC& udtMeterRec,
                          XMLWrapper& status) {
    Request req(owner, traceName, udtMeterRec, &status);
    return req.run([&] {
        req.fail(ME_NOT_SUPPORTED, " ; This request is not available yet");
        return req.complete(ME_NOT_SUPPORTED);
    });
}

}  // namespace

std::int32_t getDeviceCaps(DllWrapper::Impl& owner, METER_REC& udtMeterRec, XMLWrapper&, XMLWrapper&, bool,
                           XMLWrapper& status, bool&) {
    return notAvailable(owner, "getDeviceCaps", udtMeterRec, status);
}

}  // namespace varnel::detail
