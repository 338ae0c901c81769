// The XML document component: every operation, the three
// positions, errors, text round trips, entity safety and files.
#include "varnel/xml_wrapper.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <utility>
#include <vector>

#include "varnel/component_error.h"

using namespace varnel;

namespace {

// Runs f, expecting a ComponentError with `number` whose description contains `mentions`.
template <class F>
void expectError(F&& f, std::int32_t number, const std::string& mentions) {
    try {
        f();
        ADD_FAILURE() << "no error; expected " << number;
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), number) << e.description();
        EXPECT_NE(e.description().find(mentions), std::string::npos)
            << "'" << e.description() << "' does not mention '" << mentions << "'";
    }
}

// A directory of its own for each test, removed afterwards.
struct TempDir {
    std::filesystem::path path;
    TempDir() {
        const auto* info = ::testing::UnitTest::GetInstance()->current_test_info();
        path = std::filesystem::temp_directory_path() /
               ("varnel_xml_" + std::string(info->test_suite_name()) + "_" + info->name() + "_" +
                std::to_string(::getpid()));
        std::filesystem::remove_all(path);
        std::filesystem::create_directories(path);
    }
    ~TempDir() { std::filesystem::remove_all(path); }
    std::string file(const std::string& name, const std::string& content = {}) const {
        std::string p = (path / name).string();
        if (!content.empty()) std::ofstream(p, std::ios::binary) << content;
        return p;
    }
};

XMLWrapper loaded(const std::string& text) {
    XMLWrapper x;
    EXPECT_TRUE(x.LoadXML(text)) << x.LastLoadError();
    return x;
}

}  // namespace

// --- the empty document ---

TEST(XMLWrapperTest, NewObjectIsEmptyAndReadsRaiseMissingObject) {
    XMLWrapper x;
    EXPECT_TRUE(x.IsEmpty());
    EXPECT_EQ(x.XML(), "");
    expectError([&] { x.GetChildCount(); }, errc::missing_object, "GetChildCount");
    expectError([&] { x.GetRootName(); }, errc::missing_object, "empty");
    expectError([&] { x.MoveToRoot(); }, errc::missing_object, "MoveToRoot");
    expectError([&] { x.MoveToChild("A"); }, errc::missing_object, "MoveToChild");
    expectError([&] { x.SelectElement("A"); }, errc::missing_object, "SelectElement");
    expectError([&] { x.GetChildValue("A"); }, errc::missing_object, "GetChildValue");
    expectError([&] { x.GetChildValueAt(0); }, errc::missing_object, "GetChildValueAt");
    expectError([&] { x.GetChildName(0); }, errc::missing_object, "GetChildName");
    expectError([&] { x.GetChildAttribute("A", "b"); }, errc::missing_object, "GetChildAttribute");
    expectError([&] { x.GetChildAttributeAt(0, "b"); }, errc::missing_object,
                "GetChildAttributeAt");
    expectError([&] { x.CountElements("A"); }, errc::missing_object, "CountElements");
    expectError([&] { x.SetAttribute("a", "1"); }, errc::missing_object, "SetAttribute");
    expectError([&] { x.AddChildElement("A"); }, errc::missing_object, "AddChildElement");
    expectError([&] { x.SetChildAttribute("a", "1"); }, errc::missing_object, "SetChildAttribute");
    EXPECT_TRUE(x.IsEmpty());
}

TEST(XMLWrapperTest, AddElementOnEmptyDocumentCreatesTheDocumentElement) {
    XMLWrapper x;
    x.AddElement("Root", "r");
    EXPECT_FALSE(x.IsEmpty());
    EXPECT_EQ(x.GetRootName(), "Root");
    x.SetAttribute("k", "v");  // the document element is the last added element
    x.AddElement("A", "1");    // and current: A goes under it
    x.AddElement("B", "2");
    EXPECT_EQ(x.GetChildCount(), 2);
    EXPECT_EQ(x.XML(), "<Root k=\"v\">r<A>1</A>\n  <B>2</B>\n</Root>\n");
}

// --- adding: AddElement, SetAttribute, AddChildElement, SetChildAttribute ---

TEST(XMLWrapperTest, AddElementAppendsUnderCurrentWhichStaysCurrent) {
    XMLWrapper x;
    x.InitDocument(doc_kind::device_info);
    x.SelectElement("DeviceInfo");
    x.AddElement("SN", "ABC123");
    x.AddElement("TypeID", "7");
    x.AddElement("Empty");
    EXPECT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildName(0), "SN");
    EXPECT_EQ(x.GetChildValue("SN"), "ABC123");
    EXPECT_EQ(x.GetChildValue("TypeID"), "7");
    EXPECT_EQ(x.GetChildValue("Empty"), "");
    x.MoveToRoot();
    EXPECT_EQ(x.CountElements("SN"), 1);
    x.MoveToChild("PortInfo");
    EXPECT_EQ(x.GetChildCount(), 0);
}

