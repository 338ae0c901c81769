// Profile files: the shipped ones, what the writer writes, and files that
// describe no meter or whose text is not well-formed XML in UTF-8, which are
// refused whole, naming the file, the line and the problem; the reader never
// takes the first of two attributes or cuts a value at "&#0;".
#include <gmock/gmock.h>

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

// The shipped files are the default meters; what the writer writes reads back equal, down to
// unprintable name bytes and record types the conversion does not know; text the reader
// would refuse is not written.
TEST_F(ProfileText, ShippedFilesAreTheDefaultMetersAndWrittenOnesReadBackEqual) {
    for (int type = 1; type <= 8; ++type) {
        const std::string path = std::string(VARNEL_SOURCE_DIR) + "/sim/profiles/type" + std::to_string(type) + ".xml";
        EXPECT_EQ(readProfileFile(path), defaultProfile(type)) << type;
    }
    MeterProfile p = defaultProfile(7);
    p.port = 3;
    p.identitySerial = "00";
    p.attached = false;
    p.corruptedRecords = {0, 9};
    p.insulinNames[11].bytes = std::string("\x01\xE9\x7F", 3);
    p.oralMedNames[7].bytes = "K\xF6ln";
    p.binaryDatalog[3] = RECORD_DATA{};
    p.binaryDatalog[3].recType = 77;
    p.binaryDatalog[3].timeStamp = p.binaryDatalog[2].timeStamp;
    MeterProfile records = defaultProfile(2);
    records.datalog[0].Test.Medication = 0.1;
    records.name = "K\xC3\xB6ln";
    TempDir dir;
    const std::string file = dir.file("meter.xml");
    for (const MeterProfile& written : {p, records}) {
        writeProfileFile(written, file);
        EXPECT_EQ(readProfileFile(file), written) << written.type;
    }
    records.serial = "AB\x01";
    EXPECT_THROW(writeProfileFile(records, file), std::runtime_error);
    records.serial = "ABC";
    records.name = "K\xF6ln";  // a single byte, not UTF-8
    EXPECT_THAT([&] { writeProfileFile(records, file); },
                ::testing::ThrowsMessage<std::runtime_error>(
                    ::testing::HasSubstr("name cannot be written as XML text: invalid UTF-8")));
}
