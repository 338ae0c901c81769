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

    // A refused setting: the others are still written; said by element, value and what it takes.
    r = set("<Beep>1</Beep><CC>99</CC>");
    EXPECT_EQ(r.status, 31);
    EXPECT_EQ(r.err,
              "varnel: CC: \"99\" was not written (Bad parameter passed to the function); 'varnel caps --item CC' "
              "shows what it takes\nvarnel: written: Beep; not written: CC\n");
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(savedBeep(), "0");
    // --force sends what its schema refuses; the meter's refusal names the document's own range.
    std::ofstream(dir / "forced.xml")
        << "<DeviceSettings><DeviceInfo><SN>MVX7001184</SN><TypeID>7</TypeID></DeviceInfo>"
           "<Settings><Beep Min=\"0\" Max=\"1\">abc</Beep><CC>5</CC></Settings></DeviceSettings>";
    r = varnel({"set", "-q", "--force", (dir / "forced.xml").string(), "--sim-profile", meter.string()});
    EXPECT_EQ(r.status, 31);
    EXPECT_EQ(r.err,
              "varnel: Beep: \"abc\" was not written (Operation failed); it takes 0 to 1\n"
              "varnel: written: CC; not written: Beep\n");
}

TEST_F(SetCommand, RefusesBeforeTouchingTheMeterWhatValidateRefuses) {
    const std::string head = "<DeviceSettings><DeviceInfo><SN>MVX7001184</SN><TypeID>7</TypeID></DeviceInfo><Settings>";
    const struct {
        std::string text;
        const char* said;
    } cases[] = {
        {head + "<Beeep>0</Beeep></Settings></DeviceSettings>", "cfg.xml: line 1: Element 'Beeep'"},
        {head + "<CC Min=\"1\" Max=\"16\">99</CC></Settings></DeviceSettings>",
         "cfg.xml: line 1: CC 99 is outside its own range 1 to 16"},
        {head + "<Clock><Val D=\"1\" MM=\"1\" Y=\"2030\" h=\"0\" m=\"0\" s=\"0\"/><Min D=\"1\" MM=\"1\" Y=\"2000\"/>"
                "<Max D=\"31\" MM=\"12\" Y=\"2020\"/></Clock></Settings></DeviceSettings>",
         "Clock 2030-01-01 is outside its own range 2000-01-01 to 2020-12-31"},
        {"<DeviceSettings><Settings>", "cfg.xml: not an XML document"},
        {"<Datalog><DeviceInfo/><TransferDetail/><Records/></Datalog>",
         "cfg.xml is a Datalog document, not a DeviceSettings document"},
        // What the component will not read, no schema lets through.
        {"<!DOCTYPE DeviceSettings [<!ENTITY e \"1\">]>" + head + "<Beep>&e;</Beep></Settings></DeviceSettings>",
         "cfg.xml: not an XML document"},
        {"<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?>" + head +
             "<Language Txt=\"Fran\xE7"
             "ais\"/></Settings></DeviceSettings>",
         "cfg.xml: not an XML document"},
    };
    const std::string before = slurp(meter);
    for (const auto& c : cases) {
        std::ofstream(dir / "cfg.xml", std::ios::trunc) << c.text;
        const Outcome r = set("", dir / "cfg.xml");
        EXPECT_EQ(r.status, 65) << c.text;
        EXPECT_NE(r.err.find(c.said), std::string::npos) << r.err;
        EXPECT_EQ(slurp(meter), before) << c.text;
        // Datalog keeps to its own schema; every other file is as wrong for validate.
        if (c.text[1] != 'D') {
            EXPECT_EQ(varnel({"validate", (dir / "cfg.xml").string()}).status, 65) << c.text;
        }
    }
}

// varnel validate: the schema it used, then "valid" or each problem with its line.
TEST_F(VarnelCommand, ValidateNamesTheSchemaAndEachProblemWithItsLine) {
    const struct {
        const char* document;
        const char* output;  // the start of what it prints
        int status;
    } cases[] = {
        {"<Status>\n  <ErrCode><Major>0</Major><Minor>0</Minor></ErrCode>\n  <ErrDesc>ok</ErrDesc>\n</Status>\n",
         "schema Status.xsd\nvalid\n", 0},
        {"<Status>\n  <ErrCod/>\n</Status>\n", "schema Status.xsd\nline 2: Element 'ErrCod'", 65},
        {"<Unknown/>", "", 65},
        {"<Status>", "line 1: ", 65},
    };
    for (const auto& c : cases) {
        std::ofstream(dir / "doc.xml", std::ios::trunc) << c.document;
        const Outcome r = varnel({"validate", (dir / "doc.xml").string()});
        EXPECT_EQ(r.out.rfind(c.output, 0), 0u) << r.out;
        EXPECT_EQ(r.status, c.status) << r.out;
    }
}

}  // namespace