TEST(XMLWrapperTest, SetAttributeWritesOnTheLastAddedElementAndReplaces) {
    XMLWrapper x;
    x.InitDocument(doc_kind::device_info);
    x.SelectElement("DeviceInfo");
    x.AddElement("Class", "0");
    x.SetAttribute("Txt", "Glucose Meter");
    x.MoveToRoot();  // navigation does not move the last added element
    x.SetAttribute("Extra", "1");
    x.SetAttribute("Txt", "Meter");  // same name: replaced, not doubled
    x.SelectElement("DeviceInfo");
    EXPECT_EQ(x.GetChildAttribute("Class", "Txt"), "Meter");
    EXPECT_EQ(x.GetChildAttribute("Class", "Extra"), "1");
    EXPECT_EQ(x.XML().find("Txt=\"Glucose Meter\""), std::string::npos);
}

TEST(XMLWrapperTest, SetAttributeWithNothingAddedRaisesMissingObject) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    expectError([&] { x.SetAttribute("a", "1"); }, errc::missing_object, "no element");
    expectError([&] { x.AddChildElement("A"); }, errc::missing_object, "no element");
    expectError([&] { x.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
}

TEST(XMLWrapperTest, StatusGroupAsThePartsWriteIt) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major", "", "-17");
    x.AddChildElement("Minor", "", "-19");
    const std::string desc =
        "Bad parameter passed to the function ; Port number from XML file is invalid";
    x.AddElement("ErrDesc", desc);
    x.AddElement("VBTrace", "0");
    EXPECT_EQ(x.XML(),
              "<Status>\n"
              "  <ErrCode>\n"
              "    <Major>-17</Major>\n"
              "    <Minor>-19</Minor>\n"
              "  </ErrCode>\n"
              "  <ErrDesc>Bad parameter passed to the function ; Port number from XML file is "
              "invalid</ErrDesc>\n"
              "  <VBTrace>0</VBTrace>\n"
              "</Status>\n");
    EXPECT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildValueAt(1), desc);
    x.MoveToChild("ErrCode");
    EXPECT_EQ(x.GetChildValue("Major"), "-17");
    EXPECT_EQ(x.GetChildValue("Minor"), "-19");
}

TEST(XMLWrapperTest, AddChildElementUnderTheLastChildOfTheGivenParentName) {
    // The settings document: Insulins/Pre/Insulin, then Insulins/Custom/Insulin.
    XMLWrapper x;
    x.InitDocument(doc_kind::device_settings);
    x.MoveToChild("Settings");
    x.AddElement("Insulins");
    x.AddChildElement("Pre");
    x.SetChildAttribute("Mode", "0");
    x.AddChildElement("Insulin", "Pre", "1");
    x.SetChildAttribute("Txt", "Rapid");
    x.AddChildElement("Insulin", "Pre", "2");
    x.AddChildElement("Custom");
    x.SetChildAttribute("Max", "11");
    x.AddChildElement("Insulin", "Custom", "11");
    x.SetChildAttribute("InUse", "false");
    x.AddChildElement("Pre");  // a second Pre: the last one of the name is used
    x.AddChildElement("Insulin", "Pre", "3");

    x.MoveToChild("Insulins");
    ASSERT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildName(0), "Pre");
    EXPECT_EQ(x.GetChildName(1), "Custom");
    EXPECT_EQ(x.GetChildName(2), "Pre");
    EXPECT_EQ(x.GetChildAttributeAt(0, "Mode"), "0");
    EXPECT_EQ(x.GetChildAttribute("Custom", "Max"), "11");
    x.MoveToChild("Pre");
    ASSERT_EQ(x.GetChildCount(), 2);
    EXPECT_EQ(x.GetChildValueAt(0), "1");
    EXPECT_EQ(x.GetChildAttributeAt(0, "Txt"), "Rapid");
    EXPECT_EQ(x.GetChildValueAt(1), "2");
    x.SelectElement("Custom");
    ASSERT_EQ(x.GetChildCount(), 1);
    EXPECT_EQ(x.GetChildValueAt(0), "11");
    EXPECT_EQ(x.GetChildAttributeAt(0, "InUse"), "false");
    x.SelectElement("Insulins");
    EXPECT_EQ(x.CountElements("Insulin"), 4);
    EXPECT_NE(x.XML().find("<Pre>\n        <Insulin>3</Insulin>\n      </Pre>"), std::string::npos)
        << x.XML();
}

TEST(XMLWrapperTest, AddChildElementNestsCommentsAndStripUnderGluc) {
    // Readings entries: Gluc/Comments/Food, Gluc/Comments/Event, Gluc/Strip/Lvl.
    XMLWrapper x;
    x.InitDocument(doc_kind::datalog);
    x.SelectElement("Records");
    x.AddElement("Gluc");
    x.SetAttribute("Val", "123");
    x.AddChildElement("MealSlot");
    x.SetChildAttribute("Slot", "4");
    x.AddChildElement("Comments");
    x.AddChildElement("Food", "Comments", "1");
    x.SetChildAttribute("Txt", "Fasting");
    x.AddChildElement("Event", "Comments", "5");
    x.SetChildAttribute("Txt", "EVENT5");
    x.AddChildElement("Strip");
    x.AddChildElement("Lvl", "Strip", "1");
    x.SetChildAttribute("Upper", "200");

    x.MoveToChild("Gluc");
    EXPECT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildAttribute("MealSlot", "Slot"), "4");
    x.MoveToChild("Comments");
    ASSERT_EQ(x.GetChildCount(), 2);
    EXPECT_EQ(x.GetChildName(0), "Food");
    EXPECT_EQ(x.GetChildAttributeAt(0, "Txt"), "Fasting");
    EXPECT_EQ(x.GetChildName(1), "Event");
    EXPECT_EQ(x.GetChildValueAt(1), "5");
    x.SelectElement("Strip");
    EXPECT_EQ(x.GetChildValue("Lvl"), "1");
    EXPECT_EQ(x.GetChildAttribute("Lvl", "Upper"), "200");
}

