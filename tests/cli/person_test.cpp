// The command as a person meets it: info and the clock warning, setting the clock, the settings
// round trip, and Ctrl-C in the middle of a run.
#include <gtest/gtest.h>
#include <signal.h>

#include <regex>

#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

TEST_F(VarnelCommand, InfoTellsTheMeterInPlainWordsAndWarnsOfAClockThatIsOff) {
    // The test meter's clock stands at 2008-03-07 14:05:09 and holds 2000-2020.
    const struct {
        const char* now;
        const char* warning;  // standard error, "" for none
    } cases[] = {
        {"2008-03-07 14:06:09", ""},
        {"2008-03-07 14:15:09",
         "varnel: warning: the meter clock is off (meter is 00:10:00 behind); "
         "'varnel clock --sync' sets it to the computer clock\n"},
        {"2031-01-01 10:00:00",
         "varnel: warning: the meter clock cannot hold today's date (2031-01-01): it accepts "
         "only 2000-01-01 to 2020-12-31, so its readings carry the meter's own dates\n"},
        // A stand-in clock that is no time is said, not replaced by the real one.
        {"2008-02-30 10:00:00",
         "varnel: VARNEL_NOW stands in for the computer clock, but the date 2008-02-30 does not exist; unset it or "
         "give a real time\n"},
    };
    for (const auto& c : cases) {
        Now now(c.now);
        // Only --records uploads to count them; the unit is told either way.
        const bool count = &c == &cases[0];
        std::vector<std::string> args{"info", "-q", "--sim-profile", meter.string()};
        if (count) args.push_back("--records");
        const Outcome r = varnel(args);
        EXPECT_EQ(r.err, c.warning) << c.now;
        EXPECT_EQ(r.status, &c == std::end(cases) - 1 ? 64 : 0);
        if (r.status) continue;
        const auto shown = lines(r.out);
        ASSERT_EQ(shown.size(), 11u) << r.out;
        EXPECT_EQ(shown[5], count ? "Records:        12 of 1000"
                                  : "Records:        not counted ('varnel info --records' counts them by an upload)");
        EXPECT_EQ(shown[6], "Glucose unit:   mg/dL");
        EXPECT_EQ(shown[8], std::string("Computer clock: ") + c.now);
    }
}

// Type 5 keeps its clock within 1996-2026.
TEST_F(VarnelCommand, ClockSyncSetsTheMeterToTheComputerClockOrNamesTheMeterRange) {
    const struct {
        const char* now;
        std::vector<std::string> how;
        const char* shown;  // standard output when it succeeds, else standard error
    } cases[] = {
        // The clocks are shown after the sync, read back from the meter.
        {"2026-06-01 12:00:00",
         {"--sync"},
         "Meter clock:    2026-06-01 12:00:0\\d\nComputer clock: 2026-06-01 12:00:00\nDifference:     (none, the "
         "clocks "
         "agree|meter is 00:00:0\\d ahead)\nMeter accepts:  1996-01-01 to 2026-12-31\n"},
        // The exports' own form of a time is taken as well; one message, without the component's own line before it.
        {"2031-01-01 10:00:00",
         {"--set", "2030-01-01T00:00:00"},
         "varnel: the meter clock accepts only 1996-01-01 to "
         "2026-12-31, so it cannot be set to 2030-01-01 00:00:00\n"},
        {"2031-01-01 10:00:00",
         {"--sync"},
         "varnel: the meter clock accepts only 1996-01-01 to 2026-12-31, so it cannot "
         "be set to today's date \\(2031-01-01\\)\n"},
    };
    for (const auto& c : cases) {
        Now now(c.now);
        std::vector<std::string> args{"clock", "-q", "--sim-type", "5"};
        args.insert(args.end(), c.how.begin(), c.how.end());
        const Outcome r = varnel(args);
        const bool synced = &c == &cases[0];
        EXPECT_EQ(r.status, synced ? 0 : 17) << r.err;
        EXPECT_TRUE(std::regex_match(synced ? r.out : r.err, std::regex(c.shown))) << r.out << r.err;
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

TEST_F(VarnelCommand, ASignalStopsTheRunReleasesTheMeterAndLeavesNoPartialFile) {
    const struct {
        std::vector<std::string> args;
        const char* step;  // the progress label after whose first line the signal is sent
        int signal;
        int status;
        const char* said;
        bool erased;
    } cases[] = {
        {{"readings", "-o", (dir / "log.xml").string()},
         "readings ",
         SIGINT,
         130,
         "varnel: interrupted: stopping once the meter finishes its current step\nvarnel: meter released\n",
         false},
        // An erase under way cannot be called back, and is said to have happened.
        {{"clear", "--yes"},
         "clear ",
         SIGTERM,
         143,
         "varnel: the erase had already been sent: meter MVX7001184 is erased\nvarnel: meter released\n",
         true},
    };
    for (const auto& c : cases) {
        // The full type-7 meter: its upload and erase last long enough to be interrupted.
        fs::copy_file(VARNEL_SOURCE_DIR "/sim/profiles/type7.xml", meter, fs::copy_options::overwrite_existing);
        const std::size_t before = savedRecords();
        std::vector<std::string> args = c.args;
        args.insert(args.end(), {"--sim-profile", meter.string(), "--sim-save", meter.string()});
        Running run(args, dir / "stdout");
        ASSERT_TRUE(run.waitFor(c.step)) << run.seen;
        ::kill(run.pid, c.signal);
        EXPECT_EQ(run.finish(), c.status) << run.seen;
        EXPECT_TRUE(run.seen.ends_with(c.said)) << run.seen;
        EXPECT_EQ(run.seen.find(std::string(c.step) + "100%"), std::string::npos) << run.seen;
        // No output, not even a temporary file; the meter was saved after its release.
        EXPECT_EQ(std::distance(fs::directory_iterator(dir), fs::directory_iterator()), 2) << run.seen;
        EXPECT_EQ(savedRecords(), c.erased ? 0u : before);
    }
}

}  // namespace
