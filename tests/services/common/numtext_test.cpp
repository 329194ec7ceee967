#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <gtest/gtest.h>

#include <cstring>
#include <limits>
#include <random>

using MCCommon_800::FormatDefault;
using MCCommon_800::FormatRoundTrip;
using MCCommon_800::ParseDouble;

TEST(NumText, RoundTripTextReadsBackBitForBit) {
    std::mt19937_64 gen(20261206);
    for (int i = 0; i < 20000; ++i) {
        const std::uint64_t bits = gen();
        double x;
        std::memcpy(&x, &bits, sizeof x);
        if (std::isnan(x)) {
            continue;
        }
        double back = 0.0;
        ASSERT_TRUE(ParseDouble(FormatRoundTrip(x), back)) << FormatRoundTrip(x);
        ASSERT_EQ(std::memcmp(&x, &back, sizeof x), 0) << FormatRoundTrip(x);
    }
}

TEST(NumText, WholeNumbersArePlainAndDefaultIsTheStreamForm) {
    // clang-format off
    const std::pair<double, const char*> kRoundTrip[] = {
        {95.0, "95"}, {100000.0, "100000"}, {-3.0, "-3"}, {9007199254740991.0, "9007199254740991"},
        {0.1, "0.1"}, {1e300, "1e+300"}, {std::numeric_limits<double>::infinity(), "INF"}};
    // clang-format on
    for (const auto& [x, text] : kRoundTrip) {
        EXPECT_EQ(FormatRoundTrip(x), text);
    }
    EXPECT_EQ(FormatDefault(0.25), "0.25");
    EXPECT_EQ(FormatDefault(1234567.0), "1.23457e+06");
}

TEST(NumText, ParserRejectsAnythingButOneNumber) {
    double x = 7.0;
    for (const char* bad :
         {"", " ", "1.5x", "abc", "1,5", "--1", "+-1", "0x10", "1 2", "1e", "e5"}) {
        EXPECT_FALSE(ParseDouble(bad, x)) << bad;
        EXPECT_EQ(x, 7.0);
    }
    EXPECT_TRUE(ParseDouble(" +2.5e3 ", x));
    EXPECT_EQ(x, 2500.0);
    EXPECT_TRUE(ParseDouble("1e999", x));
    EXPECT_TRUE(std::isinf(x));
    EXPECT_TRUE(ParseDouble("-INF", x));
    EXPECT_EQ(x, -std::numeric_limits<double>::infinity());
    EXPECT_TRUE(ParseDouble("NaN", x));
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(x));
}
