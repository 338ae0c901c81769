// `varnel caps`, run as a user runs it.
#include <gtest/gtest.h>

#include <string>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

// The names under Settings and Records of a printed capabilities document.
std::string described(const Outcome& r) {
    return childNames(r.out, "DeviceCaps/Settings") + "| " + childNames(r.out, "DeviceCaps/Records");
}

TEST_F(VarnelCommand, CapsDescribesEverythingOrTheNamesAsked) {
    Outcome r = varnel({"caps", "-q", "--sim-type", "4"});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(described(r), "Clock GlucUnit GlucRange GlucErrRange GlucCalib | Gluc ");

    // Refused names are noted after the document; with nothing left the run fails.
    r = varnel({"caps", "-q", "--sim-profile", meter.string(), "--item", "Language", "--item", "Bogus", "--record",
                "Food", "--record", "Visit"});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(described(r), "Language | Food ");
    EXPECT_EQ(r.err, "varnel: Partial success;Bogus is not supported;\n");

    r = varnel({"caps", "-q", "--sim-type", "1", "--record", "HbA1c"});
    EXPECT_EQ(r.status, 17);
    EXPECT_EQ(r.out, "");
    EXPECT_EQ(r.err, "varnel: Operation failed; Invalid XML;HbA1c is not supported;\n");

    r = varnel({"caps", "-q", "--item", "not a name"});
    EXPECT_EQ(r.status, 64);
    EXPECT_NE(r.err.find("--item and --record"), std::string::npos) << r.err;
}

}  // namespace
