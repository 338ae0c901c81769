// The XML document component under hostile input: text it must refuse with a
// clear reason, values it must not write, the size and depth limits, and
// indexed access that stays linear however many children there are.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "contracts/xml_index_steps.h"
#include "support/expect_error.h"
#include "varnel/component_error.h"
#include "varnel/xml_wrapper.h"

using namespace varnel;
using namespace std::string_literals;

namespace {

constexpr std::size_t kMiB = std::size_t(1) << 20;

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

struct Refusal {
    const char* kind;
    std::string text;
    std::string reason;  // a part of LastLoadError()
};

}  // namespace

TEST(XMLHostileText, LoadRefusesWithWhatAndWhereAndChangesNothing) {
    const Refusal refusals[] = {
        {"control", "<R>\n<A>ok</A>\n<B>\x0B</B></R>", "U+000B, which XML does not allow at line 3, offset 17"},
        {"NUL", "<R>ab"s + '\0' + "cd</R>", "U+0000, which XML does not allow at line 1, offset 5"},
        {"reference", "<R>AB&#0;C</R>", "character reference to U+0000, which XML does not allow at line 1, offset 5"},
        {"reference", "<R>&#xD800;</R>", "reference to U+D800"},
        {"reference", "<R>&#x110000;</R>", "beyond U+10FFFF"},
        {"reference", "<R>&#X41;</R>", "malformed character reference"},
        {"entity", "<R>&nbsp;</R>", "undeclared entity nbsp at line 1, offset 3"},
        {"entity", "<?xml version='1.0' standalone='yes'?><!DOCTYPE R SYSTEM 'r.dtd'><R>&x;</R>", "undeclared entity"},
        {"UTF-8", "<R>caf\xE9</R>", "invalid UTF-8 (byte 0xE9) at line 1, offset 6"},
        {"UTF-8", "<R a='\xC0\xAF'/>", "invalid UTF-8 (byte 0xC0)"},        // overlong "/"
        {"UTF-8", "<R>\xED\xA0\x80</R>", "invalid UTF-8 (byte 0xED)"},      // an encoded surrogate
        {"UTF-8", "<R>\xF4\x90\x80\x80</R>", "invalid UTF-8 (byte 0xF4)"},  // beyond U+10FFFF
        {"UTF-8", "<R\xFF/>", "invalid UTF-8 (byte 0xFF)"},
        {"UTF-8", "<R>\xEF\xBF\xBE</R>", "U+FFFE, which XML does not allow"},
        {"duplicate", "<R a='1' a='2'/>", "duplicate attribute a at line 1, offset 9"},
        {"duplicate",
         "<R a0='' a1='' a2='' a3='' a4='' a5='' a6='' a7='' a8='' a9='' b0='' b1='' b2='' b3='' "
         "b4='' b5='' b6='' b7='' a3=''/>",
         "duplicate attribute a3"},
        {"DTD", "<!DOCTYPE R [<!ENTITY e 'x'>]><R>&e;</R>", "internal subset"},
        {"DTD", "<!DOCTYPE R PUBLIC 'a{b}' 'c'><R/>", "public identifier"},
        {"declaration", "<?xml?><R/>", "without a version"},
        {"declaration", "<?xml version='2.0'?><R/>", "unsupported XML version"},
        {"declaration", "<?xml version='1.0' standalone='maybe'?><R/>", "standalone"},
        {"declaration", "<?xml version='1.0' encoding='8bit'?><R/>", "encoding name"},
        {"declaration", "<?xml version='1.0' encoding='ISO-8859-1'?><R>caf\xC3\xA9</R>", "documents are UTF-8"},
        {"deep", nested(257), "nested deeper than 256 levels"},
        {"deep", nested(100'000), "nested deeper than 256 levels at line 1, offset 768"},
        {"huge", "<R>" + std::string(kXmlDocumentMaxBytes, 'x') + "</R>", "larger than the 64 MiB"},
    };
    XMLWrapper x = kept();
    for (const auto& [kind, text, reason] : refusals) {
        SCOPED_TRACE(std::string(kind) + ": " + text.substr(0, 80));
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
    const std::pair<std::string, std::string> bad[] = {
        {"ok\x1F", "character U+001F, which XML does not allow at byte 2"},
        {"caf\xE9", "invalid UTF-8"},
        {"x\xEF\xBF\xBE", "character U+FFFE"}};
    for (const auto& [value, reason] : bad) {
        SCOPED_TRACE(value);
        expectError([&] { x.AddElement("N", value); }, errc::document_failure,
                    "AddElement: the text for 'N' has " + reason);
        expectError([&] { x.AddChildElement("N", "", value); }, errc::document_failure, "AddChildElement: the text");
        expectError([&] { x.SetAttribute("a", value); }, errc::document_failure, "SetAttribute: the value for 'a' has");
        expectError([&] { x.SetChildAttribute("a", value); }, errc::document_failure, reason);
    }
    EXPECT_EQ(x.XML(), before);
    x.SetChildAttribute("still", "C");  // the positions did not move
    EXPECT_NE(x.XML().find("<C still=\"C\">"), std::string::npos);

    // Everything the component writes, it reads back.
    x.AddElement("Ok", "\x7F\xC2\x85\t\xF0\x9F\x98\x80");
    x.SetAttribute("a", "\t\r\n\"'<&>");
    XMLWrapper y;
    ASSERT_TRUE(y.LoadXML(x.XML())) << y.LastLoadError();
    y.MoveToChild("A");
    EXPECT_EQ(y.GetChildValue("Ok"), "\x7F\xC2\x85\t\xF0\x9F\x98\x80");
    EXPECT_EQ(y.GetChildAttribute("Ok", "a"), "\t\r\n\"'<&>");
}

TEST(XMLHostileText, BuildingStopsAtTheSameDepthAndSizeThatLoadingAccepts) {
    // Depth: 256 levels through the operations, the 257th refused, and the text loads back.
    XMLWrapper deep;
    deep.AddElement("a");
    for (int level = 2; level <= 256; ++level) {
        deep.AddElement("a");
        deep.MoveToChild("a");
    }
    const std::string before = deep.XML();
    expectError([&] { deep.AddElement("b"); }, errc::document_failure, "'b' would be nested deeper than 256 levels");
    expectError([&] { deep.AddChildElement("b"); }, errc::document_failure, "deeper than 256");
    EXPECT_EQ(deep.XML(), before);
    XMLWrapper back;
    ASSERT_TRUE(back.LoadXML(deep.XML())) << back.LastLoadError();
    EXPECT_EQ(back.CountElements("a"), 255);

    // Size: a caller's text past the limit is refused before it is copied in.
    expectError([&] { deep.SetAttribute("big", std::string(kXmlDocumentMaxBytes, 'x')); }, errc::document_failure,
                "larger than the 64 MiB");

    // Size: indentation counts. Elements at the deepest level fill the limit
    // with little text; the one past it is refused, the document still writes
    // and loads back, and the same elements given as text are refused too.
    XMLWrapper wide;
    ASSERT_TRUE(wide.LoadXML(nested(255)));
    for (int level = 2; level <= 255; ++level) wide.MoveToChild("a");
    int added = 0;
    try {
        for (;; ++added) wide.AddElement("b");
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::document_failure);
        EXPECT_NE(e.description().find("AddElement: the document would be larger than the 64 MiB"), std::string::npos)
            << e.description();
    }
    EXPECT_GT(added, 50'000);
    const std::string text = wide.XML();
    EXPECT_LE(text.size(), kXmlDocumentMaxBytes);
    ASSERT_TRUE(back.LoadXML(text)) << back.LastLoadError();
    std::string bs;
    for (int i = 0; i <= added; ++i) bs += "<b/>";
    EXPECT_FALSE(back.LoadXML(nested(255, bs)));  // some 260 KB of text, too large once written
    EXPECT_NE(back.LastLoadError().find("larger than the 64 MiB"), std::string::npos) << back.LastLoadError();
    EXPECT_EQ(back.CountElements("b"), added);
    // Starting afresh frees the budget.
    wide.InitDocument(doc_kind::status);
    wide.AddElement("b");
    wide.SetAttribute("v", std::string(kXmlDocumentMaxBytes / 2, 'x'));
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
        for (std::int32_t i = 0; i < x.GetChildCount(); ++i) {
            EXPECT_EQ(x.GetChildName(i), "Insulin");
            if (x.GetChildValueAt(i) != std::to_string(i) || x.GetChildAttributeAt(i, "Txt") != "n" + std::to_string(i))
                ADD_FAILURE() << "child " << i;
        }
        for (std::int32_t i = x.GetChildCount() - 1; i >= 0; --i)
            if (x.GetChildValueAt(i) != std::to_string(i)) ADD_FAILURE() << "child " << i << " backwards";
        EXPECT_EQ(x.GetChildValueAt(children / 2), std::to_string(children / 2));  // a jump
        return detail::xmlIndexSteps() - before;
    };
    const std::uint64_t small = stepsToReadAll(4'000);
    const std::uint64_t large = stepsToReadAll(64'000);
    EXPECT_LE(small, 4u * 4'000);
    EXPECT_LE(large, 16 * small + 64'000);  // 16 times the children, 16 times the steps
}

TEST(XMLIndexedAccess, RememberedPlacesFollowChangesAndNavigation) {
    XMLWrapper x;
    ASSERT_TRUE(x.LoadXML("<R>t<A/><!-- c --><B><X/><Y/></B>u<C/></R>"));
    EXPECT_EQ(x.GetChildName(2), "C");
    EXPECT_EQ(x.GetChildCount(), 3);
    x.AddElement("D");  // appended under R: the count and the last index follow
    EXPECT_EQ(x.GetChildCount(), 4);
    EXPECT_EQ(x.GetChildName(3), "D");
    x.MoveToChild("B");  // another parent: indexes count its children
    EXPECT_EQ(x.GetChildCount(), 2);
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
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace {

// Runs f in a child process whose address space may grow by `headroom` bytes
// only; the child's exit code: 0 ComponentError internal "out of memory",
// 1 no error, 2 another ComponentError, 3 anything else escaped.
int underMemoryLimit(std::size_t headroom, const std::function<void()>& prepare, const std::function<void()>& f) {
    const pid_t child = fork();
    if (child == 0) {
        prepare();
        std::size_t pages = 0;
        std::ifstream("/proc/self/statm") >> pages;
        const rlim_t limit = pages * static_cast<std::size_t>(sysconf(_SC_PAGESIZE)) + headroom;
        const rlimit r{limit, limit};
        setrlimit(RLIMIT_AS, &r);
        try {
            f();
            _exit(1);
        } catch (const ComponentError& e) {
            _exit(e.number() == errc::internal && e.description().find("out of memory") != std::string::npos ? 0 : 2);
        } catch (...) {
            _exit(3);
        }
    }
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 100 + WTERMSIG(status);
}

}  // namespace

TEST(XMLHostileText, RunningOutOfMemoryIsAComponentError) {
    // In a fresh process: memory freed by earlier tests would be reused
    // without growing the address space, and hide the shortage.
    if (!std::getenv("VARNEL_XML_FRESH_PROCESS")) {
        const std::string self =
            "VARNEL_XML_FRESH_PROCESS=1 '" + std::filesystem::read_symlink("/proc/self/exe").string() +
            "' --gtest_brief=1 --gtest_filter=" +
            std::string(::testing::UnitTest::GetInstance()->current_test_info()->test_suite_name()) + "." +
            ::testing::UnitTest::GetInstance()->current_test_info()->name();
        EXPECT_EQ(std::system(self.c_str()), 0);
        return;
    }
    XMLWrapper x;
    const std::string text(4096, 'x');
    auto fill = [&](int elements) {
        x.AddElement("R");
        for (int i = 0; i < elements; ++i) x.AddElement("E", text);
    };
    // Building, writing, copying and loading with too little memory left.
    EXPECT_EQ(underMemoryLimit(
                  8 << 20, [] {}, [&] { fill(1 << 30); }),
              0);
    EXPECT_EQ(underMemoryLimit(
                  4 << 20, [&] { fill(4000); }, [&] { (void)x.XML(); }),
              0);
    EXPECT_EQ(underMemoryLimit(
                  4 << 20, [&] { fill(4000); }, [&] { XMLWrapper copy(x); }),
              0);
    std::string big;
    EXPECT_EQ(underMemoryLimit(
                  4 << 20,
                  [&] {
                      fill(4000);
                      big = x.XML();
                  },
                  [&] { (void)XMLWrapper().LoadXML(big); }),
              0);
}
#endif
