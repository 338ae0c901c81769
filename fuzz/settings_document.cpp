// A settings document, as a client may send anything, written to a simulated
// meter. Expected failures are reports; an unexpected one may only be a
// ComponentError; anything else (a crash, a sanitizer finding, another
// exception) is a fault.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "harness.h"
#include "support/sim_transport.h"
#include "varnel/component_error.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace varnel;
    XMLWrapper settings;
    if (!settings.LoadXML(std::string(reinterpret_cast<const char*>(data), size))) return 0;
    // The document's own TypeID picks the meter, so documents of every type reach their writers.
    int type = eMorvex;
    try {
        settings.SelectElement("DeviceInfo");
        const int wanted = std::atoi(settings.GetChildValue("TypeID").c_str());
        if (wanted >= 1 && wanted <= 8) type = wanted;
        settings.MoveToRoot();
    } catch (const ComponentError&) {}
    fuzz::Discovered meter(test::simTransport(), type);
    if (!meter.found) __builtin_trap();
    try {
        test::makeCall(meter.wrapper, test::Call::setSettings, meter.rec, meter.device, meter.status, settings);
    } catch (const ComponentError&) {}
    return 0;
}
