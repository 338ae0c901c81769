// The XML document component under hostile input: text it must refuse with a
// clear reason, values it must not write, the size and depth limits, and
// indexed access that stays linear however many children there are.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <tuple>
#include <vector>

#include "contracts/xml_index_steps.h"
#include "support/expect_error.h"
#include "varnel/component_error.h"
#include "varnel/xml_wrapper.h"

using namespace varnel;
using namespace std::string_literals;

namespace {

// A document to load over, and what it looked like before.
XMLWrapper kept() {
    XMLWrapper x;
    EXPECT_TRUE(x.LoadXML("<Kept><A>1</A></Kept>"));
    x.MoveToChild("A");
    return x;
}

using test::expectError;

std::string nested(int depth, const std::string& inner = "") {
    std::string open, close;
    for (int i = 0; i < depth; ++i) open += "<a>", close += "</a>";
    return open + inner + close;
}

}  // namespace

TEST(XMLHostileText, LoadRefusesWithWhatAndWhereAndChangesNothing) {
    // One of each kind of refusal, and a part of its LastLoadError(); which texts are
    // well-formed at all: the fuzz target, against libxml2.
    const std::pair<std::string, const char*> refusals[] = {
        {"<R>\n<A>ok</A>\n<B>\x0B</B></R>", "U+000B, which XML does not allow at line 3, offset 17"},
        {"<R>ab"s + '\0' + "cd</R>", "U+0000, which XML does not allow at line 1, offset 5"},
        {"<R>AB&#0;C</R>", "character reference to U+0000, which XML does not allow at line 1, offset 5"},
        {"<R>&#xD800;</R>", "reference to U+D800"},
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
    EXPECT_EQ(y.GetChildValue("Ok"), "\x7F\xC2\x85\t\xF0\x9F\x98\x80<&>");
    EXPECT_EQ(y.GetChildAttribute("Ok", "a"), "\t\r\n\"'<&>");
    for (auto [name, value] : {std::pair{"W", "   "}, {"T", "a\nb\nc"}, {"Z", "ab"}})
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
    EXPECT_LE(deep.XML().size(), kXmlDocumentMaxBytes);
    ASSERT_TRUE(back.LoadXML(deep.XML())) << back.LastLoadError();
    std::string bs;
    for (int i = 0; i <= added; ++i) bs += "<b/>";
    EXPECT_FALSE(back.LoadXML(nested(255, "<a/>" + bs)));  // some 260 KB of text, too large once written
    EXPECT_NE(back.LastLoadError().find("larger than the 64 MiB"), std::string::npos) << back.LastLoadError();
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

#if !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__)
#include <sys/resource.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

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
