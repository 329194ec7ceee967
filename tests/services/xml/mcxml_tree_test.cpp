// Elements and texts: navigation by any name, insertion, namespaces kept through writer and
// parser, the serializer's form, and UTF-8 <-> UTF-16 conversion of non-ASCII and bad text.
#include "mcxml/mcxml.h"

#include <xercesc/dom/DOMComment.hpp>
#include <xercesc/dom/DOMText.hpp>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using namespace MCXML_800;
using xercesc::DOMElement;

using Names = std::vector<std::string>;

// Names of the child elements of `parent` in order, walked with the any-name lookups.
Names ChildNames(const xercesc::DOMNode* parent) {
    Names names;
    for (const DOMElement* e = GetFirstChildElmt(parent); e != nullptr; e = GetNextSiblingElmt(e)) {
        names.push_back(ToUTF8(e->getTagName()));
    }
    return names;
}

std::string Serialized(const xercesc::DOMDocument* doc) {
    std::string text;
    EXPECT_TRUE(SerializeToUTF8(doc, text));
    return text;
}

// The root element of `doc` after writing it and reading it back with `reader`.
const DOMElement* Reparsed(const xercesc::DOMDocument* doc, MCXMLReadWrite& reader) {
    EXPECT_TRUE(reader.ParseToDOM(Serialized(doc))) << reader.GetErrorMessage();
    return reader.GetDocument() ? reader.GetDocument()->getDocumentElement() : nullptr;
}

class XmlTree : public ::testing::Test {
protected:
    // Root holding A(id 1), B, A(id 3), a text node, a comment, C.
    void SetUp() override {
        ASSERT_NE(fpDoc, nullptr);
        int id = 0;
        for (const char* name : {"A", "B", "A"}) {
            DOMElement* e = CreateElement(fpDoc.get(), name);
            ASSERT_TRUE(SetAttribute(e, "id", ++id));
            ASSERT_TRUE(InsertElement(Root(), e));
        }
        Root()->appendChild(fpDoc->createTextNode(u"text between"));
        Root()->appendChild(fpDoc->createComment(u"a comment"));
        ASSERT_TRUE(InsertElement(Root(), CreateElement(fpDoc.get(), "C")));
    }
    DOMElement* Root() const { return fpDoc->getDocumentElement(); }

    DOMDocumentPtr fpDoc = CreateDocument("", "Root");
};

TEST_F(XmlTree, FindsElementsByNameAndByAnyName) {
    EXPECT_EQ(ChildNames(Root()), (Names{"A", "B", "A", "C"}));
    const DOMElement* a2 = GetNextSiblingElmt(GetFirstChildElmt(Root(), "A"), "A");
    ASSERT_NE(a2, nullptr);
    int id = 0;
    EXPECT_EQ(GetIntAttribute(a2, "id", 0, id), kAttributeRead);
    EXPECT_EQ(id, 3);
    EXPECT_EQ(GetNextSiblingElmt(a2, "A"), nullptr);
    // The text and comment nodes between the second A and C are skipped.
    EXPECT_EQ(GetNextSiblingElmt(a2), GetFirstChildElmt(Root(), "C"));
    EXPECT_EQ(GetFirstChildElmt(Root(), "a"), nullptr); // names are case-sensitive
    EXPECT_EQ(GetFirstChildElmt(Root(), std::string("A\0B", 3)), nullptr);
    EXPECT_EQ(GetFirstChildElmt(GetFirstChildElmt(Root(), "C")), nullptr);
    EXPECT_EQ(GetFirstChildElmt(nullptr, "A"), nullptr);
    EXPECT_EQ(GetNextSiblingElmt(nullptr), nullptr);
    EXPECT_EQ(GetNextSiblingElmt(Root()), nullptr);
    EXPECT_EQ(GetFirstChildElmt(fpDoc.get(), "Root"), Root());
}

