// The settings and capabilities documents the two reading requests write.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <optional>
#include <sstream>

#include "errors/error_description.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;
using detail::ErrorDescription;

namespace {

struct DeviceSettings : WrapperTest {
    XMLWrapper cfg = newDoc(doc_kind::device_settings);
    std::shared_ptr<pugi::xml_document> tree;
    bool checkMeter = false;

    // Reads every item the meter offers, or the listed ones, into a fresh document.
    std::int32_t get(const std::optional<Names>& listed = std::nullopt) {
        if (listed && !listed->empty()) {
            cfg.SelectElement("Settings");
            for (const std::string& n : *listed) cfg.AddElement(n);
        }
        const std::int32_t r = wrapper->getDeviceSettings(rec, device, cfg, !listed, status, checkMeter);
        tree = parsed(cfg);
        cfg = newDoc(doc_kind::device_settings);
        return r;
    }
    pugi::xml_node item(const char* path) {
        return tree->document_element().child("Settings").first_element_by_path(path);
    }
    std::string at(const char* path) { return nodeText(item(path)); }
    std::string items() { return childNames(tree->document_element().child("Settings")); }
    Names children(const char* path) { return childTexts(item(path)); }
};

TEST_F(DeviceSettings, Type7ValuesWordsAndLimits) {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    p.clock = sim::secondsOf(2009, 4, 5, 7, 8, 0);
    p.insulinNames[0].fixed = true;
    p.insulinNames[11].bytes = "MYINS";
    p.favoriteInsulins = {2, 0, 12};
    p.favoriteOralMeds = {0, 0, 0, 0, 7};
    p.scheduleSelection = 1;
    p.targets = {70, 140, 90, 180, 60};
    p.initializedFlag = 1;
    discover(p);
    ASSERT_EQ(get(), ME_SUCCESS);

    EXPECT_EQ(children("Clock"), (Names{"D=5 MM=04 Y=2009 h=7 m=8 s=0 ", "D=1 MM=01 Y=2000 ", "D=31 MM=12 Y=2020 "}));
    // Beep and pump use are stored as "off" flags and shown inverted.
    EXPECT_EQ(at("Beep"), "Mode=1 Txt=On Min=0 Max=1 1");
    EXPECT_EQ(at("PumpUse"), "Mode=1 Txt=No Min=0 Max=1 0");
    EXPECT_EQ(at("DevInit"), "Mode=1 Txt=Yes Min=0 Max=1 1");

    // Positions 1-10 are fixed names, the rest named by the user; favourites 0 are left out.
    EXPECT_EQ(at("Insulins/Pre/Insulin"), "InUse=true Txt=" + sim::meter().insulinNames[0].bytes + " 1");
    EXPECT_EQ(children("Insulins/Custom")[1], "InUse=false Txt=MYINS 12");
    EXPECT_EQ(children("Insulins/Favorite"),
              (Names{"Txt=" + sim::meter().insulinNames[1].bytes + " 2", "Txt=MYINS 12"}));
    EXPECT_EQ(at("Pills/Favorite") + item("Pills/Favorite/Pill").child_value(), "Max=5 Mode=1 7");

    EXPECT_EQ(at("Schedule"), "Custom=true Mode=1 ");
    EXPECT_EQ(at("Targets"), "Mode=1 Unit=0 UTxt=mg/dL ");
    EXPECT_EQ(at("Targets/PreMealHigh") + "|" + at("Targets/Hypo"), "Min=60 Max=200 140|Min=50 Max=90 60");
}

TEST_F(DeviceSettings, OptionMappingsAndAttributes) {
    sim::MeterProfile p = sim::defaultProfile(eCVTarnConsumerMeter);
    p.options[eCommunicationRate].value = 3;
    p.options[eTranslateNewLang].availability = 0;
    discover(p);
    ASSERT_EQ(get(), ME_SUCCESS);
    // The baud range ends at the fastest rate, whichever rate is set now.
    EXPECT_EQ(at("Baud"), "Mode=1 Txt=300 Min=0 Max=3 0");
    EXPECT_EQ(at("NewLang"), "Txt=English Min=0 Max=1 0");

    discover(eCVTolvoMeter);  // baud read-only at 9600
    ASSERT_EQ(get(), ME_SUCCESS);
    EXPECT_EQ(at("Baud"), "Mode=0 Txt=9600 Min=3 Max=3 3");

    discover(eDunmark);
    ASSERT_EQ(get(), ME_SUCCESS);
    EXPECT_EQ(item("Language").attribute("Mode").value(), std::string("0"));  // fixed on this type although writable
}

TEST_F(DeviceSettings, ListedItems) {
    const std::string partial = "-31/-31/" + ErrorDescription(-31) + ";";
    struct Case {
        int type;
        Names listed;
        std::string items, report;
        int reads, identityChecks;  // single option and clock reads; identity checks after the reads
    } cases[] = {
        // Only the clock: no identity check.
        {eMorvex, {"Clock"}, "Clock ", kReportOk, 1, 0},
        // EvtAvgDurn and EvtAvg name the same item; the element follows the meter type.
        {eMorvex, {"EvtAvg", "Nothing"}, "EvtAvgDurn ", partial + "Nothing is not supported;", 0, 1},
        {eCVPellis, {"EvtAvgDurn"}, "EvtAvg ", kReportOk, 0, 1},
        {eQuillaandBremo, {"Beep", "GlucUnit"}, "GlucUnit ", partial + "Beep is not supported;", 1, 1},
        // Nothing the meter offers: the document still describes the meter, nothing is read.
        {eCorviaZenta, {"Foo"}, "", "-17/-17/" + ErrorDescription(-17) + ";Foo is not supported;", 0, 1},
        {eCorviaZenta, {"TimeFormat", "GlucUnit"}, "GlucUnit TimeFormat ", kReportOk, 2, 1},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.listed.front());
        discover(c.type);
        EXPECT_EQ(get(c.listed), ME_SUCCESS);
        EXPECT_EQ(items(), c.items);
        EXPECT_EQ(report(), c.report);
        EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("SN"), sim::meter().serial);
        EXPECT_EQ(sim::callCount("vb_Read_Meter_Option") + sim::callCount("vb_Read_Meter_Clock"), c.reads);
        EXPECT_EQ(sim::callCount("vb_Chk4Meter"), c.identityChecks);
    }
    EXPECT_EQ(sim::callCount("vb_Tickle_Meter"), 1);  // the second single read wakes the meter first
}

