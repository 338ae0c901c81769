// Finding a meter, the device information that describes it, and the checks
// every later request makes on that information.
#include <gtest/gtest.h>

#include <cctype>

#include "requests/discovery.h"
#include "support/client_session.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Discovery : WrapperTest {
    std::int32_t discoverOn(const std::string& ports, const std::string& kind = "COM") {
        XMLWrapper conn = connectionDoc(ports, kind);
        device = newDoc(doc_kind::device_info);
        fresh();
        return wrapper->discoverDevice(rec, device, conn, status);
    }
    void meterWith(int type, std::int16_t port, const std::string& firmware = "") {
        sim::MeterProfile p = sim::defaultProfile(type);
        p.port = port;
        if (!firmware.empty()) p.firmware = firmware;
        sim::loadProfile(p);
    }
};

TEST_F(Discovery, FoundMeterIsDescribedAndItsRecordFilled) {
    meterWith(eCVPellis, 3, "SW1234567 05/07/03");
    EXPECT_EQ(discoverOn("3"), ME_SUCCESS);
    const auto described = parsed(device);
    const pugi::xml_node found = described->document_element().child("DeviceInfo");
    EXPECT_EQ(childTexts(found), (Names{"PLS2004417", "D=07 MM=05 Y=2003 SW1234567", "Corvia(R) Pellis(R)", "2",
                                        "Txt=Glucose Meter 0", "Txt=On 1"}));
    EXPECT_EQ(childTexts(described->document_element().child("PortInfo")), (Names{"3", "Txt=Serial 0"}));
    EXPECT_EQ(rec.M_Type, eCVPellis);
    EXPECT_STREQ(detail::meterDisplayName(9), "Old Meter");

    // Some meters are switched off while they talk; a four-digit year gives no date attributes.
    for (int type : {6, 8}) {
        meterWith(type, 1, "V1 12/31/2003");
        ASSERT_EQ(discoverOn("1"), ME_SUCCESS);
        const auto doc = parsed(device);
        const pugi::xml_node info = doc->document_element().child("DeviceInfo"), state = info.child("CommState");
        EXPECT_EQ(std::string(state.child_value()) + state.attribute("Txt").value(), "0Off");
        EXPECT_FALSE(info.child("MasterSWVer").attribute("D")) << type;
    }
}

TEST(Firmware, VersionAndTwoDigitYears) {
    for (auto [text, parts] : {std::pair{"V1 1/2/99", "V1 2 01 1999"},
                               {"2.3 12/31/00", "2.3 31 12 2000"},
                               {"V1 12/31/89", "V1 31 12 2089"},
                               {"V1 12/31/2003", "V1 31 12 "},
                               {"V1 1/2/3", "V1 2 01 2003"},
                               {"V1 1/2/5.5", "V1 2 01 "}}) {
        const detail::FirmwareText f = detail::splitFirmware(text);
        EXPECT_EQ(f.version + " " + f.day + " " + f.month + " " + f.year, parts);
    }
    EXPECT_THROW(detail::splitFirmware("V1.0"), ComponentError);  // no date
}

TEST_F(Discovery, PortsToSearchAndMissingPorts) {
    meterWith(eDunmark, 4);
    const std::string none = "-17/-13/No device found ; No meter detected on port ";
    struct Case {
        const char *ports, *kind;
        std::int32_t result;
        std::string group;
    };
    for (const Case& c : {Case{"3,4,5", "COM", ME_NO_DEVICE, none + "3"},
                          Case{"256", "COM", ME_INVALID_XMLWRAPPOBJ, "-17/-33/256 is not a valid port"},
                          Case{"4", "usb", ME_UNSUPPORTED_PORTS, "-11/-25/usb is Unsupported"},
                          Case{"abc", "COM", ME_NO_DEVICE, none + "abc"}, Case{"4,3", "com", ME_SUCCESS, ""}}) {
        SCOPED_TRACE(c.ports);
        rec.M_Type = 5;
        EXPECT_EQ(discoverOn(c.ports, c.kind), c.result);
        EXPECT_EQ(statusGroups(status), c.group.empty() ? std::vector<std::string>{} : std::vector{c.group});
        EXPECT_EQ(completions, 0);
        // A failed search empties the caller's record and stops long loops.
        if (c.result == ME_NO_DEVICE) {
            EXPECT_EQ(rec.M_Type, 0);
            EXPECT_FALSE(detail::GetContinueFlag());
        }
    }
    EXPECT_TRUE(detail::GetContinueFlag());  // set again by the meter found last

    // A document without ports fails through the handler for unexpected errors.
    XMLWrapper conn = newDoc(doc_kind::connection_info);
    fresh();
    EXPECT_EQ(unexpectedTrace([&] { wrapper->discoverDevice(rec, device, conn, status); }), "9 discoverDevice --> ");
    ASSERT_EQ(statusGroups(status).size(), 1u);
    EXPECT_TRUE(statusGroups(status)[0].starts_with("-17/-16/"));
    EXPECT_EQ(completions, 1);
}

// A meter whose firmware or serial number cannot be read is not described; the next discovery works.
TEST_F(Discovery, AFailedIdentityReadIsAReportedFailure) {
    for (auto [type, function] : {std::pair{eMorvex, "GetMeterDatalog"}, {eDunmark, "vb_Upload_Meter_Datalog"}}) {
        SCOPED_TRACE(function);
        meterWith(type, 2);
        sim::setIdentitySerial("00");  // only an upload tells the serial number
        sim::injectFault(function, 1, ME_TIME_OUT, false);
        EXPECT_EQ(discoverOn("2"), ME_TIME_OUT);
        EXPECT_EQ(report(), "-17/-2/Timeout error ; Serial number read failed");
        EXPECT_EQ(childNames(parsed(device)->document_element().child("DeviceInfo")), "");
        EXPECT_EQ(completions, 0);
        // A failed search before does not keep the next one from uploading.
        EXPECT_EQ(discoverOn("5"), ME_NO_DEVICE);
        EXPECT_EQ(discoverOn("2"), ME_SUCCESS);
        EXPECT_EQ(parsed(device)->document_element().child("DeviceInfo").child_value("SN"), sim::meter().serial);
    }
}

// The checks the five requests that act on a found meter make on the device
// information a client passes: the same refusals, with the same texts, before
// anything is read or written.
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
