// `varnel settings` and `varnel clock`, run as a user runs them.
#include <gtest/gtest.h>

#include <cstdlib>
#include <regex>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

TEST_F(VarnelCommand, SettingsPrintsAllItemsOrTheListedOnes) {
    const fs::path file = dir / "settings.xml";
    Outcome r = varnel({"settings", "-q", "--sim-type", "4", "-o", file.string()});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.out + r.err, "");
    EXPECT_EQ(childNames(slurp(file), "DeviceSettings/Settings"), "Clock GlucUnit GlucRange GlucErrRange GlucCalib ");

    // Refused names are noted after the document; with nothing left the run fails.
    r = varnel({"settings", "-q", "--sim-profile", meter.string(), "--item", "Beep", "--item", "Baud"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(childNames(r.out, "DeviceSettings/Settings"), "Beep ");
    EXPECT_EQ(r.err, "varnel: Partial success;Baud is not supported;\n");
    r = varnel({"settings", "-q", "--sim-profile", meter.string(), "--item", "Baud"});
    EXPECT_EQ(r.status, 17);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "varnel: Operation failed;Baud is not supported;\n");
}

TEST_F(VarnelCommand, ClockShowsBothClocksAndTheDifference) {
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
}

TEST_F(VarnelCommand, ClockSyncSetsTheMeterToTheComputerClock) {
    // Type 5 keeps its clock within 1996-2026; a later "now" is refused (see person_test).
    ::setenv("VARNEL_NOW", "2026-06-01 12:00:00", 1);
    const Outcome r = varnel({"clock", "-q", "--sync", "--sim-type", "5"});
    ::unsetenv("VARNEL_NOW");
    ASSERT_EQ(r.status, 0) << r.err;
    // The clocks are shown after the sync, read back from the meter.
    EXPECT_TRUE(std::regex_search(r.out, std::regex(R"(\nDifference:     (none, the clocks agree|meter is 00:00:0\d ahead)\n)")))
        << r.out;
}

}  // namespace
