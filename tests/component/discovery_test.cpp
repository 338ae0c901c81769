#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "documents/discovery.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Discovery : WrapperTest {
    std::int32_t discoverOn(const std::string& ports, const std::string& kind = "COM") {
        XMLWrapper conn = connectionDoc(ports, kind);
        device = newDoc(doc_kind::device_info);
        return wrapper->discoverDevice(rec, device, conn, status);
    }
    void meterWith(int type, std::int16_t port, const std::string& firmware = "") {
        sim::MeterProfile p = sim::defaultProfile(type);
        p.port = port;
        if (!firmware.empty()) p.firmware = firmware;
        sim::loadProfile(p);
    }
    pugi::xml_node info(const pugi::xml_document& doc) { return doc.document_element().child("DeviceInfo"); }
};

TEST_F(Discovery, FoundMeterIsDescribedAndItsRecordFilled) {
    meterWith(eCVPellis, 3, "SW1234567 05/07/03");
    EXPECT_EQ(discoverOn("3"), ME_SUCCESS);
    EXPECT_EQ(device.XML(), R"(<Device>
  <DeviceInfo>
    <SN>PLS2004417</SN>
    <MasterSWVer D="07" MM="05" Y="2003">SW1234567</MasterSWVer>
    <Name>Corvia(R) Pellis(R)</Name>
    <TypeID>2</TypeID>
    <Class Txt="Glucose Meter">0</Class>
    <CommState Txt="On">1</CommState>
  </DeviceInfo>
  <PortInfo>
    <PortID>3</PortID>
    <PortType Txt="Serial">0</PortType>
  </PortInfo>
</Device>
)");
    EXPECT_EQ(rec.M_Type, eCVPellis);
    EXPECT_EQ(rec.port.com_number, 3);
    EXPECT_TRUE(statusGroups(status).empty());
    EXPECT_EQ(completions, 0);
    EXPECT_TRUE(detail::GetContinueFlag());
}

TEST_F(Discovery, NamesAndCommStateByType) {
    const char* names[] = {"", "Corvia(R) Tarn", "Corvia(R) Pellis(R)",
                           "Corvia(R) Dunmark(R), Corvia(R) Harvel(R), Corvia(R) Dunmark(R) Plus",
                           "Corvia(R) Quilla(R), Ostrel(TM), Bremo(R), Vimmet(R)",
                           "Corvia(R) TOLVO(TM), Corvia(R) TOLVO(TM) Plus", "Corvia(R) Zenta(TM)",
                           "Corvia(R) Morvex(TM)", "Parvix(R)"};
    for (int type = 1; type <= 8; ++type) {
        meterWith(type, 1);
        ASSERT_EQ(discoverOn("1"), ME_SUCCESS) << type;
        auto doc = parsed(device);
        EXPECT_STREQ(info(*doc).child_value("Name"), names[type]);
        const bool off = type == 4 || type == 6 || type == 8;
        EXPECT_STREQ(info(*doc).child_value("CommState"), off ? "0" : "1") << type;
        EXPECT_STREQ(info(*doc).child("CommState").attribute("Txt").value(), off ? "Off" : "On");
    }
    EXPECT_STREQ(detail::meterDisplayName(0), "Old Meter");
    EXPECT_STREQ(detail::meterDisplayName(9), "Old Meter");
}

TEST_F(Discovery, OnlyTheFirstPortOfAListIsSearched) {
    meterWith(eDunmark, 4);
    EXPECT_EQ(discoverOn("3,4,5"), ME_NO_DEVICE);
    EXPECT_EQ(statusGroups(status),
              (std::vector<StatusGroup>{{"-17", "-13", "No device found ; No meter detected on port 3", "none"}}));
    EXPECT_EQ(discoverOn("4,3"), ME_SUCCESS);

    status = newDoc(doc_kind::status);
    EXPECT_EQ(discoverOn("7"), ME_NO_DEVICE);
    EXPECT_EQ(statusGroups(status)[0].desc, "No device found ; No meter detected on port 7");
    // The caller's record is emptied and long loops are told to stop.
    EXPECT_EQ(rec.M_Type, 0);
    EXPECT_EQ(rec.port.com_number, 0);
    EXPECT_FALSE(detail::GetContinueFlag());
    EXPECT_EQ(completions, 0);
}

