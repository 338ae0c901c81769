// The checks the five requests that act on a found meter make on the device
// information a client passes: the same refusals, with the same texts, before
// anything is read or written.
#include <gtest/gtest.h>

#include <cctype>

#include "support/client_session.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct DeviceInfo : WrapperTest, ::testing::WithParamInterface<Call> {
    // Runs the request with this device information on the discovered type-7 meter.
    std::int32_t run(const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper info = deviceDoc(port, sn, type);
        XMLWrapper out =
            GetParam() == Call::setSettings ? settingsDoc(sim::meter().serial, "7", "<Beep>0</Beep>") : XMLWrapper();
        fresh();
        return makeCall(*wrapper, GetParam(), rec, info, status, out);
    }
};

TEST_P(DeviceInfo, RefusedBeforeAnyMeterWorkAndAcceptedAsTheMeterSaysIt) {
    discover(eMorvex);
    const sim::MeterProfile meter = sim::meter();
    const std::string sn = meter.serial;
    const std::string bad = "-17/-19/Bad parameter passed to the function ; ";
    const std::string other = "-8/-8/Different device detected ; Device ";
    // Only the settings requests name the port's own major code.
    const std::string port = GetParam() == Call::settings || GetParam() == Call::setSettings ? "-3/-19/" : "-17/-19/";
    const std::string portText = GetParam() == Call::setSettings ? "XML" : "XML file";
    struct Case {
        std::string port, sn, type, report;
    };
    for (const Case& c : {
             Case{"-1", sn, "7",
                  port + "Bad parameter passed to the function ; Port number from " + portText + " is invalid"},
             Case{"1", "", "7", bad + "Device SN from Device Info XML is invalid"},
             Case{"1", sn, "9", bad + "Device Type from Device Info XML is invalid"},
             Case{"1", sn, "0", bad + "Device Type from Device Info XML is invalid"},
             Case{"1", "OTHER1", "7",
                  other + "SN from Device Info XML - OTHER1 Device SN from device - " + sn + " do not match"},
             // A type that is no whole number is compared as it is, not rounded.
             Case{"1", sn, "7.5", other + "Type from Device Info XML - 7.5 Device Type from device - 7 do not match"},
         }) {
        SCOPED_TRACE(c.report);
        EXPECT_NE(run(c.port, c.sn, c.type), ME_SUCCESS);
        EXPECT_EQ(statusGroups(status).front(), c.report);
        EXPECT_EQ(completions, 1);
        sim::MeterProfile after = sim::meter();
        after.clock = meter.clock;  // it runs on while the request waits
        EXPECT_TRUE(after == meter);
    }

    // A client that keeps the meter open on failure finds it open.
    rec.Error_code = -50;
    EXPECT_NE(run("1", "", "7"), ME_SUCCESS);
    EXPECT_FALSE(closed());
    rec.Error_code = 0;

    // Serial numbers match without regard to case, type texts by value; a port that is no number is port 0.
    std::string lower = sn;
    for (char& ch : lower) ch = static_cast<char>(std::tolower(static_cast<unsigned char>(ch)));
    for (auto [portText, serial, type] : {std::tuple{"1", lower, "7.0"}, {"abc", sn, "7"}}) {
        SCOPED_TRACE(portText);
        EXPECT_EQ(run(portText, serial, type), ME_SUCCESS) << report();
        EXPECT_FALSE(closed());
    }
}

std::string callName(const ::testing::TestParamInfo<Call>& info) {
    const char* names[] = {"", "settings", "", "caps", "", "setSettings", "readings", "clear"};
    return names[int(info.param)];
}

INSTANTIATE_TEST_SUITE_P(Requests, DeviceInfo,
                         ::testing::Values(Call::settings, Call::caps, Call::setSettings, Call::readings, Call::clear),
                         callName);

}  // namespace
