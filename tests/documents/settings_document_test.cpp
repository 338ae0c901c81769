#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <optional>

#include "component/error_description.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;
using detail::ErrorDescription;

namespace {

using Names = std::vector<std::string>;

struct DeviceSettings : WrapperTest {
    XMLWrapper cfg = newDoc(doc_kind::device_settings);
    std::shared_ptr<pugi::xml_document> tree;
    bool checkMeter = false;

    // Reads every item the meter offers, or the listed ones.
    std::int32_t get(const std::optional<Names>& listed = std::nullopt) {
        if (listed && !listed->empty()) {
            cfg.SelectElement("Settings");
            for (const std::string& n : *listed) cfg.AddElement(n);
        }
        const std::int32_t r = wrapper->getDeviceSettings(rec, device, cfg, !listed, status, checkMeter);
        tree = parsed(cfg);
        return r;
    }
    pugi::xml_node item(const char* name) { return tree->document_element().child("Settings").child(name); }
    Names items() {
        Names out;
        for (pugi::xml_node n : tree->document_element().child("Settings").children()) out.push_back(n.name());
        return out;
    }
    std::string attr(const char* element, const char* attribute) {
        return item(element).attribute(attribute).value();
    }
    // "text Txt Mode Min-Max" of an option element.
    std::string show(const char* element) {
        return std::string(item(element).child_value()) + " " + attr(element, "Txt") + " " + attr(element, "Mode") +
               " " + attr(element, "Min") + "-" + attr(element, "Max");
    }
    Names only(const std::string& major, const std::string& minor, const std::string& desc) {
        return {major + "/" + minor + "/" + desc};
    }
    Names success() { return only("0", "0", ErrorDescription(0)); }
    int closes() const { return sim::callCount("close_meter"); }
    // Attaches this meter and discovers it.
    void load(const sim::MeterProfile& p) {
        sim::loadProfile(p);
        device = newDoc(doc_kind::device_info);
        XMLWrapper conn = connectionDoc(std::to_string(p.port));
        ASSERT_EQ(wrapper->discoverDevice(rec, device, conn, status), ME_SUCCESS);
        fresh();
    }
    std::size_t count(pugi::xml_node parent) {
        return static_cast<std::size_t>(std::distance(parent.begin(), parent.end()));
    }
};

TEST_F(DeviceSettings, EveryTypeGivesItsItemsInDocumentOrderWithProgress) {
    const Names common = {"GlucRange", "GlucErrRange", "GlucCalib"};
    const std::vector<std::pair<int, Names>> cases = {
        {1, {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "CommMode",
             "Baud", "NewLang"}},
        {2, {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "EvtAvg",
             "InsPrompt"}},
        {3, {"Clock", "CC", "Beep", "GlucUnit", "DateFormat", "TimeFormat", "Language", "ShowLastResult",
             "DaysAveraged"}},
        {4, {"Clock", "GlucUnit"}},
        {5, {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "CommMode",
             "Baud", "NewLang", "ShowClock", "DayLight"}},
        {6, {"Clock", "GlucUnit", "TimeFormat"}},
        {7, {"Clock", "CC", "Beep", "DevInit", "GlucUnit", "DateFormat", "TimeFormat", "Language", "EvtAvgDurn",
             "WeekBegin", "CholesUnit", "PumpUse", "Insulins", "Pills", "Schedule", "Targets"}},
        {8, {"Clock", "GlucUnit", "TimeFormat"}},
    };
    for (const auto& [type, first] : cases) {
        SCOPED_TRACE(type);
        discover(type);
        cfg = XMLWrapper();  // the request builds the whole document in this mode
        EXPECT_EQ(get(), ME_SUCCESS);
        Names expected = first;
        expected.insert(expected.end(), common.begin(), common.end());
        EXPECT_EQ(items(), expected);
        EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("TypeID"), std::to_string(type));
        EXPECT_EQ(attr("GlucErrRange", "High"), type == 3 ? "768" : "1023");

        const int step = static_cast<int>(std::nearbyint(100.0 / static_cast<double>(expected.size())));
        std::vector<int> steps;
        for (std::size_t i = 1; i <= expected.size(); ++i) steps.push_back(std::min<int>(int(i) * step, 100));
        EXPECT_EQ(progress, steps);
        const bool single = type == 4 || type == 6 || type == 8;
        EXPECT_EQ(sim::callCount("vb_Read_Meter_Options"), single ? 0 : 1);
        EXPECT_EQ(sim::callCount("vb_Read_Meter_Option"), single ? int(first.size()) - 1 : 0);
        // Single reads wake the meter before every other read.
        EXPECT_EQ(sim::callCount("vb_Tickle_Meter"), single ? 1 : 0);
        EXPECT_EQ(statusGroups(status), success());
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closes(), 0);
        EXPECT_TRUE(checkMeter);
    }
    EXPECT_EQ(progress.back(), 100);  // type 8: six steps of 17, capped
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
    load(p);
    ASSERT_EQ(get(), ME_SUCCESS);

    auto date = [&](const char* child) {
        pugi::xml_node n = item("Clock").child(child);
        return std::string(n.attribute("D").value()) + "/" + n.attribute("MM").value() + "/" + n.attribute("Y").value();
    };
    EXPECT_EQ(date("Val") + " " + item("Clock").child("Val").attribute("h").value() + ":" +
                  item("Clock").child("Val").attribute("m").value(),
              "5/04/2009 7:8");
    EXPECT_EQ(date("Min") + "-" + date("Max"), "1/01/2000-31/12/2020");

    // Beep and pump use are stored as "off" flags and shown inverted.
    EXPECT_EQ(show("Beep"), "1 On 1 0-1");
    EXPECT_EQ(show("PumpUse"), "0 No 1 0-1");
    EXPECT_EQ(show("EvtAvgDurn"), "1 14 Days 1 0-4");
    EXPECT_EQ(show("CC"), "4  1 1-16");
    EXPECT_EQ(show("DevInit"), "1 Yes 1 0-1");
    EXPECT_EQ(show("Language") + attr("Language", "Val"), " English 1 0-190");

    Names langs;
    for (pugi::xml_node l : item("Language").child("ValidLang").children("Lang"))
        langs.push_back(std::string(l.child_value()) + l.attribute("Txt").value());
    EXPECT_EQ(langs, (Names{"0English", "1Spanish", "2French", "3Italian", "4Dutch", "5Portuguese", "7German",
                            "9Danish", "10Finnish", "11Norwegian", "19British"}));

    pugi::xml_node ins = item("Insulins");
    EXPECT_EQ(count(ins.child("Pre")), 10u);
    EXPECT_EQ(count(ins.child("Custom")), 11u);
    EXPECT_STREQ(ins.child("Custom").attribute("Max").value(), "11");
    EXPECT_STREQ(ins.child("Pre").first_child().attribute("InUse").value(), "true");
    EXPECT_STREQ(ins.child("Custom").first_child().attribute("InUse").value(), "false");
    EXPECT_STREQ(ins.child("Custom").find_child_by_attribute("Txt", "MYINS").child_value(), "12");
    Names favourites;
    for (pugi::xml_node f : ins.child("Favorite").children()) favourites.push_back(f.child_value());
    EXPECT_EQ(favourites, (Names{"2", "12"}));
    EXPECT_STREQ(ins.child("Favorite").last_child().attribute("Txt").value(), "MYINS");

    pugi::xml_node pills = item("Pills");
    EXPECT_EQ(count(pills.child("Pre")), 5u);
    EXPECT_EQ(count(pills.child("Custom")), 10u);
    EXPECT_STREQ(pills.child("Favorite").attribute("Max").value(), "5");
    EXPECT_STREQ(pills.child("Favorite").first_child().child_value(), "7");

    EXPECT_EQ(attr("Schedule", "Custom"), "true");
    pugi::xml_node night = item("Schedule").child("Night");
    EXPECT_EQ(std::string(night.attribute("h").value()) + ":" + night.attribute("m").value(), "23:0");
    EXPECT_STREQ(item("Schedule").child("PreB").attribute("h").value(), "7");

    EXPECT_EQ(attr("Targets", "UTxt"), "mg/dL");
    EXPECT_STREQ(item("Targets").child_value("PreMealHigh"), "140");
    EXPECT_STREQ(item("Targets").child("Hypo").attribute("Max").value(), "90");
    EXPECT_EQ(attr("GlucRange", "Low") + "-" + attr("GlucRange", "High"), "20-600");
    EXPECT_EQ(std::string(item("GlucCalib").child_value()) + attr("GlucCalib", "Txt"), "1Plasma");
    EXPECT_EQ(progress.back(), 95);  // 19 steps of 5
}

