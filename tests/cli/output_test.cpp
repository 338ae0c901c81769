// The all-or-nothing output file.
#include <gtest/gtest.h>

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

    EXPECT_THROW(writeOutput((dir / "no" / "such.xml").string(), "x"), OutputError);
    EXPECT_FALSE(isReplaceableFile(dir.string()));
    EXPECT_TRUE(isReplaceableFile((dir / "new.xml").string()));
}

}  // namespace
