// The distribution and special functions wrap Boost.Math: the 60-digit references pin the
// wrapping (argument order, the rate convention, missing values), the edges the guards.
#include "mcmath/mcdistfun.h"
#include "mcmath/mcmathfun.h"
#include "mcmath/mcquantile.h"

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

// The quantile rows also check the prepared quantiles of the normal score.
TEST_P(DistFunReference, AgreesWithHighPrecisionValue) {
    const auto& row = GetParam();
    EXPECT_NEAR_REL(Evaluate(row), row.fExpected, kRefRel)
        << row.fFunction << "(" << row.fA << ", " << row.fB << ", " << row.fC << ")";
    const std::string f = row.fFunction;
    const double prepared = f == "IdfGam"    ? MCMath_800::MCGammaQuantile(row.fB, row.fC)(row.fA)
                            : f == "IdfBeta" ? MCMath_800::MCBetaQuantile(row.fB, row.fC)(row.fA)
                            : f == "IdfNorm" ? MCMath_800::MCNormalQuantile(row.fB, row.fC)(row.fA)
                                             : row.fExpected;
    EXPECT_NEAR_REL(prepared, row.fExpected, kRefRel) << "prepared quantile";
}

INSTANTIATE_TEST_SUITE_P(Mpmath, DistFunReference, ::testing::ValuesIn(mcreference::kDistFunRows),
                         [](const ::testing::TestParamInfo<mcreference::DistFunRow>& paramInfo) {
                             return std::string(paramInfo.param.fFunction) + "_" +
                                    std::to_string(paramInfo.index);
                         });

// Bad input gives missing (NaN below); the ends of the supports give their limits. A tiny shape
// puts the Gamma median below the smallest double: its rounded value is 0. The rate (not scale)
// convention of the Gamma functions is pinned by the reference rows with rate != 1.
using D = MCDistFun;
#define MC_CASE(expr, expected) std::make_tuple(#expr, (expr), double(expected))

TEST(DistFunEdges, BadInputAndEndsOfTheSupport) {
    // clang-format off
    const std::tuple<const char*, double, double> cases[] = {
        MC_CASE(D::CdfStdNorm(kNaN), kNaN), MC_CASE(D::CdfNorm(1, 0, 0), kNaN),
        MC_CASE(D::CdfNorm(1, kInf, 1), kNaN), MC_CASE(D::CdfGam(1, 0, 1), kNaN),
        MC_CASE(D::CdfGam(1, 2, -1), kNaN), MC_CASE(D::CdfGam(1, kInf, 1), kNaN),
        MC_CASE(D::CdfGam(kNaN, 2, 1), kNaN), MC_CASE(D::CdfBeta(0.5, 0, 1), kNaN),
        MC_CASE(D::CdfChi(3, 0), kNaN), MC_CASE(D::CdfBin(1, -1, 0.5), kNaN),
        MC_CASE(D::CdfBin(1, 5, 1.5), kNaN), MC_CASE(D::CdfBin(1, kInf, 0.5), kNaN),
        MC_CASE(D::CdfBin(3, 10, -0.2), kNaN), MC_CASE(D::CdfBin(kNaN, 10, 0.2), kNaN),
        MC_CASE(D::IdfNorm(0, 0, 1), kNaN), MC_CASE(D::IdfNorm(1, 0, 1), kNaN),
        MC_CASE(D::IdfNorm(kNaN, 0, 1), kNaN), MC_CASE(D::IdfGam(1, 2, 1), kNaN),
        MC_CASE(D::IdfGam(-0.1, 2, 1), kNaN), MC_CASE(D::IdfGam(0.5, 2, 1e-320), kNaN),
        MC_CASE(D::IdfBeta(1.0000001, 2, 3), kNaN), MC_CASE(D::norvanednlgam(0), kNaN),
        MC_CASE(D::norvanednlgam(-2), kNaN), MC_CASE(D::norvanednlgam(-0.5), kNaN),
        MC_CASE(D::norvanednlgam(kInf), kNaN), MC_CASE(MCMathFun::Digamma(-3), kNaN),
        MC_CASE(MCMathFun::Trigamma(0), kNaN),
        MC_CASE(D::CdfStdNorm(-kInf), 0), MC_CASE(D::CdfStdNorm(kInf), 1),
        MC_CASE(D::CdfGam(0, 0.3, 2), 0), MC_CASE(D::CdfGam(-5, 0.3, 2), 0),
        MC_CASE(D::CdfGam(kInf, 0.3, 2), 1), MC_CASE(D::CdfGam(1e300, 2, 1e300), 1),
        MC_CASE(D::CdfBeta(0, 0.5, 0.5), 0), MC_CASE(D::CdfBeta(1, 0.5, 0.5), 1),
        MC_CASE(D::CdfBeta(7, 2, 2), 1), MC_CASE(D::CdfChi(0, 3), 0),
        MC_CASE(D::CdfBin(-1, 10, 0.3), 0), MC_CASE(D::CdfBin(10, 10, 0.3), 1),
        MC_CASE(D::CdfBin(3, 10, 0), 1), MC_CASE(D::CdfBin(3, 10, 1), 0),
        MC_CASE(D::IdfGam(0, 0.01, 2), 0), MC_CASE(D::IdfBeta(0, 0.3, 4), 0),
        MC_CASE(D::IdfBeta(1, 0.3, 4), 1), MC_CASE(D::IdfGam(0.5, 1e-4, 1), 0)};
    // clang-format on
    for (const auto& [call, value, expected] : cases) {
        EXPECT_TRUE(mctest::Near(value, expected, 0.0)) << call;
    }
}