TEST_F(DeviceSettings, OptionMappingsAndAttributes) {
    sim::MeterProfile p = sim::defaultProfile(eCVTarnConsumerMeter);
    p.options[eCommunicationRate].value = 3;
    p.options[eBeepStatus].value = 1;
    p.options[eNumericSeparator].availability = 1;
    p.options[eCommunicationMode].value = 2;
    p.options[eTranslateNewLang].availability = 0;
    load(p);
    ASSERT_EQ(get(), ME_SUCCESS);
    // The baud range ends at the fastest rate, whichever rate is set now.
    EXPECT_EQ(show("Baud"), "0 300 1 0-3");
    EXPECT_EQ(show("Beep"), "0 Off 1 0-1");
    EXPECT_EQ(show("Decimal"), "0 . 0 0-1");
    EXPECT_EQ(show("NewLang"), "0 English  0-1");
    EXPECT_EQ(show("CommMode"), "2 Data A 1 0-3");

    p = sim::defaultProfile(eCVTolvoMeter);  // baud read-only at 9600
    load(p);
    ASSERT_EQ(get(), ME_SUCCESS);
    EXPECT_EQ(show("Baud"), "3 9600 0 3-3");

    discover(eDunmark);
    ASSERT_EQ(get(), ME_SUCCESS);
    EXPECT_EQ(attr("Language", "Mode"), "0");  // fixed on this type although writable
}

