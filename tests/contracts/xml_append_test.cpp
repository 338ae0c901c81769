// The writers' append path: it skips the lookup of an attribute only where the
// element cannot have one of that name yet, so a repeated name still replaces.
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "contracts/xml_wrapper_append.h"
#include "support/expect_error.h"
#include "varnel/component_error.h"

namespace varnel {
namespace {

using detail::XmlAppender;

struct AppendCase {
    const char* what;
    std::function<void(XmlAppender&)> build;
    const char* xml;  // the document element's content as XML() writes it
};

TEST(XmlAppend, RepeatedNamesReplaceOnEveryPathIntoTheElement) {
    const AppendCase cases[] = {
        {"twice on the new element",
         [](XmlAppender& a) {
             a.addElement("E");
             a.setAttribute("V", "1");
             a.setAttribute("V", "2");
         },
         "<E V=\"2\" />"},
        // The public operation and the append path keep one account of what is set.
        {"public, then append path",
         [](XmlAppender& a) {
             a.addElement("E");
             a.document().SetAttribute("V", "1");
             a.setAttribute("V", "2");
         },
         "<E V=\"2\" />"},
        {"again after children were added below",
         [](XmlAppender& a) {
             a.addElement("E");
             a.setAttributes({{{"D", "1"}, {"MM", "02"}}});
             for (int i = 0; i < 6; ++i) a.addChildElement("C");
             a.setAttribute("MM", "03");
         },
         "<E D=\"1\" MM=\"03\">\n\t\t<C />\n\t\t<C />\n\t\t<C />\n\t\t<C />\n\t\t<C />\n\t\t<C />\n\t</E>"},
        {"on the child, around a new element",
         [](XmlAppender& a) {
             a.addElement("E");
             a.addChildElement("C");
             a.setChildAttribute("T", "x");
             a.addElement("F");
             a.setChildAttribute("T", "y");
         },
         "<E>\n\t\t<C T=\"y\" />\n\t</E>\n\t<F />"},
    };
    for (const AppendCase& c : cases) {
        XMLWrapper doc;
        doc.InitDocument(doc_kind::status);
        XmlAppender append(doc);
        c.build(append);
        std::string xml = doc.XML();
        // Compare tabs for the two-blank indentation, as the expectations are written.
        for (std::size_t at; (at = xml.find("  ")) != std::string::npos;) xml.replace(at, 2, "\t");
        EXPECT_EQ(xml, "<Status>\n\t" + std::string(c.xml) + "\n</Status>\n") << c.what;
    }
}

TEST(XmlAppend, RefusesWhatThePublicOperationsRefuse) {
    XMLWrapper doc;
    doc.InitDocument(doc_kind::status);
    XmlAppender append(doc);
    test::expectError([&] { append.setAttribute("V", "1"); }, errc::missing_object, "no element has been added");
    append.addElement("E");
    test::expectError([&] { append.setAttribute("1V", "1"); }, errc::document_failure, "'1V' is not a valid XML");
    test::expectError([&] { append.setAttribute("V", "a\x01"); }, errc::document_failure, "U+0001");
    // A value ends at its first zero byte, as everywhere.
    append.setAttribute("V", std::string_view("ab\0cd", 5));
    doc.SelectElement("E");
    doc.MoveToRoot();
    EXPECT_EQ(doc.GetChildAttribute("E", "V"), "ab");
}

}  // namespace
}  // namespace varnel
