// Sessions recorded on the simulated meters through libvarnel_record, then
// answered by libvarnel_replay: the component must see the very same session.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "support/client_session.h"
#include "support/temp_dir.h"
#include "support/varnel_command.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/vxcapture.h"
#include "varnel/vxsim.h"
#include "varnel/xml_wrapper.h"

namespace {

namespace fs = std::filesystem;
using varnel::XMLWrapper;
using Lines = std::vector<std::string>;

// A library loaded once for the program; its controls are looked up by name.
struct Library {
    void* handle;
    explicit Library(const char* path) : handle(dlopen(path, RTLD_NOW | RTLD_LOCAL)) {}
    template <class F>
    F* fn(const char* name) const {
        return reinterpret_cast<F*>(dlsym(handle, name));
    }
};
const Library sim(VARNEL_TEST_TRANSPORT_PATH), recorder(VARNEL_RECORD_PATH), replayer(VARNEL_REPLAY_PATH);

using varnel::test::Call;
using varnel::test::newDoc;
using varnel::test::TempDir;
using Steps = std::vector<Call>;

// A virtual clock that also adds up every wait, past the 32-bit wrap.
std::uint64_t slept = 0;
struct CountingClock : varnel::ManualClock {
    using ManualClock::ManualClock;
    void sleep(std::uint32_t ms) override {
        slept += ms;
        ManualClock::sleep(ms);
    }
};

// Runs the calls as a client would, on a fresh virtual clock, and writes down
// everything the client sees: codes, documents, status, progress, completions.
Lines runSession(const std::string& transport, const Steps& steps) {
    slept = 0;
    varnel::setThreadClock(std::make_shared<CountingClock>(1000));
    Lines seen;
    {
        varnel::DllWrapper w(transport);
        w.setOnProgress([&](std::int16_t& p) { seen.push_back("progress " + std::to_string(p)); });
        w.setOnComplete([&] { seen.push_back("complete"); });
        METER_REC rec{};
        XMLWrapper device = newDoc(varnel::doc_kind::device_info), settings;
        for (Call step : steps) {
            XMLWrapper status = newDoc(varnel::doc_kind::status), out = settings;
            std::int32_t code = 0;
            try {
                code = varnel::test::makeCall(w, step, rec, device, status, out);
            } catch (const varnel::ComponentError& e) {
                seen.push_back("unexpected " + std::to_string(e.number()) + " " + e.description());
            }
            if (step == Call::settings) settings = out;  // what a later write sends back
            seen.push_back("step " + std::to_string(int(step)) + " code " + std::to_string(code));
            seen.push_back(status.XML());
            seen.push_back(out.XML());
        }
    }
    varnel::setThreadClock(nullptr);
    return seen;
}

std::string recordError() { return recorder.fn<decltype(vxcap_last_error)>("vxcap_last_error")(); }
std::string replayError() { return replayer.fn<decltype(vxcap_last_error)>("vxcap_last_error")(); }

// Records the steps on the default simulated meter of a type, with an optional fault.
Lines record(int type, const Steps& steps, const fs::path& file, const char* faultFunction = nullptr) {
    sim.fn<decltype(vxsim_select_type)>("vxsim_select_type")(type);
    if (faultFunction) sim.fn<decltype(vxsim_fail_call)>("vxsim_fail_call")(faultFunction, 1, ME_TIME_OUT, 0);
    EXPECT_EQ(
        recorder.fn<decltype(vxcap_record_start)>("vxcap_record_start")(VARNEL_TEST_TRANSPORT_PATH, file.c_str()), 0)
        << recordError();
    Lines seen = runSession(VARNEL_RECORD_PATH, steps);
    EXPECT_EQ(recordError(), "");
    return seen;
}

// Replays a capture under the steps, keeping the recorded times unless `timed` is false;
// `finished` tells whether every recorded call was asked for.
Lines replay(const fs::path& file, const Steps& steps, bool* finished = nullptr, bool timed = true) {
    timed ? ::setenv("VARNEL_REPLAY_TIMING", "recorded", 1) : ::unsetenv("VARNEL_REPLAY_TIMING");
    replayer.fn<decltype(vxcap_replay_start)>("vxcap_replay_start")(file.c_str());
    Lines seen = runSession(VARNEL_REPLAY_PATH, steps);
    const int end = replayer.fn<decltype(vxcap_replay_finish)>("vxcap_replay_finish")();
    if (finished) *finished = end == 0;
    return seen;
}

Lines fileLines(const fs::path& file) { return varnel::test::lines(varnel::test::slurp(file)); }

void writeLines(const fs::path& file, const Lines& lines) {
    std::ofstream out(file, std::ios::trunc);
    for (const std::string& l : lines) out << l << '\n';
}

// What the client saw of a step: "step <n> code <code>".
std::string stepLine(const Lines& seen, Call step) {
    const std::string prefix = "step " + std::to_string(int(step)) + " ";
    for (const std::string& l : seen)
        if (l.rfind(prefix, 0) == 0) return l;
    return "no step";
}

const Steps kFullSession{Call::discover, Call::settings, Call::caps, Call::readings, Call::close};

// Every public request on every simulated type: what the client sees on replay is what it saw
// live. On type 1 the upload fails while recording: the replay fails it again, with the same report.
TEST(Capture, ReplayShowsTheClientTheRecordedSessionOnEveryMeterType) {
    const Steps steps{Call::discover, Call::settings, Call::caps,  Call::setSettings,
                      Call::readings, Call::clear,    Call::close};
    TempDir dir;
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE("type " + std::to_string(type));
        const Lines live = record(type, steps, dir.file("set.jsonl"), type == 1 ? "vb_Upload_Meter_Datalog" : nullptr);
        EXPECT_EQ(stepLine(live, Call::readings), type == 1 ? "step 6 code -2" : "step 6 code 0");
        bool finished = false;
        EXPECT_EQ(replay(dir.file("set.jsonl"), steps, &finished), live);
        EXPECT_TRUE(finished) << replayError();
    }
}

