// `varnel set`, run as a user runs it.
#include <gtest/gtest.h>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

struct SetCommand : VarnelCommand {
    // `varnel set` with a document holding these settings for the test meter, or with the given file.
    Outcome set(const std::string& settings, fs::path cfg = {}) const {
        if (cfg.empty()) {
            cfg = dir / "cfg.xml";
            std::ofstream(cfg) << "<DeviceSettings><DeviceInfo><SN>MVX7001184</SN><TypeID>7</TypeID></DeviceInfo>"
                               << "<Settings>" << settings << "</Settings></DeviceSettings>\n";
        }
        return varnel({"set", "-q", cfg.string(), "--sim-profile", meter.string(), "--sim-save", meter.string()});
    }
    // The beeper as the meter holds it: 1 is off.
    std::string savedBeep() const {
        pugi::xml_document doc;
        return saved(doc).child("options").find_child_by_attribute("option", "code", "1").attribute("value").value();
    }
};

TEST_F(SetCommand, WritesTheDocumentAndExitsWithItsOutcome) {
    Outcome r = set("<Beep>0</Beep>");
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out, "Wrote the settings of " + (dir / "cfg.xml").string() + " to meter MVX7001184 on port 1.\n");
    EXPECT_EQ(savedBeep(), "1");

    // A refused setting: the others are still written, the report is the one line said.
    r = set("<Beep>1</Beep><CC>99</CC>");
    EXPECT_EQ(r.status, 31);
    EXPECT_EQ(r.err, "varnel: Partial success; Invalid StripCalCode value ;Bad parameter passed to the function;\n");
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(savedBeep(), "0");

    // A file that is no document is refused before the meter is touched.
    std::ofstream(dir / "broken.xml") << "<DeviceSettings><Settings>";
    const std::string before = slurp(meter);
    r = set("", dir / "broken.xml");
    EXPECT_EQ(r.status, 65);
    EXPECT_EQ(r.err.rfind("varnel: " + (dir / "broken.xml").string() + ": not an XML document", 0), 0u) << r.err;
    EXPECT_EQ(set("", dir / "missing.xml").status, 64);
    EXPECT_EQ(slurp(meter), before);
}

}  // namespace
