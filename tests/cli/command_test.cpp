// The varnel command run as a user runs it, on a small simulated meter.
#include <gtest/gtest.h>
#include <pugixml.hpp>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

extern char** environ;

namespace {

namespace fs = std::filesystem;

struct Outcome {
    int status = -1;
    std::string out, err;
};

std::string slurp(const fs::path& p) {
    std::ifstream in(p, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

std::vector<std::string> lines(const std::string& text) {
    std::vector<std::string> result;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) result.push_back(line);
    return result;
}

class VarnelCommand : public ::testing::Test {
protected:
    fs::path dir;
    fs::path meter;  // a type-7 meter with a short log, so each run stays quick
    static constexpr int kRecords = 12;

    void SetUp() override {
        char tmpl[] = "/tmp/varnel-cli-XXXXXX";
        ASSERT_NE(::mkdtemp(tmpl), nullptr);
        dir = tmpl;
        meter = dir / "meter.xml";
        pugi::xml_document profile;
        ASSERT_TRUE(profile.load_file(VARNEL_SOURCE_DIR "/sim/profiles/type7.xml"));
        pugi::xml_node log = profile.child("meter").child("binaryDatalog");
        int kept = 0;
        for (pugi::xml_node r = log.first_child(); r;) {
            pugi::xml_node next = r.next_sibling();
            if (++kept > kRecords) log.remove_child(r);
            r = next;
        }
        ASSERT_TRUE(profile.save_file(meter.c_str()));
    }
    void TearDown() override { fs::remove_all(dir); }

    Outcome varnel(std::vector<std::string> args) const {
        args.insert(args.begin(), VARNEL_CLI_PATH);
        std::vector<char*> argv;
        for (std::string& a : args) argv.push_back(a.data());
        argv.push_back(nullptr);
        const fs::path out = dir / "stdout", err = dir / "stderr";
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
        posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        pid_t pid = 0;
        Outcome run;
        if (posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ) == 0) {
            int wstatus = 0;
            ::waitpid(pid, &wstatus, 0);
            run.status = WIFEXITED(wstatus) ? WEXITSTATUS(wstatus) : 128 + WTERMSIG(wstatus);
        }
        posix_spawn_file_actions_destroy(&actions);
        run.out = slurp(out);
        run.err = slurp(err);
        return run;
    }

    // A readings run on the test meter, its datalog parsed.
    pugi::xml_node readings(pugi::xml_document& doc, std::vector<std::string> more = {}) const {
        std::vector<std::string> args{"readings", "-q", "--sim-profile", meter.string()};
        args.insert(args.end(), more.begin(), more.end());
        const Outcome r = varnel(args);
        EXPECT_EQ(r.status, 0) << r.err;
        EXPECT_TRUE(doc.load_string(r.out.c_str())) << r.out;
        return doc.child("Datalog");
    }
};

TEST_F(VarnelCommand, ReadingsGivesTheWholeDatalogAsXmlOrCsv) {
    pugi::xml_document doc;
    const pugi::xml_node log = readings(doc);
    EXPECT_STREQ(log.child("DeviceInfo").child_value("SN"), "MVX7001184");
    EXPECT_STREQ(log.child("DeviceInfo").child_value("TypeID"), "7");
    const pugi::xml_node counts = log.child("TransferDetail").child("Records");
    EXPECT_EQ(counts.child("Total").text().as_int(), kRecords);
    EXPECT_EQ(counts.child("Valid").text().as_int(), kRecords);
    const pugi::xml_node first = log.child("Records").first_child();
    EXPECT_STREQ(first.name(), "Gluc");
    EXPECT_STREQ(first.attribute("Val").value(), "111");
    EXPECT_STREQ(first.attribute("Y").value(), "2008");
    std::size_t entries = 0;
    for (auto e : log.child("Records").children()) entries += !!e;
    EXPECT_GT(entries, 0u);

    const Outcome csv = varnel({"readings", "--csv", "--sim-profile", meter.string()});
    ASSERT_EQ(csv.status, 0) << csv.err;
    const auto rows = lines(csv.out);
    ASSERT_EQ(rows.size(), entries + 1);
    EXPECT_EQ(rows[0], "date-time,kind,value,unit,slot,comments");
    EXPECT_EQ(rows[1].rfind("2008-02-15 07:05:09,Glucose,111,mg/dL,", 0), 0u) << rows[1];
    EXPECT_NE(csv.out.find(",Insulin injection,14.5,Units,"), std::string::npos) << csv.out;
    // Progress goes to standard error, as rising plain lines when it is not a terminal.
    int last = 0;
    ASSERT_FALSE(lines(csv.err).empty());
    for (const std::string& line : lines(csv.err)) {
        int percent = 0;
        ASSERT_EQ(std::sscanf(line.c_str(), "readings %d%%", &percent), 1) << line;
        EXPECT_GT(percent, last);
        last = percent;
    }
}

TEST_F(VarnelCommand, DiscoverDescribesTheSelectedSimulatedMeter) {
    const Outcome r = varnel({"discover", "--sim-type", "4", "-o", (dir / "device.xml").string()});
    ASSERT_EQ(r.status, 0) << r.err;
    pugi::xml_document doc;
    ASSERT_TRUE(doc.load_file((dir / "device.xml").c_str()));
    const pugi::xml_node info = doc.child("Device").child("DeviceInfo");
    EXPECT_STREQ(info.child_value("TypeID"), "4");
    EXPECT_STREQ(info.child_value("SN"), "QLB4008830");
    EXPECT_STREQ(info.child("CommState").attribute("Txt").value(), "Off");
    EXPECT_STREQ(doc.child("Device").child("PortInfo").child_value("PortID"), "1");
    EXPECT_TRUE(r.out.empty());
}

TEST_F(VarnelCommand, FailuresSayWhyInOneLineAndExitWithTheCode) {
    const Outcome none = varnel({"discover", "-q", "--port", "5"});
    EXPECT_EQ(none.status, 13);  // ME_NO_DEVICE made positive
    EXPECT_EQ(none.err, "varnel: No device found ; No meter detected on port 5\n");
    EXPECT_TRUE(none.out.empty());

    std::ofstream(dir / "broken.xml") << "<meter type=\"12\"/>";
    const Outcome profile = varnel({"readings", "-q", "--sim-profile", (dir / "broken.xml").string()});
    EXPECT_EQ(profile.status, 64);
    ASSERT_EQ(lines(profile.err).size(), 1u) << profile.err;
    EXPECT_NE(profile.err.find("cannot load the simulated meter profile"), std::string::npos) << profile.err;
    EXPECT_NE(profile.err.find("type"), std::string::npos) << "the simulator's reason is missing: " << profile.err;

    const Outcome foreign = varnel({"discover", "-q", "--transport", VARNEL_LIBRARY_PATH, "--sim-type", "2"});
    EXPECT_EQ(foreign.status, 64);
    EXPECT_NE(foreign.err.find("vxsim_select_type"), std::string::npos) << foreign.err;
}

TEST_F(VarnelCommand, ErasingNeedsConsentAndNeverLosesReadings) {
    const std::string before = slurp(meter);
    const Outcome refused = varnel({"clear", "--sim-profile", meter.string(), "--sim-save", meter.string()});
    EXPECT_EQ(refused.status, 2);
    EXPECT_NE(refused.err.find("--yes"), std::string::npos) << refused.err;
    EXPECT_EQ(slurp(meter), before);

    // An output that cannot be written leaves the meter as it was.
    const std::string lost = (dir / "missing" / "log.xml").string();
    const Outcome failed = varnel({"readings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(),
                               "-o", lost, "--clear-after"});
    EXPECT_EQ(failed.status, 64);
    pugi::xml_document kept;
    EXPECT_EQ(readings(kept).child("TransferDetail").child("Records").child("Total").text().as_int(), kRecords);

    EXPECT_EQ(varnel({"readings", "-q", "-o", "-", "--clear-after"}).status, 2);

    const fs::path saved = dir / "log.xml";
    const Outcome moved = varnel({"readings", "-q", "--sim-profile", meter.string(), "--sim-save", meter.string(),
                              "-o", saved.string(), "--clear-after"});
    ASSERT_EQ(moved.status, 0) << moved.err;
    pugi::xml_document file;
    ASSERT_TRUE(file.load_file(saved.c_str()));
    EXPECT_EQ(file.child("Datalog").child("TransferDetail").child("Records").child("Total").text().as_int(),
              kRecords);
    pugi::xml_document after;
    const pugi::xml_node empty = readings(after);
    EXPECT_EQ(empty.child("TransferDetail").child("Records").child("Total").text().as_int(), 0);
    EXPECT_FALSE(empty.child("Records").first_child());
}

}  // namespace
