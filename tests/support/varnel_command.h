// The varnel command run as a user runs it, as a process, on a small simulated meter.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#include <pugixml.hpp>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

extern char** environ;

namespace varnel::test {

namespace fs = std::filesystem;

struct Outcome {
    int status = -1;
    std::string out, err;
};

inline std::string slurp(const fs::path& p) {
    std::ifstream in(p, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

// The names of the children of the element at path in a printed document, each followed by a blank.
inline std::string childNames(const std::string& xml, const char* path) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) return "not a document: " + xml;
    std::string names;
    for (pugi::xml_node n : doc.first_element_by_path(path).children()) names += n.name() + std::string(" ");
    return names;
}

inline std::vector<std::string> lines(const std::string& text) {
    std::vector<std::string> result;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) result.push_back(line);
    return result;
}

// The command started as a process: standard output to a file, standard error through a pipe, line by line.
struct Running {
    pid_t pid = 0;
    FILE* err = nullptr;
    std::string seen;

    Running(std::vector<std::string> args, const fs::path& out) {
        args.insert(args.begin(), VARNEL_CLI_PATH);
        std::vector<char*> argv;
        for (std::string& a : args) argv.push_back(a.data());
        argv.push_back(nullptr);
        int fds[2];
        EXPECT_EQ(::pipe(fds), 0);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
        posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        posix_spawn_file_actions_adddup2(&actions, fds[1], 2);
        posix_spawn_file_actions_addclose(&actions, fds[0]);
        EXPECT_EQ(posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ), 0);
        posix_spawn_file_actions_destroy(&actions);
        ::close(fds[1]);
        err = ::fdopen(fds[0], "r");
    }
    // Reads standard error up to the first line that starts with `prefix`; false at its end.
    bool waitFor(const std::string& prefix) {
        char line[512];
        while (std::fgets(line, sizeof line, err)) {
            seen += line;
            if (std::string(line).rfind(prefix, 0) == 0) return true;
        }
        return false;
    }
    // The exit status once the run ends; the rest of standard error is in `seen`.
    int finish() {
        for (int c; (c = std::fgetc(err)) != EOF;) seen += static_cast<char>(c);
        std::fclose(err);
        int wstatus = 0;
        ::waitpid(pid, &wstatus, 0);
        return WIFEXITED(wstatus) ? WEXITSTATUS(wstatus) : 128 + WTERMSIG(wstatus);
    }
};

// The computer clock as the command sees it, for the runs of one test.
struct Now {
    explicit Now(const char* time) { ::setenv("VARNEL_NOW", time, 1); }
    ~Now() { ::unsetenv("VARNEL_NOW"); }
};

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
        Running run(std::move(args), dir / "stdout");
        Outcome r;
        r.status = run.finish();
        r.err = run.seen;
        r.out = slurp(dir / "stdout");
        return r;
    }

    // The test meter as the last run saved it.
    pugi::xml_node saved(pugi::xml_document& doc) const {
        EXPECT_TRUE(doc.load_file(meter.c_str()));
        return doc.child("meter");
    }
    std::size_t savedRecords() const {
        pugi::xml_document doc;
        const pugi::xml_node log = saved(doc).child("binaryDatalog");
        return static_cast<std::size_t>(std::distance(log.begin(), log.end()));
    }
};

}  // namespace varnel::test
