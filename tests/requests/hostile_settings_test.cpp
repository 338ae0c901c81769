// Settings documents written by hostile or careless clients: values that are
// no number, or no text the meter can hold, are refused item by item and
// leave the meter as it was.
#include <gtest/gtest.h>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct HostileSettings : WrapperTest {
    std::int32_t apply(const std::string& settings) {
        // The serial as the client has it: from the device information document.
        const std::string serial = parsed(device)->document_element().child("DeviceInfo").child_value("SN");
        XMLWrapper cfg = settingsDoc(serial, std::to_string(sim::meter().type), settings);
        fresh();
        if (cfg.IsEmpty()) return ME_INVALID_XMLWRAPPOBJ;
        return wrapper->setDeviceSettings(rec, device, cfg, status);
    }
    // The text of the named custom entry the meter reports for a position.
    std::string reportedName(const char* list, int position) {
        const auto doc = readSettings();
        for (pugi::xml_node n : doc->document_element().child("Settings").child(list).child("Custom").children())
            if (n.text().as_int() == position) return n.attribute("Txt").value();
        return "(no entry)";
    }
};

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

TEST_F(HostileSettings, NonNumbersAreRefusedByEveryReaderAndNeverWritten) {
    // One of each kind the number parser refuses (all of them: tests/util), and numbers beyond 16 bits.
    const std::vector<std::string> values = {"abc",
                                             "1e2",
                                             "0x10",
                                             "\u0661\u0662",
                                             "99999999999999999999",
                                             "40000",
                                             "-32769",
                                             "32767.5",
                                             std::string(10'000'000, '7')};
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

TEST_F(HostileSettings, MeterTextReachesDocumentsAsUtf8AndGoesBackInItsCodePageOrIsRefusedWhole) {
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
