// CSV fields and the all-or-nothing output file.
#include <gtest/gtest.h>

#include "csv.h"
#include "output.h"
#include "support/varnel_command.h"

namespace {

using namespace varnel::cli;
using namespace varnel::test;

TEST(CsvField, QuotesWhatASpreadsheetWouldSplitAndDisarmsFormulas) {
    EXPECT_EQ(csvField("Before Lunch"), "Before Lunch");
    EXPECT_EQ(csvField("Syst=120; Diast=80"), "Syst=120; Diast=80");
    EXPECT_EQ(csvField("70/30, NPH"), "\"70/30, NPH\"");
    EXPECT_EQ(csvField("say \"hi\""), "\"say \"\"hi\"\"\"");
    EXPECT_EQ(csvField("two\nlines"), "\"two\nlines\"");
    EXPECT_EQ(csvField("=HYPERLINK(\"x\")"), "\"'=HYPERLINK(\"\"x\"\")\"");
    EXPECT_EQ(csvField("@cmd"), "'@cmd");
    EXPECT_EQ(csvField("-2.5"), "-2.5");
    EXPECT_EQ(csvLine({"a", "", "b,c"}), "a,,\"b,c\"\n");
}

TEST(CsvDatalog, EveryEntryGetsOneLineEvenOfAnUnknownKind) {
    const std::string csv = datalogToCsv(
        "<Datalog><TransferDetail><Records><Total>3</Total></Records>"
        "<ExtraInfo><GlucUnit Txt=\"mg/dL\">0</GlucUnit></ExtraInfo></TransferDetail><Records>"
        "<Gluc D=\"5\" MM=\"01\" Y=\"2006\" h=\"7\" m=\"3\" s=\"0\" Val=\"147\" Type=\"0\" Txt=\"Blood\">"
        "<MealSlot Slot=\"3\" Txt=\"Before Lunch\"/><Comments><Ill/><Food Txt=\"Fasting\">1</Food></Comments></Gluc>"
        "<BP D=\"5\" MM=\"01\" Y=\"2006\" h=\"8\" m=\"0\" s=\"0\" Syst=\"120\" Diast=\"80\"/>"
        "<Future D=\"5\" MM=\"01\" Y=\"2006\" h=\"9\" m=\"0\" s=\"0\"/></Records></Datalog>");
    EXPECT_EQ(csv,
              "date-time,kind,value,unit,slot,comments\n"
              "2006-01-05 07:03:00,Glucose,147,mg/dL,Before Lunch,Ill; Fasting\n"
              "2006-01-05 08:00:00,Blood pressure,Syst=120; Diast=80,,,\n"
              "2006-01-05 09:00:00,Future,,,,\n");
    EXPECT_THROW(datalogToCsv("<Status/>"), std::runtime_error);
}

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
