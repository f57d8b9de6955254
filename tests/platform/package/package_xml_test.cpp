// SPDX-License-Identifier: Apache-2.0
#include "platform/package/package_xml.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

namespace platform::package {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

// The local names of the elements in the namespace "urn:n" below the root "r" of "urn:n".
std::vector<std::string> elementsOf(const std::string& xml) {
    std::vector<std::string> names;
    forEachElement({reinterpret_cast<const std::uint8_t*>(xml.data()), xml.size()}, "r", "urn:n",
                   [&](const XmlElement& element) { names.emplace_back(element.localName()); });
    return names;
}

std::string root(const std::string& content) {
    return "<r xmlns='urn:n'>" + content + "</r>";
}

std::string inUtf16(const std::u16string& text, bool isBigEndian) {
    std::string bytes;
    for (const char16_t c : text) {
        const char high = static_cast<char>(c >> 8);
        const char low = static_cast<char>(c & 0xFF);
        bytes += isBigEndian ? std::string{high, low} : std::string{low, high};
    }
    return bytes;
}

std::string problemOf(const std::string& xml) {
    try {
        elementsOf(xml);
    } catch (const std::runtime_error& error) {
        return error.what();
    }
    return "";
}

TEST(ForEachElement, VisitsTheChildrenOfTheRootThatAreInItsNamespace) {
    EXPECT_THAT(elementsOf(root("<a/><b><c/></b> text <x:d xmlns:x='urn:o'/><e xmlns=''/><f/>")),
                ElementsAre("a", "b", "f"));
    EXPECT_THAT(elementsOf("<x:r xmlns:x='urn:n'><x:a/><b/></x:r>"), ElementsAre("a"));
    EXPECT_THAT(elementsOf(root("")), IsEmpty());
}

TEST(ForEachElement, GivesTheAttributesThatHaveNoNamespace) {
    const std::string xml = root("<a x:k='other' xmlns:x='urn:o' k='&lt;&#65;&amp;' e=''/>");
    forEachElement({reinterpret_cast<const std::uint8_t*>(xml.data()), xml.size()}, "r", "urn:n",
                   [](const XmlElement& element) {
                       EXPECT_EQ(element.attribute("k"), "<A&");
                       EXPECT_EQ(element.attribute("e"), "");
                       EXPECT_EQ(element.attribute("x"), std::nullopt);
                       EXPECT_EQ(element.requiredAttribute("k"), "<A&");
                       EXPECT_THROW(element.requiredAttribute("K"), std::runtime_error);
                   });
}

TEST(ForEachElement, ReadsUtf8AndUtf16WithAndWithoutDeclarationAndMark) {
    const std::string declared = "<?xml version='1.0' encoding='";
    for (const char* encoding : {"UTF-8", "utf-8", "utf8", "UTF8"}) {
        const std::string xml = declared + encoding + "'?>" + root("<a/>");
        EXPECT_THAT(elementsOf(xml), ElementsAre("a")) << encoding;
        EXPECT_THAT(elementsOf("\xEF\xBB\xBF" + xml), ElementsAre("a")) << encoding;
    }
    const std::u16string plain = u"<r xmlns='urn:n'><\u00E9/></r>";
    for (const bool isBigEndian : {false, true}) {
        for (const std::u16string& text :
             {plain, u"\uFEFF" + plain, u"<?xml version='1.0' encoding='utf-16'?>" + plain}) {
            EXPECT_THAT(elementsOf(inUtf16(text, isBigEndian)), ElementsAre("\xC3\xA9"));
        }
    }
}

TEST(ForEachElement, RefusesOtherEncodings) {
    for (const char* encoding : {"ISO-8859-1", "us-ascii", "windows-1252", "nonsense"}) {
        EXPECT_THAT(problemOf(std::string("<?xml version='1.0' encoding='") + encoding + "'?>" +
                              root("<a/>")),
                    HasSubstr(std::string("declares the encoding \"") + encoding +
                              "\", but only UTF-8 and UTF-16 are allowed"));
    }
    EXPECT_THAT(problemOf("<?xml version='1.0' encoding='UTF-16'?>" + root("<a/>")),
                HasSubstr("declares the encoding \"UTF-16\", but its bytes are not in it"));
    EXPECT_THAT(
        problemOf(inUtf16(u"<?xml version='1.0' encoding='UTF-8'?><r xmlns='urn:n'/>", false)),
        HasSubstr("declares the encoding \"UTF-8\", but its bytes are not in it"));
    const std::string ascii = root("<a/>");
    std::string utf32;
    for (const char c : ascii) {
        utf32 += std::string{c, '\0', '\0', '\0'};
    }
    EXPECT_THROW(elementsOf(utf32), std::runtime_error);
}

TEST(ForEachElement, RefusesTextThatIsNotValidInItsEncoding) {
    EXPECT_THROW(elementsOf(root("\xFF")), std::runtime_error);
    EXPECT_THROW(elementsOf(root("\xED\xA0\x80")), std::runtime_error);
    EXPECT_THROW(elementsOf(root("\xC0\x80")), std::runtime_error);
    const std::u16string start = u"<r xmlns='urn:n'>";
    for (const char16_t lone : {u'\xD800', u'\xDC00'}) {
        EXPECT_THROW(elementsOf(inUtf16(start + lone + u"</r>", false)), std::runtime_error);
    }
    EXPECT_THROW(elementsOf(inUtf16(start + u"</r>", false) + "x"), std::runtime_error);
}

TEST(ForEachElement, RefusesWhatIsNotWellFormed) {
    for (const std::string& xml : {std::string(),
                                   std::string("text"),
                                   std::string("<r xmlns='urn:n'>"),
                                   root("<a k='1' k='2'/>"),
                                   root("<a k='<'/>"),
                                   root("<a k=1/>"),
                                   root("<a k/>"),
                                   root("&foo;"),
                                   root("<a k='&foo;'/>"),
                                   root("&#0;"),
                                   root("&#xFFFF;"),
                                   root("a & b"),
                                   root("<a></b>"),
                                   root("<a"),
                                   root("<!-- -- -->"),
                                   root("]]>"),
                                   root("\x01"),
                                   root("") + root(""),
                                   root("") + "text",
                                   root("") + std::string(1, '\0'),
                                   "text" + root(""),
                                   " <?xml version='1.0'?>" + root(""),
                                   root("<x:a/>"),
                                   root("<a x:k='1' y:k='2' xmlns:x='urn:o' xmlns:y='urn:o'/>")}) {
        EXPECT_THAT(problemOf(xml), HasSubstr("is not well-formed XML")) << xml;
    }
    EXPECT_THAT(problemOf(root("\n\n<a k='1' k='2'/>")), HasSubstr("in line 3"));
}

TEST(ForEachElement, TakesCommentsInstructionsAndBlanksAroundTheRoot) {
    EXPECT_THAT(elementsOf("<?xml version='1.0'?>\r\n<!-- c --><?p i?>" + root("<a/>") +
                           "\n<!-- c --><?p i?>\n"),
                ElementsAre("a"));
}

TEST(ForEachElement, RefusesDocumentTypes) {
    EXPECT_THAT(problemOf("<!DOCTYPE r>" + root("")), HasSubstr("a document type declaration"));
    EXPECT_THAT(problemOf("<!DOCTYPE r [<!ENTITY a 'b'>]>" + root("&a;")),
                HasSubstr("a document type declaration"));
    EXPECT_THAT(problemOf("<!DOCTYPE r SYSTEM 'file:///etc/passwd'>" + root("")),
                HasSubstr("a document type declaration"));
}

TEST(ForEachElement, RefusesAnotherRoot) {
    for (const char* xml : {"<r/>", "<s xmlns='urn:n'/>", "<r xmlns='urn:o'><r xmlns='urn:n'/></r>",
                            "<x:r xmlns='urn:n' xmlns:x='urn:o'/>"}) {
        EXPECT_EQ(problemOf(xml), "has another root element than r");
    }
    EXPECT_THROW(elementsOf("<r xmlns='urn:n&#10;x'/>"), std::runtime_error);
}

TEST(ForEachElement, RefusesElementsThatAreNestedTooDeeply) {
    std::string deep;
    for (int i = 0; i < 1'000'000; ++i) {
        deep += "<a>";
    }
    EXPECT_THAT(problemOf("<r xmlns='urn:n'>" + deep), HasSubstr("levels deep"));
}

TEST(ForEachElement, PassesOnWhatIsThrownAndVisitsNoMore) {
    int visits = 0;
    const std::string xml = root("<a/><a/>");
    EXPECT_THROW(forEachElement({reinterpret_cast<const std::uint8_t*>(xml.data()), xml.size()},
                                "r", "urn:n",
                                [&](const XmlElement&) {
                                    ++visits;
                                    throw std::string("anything");
                                }),
                 std::string);
    EXPECT_EQ(visits, 1);
}

}  // namespace
}  // namespace platform::package