// Each way a replay can part from its capture fails the request and says where, never answering on its own.
TEST(Capture, DivergenceIsReportedNotAnswered) {
    TempDir dir;
    const std::string source = dir.file("source.jsonl"), file = dir.file("case.jsonl");
    const Steps readings{Call::discover, Call::readings, Call::close};
    record(3, readings, source);
    const Lines lines = fileLines(source);
    ASSERT_GT(lines.size(), 10u);

    Lines cut(lines.begin(), lines.end() - 6);
    Lines corrupt = lines;
    corrupt[5] = corrupt[5].substr(0, corrupt[5].size() / 2);
    Lines otherPort = lines;
    for (std::string& l : otherPort)
        if (auto at = l.find("\"ports\":[1,"); at != std::string::npos) l.replace(at, 11, "\"ports\":[2,");
    Lines newer = lines;
    newer[0].replace(newer[0].find("\"version\":1"), 11, "\"version\":2");
    // Hostile lines: each refused with its line, never crashing, narrowing or waiting.
    auto edited = [&](const std::string& key, const std::string& value, bool anyLine = false) {
        Lines out = lines;
        for (std::size_t i = 1; i < out.size(); ++i) {
            const auto at = out[i].find("\"" + key + "\":");
            if (at == std::string::npos || (!anyLine && i != 3)) continue;
            const auto from = at + key.size() + 3, to = out[i].find_first_of(",}]", from);
            out[i].replace(from, to - from, value);
            return out;
        }
        ADD_FAILURE() << "no " << key;
        return out;
    };
    Lines deep = lines;
    deep[3] = std::string(60000, '[') + std::string(60000, ']');
    Lines longLine = lines;
    longLine[3] = "{\"pad\":\"" + std::string(std::size_t(1) << 20, ' ') + "\"}";
    const struct {
        const char* name;
        Lines capture;
        Steps steps;
        const char* says;
    } cases[] = {
        {"readings capture under a settings request",
         lines,
         {Call::discover, Call::settings, Call::close},
         ": expected vb_Upload_Meter_Datalog, came vb_"},
        {"capture cut short", cut, readings, "expected the end of the capture"},
        {"argument going in differs", otherPort, readings,
         "find_meter: expected ports [2,0,0,0,0,0,0,0,0,0,0], came [1,"},
        {"corrupted line", corrupt, readings, "line 6 is not valid JSON"},
        {"newer format version", newer, readings, "format version 2, newer than this replayer reads (1)"},
        {"60,000 nested arrays", deep, readings, "line 4 nests deeper than 16 levels"},
        {"a line past the limit", longLine, readings, "line 4 is longer than 1 MiB"},
        {"ms past 32 bits", edited("ms", "18446744073709551615"), readings, "line 4 has a time (ms) that is no 32-bit"},
        {"yield time past 32 bits", edited("at", "4294967296", true), readings, "has a yield whose time (at) is no 32-bit"},
        {"result past 32 bits", edited("result", "4294967296"), readings, "line 4 has a result that is no 32-bit"},
        {"fromCall past 32 bits", edited("fromCall", "4294967298", true), readings, "refers to no earlier "},
        {"escape sequences in a name", edited("fn", "\"\\u001b]0;owned\\u0007x\""), readings,
         "expected \\x1b]0;owned\\x07x, came "},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        writeLines(file, c.capture);
        const Lines seen = replay(file, c.steps);
        EXPECT_NE(replayError().find(c.says), std::string::npos) << replayError();
        EXPECT_NE(replayError().find(file), std::string::npos);
        EXPECT_EQ(replayError().find_first_of("\x1b\x07"), std::string::npos);
        EXPECT_LT(slept, 1'000'000u);
        // The request that met the divergence failed.
        EXPECT_FALSE(stepLine(seen, c.steps[c.steps.size() - 2]).ends_with(" code 0"));
    }
}

