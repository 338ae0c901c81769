// The varnel command run as a user runs it, on a small simulated meter, and its all-or-nothing output file.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <regex>

#include "output.h"
#include "support/varnel_command.h"

namespace {

using namespace varnel::cli;
using namespace varnel::test;

TEST_F(VarnelCommand, ReadingsAsXmlOrCsvAndTheMeterErasedOnlyOnceTheyAreSaved) {
    // Discovery of another type writes its device document to the file named.
    ASSERT_EQ(varnel({"discover", "--sim-type", "4", "-o", (dir / "device.xml").string()}).status, 0);
    EXPECT_NE(slurp(dir / "device.xml").find("<SN>QLB4008830</SN>"), std::string::npos);

    const fs::path csv = dir / "log.csv";
    const Outcome r = varnel({"readings", "--csv", "-o", csv.string(), "--clear-after", "--sim-profile", meter.string(),
                              "--sim-save", meter.string()});
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_NE(slurp(csv).find("\n2008-02-15T07:05:09,glucose,glucose,111,mg/dL,"), std::string::npos);
    EXPECT_EQ(savedRecords(), 0u);
    // Progress goes to standard error as plain lines when it is not a terminal, after the clock
    // warning; the erase is told last.
    EXPECT_TRUE(std::regex_match(
        r.err,
        std::regex(
            "clock 100%\nvarnel: warning: [^\n]*\n(readings \\d+%\n)+(clear \\d+%\n)+varnel: readings saved to " +
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

    // A command's help shows its own examples.
    const Outcome help = varnel({"caps", "--help"});
    EXPECT_NE(help.out.find("varnel caps --item Clock --record Gluc"), std::string::npos) << help.out;
    EXPECT_EQ(help.out.find("varnel readings"), std::string::npos) << help.out;
}

// Refused before the meter is touched, in one line that says what is wrong: 64 for a usage, 73 for an
// output that cannot be written. A FIFO nobody reads would hold the command in open, deaf to Ctrl-C; a
// link to a missing file is never replaced by a file.
TEST_F(VarnelCommand, UsageAndOutputsAreRefusedBeforeTheMeterIsTouched) {
    const fs::path fifo = dir / "fifo", dangling = dir / "dangling.xml", missing = dir / "missing" / "log.xml";
    ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
    fs::create_symlink(missing, dangling);
    const std::string m = meter.string();
    const struct {
        std::vector<std::string> args;
        int status;
        std::string said;
    } early[] = {
        {{"discover", "--port", "300"}, 64, "--port: Value 300 not in range 1 to 255 ('varnel discover --help' shows"},
        {{"discover", "--transport", "/nonexistent.so"},
         64,
         "cannot load the transport library /nonexistent.so: cannot open shared object file: No such file or "
         "directory"},
        {{"clock", "--set", "2010-02-30 08:00:00"}, 64, "--set: the date 2010-02-30 does not exist"},
        {{"readings", "--bogus"}, 64, "The following argument was not expected: --bogus"},
        {{"readngs"}, 64, "unknown command 'readngs'; did you mean 'readings'? ('varnel --help' lists the commands)\n"},
        {{"caps", "--item", "not a name"}, 64, "--item and --record take setting and record names"},
        {{"set", (dir / "none.xml").string()}, 64, "FILE: File does not exist"},
        // Erasing needs consent, and --clear-after a file to save to.
        {{"clear"}, 64, "clear erases every reading stored in the meter; run 'varnel clear --yes' to erase"},
        {{"readings", "-o", "-", "--clear-after"}, 64, "--clear-after needs -o naming a regular file"},
        {{"readings", "--unit", "mmol"},
         64,
         "--unit mmol converts the --csv and --json exports; the XML datalog keeps"},
        {{"readings", "-o", missing.string(), "--clear-after"}, 73, "cannot write " + missing.string() + ": directory"},
        {{"settings", "-o", dir.string()}, 73, "cannot write " + dir.string() + ": it is a directory\n"},
        {{"readings", "-o", fifo.string()}, 73, "cannot write " + fifo.string() + ": it is a FIFO"},
        {{"readings", "-o", dangling.string()},
         73,
         "cannot write " + dangling.string() + ": it is a symbolic link to a missing file"},
        {{"readings", "--sim-profile", m, "--sim-save", (dir / "missing" / "m.xml").string()},
         73,
         "cannot write " + dir.string()},
    };
    const std::string before = slurp(meter);
    for (const auto& c : early) {
        std::vector<std::string> args = c.args;
        if (std::ranges::find(args, "--sim-profile") == args.end())
            args.insert(args.end(), {"-q", "--sim-profile", m, "--sim-save", m});
        const Outcome r = varnel(args);
        EXPECT_EQ(r.status, c.status) << c.said;
        EXPECT_EQ(r.err.rfind("varnel: " + c.said, 0), 0u) << r.err;
        EXPECT_EQ(lines(r.err).size(), 1u) << r.err;
    }
    EXPECT_EQ(slurp(meter), before);
    // The file writer refuses them too, whoever calls it.
    for (const fs::path& path : {fifo, dangling}) EXPECT_THROW(writeOutput(path.string(), "x"), OutputError);
    EXPECT_TRUE(fs::is_symlink(dangling));
    EXPECT_FALSE(fs::exists(dir / "missing"));
}

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
         0,
         "Language | Food ",
         "varnel: Partial success;Bogus is not supported;\n"},
        {{"caps", "--sim-type", "1", "--record", "HbA1c"},
         17,
         "",
         "varnel: Operation failed; Invalid XML;HbA1c is not supported;\n"},
        {{"settings", "--sim-type", "4"}, 0, "Clock GlucUnit GlucRange GlucErrRange GlucCalib ", ""},
        {{"settings", "--sim-profile", m, "--item", "Beep", "--item", "Baud"},
         0,
         "Beep ",
         "varnel: Partial success;Baud is not supported;\n"},
        {{"settings", "--sim-profile", m, "--item", "Baud"},
         17,
         "",
         "varnel: Operation failed;Baud is not supported;\n"},
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
}

TEST_F(VarnelCommand, OutputReplacesTheFileWholeOrTouchesNothing) {
    const fs::path file = dir / "log.xml";
    std::ofstream(file) << "old and longer content";
    writeOutput(file.string(), "new");
    EXPECT_EQ(slurp(file), "new");
    // No temporary is left beside it: the directory holds the meter profile and the file.
    EXPECT_EQ(std::distance(fs::directory_iterator(dir), fs::directory_iterator()), 2);

    // Through a link the link stays and its target gets the text.
    fs::create_symlink(file, dir / "link.xml");
    writeOutput((dir / "link.xml").string(), "linked");
    EXPECT_TRUE(fs::is_symlink(dir / "link.xml"));
    EXPECT_EQ(slurp(file), "linked");

    // The replaced file's mode is kept: a file only its owner reads stays so.
    fs::permissions(file, fs::perms::owner_read | fs::perms::owner_write);
    writeOutput(file.string(), "private");
    EXPECT_EQ(fs::status(file).permissions() & fs::perms::all, fs::perms::owner_read | fs::perms::owner_write);

    EXPECT_THROW(writeOutput((dir / "no" / "such.xml").string(), "x"), OutputError);
    EXPECT_FALSE(isReplaceableFile(dir.string()));
    EXPECT_TRUE(isReplaceableFile((dir / "new.xml").string()));
}

}  // namespace