TEST(XMLWrapperTest, AddChildElementFindsADeeperParentWhenNoChildHasTheName) {
    XMLWrapper x;
    x.InitDocument(doc_kind::filter);
    x.AddElement("Top");
    x.AddChildElement("Strip");
    x.AddChildElement("Lvl", "Strip", "1");
    x.AddChildElement("Note", "Lvl", "deep");  // Lvl is a grandchild of Top
    x.AddChildElement("Lvl", "Strip", "2");
    x.AddChildElement("Note", "Lvl", "second");  // the last Lvl in document order
    x.SelectElement("Strip");
    ASSERT_EQ(x.GetChildCount(), 2);
    x.MoveToChild("Lvl");
    EXPECT_EQ(x.GetChildValue("Note"), "deep");
    x.SelectElement("Strip");
    EXPECT_EQ(x.CountElements("Note"), 2);
    EXPECT_NE(x.XML().find("<Lvl>2<Note>second</Note>"), std::string::npos) << x.XML();
}

TEST(XMLWrapperTest, AddChildElementWithAnUnknownParentRaisesAndAddsNothing) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major", "", "-17");
    const std::string before = x.XML();
    expectError([&] { x.AddChildElement("Minor", "Nowhere", "-19"); }, errc::missing_object,
                "Nowhere");
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("still", "Major");  // the last added child did not move
    x.MoveToChild("ErrCode");
    EXPECT_EQ(x.GetChildAttribute("Major", "still"), "Major");
}

TEST(XMLWrapperTest, TheThreePositionsAreIndependent) {
    XMLWrapper x;
    x.InitDocument(doc_kind::datalog);
    x.SelectElement("TransferDetail");
    x.AddElement("Records");                  // last added: TransferDetail/Records
    x.AddChildElement("Total", "", "5");      // last child: .../Total
    x.AddElement("ExtraInfo");                // last added moves; last child stays
    x.SetChildAttribute("seen", "yes");       // still on Total
    x.AddChildElement("GlucCalib", "", "0");  // under ExtraInfo, the last added element
    x.SetChildAttribute("Txt", "Whole Blood");
    x.SelectElement("DeviceInfo");  // current moves; the others do not
    x.SetAttribute("on", "ExtraInfo");
    x.AddChildElement("GlucUnit", "", "0");
    x.AddElement("SN", "X1");  // under the current element, DeviceInfo

    x.SelectElement("TransferDetail");
    EXPECT_EQ(x.GetChildAttribute("ExtraInfo", "on"), "ExtraInfo");
    x.MoveToChild("Records");
    EXPECT_EQ(x.GetChildAttribute("Total", "seen"), "yes");
    x.SelectElement("ExtraInfo");
    ASSERT_EQ(x.GetChildCount(), 2);
    EXPECT_EQ(x.GetChildAttribute("GlucCalib", "Txt"), "Whole Blood");
    EXPECT_EQ(x.GetChildName(1), "GlucUnit");
    x.SelectElement("DeviceInfo");
    EXPECT_EQ(x.GetChildValue("SN"), "X1");
}

// --- navigation: MoveToRoot, MoveToChild, SelectElement ---

TEST(XMLWrapperTest, MoveToChildTakesTheFirstOfTheNameAndRaisesWhenAbsent) {
    XMLWrapper x = loaded("<R><A n='1'><B/></A><A n='2'/></R>");
    x.MoveToChild("A");
    EXPECT_EQ(x.GetChildName(0), "B");
    expectError([&] { x.MoveToChild("C"); }, errc::missing_object, "'C'");
    EXPECT_EQ(x.GetChildName(0), "B");                                      // current unchanged
    expectError([&] { x.MoveToChild("a"); }, errc::missing_object, "'a'");  // case matters
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildAttribute("A", "n"), "1");
    EXPECT_EQ(x.GetChildAttributeAt(1, "n"), "2");
}

TEST(XMLWrapperTest, SelectElementSearchesLevelByLevel) {
    // The deeper Target comes first in document order; the shallower one wins.
    XMLWrapper x = loaded(
        "<R><A><B><Target v='depth3'/></B><Target v='depth2'/></A>"
        "<C><Target v='depth2-late'/></C><Target v='depth1'/></R>");
    x.SelectElement("Target");
    EXPECT_EQ(x.GetChildCount(), 0);
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildAttributeAt(2, "v"), "depth1");

    XMLWrapper y =
        loaded("<R><A><B><Target v='3'/></B><Target v='2a'/></A><C><Target v='2b'/></C></R>");
    y.SelectElement("B");  // from anywhere: the search starts at the document element
    y.SelectElement("A");
    y.MoveToChild("Target");
    EXPECT_EQ(y.GetChildCount(), 0);
    y.SelectElement("A");
    EXPECT_EQ(y.GetChildAttribute("Target", "v"), "2a");  // first of the nearest level

    y.SelectElement("R");  // the document element itself counts
    EXPECT_EQ(y.GetChildCount(), 2);
    y.SelectElement("C");
    expectError([&] { y.SelectElement("Missing"); }, errc::missing_object, "'Missing'");
    EXPECT_EQ(y.GetChildAttribute("Target", "v"), "2b");  // current unchanged
}