TEST(DistFunEdges, BinomialErrorCodeAndFractionalK) {
    int err = -1;
    EXPECT_NEAR_REL(MCDistFun::CdfBin(0.0, 1.0, 0.3, err), 0.7, 1e-15); // Bernoulli: 1 − p
    EXPECT_EQ(err, 0);
    EXPECT_TRUE(MCMV::IsMissing(MCDistFun::CdfBin(3.0, 10.0, -0.2, err)));
    EXPECT_EQ(err, 1);
    // A fractional k counts as its integer part: P(X ≤ 3.7) = P(X ≤ 3).
    EXPECT_EQ(MCDistFun::CdfBin(3.7, 10.0, 0.3), MCDistFun::CdfBin(3.0, 10.0, 0.3));
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

// clang-format off
INSTANTIATE_TEST_SUITE_P(Cells, BinSearchTable, ::testing::ValuesIn(std::vector<BinSearchCase>{
    {"ZeroIsFirstCell", kTable, 0, 4, 0.0, false, 0}, {"Inside", kTable, 0, 4, 0.1, false, 0},
    {"BoundaryGoesUp", kTable, 0, 4, 0.2, false, 2},
    {"BoundaryGoesUp2", kTable, 0, 4, 0.5, false, 3},
    {"JustBelowBoundary", kTable, 0, 4, std::nextafter(0.5, 0.0), false, 2},
    {"LastCell", kTable, 0, 4, 0.9999999999999999, false, 3},
    {"TotalClampsToLastCell", kTable, 0, 4, 1.0, false, 3},
    {"BelowClampsToFirstCell", kTable, 0, 4, -0.3, false, 0},
    {"RightClosedBoundaryGoesDown", kTable, 0, 4, 0.2, true, 0},
    {"RightClosedBoundaryGoesDown2", kTable, 0, 4, 0.5, true, 2},
    {"RightClosedZero", kTable, 0, 4, 0.0, true, 0},
    {"RightClosedTotal", kTable, 0, 4, 1.0, true, 3},
    {"LeadingEmptyCellSkipped", kZeroEnds, 0, 4, 0.0, false, 1},
    {"TrailingEmptyCellSkipped", kZeroEnds, 0, 4, 1.0, false, 2},
    {"TrailingEmptyCellSkippedRC", kZeroEnds, 0, 4, 1.0, true, 2},
    {"ShortTotal", kShortTotal, 0, 3, 0.99999995, false, 2},
    {"SubRange", kTable, 2, 4, 0.1, false, 2}, {"SubRangeInside", kTable, 2, 4, 0.7, false, 3},
    {"NaNHasNoCell", kTable, 0, 4, kNaN, false, -1},
    {"HiPastEndHasNoCell", kTable, 0, 5, 0.3, false, -1},
    {"EmptyRangeHasNoCell", kTable, 3, 3, 0.3, false, 2},
    {"AllZeroWidthGivesFirst", {0.0, 0.0, 0.0}, 0, 2, 0.5, false, 0}}),
    [](const ::testing::TestParamInfo<BinSearchCase>& p) { return p.param.fName; });
// clang-format on

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