TEST_F(Discovery, PortsOutsideTheRangeAreInvalidAndTextIsPortZero) {
    for (const char* ports : {"256", "-1"}) {
        status = newDoc(doc_kind::status);
        EXPECT_EQ(discoverOn(ports), ME_INVALID_XMLWRAPPOBJ);
        EXPECT_EQ(statusGroups(status),
                  (std::vector<StatusGroup>{{"-17", "-33", std::string(ports) + " is not a valid port", "none"}}));
    }
    EXPECT_EQ(sim::callCount("find_meter"), 0);
    for (const char* ports : {"", "abc"}) {
        status = newDoc(doc_kind::status);
        EXPECT_EQ(discoverOn(ports), ME_NO_DEVICE);
        EXPECT_EQ(statusGroups(status)[0].desc, std::string("No device found ; No meter detected on port ") + ports);
    }
    EXPECT_EQ(completions, 0);
}

TEST_F(Discovery, OnlySerialPortsAreSupported) {
    EXPECT_EQ(discoverOn("1", "usb"), ME_UNSUPPORTED_PORTS);
    EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-11", "-25", "usb is Unsupported", "none"}}));
    EXPECT_EQ(discoverOn("1", "com"), ME_SUCCESS);
    EXPECT_EQ(completions, 0);
}

TEST_F(Discovery, FirmwareVersionAndDate) {
    struct Case {
        const char* firmware;
        const char* version;
        const char* d;
        const char* mm;
        const char* y;
    };
    for (Case c : {Case{"SW1234567 05/07/03", "SW1234567", "07", "05", "2003"},
                   Case{"2.3 11/05/03", "2.3", "05", "11", "2003"},
                   Case{"V1 1/2/99", "V1", "2", "01", "1999"},
                   Case{"V1 12/31/00", "V1", "31", "12", "2000"},
                   Case{"V1 12/31/89", "V1", "31", "12", "2089"},
                   Case{"V1 12/31/2003", "V1", "", "", ""},
                   Case{"V1 12/31/", "V1", "", "", ""}}) {
        meterWith(eDunmark, 1, c.firmware);
        ASSERT_EQ(discoverOn("1"), ME_SUCCESS) << c.firmware;
        auto doc = parsed(device);
        pugi::xml_node ver = info(*doc).child("MasterSWVer");
        EXPECT_STREQ(ver.child_value(), c.version) << c.firmware;
        EXPECT_STREQ(ver.attribute("D").value(), c.d) << c.firmware;
        EXPECT_STREQ(ver.attribute("MM").value(), c.mm) << c.firmware;
        EXPECT_STREQ(ver.attribute("Y").value(), c.y) << c.firmware;
    }
}

TEST_F(Discovery, MalformedInputFailsThroughTheErrorHandler) {
    meterWith(eDunmark, 1, "V1.0");
    for (bool emptyPorts : {false, true}) {
        XMLWrapper conn = emptyPorts ? newDoc(doc_kind::connection_info) : connectionDoc("1");
        status = newDoc(doc_kind::status);
        completions = 0;
        try {
            wrapper->discoverDevice(rec, device, conn, status);
            FAIL() << "no error";
        } catch (const ComponentError& e) {
            EXPECT_EQ(e.description(), "discoverDevice --> ");
        }
        const auto groups = statusGroups(status);
        ASSERT_EQ(groups.size(), 1u);
        EXPECT_EQ(groups[0].minor, "-16");
        EXPECT_EQ(groups[0].trace, "0");
        EXPECT_EQ(completions, 1);
    }
}

}  // namespace