TEST(XMLWrapperTest, SelectElementFindsTheTopLevelRecordsOfADatalog) {
    // The datalog: Records is selected after TransferDetail/Records was added.
    XMLWrapper x;
    x.InitDocument(doc_kind::datalog);
    x.SelectElement("TransferDetail");
    x.AddElement("Records");
    x.AddChildElement("Total", "", "3");
    x.SelectElement("Records");
    x.AddElement("Gluc");
    x.SetAttribute("Val", "99");
    x.MoveToRoot();
    x.MoveToChild("Records");
    EXPECT_EQ(x.GetChildCount(), 1);
    EXPECT_EQ(x.GetChildAttribute("Gluc", "Val"), "99");
}

TEST(XMLWrapperTest, MoveToRootReturnsToTheDocumentElement) {
    XMLWrapper x = loaded("<R><A><B/></A></R>");
    x.MoveToChild("A");
    x.MoveToChild("B");
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildName(0), "A");
    EXPECT_EQ(x.GetRootName(), "R");
}

// --- reading ---

TEST(XMLWrapperTest, ChildrenAreElementsOnly) {
    XMLWrapper x = loaded("<R>text<!-- c --><A>1</A><?pi x?><B><![CDATA[<2>]]></B>tail<C/></R>");
    EXPECT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildName(0), "A");
    EXPECT_EQ(x.GetChildName(2), "C");
    EXPECT_EQ(x.GetChildValueAt(1), "<2>");
    EXPECT_EQ(x.GetChildValue("B"), "<2>");
}

TEST(XMLWrapperTest, AbsentChildrenAndAttributesReadAsEmptyText) {
    XMLWrapper x = loaded("<R><A a='1'>v</A><E/></R>");
    EXPECT_EQ(x.GetChildValue("Nope"), "");
    EXPECT_EQ(x.GetChildValue("E"), "");
    EXPECT_EQ(x.GetChildAttribute("Nope", "a"), "");
    EXPECT_EQ(x.GetChildAttribute("A", "nope"), "");
    EXPECT_EQ(x.GetChildAttributeAt(0, "nope"), "");
    EXPECT_EQ(x.GetChildAttribute("A", "a"), "1");
    EXPECT_EQ(x.GetChildValueAt(1), "");
}

TEST(XMLWrapperTest, IndexesOutsideTheChildrenRaiseSubscriptOutOfRange) {
    XMLWrapper x = loaded("<Settings><A/><B/></Settings>");
    for (std::int32_t bad : {-1, 2, 100}) {
        const std::string idx = "index " + std::to_string(bad);
        expectError([&] { x.GetChildName(bad); }, errc::subscript_out_of_range, idx);
        expectError([&] { x.GetChildValueAt(bad); }, errc::subscript_out_of_range, idx);
        expectError([&] { x.GetChildAttributeAt(bad, "a"); }, errc::subscript_out_of_range, idx);
    }
    expectError([&] { x.GetChildName(2); }, errc::subscript_out_of_range, "'Settings'");
    EXPECT_EQ(x.GetChildName(1), "B");
}

TEST(XMLWrapperTest, CountElementsCountsDescendantsOfTheCurrentElementOnly) {
    XMLWrapper x = loaded(
        "<X><X><Y><X/></Y></X><Z><X/></Z><Settings><Clock/><Insulins><Clock/></Insulins></"
        "Settings></X>");
    EXPECT_EQ(x.CountElements("X"), 3);  // the document element itself is not counted
    EXPECT_EQ(x.CountElements("Clock"), 2);
    EXPECT_EQ(x.CountElements("Nope"), 0);
    x.MoveToChild("X");
    EXPECT_EQ(x.CountElements("X"), 1);
    EXPECT_EQ(x.CountElements("Clock"), 0);
    x.SelectElement("Settings");
    EXPECT_EQ(x.CountElements("Clock"), 2);
    EXPECT_EQ(x.CountElements("Settings"), 0);
    x.MoveToChild("Insulins");
    EXPECT_EQ(x.CountElements("Clock"), 1);
}

TEST(XMLWrapperTest, GetRootName) {
    XMLWrapper x;
    x.InitDocument(doc_kind::device_caps);
    EXPECT_EQ(x.GetRootName(), "DeviceCaps");
    x.SelectElement("Records");
    EXPECT_EQ(x.GetRootName(), "DeviceCaps");
}

// --- InitDocument ---

