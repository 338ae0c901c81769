// The varnel command run as a user runs it, on a small simulated meter.
#include <gtest/gtest.h>

#include <regex>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

TEST_F(VarnelCommand, ReadingsAsXmlOrCsvAndTheMeterErasedOnlyOnceTheyAreSaved) {
    // Erasing needs consent, and --clear-after a file to save to; neither run touches the meter.
    const std::string before = slurp(meter);
    Outcome r = varnel({"clear", "--sim-profile", meter.string(), "--sim-save", meter.string()});
    EXPECT_EQ(r.status, 64);
    EXPECT_NE(r.err.find("--yes"), std::string::npos) << r.err;
    EXPECT_EQ(varnel({"readings", "-q", "-o", "-", "--clear-after", "--sim-save", meter.string()}).status, 64);
    EXPECT_EQ(slurp(meter), before);
    // An output that cannot be written leaves the meter as it was.
    r = varnel({"readings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(), "-o",
                (dir / "missing" / "log.xml").string(), "--clear-after"});
    EXPECT_EQ(r.status, 73);
    EXPECT_EQ(savedRecords(), std::size_t{kRecords});

    // Discovery of another type writes its device document to the file named.
    ASSERT_EQ(varnel({"discover", "--sim-type", "4", "-o", (dir / "device.xml").string()}).status, 0);
    EXPECT_NE(slurp(dir / "device.xml").find("<SN>QLB4008830</SN>"), std::string::npos);

    const fs::path csv = dir / "log.csv";
    r = varnel({"readings", "--csv", "-o", csv.string(), "--clear-after", "--sim-profile", meter.string(), "--sim-save",
                meter.string()});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_NE(slurp(csv).find("\n2008-02-15T07:05:09,glucose,glucose,111,mg/dL,"), std::string::npos);
    EXPECT_EQ(savedRecords(), 0u);
    // Progress goes to standard error as plain lines when it is not a terminal, after the clock
    // warning; the erase is told last.
    EXPECT_TRUE(std::regex_match(r.err, std::regex("clock 100%\nvarnel: warning: [^\n]*\n(readings \\d+%\n)+(clear \\d+%\n)+varnel: readings saved to " +
                                                   csv.string() + "; meter MVX7001184 erased\n")))
        << r.err;
}

TEST_F(VarnelCommand, FailuresSayWhyInOneLineAndExitWithTheCode) {
    const Outcome none = varnel({"discover", "-q", "--port", "5"});
    EXPECT_EQ(none.status, 13);  // ME_NO_DEVICE made positive
    EXPECT_EQ(none.err, "varnel: No device found ; No meter detected on port 5\n");
    EXPECT_TRUE(none.out.empty());

    std::ofstream(dir / "broken.xml") << "<meter type=\"12\"/>";
    const Outcome profile = varnel({"readings", "-q", "--sim-profile", (dir / "broken.xml").string()});
    EXPECT_EQ(profile.status, 74);
    // One line, with the simulator's reason.
    EXPECT_TRUE(std::regex_match(profile.err, std::regex("varnel: cannot load the simulated meter profile .*type.*\n")))
        << profile.err;

    const Outcome foreign = varnel({"discover", "-q", "--transport", VARNEL_LIBRARY_PATH, "--sim-type", "2"});
    EXPECT_EQ(foreign.status, 74);
    EXPECT_NE(foreign.err.find("vxsim_select_type"), std::string::npos) << foreign.err;

    // Refused before any meter is touched, in one line that says what is wrong.
    const struct {
        std::vector<std::string> args;
        int status;
        std::string said;
    } early[] = {
        {{"discover", "--port", "300"}, 64, "--port: Value 300 not in range 1 to 255 ('varnel discover --help' shows"},
        {{"discover", "--transport", "/nonexistent.so"}, 64,
         "cannot load the transport library /nonexistent.so: cannot open shared object file: No such file or directory"},
        {{"readings", "--sim-save", (dir / "missing" / "m.xml").string()}, 73, "cannot write " + dir.string()},
        {{"clock", "--set", "2010-02-30 08:00:00"}, 64, "--set: the date 2010-02-30 does not exist"},
        {{"readings", "--bogus"}, 64, "The following argument was not expected: --bogus"},
    };
    for (const auto& c : early) {
        const Outcome r = varnel(c.args);
        EXPECT_EQ(r.status, c.status) << c.said;
        EXPECT_EQ(r.err.rfind("varnel: " + c.said, 0), 0u) << r.err;
        EXPECT_EQ(lines(r.err).size(), 1u) << r.err;
    }
}

}  // namespace
