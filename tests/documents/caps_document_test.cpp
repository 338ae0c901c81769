#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

using Names = std::vector<std::string>;

struct Caps : WrapperTest {
    XMLWrapper caps = newDoc(doc_kind::device_caps);
    bool checked = false;

    void discoverProfile(const sim::MeterProfile& p) {
        sim::loadProfile(p);
        device = newDoc(doc_kind::device_info);
        XMLWrapper conn = connectionDoc(std::to_string(p.port));
        ASSERT_EQ(wrapper->discoverDevice(rec, device, conn, status), ME_SUCCESS);
        fresh();
    }
    std::int32_t describe(bool all, const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        return wrapper->getDeviceCaps(rec, doc, caps, all, status, checked);
    }
    std::int32_t describe(bool all = true) {
        return describe(all, "1", sim::meter().serial, std::to_string(sim::meter().type));
    }
    // A listing as a client writes it.
    void list(const Names& settings, const Names& records, const char* root = "DeviceCaps") {
        caps = XMLWrapper();
        caps.AddElement(root);
        for (auto [section, names] : {std::pair{"Settings", &settings}, std::pair{"Records", &records}}) {
            caps.MoveToRoot();
            caps.AddElement(section);
            caps.MoveToChild(section);
            for (const std::string& n : *names) caps.AddElement(n);
        }
    }
    Names names(const char* section) const {
        Names out;
        for (pugi::xml_node n : parsed(caps)->document_element().child(section).children()) out.push_back(n.name());
        return out;
    }
    // The attributes of Settings/<path> or Records/<path>, "Name=value" joined by blanks, then its text.
    std::string at(const char* section, const char* path) const {
        pugi::xml_node n = parsed(caps)->document_element().child(section).first_element_by_path(path);
        std::string out;
        for (pugi::xml_attribute a : n.attributes()) out += std::string(a.name()) + "=" + a.value() + " ";
        return out + n.child_value();
    }
};

const Names kFullSettings[] = {
    {},
    {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "CommMode", "Baud",
     "NewLang", "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "EvtAvg", "InsPrompt",
     "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "CC", "Beep", "GlucUnit", "DateFormat", "TimeFormat", "Language", "ShowLastResult", "DaysAveraged",
     "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "GlucUnit", "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "CC", "Beep", "GlucUnit", "Decimal", "DateFormat", "TimeFormat", "Language", "CommMode", "Baud",
     "NewLang", "ShowClock", "DayLight", "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "GlucUnit", "TimeFormat", "GlucRange", "GlucErrRange", "GlucCalib"},
    {"Clock", "CC", "Beep", "GlucUnit", "DateFormat", "TimeFormat", "Language", "EvtAvgDurn", "WeekBegin",
     "CholesUnit", "PumpUse", "Insulins", "Pills", "Schedule", "Targets", "GlucRange", "GlucErrRange"},
};
const Names kFullRecords[] = {
    {},
    {"Gluc", "Strip"},
    {"Gluc", "Strip", "Ins", "MBolus", "Food"},
    {"Gluc"},
    {"Gluc"},
    {"Gluc", "Strip"},
    {"Gluc"},
    {"Gluc", "OralMed", "Ins", "MBolus", "MTDD", "Food", "Alcohol", "MicroAlbumin", "HbA1c", "Ketones", "HtWt", "BP",
     "Choles"},
};

TEST_F(Caps, FullDescriptionOfEveryMeterType) {
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE(type);
        discover(type);
        caps = XMLWrapper();  // rebuilt whatever the client passed
        ASSERT_EQ(describe(), ME_SUCCESS);
        EXPECT_EQ(names("Settings"), kFullSettings[type == 8 ? 6 : type]);
        EXPECT_EQ(names("Records"), kFullRecords[type == 8 ? 6 : type]);
        EXPECT_EQ(parsed(caps)->document_element().child("DeviceInfo").child_value("SN"), sim::meter().serial);
        EXPECT_EQ(statusGroups(status), Names{"0/0/Operation completed successfully"});
        EXPECT_TRUE(checked);
        EXPECT_EQ(completions, 1);
        EXPECT_FALSE(closed());
        // One even step per entry, capped at 100.
        const std::size_t entries = names("Settings").size() + names("Records").size();
        const int step = static_cast<int>(std::nearbyint(100.0 / entries));
        ASSERT_EQ(progress.size(), entries);
        for (std::size_t i = 0; i < entries; ++i) EXPECT_EQ(progress[i], std::min<int>(step * int(i + 1), 100));
    }
}

