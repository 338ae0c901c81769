// Settings documents written by hostile or careless clients: values that are
// no number, or no text the meter can hold, are refused item by item and
// leave the meter as it was.
#include <gtest/gtest.h>

#include <functional>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct HostileSettings : WrapperTest {
    std::int32_t apply(const std::string& settings) {
        XMLWrapper cfg;
        // The serial as the client has it: from the device information document.
        const std::string serial = parsed(device)->document_element().child("DeviceInfo").child_value("SN");
        fresh();
        if (!cfg.LoadXML("<DeviceSettings><DeviceInfo><SN>" + serial + "</SN><TypeID>" +
                         std::to_string(sim::meter().type) + "</TypeID></DeviceInfo><Settings>" + settings +
                         "</Settings></DeviceSettings>"))
            return ME_INVALID_XMLWRAPPOBJ;
        return wrapper->setDeviceSettings(rec, device, cfg, status);
    }
    // The text of the named custom entry the meter reports for a position.
    std::string reportedName(const char* list, int position) {
        XMLWrapper cfg = newDoc(doc_kind::device_settings);
        bool checked = false;
        fresh();
        EXPECT_EQ(wrapper->getDeviceSettings(rec, device, cfg, true, status, checked), ME_SUCCESS);
        const auto doc = parsed(cfg);
        for (pugi::xml_node n : doc->document_element().child("Settings").child(list).child("Custom").children())
            if (n.text().as_int() == position) return n.attribute("Txt").value();
        return "(no entry)";
    }
};

const std::string kFailed = "-17/-17/Operation failed;";
const std::string kPartial = "-31/-31/Partial success;";  // the group was still saved with what was valid

// Where a number is read, how to put a value there, and what refusing it reports.
struct Place {
    const char* what;
    std::function<std::string(const std::string&)> settings;
    std::function<std::string(const std::string&)> report;
    // Part of the meter the place may change at all when the value is refused (the whole meter when null).
    std::function<bool(const sim::MeterProfile&, const sim::MeterProfile&)> same = nullptr;
};

std::string clockWith(const std::string& h, const std::string& s) {
    return "<Clock><Val D=\"6\" MM=\"5\" Y=\"2010\" h=\"" + h + "\" m=\"0\" s=\"" + s + "\"/></Clock>";
}

std::string scheduleWith(const std::string& h) {
    std::string segments = "<PreB h=\"" + h + "\" m=\"0\"/>";
    for (const char* name : {"PostB", "PreL", "PostL", "PreD", "PostD", "Night"})
        segments += std::string("<") + name + " h=\"-1\" m=\"0\"/>";
    return "<Schedule Custom=\"true\">" + segments + "</Schedule>";
}

std::string fixed(const std::string& message) { return kFailed + message; }