TEST(XMLWrapperTest, InitDocumentSkeletons) {
    const std::vector<std::pair<std::int32_t, std::string>> kinds = {
        {doc_kind::device_info, "<Device>\n  <DeviceInfo />\n  <PortInfo />\n</Device>\n"},
        {doc_kind::device_settings,
         "<DeviceSettings>\n  <DeviceInfo />\n  <Settings />\n</DeviceSettings>\n"},
        {doc_kind::connection_info, "<ConnectionInfo>\n  <Ports />\n</ConnectionInfo>\n"},
        {doc_kind::device_caps,
         "<DeviceCaps>\n  <DeviceInfo />\n  <Settings />\n  <Records />\n</DeviceCaps>\n"},
        {doc_kind::datalog,
         "<Datalog>\n  <DeviceInfo />\n  <TransferDetail />\n  <Records />\n</Datalog>\n"},
        {doc_kind::filter, "<Filter />\n"},
        {doc_kind::status, "<Status />\n"},
    };
    EXPECT_EQ(doc_kind::device_settings, 2);
    EXPECT_EQ(doc_kind::device_caps, 4);
    EXPECT_EQ(doc_kind::status, 7);
    for (const auto& [kind, xml] : kinds) {
        XMLWrapper x = loaded("<Old><Stuff/></Old>");
        x.AddElement("Added");
        x.AddChildElement("Child");
        x.MoveToChild("Stuff");
        x.InitDocument(kind);
        EXPECT_EQ(x.XML(), xml) << "kind " << kind;
        // The document element is current; nothing counts as added.
        x.AddElement("New");
        x.MoveToRoot();
        EXPECT_EQ(x.GetChildName(x.GetChildCount() - 1), "New") << "kind " << kind;
        expectError([&] { x.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    }
}

TEST(XMLWrapperTest, InitDocumentKindTwoAsGetDeviceSettingsUsesIt) {
    // The settings request: InitDocument(2) then MoveToChild("DeviceInfo") right away,
    // and Settings reachable from the document element.
    XMLWrapper x = loaded("<DeviceSettings><Settings><Clock/><Beep/></Settings></DeviceSettings>");
    x.InitDocument(doc_kind::device_settings);
    x.MoveToChild("DeviceInfo");
    x.AddElement("SN", "abc");
    x.MoveToRoot();
    EXPECT_EQ(x.CountElements("Settings"), 1);
    x.MoveToChild("Settings");
    EXPECT_EQ(x.GetChildCount(), 0);
}

TEST(XMLWrapperTest, InitDocumentEmptyAndUnknownKinds) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.InitDocument(doc_kind::empty);
    EXPECT_TRUE(x.IsEmpty());
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    const std::string before = x.XML();
    expectError([&] { x.InitDocument(8); }, errc::document_failure, "kind 8");
    expectError([&] { x.InitDocument(-1); }, errc::document_failure, "kind -1");
    EXPECT_EQ(x.XML(), before);
    x.SetAttribute("kept", "1");  // positions unchanged too
    EXPECT_NE(x.XML().find("<ErrCode kept=\"1\""), std::string::npos);
}

// --- names ---

TEST(XMLWrapperTest, NamesThatAreNotXmlNamesRaiseDocumentFailure) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major");
    const std::string before = x.XML();
    for (const std::string& bad :
         std::vector<std::string>{"", "1abc", "a b", "<x>", "a&b", "-a", ".a", "a>", "a\"b", "a=b",
                                  "a/b", "a\x01", std::string("\xC3", 1), std::string("a\0b", 3)}) {
        expectError([&] { x.AddElement(bad); }, errc::document_failure,
                    "not a valid XML element name");
        expectError([&] { x.AddChildElement(bad); }, errc::document_failure, "element name");
        expectError([&] { x.SetAttribute(bad, "v"); }, errc::document_failure, "attribute name");
        expectError([&] { x.SetChildAttribute(bad, "v"); }, errc::document_failure,
                    "attribute name");
    }
    EXPECT_EQ(x.XML(), before);
    XMLWrapper empty;
    expectError([&] { empty.AddElement("9"); }, errc::document_failure, "'9'");
    EXPECT_TRUE(empty.IsEmpty());
    // Valid names, including non-ASCII letters, digits after the first, '-', '.', ':', '_'.
    for (const std::string& good : std::vector<std::string>{"a", "_x", "A1-b.c", "ns:tag",
                                                            "Gr\xC3\xB6\xC3\x9F"
                                                            "e",
                                                            "\xE6\x97\xA5"}) {
        x.AddElement(good, "t");
        x.SetAttribute(good, "v");
        x.AddChildElement(good);
        x.SetChildAttribute(good, "w");
        EXPECT_EQ(x.GetChildValue(good), "t");
        EXPECT_EQ(x.GetChildAttribute(good, good), "v");
    }
    XMLWrapper back = loaded(x.XML());
    EXPECT_EQ(back.GetChildValue("Gr\xC3\xB6\xC3\x9F"
                                 "e"),
              "t");
}

// --- round trips ---

