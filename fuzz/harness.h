// What the fuzz targets share: a virtual clock, so nothing waits for real, and
// a component that has discovered a fresh simulated meter.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "component/wrapper_access.h"
#include "simulator.h"
#include "support/client_session.h"
#include "util/helpers.h"
#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::fuzz {

inline void useVirtualClock() {
    static const bool installed = [] {
        setThreadClock(std::make_shared<ManualClock>(1000));
        return true;
    }();
    (void)installed;
}

inline XMLWrapper newDoc(std::int32_t kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

// A component over the transport that has found the meter of the given type on its port.
struct Discovered {
    DllWrapper wrapper;
    METER_REC rec{};
    XMLWrapper device = newDoc(doc_kind::device_info);
    XMLWrapper status = newDoc(doc_kind::status);
    bool found = false;

    Discovered(std::shared_ptr<detail::Transport> transport, int type)
        : wrapper(detail::wrapperOver(std::move(transport))) {
        useVirtualClock();
        detail::SetContinueFlag(true);
        sim::loadProfile(sim::defaultProfile(type));
        XMLWrapper out;
        found = test::makeCall(wrapper, test::Call::discover, rec, device, status, out, sim::meter().port) == ME_SUCCESS;
        status = newDoc(doc_kind::status);
    }
};

}  // namespace varnel::fuzz