TEST_F(HostileSettings, NonNumbersAreRefusedByEveryReaderAndNeverWritten) {
    const std::string tenMegabytes(10'000'000, '7');
    const std::vector<std::string> values = {"abc",
                                             "nan",
                                             "inf",
                                             "1e309",
                                             "1e2",
                                             "0x10",
                                             "1 2",
                                             "\xC2\xA0"
                                             "12",
                                             "12\xC2\xA0",
                                             "+",
                                             "-",
                                             ".",
                                             "1.2.3",
                                             "\xC3\xA9",
                                             "\xD9\xA1\xD9\xA2",  // Arabic-Indic twelve
                                             "99999999999999999999",
                                             tenMegabytes};
    const auto names = [](const sim::MeterProfile& a, const sim::MeterProfile& b) {
        return a.insulinNames == b.insulinNames;
    };
    const Place places[] = {
        {"Beep", [](auto& v) { return "<Beep>" + v + "</Beep>"; },
         [](auto&) { return fixed(" Invalid Beeper value ;Operation failed;"); }},
        {"CC", [](auto& v) { return "<CC>" + v + "</CC>"; },
         [](auto&) { return fixed(" Invalid StripCalCode value ;Operation failed;"); }},
        {"WeekBegin", [](auto& v) { return "<WeekBegin>" + v + "</WeekBegin>"; },
         [](auto&) { return fixed(" Invalid DaysBeginWeek value ;Operation failed;"); }},
        {"Language", [](auto& v) { return "<Language Val=\"" + v + "\"/>"; },
         [](auto&) { return fixed(" Invalid Language value ;Operation failed;"); }},
        {"clock hour", [](auto& v) { return clockWith(v, "0"); },
         [](auto&) { return fixed("Invalid DeviceClock value ; "); }},
        {"clock second", [](auto& v) { return clockWith("7", v); },
         [](auto&) { return fixed("Invalid DeviceClock value ; "); }},
        {"DevInit", [](auto& v) { return "<DevInit>" + v + "</DevInit>"; },
         [](auto&) { return fixed("Invalid DevInit value ; "); }},
        {"schedule", [](auto& v) { return scheduleWith(v); },
         [](auto&) { return kPartial + "Invalid Schedule PreB value ; "; }},
        {"targets",
         [](auto& v) {
             return "<Targets><PreMealLow>" + v +
                    "</PreMealLow><PreMealHigh>130</PreMealHigh>"
                    "<PostMealLow>80</PostMealLow><PostMealHigh>180</PostMealHigh><Hypo>60</Hypo></Targets>";
         },
         [](auto&) { return kPartial + "Invalid Targets PreMealLow value ; "; }},
        {"custom insulin",
         [](auto& v) { return "<Insulins><Custom><I Txt=\"New\">" + v + "</I></Custom><Favorite/></Insulins>"; },
         [](auto& v) { return kPartial + "Invalid CustomInsulin at index " + detail::Abbreviated(v) + " ;"; }, names},
        {"favourite insulin",
         [](auto& v) { return "<Insulins><Custom/><Favorite><I>" + v + "</I></Favorite></Insulins>"; },
         [](auto& v) { return kPartial + "Invalid FavoriteInsulin at index " + detail::Abbreviated(v) + " ;"; }, names},
    };
    discover(eMorvex);
    for (const Place& place : places) {
        for (const std::string& value : values) {
            SCOPED_TRACE(std::string(place.what) + " " + value.substr(0, 24));
            const sim::MeterProfile before = sim::meter();
            const auto writes = [] {
                return sim::callCount("vb_Set_Meter_Option") + sim::callCount("vb_Set_Meter_Clock") +
                       sim::callCount("SetInitializedFlag");
            };
            const int written = writes();
            ASSERT_EQ(apply(place.settings(value)), ME_SUCCESS);
            EXPECT_EQ(report(), place.report(value));
            sim::MeterProfile after = sim::meter();
            after.clock = before.clock;  // the meter's clock runs on by itself
            EXPECT_TRUE(place.same ? place.same(before, after) : before == after);
            EXPECT_EQ(writes(), written);
        }
    }
}

TEST_F(HostileSettings, OptionValuesBeyondSixteenBitsAreRefusedNotRaised) {
    discover(eCVPellis);
    const sim::MeterProfile before = sim::meter();
    ASSERT_EQ(apply("<InsPrompt>40000</InsPrompt><Beep>-32769</Beep><CC>32767.5</CC>"), ME_SUCCESS);
    EXPECT_EQ(report(), kFailed +
                            " Invalid StripCalCode value ;Operation failed; Invalid Beeper value ;Operation failed;"
                            " Invalid InsPrompt value ;Operation failed;");
    EXPECT_TRUE(before == sim::meter());
    EXPECT_EQ(completions, 1);
}

TEST_F(HostileSettings, NamesTheMeterCannotHoldAreRefusedWhole) {
    discover(eMorvex);
    const std::string kept = sim::meter().insulinNames[11].bytes;
    for (const char* name : {"\xF0\x9F\x92\x89", "\xE8\x83\xB0\xE5\xB3\xB6", "ab\xEF\xBF\xBD",
                             "\xC5\x81\xC3\xB3"
                             "d\xC5\xBA"}) {
        SCOPED_TRACE(name);
        ASSERT_EQ(apply(std::string("<Insulins><Custom><I Txt=\"") + name + "\">12</I></Custom><Favorite/></Insulins>"),
                  ME_SUCCESS);
        EXPECT_EQ(report(), kPartial + "Invalid CustomInsulin at index 12 ;");
        EXPECT_EQ(sim::meter().insulinNames[11].bytes, kept);
    }
    // Bytes that are not UTF-8 never reach the meter, whether the loader or the item refuses them.
    for (const char* name : {"\xE9t\xE9", "ab\xC3", "\xC0\xAF"}) {
        SCOPED_TRACE(name);
        if (apply(std::string("<Insulins><Custom><I Txt=\"") + name + "\">12</I></Custom><Favorite/></Insulins>") ==
            ME_SUCCESS) {
            EXPECT_EQ(report(), kPartial + "Invalid CustomInsulin at index 12 ;");
        }
        EXPECT_EQ(sim::meter().insulinNames[11].bytes, kept);
    }
}

TEST_F(HostileSettings, MeterTextReachesDocumentsAsUtf8AndGoesBackInItsCodePage) {
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
}

}  // namespace
