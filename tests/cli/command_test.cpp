// The varnel command run as a user runs it, on a small simulated meter.
#include <gtest/gtest.h>
#include <pugixml.hpp>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;
namespace fs = std::filesystem;

TEST_F(VarnelCommand, ReadingsGivesTheWholeDatalogAsXmlOrCsv) {
    pugi::xml_document doc;
    const pugi::xml_node log = readings(doc);
    EXPECT_STREQ(log.child("DeviceInfo").child_value("SN"), "MVX7001184");
    EXPECT_STREQ(log.child("DeviceInfo").child_value("TypeID"), "7");
    const pugi::xml_node counts = log.child("TransferDetail").child("Records");
    EXPECT_EQ(counts.child("Total").text().as_int(), kRecords);
    EXPECT_EQ(counts.child("Valid").text().as_int(), kRecords);
    const pugi::xml_node first = log.child("Records").first_child();
    EXPECT_STREQ(first.name(), "Gluc");
    EXPECT_STREQ(first.attribute("Val").value(), "111");
    EXPECT_STREQ(first.attribute("Y").value(), "2008");
    std::size_t entries = 0;
    for (auto e : log.child("Records").children()) entries += !!e;
    EXPECT_GT(entries, 0u);

    const Outcome csv = varnel({"readings", "--csv", "--sim-profile", meter.string()});
    ASSERT_EQ(csv.status, 0) << csv.err;
    const auto rows = lines(csv.out);
    ASSERT_EQ(rows.size(), entries + 1);
    EXPECT_EQ(rows[0], "date-time,kind,value,unit,slot,comments");
    EXPECT_EQ(rows[1].rfind("2008-02-15 07:05:09,Glucose,111,mg/dL,", 0), 0u) << rows[1];
    EXPECT_NE(csv.out.find(",Insulin injection,14.5,Units,"), std::string::npos) << csv.out;
    // Progress goes to standard error, as rising plain lines when it is not a terminal.
    int last = 0;
    ASSERT_FALSE(lines(csv.err).empty());
    for (const std::string& line : lines(csv.err)) {
        int percent = 0;
        ASSERT_EQ(std::sscanf(line.c_str(), "readings %d%%", &percent), 1) << line;
        EXPECT_GT(percent, last);
        last = percent;
    }
}

TEST_F(VarnelCommand, DiscoverDescribesTheSelectedSimulatedMeter) {
    const Outcome r = varnel({"discover", "--sim-type", "4", "-o", (dir / "device.xml").string()});
    ASSERT_EQ(r.status, 0) << r.err;
    pugi::xml_document doc;
    ASSERT_TRUE(doc.load_file((dir / "device.xml").c_str()));
    const pugi::xml_node info = doc.child("Device").child("DeviceInfo");
    EXPECT_STREQ(info.child_value("TypeID"), "4");
    EXPECT_STREQ(info.child_value("SN"), "QLB4008830");
    EXPECT_STREQ(info.child("CommState").attribute("Txt").value(), "Off");
    EXPECT_STREQ(doc.child("Device").child("PortInfo").child_value("PortID"), "1");
    EXPECT_TRUE(r.out.empty());
}

TEST_F(VarnelCommand, FailuresSayWhyInOneLineAndExitWithTheCode) {
    const Outcome none = varnel({"discover", "-q", "--port", "5"});
    EXPECT_EQ(none.status, 13);  // ME_NO_DEVICE made positive
    EXPECT_EQ(none.err, "varnel: No device found ; No meter detected on port 5\n");
    EXPECT_TRUE(none.out.empty());

    std::ofstream(dir / "broken.xml") << "<meter type=\"12\"/>";
    const Outcome profile = varnel({"readings", "-q", "--sim-profile", (dir / "broken.xml").string()});
    EXPECT_EQ(profile.status, 64);
    ASSERT_EQ(lines(profile.err).size(), 1u) << profile.err;
    EXPECT_NE(profile.err.find("cannot load the simulated meter profile"), std::string::npos) << profile.err;
    EXPECT_NE(profile.err.find("type"), std::string::npos) << "the simulator's reason is missing: " << profile.err;

    const Outcome foreign = varnel({"discover", "-q", "--transport", VARNEL_LIBRARY_PATH, "--sim-type", "2"});
    EXPECT_EQ(foreign.status, 64);
    EXPECT_NE(foreign.err.find("vxsim_select_type"), std::string::npos) << foreign.err;
}

TEST_F(VarnelCommand, ErasingNeedsConsentAndNeverLosesReadings) {
    const std::string before = slurp(meter);
    const Outcome refused = varnel({"clear", "--sim-profile", meter.string(), "--sim-save", meter.string()});
    EXPECT_EQ(refused.status, 2);
    EXPECT_NE(refused.err.find("--yes"), std::string::npos) << refused.err;
    EXPECT_EQ(slurp(meter), before);

    // An output that cannot be written leaves the meter as it was.
    const std::string lost = (dir / "missing" / "log.xml").string();
    const Outcome failed = varnel({"readings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(),
                               "-o", lost, "--clear-after"});
    EXPECT_EQ(failed.status, 64);
    pugi::xml_document kept;
    EXPECT_EQ(readings(kept).child("TransferDetail").child("Records").child("Total").text().as_int(), kRecords);

    EXPECT_EQ(varnel({"readings", "-q", "-o", "-", "--clear-after"}).status, 2);

    const fs::path saved = dir / "log.xml";
    const Outcome moved = varnel({"readings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(),
                              "-o", saved.string(), "--clear-after"});
    ASSERT_EQ(moved.status, 0) << moved.err;
    pugi::xml_document file;
    ASSERT_TRUE(file.load_file(saved.c_str()));
    EXPECT_EQ(file.child("Datalog").child("TransferDetail").child("Records").child("Total").text().as_int(),
              kRecords);
    pugi::xml_document after;
    const pugi::xml_node empty = readings(after);
    EXPECT_EQ(empty.child("TransferDetail").child("Records").child("Total").text().as_int(), 0);
    EXPECT_FALSE(empty.child("Records").first_child());
}

}  // namespace