TEST_F(DeviceSettings, ListedItems) {
    // Only the clock: no identity check, so another meter answering goes unnoticed.
    discover(eMorvex);
    sim::setIdentitySerial("OTHER");
    EXPECT_EQ(get(Names{"Clock"}), ME_SUCCESS);
    EXPECT_EQ(items(), Names{"Clock"});
    EXPECT_EQ(statusGroups(status), success());
    EXPECT_EQ(sim::callCount("vb_Chk4Meter"), 0);
    sim::setIdentitySerial("");

    // EvtAvgDurn and EvtAvg name the same item; the element follows the meter type.
    cfg = newDoc(doc_kind::device_settings);
    status = newDoc(doc_kind::status);
    EXPECT_EQ(get(Names{"EvtAvg", "Nothing"}), ME_SUCCESS);
    EXPECT_EQ(items(), Names{"EvtAvgDurn"});
    EXPECT_EQ(statusGroups(status), only("-31", "-31", ErrorDescription(-31) + ";Nothing is not supported;"));

    discover(eCVPellis);
    cfg = newDoc(doc_kind::device_settings);
    EXPECT_EQ(get(Names{"EvtAvgDurn"}), ME_SUCCESS);
    EXPECT_EQ(items(), Names{"EvtAvg"});

    discover(eQuillaandBremo);
    cfg = newDoc(doc_kind::device_settings);
    EXPECT_EQ(get(Names{"Beep", "GlucUnit"}), ME_SUCCESS);
    EXPECT_EQ(items(), Names{"GlucUnit"});
    EXPECT_EQ(statusGroups(status), only("-31", "-31", ErrorDescription(-31) + ";Beep is not supported;"));
    EXPECT_EQ(sim::callCount("vb_Read_Meter_Option"), 1);

    // Nothing the meter offers: the document still describes the meter, nothing is read.
    discover(eCorviaZenta);
    cfg = newDoc(doc_kind::device_settings);
    EXPECT_EQ(get(Names{"Foo"}), ME_SUCCESS);
    EXPECT_TRUE(items().empty());
    EXPECT_STREQ(tree->document_element().child("DeviceInfo").child_value("SN"), "ZNT6005521");
    EXPECT_EQ(statusGroups(status), only("-17", "-17", ErrorDescription(-17) + ";Foo is not supported;"));
    EXPECT_EQ(sim::callCount("vb_Read_Meter_Option") + sim::callCount("vb_Read_Meter_Clock"), 0);
    EXPECT_EQ(sim::callCount("vb_Chk4Meter"), 1);

    discover(eCorviaZenta);
    cfg = newDoc(doc_kind::device_settings);
    EXPECT_EQ(get(Names{"TimeFormat", "GlucUnit"}), ME_SUCCESS);
    EXPECT_EQ(items(), (Names{"GlucUnit", "TimeFormat"}));
    EXPECT_EQ(sim::callCount("vb_Read_Meter_Option"), 2);
    EXPECT_EQ(sim::callCount("vb_Tickle_Meter"), 1);
}

struct Exit {
    const char* what;
    std::function<void(DeviceSettings&)> arrange;
    std::optional<Names> listed;  // none: every item
    std::int32_t result;
    std::string major, minor, desc;
    int closes;
};

