// Settings documents as clients write them, careful or not: each item is written
// or refused on its own, and a refused value leaves the meter as it was.
#include <gtest/gtest.h>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct ApplySettings : WrapperTest {
    // A configuration document for the discovered meter, with the serial as the client has it.
    XMLWrapper config(const std::string& settings) const {
        const std::string serial = parsed(device)->document_element().child("DeviceInfo").child_value("SN");
        return settingsDoc(serial, std::to_string(sim::meter().type), settings);
    }
    std::int32_t apply(XMLWrapper cfg) {
        fresh();
        return wrapper->setDeviceSettings(rec, device, cfg, status);
    }
    std::int32_t apply(const std::string& settings) { return apply(config(settings)); }
    static std::int16_t option(MeterOptions_Enum o) { return sim::meter().options[o].value; }
    static std::string clockVal(const std::string& d, const std::string& mm, const std::string& y, const std::string& h,
                                const std::string& m, const std::string& s) {
        return "<Clock><Val D=\"" + d + "\" MM=\"" + mm + "\" Y=\"" + y + "\" h=\"" + h + "\" m=\"" + m + "\" s=\"" +
               s + "\"/></Clock>";
    }
    // The text of the named custom entry the meter reports for a position.
    std::string reportedName(const char* list, int position) {
        const auto doc = readSettings();
        for (pugi::xml_node n : doc->document_element().child("Settings").child(list).child("Custom").children())
            if (n.text().as_int() == position) return n.attribute("Txt").value();
        return "(no entry)";
    }
};

TEST_F(ApplySettings, EachElementIsWrittenOrRefusedAndEveryRefusalIsGatheredInOrder) {
    discover(eCVTolvoMeter);
    sim::MeterProfile expected = sim::meter();  // only what is valid changes
    for (auto [o, value] : {std::pair{eStripCalCode, 2}, {eBeepStatus, 0}, {eLanguage, 3}, {eDisplayClock, 1}})
        expected.options[o].value = static_cast<std::int16_t>(value);
    ASSERT_EQ(apply("<CC> 2 </CC><Beep>1</Beep><Decimal>  </Decimal><DateFormat>abc</DateFormat>"
                    "<Language Val=\"3\"/><Baud>0</Baud><CommMode>9</CommMode><ShowClock>0</ShowClock>"
                    "<DayLight>abc</DayLight>"),
              ME_SUCCESS);
    EXPECT_EQ(report(),
              "-31/-31/Partial success; Invalid Punctuation value ;Operation failed;"
              " Invalid DateMode value ;Operation failed;"
              " Invalid CommMode value ;Bad parameter passed to the function;"
              " BaudRate value is read only ; Invalid Daylight value ;Operation failed;");
    EXPECT_TRUE(sim::meter() == expected);
    EXPECT_EQ(progress, (std::vector<int>{11, 22, 33, 44, 55, 66, 77, 88, 99}));

    discover(eCVTarnConsumerMeter);
    for (auto [text, raw] : {std::pair{"0", 3}, {"3", 0}, {"2", 1}, {"00", 0}}) {
        ASSERT_EQ(apply(std::string("<Baud>") + text + "</Baud>"), ME_SUCCESS);
        EXPECT_EQ(option(eCommunicationRate), raw) << text;
    }

    // Names the type does not take are refused by name, read-only ones as such; progress counts the rest.
    discover(eQuillaandBremo);
    ASSERT_EQ(apply(clockVal("6", "5", "2010", "7", "8", "") +
                    "<GlucUnit>1</GlucUnit><TimeFormat>1</TimeFormat><GlucRange/><Foo/>"),
              ME_SUCCESS);
    EXPECT_EQ(report(),
              "-31/-31/Partial success;TimeFormat is not supported;GlucRange value is read only;"
              "Foo is not supported; GlucoseUnit value is read only ");
    EXPECT_EQ(sim::meter().clock, sim::secondsOf(2010, 5, 6, 7, 8, 0));
    EXPECT_EQ(progress, (std::vector<int>{50, 100}));
}

