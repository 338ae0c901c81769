// Profile files that describe no meter, or whose text is not well-formed XML
// in UTF-8, are refused whole, naming the file, the line and the problem; the
// reader never takes the first of two attributes or cuts a value at "&#0;", and
// the writer never writes a file the reader would refuse.
#include <fstream>

#include "fixture.h"
#include "support/temp_dir.h"
#include "varnel/vxsim.h"

using namespace varnel::sim;
using simtest::SimTest;
using varnel::test::TempDir;

namespace {

const std::string kHead = R"(<meter type="1" firmware="X1 01/02/03" clock="2005-01-01 00:00:00")";
const std::string kMeter = kHead + R"( serial="ABC1234567")";
const std::string kMorvex =
    R"(<meter type="7" serial="MVX7001184" firmware="MX2210 05/07/03" clock="2008-03-07 14:05:09">)";

}  // namespace

using ProfileText = SimTest;

// The text check is the documents' own (tests/contracts): here, that the reader applies it.
TEST_F(ProfileText, BadFilesNameTheFileTheLineAndTheProblemAndLeaveTheMeter) {
    const std::pair<std::string, std::string> cases[] = {
        {kMeter + R"( serial="EVIL"/>)", ":1: duplicate attribute serial"},
        {kHead + "\n  serial=\"ABC123&#0;4567\"/>", ":2: character reference to U+0000"},
        {kMeter + R"( port="1x"/>)", ":1: port \"1x\" is not a whole number"},
        {kMeter + ">\n<ranges glucoseLow='20'/>\n</meter>", ":2: attribute glucoseHigh is missing"},
        {kMeter + ">\n<datalog>\n<entry dType='1' time='2005-02-30 00:00:00'/></datalog></meter>",
         ":3: time \"2005-02-30 00:00:00\" is not a time"},
        {kMeter + "><options><option code='6' availability='2' value='3' min='0' max='9'/></options></meter>",
         ": language 3 is not in the language map"},
        {kMeter + "><binaryDatalog/></meter>", ":1: only a type-7 meter keeps <binaryDatalog>"},
        {kMorvex + "\n<binaryDatalog>\n<record type='Glucoze' time='2008-01-01 00:00:00'/></binaryDatalog></meter>",
         ":3: record type \"Glucoze\" is unknown"},
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
    EXPECT_EQ(vxsim_load_profile("/nonexistent/meter.xml"), ME_FAIL);
    EXPECT_NE(std::string(vxsim_last_error()).find("/nonexistent/meter.xml"), std::string::npos);

    const std::string good = dir.file("good.xml", kMeter + "><ranges glucoseLow='20' glucoseHigh='600'/></meter>");
    ASSERT_EQ(vxsim_load_profile(good.c_str()), ME_SUCCESS) << vxsim_last_error();
    EXPECT_STREQ(vxsim_last_error(), "");
    EXPECT_EQ(meter().serial, "ABC1234567");
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
