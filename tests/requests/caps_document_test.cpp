#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <sstream>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Caps : WrapperTest {
    XMLWrapper caps = newDoc(doc_kind::device_caps);
    bool checked = false;

    std::int32_t describe(bool all = true) { return wrapper->getDeviceCaps(rec, device, caps, all, status, checked); }
    // A listing as a client writes it: the names under Settings, then those under Records.
    void list(const std::string& settings, const std::string& records) {
        ASSERT_TRUE(caps.LoadXML("<DeviceCaps><Settings>" + settings + "</Settings><Records>" + records +
                                 "</Records></DeviceCaps>"));
    }
    // The names under Settings, then under Records.
    std::string described() const {
        const auto doc = parsed(caps);
        return childNames(doc->document_element().child("Settings")) + "| " +
               childNames(doc->document_element().child("Records")) + "| ";
    }
    std::string at(const char* path) const {
        return nodeText(parsed(caps)->document_element().first_element_by_path(path));
    }
};

// The two requests and their two modes agree on every type: what the settings request reads
// in full, its listing reads again; listed to the capabilities, those items are described or
// named as unsupported, the full description among the former. Ranges are the meter's own.
TEST_F(Caps, TheRequestsAndTheirModesAgreeOnEveryType) {
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE(type);
        discover(type);
        const sim::MeterProfile m = sim::meter();
        const auto full = readSettings();
        const pugi::xml_node items = full->document_element().child("Settings");
        const std::string names = childNames(items);
        std::string listing;
        for (pugi::xml_node n : items.children()) listing += "<" + std::string(n.name()) + "/>";
        // One even step per item, capped at 100.
        const int count = static_cast<int>(std::distance(items.begin(), items.end()));
        std::vector<int> steps;
        for (int i = 1; i <= count; ++i) steps.push_back(std::min(i * int(std::nearbyint(100.0 / count)), 100));
        EXPECT_EQ(progress, steps);
        EXPECT_EQ(full->document_element().child("DeviceInfo").child_value("TypeID"), std::to_string(type));
        EXPECT_EQ(nodeText(items.child("GlucRange")) + "|" + nodeText(items.child("GlucErrRange")),
                  "High=" + std::to_string(m.glucoseHigh) + " Low=" + std::to_string(m.glucoseLow) + " Mode=0 |High=" +
                      std::to_string(m.glucoseErrorHigh) + " Low=" + std::to_string(m.glucoseErrorLow) + " Mode=0 ");

        XMLWrapper listed = settingsDoc(m.serial, std::to_string(type), listing);
        bool check = false;
        fresh();
        ASSERT_EQ(wrapper->getDeviceSettings(rec, device, listed, false, status, check), ME_SUCCESS);
        EXPECT_EQ(report(), kReportOk);
        EXPECT_EQ(childNames(parsed(listed)->document_element().child("Settings")), names);

        caps = XMLWrapper();
        fresh();
        ASSERT_EQ(describe(), ME_SUCCESS);
        std::istringstream all(described().substr(0, described().find("| ")));
        list(listing, "");
        fresh();
        describe(false);
        // Each listed name once: described in order, or named as unsupported.
        std::string kept = " ";
        std::istringstream in(names);
        for (std::string n; in >> n;)
            if (report().find(";" + n + " is not supported;") == std::string::npos) kept += n + " ";
        EXPECT_EQ(" " + described(), kept + "| | ");
        for (std::string n; all >> n;) EXPECT_NE(kept.find(" " + n + " "), std::string::npos) << n;
    }
}

// What the description takes from the meter itself rather than from its type.
TEST_F(Caps, TheMetersOwnOptionsLanguagesAndLimits) {
    sim::MeterProfile tarn = sim::defaultProfile(1);
    tarn.options[eNumericSeparator].availability = 0;  // the meter lacks it though its type lists it
    tarn.languages = {0, 19, 23};
    tarn.glucoseLow = 25;
    discover(tarn);
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(described().find("Decimal"), std::string::npos);
    EXPECT_EQ(childTexts(parsed(caps)->document_element().first_element_by_path("Settings/Language/ValidLang")),
              (Names{"Txt=English 0", "Txt=British 19", "23"}));
    EXPECT_EQ(at("Settings/GlucRange") + at("Records/Gluc"), "High=600 Low=25 Mode=0 Min=0 Max=1023 ");
}

TEST_F(Caps, ListingDescribesWhatTheTypeHasAndNamesTheRest) {
    discover(eCVTarnConsumerMeter);
    list("<Clock/><Frobnicate/><DevInit/>", "<Gluc/><HbA1c/>");
    expectExit(describe(false), ME_PARTIALSUCCESS,
               "-31/-31/Partial success;Frobnicate is not supported;DevInit is not supported;HbA1c is not supported;",
               false);
    EXPECT_EQ(described(), "Clock | Gluc | ");
    EXPECT_EQ(progress, (std::vector<int>{50, 100}));

    // Type 7 describes its calibration when asked, takes either averaging name, and keeps visits silently.
    discover(eMorvex);
    list("<GlucCalib/><EvtAvg/><Pills/>", "<Visit/><Gluc/>");
    EXPECT_EQ(describe(false), ME_SUCCESS);
    EXPECT_EQ(described(), "EvtAvgDurn Pills GlucCalib | Gluc | ");
    EXPECT_EQ(progress, (std::vector<int>{20, 40, 60, 80}));
}

TEST_F(Caps, EveryExit) {
    discover(eMorvex);
    const std::string xml = "-17/-33/Invalid XML ;";
    // A listing the request cannot use leaves the document as the client wrote it.
    for (auto [listing, expected] : {
             std::pair{"<DeviceSettings><Settings><Clock/></Settings><Records/></DeviceSettings>", xml},
             {"<DeviceCaps><Records><Settings/></Records><Settings><Clock/></Settings></DeviceCaps>",
              xml + "Settings node missing in Device capabilities"},
             {"<DeviceCaps><Settings><Clock/></Settings></DeviceCaps>",
              xml + "Records node missing in Device capabilities"},
             {"<DeviceCaps><Settings><Decimal/></Settings><Records><Strip/></Records></DeviceCaps>",
              "-17/-33/Operation failed; Invalid XML;Decimal is not supported;Strip is not supported;"},
         }) {
        SCOPED_TRACE(expected);
        fresh();
        ASSERT_TRUE(caps.LoadXML(listing));
        const std::string before = caps.XML();
        expectExit(describe(false), ME_FAIL, expected, true);
        EXPECT_EQ(caps.XML(), before);
    }

    // A listing in an empty document: the unexpected-error handler.
    fresh();
    caps = XMLWrapper();
    EXPECT_NE(unexpectedTrace([&] { describe(false); }).find(" getDeviceCaps --> "), std::string::npos);
    expectUnexpected("Unknown status;Error number = ");
}

}  // namespace
