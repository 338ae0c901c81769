// `varnel settings` and `varnel clock`, run as a user runs them.
#include <gtest/gtest.h>
#include <pugixml.hpp>

#include <regex>
#include <string>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

struct SettingsCommand : VarnelCommand {
    Outcome settings(std::vector<std::string> items) const {
        std::vector<std::string> args{"settings", "-q", "--sim-profile", meter.string()};
        for (const std::string& item : items) args.insert(args.end(), {"--item", item});
        return varnel(args);
    }
    static std::vector<std::string> names(const std::string& xml) {
        pugi::xml_document doc;
        EXPECT_TRUE(doc.load_string(xml.c_str())) << xml;
        std::vector<std::string> out;
        for (pugi::xml_node n : doc.child("DeviceSettings").child("Settings").children()) out.push_back(n.name());
        return out;
    }
};

TEST_F(SettingsCommand, PrintsAllItemsOrTheListedOnes) {
    Outcome r = settings({});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(r.err.empty()) << r.err;
    const auto all = names(r.out);
    ASSERT_EQ(all.size(), 19u);
    EXPECT_EQ(all.front(), "Clock");
    EXPECT_EQ(all.back(), "GlucCalib");

    // Refused names are noted after the document; with nothing left the run fails.
    r = settings({"Beep", "Baud"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(names(r.out), std::vector<std::string>{"Beep"});
    EXPECT_EQ(r.err, "varnel: Partial success;Baud is not supported;\n");
    r = settings({"Baud"});
    EXPECT_EQ(r.status, 17);
    EXPECT_TRUE(r.out.empty());
    EXPECT_EQ(r.err, "varnel: Operation failed;Baud is not supported;\n");

    const fs::path file = dir / "settings.xml";
    r = varnel({"settings", "-q", "--sim-type", "4", "-o", file.string()});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(r.out.empty());
    EXPECT_EQ(names(slurp(file)), (std::vector<std::string>{"Clock", "GlucUnit", "GlucRange", "GlucErrRange",
                                                            "GlucCalib"}));
}

TEST_F(SettingsCommand, ClockShowsBothClocksAndTheDifference) {
    const Outcome r = varnel({"clock", "-q", "--sim-type", "5"});
    ASSERT_EQ(r.status, 0) << r.err;
    const auto shown = lines(r.out);
    ASSERT_EQ(shown.size(), 4u) << r.out;
    EXPECT_EQ(shown[0], "Meter clock:    2007-04-02 21:15:30");
    EXPECT_TRUE(std::regex_match(shown[1], std::regex(R"(Computer clock: \d{4}-\d\d-\d\d \d\d:\d\d:\d\d)")));
    // The simulated meter's clock is years behind any computer running this test.
    EXPECT_TRUE(std::regex_match(shown[2], std::regex(R"(Difference:     meter is \d+ days \d\d:\d\d:\d\d behind)")))
        << shown[2];
    EXPECT_EQ(shown[3], "Meter accepts:  1996-01-01 to 2026-12-31");

    EXPECT_EQ(varnel({"clock", "-q", "--port", "3"}).status, 13);
}

}  // namespace
