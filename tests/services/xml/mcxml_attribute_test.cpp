// Attributes as text and numbers: doubles written as xsd:double come back bit for bit (also
// through serialise and parse); counts read as ints; bad texts are refused with `out` kept.
#include "mccommon/mcmv.h"
#include "mctolerance.h"
#include "mcxml/mcxml.h"

#include <xercesc/util/XMLDouble.hpp>

#include <gtest/gtest.h>

#include <cfloat>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <tuple>
#include <vector>

namespace {

using namespace MCXML_800;
using MCCommon_800::MCMV;
using xercesc::DOMElement;

constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

bool SameBits(double a, double b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
}

// Doubles from random bit patterns (every exponent, subnormals, both zeros; no NaN), plus the
// plain-integer form and its edge at 2^53.
std::vector<double> RandomDoubles(std::size_t n, std::uint64_t seed) {
    std::mt19937_64 gen(seed);
    // clang-format off
    std::vector<double> values{0.0, -0.0, 1.0, -3.0, 95.0, 9007199254740991.0, 9007199254740992.0,
                               0.1, DBL_MIN, DBL_TRUE_MIN, DBL_MAX, -DBL_MAX, kInf, -kInf};
    // clang-format on
    while (values.size() < n) {
        const std::uint64_t bits = gen();
        double x;
        std::memcpy(&x, &bits, sizeof x);
        if (!std::isnan(x)) {
            values.push_back(x);
        }
    }
    return values;
}

// The plan reader parses numbers as Xerces-C's xsd:double, so every number text must be such a
// literal of the same value (Xerces-C flushes subnormals to zero: those need only be accepted).
void ExpectXsdDouble(const XMLCh* text, double x) {
    try {
        const xercesc::XMLDouble number(text);
        if (std::isinf(x)) {
            EXPECT_EQ(number.getType(), x > 0 ? xercesc::XMLAbstractDoubleFloat::PosINF
                                              : xercesc::XMLAbstractDoubleFloat::NegINF);
        } else if (std::fabs(x) >= DBL_MIN) {
            EXPECT_EQ(number.getValue(), x) << ToUTF8(text);
        }
    } catch (const xercesc::XMLException&) {
        ADD_FAILURE() << "not an xsd:double: " << ToUTF8(text);
    }
}

TEST(XmlNumbers, DoublesAreXsdDoublesAndSurviveSerialiseAndParse) {
    const std::vector<double> values = RandomDoubles(5000, 777);
    DOMDocumentPtr doc = CreateDocument("urn:mcsim:test", "Numbers");
    ASSERT_NE(doc, nullptr);
    for (double x : values) {
        DOMElement* e = CreateElement(doc.get(), "V");
        ASSERT_TRUE(SetAttribute(e, "value", x));
        double back = 0.5;
        ASSERT_EQ(GetDoubleAttribute(e, "value", back), kAttributeRead);
        ASSERT_TRUE(SameBits(back, x)) << ToUTF8(GetAttribute(e, "value"));
        ExpectXsdDouble(GetAttribute(e, "value"), x);
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

class XmlAttribute : public ::testing::Test {
protected:
    DOMElement* Root() const { return fpDoc->getDocumentElement(); }
    DOMDocumentPtr fpDoc = CreateDocument("", "Root");
};

// Special values are xsd words; absent is not empty. "." (how documents write a missing number)
// and any NaN read as missing; the rest is ParseDouble's, whose refusals keep `out`.
TEST_F(XmlAttribute, SpecialValuesAbsenceAndNumberTexts) {
    ASSERT_TRUE(SetAttribute(Root(), "m", MCMV::Missing()));
    EXPECT_EQ(ToUTF8(GetAttribute(Root(), "m")), "NaN");
    ASSERT_TRUE(SetAttribute(Root(), "inf", -kInf));
    EXPECT_EQ(ToUTF8(GetAttribute(Root(), "inf")), "-INF");
    ASSERT_TRUE(SetAttribute(Root(), "empty", ""));
    EXPECT_NE(GetAttribute(Root(), "empty"), nullptr);
    EXPECT_EQ(GetAttribute(Root(), "none"), nullptr);
    EXPECT_EQ(GetAttribute(nullptr, "none"), nullptr);
    EXPECT_EQ(GetAttribute(Root(), static_cast<const XMLCh*>(nullptr)), nullptr);
    double x = 2.0;
    int n = 3;
    EXPECT_EQ(GetDoubleAttribute(Root(), "none", x), kAttributeAbsent);
    EXPECT_EQ(GetDoubleAttribute(nullptr, "none", x), kAttributeAbsent);
    EXPECT_EQ(GetIntAttribute(Root(), "none", 0, n), kAttributeAbsent);
    EXPECT_TRUE(x == 2.0 && n == 3);

    // clang-format off
    const std::tuple<const char*, int, double> kTexts[] = {
        {".", kAttributeRead, kNaN}, {" . ", kAttributeRead, kNaN}, {"NaN", kAttributeRead, kNaN},
        {"-INF", kAttributeRead, -kInf}, {" 2.5 ", kAttributeRead, 2.5},
        {"", kAttributeNotNumber, 6.5}, {"..", kAttributeNotNumber, 6.5},
        {". 5", kAttributeNotNumber, 6.5}, {".5.", kAttributeNotNumber, 6.5},
        {"1.5x", kAttributeNotNumber, 6.5}};
    // clang-format on
    for (const auto& [text, status, value] : kTexts) {
        ASSERT_TRUE(SetAttribute(Root(), "x", text));
        double out = 6.5;
        EXPECT_EQ(GetDoubleAttribute(Root(), "x", out), status) << '"' << text << '"';
        EXPECT_TRUE(mctest::Near(out, value, 0.0)) << '"' << text << '"';
    }
}

struct IntCase {
    const char* text;
    int base;
    bool ok;
    int value; //!< expected when ok
};

class XmlIntText : public ::testing::TestWithParam<IntCase> {};

TEST_P(XmlIntText, ReadsOrRefuses) {
    const IntCase& c = GetParam();
    DOMDocumentPtr doc = CreateDocument("", "R");
    ASSERT_TRUE(SetAttribute(doc->getDocumentElement(), "n", c.text));
    int out = -77;
    EXPECT_EQ(GetIntAttribute(doc->getDocumentElement(), "n", c.base, out),
              c.ok ? kAttributeRead : kAttributeNotNumber)
        << '"' << c.text << "\" base " << c.base;
    EXPECT_EQ(out, c.ok ? c.value : -77) << c.text;
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Counts, XmlIntText, ::testing::Values(
    IntCase{"95", 0, true, 95}, IntCase{" 12\t", 0, true, 12}, IntCase{"1e2", 0, true, 100},
    IntCase{"7.0", 0, true, 7}, IntCase{"-0", 0, true, 0}, IntCase{"2147483647", 0, true, INT_MAX},
    IntCase{"-2147483648", 0, true, INT_MIN}, IntCase{"42", 10, true, 42},
    IntCase{"ff", 16, true, 255}, IntCase{"-101", 2, true, -5},
    IntCase{"2147483648", 0, false, 0}, IntCase{"-2147483649", 0, false, 0},
    IntCase{"1e300", 0, false, 0}, IntCase{"2.5", 0, false, 0},
    IntCase{"1.0000000000000002", 0, false, 0}, IntCase{"NaN", 0, false, 0},
    IntCase{".", 0, false, 0}, IntCase{"-INF", 0, false, 0}, IntCase{"ten", 0, false, 0},
    IntCase{"0x10", 0, false, 0}, IntCase{"1 2", 0, false, 0}, IntCase{"", 0, false, 0},
    IntCase{"   ", 0, false, 0}, IntCase{"80000000", 16, false, 0}, IntCase{"12", 2, false, 0},
    IntCase{"1", 1, false, 0}, IntCase{"1", 37, false, 0}));
// clang-format on

// Controls other than tab, LF and CR, and U+FFFE / U+FFFF, are not XML 1.0 characters: a
// document holding them could not be read.
TEST_F(XmlAttribute, UnwritableTextsAndNamesAreRefused) {
    for (const std::string& text :
         {std::string("a\x01z"), std::string("bell\x07"), std::string("nul\0in", 6),
          std::string("\xEF\xBF\xBE"), std::string("\xEF\xBF\xBF")}) {
        EXPECT_FALSE(SetAttribute(Root(), "t", text));
        EXPECT_EQ(GetAttribute(Root(), "t"), nullptr);
    }
    const XMLCh loneHigh[] = {u'a', 0xD800, u'b', 0}, loneLow[] = {u'a', 0xDC00, 0};
    const XMLCh pair[] = {0xD834, 0xDD1E, 0}; // U+1D11E, a valid pair
    EXPECT_FALSE(SetAttribute(Root(), u"t", loneHigh) || SetAttribute(Root(), u"t", loneLow));
    EXPECT_TRUE(SetAttribute(Root(), u"t", pair));

    for (const std::string& name : {std::string(""), std::string("1abc"), std::string("a b"),
                                    std::string("a<b"), std::string("ok\0no", 5)}) {
        EXPECT_FALSE(SetAttribute(Root(), name, "v") || SetAttribute(Root(), name, 1.0)) << name;
    }
    EXPECT_FALSE(SetAttribute(nullptr, "t", "v") || SetAttribute(nullptr, "t", 1.0) ||
                 SetAttribute(Root(), u"t", static_cast<const XMLCh*>(nullptr)));
}

// A raw tab or line break in an attribute would be read back as a space: the writer escapes.
TEST_F(XmlAttribute, BlanksAndMarkupSurviveTheRoundTrip) {
    const std::string value = "tab\there\nline\r\nfeed <&> \"quoted\" 'single'  two  spaces ";
    ASSERT_TRUE(SetAttribute(Root(), "v", value));
    std::string text;
    ASSERT_TRUE(SerializeToUTF8(fpDoc.get(), text));
    MCXMLReadWrite reader;
    ASSERT_TRUE(reader.ParseToDOM(text)) << reader.GetErrorMessage();
    std::string back;
    ASSERT_TRUE(GetAttribute(reader.GetDocument()->getDocumentElement(), "v", back));
    EXPECT_EQ(back, value);
}

} // namespace
