// The command as a person meets it: info and the clock warning, the settings round trip,
// exit statuses, and Ctrl-C in the middle of a run.
#include <gtest/gtest.h>
#include <signal.h>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

TEST_F(VarnelCommand, InfoTellsTheMeterInPlainWordsAndWarnsOfAClockThatIsOff) {
    // The test meter's clock stands at 2008-03-07 14:05:09 and holds 2000-2020.
    const struct {
        const char* now;
        const char* warning;  // "" for none
    } cases[] = {
        {"2008-03-07 14:06:09", ""},
        {"2008-03-07 14:15:09", "varnel: warning: the meter clock is off (meter is 00:10:00 behind); "
                                "'varnel clock --sync' sets it to the computer clock\n"},
        {"2031-01-01 10:00:00", "varnel: warning: the meter clock cannot hold today's date (2031-01-01): it accepts "
                                "only 2000-01-01 to 2020-12-31, so its readings carry the meter's own dates\n"},
    };
    for (const auto& c : cases) {
        Now now(c.now);
        // Only --records uploads to count them; the unit is told either way.
        const bool count = &c == &cases[0];
        std::vector<std::string> args{"info", "-q", "--sim-profile", meter.string()};
        if (count) args.push_back("--records");
        const Outcome r = varnel(args);
        ASSERT_EQ(r.status, 0) << r.err;
        EXPECT_EQ(r.err, c.warning) << c.now;
        const auto shown = lines(r.out);
        ASSERT_EQ(shown.size(), 11u) << r.out;
        EXPECT_EQ(shown[5], count ? "Records:        12 of 1000"
                                  : "Records:        not counted ('varnel info --records' counts them by an upload)");
        EXPECT_EQ(shown[6], "Glucose unit:   mg/dL");
        EXPECT_EQ(shown[8], std::string("Computer clock: ") + c.now);
    }
    {
        // A stand-in clock that is no time is said, not replaced by the real one.
        Now bad("2008-02-30 10:00:00");
        const Outcome r = varnel({"info", "-q", "--sim-profile", meter.string()});
        EXPECT_EQ(r.status, 64);
        EXPECT_NE(r.err.find("VARNEL_NOW stands in for the computer clock, but the date 2008-02-30 does not exist"),
                  std::string::npos) << r.err;
    }
    // The same warning comes before an upload, and the upload goes on.
    Now now("2008-03-07 14:25:09");
    const Outcome r = varnel({"readings", "-q", "--sim-profile", meter.string(), "-o", (dir / "log.xml").string()});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.err, "varnel: warning: the meter clock is off (meter is 00:20:00 behind); "
                     "'varnel clock --sync' sets it to the computer clock\n");
}

TEST_F(VarnelCommand, ARefusedClockTimeNamesTheMeterRange) {
    const struct {
        std::vector<std::string> how;
        const char* said;
    } cases[] = {
        // The exports' own form of a time is taken as well.
        {{"--set", "2030-01-01T00:00:00"}, "it cannot be set to 2030-01-01 00:00:00"},
        {{"--sync"}, "it cannot be set to today's date (2031-01-01)"},
    };
    Now now("2031-01-01 10:00:00");
    for (const auto& c : cases) {
        std::vector<std::string> args{"clock", "-q", "--sim-type", "5"};
        args.insert(args.end(), c.how.begin(), c.how.end());
        const Outcome r = varnel(args);
        EXPECT_EQ(r.status, 17);
        // One message, without the component's own line before it.
        EXPECT_EQ(r.err, std::string("varnel: the meter clock accepts only 1996-01-01 to 2026-12-31, so ") + c.said + "\n");
    }
}