// What a replay reads and waits is bounded: no device or oversized file is read,
// recorded times are kept only when asked, and then at most a minute a call.
TEST(Capture, ReplayReadsAndWaitsWithinItsLimits) {
    const auto start = replayer.fn<decltype(vxcap_replay_start)>("vxcap_replay_start");
    EXPECT_NE(start("/dev/zero"), 0);
    EXPECT_NE(replayError().find("the capture is no regular file"), std::string::npos) << replayError();
    TempDir dir;
    const std::string big = dir.file("big.jsonl", "{}"), file = dir.file("timing.jsonl");
    fs::resize_file(big, (std::uintmax_t(16) << 20) + 1);
    EXPECT_NE(start(big.c_str()), 0);
    EXPECT_NE(replayError().find("larger than 16 MiB"), std::string::npos) << replayError();

    const Steps steps{Call::discover, Call::readings, Call::close};
    const Lines live = record(2, steps, file);
    const std::uint64_t recorded = slept;
    ASSERT_GT(recorded, 1000u);
    EXPECT_EQ(replay(file, steps), live);
    EXPECT_EQ(slept, recorded);
    bool finished = false;
    replay(file, steps, &finished, false);
    EXPECT_TRUE(finished) << replayError();
    EXPECT_LT(slept, recorded);  // the component's own waits only

    Lines lines = fileLines(file);
    for (std::string& l : lines)
        if (auto at = l.find("\"ms\":"); at != std::string::npos && l.find("\"yields\"") == std::string::npos)
            l.replace(at + 5, l.find_first_of(",}", at) - at - 5, "4294967295");
    writeLines(file, lines);
    replay(file, steps, &finished);
    EXPECT_TRUE(finished) << replayError();
    EXPECT_LE(slept, lines.size() * 60'000u);
}

// The recorder refuses to record a capture library, writes captures for their owner
// alone, and still releases the meter once the capture cannot be written.
TEST(Capture, RecorderGuardsItsFileAndTheMeter) {
    const auto start = recorder.fn<decltype(vxcap_record_start)>("vxcap_record_start");
    TempDir dir;
    const std::string file = dir.file("guarded.jsonl", "an older capture");
    for (const char* library : {VARNEL_RECORD_PATH, VARNEL_REPLAY_PATH}) {
        EXPECT_NE(start(library, file.c_str()), 0);
        EXPECT_NE(recordError().find("is a capture library itself"), std::string::npos) << recordError();
    }
    fs::permissions(file, fs::perms(0644));
    record(1, {Call::discover, Call::close}, file);
    EXPECT_EQ(fs::status(file).permissions() & fs::perms::all, fs::perms::owner_read | fs::perms::owner_write);

    // The disk fills after the header: nothing more is recorded, but close_meter still reaches the meter.
    rlimit saved{};
    ::getrlimit(RLIMIT_FSIZE, &saved);
    const auto oldHandler = std::signal(SIGXFSZ, SIG_IGN);
    rlimit small = saved;
    small.rlim_cur = 600;
    ::setrlimit(RLIMIT_FSIZE, &small);
    ASSERT_EQ(start(VARNEL_TEST_TRANSPORT_PATH, file.c_str()), 0) << recordError();
    const Lines seen = runSession(VARNEL_RECORD_PATH, {Call::discover, Call::close});
    ::setrlimit(RLIMIT_FSIZE, &saved);
    std::signal(SIGXFSZ, oldHandler);
    EXPECT_NE(recordError().find("cannot write the capture file"), std::string::npos) << recordError();
    EXPECT_NE(recordError().find("close_meter was passed on to release the meter, unrecorded"), std::string::npos);
    EXPECT_EQ(stepLine(seen, Call::close), "step 8 code 0");
}

// The captured session of each type, kept in the tree: a change to what the
// component asks of the transport shows up here as a diverging replay.
TEST(Capture, KeptSessionsReplayWithoutDivergence) {
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE("type " + std::to_string(type));
        const fs::path file = fs::path(VARNEL_CAPTURE_FIXTURES) / ("type" + std::to_string(type) + ".jsonl");
        ASSERT_TRUE(fs::exists(file));
        bool finished = false;
        const Lines seen = replay(file, kFullSession, &finished);
        EXPECT_TRUE(finished) << replayError();
        for (const std::string& l : seen)
            EXPECT_TRUE(l.rfind("step ", 0) != 0 || l.ends_with(" code 0")) << l;
    }
}

