// `varnel caps` and `varnel settings`, run as a user runs them.
#include <gtest/gtest.h>

#include <regex>
#include <string>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

TEST_F(VarnelCommand, CapsAndSettingsDescribeEverythingOrTheNamesAsked) {
    const std::string m = meter.string();
    // Refused names are noted after the document; with nothing left the run fails.
    const struct {
        std::vector<std::string> args;
        int status;
        const char* names;  // under Settings, then "| " and under Records for caps
        const char* err;
    } cases[] = {
        {{"caps", "--sim-type", "4"}, 0, "Clock GlucUnit GlucRange GlucErrRange GlucCalib | Gluc ", ""},
        {{"caps", "--sim-profile", m, "--item", "Language", "--item", "Bogus", "--record", "Food", "--record", "Visit"},
         0, "Language | Food ", "varnel: Partial success;Bogus is not supported;\n"},
        {{"caps", "--sim-type", "1", "--record", "HbA1c"}, 17, "",
         "varnel: Operation failed; Invalid XML;HbA1c is not supported;\n"},
        {{"settings", "--sim-type", "4"}, 0, "Clock GlucUnit GlucRange GlucErrRange GlucCalib ", ""},
        {{"settings", "--sim-profile", m, "--item", "Beep", "--item", "Baud"}, 0, "Beep ",
         "varnel: Partial success;Baud is not supported;\n"},
        {{"settings", "--sim-profile", m, "--item", "Baud"}, 17, "", "varnel: Operation failed;Baud is not supported;\n"},
    };
    for (const auto& c : cases) {
        auto args = c.args;
        args.insert(args.begin() + 1, "-q");
        const Outcome r = varnel(args);
        SCOPED_TRACE(args[0] + " " + args[3]);
        EXPECT_EQ(r.status, c.status) << r.err;
        EXPECT_EQ(r.err, c.err);
        const std::string names = args[0] == "caps" ? childNames(r.out, "DeviceCaps/Settings") + "| " +
                                                          childNames(r.out, "DeviceCaps/Records")
                                                    : childNames(r.out, "DeviceSettings/Settings");
        EXPECT_EQ(c.status ? r.out : names, c.names);
    }
    EXPECT_EQ(varnel({"caps", "-q", "--item", "not a name"}).status, 64);
}

TEST_F(VarnelCommand, ClockSyncSetsTheMeterToTheComputerClockAndShowsBoth) {
    // Type 5 keeps its clock within 1996-2026; a later "now" is refused (see person_test).
    Now now("2026-06-01 12:00:00");
    const Outcome r = varnel({"clock", "-q", "--sync", "--sim-type", "5"});
    ASSERT_EQ(r.status, 0) << r.err;
    // The clocks are shown after the sync, read back from the meter.
    EXPECT_TRUE(std::regex_match(r.out, std::regex("Meter clock:    2026-06-01 12:00:0\\d\nComputer clock: 2026-06-01 "
                                                   "12:00:00\nDifference:     (none, the clocks agree|meter is "
                                                   "00:00:0\\d ahead)\nMeter accepts:  1996-01-01 to 2026-12-31\n")))
        << r.out;
}

}  // namespace
