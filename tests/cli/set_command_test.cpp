// `varnel set` and `varnel clock --sync`, run as a user runs them.
#include <gtest/gtest.h>
#include <pugixml.hpp>

#include <cstdlib>
#include <ctime>
#include <fstream>
#include <string>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

struct SetCommand : VarnelCommand {
    fs::path config(const std::string& settings) const {
        const fs::path path = dir / "cfg.xml";
        std::ofstream(path) << "<DeviceSettings><DeviceInfo><SN>MVX7001184</SN><TypeID>7</TypeID></DeviceInfo>"
                            << "<Settings>" << settings << "</Settings></DeviceSettings>\n";
        return path;
    }
    Outcome set(const fs::path& cfg) const {
        return varnel({"set", "-q", cfg.string(), "--sim-profile", meter.string(), "--sim-save", meter.string()});
    }
    std::string savedOption(int code) const {
        pugi::xml_document doc;
        EXPECT_TRUE(doc.load_file(meter.c_str()));
        return doc.child("meter").child("options").find_child_by_attribute("option", "code", std::to_string(code).c_str())
            .attribute("value")
            .value();
    }
};

TEST_F(SetCommand, WritesTheDocumentAndExitsWithItsOutcome) {
    const fs::path cfg = config("<Beep>0</Beep><Targets><PreMealLow>75</PreMealLow><PreMealHigh>140</PreMealHigh>"
                                "<PostMealLow>85</PostMealLow><PostMealHigh>170</PostMealHigh><Hypo>65</Hypo></Targets>");
    Outcome r = set(cfg);
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "Wrote the settings of " + cfg.string() + " to meter MVX7001184 on port 1.\n");
    EXPECT_EQ(savedOption(1), "1");  // the document's "off" is the meter's 1
    pugi::xml_document saved;
    ASSERT_TRUE(saved.load_file(meter.c_str()));
    EXPECT_STREQ(saved.child("meter").child("targets").attribute("hypo").value(), "65");

    r = set(config("<Beep>1</Beep><CC>99</CC>"));
    EXPECT_EQ(r.status, 31);
    EXPECT_EQ(r.err, "varnel: Partial success; Invalid StripCalCode value ;Bad parameter passed to the function;\n");
    EXPECT_TRUE(r.out.empty());
    EXPECT_EQ(savedOption(1), "0");

}

TEST_F(SetCommand, RefusesAFileThatIsNoDocumentBeforeTouchingTheMeter) {
    std::ofstream(dir / "broken.xml") << "<DeviceSettings><Settings>";
    const std::string before = slurp(meter);
    Outcome r = set(dir / "broken.xml");
    EXPECT_EQ(r.status, 2);
    EXPECT_EQ(r.err.rfind("varnel: " + (dir / "broken.xml").string() + ": not an XML document", 0), 0u) << r.err;
    EXPECT_EQ(set(dir / "missing.xml").status, 2);
    EXPECT_EQ(slurp(meter), before);
}

TEST_F(SetCommand, ClockSyncWritesTheComputerClockThroughTheSettingsRequest) {
    // Type 7 keeps its clock within 2000-2020, so today's date is refused.
    Outcome r = varnel({"clock", "-q", "--sync", "--sim-type", "7"});
    EXPECT_EQ(r.status, 17);
    EXPECT_EQ(r.err, "varnel: Operation failed;Invalid DeviceClock year value ; \n");

    const std::time_t now = std::time(nullptr);
    std::tm local{};
    localtime_r(&now, &local);
    if (local.tm_year + 1900 > 2026) GTEST_SKIP() << "no simulated meter keeps this year";
    r = varnel({"clock", "-q", "--sync", "--sim-type", "5", "--sim-save", meter.string()});
    ASSERT_EQ(r.status, 0) << r.err;
    pugi::xml_document saved;
    ASSERT_TRUE(saved.load_file(meter.c_str()));
    std::tm meterTime{};
    ASSERT_NE(strptime(saved.child("meter").attribute("clock").value(), "%Y-%m-%d %H:%M:%S", &meterTime), nullptr);
    meterTime.tm_isdst = -1;
    EXPECT_LE(std::abs(std::difftime(std::mktime(&meterTime), now)), 5.0);
}

}  // namespace
