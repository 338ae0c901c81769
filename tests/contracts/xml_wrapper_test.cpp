// The XML document component: the operations, the three positions, errors,
// text round trips, entity safety, files, copies.
#include "varnel/xml_wrapper.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "support/expect_error.h"
#include "support/temp_dir.h"
#include "support/wrapper_fixture.h"
#include "varnel/component_error.h"

using namespace varnel;
using varnel::test::newDoc;
using namespace std::string_literals;

namespace {

using test::expectError;
using test::TempDir;

XMLWrapper loaded(const std::string& text) {
    XMLWrapper x;
    EXPECT_TRUE(x.LoadXML(text)) << x.LastLoadError();
    return x;
}

// The status document a request writes: ErrCode/Major, ErrCode/Minor, ErrDesc.
XMLWrapper statusDoc() {
    XMLWrapper x = newDoc(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major", "", "-17");
    x.AddChildElement("Minor", "", "-19");
    x.AddElement("ErrDesc", "Bad parameter passed to the function ; Port number from XML file is invalid");
    x.AddElement("VBTrace");
    return x;
}

}  // namespace

TEST(XMLWrapperTest, EmptyDocumentRaisesMissingObjectUntilAnElementIsAdded) {
    XMLWrapper x;
    EXPECT_TRUE(x.IsEmpty());
    EXPECT_EQ(x.XML(), "");
    const std::vector<std::pair<const char*, std::function<void()>>> ops = {
        {"GetChildValue", [&] { x.GetChildValue("A"); }},
        {"SelectElement", [&] { x.SelectElement("A"); }},
        {"AddChildElement", [&] { x.AddChildElement("A"); }},
    };
    for (const auto& [op, call] : ops)
        expectError(call, errc::missing_object, std::string(op) + ": the document is empty");

    x.AddElement("Root", "r");  // the document element: current and last added
    x.SetAttribute("k", "old");
    x.SetAttribute("k", "v");  // replaced, not doubled
    x.AddElement("A", "1");
    x.AddElement("B");
    EXPECT_EQ(x.XML(), "<Root k=\"v\">r<A>1</A>\n  <B />\n</Root>\n");
}

TEST(XMLWrapperTest, AddChildElementPlacesUnderTheLastAddedOrTheNamedParent) {
    XMLWrapper x = newDoc(doc_kind::filter);
    x.AddElement("Top");
    x.AddChildElement("Pre");
    x.AddChildElement("Insulin", "Pre", "1");
    x.AddChildElement("Pre");
    x.AddChildElement("Insulin", "Pre", "2");  // the last direct child of the name
    x.AddChildElement("Strip");
    x.AddChildElement("Lvl", "Strip", "1");
    x.AddChildElement("Note", "Lvl", "a");  // no direct Lvl: the last one below
    x.AddChildElement("Lvl", "Strip", "2");
    x.AddChildElement("Pre", "Lvl");
    x.AddChildElement("Insulin", "Pre", "3");  // a direct Pre wins over a later, deeper one
    x.SetChildAttribute("Txt", "Rapid");
    EXPECT_EQ(x.XML(),
              "<Filter>\n  <Top>\n    <Pre>\n      <Insulin>1</Insulin>\n    </Pre>\n"
              "    <Pre>\n      <Insulin>2</Insulin>\n      <Insulin Txt=\"Rapid\">3</Insulin>\n    </Pre>\n"
              "    <Strip>\n      <Lvl>1<Note>a</Note>\n      </Lvl>\n      <Lvl>2<Pre />\n      </Lvl>\n"
              "    </Strip>\n  </Top>\n</Filter>\n");

    const std::string before = x.XML();
    expectError([&] { x.AddChildElement("Minor", "Nowhere", "-19"); }, errc::missing_object, "'Nowhere'");
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("Txt", "Long");  // the last added child did not move
    EXPECT_NE(x.XML().find("<Insulin Txt=\"Long\">3"), std::string::npos);
}

TEST(XMLWrapperTest, TheThreePositionsAreIndependent) {
    XMLWrapper x = newDoc(doc_kind::datalog);
    x.SelectElement("TransferDetail");
    x.AddElement("Records");                  // last added: TransferDetail/Records
    x.AddChildElement("Total", "", "5");      // last child: .../Total
    x.AddElement("ExtraInfo");                // last added moves; last child stays
    x.SetChildAttribute("seen", "yes");       // still on Total
    x.AddChildElement("GlucCalib", "", "0");  // under ExtraInfo
    x.SelectElement("DeviceInfo");            // current moves; the others do not
    x.SetAttribute("on", "ExtraInfo");
    x.AddChildElement("GlucUnit", "", "0");
    x.AddElement("SN", "X1");  // under the current element
    EXPECT_EQ(x.XML(),
              "<Datalog>\n  <DeviceInfo>\n    <SN>X1</SN>\n  </DeviceInfo>\n  <TransferDetail>\n"
              "    <Records>\n      <Total seen=\"yes\">5</Total>\n    </Records>\n"
              "    <ExtraInfo on=\"ExtraInfo\">\n      <GlucCalib>0</GlucCalib>\n      <GlucUnit>0</GlucUnit>\n"
              "    </ExtraInfo>\n  </TransferDetail>\n  <Records />\n</Datalog>\n");
}

TEST(XMLWrapperTest, InitDocumentSkeletonsStartAfresh) {
    static_assert(doc_kind::device_settings == 2 && doc_kind::device_caps == 4 && doc_kind::status == 7);
    // Every skeleton is pinned by its schema; here, that one replaces the document and its positions.
    XMLWrapper d = statusDoc();
    d.MoveToChild("ErrCode");
    d.InitDocument(doc_kind::datalog);
    EXPECT_EQ(d.XML(), "<Datalog>\n  <DeviceInfo />\n  <TransferDetail />\n  <Records />\n</Datalog>\n");
    expectError([&] { d.SetAttribute("a", "1"); }, errc::missing_object, "no element");
    expectError([&] { d.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    d.AddElement("New");  // under the document element
    d.MoveToRoot();
    EXPECT_EQ(d.GetChildName(3), "New");

    XMLWrapper x = statusDoc();
    const std::string before = x.XML();
    for (std::int32_t bad : {8, -1})
        expectError([&] { x.InitDocument(bad); }, errc::document_failure, "kind " + std::to_string(bad));
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("kept", "1");  // positions unchanged too
    EXPECT_NE(x.XML().find("<Minor kept=\"1\">"), std::string::npos);
    x.InitDocument(doc_kind::empty);
    EXPECT_TRUE(x.IsEmpty());
}

TEST(XMLWrapperTest, NamesMustBeXmlNames) {
    XMLWrapper x = statusDoc();
    const std::string before = x.XML();
    for (const std::string& bad : {""s, "1abc"s, "a b"s, "a\x01"s, "\xC3"s, "a\0b"s}) {
        SCOPED_TRACE(bad);
        expectError([&] { x.AddElement(bad); }, errc::document_failure, "not a valid XML element name");
        expectError([&] { x.AddChildElement(bad); }, errc::document_failure, "element name");
        expectError([&] { x.SetAttribute(bad, "v"); }, errc::document_failure, "attribute name");
        expectError([&] { x.SetChildAttribute(bad, "v"); }, errc::document_failure, "attribute name");
    }
    EXPECT_EQ(x.XML(), before);
    XMLWrapper empty;
    expectError([&] { empty.AddElement("9"); }, errc::document_failure, "'9'");
    EXPECT_TRUE(empty.IsEmpty());

    for (const std::string good : {"A1-b.c", "ns:tag", "\xE6\x97\xA5"}) {
        x.AddElement(good, "t");
        x.SetAttribute(good, "v");
        x.AddChildElement(good);
        x.SetChildAttribute(good, "w");
        EXPECT_EQ(loaded(x.XML()).GetChildAttribute(good, good), "v") << good;
    }
}

TEST(XMLWrapperTest, NavigationAndReading) {
    XMLWrapper x = loaded("<R><A n='1'><B/></A><A n='2'/></R>");
    x.MoveToChild("A");  // the first of the name
    EXPECT_EQ(x.GetChildName(0), "B");
    expectError([&] { x.MoveToChild("C"); }, errc::missing_object, "'C'");
    expectError([&] { x.MoveToChild("b"); }, errc::missing_object, "'b'");  // case matters
    x.MoveToChild("B");                                                     // the failures left A current
    EXPECT_EQ(x.GetRootName(), "R");
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildAttributeAt(1, "n"), "2");

    // SelectElement searches level by level from the document element: the
    // deepest T comes first in document order, the first of the nearest level wins.
    x = loaded("<R><A><B><T><deep/></T></B><T><first/></T></A><C><T><second/></T></C></R>");
    x.SelectElement("B");
    x.SelectElement("T");
    EXPECT_EQ(x.GetChildName(0), "first");
    x.SelectElement("R");  // the document element itself counts
    EXPECT_EQ(x.GetChildCount(), 2);
    x.SelectElement("C");
    expectError([&] { x.SelectElement("Missing"); }, errc::missing_object, "'Missing'");
    EXPECT_EQ(x.GetChildName(0), "T");  // current unchanged

    // Only elements are children; absent names and attributes read as "".
    x = loaded("<Settings>t<!-- c --><A a='1'>v</A><?pi x?><B><![CDATA[<2>]]></B>tail<E/></Settings>");
    EXPECT_EQ(x.GetChildCount(), 3);
    EXPECT_EQ(x.GetChildName(2), "E");
    EXPECT_EQ(x.GetChildValue("B"), "<2>");
    EXPECT_EQ(x.GetChildValueAt(2), "");
    EXPECT_EQ(x.GetChildValue("Nope"), "");
    EXPECT_EQ(x.GetChildAttribute("A", "nope"), "");

    for (std::int32_t bad : {-1, 3}) {
        const std::string idx = "index " + std::to_string(bad) + " outside the 3 children of 'Settings'";
        expectError([&] { x.GetChildValueAt(bad); }, errc::subscript_out_of_range, idx);
    }

    // CountElements: descendants at every depth of the current element, not the element itself.
    x = loaded("<X><X><Y><X/></Y></X><Z><X/></Z><S><C/><I><C/></I></S></X>");
    EXPECT_EQ(x.CountElements("X"), 3);
    x.MoveToChild("X");
    EXPECT_EQ(x.CountElements("X"), 1);
    EXPECT_EQ(x.CountElements("C"), 0);
    x.SelectElement("I");
    EXPECT_EQ(x.CountElements("C"), 1);
}

// Escaping is the library's (every written text reads back: xml_hostile_test); blanks, zero bytes and line ends are ours.
TEST(XMLWrapperTest, BlanksZeroBytesAndLineEndsInTexts) {
    XMLWrapper z;
    z.AddElement("R");
    z.AddElement("W", "   ");
    z.AddElement("T", "a\r\nb\rc");
    z.SetAttribute("a", "a\r\nb");
    z.AddElement("Z", std::string("ab\0cd", 5));
    EXPECT_EQ(z.GetChildValue("Z"), "ab");  // a text ends at its first zero byte
    z = loaded(z.XML());
    EXPECT_EQ(z.GetChildValue("T"), "a\nb\nc");          // line-end normalisation
    EXPECT_EQ(z.GetChildAttribute("T", "a"), "a\r\nb");  // attributes keep it
    EXPECT_EQ(z.GetChildValue("W"), "   ");
}

TEST(XMLWrapperTest, LoadXmlReplacesTheDocumentOrRefusesAndChangesNothing) {
    XMLWrapper x = statusDoc();
    ASSERT_TRUE(x.LoadXML("\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!-- c -->\n<New><A/></New>\n"));
    EXPECT_EQ(x.XML(), "<New>\n  <A />\n</New>\n");  // declaration and comment dropped
    expectError([&] { x.SetAttribute("a", "1"); }, errc::missing_object, "no element");
    expectError([&] { x.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    EXPECT_EQ(x.GetChildName(0), "A");

    EXPECT_TRUE(x.LoadXML("<!DOCTYPE R><R/>")) << x.LastLoadError();

    // Malformed text is refused and changes nothing (hostile text: xml_hostile_test).
    const char* bad[] = {"", "just text", "<R></S>", "<R/><S/>", "<R/>trailing"};
    x = statusDoc();
    x.SelectElement("ErrCode");
    const std::string before = x.XML();
    for (const char* text : bad) {
        EXPECT_FALSE(x.LoadXML(text)) << "accepted: " << text;
        EXPECT_NE(x.LastLoadError(), "") << text;
        EXPECT_EQ(x.XML(), before) << text;
    }
    EXPECT_EQ(x.GetChildValue("Major"), "-17");  // positions unchanged as well
    x.SetAttribute("a", "1");
    x.SetChildAttribute("b", "2");
    EXPECT_NE(x.XML().find("<VBTrace a=\"1\" />"), std::string::npos);
    EXPECT_NE(x.XML().find("<Minor b=\"2\">"), std::string::npos);
    XMLWrapper e;
    EXPECT_FALSE(e.LoadXML("<R>"));
    EXPECT_TRUE(e.IsEmpty());

    EXPECT_NE(x.LastLoadError(), "");
    EXPECT_TRUE(x.LoadXML("<R/>"));
    EXPECT_EQ(x.LastLoadError(), "");  // forgotten after a successful load
}

TEST(XMLWrapperTest, EntitiesAndDtdsAreNeverExpanded) {
    TempDir dir;
    const std::string secret = dir.file("secret.txt", "TOPSECRET");
    const std::string dtd = dir.file("ext.dtd", "<!ENTITY ext 'FROMDTD'>");
    // An external subset is named, never read: its entities stay as written.
    {
        XMLWrapper x = loaded("<!DOCTYPE R SYSTEM \"file://" + dtd + "\"><R><A>&ext;</A><B attr='&ext;'/></R>");
        EXPECT_EQ(x.GetChildAttribute("B", "attr"), "&ext;");
        EXPECT_EQ(x.XML().find("DOCTYPE"), std::string::npos);   // dropped
        EXPECT_EQ(loaded(x.XML()).GetChildValue("A"), "&ext;");  // written back as plain text
    }
    // Entities would be declared in an internal subset: refused, whatever it holds.
    const std::string internal[] = {
        "<!DOCTYPE R [<!ENTITY xxe SYSTEM \"file://" + secret + "\">]><R><A>&xxe;</A></R>",
        "<!DOCTYPE R [<!ENTITY % p SYSTEM \"file://" + dtd + "\"> %p;]><R><A>&ext;</A></R>",
    };
    XMLWrapper x = loaded("<Kept/>");
    for (const std::string& text : internal) {
        EXPECT_FALSE(x.LoadXML(text)) << text;
        EXPECT_NE(x.LastLoadError().find("internal subset"), std::string::npos) << x.LastLoadError();
        EXPECT_EQ(x.GetRootName(), "Kept");
    }
    EXPECT_FALSE(x.LoadFile(dir.file("xxe.xml", internal[0])));
    EXPECT_EQ(x.GetRootName(), "Kept");
}

TEST(XMLWrapperTest, SaveFileAndLoadFile) {
    TempDir dir;
    XMLWrapper x = statusDoc();
    x.AddElement("Name", "Corvia(R) Pellis(R) \xE2\x84\xA2");
    const std::string path = dir.file("status.xml");
    x.SaveFile(path);
    std::string first;
    std::getline(std::ifstream(path), first);
    EXPECT_EQ(first.rfind("<?xml version=\"1.0\"", 0), 0u) << first;
    XMLWrapper y;
    ASSERT_TRUE(y.LoadFile(path)) << y.LastLoadError();
    EXPECT_EQ(y.XML(), x.XML());

    const std::string before = x.XML();
    expectError([&] { x.LoadFile((dir.path / "missing.xml").string()); }, errc::document_failure, "missing.xml");
    // A directory: opened but unreadable on POSIX, not even opened on Windows.
    expectError([&] { x.LoadFile(dir.path.string()); }, errc::document_failure, "LoadFile: cannot ");
    EXPECT_FALSE(x.LoadFile(dir.file("bad.xml", "<R><A></R>")));
    EXPECT_NE(x.LastLoadError(), "");
    EXPECT_FALSE(x.LoadFile(dir.file("utf16.xml", std::string("\xFF\xFE<\0R\0/\0>\0", 10))));
    EXPECT_NE(x.LastLoadError().find("UTF-16"), std::string::npos);
    EXPECT_EQ(x.XML(), before);
    expectError([&] { x.SaveFile((dir.path / "no/such/dir/out.xml").string()); }, errc::document_failure, "out.xml");
    expectError([&] { XMLWrapper().SaveFile(dir.file("empty.xml")); }, errc::missing_object, "SaveFile");
}

TEST(XMLWrapperTest, CopiesAreDeepAndKeepThePositionsMovesLeaveAnEmptyDocument) {
    XMLWrapper x = newDoc(doc_kind::datalog);
    x.SelectElement("TransferDetail");
    x.AddElement("Records");
    x.AddChildElement("Total", "", "1");
    x.SelectElement("DeviceInfo");

    XMLWrapper c(x);
    c.AddElement("SN", "copy");        // current: DeviceInfo
    c.AddChildElement("Sub");          // last added: SN, in the copy only
    x.SetChildAttribute("orig", "1");  // the original's last child is still Total
    EXPECT_EQ(x.GetChildCount(), 0);
    EXPECT_EQ(c.GetChildCount(), 1);
    EXPECT_NE(c.XML().find("<SN>copy<Sub />"), std::string::npos) << c.XML();

    XMLWrapper d = loaded("<Other/>");
    d = x;
    d.SetChildAttribute("again", "2");
    EXPECT_NE(d.XML().find("<Total orig=\"1\" again=\"2\">"), std::string::npos) << d.XML();

    // A moved-from object is an empty document, and usable.
    XMLWrapper y(std::move(d));
    y.SetChildAttribute("moved", "3");
    EXPECT_NE(y.XML().find("again=\"2\" moved=\"3\""), std::string::npos);
    EXPECT_TRUE(d.IsEmpty());  // NOLINT(bugprone-use-after-move): documented behaviour
    EXPECT_EQ(d.XML(), "");
    expectError([&] { d.GetChildCount(); }, errc::missing_object, "empty");
    d.AddElement("Fresh");
    EXPECT_EQ(d.GetRootName(), "Fresh");
}
