// Attributes as text and as numbers: what SetAttribute writes comes back bit for bit through
// GetDoubleAttribute (also across a full serialise-and-parse round trip), counts read as ints,
// and texts that are not numbers, not integral or out of range are refused with `out` kept.
#include "mccommon/mcmv.h"
#include "mcxml/mcxml.h"

#include <xercesc/util/XMLDouble.hpp>

#include <gtest/gtest.h>

#include <cfloat>
#include <climits>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

namespace {

using namespace MCXML_800;
using MCCommon_800::MCMV;
using xercesc::DOMElement;

bool SameBits(double a, double b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
}

// Doubles from uniformly random bit patterns: every exponent, subnormals and both signs of
// zero turn up, which a uniform draw over a range would miss. NaNs are left out (they are
// tested as the missing value).
std::vector<double> RandomDoubles(std::size_t n, std::uint64_t seed) {
    std::mt19937_64 gen(seed);
    std::vector<double> values;
    while (values.size() < n) {
        const std::uint64_t bits = gen();
        double x;
        std::memcpy(&x, &bits, sizeof x);
        if (!std::isnan(x)) {
            values.push_back(x);
        }
    }
    // Values that exercise the plain-integer form and its edge at 2^53.
    for (double x :
         {0.0, -0.0, 1.0, -3.0, 95.0, 100000.0, 9007199254740991.0, 9007199254740992.0, 0.1,
          DBL_MIN, DBL_TRUE_MIN, DBL_MAX, -DBL_MAX, std::numeric_limits<double>::infinity(),
          -std::numeric_limits<double>::infinity()}) {
        values.push_back(x);
    }
    return values;
}

class XmlAttribute : public ::testing::Test {
protected:
    DOMElement* Root() const { return fpDoc->getDocumentElement(); }
    //! A document holding only its root element "Root".
    DOMDocumentPtr fpDoc = CreateDocument("", "Root");
};

TEST_F(XmlAttribute, DoublesReadBackBitForBit) {
    ASSERT_NE(fpDoc, nullptr);
    for (double x : RandomDoubles(20000, 20240611)) {
        ASSERT_TRUE(SetAttribute(Root(), "v", x));
        double back = 0.5;
        ASSERT_EQ(GetDoubleAttribute(Root(), "v", back), kAttributeRead)
            << ToUTF8(GetAttribute(Root(), "v"));
        ASSERT_TRUE(SameBits(back, x)) << ToUTF8(GetAttribute(Root(), "v"));
    }
}

TEST(XmlNumberDocument, DoublesSurviveSerialiseAndParse) {
    const std::vector<double> values = RandomDoubles(3000, 777);
    DOMDocumentPtr doc = CreateDocument("urn:mcsim:test", "Numbers");
    ASSERT_NE(doc, nullptr);
    for (double x : values) {
        DOMElement* e = CreateElement(doc.get(), "V");
        ASSERT_TRUE(SetAttribute(e, "value", x));
        ASSERT_TRUE(InsertElement(doc->getDocumentElement(), e));
    }
    std::string text;
    ASSERT_TRUE(SerializeToUTF8(doc.get(), text));

    MCXMLReadWrite reader;
    ASSERT_TRUE(reader.ParseToDOM(text)) << reader.GetErrorMessage();
    std::size_t i = 0;
    for (const DOMElement* e = GetFirstChildElmt(reader.GetDocument()->getDocumentElement(), "V");
         e != nullptr; e = GetNextSiblingElmt(e, "V"), ++i) {
        ASSERT_LT(i, values.size());
        double back = 0.0;
        ASSERT_EQ(GetDoubleAttribute(e, "value", back), kAttributeRead);
        ASSERT_TRUE(SameBits(back, values[i])) << ToUTF8(GetAttribute(e, "value"));
    }
    EXPECT_EQ(i, values.size());
}

// The plan reader reads distribution parameters with the xsd:double type of Xerces-C, so every
// number text must be an xsd:double literal of the same value. Xerces-C flushes subnormal
// literals to zero, so those are checked only for being accepted.
TEST_F(XmlAttribute, NumberTextIsAnXsdDoubleOfTheSameValue) {
    for (double x : RandomDoubles(5000, 99)) {
        ASSERT_TRUE(SetAttribute(Root(), "v", x));
        const XMLCh* text = GetAttribute(Root(), "v");
        double parsed = 0.0;
        xercesc::XMLAbstractDoubleFloat::LiteralType type{};
        try {
            xercesc::XMLDouble number(text);
            parsed = number.getValue();
            type = number.getType();
        } catch (const xercesc::XMLException&) {
            FAIL() << "not an xsd:double: " << ToUTF8(text);
        }
        if (std::isinf(x)) {
            EXPECT_EQ(type, x > 0 ? xercesc::XMLAbstractDoubleFloat::PosINF
                                  : xercesc::XMLAbstractDoubleFloat::NegINF);
        } else if (std::fabs(x) >= DBL_MIN) {
            ASSERT_EQ(parsed, x) << ToUTF8(text);
        }
    }
}

TEST_F(XmlAttribute, WholeNumbersAreWrittenPlainAndReadAsCounts) {
    const struct {
        double value;
        const char* text;
    } kCases[] = {{0.0, "0"},
                  {95.0, "95"},
                  {100000.0, "100000"},
                  {-3.0, "-3"},
                  {2147483647.0, "2147483647"},
                  {-2147483648.0, "-2147483648"}};
    for (const auto& c : kCases) {
        ASSERT_TRUE(SetAttribute(Root(), "n", c.value));
        std::string text;
        ASSERT_TRUE(GetAttribute(Root(), "n", text));
        EXPECT_EQ(text, c.text);
        int count = -1;
        EXPECT_EQ(GetIntAttribute(Root(), "n", 0, count), kAttributeRead) << c.text;
        EXPECT_EQ(count, static_cast<int>(c.value));
    }
}

TEST_F(XmlAttribute, MissingAndSpecialValues) {
    // The missing value is written as the xsd:double "NaN" and comes back as missing.
    ASSERT_TRUE(SetAttribute(Root(), "m", MCMV::Missing()));
    EXPECT_EQ(ToUTF8(GetAttribute(Root(), "m")), "NaN");
    double x = 1.0;
    EXPECT_EQ(GetDoubleAttribute(Root(), "m", x), kAttributeRead);
    EXPECT_TRUE(MCMV::IsMissing(x));

    // "." is how documents write a missing value where a number stands.
    ASSERT_TRUE(SetAttribute(Root(), "dot", "."));
    x = 1.0;
    EXPECT_EQ(GetDoubleAttribute(Root(), "dot", x), kAttributeRead);
    EXPECT_TRUE(MCMV::IsMissing(x));

    ASSERT_TRUE(SetAttribute(Root(), "inf", -std::numeric_limits<double>::infinity()));
    EXPECT_EQ(ToUTF8(GetAttribute(Root(), "inf")), "-INF");

    // A count cannot be missing or infinite.
    int n = 4;
    EXPECT_EQ(GetIntAttribute(Root(), "m", 0, n), kAttributeNotNumber);
    EXPECT_EQ(GetIntAttribute(Root(), "inf", 0, n), kAttributeNotNumber);
    EXPECT_EQ(GetIntAttribute(Root(), "dot", 0, n), kAttributeNotNumber);
    EXPECT_EQ(n, 4);
}

TEST_F(XmlAttribute, AbsentAttributeIsNotAnEmptyOne) {
    ASSERT_TRUE(SetAttribute(Root(), "empty", ""));
    ASSERT_NE(GetAttribute(Root(), "empty"), nullptr);
    EXPECT_EQ(*GetAttribute(Root(), "empty"), 0);
    EXPECT_EQ(GetAttribute(Root(), "none"), nullptr);
    EXPECT_EQ(GetAttribute(nullptr, "none"), nullptr);
    EXPECT_EQ(GetAttribute(Root(), static_cast<const XMLCh*>(nullptr)), nullptr);

    double x = 2.0;
    int n = 3;
    EXPECT_EQ(GetDoubleAttribute(Root(), "none", x), kAttributeAbsent);
    EXPECT_EQ(GetDoubleAttribute(nullptr, "none", x), kAttributeAbsent);
    EXPECT_EQ(GetIntAttribute(Root(), "none", 0, n), kAttributeAbsent);
    EXPECT_EQ(GetDoubleAttribute(Root(), "empty", x), kAttributeNotNumber);
    EXPECT_EQ(GetIntAttribute(Root(), "empty", 0, n), kAttributeNotNumber);
    EXPECT_EQ(x, 2.0);
    EXPECT_EQ(n, 3);
}

// ---- Count texts ---------------------------------------------------------------------------

struct IntCase {
    const char* name;
    const char* text;
    int base;
    bool ok;
    int value; // expected when ok
};

class XmlIntText : public ::testing::TestWithParam<IntCase> {};

TEST_P(XmlIntText, ReadsOrRefuses) {
    const IntCase& c = GetParam();
    DOMDocumentPtr doc = CreateDocument("", "R");
    ASSERT_TRUE(SetAttribute(doc->getDocumentElement(), "n", c.text));
    int out = -77;
    const int result = GetIntAttribute(doc->getDocumentElement(), "n", c.base, out);
    if (c.ok) {
        EXPECT_EQ(result, kAttributeRead);
        EXPECT_EQ(out, c.value);
    } else {
        EXPECT_EQ(result, kAttributeNotNumber);
        EXPECT_EQ(out, -77);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Counts, XmlIntText,
    ::testing::Values(
        IntCase{"Plain", "95", 0, true, 95}, IntCase{"Blanks", " 12\t", 0, true, 12},
        IntCase{"Exponent", "1e2", 0, true, 100},
        IntCase{"TrailingZeroFraction", "7.0", 0, true, 7},
        IntCase{"NegativeZero", "-0", 0, true, 0},
        IntCase{"IntMax", "2147483647", 0, true, INT_MAX},
        IntCase{"IntMin", "-2147483648", 0, true, INT_MIN}, IntCase{"Base10", "42", 10, true, 42},
        IntCase{"Hex", "ff", 16, true, 255}, IntCase{"Binary", "-101", 2, true, -5},
        IntCase{"AboveIntMax", "2147483648", 0, false, 0},
        IntCase{"BelowIntMin", "-2147483649", 0, false, 0}, IntCase{"Huge", "1e300", 0, false, 0},
        IntCase{"Fraction", "2.5", 0, false, 0},
        IntCase{"OneUlpAboveOne", "1.0000000000000002", 0, false, 0},
        IntCase{"NaN", "NaN", 0, false, 0}, IntCase{"Infinity", "INF", 0, false, 0},
        IntCase{"Word", "ten", 0, false, 0}, IntCase{"HexPrefix", "0x10", 0, false, 0},
        IntCase{"TwoNumbers", "1 2", 0, false, 0}, IntCase{"Blank", "   ", 0, false, 0},
        IntCase{"HexOutOfRange", "80000000", 16, false, 0},
        IntCase{"BadDigitForBase", "12", 2, false, 0}, IntCase{"BaseOne", "1", 1, false, 0},
        IntCase{"BaseTooLarge", "1", 37, false, 0}),
    [](const ::testing::TestParamInfo<IntCase>& p) { return p.param.name; });

// ---- Number texts that are not numbers -----------------------------------------------------

class XmlBadDouble : public ::testing::TestWithParam<const char*> {};

TEST_P(XmlBadDouble, IsRefusedWithOutKept) {
    DOMDocumentPtr doc = CreateDocument("", "R");
    ASSERT_TRUE(SetAttribute(doc->getDocumentElement(), "x", GetParam()));
    double out = 6.5;
    EXPECT_EQ(GetDoubleAttribute(doc->getDocumentElement(), "x", out), kAttributeNotNumber);
    EXPECT_EQ(out, 6.5);
}

INSTANTIATE_TEST_SUITE_P(Texts, XmlBadDouble,
                         ::testing::Values("", " ", "1.5x", "abc", "1,5", "--1", "0x10", "1 2",
                                           "..", ". 5", "1e", "e5"));

// ---- Texts and names that cannot be written ------------------------------------------------

TEST_F(XmlAttribute, UnwritableTextsAndNamesAreRefused) {
    // Control characters other than tab, line feed and carriage return, and the non-characters
    // U+FFFE / U+FFFF, are not XML 1.0 characters: a document holding them could not be read.
    for (const std::string& text :
         {std::string("a\x01z"), std::string("bell\x07"), std::string("nul\0in", 6),
          std::string("\xEF\xBF\xBE"), std::string("\xEF\xBF\xBF")}) {
        EXPECT_FALSE(SetAttribute(Root(), "t", text));
        EXPECT_EQ(GetAttribute(Root(), "t"), nullptr);
    }
    const XMLCh loneHigh[] = {u'a', 0xD800, u'b', 0};
    const XMLCh loneLow[] = {u'a', 0xDC00, 0};
    const XMLCh pair[] = {0xD834, 0xDD1E, 0}; // U+1D11E, a valid pair
    EXPECT_FALSE(SetAttribute(Root(), u"t", loneHigh));
    EXPECT_FALSE(SetAttribute(Root(), u"t", loneLow));
    EXPECT_TRUE(SetAttribute(Root(), u"t", pair));

    for (const std::string& name : {std::string(""), std::string("1abc"), std::string("a b"),
                                    std::string("a<b"), std::string("ok\0no", 5)}) {
        EXPECT_FALSE(SetAttribute(Root(), name, "v")) << name;
        EXPECT_FALSE(SetAttribute(Root(), name, 1.0)) << name;
    }
    EXPECT_FALSE(SetAttribute(nullptr, "t", "v"));
    EXPECT_FALSE(SetAttribute(nullptr, "t", 1.0));
    EXPECT_FALSE(SetAttribute(Root(), u"t", static_cast<const XMLCh*>(nullptr)));
}

// Blanks and markup characters in values must be escaped by the writer: a raw tab or line
// break in an attribute would be read back as a space.
TEST(XmlAttributeText, BlanksAndMarkupSurviveTheRoundTrip) {
    const std::string value = "tab\there\nline\r\nfeed <&> \"quoted\" 'single'  two  spaces ";
    DOMDocumentPtr doc = CreateDocument("", "R");
    ASSERT_TRUE(SetAttribute(doc->getDocumentElement(), "v", value));
    std::string text;
    ASSERT_TRUE(SerializeToUTF8(doc.get(), text));
    MCXMLReadWrite reader;
    ASSERT_TRUE(reader.ParseToDOM(text)) << reader.GetErrorMessage();
    std::string back;
    ASSERT_TRUE(GetAttribute(reader.GetDocument()->getDocumentElement(), "v", back));
    EXPECT_EQ(back, value);
}

} // namespace
