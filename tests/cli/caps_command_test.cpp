// `varnel caps`, run as a user runs it.
#include <gtest/gtest.h>
#include <pugixml.hpp>

#include <string>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

struct CapsCommand : VarnelCommand {
    // The names under Settings and Records of a printed capabilities document.
    static std::string described(const Outcome& r) {
        pugi::xml_document doc;
        EXPECT_TRUE(doc.load_string(r.out.c_str())) << r.out;
        std::string out;
        for (const char* section : {"Settings", "Records"}) {
            for (pugi::xml_node n : doc.child("DeviceCaps").child(section).children()) out += std::string(n.name()) + " ";
            out += "| ";
        }
        return out;
    }
};

TEST_F(CapsCommand, DescribesEverythingOrTheNamesAsked) {
    Outcome all = varnel({"caps", "-q", "--sim-type", "4"});
    ASSERT_EQ(all.status, 0) << all.err;
    EXPECT_EQ(described(all), "Clock GlucUnit GlucRange GlucErrRange GlucCalib | Gluc | ");

    Outcome some = varnel({"caps", "-q", "--sim-profile", meter.string(), "--item", "Language", "--item", "Bogus",
                           "--record", "Food", "--record", "Visit"});
    ASSERT_EQ(some.status, 0) << some.err;
    EXPECT_EQ(described(some), "Language | Food | ");
    EXPECT_EQ(lines(some.err), std::vector<std::string>{"varnel: Partial success;Bogus is not supported;"});
}

TEST_F(CapsCommand, NothingDescribableFailsWithTheCode) {
    Outcome none = varnel({"caps", "-q", "--sim-type", "1", "--record", "HbA1c"});
    EXPECT_EQ(none.status, 17);
    EXPECT_EQ(none.out, "");
    EXPECT_EQ(lines(none.err),
              std::vector<std::string>{"varnel: Operation failed; Invalid XML;HbA1c is not supported;"});

    Outcome unusable = varnel({"caps", "-q", "--item", "not a name"});
    EXPECT_EQ(unusable.status, 2);
    EXPECT_NE(unusable.err.find("--item and --record"), std::string::npos) << unusable.err;
}

}  // namespace