TEST_F(Caps, LimitsModesAndWords) {
    sim::MeterProfile tarn = sim::defaultProfile(1);
    tarn.options[eNumericSeparator].availability = 0;  // the meter lacks it though its type lists it
    tarn.languages = {0, 19, 23};
    tarn.glucoseLow = 25;
    discoverProfile(tarn);
    ASSERT_EQ(describe(), ME_SUCCESS);
    const Names settings = names("Settings");
    EXPECT_EQ(std::count(settings.begin(), settings.end(), "Decimal"), 0);
    EXPECT_EQ(progress.size(), 15u);
    EXPECT_EQ(at("Settings", "Clock"), "Mode=1 ");
    EXPECT_EQ(at("Settings", "Clock/Min") + at("Settings", "Clock/Max"), "D=1 MM=01 Y=1990 D=31 MM=12 Y=2014 ");
    EXPECT_EQ(at("Settings", "CC"), "Mode=1 Min=1 Max=16 ");
    EXPECT_EQ(at("Settings", "Baud"), "Mode=1 Min=0 Max=3 ");
    EXPECT_EQ(at("Settings", "Language"), "Mode=1 Min=0 Max=7 ");
    auto lang = parsed(caps)->document_element().child("Settings").child("Language").child("ValidLang");
    Names langs;
    for (pugi::xml_node l : lang.children()) langs.push_back(std::string(l.child_value()) + l.attribute("Txt").value());
    EXPECT_EQ(langs, (Names{"0English", "19British", "23"}));
    EXPECT_EQ(at("Settings", "GlucRange"), "High=600 Low=25 Mode=0 ");
    EXPECT_EQ(at("Settings", "GlucErrRange"), "High=1023 Low=-1 Mode=0 ");
    EXPECT_EQ(at("Settings", "GlucCalib"), "Txt=Whole Blood Mode=0 0");
    EXPECT_EQ(at("Records", "Gluc"), "Min=0 Max=1023 ");

    discover(eDunmark);  // its glucose stops at 768
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(at("Settings", "GlucErrRange") + "|" + at("Records", "Gluc"), "High=768 Low=-1 Mode=0 |Min=0 Max=768 ");

    discover(eCVTolvoMeter);  // a read-only baud rate
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(at("Settings", "Baud") + "|" + at("Settings", "GlucCalib"), "Mode=0 Min=3 Max=3 |Txt=Plasma Mode=0 1");
}

TEST_F(Caps, MedicationScheduleTargetsAndRecordsOfType7) {
    discover(eMorvex);
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(at("Settings", "EvtAvgDurn"), "Mode=1 Min=0 Max=4 ");
    EXPECT_EQ(at("Settings", "Insulins/Pre") + at("Settings", "Insulins/Custom") + at("Settings", "Insulins/Favorite"),
              "Mode=0 Max=10 Max=11 Mode=1 StrLen=8 Max=3 Mode=1 ");
    EXPECT_EQ(at("Settings", "Pills/Pre") + at("Settings", "Pills/Custom") + at("Settings", "Pills/Favorite"),
              "Mode=0 Max=5 Max=10 Mode=1 StrLen=8 Max=5 Mode=1 ");
    EXPECT_EQ(at("Settings", "Schedule"), "Custom=true Mode=1 ");
    EXPECT_EQ(at("Settings", "Targets") + at("Settings", "Targets/PostMealHigh") + at("Settings", "Targets/Hypo"),
              "Mode=1 Unit=0 UTxt=mg/dL Min=60 Max=200 Min=50 Max=90 ");
    EXPECT_EQ(at("Records", "Food/Carbs") + at("Records", "Food/SFat") + at("Records", "Food/Cals") +
                  at("Records", "Food/Protein"),
              "Min=0 Max=250 Min=0 Max=250 Min=0 Max=2500 Min=0 Max=250 ");
    EXPECT_EQ(at("Records", "HbA1c") + at("Records", "Choles/Trig") + at("Records", "BP/Diast"),
              "Min=4.0 Max=15.0 Min=0 Max=3001 Min=40 Max=150 ");

    discover(eCVPellis);  // the same food record without the type-7 parts
    ASSERT_EQ(describe(), ME_SUCCESS);
    EXPECT_EQ(parsed(caps)->document_element().child("Records").child("Food").select_nodes("*").size(), 1u);
    EXPECT_EQ(at("Settings", "EvtAvg"), "Mode=1 Min=0 Max=1 ");
}

TEST_F(Caps, ListingDescribesWhatTheTypeHasAndNamesTheRest) {
    discover(eCVTarnConsumerMeter);
    list({"Clock", "Frobnicate", "DevInit"}, {"Gluc", "HbA1c"});
    EXPECT_EQ(describe(false), ME_PARTIALSUCCESS);
    EXPECT_EQ(names("Settings"), Names{"Clock"});
    EXPECT_EQ(names("Records"), Names{"Gluc"});
    EXPECT_EQ(statusGroups(status),
              Names{"-31/-31/Partial success;Frobnicate is not supported;DevInit is not supported;HbA1c is not supported;"});
    EXPECT_EQ(progress, (std::vector<int>{50, 100}));
    EXPECT_EQ(completions, 1);
    EXPECT_FALSE(closed());

    // Type 7 describes its calibration when asked, takes either averaging name, and keeps visits silently.
    discover(eMorvex);
    list({"GlucCalib", "EvtAvg", "Pills"}, {"Visit", "Gluc"});
    EXPECT_EQ(describe(false), ME_SUCCESS);
    EXPECT_EQ(names("Settings"), (Names{"EvtAvgDurn", "Pills", "GlucCalib"}));
    EXPECT_EQ(names("Records"), Names{"Gluc"});
    EXPECT_EQ(progress, (std::vector<int>{20, 40, 60, 80}));
}