TEST_F(ApplySettings, ChecksStopTheRequestBeforeAnyWrite) {
    discover(eMorvex);
    const std::string sn = sim::meter().serial;
    const std::string beep = "<Beep>0</Beep>";
    const std::string bad = "-17/-19/Bad parameter passed to the function ; ";
    const std::string diff = "-8/-8/Different device detected ; ";
    for (auto [cfg, expected] : {
             std::pair{settingsDoc(sn, "7", beep, "Other"), std::string("-17/-33/Invalid XML ;")},
             {settingsDoc(sn, "7", "</Settings><DeviceInfo/><Settings>"),
              "-17/-33/Invalid XML ;DeviceInfo missing in Device settings"},
             {settingsDoc(sn, "9", beep), bad + "Device Type from Device Info XML is invalid"},
             {settingsDoc("", "7", beep), bad + "Device SN from Device settings XML is invalid"},
             {settingsDoc("X1", "7", beep),
              diff + "Device SN from Device settings XML - X1 Device SN from device - " + sn + " do not match"},
             {settingsDoc(sn, "5", beep),
              diff + "Device Type from Device settings XML - 5 Device Type from device - 7 do not match"},
             {config(beep + "</Settings><Settings>"), "-17/-33/Invalid XML ;Settings missing in Device settings"},
             {config(""), "-17/-33/Invalid XML"},
         }) {
        SCOPED_TRACE(expected);
        const int before = sim::callCount("vb_Set_Meter_Option");
        expectExit(apply(cfg), ME_FAIL, expected, false);
        EXPECT_EQ(sim::callCount("vb_Set_Meter_Option"), before);
    }
}

// Values within the type's ranges are written and nothing else changes; a refused one leaves the meter as it was.
TEST_F(ApplySettings, ValuesAreWrittenWithinTheMeterTypesRangesOnly) {
    const std::string clock = "-17/-17/Operation failed;Invalid DeviceClock value ; ";
    const std::string year = "-17/-17/Operation failed;Invalid DeviceClock year value ; ";
    const std::string devInit = "-17/-17/Operation failed;Invalid DevInit value ; ";
    using Change = void (*)(sim::MeterProfile&);
    struct Case {
        int type;
        std::string settings, report;
        Change change = nullptr;
        const char* fault = nullptr;  // fails the next call of this transport function
    } cases[] = {
        {eCVTarnConsumerMeter, "<Beep>2</Beep>",
         "-17/-17/Operation failed; Invalid Beeper value ;Bad parameter passed to the function;"},
        // Type 7 has no language to set, and names its averaging EvtAvgDurn with other values.
        {eMorvex, "<Language Val=\"6\"/><EvtAvg>2</EvtAvg>",
         "-17/-17/Operation failed; Invalid Language value;  Invalid EventAveraging value ;Operation failed;"},
        {eMorvex, clockVal("31", "12", "2020", "23", "59", "59") + "<DevInit> 0 </DevInit><EvtAvgDurn>3</EvtAvgDurn>",
         kReportOk,
         [](sim::MeterProfile& m) {
             m.clock = sim::secondsOf(2020, 12, 31, 23, 59, 59), m.initializedFlag = 0;
             m.options[eEvevtAveraging].value = 3;
         }},
        {eCVPellis, "<Language Val=\"6\"/><EvtAvg>0</EvtAvg>", kReportOk,
         [](sim::MeterProfile& m) { m.options[eLanguage].value = 6, m.options[eEvevtAveraging].value = 0; }},
        // Type 5 keeps years to 2026; blanks around the parts are ignored.
        {eCVTolvoMeter, clockVal(" 1", "01", "2021 ", "0", "0", ""), kReportOk,
         [](sim::MeterProfile& m) { m.clock = sim::secondsOf(2021, 1, 1); }},
        {eMorvex, clockVal("6", "5", "2010", "24", "0", "0"), clock},
        {eMorvex, clockVal("30", "02", "2010", "7", "0", ""), clock},
        {eMorvex, clockVal("6", "5", "2021", "7", "0", ""), year},
        {eMorvex, clockVal("31", "12", "1999", "23", "59", "59"), year},
        {eMorvex, "<DevInit>2</DevInit>", devInit},
        {eMorvex, "<DevInit>1</DevInit>", devInit + "Timeout error;", nullptr, "SetInitializedFlag"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.settings);
        discover(c.type);
        if (c.fault) sim::injectFault(c.fault, 1, ME_TIME_OUT, false);
        sim::MeterProfile expected = sim::meter();
        if (c.change) c.change(expected);
        ASSERT_EQ(apply(c.settings), ME_SUCCESS);
        EXPECT_EQ(report(), c.report);
        EXPECT_TRUE(sim::meter() == expected);
    }
}