TEST(XMLWrapperTest, RoundTripThroughXmlText) {
    const std::vector<std::string> texts = {
        "plain",
        "a < b && c > d",
        "quote \" and 'apos'",
        "]]> and <![CDATA[",
        "line1\nline2",
        "tab\there",
        "  padded  ",
        "   ",
        "\n",
        "ctl\x01\x1F",
        "Gr\xC3\xB6\xC3\x9F"
        "e \xE2\x82\xAC",
        "latin1 \xE9 byte",
        "&amp; literal",
        "-17",
    };
    XMLWrapper x;
    x.InitDocument(doc_kind::datalog);
    x.SelectElement("Records");
    for (const std::string& t : texts) {
        x.AddElement("E", t);
        x.SetAttribute("a", t);
        x.AddChildElement("C", "", t);
        x.SetChildAttribute("b", t);
    }
    x.AddElement("Mixed", "head");
    x.AddChildElement("Inner", "", "in");

    XMLWrapper y;
    ASSERT_TRUE(y.LoadXML(x.XML())) << y.LastLoadError() << "\n" << x.XML();
    EXPECT_EQ(y.XML(), x.XML());
    y.SelectElement("Records");
    ASSERT_EQ(y.GetChildCount(), static_cast<std::int32_t>(texts.size()) + 1);
    for (std::size_t i = 0; i < texts.size(); ++i) {
        const auto k = static_cast<std::int32_t>(i);
        EXPECT_EQ(y.GetChildValueAt(k), texts[i]) << i;
        EXPECT_EQ(y.GetChildAttributeAt(k, "a"), texts[i]) << i;
    }
    y.MoveToChild("E");
    EXPECT_EQ(y.GetChildValue("C"), texts[0]);
    EXPECT_EQ(y.GetChildAttribute("C", "b"), texts[0]);
    y.SelectElement("Records");
    EXPECT_EQ(y.GetChildValue("Mixed"), "head");
    y.MoveToChild("Mixed");
    EXPECT_EQ(y.GetChildValue("Inner"), "in");
}

TEST(XMLWrapperTest, CarriageReturnComesBackAsLineFeed) {
    XMLWrapper x;
    x.AddElement("R");
    x.AddElement("T", "a\r\nb\rc");
    x.SetAttribute("a", "a\r\nb");
    XMLWrapper y = loaded(x.XML());
    EXPECT_EQ(y.GetChildValue("T"), "a\nb\nc");          // the documented exception
    EXPECT_EQ(y.GetChildAttribute("T", "a"), "a\r\nb");  // attributes keep it
}

TEST(XMLWrapperTest, TextEndsAtTheFirstZeroByte) {
    XMLWrapper x;
    x.AddElement("R");
    x.AddElement("T", std::string("ab\0cd", 5));
    EXPECT_EQ(x.GetChildValue("T"), "ab");
}

TEST(XMLWrapperTest, LoadXmlStartsThePositionsAfresh) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major");
    ASSERT_TRUE(
        x.LoadXML("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!-- c -->\n<New><A/></New>\n"));
    EXPECT_EQ(x.GetRootName(), "New");
    EXPECT_EQ(x.GetChildName(0), "A");
    EXPECT_EQ(x.LastLoadError(), "");
    expectError([&] { x.SetAttribute("a", "1"); }, errc::missing_object, "no element");
    expectError([&] { x.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    EXPECT_EQ(x.XML(), "<New>\n  <A />\n</New>\n");  // declaration and comment dropped
}

TEST(XMLWrapperTest, LoadXmlRefusesMalformedTextAndLeavesTheDocumentUnchanged) {
    const std::vector<std::string> bad = {
        "",
        "   ",
        "just text",
        "<R>",
        "<R></S>",
        "<R><A></R></A>",
        "<R a='1' a='2'/>",
        "<R a=1/>",
        "<R a='x<y'/>",
        "<R>&</R>",
        "<R>&undeclared;</R>",
        "<R>&#0;</R>",
        "<R>&#xD800;</R>",
        "<R>&#xZZ;</R>",
        "<R>a ]]> b</R>",
        "<R/><S/>",
        "<R/>trailing",
        "leading<R/>",
        "<R><!-- a -- b --></R>",
        "<R><![CDATA[x</R>",
        "<1R/>",
        "<R><a b='1'c='2'/></R>",
        "<R/><?xml version='1.0'?>",
        "<R><!ELEMENT x ANY></R>",
        "<!DOCTYPE R [<!ENTITY e 'x'>",
        "<R attr='unterminated/>",
    };
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major", "", "-17");
    x.SelectElement("ErrCode");
    const std::string before = x.XML();
    for (const std::string& text : bad) {
        EXPECT_FALSE(x.LoadXML(text)) << "accepted: " << text;
        EXPECT_NE(x.LastLoadError(), "") << text;
        EXPECT_EQ(x.XML(), before) << text;
    }
    // Positions unchanged as well.
    EXPECT_EQ(x.GetChildValue("Major"), "-17");
    x.SetAttribute("a", "1");
    x.SetChildAttribute("b", "2");
    EXPECT_NE(x.XML().find("<ErrCode a=\"1\">"), std::string::npos);
    EXPECT_NE(x.XML().find("<Major b=\"2\">"), std::string::npos);
    // An empty document stays empty.
    XMLWrapper e;
    EXPECT_FALSE(e.LoadXML("<R>"));
    EXPECT_TRUE(e.IsEmpty());
}

TEST(XMLWrapperTest, LoadXmlRefusesNestingDeeperThan256) {
    auto nested = [](int depth) {
        std::string t;
        for (int i = 0; i < depth; ++i) t += "<a>";
        for (int i = 0; i < depth; ++i) t += "</a>";
        return t;
    };
    XMLWrapper x;
    EXPECT_TRUE(x.LoadXML(nested(256))) << x.LastLoadError();
    EXPECT_EQ(x.CountElements("a"), 255);
    EXPECT_FALSE(x.LoadXML(nested(257)));
    EXPECT_NE(x.LastLoadError().find("256"), std::string::npos) << x.LastLoadError();
    EXPECT_FALSE(x.LoadXML(nested(100000)));
    EXPECT_EQ(x.CountElements("a"), 255);
}

TEST(XMLWrapperTest, LoadXmlAcceptsOrdinaryWellFormedText) {
    for (const std::string& good : std::vector<std::string>{
             "<R/>",
             "\xEF\xBB\xBF<R/>",
             "<?xml version='1.0'?><R a=\"1\" b='&lt;&amp;&#65;&#x42;'>&gt;&quot;&apos;</R>",
             "<R\n  a = '1'\n>x</R >",
             "<!DOCTYPE R><R/>",
             "<!-- a --><?pi data?><R><?p?><!----></R><!-- end -->\n",
             "<R><![CDATA[ & < ]] > ]]></R>",
         }) {
        XMLWrapper x;
        EXPECT_TRUE(x.LoadXML(good)) << good << ": " << x.LastLoadError();
        EXPECT_EQ(x.GetRootName(), "R");
    }
    XMLWrapper x = loaded("<R b='&lt;&amp;&#65;&#x42;'><T>&gt;&quot;&apos;</T></R>");
    x.AddElement("Z");
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildValue("T"), ">\"'");
    XMLWrapper y = loaded(x.XML());
    EXPECT_EQ(y.GetChildValue("T"), ">\"'");
}