TEST_F(DeviceSettings, EveryExitReportsOnceAndCompletes) {
    const std::string xml = "-17/-33/" + ErrorDescription(-33);
    XMLWrapper bare;
    bare.AddElement("DeviceSettings");
    // The device information and transport failures: the device information tests and the fault sweep.
    for (auto [doc, listed, expected] : {std::tuple{newDoc(doc_kind::device_caps), Names{"Clock"}, xml + " ;"},
                                         {XMLWrapper(), Names{}, xml},
                                         {bare, Names{}, xml + " ;Settings node missing in Device settings"}}) {
        SCOPED_TRACE(expected);
        discover(eMorvex);
        if (!doc.IsEmpty()) cfg = doc;
        expectExit(get(listed), ME_FAIL, expected, true);
    }

    // Any other run-time error goes to the common handler and reaches the caller.
    discover(eMorvex);
    device = XMLWrapper();
    EXPECT_THROW(get(Names{"Beep"}), ComponentError);
    expectUnexpected(ErrorDescription(-16) + ";Error number = ");
}

// The capabilities document.
struct Caps : DeviceSettings {
    XMLWrapper caps = newDoc(doc_kind::device_caps);

    std::int32_t describe(bool all = true) {
        const std::int32_t r = wrapper->getDeviceCaps(rec, device, caps, all, status, checkMeter);
        tree = parsed(caps);
        return r;
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
};

// The two requests and their two modes agree on every type: what the settings request reads
// in full, its listing reads again; listed to the capabilities, those items are described or
// named as unsupported, the full description among the former. Ranges are the meter's own.
TEST_F(Caps, TheRequestsAndTheirModesAgreeOnEveryType) {
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE(type);
        discover(type);
        const sim::MeterProfile m = sim::meter();
        fresh();
        ASSERT_EQ(get(), ME_SUCCESS);
        const auto full = tree;
        const pugi::xml_node settings = full->document_element().child("Settings");
        const std::string names = childNames(settings);
        std::string listing;
        Names listed;
        for (pugi::xml_node n : settings.children()) listed.push_back(n.name()), listing += "<" + listed.back() + "/>";
        // One even step per item, capped at 100.
        const int count = static_cast<int>(std::distance(settings.begin(), settings.end()));
        std::vector<int> steps;
        for (int i = 1; i <= count; ++i) steps.push_back(std::min(i * int(std::nearbyint(100.0 / count)), 100));
        EXPECT_EQ(progress, steps);
        EXPECT_EQ(full->document_element().child("DeviceInfo").child_value("TypeID"), std::to_string(type));
        EXPECT_EQ(nodeText(settings.child("GlucRange")) + "|" + nodeText(settings.child("GlucErrRange")),
                  "High=" + std::to_string(m.glucoseHigh) + " Low=" + std::to_string(m.glucoseLow) + " Mode=0 |High=" +
                      std::to_string(m.glucoseErrorHigh) + " Low=" + std::to_string(m.glucoseErrorLow) + " Mode=0 ");

        fresh();
        ASSERT_EQ(get(listed), ME_SUCCESS);
        EXPECT_EQ(report(), kReportOk);
        EXPECT_EQ(items(), names);

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
    EXPECT_EQ(children("Language/ValidLang"), (Names{"Txt=English 0", "Txt=British 19", "23"}));
    EXPECT_EQ(at("GlucRange") + nodeText(tree->first_element_by_path("DeviceCaps/Records/Gluc")),
              "High=600 Low=25 Mode=0 Min=0 Max=1023 ");
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
