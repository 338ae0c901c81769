// The all-or-nothing output file.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <utility>

#include "output.h"
#include "support/varnel_command.h"

namespace {

using namespace varnel::cli;
using namespace varnel::test;

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

// Outputs -o refuses before the meter is touched: a FIFO nobody reads (the command
// would wait in open, deaf to Ctrl-C) and a link to a missing file (never replaced by a file).
TEST_F(VarnelCommand, OutputThatCouldHangOrReplaceALinkIsRefusedFirst) {
    const fs::path fifo = dir / "fifo", dangling = dir / "dangling.xml";
    ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
    fs::create_symlink(dir / "missing" / "log.xml", dangling);
    for (const auto& [path, says] : {std::pair{fifo, "it is a FIFO"}, {dangling, "a symbolic link to a missing file"}}) {
        EXPECT_NE(unwritableReason(path.string()).find(says), std::string::npos);
        EXPECT_THROW(writeOutput(path.string(), "x"), OutputError);
        const auto run = varnel({"readings", "-q", "--sim-profile", meter.string(), "-o", path.string()});
        EXPECT_EQ(run.status, 73) << run.err;
        EXPECT_NE(run.err.find(says), std::string::npos) << run.err;
    }
    EXPECT_TRUE(fs::is_symlink(dangling));
    EXPECT_FALSE(fs::exists(dir / "missing"));
}

}  // namespace