// --- entities and DTDs: nothing outside the text is read or expanded ---

TEST(XMLWrapperTest, ExternalEntitiesAndDtdsAreNeverExpanded) {
    TempDir dir;
    const std::string secret = dir.file("secret.txt", "TOPSECRET");
    const std::string dtd = dir.file("ext.dtd", "<!ENTITY ext 'FROMDTD'>");
    const std::string docs[] = {
        "<!DOCTYPE R [<!ENTITY xxe SYSTEM \"file://" + secret + "\">]><R><A>&xxe;</A></R>",
        "<!DOCTYPE R [<!ENTITY xxe SYSTEM \"" + secret + "\">]><R><A>&xxe;</A></R>",
        "<!DOCTYPE R SYSTEM \"file://" + dtd + "\"><R><A>&ext;</A></R>",
        "<!DOCTYPE R PUBLIC \"-//X//Y\" \"" + dtd + "\"><R><A>&ext;</A></R>",
        "<!DOCTYPE R [<!ENTITY % p SYSTEM \"file://" + dtd + "\"> %p;]><R><A>&ext;</A></R>",
    };
    for (const std::string& text : docs) {
        XMLWrapper x;
        ASSERT_TRUE(x.LoadXML(text)) << text << ": " << x.LastLoadError();
        const std::string value = x.GetChildValue("A");
        EXPECT_TRUE(value == "&xxe;" || value == "&ext;") << value;
        EXPECT_EQ(x.XML().find("TOPSECRET"), std::string::npos);
        EXPECT_EQ(x.XML().find("FROMDTD"), std::string::npos);
        EXPECT_EQ(x.XML().find("DOCTYPE"), std::string::npos);  // the DOCTYPE is dropped
        // Written back, the reference is plain text.
        XMLWrapper y = loaded(x.XML());
        EXPECT_EQ(y.GetChildValue("A"), value);
    }
    // The same through a file.
    const std::string path = dir.file("xxe.xml", docs[0]);
    XMLWrapper f;
    ASSERT_TRUE(f.LoadFile(path));
    EXPECT_EQ(f.GetChildValue("A"), "&xxe;");
}

TEST(XMLWrapperTest, InternalEntitiesAreNotExpandedEither) {
    // "Billion laughs": lol9 would expand to 10^9 copies of "lol".
    std::string laughs = "<!DOCTYPE R [<!ENTITY lol0 \"lol\">";
    for (int i = 1; i <= 9; ++i) {
        laughs += "<!ENTITY lol" + std::to_string(i) + " \"";
        for (int k = 0; k < 10; ++k) laughs += "&lol" + std::to_string(i - 1) + ";";
        laughs += "\">";
    }
    laughs += "]><R><A>&lol9;</A><B attr='&lol9;'/></R>";
    XMLWrapper x;
    ASSERT_TRUE(x.LoadXML(laughs)) << x.LastLoadError();
    EXPECT_EQ(x.GetChildValue("A"), "&lol9;");
    EXPECT_EQ(x.GetChildAttribute("B", "attr"), "&lol9;");
    EXPECT_LT(x.XML().size(), 200u);
}

// --- files ---