TEST_F(Caps, MalformedOrEmptyListing) {
    discover(eMorvex);
    const std::string xml = "-17/-33/Invalid XML ;";
    struct Case {
        Names settings, records;
        const char* root;
        int extraSettings;  // a second Settings element somewhere below the root
        std::string group;
    };
    for (const Case& c : {
             Case{{"Clock"}, {}, "DeviceSettings", 0, xml},
             Case{{"Clock"}, {}, "DeviceCaps", 1, xml + "Settings node missing in Device capabilities"},
             Case{{}, {}, "DeviceCaps", 0, "-17/-33/Operation failed; Invalid XML"},
             Case{{"Decimal"}, {"Strip"}, "DeviceCaps", 0,
                  "-17/-33/Operation failed; Invalid XML;Decimal is not supported;Strip is not supported;"},
         }) {
        SCOPED_TRACE(c.group);
        fresh();
        list(c.settings, c.records, c.root);
        if (c.extraSettings) {
            caps.SelectElement("Records");
            caps.AddElement("Settings");
        }
        const std::string before = caps.XML();
        EXPECT_EQ(describe(false), ME_FAIL);
        EXPECT_EQ(statusGroups(status), Names{c.group});
        EXPECT_EQ(caps.XML(), before);
        EXPECT_TRUE(closed());
        EXPECT_EQ(completions, 1);
    }
    // Without Records.
    fresh();
    caps = XMLWrapper();
    caps.AddElement("DeviceCaps");
    caps.AddElement("Settings");
    EXPECT_EQ(describe(false), ME_FAIL);
    EXPECT_EQ(statusGroups(status), Names{xml + "Records node missing in Device capabilities"});
}

TEST_F(Caps, EveryExit) {
    discover(eMorvex);
    const std::string sn = sim::meter().serial, bad = "-17/-19/Bad parameter passed to the function ; ";
    const std::string other = "-8/-8/Different device detected ; Device ";
    struct Case {
        std::string port, sn, type;
        const char* fault;  // transport function failing once
        std::int16_t keep;
        std::int32_t result;
        std::string group;
        bool closes;
        int completions;
    };
    for (const Case& c : {
             Case{"-1", sn, "7", "", 0, ME_BAD_PARAMETER, bad + "Port number from XML file is invalid", false, 1},
             Case{"1", "", "7", "", 0, ME_BAD_PARAMETER, bad + "Device SN from Device Info XML is invalid", true, 1},
             Case{"1", sn, "9", "", -50, ME_BAD_PARAMETER, bad + "Device Type from Device Info XML is invalid", false, 1},
             Case{"1", sn, "7", "vb_Read_Meter_Clock", 0, ME_TIME_OUT,
                  "-17/-2/Operation failed;;Timeout error ; Clock setting failed", true, 1},
             Case{"1", sn, "7", "vb_Read_Meter_Option", 0, ME_TIME_OUT,
                  "-17/-2/Operation failed;;Timeout error ; StripCalCode setting failed", true, 1},
             Case{"1", sn, "7", "GetScheduleSelection", 0, ME_COM_ERROR,
                  "-17/-3/Operation failed;;Communication errorSchedule setting failed", true, 1},
             Case{"1", sn, "7", "vb_Chk4Meter", 0, ME_COM_ERROR, "-17/-3/Communication error", false, 0},
             Case{"1", "other1", "7", "", 0, ME_FAIL,
                  other + "SN from Device Info XML - other1 Device SN from device - " + sn + " do not match", false, 1},
             Case{"1", sn, "7.0", "", 0, ME_SUCCESS, "0/0/Operation completed successfully", false, 1},
             Case{"1", sn, "2", "", 0, ME_FAIL,
                  other + "Type from Device Info XML - 2 Device Type from device - 7 do not match", false, 1},
         }) {
        SCOPED_TRACE(c.group);
        if (*c.fault) sim::injectFault(c.fault, 1, c.result, false);
        fresh();
        rec.Error_code = c.keep;
        EXPECT_EQ(describe(true, c.port, c.sn, c.type), c.result);
        EXPECT_EQ(statusGroups(status), Names{c.group});
        EXPECT_EQ(closed(), c.closes);
        EXPECT_EQ(completions, c.completions);
    }

    // A listing in an empty document: the unexpected-error handler.
    fresh();
    rec.Error_code = 0;
    caps = XMLWrapper();
    EXPECT_EQ(unexpectedTrace([&] { describe(false); }).rfind(" getDeviceCaps --> "), 2u);
    ASSERT_EQ(statusGroups(status).size(), 1u);
    EXPECT_EQ(statusGroups(status)[0].rfind("-17/-16/Unknown status;Error number = ", 0), 0u);
    EXPECT_TRUE(closed());
    EXPECT_EQ(completions, 1);
}

}  // namespace
