// The XML document component: the operations, the three positions, errors, files, copies,
// the writers' append path; and under hostile input: text it must refuse with a clear reason,
// values it must not write, the size and depth limits, running out of memory, and indexed
// access that stays linear however many children there are.
#include "varnel/xml_wrapper.h"

#include <gtest/gtest.h>

#include <fstream>
#include <functional>
#include <string>
#include <utility>

#include "contracts/xml_index_steps.h"
#include "contracts/xml_wrapper_append.h"
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

// The document as XML() writes it, without the line breaks and indentation (pinned once, below).
std::string flat(const XMLWrapper& x) {
    std::string xml = x.XML();
    for (std::size_t at; (at = xml.find('\n')) != std::string::npos;)
        xml.erase(at, xml.find_first_not_of(' ', at + 1) - at);
    return xml;
}

// A document to load over, and what it looked like before.
XMLWrapper kept() {
    XMLWrapper x = loaded("<Kept><A>1</A></Kept>");
    x.MoveToChild("A");
    return x;
}

std::string nested(int depth, const std::string& inner = "") {
    std::string open, close;
    for (int i = 0; i < depth; ++i) open += "<a>", close += "</a>";
    return open + inner + close;
}

// The status document a request writes: ErrCode/Major, ErrCode/Minor, ErrDesc.
XMLWrapper statusDoc() {
    XMLWrapper x = newDoc(doc_kind::status);
    x.AddElement("ErrCode");
    x.AddChildElement("Major", "", "-17");
    x.AddChildElement("Minor", "", "-19");
    x.AddElement("ErrDesc", "Bad parameter passed to the function ; Port number from XML file is invalid");
    return x;
}

}  // namespace

