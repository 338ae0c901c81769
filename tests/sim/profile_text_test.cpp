// Profile files whose text is not a well-formed XML document in UTF-8 are
// refused whole, naming the file, the line and the problem; the reader never
// takes the first of two attributes or cuts a value at "&#0;", and the writer
// never writes a file the reader would refuse.
#include <fstream>

#include "fixture.h"
#include "support/temp_dir.h"
#include "varnel/vxsim.h"

using namespace varnel::sim;
using simtest::SimTest;
using varnel::test::TempDir;

namespace {

const std::string kHead = R"(<meter type="1" firmware="X1 01/02/03" clock="2005-01-01 00:00:00")";

}  // namespace

using ProfileText = SimTest;

TEST_F(ProfileText, HostileTextIsRefusedWithTheLineAndTheMeterIsKept) {
    const std::pair<std::string, std::string> cases[] = {
        {kHead + R"( serial="ABC1234567" serial="EVIL"/>)", ":1: duplicate attribute serial"},
        {kHead + "\n  serial=\"ABC123&#0;4567\"/>", ":2: character reference to U+0000"},
        {kHead + R"( serial="AB&#1;C"/>)", ":1: character reference to U+0001"},
        {kHead + R"( serial="AB&#xFFFE;C"/>)", "U+FFFE"},
        {kHead + R"( serial="AB&#xD800;C"/>)", "U+D800"},
        {kHead + " serial=\"AB\x01"
                 "C\"/>",
         ":1: character U+0001, which XML does not allow"},
        {kHead + " serial=\"AB\xE9"
                 "C\"/>",
         ":1: invalid UTF-8 (byte 0xE9)"},
        {kHead + R"( serial="&bogus;"/>)", "undeclared entity bogus"},
        {kHead + R"( serial="ABC1234567"/><meter/>)", "content after the document element"},
        {kHead + R"( serial="A<B"/>)", "'<' in an attribute value"},
        {kHead + R"( serial="ABC1234567"><ranges glucoseLow='20' glucoseHigh='600' glucoseLow='1'/></meter>)",
         "duplicate attribute glucoseLow"},
    };
    TempDir dir;
    for (const auto& [content, expected] : cases) {
        SCOPED_TRACE(content);
        const std::string file = dir.file("meter.xml", content);
        EXPECT_EQ(vxsim_load_profile(file.c_str()), ME_FAIL);
        const std::string error = vxsim_last_error();
        EXPECT_EQ(error.rfind(file + ":", 0), 0u) << error;
        EXPECT_NE(error.find(expected), std::string::npos) << error;
        EXPECT_EQ(meter().type, eMorvex);
    }
}

TEST_F(ProfileText, TheWriterRefusesTextTheReaderWouldRefuse) {
    MeterProfile p = defaultProfile(2);
    p.serial =
        "AB\x01"
        "C";
    TempDir dir;
    const std::string file = dir.file("meter.xml");
    EXPECT_THROW(writeProfileFile(p, file), std::runtime_error);
    p.serial = "ABC";
    p.name = "K\xF6ln";  // a single byte, not UTF-8
    try {
        writeProfileFile(p, file);
        ADD_FAILURE() << "written";
    } catch (const std::runtime_error& e) {
        EXPECT_NE(std::string(e.what()).find("name cannot be written as XML text: invalid UTF-8"), std::string::npos)
            << e.what();
    }
    p.name = "K\xC3\xB6ln";
    writeProfileFile(p, file);
    EXPECT_EQ(readProfileFile(file), p);
}