TEST_F(ApplySettings, MedicationFavouritesMustNameFixedOrNewlyNamedEntries) {
    discover(eMorvex);
    const sim::MeterProfile before = sim::meter();
    ASSERT_EQ(apply("<Insulins><Custom><Insulin Txt=\" Rapid \">12</Insulin><Insulin Txt=\"X\">25</Insulin></Custom>"
                    "<Favorite><Insulin>12</Insulin><Insulin>13</Insulin><Insulin>0</Insulin><Insulin> </Insulin>"
                    "<Insulin>3</Insulin><Insulin>5</Insulin><Insulin>7</Insulin></Favorite></Insulins>"
                    "<Pills><Custom><Pill Txt=\"Metf\">7</Pill></Custom>"
                    "<Favorite><Pill>8</Pill><Pill>7</Pill><Pill>2</Pill></Favorite></Pills>"),
              ME_SUCCESS);
    EXPECT_EQ(report(),
              "-31/-31/Partial success;Invalid CustomInsulin at index 25 ;"
              "Invalid FavoriteInsulin at index 13  ;Invalid FavoriteInsulin at index 0 ;"
              "Too many FavoriteInsulin at index 7 ;Invalid FavoriteInsulin at index 8 ;");
    const sim::MeterProfile after = sim::meter();
    EXPECT_EQ(after.insulinNames[11].bytes, "Rapid");
    EXPECT_EQ(after.insulinNames[12], before.insulinNames[12]);
    EXPECT_EQ(after.favoriteInsulins, (std::array<std::int16_t, 3>{12, 3, 5}));
    EXPECT_EQ(after.oralMedNames[6].bytes, "Metf");
    EXPECT_EQ(after.favoriteOralMeds, (std::array<std::int16_t, 5>{7, 2, 0, 0, 0}));

    // A fourteenth named entry has no place in the request's list.
    std::string custom;
    for (int p : {11, 12, 13, 14, 15, 16, 17, 18, 19, 20, 21, 11, 12, 13})
        custom += "<Insulin Txt=\"N\">" + std::to_string(p) + "</Insulin>";
    EXPECT_THROW(apply("<Insulins><Custom>" + custom + "</Custom><Favorite/></Insulins>"), ComponentError);
    expectUnexpected("Unknown status;Error number = ");
}

TEST_F(ApplySettings, ScheduleAndTargetsKeepWhatTheDocumentDoesNotValidlyChange) {
    discover(eMorvex);
    ASSERT_EQ(apply("<Schedule Custom=\" TRUE \"><PreB h=\"6\" m=\"30\"/><PostB h=\"-1\" m=\"0\"/>"
                    "<PreL h=\"25\" m=\"0\"/><PostL h=\"13\" m=\"45\"/><PreD h=\"18\" m=\"0\"/>"
                    "<PostD h=\"20\" m=\"0\"/><Night h=\"22\" m=\"14\"/></Schedule>"
                    "<Targets><PreMealLow>75</PreMealLow><PreMealHigh>140</PreMealHigh><PostMealLow>85</PostMealLow>"
                    "<PostMealHigh>170</PostMealHigh><Hypo>0</Hypo></Targets>"),
              ME_SUCCESS);
    EXPECT_EQ(report(), "-31/-31/Partial success;Invalid Schedule PreL value ; Invalid Targets Hypo value ; ");
    sim::MeterProfile meter = sim::meter();
    EXPECT_EQ(meter.scheduleSelection, 1);
    EXPECT_EQ(meter.mealSegments, (std::array<std::int16_t, 7>{26, 36, 46, 55, 72, 80, 88}));
    EXPECT_EQ(meter.targets, (sim::TargetLimits{75, 140, 85, 170, 60}));

    // With the fixed schedule no segment is needed; a selection that is neither keeps the meter's.
    ASSERT_EQ(apply("<Schedule Custom=\"false\"/>"), ME_SUCCESS);
    EXPECT_EQ(sim::meter().scheduleSelection, 0);
    ASSERT_EQ(apply("<Schedule Custom=\"maybe\"/>"), ME_SUCCESS);
    EXPECT_EQ(report(), "-31/-31/Partial success;Schedule type invalid ; ");
    EXPECT_EQ(sim::meter().scheduleSelection, 0);
}

