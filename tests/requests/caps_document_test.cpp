#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Caps : WrapperTest {
    XMLWrapper caps = newDoc(doc_kind::device_caps);
    bool checked = false;

    std::int32_t describe(bool all, const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        return wrapper->getDeviceCaps(rec, doc, caps, all, status, checked);
    }
    std::int32_t describe(bool all = true) {
        return describe(all, "1", sim::meter().serial, std::to_string(sim::meter().type));
    }
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

// The items come from the settings tables (the settings request's test); the records list is the caps' own.
TEST_F(Caps, FullDescriptionListsEveryItemAndRecordKind) {
    const std::pair<int, std::string> cases[] = {
        {4, "Clock GlucUnit GlucRange GlucErrRange GlucCalib | Gluc | "},
        {7,
         "Clock CC Beep GlucUnit DateFormat TimeFormat Language EvtAvgDurn WeekBegin CholesUnit PumpUse Insulins Pills "
         "Schedule Targets GlucRange GlucErrRange | Gluc OralMed Ins MBolus MTDD Food Alcohol MicroAlbumin HbA1c "
         "Ketones HtWt BP Choles | "},
    };
    for (const auto& [type, full] : cases) {
        SCOPED_TRACE(type);
        discover(type);
        caps = XMLWrapper();  // rebuilt whatever the client passed
        expectExit(describe(), ME_SUCCESS, kReportOk, false);
        EXPECT_EQ(described(), full);
        EXPECT_TRUE(checked);
        // One step per entry (the stepping itself: the settings request's test).
        EXPECT_EQ(progress.size(), std::size_t(std::count(full.begin(), full.end(), ' ') - 2));
    }
}

TEST_F(Caps, LimitsModesAndWords) {
    sim::MeterProfile tarn = sim::defaultProfile(1);
    tarn.options[eNumericSeparator].availability = 0;  // the meter lacks it though its type lists it
    tarn.languages = {0, 19, 23};
    tarn.glucoseLow = 25;
    discover(tarn);
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(described().find("Decimal"), std::string::npos);
    EXPECT_EQ(at("Settings/Clock") + at("Settings/Clock/Min") + at("Settings/Clock/Max"),
              "Mode=1 D=1 MM=01 Y=1990 D=31 MM=12 Y=2014 ");
    EXPECT_EQ(childTexts(parsed(caps)->document_element().first_element_by_path("Settings/Language/ValidLang")),
              (Names{"Txt=English 0", "Txt=British 19", "23"}));
    EXPECT_EQ(at("Settings/GlucRange") + at("Settings/GlucErrRange") + at("Records/Gluc"),
              "High=600 Low=25 Mode=0 High=1023 Low=-1 Mode=0 Min=0 Max=1023 ");

    discover(eMorvex);
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(at("Settings/EvtAvgDurn") + at("Settings/Schedule"), "Mode=1 Min=0 Max=4 Custom=true Mode=1 ");
    EXPECT_EQ(at("Settings/Insulins/Custom") + at("Records/HbA1c"), "Max=11 Mode=1 StrLen=8 Min=4.0 Max=15.0 ");
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
    const std::string sn = sim::meter().serial, xml = "-17/-33/Invalid XML ;";
    const std::string failed = "-17/-33/Operation failed; Invalid XML";
    struct Case {
        std::string type, listing;  // no listing: describe everything
        const char* fault;          // transport function failing once with the result
        std::int32_t result;
        std::string group;
    };
    for (const Case& c : {
             // A listing the request cannot use leaves the document as the client wrote it.
             Case{"7", "<DeviceSettings><Settings><Clock/></Settings><Records/></DeviceSettings>", "", ME_FAIL, xml},
             Case{"7", "<DeviceCaps><Records><Settings/></Records><Settings><Clock/></Settings></DeviceCaps>", "",
                  ME_FAIL, xml + "Settings node missing in Device capabilities"},
             Case{"7", "<DeviceCaps><Settings><Clock/></Settings></DeviceCaps>", "", ME_FAIL,
                  xml + "Records node missing in Device capabilities"},
             Case{"7", "<DeviceCaps><Settings><Decimal/></Settings><Records><Strip/></Records></DeviceCaps>", "",
                  ME_FAIL, failed + ";Decimal is not supported;Strip is not supported;"},
             Case{"7", "", "GetScheduleSelection", ME_COM_ERROR,
                  "-17/-3/Operation failed;;Communication errorSchedule setting failed"},
             Case{"7.0", "", "", ME_SUCCESS, kReportOk},
         }) {
        SCOPED_TRACE(c.group);
        if (*c.fault) sim::injectFault(c.fault, 1, static_cast<std::int16_t>(c.result), false);
        fresh();
        ASSERT_TRUE(c.listing.empty() || caps.LoadXML(c.listing));
        const std::string before = caps.XML();
        expectExit(describe(c.listing.empty(), "1", sn, c.type), c.result, c.group, c.result != ME_SUCCESS);
        EXPECT_TRUE(c.listing.empty() || caps.XML() == before);
    }

    // A listing in an empty document: the unexpected-error handler.
    fresh();
    caps = XMLWrapper();
    EXPECT_NE(unexpectedTrace([&] { describe(false); }).find(" getDeviceCaps --> "), std::string::npos);
    expectUnexpected("Unknown status;Error number = ");
}

}  // namespace