// The command records around its transport and replays in its place; a replay that parts says where.
using CaptureCommand = varnel::test::VarnelCommand;
TEST_F(CaptureCommand, RecordedReadingsReplayThroughTheCommand) {
    const std::string capture = (dir / "session.jsonl").string();
    const auto live = varnel({"readings", "-q", "--sim-profile", meter.string(), "--record", capture});
    ASSERT_EQ(live.status, 0) << live.err;
    const auto again = varnel({"readings", "-q", "--replay", capture});
    EXPECT_EQ(again.status, 0) << again.err;
    EXPECT_EQ(again.out, live.out);
    const auto other = varnel({"settings", "-q", "--replay", capture});
    EXPECT_NE(other.status, 0);
    EXPECT_NE(other.err.find("varnel: replay of " + capture + ": call "), std::string::npos) << other.err;
    // A text handed to the command reaches the terminal escaped, whichever message carries it.
    const auto hostile = varnel({"readings", "--sim-profile", (dir / "no\x1b]0;x\x07.xml").string()});
    EXPECT_NE(hostile.err.find("no\\x1b]0;x\\x07.xml"), std::string::npos) << hostile.err;
    EXPECT_EQ(hostile.err.find('\x1b'), std::string::npos);
}

// Writes the kept sessions anew: run with --gtest_also_run_disabled_tests --gtest_filter='*WriteKeptSessions'.
TEST(Capture, DISABLED_WriteKeptSessions) {
    for (int type = 1; type <= 8; ++type) {
        const fs::path file = fs::path(VARNEL_CAPTURE_FIXTURES) / ("type" + std::to_string(type) + ".jsonl");
        record(type, kFullSession, file);
        // The build tree's path means nothing elsewhere.
        Lines lines = fileLines(file);
        lines[0].replace(lines[0].find(VARNEL_TEST_TRANSPORT_PATH), std::strlen(VARNEL_TEST_TRANSPORT_PATH),
                         "libvantrix32.so.0");
        writeLines(file, lines);
    }
}

}  // namespace