TEST(XMLWrapperTest, SaveFileAndLoadFileRoundTrip) {
    TempDir dir;
    XMLWrapper x;
    x.InitDocument(doc_kind::device_info);
    x.SelectElement("DeviceInfo");
    x.AddElement("SN", "ABC123");
    x.AddElement("Name", "Corvia(R) Pellis(R) \xE2\x84\xA2");
    x.AddElement("Class", "0");
    x.SetAttribute("Txt", "Glucose Meter");
    x.SelectElement("PortInfo");
    x.AddElement("PortID", "3");
    const std::string path = dir.file("device.xml");
    x.SaveFile(path);

    std::ifstream in(path, std::ios::binary);
    std::string saved((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    EXPECT_EQ(saved.rfind("<?xml version=\"1.0\"", 0), 0u) << saved;

    XMLWrapper y;
    ASSERT_TRUE(y.LoadFile(path)) << y.LastLoadError();
    EXPECT_EQ(y.XML(), x.XML());
    y.SelectElement("PortInfo");
    EXPECT_EQ(y.GetChildValue("PortID"), "3");
    y.SelectElement("DeviceInfo");
    EXPECT_EQ(y.GetChildAttribute("Class", "Txt"), "Glucose Meter");
    EXPECT_EQ(y.GetChildValue("Name"), "Corvia(R) Pellis(R) \xE2\x84\xA2");

    // A UTF-8 byte-order mark is accepted.
    XMLWrapper z;
    EXPECT_TRUE(z.LoadFile(dir.file("bom.xml", "\xEF\xBB\xBF<R><A>1</A></R>")));
    EXPECT_EQ(z.GetChildValue("A"), "1");
}

TEST(XMLWrapperTest, FileFailures) {
    TempDir dir;
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    const std::string before = x.XML();
    const std::string missing = (dir.path / "missing.xml").string();
    expectError([&] { x.LoadFile(missing); }, errc::document_failure, "missing.xml");
    expectError([&] { x.LoadFile(dir.path.string()); }, errc::document_failure, "cannot read");
    EXPECT_FALSE(x.LoadFile(dir.file("bad.xml", "<R><A></R>")));
    EXPECT_NE(x.LastLoadError(), "");
    EXPECT_FALSE(x.LoadFile(dir.file("utf16.xml", std::string("\xFF\xFE<\0R\0/\0>\0", 10))));
    EXPECT_NE(x.LastLoadError().find("UTF-16"), std::string::npos);
    EXPECT_EQ(x.XML(), before);
    expectError([&] { x.SaveFile((dir.path / "no/such/dir/out.xml").string()); },
                errc::document_failure, "out.xml");
    XMLWrapper empty;
    expectError([&] { empty.SaveFile(dir.file("empty.xml")); }, errc::missing_object, "SaveFile");
}

// --- copy and move ---

TEST(XMLWrapperTest, CopiesAreDeepAndKeepThePositions) {
    XMLWrapper x;
    x.InitDocument(doc_kind::datalog);
    x.SelectElement("TransferDetail");
    x.AddElement("Records");
    x.AddChildElement("Total", "", "1");
    x.SelectElement("DeviceInfo");

    XMLWrapper c(x);
    EXPECT_EQ(c.XML(), x.XML());
    c.AddElement("SN", "copy");        // current: DeviceInfo
    c.SetAttribute("k", "v");          // last added: SN (in the copy)
    c.AddChildElement("Sub");          // under SN
    x.SetChildAttribute("orig", "1");  // the original's last child is still Total
    EXPECT_EQ(x.GetChildCount(), 0);
    EXPECT_EQ(c.GetChildCount(), 1);
    EXPECT_EQ(x.XML().find("copy"), std::string::npos);
    EXPECT_EQ(c.XML().find("orig"), std::string::npos);

    XMLWrapper d = loaded("<Other/>");
    d = x;
    d.SetChildAttribute("again", "2");  // positions came with the assignment
    EXPECT_NE(d.XML().find("<Total orig=\"1\" again=\"2\">"), std::string::npos) << d.XML();
    d = d;  // self-assignment is harmless
    EXPECT_EQ(d.GetRootName(), "Datalog");
}

TEST(XMLWrapperTest, MovedFromObjectIsAnEmptyDocument) {
    XMLWrapper x;
    x.InitDocument(doc_kind::status);
    x.AddElement("ErrCode");
    XMLWrapper y(std::move(x));
    y.SetAttribute("moved", "1");
    EXPECT_NE(y.XML().find("moved"), std::string::npos);
    EXPECT_TRUE(x.IsEmpty());  // NOLINT(bugprone-use-after-move): documented behaviour
    EXPECT_EQ(x.XML(), "");
    expectError([&] { x.GetChildCount(); }, errc::missing_object, "empty");
    x.AddElement("Fresh");
    EXPECT_EQ(x.GetRootName(), "Fresh");
    XMLWrapper z;
    z = std::move(y);
    EXPECT_EQ(z.GetRootName(), "Status");
    EXPECT_TRUE(y.IsEmpty());  // NOLINT(bugprone-use-after-move)
    y.InitDocument(doc_kind::filter);
    EXPECT_EQ(y.GetRootName(), "Filter");
}

// --- the documents of docs/documents.md, built the way a client does ---

TEST(XMLWrapperTest, ConnectionDocumentAsDiscoveryReadsIt) {
    XMLWrapper conn;
    conn.InitDocument(doc_kind::connection_info);
    conn.SelectElement("Ports");
    conn.AddElement("COM");
    conn.AddChildElement("PortsToSearch", "", "3,4");
    EXPECT_EQ(conn.XML(),
              "<ConnectionInfo>\n  <Ports>\n    <COM>\n      <PortsToSearch>3,4</PortsToSearch>\n"
              "    </COM>\n  </Ports>\n</ConnectionInfo>\n");
    // Discovery reads the connection document this way.
    conn.MoveToRoot();
    conn.SelectElement("Ports");
    const std::int32_t n = conn.GetChildCount();
    const std::string name = conn.GetChildName(n - 1);
    EXPECT_EQ(name, "COM");
    conn.MoveToChild(name);
    EXPECT_EQ(conn.GetChildValue("PortsToSearch"), "3,4");
}