TEST_F(ApplySettings, AMissingElementEndsTheRequestAfterTheEarlierWrites) {
    discover(eMorvex);
    const std::int16_t beep = option(eBeepStatus);
    ASSERT_EQ(
        apply(clockVal("6", "5", "2010", "7", "8", "") + clockVal("6", "5", "2011", "7", "8", "") + "<Beep>0</Beep>"),
        ME_FAIL);
    EXPECT_EQ(report(), "-17/-33/Invalid XML ;Clock missing in Device settings");
    EXPECT_EQ(option(eBeepStatus), beep);

    ASSERT_EQ(apply("<Beep>0</Beep><CC>abc</CC><Insulins><Custom/></Insulins><Targets/>"), ME_FAIL);
    EXPECT_EQ(report(),
              "-17/-33/Invalid XML ;Favorite missing in Device settings;"
              " Invalid StripCalCode value ;Operation failed;");
    EXPECT_EQ(option(eBeepStatus), 1);
    EXPECT_EQ(completions, 1);
}

// Values that are no number, or no text the meter can hold.
const std::string kFailed = "-17/-17/Operation failed;";
const std::string kPartial = "-31/-31/Partial success;";  // the group was still saved with what was valid

// Where a number is read, and what refusing it reports: "@" stands for the value.
struct Place {
    std::string settings, report;
    bool namesOnly = false;  // may still save the names group's other parts; else the meter stays as it was
};

// The text with its "@", if any, replaced by the value.
std::string with(std::string text, const std::string& value) {
    const auto at = text.find('@');
    return at == std::string::npos ? text : text.replace(at, 1, value);
}

TEST_F(ApplySettings, NonNumbersAreRefusedByEveryReaderAndNeverWritten) {
    // One of each kind the number parser refuses (all of them: tests/util), and numbers beyond 16 bits.
    const std::string tenMegabytes(10'000'000, '7');
    const std::vector<std::string> values = {"abc",   "1e2",    "0x10",    "\u0661\u0662", "99999999999999999999",
                                             "40000", "-32769", "32767.5", tenMegabytes};
    const std::string option = "value ;Operation failed;", clock = kFailed + "Invalid DeviceClock value ; ";
    const std::string segments = R"(<PostB h="-1" m="0"/><PreL h="-1" m="0"/><PostL h="-1" m="0"/>)"
                                 R"(<PreD h="-1" m="0"/><PostD h="-1" m="0"/><Night h="-1" m="0"/>)";
    const Place places[] = {
        {"<Beep>@</Beep>", kFailed + " Invalid Beeper " + option},
        {"<CC>@</CC>", kFailed + " Invalid StripCalCode " + option},
        {"<WeekBegin>@</WeekBegin>", kFailed + " Invalid DaysBeginWeek " + option},
        {"<Language Val=\"@\"/>", kFailed + " Invalid Language " + option},
        {R"(<Clock><Val D="6" MM="5" Y="2010" h="@" m="0" s="0"/></Clock>)", clock},
        {R"(<Clock><Val D="6" MM="5" Y="2010" h="7" m="0" s="@"/></Clock>)", clock},
        {"<DevInit>@</DevInit>", kFailed + "Invalid DevInit value ; "},
        {R"(<Schedule Custom="true"><PreB h="@" m="0"/>)" + segments + "</Schedule>",
         kPartial + "Invalid Schedule PreB value ; "},
        {"<Targets><PreMealLow>@</PreMealLow><PreMealHigh>130</PreMealHigh><PostMealLow>80</PostMealLow>"
         "<PostMealHigh>180</PostMealHigh><Hypo>60</Hypo></Targets>",
         kPartial + "Invalid Targets PreMealLow value ; "},
        {"<Insulins><Custom><I Txt=\"New\">@</I></Custom><Favorite/></Insulins>",
         kPartial + "Invalid CustomInsulin at index @ ;", true},
        {"<Insulins><Custom/><Favorite><I>@</I></Favorite></Insulins>",
         kPartial + "Invalid FavoriteInsulin at index @ ;", true},
    };
    const auto writes = [] {
        return sim::callCount("vb_Set_Meter_Option") + sim::callCount("vb_Set_Meter_Clock") +
               sim::callCount("SetInitializedFlag");
    };
    discover(eMorvex);
    for (const Place& place : places) {
        for (const std::string& value : values) {
            SCOPED_TRACE(place.settings.substr(0, 24) + " " + value.substr(0, 24));
            const sim::MeterProfile before = sim::meter();
            const int written = writes();
            ASSERT_EQ(apply(with(place.settings, value)), ME_SUCCESS);
            EXPECT_EQ(report(), with(place.report, detail::Abbreviated(value)));
            sim::MeterProfile after = sim::meter();
            after.clock = before.clock;  // the meter's clock runs on by itself
            EXPECT_TRUE(place.namesOnly ? before.insulinNames == after.insulinNames : before == after);
            EXPECT_EQ(writes(), written);
        }
    }
}