TEST(XMLWrapperTest, EmptyDocumentRaisesMissingObjectUntilAnElementIsAdded) {
    XMLWrapper x;
    EXPECT_TRUE(x.IsEmpty());
    EXPECT_EQ(x.XML(), "");
    const std::pair<const char*, std::function<void()>> ops[] = {
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
    EXPECT_EQ(flat(x),
              "<Filter><Top><Pre><Insulin>1</Insulin></Pre><Pre><Insulin>2</Insulin><Insulin Txt=\"Rapid\">3</Insulin>"
              "</Pre><Strip><Lvl>1<Note>a</Note></Lvl><Lvl>2<Pre /></Lvl></Strip></Top></Filter>");

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
    x.AddElement("SN", "X1");  // under the current element
    EXPECT_EQ(flat(x),
              "<Datalog><DeviceInfo><SN>X1</SN></DeviceInfo><TransferDetail><Records><Total seen=\"yes\">5</Total>"
              "</Records><ExtraInfo on=\"ExtraInfo\"><GlucCalib>0</GlucCalib></ExtraInfo></TransferDetail><Records />"
              "</Datalog>");
}

TEST(XMLWrapperTest, InitDocumentAndLoadXmlStartAfreshOrChangeNothing) {
    // Every skeleton is pinned by its schema; here, that one replaces the document and its positions.
    XMLWrapper d = statusDoc();
    d.MoveToChild("ErrCode");
    d.InitDocument(doc_kind::datalog);
    EXPECT_EQ(flat(d), "<Datalog><DeviceInfo /><TransferDetail /><Records /></Datalog>");
    expectError([&] { d.SetAttribute("a", "1"); }, errc::missing_object, "no element");
    expectError([&] { d.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    d.AddElement("New");  // under the document element
    d.MoveToRoot();
    EXPECT_EQ(d.GetChildName(3), "New");
    // A load does the same; the declaration, a byte-order mark and comments are dropped.
    ASSERT_TRUE(d.LoadXML("\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!-- c -->\n<New><A/></New>\n"));
    EXPECT_EQ(d.XML(), "<New>\n  <A />\n</New>\n");
    expectError([&] { d.SetChildAttribute("a", "1"); }, errc::missing_object, "no child");
    EXPECT_EQ(d.GetChildName(0), "A");

    XMLWrapper x = statusDoc();
    const std::string before = x.XML();
    for (std::int32_t bad : {8, -1})
        expectError([&] { x.InitDocument(bad); }, errc::document_failure, "kind " + std::to_string(bad));
    EXPECT_FALSE(x.LoadXML("<R></S>"));  // every other refusal: XMLHostileText below
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("kept", "1");  // positions unchanged too
    EXPECT_NE(x.XML().find("<Minor kept=\"1\">"), std::string::npos);
    EXPECT_TRUE(x.LoadXML("<R/>"));
    EXPECT_EQ(x.LastLoadError(), "");  // forgotten after a successful load
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
        EXPECT_EQ(loaded(x.XML()).GetChildAttribute(good, good), "v") << good;
    }
}

TEST(XMLWrapperTest, NavigationAndReading) {
    XMLWrapper x = loaded("<R><A n='1'><B/></A><A n='2'/></R>");
    x.MoveToChild("A");  // the first of the name
    EXPECT_EQ(x.GetChildName(0), "B");
    expectError([&] { x.MoveToChild("b"); }, errc::missing_object, "'b'");  // case matters
    x.MoveToChild("B");                                                     // the failure left A current
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
    EXPECT_EQ(x.GetChildName(2), "E");
    EXPECT_EQ(x.GetChildValue("B"), "<2>");
    EXPECT_EQ(x.GetChildValueAt(2), "");
    EXPECT_EQ(x.GetChildValue("Nope"), "");
    EXPECT_EQ(x.GetChildAttribute("A", "nope"), "");
    for (std::int32_t bad : {-1, 3})
        expectError([&] { x.GetChildValueAt(bad); }, errc::subscript_out_of_range,
                    "index " + std::to_string(bad) + " outside the 3 children of 'Settings'");

    // CountElements: descendants at every depth of the current element, not the element itself.
    x = loaded("<X><X><Y><X/></Y></X><Z><X/></Z><S><C/><I><C/></I></S></X>");
    EXPECT_EQ(x.CountElements("X"), 3);
    x.MoveToChild("X");
    EXPECT_EQ(x.CountElements("X"), 1);
    EXPECT_EQ(x.CountElements("C"), 0);
}

TEST(XMLWrapperTest, AnExternalSubsetIsNamedNeverRead) {
    TempDir dir;
    const std::string dtd = dir.file("ext.dtd", "<!ENTITY ext 'FROMDTD'>");
    XMLWrapper x = loaded("<!DOCTYPE R SYSTEM \"file://" + dtd + "\"><R><A>&ext;</A><B attr='&ext;'/></R>");
    EXPECT_EQ(x.GetChildAttribute("B", "attr"), "&ext;");
    EXPECT_EQ(x.XML().find("DOCTYPE"), std::string::npos);   // dropped
    EXPECT_EQ(loaded(x.XML()).GetChildValue("A"), "&ext;");  // written back as plain text
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
    EXPECT_FALSE(x.LoadFile(dir.file("utf16.xml", std::string("\xFF\xFE<\0R\0/\0>\0", 10))));
    EXPECT_NE(x.LastLoadError().find("UTF-16"), std::string::npos);
    EXPECT_EQ(x.XML(), before);
    expectError([&] { x.SaveFile((dir.path / "no/such/dir/out.xml").string()); }, errc::document_failure, "out.xml");
    expectError([&] { XMLWrapper().SaveFile(dir.file("empty.xml")); }, errc::missing_object, "SaveFile");
}

TEST(XMLWrapperTest, CopiesAreDeepAndKeepThePositionsMovesLeaveAnEmptyDocument) {
    XMLWrapper x = statusDoc();
    x.SelectElement("ErrCode");
    XMLWrapper c(x);
    c.AddElement("SN", "copy");  // current: ErrCode; last added: SN, in the copy only
    c.AddChildElement("Sub");
    x.SetChildAttribute("orig", "1");  // the original's last child is still Minor
    EXPECT_EQ(x.CountElements("SN"), 0);
    EXPECT_NE(c.XML().find("<SN>copy<Sub />"), std::string::npos) << c.XML();

    XMLWrapper d = loaded("<Other/>");
    d = x;
    d.SetChildAttribute("again", "2");
    // A moved-from object is an empty document, and usable.
    XMLWrapper y(std::move(d));
    y.SetChildAttribute("moved", "3");
    EXPECT_NE(y.XML().find("<Minor orig=\"1\" again=\"2\" moved=\"3\">"), std::string::npos) << y.XML();
    EXPECT_TRUE(d.IsEmpty());  // NOLINT(bugprone-use-after-move): documented behaviour
    d.AddElement("Fresh");
    EXPECT_EQ(d.GetRootName(), "Fresh");
}

// The writers' append path skips the lookup of an attribute only where the element
// cannot have one of that name yet, so a repeated name still replaces.
TEST(XmlAppend, RepeatedNamesReplaceOnEveryPathIntoTheElement) {
    XMLWrapper doc = newDoc(doc_kind::status);
    detail::XmlAppender a(doc);
    a.addElement("E");
    a.setAttribute("V", "1");
    a.setAttribute("V", "2");  // twice on the new element
    a.addElement("P");
    a.document().SetAttribute("V", "1");
    a.setAttribute("V", "2");  // the public operation and the append path keep one account
    a.addElement("Q");
    a.setAttributes({{{"D", "1"}, {"MM", "02"}}});
    for (int i = 0; i < 6; ++i) a.addChildElement("C");
    a.setAttribute("MM", "03");  // again after children were added below
    a.addChildElement("C");
    a.setChildAttribute("T", "x");
    a.addElement("F");
    a.setChildAttribute("T", "y");  // on the child, around a new element
    EXPECT_EQ(flat(doc),
              "<Status><E V=\"2\" /><P V=\"2\" /><Q D=\"1\" MM=\"03\"><C /><C /><C /><C /><C /><C />"
              "<C T=\"y\" /></Q><F /></Status>");
}

TEST(XmlAppend, RefusesWhatThePublicOperationsRefuse) {
    XMLWrapper doc = newDoc(doc_kind::status);
    detail::XmlAppender append(doc);
    expectError([&] { append.setAttribute("V", "1"); }, errc::missing_object, "no element has been added");
    append.addElement("E");
    expectError([&] { append.setAttribute("1V", "1"); }, errc::document_failure, "'1V' is not a valid XML");
    expectError([&] { append.setAttribute("V", "a\x01"); }, errc::document_failure, "U+0001");
    append.setAttribute("V", std::string_view("ab\0cd", 5));  // a value ends at its first zero byte, as everywhere
    EXPECT_EQ(flat(doc), "<Status><E V=\"ab\" /></Status>");
}

TEST(XMLHostileText, LoadRefusesWithWhatAndWhereAndChangesNothing) {
    // One of each kind of refusal, and a part of its LastLoadError(); which texts are
    // well-formed at all: the fuzz target, against libxml2.
    const std::pair<std::string, const char*> refusals[] = {
        {"<R>\n<A>ok</A>\n<B>\x0B</B></R>", "U+000B, which XML does not allow at line 3, offset 17"},
        {"<R>ab"s + '\0' + "cd</R>", "U+0000, which XML does not allow at line 1, offset 5"},
        {"<R>AB&#0;C</R>", "character reference to U+0000, which XML does not allow at line 1, offset 5"},
        {"<R>&#xD800;</R>", "reference to U+D800"},
        {"<R>&#x110000;</R>", "beyond U+10FFFF"},
        {"<R>&#X41;</R>", "malformed character reference"},
        {"<R>&nbsp;</R>", "undeclared entity nbsp at line 1, offset 3"},
        {"<R>caf\xE9</R>", "invalid UTF-8 (byte 0xE9) at line 1, offset 6"},
        {"<R a='\xC0\xAF'/>", "invalid UTF-8 (byte 0xC0)"},    // overlong "/"
        {"<R>\xED\xA0\x80</R>", "invalid UTF-8 (byte 0xED)"},  // an encoded surrogate
        {"<R>\xEF\xBF\xBE</R>", "U+FFFE, which XML does not allow"},
        {"<R a='1' a='2'/>", "duplicate attribute a at line 1, offset 9"},
        {"<R a0='' a1='' a2='' a3='' a4='' a5='' a6='' a7='' a8='' a9='' b0='' b1='' b2='' b3='' "
         "b4='' b5='' b6='' b7='' a3=''/>",
         "duplicate attribute a3"},
        {"just text", "no document element at line 1, offset 0"},
        {"<R/><S/>", "content after the document element"},
        {"<R/>trailing", "text outside the document element"},
        {"<!DOCTYPE R [<!ENTITY x SYSTEM 'file:///etc/passwd'>]><R>&x;</R>", "internal subset"},
        {"<!DOCTYPE R PUBLIC 'a{b}' 'c'><R/>", "public identifier"},
        {"<?xml version='2.0'?><R/>", "unsupported XML version"},
        {"<?xml version='1.0' encoding='8bit'?><R/>", "encoding name"},
        {"<?xml version='1.0' encoding='ISO-8859-1'?><R>caf\xC3\xA9</R>", "documents are UTF-8"},
        {nested(100'000), "nested deeper than 256 levels at line 1, offset 768"},
        {"<R>" + std::string(kXmlDocumentMaxBytes, 'x') + "</R>", "larger than the 64 MiB"},
    };
    XMLWrapper x = kept();
    for (const auto& [text, reason] : refusals) {
        SCOPED_TRACE(text.substr(0, 80));
        EXPECT_FALSE(x.LoadXML(text));
        EXPECT_NE(x.LastLoadError().find(reason), std::string::npos) << x.LastLoadError();
        EXPECT_EQ(x.GetRootName(), "Kept");  // unchanged, positions too
        EXPECT_EQ(x.GetChildCount(), 0);
    }

    // What XML 1.0 does allow still loads.
    const std::string allowed[] = {
        "<R a='&#9;&#xA;&#13;'>&#x10FFFF;&#xFFFD;&#xE000;&#x20;</R>",
        "<R>\x7F \xC2\x85 \xEF\xBF\xBD \xF0\x9F\x98\x80 \t\r\n</R>",
        "<?xml version='1.1' encoding='UTF-8' standalone='no'?><R/>",
        "<?xml-stylesheet href='r.css'?><R/>",  // a processing instruction, not the declaration
        "<!DOCTYPE R SYSTEM 'r.dtd'><R>&x;</R>",
        nested(256),
    };
    for (const std::string& text : allowed) EXPECT_TRUE(x.LoadXML(text)) << text << ": " << x.LastLoadError();
}

TEST(XMLHostileText, WritingRefusesTextsThatAreNotXmlCharacters) {
    XMLWrapper x = kept();
    x.AddElement("E", "e");
    x.AddChildElement("C", "", "c");
    const std::string before = x.XML();
    // One of each kind; every kind the check refuses is in the loading table above.
    for (const auto& [value, reason] : {std::pair{"ok\x1F", "character U+001F, which XML does not allow at byte 2"},
                                        {"caf\xE9", "invalid UTF-8"},
                                        {"x\xEF\xBF\xBE", "character U+FFFE"}}) {
        SCOPED_TRACE(value);
        expectError([&] { x.AddElement("N", value); }, errc::document_failure,
                    "AddElement: the text for 'N' has "s + reason);
        expectError([&] { x.AddChildElement("N", "", value); }, errc::document_failure, "AddChildElement: the text");
        expectError([&] { x.SetAttribute("a", value); }, errc::document_failure, "SetAttribute: the value for 'a' has");
        expectError([&] { x.SetChildAttribute("a", value); }, errc::document_failure, reason);
    }
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("still", "C");  // the positions did not move
    EXPECT_NE(x.XML().find("<C still=\"C\">"), std::string::npos);

    // Everything the component writes, it reads back: blanks too, line ends as XML reads them, and
    // a text up to its first zero byte.
    x.AddElement("Ok", "\x7F\xC2\x85\t\xF0\x9F\x98\x80<&>");
    x.SetAttribute("a", "\t\r\n\"'<&>");
    x.AddElement("W", "   ");
    x.AddElement("T", "a\r\nb\rc");
    x.AddElement("Z", std::string("ab\0cd", 5));
    XMLWrapper y;
    ASSERT_TRUE(y.LoadXML(x.XML())) << y.LastLoadError();
    y.MoveToChild("A");
    EXPECT_EQ(y.GetChildAttribute("Ok", "a"), "\t\r\n\"'<&>");
    for (auto [name, value] :
         {std::pair{"Ok", "\x7F\xC2\x85\t\xF0\x9F\x98\x80<&>"}, {"W", "   "}, {"T", "a\nb\nc"}, {"Z", "ab"}})
        EXPECT_EQ(y.GetChildValue(name), value) << name;
}

TEST(XMLHostileText, BuildingStopsAtTheSameDepthAndSizeThatLoadingAccepts) {
    // Depth: 256 levels through the operations, the 257th refused, and the text loads back.
    XMLWrapper deep;
    ASSERT_TRUE(deep.LoadXML(nested(255)));
    auto down = [&](int levels) {
        deep.MoveToRoot();
        for (int level = 2; level <= levels; ++level) deep.MoveToChild("a");
    };
    down(255);
    deep.AddElement("a");
    down(256);
    const std::string before = deep.XML();
    expectError([&] { deep.AddElement("b"); }, errc::document_failure, "'b' would be nested deeper than 256 levels");
    expectError([&] { deep.AddChildElement("b"); }, errc::document_failure, "deeper than 256");
    EXPECT_EQ(deep.XML(), before);
    XMLWrapper back;
    ASSERT_TRUE(back.LoadXML(before)) << back.LastLoadError();
    // Size: a caller's text past the limit is refused before it is copied in.
    expectError([&] { deep.SetAttribute("big", std::string(kXmlDocumentMaxBytes, 'x')); }, errc::document_failure,
                "larger than the 64 MiB");

    // Size: indentation counts. Elements at the deepest level fill the limit
    // with little text; the one past it is refused, the document still writes
    // and loads back, and the same elements given as text are refused too.
    down(255);
    int added = 0;
    try {
        for (;; ++added) deep.AddElement("b");
    } catch (const ComponentError& e) {
        EXPECT_NE(e.description().find("AddElement: the document would be larger than the 64 MiB"), std::string::npos)
            << e.description();
    }
    EXPECT_GT(added, 50'000);
    ASSERT_TRUE(back.LoadXML(deep.XML())) << back.LastLoadError();
    std::string bs;
    for (int i = 0; i <= added; ++i) bs += "<b/>";
    EXPECT_FALSE(back.LoadXML(nested(255, "<a/>" + bs)));  // some 260 KB of text, too large once written
    EXPECT_NE(back.LastLoadError().find("larger than the 64 MiB"), std::string::npos) << back.LastLoadError();
    // Starting afresh frees the budget.
    deep.InitDocument(doc_kind::status);
    deep.AddElement("b");
    deep.SetAttribute("v", std::string(kXmlDocumentMaxBytes / 2, 'x'));
}

TEST(XMLIndexedAccess, ReadingEveryChildInOrderTakesStepsInProportionToTheChildren) {
    // Settings-like: a long list of children with a text and an attribute each.
    auto stepsToReadAll = [](int children) {
        XMLWrapper x;
        x.AddElement("Settings");
        for (int i = 0; i < children; ++i) {
            x.AddElement("Insulin", std::to_string(i));
            x.SetAttribute("Txt", "n" + std::to_string(i));
        }
        x.MoveToRoot();
        const std::uint64_t before = detail::xmlIndexSteps();
        for (std::int32_t i = 0; i < x.GetChildCount(); ++i)
            if (x.GetChildName(i) != "Insulin" || x.GetChildAttributeAt(i, "Txt") != "n" + std::to_string(i))
                ADD_FAILURE() << "child " << i;
        for (std::int32_t i = x.GetChildCount() - 1; i >= 0; --i)
            if (x.GetChildValueAt(i) != std::to_string(i)) ADD_FAILURE() << "child " << i << " backwards";
        EXPECT_EQ(x.GetChildValueAt(children / 2), std::to_string(children / 2));  // a jump
        return detail::xmlIndexSteps() - before;
    };
    const std::uint64_t small = stepsToReadAll(4'000);
    EXPECT_LE(small, 4u * 4'000);
    EXPECT_LE(stepsToReadAll(64'000), 16 * small + 64'000);  // 16 times the children, 16 times the steps
}

TEST(XMLIndexedAccess, RememberedPlacesFollowChangesAndNavigation) {
    XMLWrapper x;
    ASSERT_TRUE(x.LoadXML("<R>t<A/><!-- c --><B><X/><Y/></B>u<C/></R>"));
    EXPECT_EQ(x.GetChildName(2), "C");
    x.AddElement("D");  // appended under R: the count and the last index follow
    EXPECT_EQ(x.GetChildCount(), 4);
    EXPECT_EQ(x.GetChildName(3), "D");
    x.MoveToChild("B");  // another parent: indexes count its children
    EXPECT_EQ(x.GetChildName(1), "Y");
    expectError([&] { x.GetChildName(2); }, errc::subscript_out_of_range, "outside the 2 children of 'B'");
    x.MoveToRoot();
    EXPECT_EQ(x.GetChildName(1), "B");
    ASSERT_TRUE(x.LoadXML("<R><P/><Q/></R>"));  // a new tree: nothing remembered from the old one
    EXPECT_EQ(x.GetChildName(1), "Q");
    EXPECT_EQ(x.GetChildCount(), 2);
    x.InitDocument(doc_kind::datalog);
    EXPECT_EQ(x.GetChildName(2), "Records");
    XMLWrapper copy(x);
    copy.AddElement("Extra");
    EXPECT_EQ(copy.GetChildCount(), 4);
    EXPECT_EQ(x.GetChildCount(), 3);
}

// Memory limits through setrlimit: POSIX, unsanitized.
#if !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__) && !defined(_WIN32)
#include <sys/resource.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

TEST(XMLHostileText, RunningOutOfMemoryIsAComponentError) {
    // Building, writing, copying and loading with too little memory left, each in a fresh process:
    // memory freed by earlier tests would be reused without growing the address space, and hide the shortage.
    const char* shortage = std::getenv("VARNEL_XML_SHORTAGE");
    if (!shortage) {
        for (int which = 0; which < 4; ++which) {
            const std::string self =
                "VARNEL_XML_SHORTAGE=" + std::to_string(which) + " '" +
                std::filesystem::read_symlink("/proc/self/exe").string() +
                "' --gtest_brief=1 --gtest_filter=XMLHostileText.RunningOutOfMemoryIsAComponentError";
            EXPECT_EQ(std::system(self.c_str()), 0) << which;
        }
        return;
    }
    const int which = std::atoi(shortage);
    XMLWrapper x;
    x.AddElement("R");
    std::string big;
    for (int i = 0; which > 0 && i < 4000; ++i) x.AddElement("E", std::string(4096, 'x'));
    if (which > 0) big = x.XML();
    std::size_t pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    const rlim_t limit = pages * static_cast<std::size_t>(sysconf(_SC_PAGESIZE)) + (which == 0 ? 8 << 20 : 4 << 20);
    const rlimit r{limit, limit};
    setrlimit(RLIMIT_AS, &r);
    const std::function<void()> runs[] = {
        [&] {
            for (;;) x.AddElement("E", std::string(4096, 'x'));
        },
        [&] { (void)x.XML(); },
        [&] { XMLWrapper copy(x); },
        [&] { (void)XMLWrapper().LoadXML(big); },
    };
    expectError(runs[which], errc::internal, "out of memory");
}
#endif