TEST_F(DeviceSettings, EveryExitReportsOnceAndCompletes) {
    const std::string bad = ErrorDescription(-19) + " ; Device ";
    const std::string failed = ErrorDescription(-17) + ";;" + ErrorDescription(-2);
    auto fault = [](const char* fn, int nth = 1) {
        return [=](DeviceSettings&) { sim::injectFault(fn, nth, ME_TIME_OUT, true); };
    };
    auto info = [](const char* port, const char* sn, const char* type) {
        return [=](DeviceSettings& t) { t.device = deviceDoc(port, sn, type); };
    };
    const std::vector<Exit> exits = {
        {"negative port", info("-1", "MVX7001184", "7"), {}, -17, "-3", "-19",
         ErrorDescription(-19) + " ; Port number from XML file is invalid", 0},
        {"no serial", info("1", "", "7"), {}, -17, "-17", "-19", bad + "SN from Device Info XML is invalid", 1},
        {"type 9", info("1", "MVX7001184", "9"), {}, -17, "-17", "-19",
         bad + "Type from Device Info XML is invalid", 1},
        {"kept open", [](DeviceSettings& t) { t.device = deviceDoc("1", "", "7"); t.rec.Error_code = -50; }, {},
         -17, "-17", "-19", bad + "SN from Device Info XML is invalid", 0},
        {"other root", [](DeviceSettings& t) { t.cfg = newDoc(doc_kind::device_caps); }, Names{"Clock"}, -17, "-17",
         "-33", ErrorDescription(-33) + " ;", 1},
        {"empty list", nullptr, Names{}, -17, "-17", "-33", ErrorDescription(-33), 1},
        {"no Settings",
         [](DeviceSettings& t) { t.cfg = XMLWrapper(); t.cfg.AddElement("DeviceSettings"); }, Names{}, -17, "-17",
         "-33", ErrorDescription(-33) + " ;Settings node missing in Device settings", 1},
        {"clock", fault("vb_Read_Meter_Clock"), {}, -2, "-17", "-2", failed + " ; Clock setting failed", 1},
        {"options", fault("vb_Read_Meter_Options"), Names{"Beep", "Bad"}, -2, "-17", "-2",
         ErrorDescription(-17) + ";Bad is not supported; ; GetAllGeneralSettings failed. Error is : " +
             ErrorDescription(-2), 1},
        {"insulins", fault("GetPredefinedInsulins"), {}, -2, "-17", "-2", failed + " ; Insulins setting failed", 1},
        {"pills", fault("GetPredefinedOralMeds"), {}, -2, "-17", "-2", failed + " ; OralMeds setting failed", 1},
        {"schedule", fault("GetMealSegments"), {}, -2, "-17", "-2", failed + " ; Schedule setting failed", 1},
        {"targets", fault("GetTargetRange"), {}, -2, "-17", "-2", failed + " ; Targets setting failed", 1},
        {"target unit", fault("vb_Read_Meter_Option"), Names{"Targets"}, -2, "-17", "-2",
         failed + " ; Target Units settings failed", 1},
        {"identity", fault("vb_Chk4Meter"), {}, -2, "-17", "-2", ErrorDescription(-2), 0},
        {"serial", [](DeviceSettings&) { sim::setIdentitySerial("mvx7009999"); }, Names{"Beep", "CC"}, -17, "-8", "-8",
         ErrorDescription(-8) +
             " ; Device SN from Device Info XML - MVX7001184 Device SN from device - mvx7009999 do not match", 0},
    };
    for (const Exit& e : exits) {
        SCOPED_TRACE(e.what);
        discover(eMorvex);
        cfg = newDoc(doc_kind::device_settings);
        if (e.arrange) e.arrange(*this);
        const int before = closes();
        EXPECT_EQ(get(e.listed), e.result);
        EXPECT_EQ(statusGroups(status), only(e.major, e.minor, e.desc));
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closes() - before, e.closes);
        sim::clearFaults();
        sim::setIdentitySerial("");
        rec.Error_code = 0;
    }

    // A single read failing on a meter read option by option.
    discover(eParvix);
    sim::injectFault("vb_Read_Meter_Option", 1, ME_TIME_OUT, false);
    EXPECT_EQ(get(), ME_TIME_OUT);
    EXPECT_EQ(statusGroups(status), only("-17", "-2", failed + " ; GluUnits settings failed"));
    EXPECT_EQ(items(), Names{"Clock"});

    // Any other run-time error goes to the common handler and reaches the caller.
    discover(eMorvex);
    device = XMLWrapper();
    EXPECT_THROW(get(Names{"Beep"}), ComponentError);
    ASSERT_EQ(statusGroups(status).size(), 1u);
    EXPECT_EQ(statusGroups(status)[0].rfind("-17/-16/", 0), 0u);
    EXPECT_EQ(completions, 1);
}

}  // namespace
