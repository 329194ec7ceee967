// The parser on good, malformed and hostile text: a refusal gives false, a null document and a
// reason, without crashing or reading anything but the given text.
#include "mcxml/mcxml.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <initializer_list>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace MCXML_800;
using xercesc::DOMElement;

// Text nested `depth` elements deep.
std::string Nested(int depth) {
    std::string open, close;
    for (int i = 0; i < depth; ++i) {
        open += "<e>";
        close += "</e>";
    }
    return open + close;
}

void ExpectRefused(MCXMLReadWrite& reader, const std::string& text) {
    EXPECT_FALSE(reader.ParseToDOM(text));
    EXPECT_EQ(reader.GetDocument(), nullptr);
    EXPECT_FALSE(reader.GetErrorMessage().empty());
}

struct BadDocument {
    const char* name;
    std::string text;
};

class XmlHostile : public ::testing::TestWithParam<BadDocument> {};

TEST_P(XmlHostile, IsRefused) {
    MCXMLReadWrite reader;
    // A good document first, so that the refusal must also drop it.
    ASSERT_TRUE(reader.ParseToDOM("<ok/>"));
    ExpectRefused(reader, GetParam().text);
}

// Entity expansion bomb (the "billion laughs"): ten levels of ten references each.
std::string BillionLaughs() {
    std::string text = "<?xml version=\"1.0\"?><!DOCTYPE lolz [<!ENTITY lol0 \"lol\">";
    for (int i = 1; i <= 9; ++i) {
        text += "<!ENTITY lol" + std::to_string(i) + " \"";
        for (int k = 0; k < 10; ++k) {
            text += "&lol" + std::to_string(i - 1) + ";";
        }
        text += "\">";
    }
    return text + "]><lolz>&lol9;</lolz>";
}

// Quadratic blow-up: one large entity referenced many times, within any expansion count cap.
std::string QuadraticBlowup() {
    std::string text = "<!DOCTYPE r [<!ENTITY big \"" + std::string(100000, 'x') + "\">]><r>";
    for (int i = 0; i < 20000; ++i) {
        text += "&big;";
    }
    return text + "</r>";
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Documents, XmlHostile, ::testing::Values(
    BadDocument{"Empty", ""}, BadDocument{"Blank", "  \n "}, BadDocument{"NotXml", "not xml"},
    BadDocument{"Unclosed", "<a><b></a>"}, BadDocument{"TruncatedTag", "<a attr='1'"},
    BadDocument{"TwoRoots", "<a/><b/>"}, BadDocument{"DuplicateAttribute", "<a x='1' x='2'/>"},
    BadDocument{"UnquotedAttribute", "<a x=1/>"}, BadDocument{"UndeclaredEntity", "<a>&foo;</a>"},
    BadDocument{"InvalidCharacterReference", "<a>&#1;</a>"},
    BadDocument{"ControlCharacter", "<a>\x01</a>"}, BadDocument{"InvalidUTF8", "<a>\xFF\xFE</a>"},
    BadDocument{"UnknownEncoding", "<?xml version='1.0' encoding='no-such'?><a/>"},
    BadDocument{"UnboundPrefix", "<p:a/>"}, BadDocument{"EmbeddedNul", std::string("<a>\0</a>", 8)},
    BadDocument{"DocumentType", "<!DOCTYPE a><a/>"}, BadDocument{"BillionLaughs", BillionLaughs()},
    BadDocument{"QuadraticBlowup", QuadraticBlowup()},
    BadDocument{"ExternalDTDOverNetwork", "<!DOCTYPE a SYSTEM \"http://127.0.0.1:9/a.dtd\"><a/>"},
    BadDocument{"ParameterEntityOverNetwork",
                "<!DOCTYPE a [<!ENTITY % p SYSTEM \"http://127.0.0.1:9/p\"> %p;]><a/>"},
    BadDocument{"TooDeep", Nested(MCXMLReadWrite::kMaxElementDepth + 1)},
    BadDocument{"FarTooDeep", Nested(200000)}),
    [](const ::testing::TestParamInfo<BadDocument>& p) { return p.param.name; });
// clang-format on

// A scratch file holding a marker text, removed at the end of the test.
struct ScratchFile {
    ScratchFile(const std::string& name, const std::string& content)
        : fPath(::testing::TempDir() + name) {
        std::ofstream(fPath) << content;
    }
    ~ScratchFile() { std::remove(fPath.c_str()); }
    std::string Url() const { return "file://" + fPath; }
    std::string fPath;
};

