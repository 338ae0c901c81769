#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <optional>

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

TEST_F(DeviceSettings, EveryTypeGivesItsItemsInDocumentOrderWithProgress) {
    const std::string general = "Clock CC Beep GlucUnit ";
    const std::pair<int, std::string> cases[] = {
        {1, general + "Decimal DateFormat TimeFormat Language CommMode Baud NewLang "},
        {2, general + "Decimal DateFormat TimeFormat Language EvtAvg InsPrompt "},
        {3, general + "DateFormat TimeFormat Language ShowLastResult DaysAveraged "},
        {4, "Clock GlucUnit "},
        {5, general + "Decimal DateFormat TimeFormat Language CommMode Baud NewLang ShowClock DayLight "},
        {6, "Clock GlucUnit TimeFormat "},
        {7,
         "Clock CC Beep DevInit GlucUnit DateFormat TimeFormat Language EvtAvgDurn WeekBegin CholesUnit PumpUse "
         "Insulins Pills Schedule Targets "},
        {8, "Clock GlucUnit TimeFormat "},
    };
    for (const auto& [type, first] : cases) {
        SCOPED_TRACE(type);
        discover(type);
        cfg = XMLWrapper();  // the request builds the whole document in this mode
        EXPECT_EQ(get(), ME_SUCCESS);
        EXPECT_EQ(items(), first + "GlucRange GlucErrRange GlucCalib ");
        EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("TypeID"), std::to_string(type));
        EXPECT_EQ(at("GlucErrRange"), type == 3 ? "High=768 Low=-1 Mode=0 " : "High=1023 Low=-1 Mode=0 ");
        // One even step per item, capped: type 8 reaches 100 at its sixth step of 17.
        const int count = static_cast<int>(std::count(first.begin(), first.end(), ' ')) + 3;
        const int step = static_cast<int>(std::nearbyint(100.0 / count));
        std::vector<int> steps;
        for (int i = 1; i <= count; ++i) steps.push_back(std::min(i * step, 100));
        EXPECT_EQ(progress, steps);
        // Types 4, 6 and 8 read option by option, waking the meter before every read after the first.
        const bool single = type == 4 || type == 6 || type == 8;
        EXPECT_EQ(sim::callCount("vb_Read_Meter_Options"), single ? 0 : 1);
        EXPECT_EQ(sim::callCount("vb_Read_Meter_Option"), single ? count - 4 : 0);
        EXPECT_EQ(sim::callCount("vb_Tickle_Meter"), single ? 1 : 0);
        expectExit(ME_SUCCESS, ME_SUCCESS, kReportOk, false);
        EXPECT_TRUE(checkMeter);
    }
}