TEST_F(XmlTree, InsertsBeforeAGivenChildAndRefusalsLeaveTheTree) {
    DOMElement* b = GetFirstChildElmt(Root(), "B");
    ASSERT_TRUE(InsertElement(Root(), CreateElement(fpDoc.get(), "N"), b));
    DOMElement* loose = CreateElement(fpDoc.get(), "L");
    EXPECT_FALSE(InsertElement(Root(), loose, CreateElement(fpDoc.get(), "X"))); // not a child
    DOMDocumentPtr other = CreateDocument("", "Other");
    EXPECT_FALSE(InsertElement(Root(), CreateElement(other.get(), "Foreign")));
    EXPECT_FALSE(InsertElement(b, Root())); // an element into its own descendant
    EXPECT_FALSE(InsertElement(nullptr, loose));
    EXPECT_FALSE(InsertElement(Root(), nullptr));
    EXPECT_EQ(ChildNames(Root()), (Names{"A", "N", "B", "A", "C"}));
}

TEST(XmlElement, InvalidNamesGiveNoElement) {
    DOMDocumentPtr doc = CreateDocument("", "R");
    for (const std::string& name : {std::string(""), std::string("1x"), std::string("a b"),
                                    std::string("<x>"), std::string("a\0b", 3)}) {
        EXPECT_EQ(CreateElement(doc.get(), name), nullptr) << name;
    }
    EXPECT_EQ(CreateElement(nullptr, "x"), nullptr);
    EXPECT_EQ(CreateElement(doc.get(), static_cast<const XMLCh*>(nullptr)), nullptr);
    EXPECT_EQ(CreateDocument("", "not a name"), nullptr);
}

// Children made with CreateElement stay in their root's namespace through writing and reading (a
// child left out would be written with xmlns=""). A root without a namespace that declares one
// through xmlns attributes has them written as set, and its children land in that namespace.
TEST(XmlNamespace, ChildrenKeepTheRootsOrDeclaredNamespace) {
    const std::string space = "http://example.org/mcsim/test";
    DOMDocumentPtr doc = CreateDocument(space, "Plan");
    DOMElement* child = CreateElement(doc.get(), "Section");
    ASSERT_TRUE(InsertElement(doc->getDocumentElement(), child));
    ASSERT_TRUE(InsertElement(child, CreateElement(doc.get(), "Item")));
    EXPECT_EQ(Serialized(doc.get()).find("xmlns=\"\""), std::string::npos);
    MCXMLReadWrite reader;
    const DOMElement* item =
        GetFirstChildElmt(GetFirstChildElmt(Reparsed(doc.get(), reader), "Section"), "Item");
    ASSERT_NE(item, nullptr);
    EXPECT_EQ(ToUTF8(item->getNamespaceURI()), space);

    const std::string plan = "http://example.org/mcsim/plan";
    doc = CreateDocument("", "Plan");
    DOMElement* root = doc->getDocumentElement();
    ASSERT_TRUE(SetAttribute(root, "xmlns", plan));
    ASSERT_TRUE(SetAttribute(root, "xmlns:xsi", "http://www.w3.org/2001/XMLSchema-instance"));
    ASSERT_TRUE(SetAttribute(root, "xsi:schemaLocation", plan + " plan.xsd"));
    ASSERT_TRUE(InsertElement(root, CreateElement(doc.get(), "Header")));
    const DOMElement* readRoot = Reparsed(doc.get(), reader);
    const DOMElement* header = GetFirstChildElmt(readRoot, "Header");
    ASSERT_NE(header, nullptr);
    EXPECT_EQ(ToUTF8(header->getNamespaceURI()), plan);
    std::string location;
    ASSERT_TRUE(GetAttribute(readRoot, "xsi:schemaLocation", location));
    EXPECT_EQ(location, plan + " plan.xsd");

    // Prefixed elements are found by their local name too.
    ASSERT_TRUE(reader.ParseToDOM("<p:Plan xmlns:p='urn:p'><x/><p:Target name='t'/></p:Plan>"));
    const DOMElement* prefixed = reader.GetDocument()->getDocumentElement();
    EXPECT_NE(GetFirstChildElmt(prefixed, "Target"), nullptr);
    EXPECT_EQ(GetFirstChildElmt(prefixed, "Target"), GetFirstChildElmt(prefixed, "p:Target"));
}