TEST_F(ApplySettings, MeterTextReachesDocumentsAsUtf8AndGoesBackInItsCodePageOrIsRefusedWhole) {
    sim::MeterProfile meter = sim::defaultProfile(eMorvex);
    meter.serial =
        "SN\xE9"
        "42";
    meter.insulinNames[11].bytes = "Caf\xE9\x80\x01";
    meter.oralMedNames[6].bytes = "\x81\x9D";  // bytes the code page leaves undefined
    discover(meter);
    EXPECT_STREQ(parsed(device)->document_element().child("DeviceInfo").child_value("SN"),
                 "SN\xC3\xA9"
                 "42");
    EXPECT_EQ(reportedName("Insulins", 12), "Caf\xC3\xA9\xE2\x82\xAC\xEF\xBF\xBD");
    EXPECT_EQ(reportedName("Pills", 7), "\xC2\x81\xC2\x9D");

    // Accented names are cut at eight characters, never inside one; the serial still matches.
    ASSERT_EQ(apply("<Insulins><Custom><I Txt=\"Cr\xC3\xA8me br\xC3\xBB\">13</I><I Txt=\"\xC3\xA9t\xC3\xA9\">14</I>"
                    "</Custom><Favorite/></Insulins>"
                    "<Pills><Custom><P Txt=\"\xC2\x81\xC2\x9D\">7</P></Custom><Favorite/></Pills>"),
              ME_SUCCESS);
    EXPECT_EQ(report(), kReportOk);
    EXPECT_EQ(sim::meter().insulinNames[12].bytes, "Cr\xE8me br");
    EXPECT_EQ(sim::meter().insulinNames[13].bytes, "\xE9t\xE9");
    EXPECT_EQ(sim::meter().oralMedNames[6].bytes, "\x81\x9D");
    EXPECT_EQ(reportedName("Insulins", 13), "Cr\xC3\xA8me br");

    // A name the code page cannot hold is refused whole.
    for (const char* name : {"\xF0\x9F\x92\x89", "ab\xEF\xBF\xBD"}) {
        ASSERT_EQ(apply(std::string("<Insulins><Custom><I Txt=\"") + name + "\">13</I></Custom><Favorite/></Insulins>"),
                  ME_SUCCESS);
        EXPECT_EQ(report(), kPartial + "Invalid CustomInsulin at index 13 ;") << name;
        EXPECT_EQ(sim::meter().insulinNames[12].bytes, "Cr\xE8me br");
    }
}

}  // namespace
