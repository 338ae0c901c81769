// The document schemas: they load, carry the project version, accept every
// document the end-to-end runs wrote and the settings documents a client sends
// back, and name the line of what a client got wrong.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <set>
#include <sstream>
#include <string>

#include "document_check.h"
#include "support/wrapper_fixture.h"
#include "varnel/version.h"

namespace varnel::test {
namespace {

namespace fs = std::filesystem;
using cli::DocumentCheck;

const char* const kSchemaDir = VARNEL_SCHEMA_DIR;

DocumentCheck check(const std::string& xml) { return cli::checkDocument(xml, kSchemaDir); }

std::string joined(const std::vector<std::string>& lines) {
    std::string out;
    for (const std::string& l : lines) out += l + "\n";
    return out;
}

TEST(Schemas, EachLoadsAndCarriesTheProjectVersion) {
    for (const char* name :
         {"Common", "Device", "ConnectionInfo", "DeviceSettings", "DeviceCaps", "Datalog", "Filter", "Status"}) {
        SCOPED_TRACE(name);
        pugi::xml_document schema;
        ASSERT_TRUE(schema.load_file((fs::path(kSchemaDir) / (std::string(name) + ".xsd")).c_str()));
        EXPECT_STREQ(schema.document_element().attribute("version").value(), VARNEL_VERSION_STRING);
        // Common.xsd holds the shared types that the others include.
        if (std::string(name) == "Common") continue;
        // A schema that does not compile gives no verdict on a document.
        const DocumentCheck c = check("<" + std::string(name) + "/>");
        EXPECT_TRUE(c.verdict == DocumentCheck::Verdict::valid || c.verdict == DocumentCheck::Verdict::invalid)
            << joined(c.problems);
    }
}

// Every document kept by the end-to-end programs (tests/support/kept_documents.h), which
// CTest runs first: discovery, settings and capabilities in both modes, readings on all
// eight meter types with every kind of entry and HI/LO readings, and the status of every exit.
TEST(Schemas, EveryDocumentTheEndToEndRunsWroteIsValid) {
    const char* dir = std::getenv("VARNEL_KEPT_DOCUMENTS");
    if (!dir) GTEST_SKIP() << "run by CTest after the programs that keep their documents";
    std::map<std::string, int> kinds;
    std::set<std::string> entries;
    std::string failures;
    for (const fs::directory_entry& file : fs::directory_iterator(dir)) {
        std::ostringstream xml;
        xml << std::ifstream(file.path()).rdbuf();
        pugi::xml_document doc;
        doc.load_string(xml.str().c_str());
        const std::string kind = doc.document_element().name();
        ++kinds[kind];
        for (pugi::xml_node e : doc.document_element().child("Records").children()) {
            entries.insert(e.name());
            if (e.attribute("Range")) entries.insert(std::string("Range=") + e.attribute("Range").value());
        }
        const DocumentCheck c = check(xml.str());
        if (c.verdict != DocumentCheck::Verdict::valid)
            failures += file.path().string() + " (" + kind + "):\n" + joined(c.problems);
    }
    EXPECT_EQ(failures, "");
    for (const char* kind : {"Device", "DeviceSettings", "DeviceCaps", "Datalog", "Status"})
        EXPECT_GT(kinds[kind], 0) << "no " << kind << " document was kept";
    // The datalogs hold every kind of entry, so each is checked.
    for (const char* entry : {"Gluc",    "Error",   "Change",       "BP",      "HtWt",       "Choles",   "Ex",
                              "Food",    "Alcohol", "HbA1c",        "HNotes",  "MTDD",       "MBolus",   "Ins",
                              "Ketones", "Visit",   "MicroAlbumin", "OralMed", "Range=High", "Range=Low"})
        EXPECT_EQ(entries.count(entry), 1u) << "no datalog entry " << entry;
}

// The settings document of a type-7 meter (every kind of item), edited as a client edits it.
struct ClientSettings : WrapperTest {
    std::string edited(const std::function<void(pugi::xml_node settings)>& edit) {
        discover(eMorvex);
        XMLWrapper cfg = newDoc(doc_kind::device_settings);
        bool checked = false;
        EXPECT_EQ(wrapper->getDeviceSettings(rec, device, cfg, true, status, checked), ME_SUCCESS);
        pugi::xml_document doc;
        doc.load_string(cfg.XML().c_str());
        edit(doc.child("DeviceSettings").child("Settings"));
        std::ostringstream out;
        doc.save(out, "  ");
        return out.str();
    }
};

struct Edit {
    const char* what;
    std::function<void(pugi::xml_node settings)> edit;
    const char* marker;  // text on the line the problem is reported at; null: the document is valid
};

TEST_F(ClientSettings, RoundTripEditsAreValidAndMistakesAreNamedWithTheirLine) {
    const Edit edits[] = {
        {"as read", [](pugi::xml_node) {}, nullptr},
        {"only what setDeviceSettings reads: read-only items and reading-side attributes left out",
         [](pugi::xml_node s) {
             for (const char* item : {"GlucRange", "GlucErrRange", "GlucCalib"}) s.remove_child(item);
             s.child("Clock").remove_child("Min");
             s.child("Clock").remove_child("Max");
             s.child("Insulins").remove_child("Pre");
             for (pugi::xml_node item : s.children())
                 for (const char* a : {"Mode", "Txt", "Min", "Max"})
                     if (std::string(item.name()) != "Language" || std::string(a) != "Txt") item.remove_attribute(a);
         },
         nullptr},
        {"a misspelt element", [](pugi::xml_node s) { s.child("Beep").set_name("Beeep"); }, "<Beeep"},
        {"an hour out of range", [](pugi::xml_node s) { s.child("Clock").child("Val").attribute("h").set_value("24"); },
         "h=\"24\""},
        {"a wrong coded value", [](pugi::xml_node s) { s.child("GlucUnit").text().set("2"); }, "<GlucUnit"},
    };
    for (const Edit& e : edits) {
        SCOPED_TRACE(e.what);
        const std::string xml = edited(e.edit);
        const DocumentCheck c = check(xml);
        if (!e.marker) {
            EXPECT_EQ(c.verdict, DocumentCheck::Verdict::valid) << joined(c.problems) << xml;
            continue;
        }
        EXPECT_EQ(c.verdict, DocumentCheck::Verdict::invalid);
        ASSERT_FALSE(c.problems.empty());
        ASSERT_NE(xml.find(e.marker), std::string::npos) << xml;
        const auto line = std::count(xml.begin(), xml.begin() + xml.find(e.marker), '\n') + 1;
        EXPECT_EQ(c.problems.front().rfind("line " + std::to_string(line) + ": ", 0), 0u) << joined(c.problems);
    }
}

}  // namespace
}  // namespace varnel::test