// Pretty-print off: no indentation or line break is added between elements.
TEST(XmlSerializer, WritesUTF8WithoutAddedLayout) {
    DOMDocumentPtr doc = CreateDocument("", "R");
    DOMElement* a = CreateElement(doc.get(), "A");
    ASSERT_TRUE(InsertElement(doc->getDocumentElement(), a));
    ASSERT_TRUE(InsertElement(a, CreateElement(doc.get(), "B")));
    const std::string text = Serialized(doc.get());
    EXPECT_EQ(text.rfind("<?xml", 0), 0u) << text;
    EXPECT_NE(text.find("encoding=\"UTF-8\""), std::string::npos) << text;
    EXPECT_NE(text.find("<R><A><B/></A></R>"), std::string::npos) << text;
    EXPECT_EQ(text.find('\n'), std::string::npos) << text;
    std::string untouched = "keep";
    EXPECT_FALSE(SerializeToUTF8(nullptr, untouched));
    EXPECT_EQ(untouched, "keep");
}

TEST(XmlText, NonAsciiNamesAndValuesRoundTrip) {
    const std::string elementName = "Größe_数据";
    const std::string attributeName = "café";
    const std::string value = "naïve – 😀 € Ωμέγα 𝄞";
    DOMDocumentPtr doc = CreateDocument("", "Wurzel");
    DOMElement* e = CreateElement(doc.get(), elementName);
    ASSERT_NE(e, nullptr);
    ASSERT_TRUE(SetAttribute(e, attributeName, value));
    e->appendChild(doc->createTextNode(ToUTF16(value).c_str()));
    ASSERT_TRUE(InsertElement(doc->getDocumentElement(), e));
    // The writer emits the characters as UTF-8, not as character references.
    EXPECT_NE(Serialized(doc.get()).find(value), std::string::npos);
    MCXMLReadWrite reader;
    const DOMElement* back = GetFirstChildElmt(Reparsed(doc.get(), reader), elementName);
    ASSERT_NE(back, nullptr);
    std::string backValue;
    ASSERT_TRUE(GetAttribute(back, attributeName, backValue));
    EXPECT_EQ(backValue, value);
    EXPECT_EQ(ToUTF8(back->getTextContent()), value);
}

TEST(XmlText, ConversionsOfKnownAndMalformedText) {
    const XMLCh kBad = 0xFFFD; // each bad unit becomes U+FFFD and the text after it is kept
    const std::pair<std::string, UTF16String> kPairs[] = {
        {"", u""},
        {"plain", u"plain"},
        {"\xE2\x82\xAC", {0x20AC}},             // EURO SIGN, three bytes
        {"\xF0\x9F\x98\x80", {0xD83D, 0xDE00}}, // U+1F600, a surrogate pair
        {"\xC3\xA9t\xC3\xA9", {0x00E9, u't', 0x00E9}},
    };
    for (const auto& [utf8, utf16] : kPairs) {
        EXPECT_EQ(ToUTF16(utf8), utf16) << utf8;
        EXPECT_EQ(ToUTF8(utf16), utf8) << utf8;
        EXPECT_EQ(ToUTF8(utf16.c_str()), utf8) << utf8;
    }
    EXPECT_EQ(ToUTF8(static_cast<const XMLCh*>(nullptr)), "");
    EXPECT_EQ(ToUTF16(static_cast<const char*>(nullptr)), UTF16String());
    EXPECT_EQ(ToUTF16(std::string("a\xC3")), (UTF16String{u'a', kBad}));
    EXPECT_EQ(ToUTF16(std::string("\xC3(x")), (UTF16String{kBad, u'(', u'x'}));
    EXPECT_EQ(ToUTF16(std::string("\xFF\xFE")), (UTF16String{kBad, kBad}));
    // An overlong form of '/' and a surrogate encoded in UTF-8 are not valid UTF-8.
    EXPECT_EQ(ToUTF16(std::string("\xC0\xAF")).find(u'/'), UTF16String::npos);
    EXPECT_EQ(ToUTF16(std::string("\xED\xA0\x80")).front(), kBad);
    EXPECT_EQ(ToUTF8(UTF16String{u'x', 0xD800, u'y'}), "x\xEF\xBF\xBDy");
}

} // namespace
