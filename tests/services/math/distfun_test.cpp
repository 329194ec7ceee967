#include "mcmath/mcdistfun.h"
#include "mcmath/mcmathfun.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"
#include "reference/distfun_reference.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include <map>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

using MCCommon_800::MCMV;
using MCMath_800::MCDistFun;
using MCMath_800::MCMathFun;

namespace {

constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
//! Agreement with the 60-digit references: the goal of 1e-12 relative leaves room for the
//! condition numbers of the hardest rows (a Gamma quantile at shape 0.01 amplifies the error
//! of P by 100).
constexpr double kRefRel = 1e-12;

//! The function of each reference row, by its name in the table.
double Evaluate(const mcreference::DistFunRow& r) {
    using F = std::function<double(double, double, double)>;
    static const std::map<std::string, F> functions = {
        {"CdfStdNorm", [](double a, double, double) { return MCDistFun::CdfStdNorm(a); }},
        {"CdfNorm", MCDistFun::CdfNorm},
        {"CdfGam", MCDistFun::CdfGam},
        {"CdfBeta", MCDistFun::CdfBeta},
        {"CdfChi", [](double a, double b, double) { return MCDistFun::CdfChi(a, b); }},
        {"CdfBin", [](double k, double n, double p) { return MCDistFun::CdfBin(k, n, p); }},
        {"IdfNorm", MCDistFun::IdfNorm},
        {"IdfGam", MCDistFun::IdfGam},
        {"IdfBeta", MCDistFun::IdfBeta},
        {"LnGamma", [](double a, double, double) { return MCDistFun::norvanednlgam(a); }},
        {"Digamma", [](double a, double, double) { return MCMathFun::Digamma(a); }},
        {"Trigamma", [](double a, double, double) { return MCMathFun::Trigamma(a); }},
    };
    const auto it = functions.find(r.fFunction);
    return it == functions.end() ? kNaN : it->second(r.fA, r.fB, r.fC);
}

class DistFunReference : public ::testing::TestWithParam<mcreference::DistFunRow> {};

TEST_P(DistFunReference, AgreesWithHighPrecisionValue) {
    const auto& row = GetParam();
    EXPECT_NEAR_REL(Evaluate(row), row.fExpected, kRefRel)
        << row.fFunction << "(" << row.fA << ", " << row.fB << ", " << row.fC << ")";
}

INSTANTIATE_TEST_SUITE_P(Mpmath, DistFunReference, ::testing::ValuesIn(mcreference::kDistFunRows),
                         [](const ::testing::TestParamInfo<mcreference::DistFunRow>& paramInfo) {
                             return std::string(paramInfo.param.fFunction) + "_" +
                                    std::to_string(paramInfo.index);
                         });

// Bad input gives missing; the ends of the supports give their limits. One row per case.
TEST(DistFunEdges, BadInputGivesMissing) {
    const std::pair<const char*, double> cases[] = {
        {"CdfStdNorm(NaN)", MCDistFun::CdfStdNorm(kNaN)},
        {"CdfNorm sd 0", MCDistFun::CdfNorm(1.0, 0.0, 0.0)},
        {"CdfNorm mean inf", MCDistFun::CdfNorm(1.0, kInf, 1.0)},
        {"CdfGam shape 0", MCDistFun::CdfGam(1.0, 0.0, 1.0)},
        {"CdfGam rate < 0", MCDistFun::CdfGam(1.0, 2.0, -1.0)},
        {"CdfGam shape inf", MCDistFun::CdfGam(1.0, kInf, 1.0)},
        {"CdfGam x NaN", MCDistFun::CdfGam(kNaN, 2.0, 1.0)},
        {"CdfBeta shape 0", MCDistFun::CdfBeta(0.5, 0.0, 1.0)},
        {"CdfChi df 0", MCDistFun::CdfChi(3.0, 0.0)},
        {"CdfBin n < 0", MCDistFun::CdfBin(1.0, -1.0, 0.5)},
        {"CdfBin p > 1", MCDistFun::CdfBin(1.0, 5.0, 1.5)},
        {"CdfBin n inf", MCDistFun::CdfBin(1.0, kInf, 0.5)},
        {"IdfNorm p 0", MCDistFun::IdfNorm(0.0, 0.0, 1.0)},
        {"IdfNorm p 1", MCDistFun::IdfNorm(1.0, 0.0, 1.0)},
        {"IdfNorm p NaN", MCDistFun::IdfNorm(kNaN, 0.0, 1.0)},
        {"IdfGam p 1", MCDistFun::IdfGam(1.0, 2.0, 1.0)},
        {"IdfGam p < 0", MCDistFun::IdfGam(-0.1, 2.0, 1.0)},
        {"IdfGam overflow", MCDistFun::IdfGam(0.5, 2.0, 1e-320)},
        {"IdfBeta p > 1", MCDistFun::IdfBeta(1.0000001, 2.0, 3.0)},
        {"lnGamma pole 0", MCDistFun::norvanednlgam(0.0)},
        {"lnGamma pole -2", MCDistFun::norvanednlgam(-2.0)},
        {"lnGamma Gamma < 0", MCDistFun::norvanednlgam(-0.5)},
        {"lnGamma inf", MCDistFun::norvanednlgam(kInf)},
        {"Digamma pole", MCMathFun::Digamma(-3.0)},
        {"Trigamma pole", MCMathFun::Trigamma(0.0)},
    };
    for (const auto& [name, value] : cases) {
        EXPECT_TRUE(MCMV::IsMissing(value)) << name << " gave " << value;
    }
}

TEST(DistFunEdges, EndsOfTheSupport) {
    const std::tuple<const char*, double, double> cases[] = {
        {"CdfStdNorm(-inf)", MCDistFun::CdfStdNorm(-kInf), 0.0},
        {"CdfStdNorm(inf)", MCDistFun::CdfStdNorm(kInf), 1.0},
        {"CdfGam(0)", MCDistFun::CdfGam(0.0, 0.3, 2.0), 0.0},
        {"CdfGam(-5)", MCDistFun::CdfGam(-5.0, 0.3, 2.0), 0.0},
        {"CdfGam(inf)", MCDistFun::CdfGam(kInf, 0.3, 2.0), 1.0},
        {"CdfGam rate*x overflows", MCDistFun::CdfGam(1e300, 2.0, 1e300), 1.0},
        {"CdfBeta(0)", MCDistFun::CdfBeta(0.0, 0.5, 0.5), 0.0},
        {"CdfBeta(1)", MCDistFun::CdfBeta(1.0, 0.5, 0.5), 1.0},
        {"CdfBeta(7)", MCDistFun::CdfBeta(7.0, 2.0, 2.0), 1.0},
        {"CdfChi(0)", MCDistFun::CdfChi(0.0, 3.0), 0.0},
        {"CdfBin k < 0", MCDistFun::CdfBin(-1.0, 10.0, 0.3), 0.0},
        {"CdfBin k = n", MCDistFun::CdfBin(10.0, 10.0, 0.3), 1.0},
        {"CdfBin p 0", MCDistFun::CdfBin(3.0, 10.0, 0.0), 1.0},
        {"CdfBin p 1", MCDistFun::CdfBin(3.0, 10.0, 1.0), 0.0},
        {"IdfGam p 0", MCDistFun::IdfGam(0.0, 0.01, 2.0), 0.0},
        {"IdfBeta p 0", MCDistFun::IdfBeta(0.0, 0.3, 4.0), 0.0},
        {"IdfBeta p 1", MCDistFun::IdfBeta(1.0, 0.3, 4.0), 1.0},
        // A tiny shape puts the median below the smallest double: its rounded value is 0.
        {"IdfGam underflow", MCDistFun::IdfGam(0.5, 1e-4, 1.0), 0.0},
    };
    for (const auto& [name, value, expected] : cases) {
        EXPECT_EQ(value, expected) << name;
    }
}

TEST(DistFunEdges, GammaSecondParameterIsARate) {
    // Exponential with rate 3 (shape 1): F(x) = 1 − e^(−3x); mean 1/3 = shape/rate.
    EXPECT_NEAR_REL(MCDistFun::CdfGam(0.5, 1.0, 3.0), -std::expm1(-1.5), 1e-14);
    EXPECT_NEAR_REL(MCDistFun::IdfGam(0.5, 1.0, 3.0), std::log(2.0) / 3.0, 1e-14);
}

TEST(DistFunEdges, BinomialErrorCodeAndFractionalK) {
    int err = -1;
    EXPECT_NEAR_REL(MCDistFun::CdfBin(0.0, 1.0, 0.3, err), 0.7, 1e-15); // Bernoulli: 1 − p
    EXPECT_EQ(err, 0);
    EXPECT_TRUE(MCMV::IsMissing(MCDistFun::CdfBin(3.0, 10.0, -0.2, err)));
    EXPECT_EQ(err, 1);
    EXPECT_TRUE(MCMV::IsMissing(MCDistFun::CdfBin(kNaN, 10.0, 0.2, err)));
    EXPECT_EQ(err, 1);
    // A fractional k counts as its integer part: P(X ≤ 3.7) = P(X ≤ 3).
    EXPECT_EQ(MCDistFun::CdfBin(3.7, 10.0, 0.3), MCDistFun::CdfBin(3.0, 10.0, 0.3));
}

//! Shapes across the range the fitting produces, small ones included.
class QuantileInvertsCdf : public ::testing::TestWithParam<double> {};

TEST_P(QuantileInvertsCdf, GammaRoundTrip) {
    const double alpha = GetParam();
    const double rate = 1.7;
    for (double s = -25.0; s <= 25.0; s += 0.5) {
        const double p = 1.0 / (1.0 + std::exp(-s));
        const double x = MCDistFun::IdfGam(p, alpha, rate);
        if (x < 1e-290) {
            continue; // underflowed: nothing to invert
        }
        // F(x) = p, with F's conditioning near 1 measured on the complement.
        const double back = MCDistFun::CdfGam(x, alpha, rate);
        EXPECT_NEAR_TOL(back, p, 1e-12, 1e-15) << "alpha " << alpha << " p " << p;
        EXPECT_NEAR_REL(MCDistFun::IdfGam(back, alpha, rate), x, 1e-10) << "p " << p;
    }
}

TEST_P(QuantileInvertsCdf, BetaRoundTrip) {
    const double a = GetParam();
    for (const double b : {0.3, 1.0, 4.0, 60.0}) {
        for (double x = 0.0125; x < 1.0; x += 0.025) {
            const double p = MCDistFun::CdfBeta(x, a, b);
            // Near 1 the double p itself carries only 1e-16/(1 − p) relative information
            // about x; the complement is where the upper tail is resolved.
            if (p < 1e-290 || 1.0 - p < 1e-4) {
                continue;
            }
            EXPECT_NEAR_REL(MCDistFun::IdfBeta(p, a, b), x, 1e-10)
                << "a " << a << " b " << b << " x " << x;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Shapes, QuantileInvertsCdf,
                         ::testing::Values(0.02, 0.3, 1.0, 2.5, 11.0, 250.0, 5000.0));

TEST(SpecialFunctions, RecurrencesHoldAcrossTheRange) {
    // lnΓ(x + 1) = lnΓ(x) + ln x; ψ(x + 1) = ψ(x) + 1/x; ψ'(x + 1) = ψ'(x) − 1/x². The sums
    // on the right cancel for small x, so the tolerance is 1e-14 of the terms' magnitude.
    const auto near = [](double lhs, double first, double second) {
        return mctest::Near(lhs, first + second, 0.0,
                            1e-14 * (std::fabs(first) + std::fabs(second)));
    };
    for (const double x : {1e-6, 0.013, 0.5, 0.9, 1.7, 3.25, 12.5, 80.0, 1234.5, 1e7}) {
        EXPECT_TRUE(
            near(MCDistFun::norvanednlgam(x + 1.0), MCDistFun::norvanednlgam(x), std::log(x)))
            << x;
        EXPECT_TRUE(near(MCMathFun::Digamma(x + 1.0), MCMathFun::Digamma(x), 1.0 / x)) << x;
        EXPECT_TRUE(near(MCMathFun::Trigamma(x + 1.0), MCMathFun::Trigamma(x), -1.0 / (x * x)))
            << x;
    }
}

// BinSearch: "result − 1 is the cell of u". Cells [t_i, t_(i+1)) unless right-closed.
struct BinSearchCase {
    const char* fName;
    std::vector<double> fTable;
    int fLo, fHi;
    double fU;
    bool fbRightClosed;
    int fCell; //!< expected result − 1
};

class BinSearchTable : public ::testing::TestWithParam<BinSearchCase> {};

TEST_P(BinSearchTable, FindsTheCell) {
    const auto& c = GetParam();
    EXPECT_EQ(MCMathFun::BinSearch(c.fTable, c.fLo, c.fHi, c.fU, c.fbRightClosed) - 1, c.fCell);
}

const std::vector<double> kTable = {0.0, 0.2, 0.2, 0.5, 1.0}; // cell 1 has zero width
const std::vector<double> kZeroEnds = {0.0, 0.0, 0.4, 1.0, 1.0};
const std::vector<double> kShortTotal = {0.0, 0.3, 0.6, 0.9999999};

INSTANTIATE_TEST_SUITE_P(
    Cells, BinSearchTable,
    ::testing::Values(BinSearchCase{"ZeroIsFirstCell", kTable, 0, 4, 0.0, false, 0},
                      BinSearchCase{"Inside", kTable, 0, 4, 0.1, false, 0},
                      BinSearchCase{"BoundaryGoesUp", kTable, 0, 4, 0.2, false, 2},
                      BinSearchCase{"BoundaryGoesUp2", kTable, 0, 4, 0.5, false, 3},
                      BinSearchCase{"JustBelowBoundary", kTable, 0, 4, std::nextafter(0.5, 0.0),
                                    false, 2},
                      BinSearchCase{"LastCell", kTable, 0, 4, 0.9999999999999999, false, 3},
                      BinSearchCase{"TotalClampsToLastCell", kTable, 0, 4, 1.0, false, 3},
                      BinSearchCase{"BelowClampsToFirstCell", kTable, 0, 4, -0.3, false, 0},
                      BinSearchCase{"RightClosedBoundaryGoesDown", kTable, 0, 4, 0.2, true, 0},
                      BinSearchCase{"RightClosedBoundaryGoesDown2", kTable, 0, 4, 0.5, true, 2},
                      BinSearchCase{"RightClosedZero", kTable, 0, 4, 0.0, true, 0},
                      BinSearchCase{"RightClosedTotal", kTable, 0, 4, 1.0, true, 3},
                      BinSearchCase{"LeadingEmptyCellSkipped", kZeroEnds, 0, 4, 0.0, false, 1},
                      BinSearchCase{"TrailingEmptyCellSkipped", kZeroEnds, 0, 4, 1.0, false, 2},
                      BinSearchCase{"TrailingEmptyCellSkippedRC", kZeroEnds, 0, 4, 1.0, true, 2},
                      BinSearchCase{"ShortTotal", kShortTotal, 0, 3, 0.99999995, false, 2},
                      BinSearchCase{"SubRange", kTable, 2, 4, 0.1, false, 2},
                      BinSearchCase{"SubRangeInside", kTable, 2, 4, 0.7, false, 3},
                      BinSearchCase{"NaNHasNoCell", kTable, 0, 4, kNaN, false, -1},
                      BinSearchCase{"HiPastEndHasNoCell", kTable, 0, 5, 0.3, false, -1},
                      BinSearchCase{"EmptyRangeHasNoCell", kTable, 3, 3, 0.3, false, 2},
                      BinSearchCase{"AllZeroWidthGivesFirst", std::vector<double>{0.0, 0.0, 0.0}, 0,
                                    2, 0.5, false, 0}),
    [](const ::testing::TestParamInfo<BinSearchCase>& paramInfo) { return paramInfo.param.fName; });

TEST(BinSearch, EvenUniformGridFillsCellsInProportion) {
    // Dyadic probabilities, so that u = k/N for k = 0, ..., N − 1 lands exactly p_i·N times in
    // cell i: any off-by-one at the boundaries changes a count.
    const std::vector<double> probs = {0.125, 0.0, 0.375, 0.25, 0.25};
    std::vector<double> table = {0.0};
    for (const double p : probs) {
        table.push_back(table.back() + p);
    }
    const int n = 1024;
    std::vector<int> counts(probs.size(), 0);
    for (int k = 0; k < n; ++k) {
        const int cell = MCMathFun::BinSearch(table, 0, static_cast<int>(table.size()) - 1,
                                              static_cast<double>(k) / n, false) -
                         1;
        ASSERT_GE(cell, 0);
        ASSERT_LT(cell, static_cast<int>(probs.size()));
        ++counts[static_cast<std::size_t>(cell)];
    }
    for (std::size_t i = 0; i < probs.size(); ++i) {
        EXPECT_EQ(counts[i], static_cast<int>(probs[i] * n)) << "cell " << i;
    }
}

} // namespace