TEST_F(DeviceSettings, Type7ValuesWordsAndLimits) {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    p.clock = sim::secondsOf(2009, 4, 5, 7, 8, 0);
    p.insulinNames[0].fixed = true;
    p.insulinNames[11].bytes = "MYINS";
    p.favoriteInsulins = {2, 0, 12};
    p.favoriteOralMeds = {0, 0, 0, 0, 7};
    p.scheduleSelection = 1;
    p.mealSegments = {28, 40, 48, 56, 72, 80, 92};
    p.targets = {70, 140, 90, 180, 60};
    p.initializedFlag = 1;
    discover(p);
    ASSERT_EQ(get(), ME_SUCCESS);

    EXPECT_EQ(children("Clock"), (Names{"D=5 MM=04 Y=2009 h=7 m=8 s=0 ", "D=1 MM=01 Y=2000 ", "D=31 MM=12 Y=2020 "}));
    // Beep and pump use are stored as "off" flags and shown inverted.
    EXPECT_EQ(at("Beep"), "Mode=1 Txt=On Min=0 Max=1 1");
    EXPECT_EQ(at("PumpUse"), "Mode=1 Txt=No Min=0 Max=1 0");
    EXPECT_EQ(at("EvtAvgDurn"), "Mode=1 Txt=14 Days Min=0 Max=4 1");
    EXPECT_EQ(at("DevInit"), "Mode=1 Txt=Yes Min=0 Max=1 1");
    EXPECT_EQ(at("Language"), "Mode=1 Val=0 Txt=English Min=0 Max=19 ");
    EXPECT_EQ(children("Language/ValidLang").back(), "Txt=British 19");

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
    p.options[eBeepStatus].value = 1;
    p.options[eNumericSeparator].availability = 1;
    p.options[eCommunicationMode].value = 2;
    p.options[eTranslateNewLang].availability = 0;
    discover(p);
    ASSERT_EQ(get(), ME_SUCCESS);
    // The baud range ends at the fastest rate, whichever rate is set now.
    EXPECT_EQ(at("Baud"), "Mode=1 Txt=300 Min=0 Max=3 0");
    EXPECT_EQ(at("Beep"), "Mode=1 Txt=Off Min=0 Max=1 0");
    EXPECT_EQ(at("NewLang"), "Txt=English Min=0 Max=1 0");
    EXPECT_EQ(at("CommMode"), "Mode=1 Txt=Data A Min=0 Max=3 2");

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
    struct Exit {
        std::function<void(DeviceSettings&)> arrange;
        std::optional<Names> listed;  // none: every item
        std::int32_t result;
        std::string report;
        bool closes;
    };
    const std::string bad = "-17/-19/" + ErrorDescription(-19) + " ; Device ";
    const std::string failed = "-17/-2/" + ErrorDescription(-17) + ";;" + ErrorDescription(-2) + " ; ";
    const std::string xml = "-17/-33/" + ErrorDescription(-33), other = "-8/-8/" + ErrorDescription(-8) + " ; Device ";
    auto fault = [](const char* fn) {
        return [=](DeviceSettings&) { sim::injectFault(fn, 1, ME_TIME_OUT, true); };
    };
    auto info = [](const char* port, const char* sn, const char* type, std::int16_t keep = 0) {
        return [=](DeviceSettings& t) {
            t.device = deviceDoc(port, sn, type);
            t.rec.Error_code = keep;
        };
    };
    auto cfg = [](XMLWrapper doc) { return [=](DeviceSettings& t) { t.cfg = doc; }; };
    XMLWrapper bare;
    bare.AddElement("DeviceSettings");
    const std::vector<Exit> exits = {
        {info("-1", "MVX7001184", "7"),
         {},
         -17,
         "-3/-19/" + ErrorDescription(-19) + " ; Port number from XML file is invalid",
         false},
        {info("1", "", "7"), {}, -17, bad + "SN from Device Info XML is invalid", true},
        {info("1", "MVX7001184", "9"), {}, -17, bad + "Type from Device Info XML is invalid", true},
        {info("1", "", "7", -50), {}, -17, bad + "SN from Device Info XML is invalid", false},
        {cfg(newDoc(doc_kind::device_caps)), Names{"Clock"}, -17, xml + " ;", true},
        {nullptr, Names{}, -17, xml, true},
        {cfg(bare), Names{}, -17, xml + " ;Settings node missing in Device settings", true},
        {fault("vb_Read_Meter_Options"), Names{"Beep", "Bad"}, -2,
         "-17/-2/" + ErrorDescription(-17) +
             ";Bad is not supported; ; GetAllGeneralSettings failed. Error is : " + ErrorDescription(-2),
         true},
        {fault("GetInitializedFlag"), {}, -2, failed + "DevInit setting failed", true},
        {fault("vb_Get_Meter_Firmware"), {}, -2, failed + "Firmware read failed", true},
        {fault("convert_from_seconds"), {}, -2, failed + "Clock setting failed", true},  // never a made-up date
        {fault("vb_Chk4Meter"), {}, -2, "-17/-2/" + ErrorDescription(-2), false},
        {[](DeviceSettings&) { sim::setIdentitySerial("mvx7009999"); }, Names{"Beep", "CC"}, -17,
         other + "SN from Device Info XML - MVX7001184 Device SN from device - mvx7009999 do not match", false},
        {info("1", "MVX7001184", "2"), Names{"Beep"}, -17,
         other + "Type from Device Info XML - 2 Device Type from device - 7 do not match", false},
    };
    for (const Exit& e : exits) {
        SCOPED_TRACE(e.report);
        discover(eMorvex);
        if (e.arrange) e.arrange(*this);
        expectExit(get(e.listed), e.result, e.report, e.closes);
        sim::clearFaults();
        sim::setIdentitySerial("");
        rec.Error_code = 0;
    }

    // Any other run-time error goes to the common handler and reaches the caller.
    discover(eMorvex);
    device = XMLWrapper();
    EXPECT_THROW(get(Names{"Beep"}), ComponentError);
    expectUnexpected(ErrorDescription(-16) + ";Error number = ");
}

// A name the meter does not give, at any position, is a failed read, never an empty name.
TEST_F(DeviceSettings, AFailedNameReadAtAnyPositionFailsTheRequest) {
    const std::string failed = "-17/-2/" + ErrorDescription(-17) + ";;" + ErrorDescription(-2) + " ; ";
    // Every position of each list fails alike in the fault sweep; here, each list's text.
    for (auto [function, position, text] :
         {std::tuple{"GetInsulinName", 21, "Insulins"}, {"GetOralMedicationName", 3, "OralMeds"}}) {
        SCOPED_TRACE(std::string(function) + " " + std::to_string(position));
        discover(eMorvex);
        sim::injectFault(function, position, ME_TIME_OUT, false);
        expectExit(get(), ME_TIME_OUT, failed + text + " setting failed", true);
        sim::clearFaults();
    }

    // A clock conversion that fails once is asked again and the document is the fault-free one.
    discover(eMorvex);
    ASSERT_EQ(get(), ME_SUCCESS);
    const std::string clean = at("Clock/Val");
    fresh();
    sim::injectFault("convert_from_seconds", 1, ME_TIME_OUT, false);
    expectExit(get(), ME_SUCCESS, kReportOk, false);
    EXPECT_EQ(at("Clock/Val"), clean);
}

}  // namespace