// External entities never bring a local file into the document or the error text; schema
// locations and XInclude elements are plain attributes and elements: a schema that does not even
// parse is never loaded, and the included file's text never appears.
TEST(XmlParse, ExternalEntitiesSchemasAndIncludesAreNotFollowed) {
    const std::string marker = "SECRET-7f3a9c";
    ScratchFile secret("mcxml_secret.txt", marker);
    ScratchFile dtd("mcxml_secret.dtd", "<!ENTITY leak \"" + marker + "\">");
    const std::string kDocuments[] = {
        "<!DOCTYPE r [<!ENTITY x SYSTEM \"" + secret.Url() + "\">]><r>&x;</r>",
        "<!DOCTYPE r [<!ENTITY x SYSTEM \"" + secret.Url() + "\">]><r a=\"&x;\"/>",
        "<!DOCTYPE r SYSTEM \"" + dtd.Url() + "\"><r>&leak;</r>",
        "<!DOCTYPE r [<!ENTITY % p SYSTEM \"" + dtd.Url() + "\"> %p;]><r>&leak;</r>",
    };
    for (const std::string& text : kDocuments) {
        MCXMLReadWrite reader;
        ExpectRefused(reader, text);
        EXPECT_EQ(reader.GetErrorMessage().find(marker), std::string::npos);
    }
    ScratchFile badSchema("mcxml_bad.xsd", "this is not a schema");
    ScratchFile included("mcxml_included.txt", "INCLUDED-51e0");
    const std::string text = "<r xmlns:xsi='http://www.w3.org/2001/XMLSchema-instance'"
                             " xmlns:xi='http://www.w3.org/2001/XInclude'"
                             " xsi:noNamespaceSchemaLocation='" +
                             badSchema.Url() + "'><xi:include href='" + included.Url() +
                             "' parse='text'/><n v='unchecked'/></r>";
    MCXMLReadWrite reader;
    ASSERT_TRUE(reader.ParseToDOM(text)) << reader.GetErrorMessage();
    const DOMElement* root = reader.GetDocument()->getDocumentElement();
    EXPECT_NE(GetFirstChildElmt(root, "xi:include"), nullptr);
    EXPECT_EQ(ToUTF8(root->getTextContent()).find("INCLUDED-51e0"), std::string::npos);
}

// Many closed siblings do not add up to depth; a huge attribute value is read whole.
TEST(XmlParse, DepthCapCountsOpenElementsOnlyAndSizeIsNotCapped) {
    MCXMLReadWrite reader;
    EXPECT_TRUE(reader.ParseToDOM(Nested(MCXMLReadWrite::kMaxElementDepth)))
        << reader.GetErrorMessage();
    std::string wide = "<r>";
    for (int i = 0; i < 5000; ++i) {
        wide += (i % 2 == 0) ? "<e/>" : "<e><f/></e>";
    }
    EXPECT_TRUE(reader.ParseToDOM(wide + "</r>")) << reader.GetErrorMessage();
    const std::string value(8 << 20, 'v');
    ASSERT_TRUE(reader.ParseToDOM("<r big='" + value + "'/>")) << reader.GetErrorMessage();
    std::string back;
    ASSERT_TRUE(GetAttribute(reader.GetDocument()->getDocumentElement(), "big", back));
    EXPECT_EQ(back.size(), value.size());
}

TEST(XmlParse, ReadsStreamsAndRefusesBadOnes) {
    std::istringstream good("<?xml version='1.0' encoding='UTF-8'?>\n<r><c n='5'/></r>");
    MCXMLReadWrite reader;
    ASSERT_TRUE(reader.ParseToDOM(good)) << reader.GetErrorMessage();
    EXPECT_NE(GetFirstChildElmt(reader.GetDocument()->getDocumentElement(), "c"), nullptr);
    std::ifstream missing(::testing::TempDir() + "mcxml_no_such_file.xml");
    std::istringstream truncated("<r><c>");
    for (std::istream* bad : std::initializer_list<std::istream*>{&missing, &truncated}) {
        ASSERT_TRUE(reader.ParseToDOM("<ok/>"));
        EXPECT_FALSE(reader.ParseToDOM(*bad));
        EXPECT_EQ(reader.GetDocument(), nullptr);
    }
}

// Readers and writers on several threads at once, the first of them also starting Xerces-C.
TEST(XmlParse, ParsesAndWritesOnSeveralThreads) {
    constexpr int kThreads = 4;
    std::vector<int> failures(kThreads, 0);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([t, &failures] {
            for (int i = 0; i < 50; ++i) {
                DOMDocumentPtr doc = CreateDocument("", "R");
                DOMElement* e = CreateElement(doc.get(), "V");
                const double x = t + i / 7.0;
                std::string text;
                MCXMLReadWrite reader;
                double back = 0.0;
                const bool ok =
                    SetAttribute(e, "x", x) && InsertElement(doc->getDocumentElement(), e) &&
                    SerializeToUTF8(doc.get(), text) && reader.ParseToDOM(text) &&
                    GetDoubleAttribute(
                        GetFirstChildElmt(reader.GetDocument()->getDocumentElement()), "x", back) ==
                        kAttributeRead &&
                    back == x;
                failures[t] += ok ? 0 : 1;
            }
        });
    }
    for (std::thread& th : threads) {
        th.join();
    }
    EXPECT_EQ(failures, std::vector<int>(kThreads, 0));
}

} // namespace