// On the type that has every kind of item; the fault sweep writes every type's settings back.
TEST_F(VarnelCommand, SettingsWrittenBackUnchanged) {
    for (const char* name : {"cfg", "writable"}) {
        const std::string file = (dir / (std::string(name) + ".xml")).string();
        std::vector<std::string> get{"settings", "-q", "--sim-type", "7", "-o", file};
        if (name[0] == 'w') get.push_back("--writable");
        ASSERT_EQ(varnel(get).status, 0);
        const Outcome set = varnel({"set", "-q", file, "--sim-type", "7"});
        EXPECT_EQ(set.status, 0) << name << ": " << set.err;
        // The full document brings read-only items, which are skipped and said; the writable one brings none.
        EXPECT_EQ(set.err.find("varnel: skipped the items the meter only reports: "),
                  name[0] == 'c' ? 0 : std::string::npos)
            << name << ": " << set.err;
    }
}

TEST_F(VarnelCommand, ExitStatusesTellUsageFilesAndRequestsApart) {
    Outcome r = varnel({"readngs"});
    EXPECT_EQ(r.status, 64);
    EXPECT_EQ(r.err, "varnel: unknown command 'readngs'; did you mean 'readings'? ('varnel --help' lists the commands)\n");
    // A command's help shows its own examples.
    r = varnel({"caps", "--help"});
    EXPECT_NE(r.out.find("varnel caps --item Clock --record Gluc"), std::string::npos) << r.out;
    EXPECT_EQ(r.out.find("varnel readings"), std::string::npos) << r.out;
    // An output that cannot be written is found before the meter is touched.
    const std::string before = slurp(meter);
    r = varnel({"settings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(), "-o", dir.string()});
    EXPECT_EQ(r.status, 73);
    EXPECT_EQ(r.err, "varnel: cannot write " + dir.string() + ": it is a directory\n");
    EXPECT_EQ(slurp(meter), before);
}

TEST_F(VarnelCommand, ASignalStopsTheRunReleasesTheMeterAndLeavesNoPartialFile) {
    // The full type-7 meter: its upload and erase last long enough to be interrupted.
    const fs::path full = dir / "full.xml";
    auto held = [&] {
        pugi::xml_document doc;
        EXPECT_TRUE(doc.load_file(full.c_str()));
        const pugi::xml_node log = doc.child("meter").child("binaryDatalog");
        return static_cast<std::size_t>(std::distance(log.begin(), log.end()));
    };
    const struct {
        std::vector<std::string> args;
        const char* step;  // the progress label after whose first line the signal is sent
        int signal;
        int status;
        const char* said;
        bool erased;
    } cases[] = {
        {{"readings", "-o", (dir / "log.xml").string()}, "readings ", SIGINT, 130,
         "varnel: interrupted: stopping once the meter finishes its current step\nvarnel: meter released\n", false},
        // An erase under way cannot be called back, and is said to have happened.
        {{"clear", "--yes"}, "clear ", SIGTERM, 143,
         "varnel: the erase had already been sent: meter MVX7001184 is erased\nvarnel: meter released\n", true},
    };
    for (const auto& c : cases) {
        fs::copy_file(VARNEL_SOURCE_DIR "/sim/profiles/type7.xml", full, fs::copy_options::overwrite_existing);
        const std::size_t before = held();
        std::vector<std::string> args = c.args;
        args.insert(args.end(), {"--sim-profile", full.string(), "--sim-save", full.string()});
        Running run(args, dir / "stdout");
        ASSERT_TRUE(run.waitFor(c.step)) << run.seen;
        ::kill(run.pid, c.signal);
        EXPECT_EQ(run.finish(), c.status) << run.seen;
        EXPECT_TRUE(run.seen.ends_with(c.said)) << run.seen;
        EXPECT_EQ(run.seen.find(std::string(c.step) + "100%"), std::string::npos) << run.seen;
        // No output, not even a temporary file; the meter was saved after its release.
        EXPECT_EQ(std::distance(fs::directory_iterator(dir), fs::directory_iterator()), 3) << run.seen;
        EXPECT_EQ(held(), c.erased ? 0u : before);
    }
}

}  // namespace
