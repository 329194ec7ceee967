// The goodness-of-fit kernels against data/gof_make_reference.py (Stephens' A² and D and the
// distribution functions at 40 digits on real data, SciPy's chi-square and Kolmogorov tails,
// Anderson and Darling's series for the limiting A², the p-value formulas and tables from the
// publications), and the invariants of weights, ties and blocks.
#include "distribution_fitting/dfcfitgoodness.h"
#include "mccommon/mcmv.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numeric>
#include <string>
#include <utility>
#include <vector>

namespace {
constexpr double kMissing = MCCommon_800::MCMV::Missing();
} // namespace

#include "data/gof_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

//! Test names from the parameter rows' names.
struct ByName {
    template <class T> std::string operator()(const ::testing::TestParamInfo<T>& row) const {
        return row.param.name;
    }
};

//! Sorted values with their weights, and u = F(x) of each.
struct Sample {
    std::vector<double> x;
    std::vector<double> w;
    std::vector<double> u;
};

//! Reference sample `which` (0 Nile, 1 shares, 2 Nile with weights 1 + i % 3 in file order),
//! sorted, with u under `type` and `params`.
Sample MakeSample(int which, int type, const std::vector<double>& params) {
    const std::vector<double>& raw = which == 1 ? gofref::kShares : gofref::kNile;
    std::vector<std::pair<double, double>> rows;
    for (std::size_t i = 0; i < raw.size(); ++i) {
        rows.emplace_back(raw[i], which == 2 ? 1.0 + static_cast<double>(i % 3) : 1.0);
    }
    std::stable_sort(rows.begin(), rows.end(),
                     [](const auto& a, const auto& b) { return a.first < b.first; });
    Sample s;
    const DFCFittedCdf cdf(static_cast<DistType>(type), params);
    for (const auto& [x, w] : rows) {
        s.x.push_back(x);
        s.w.push_back(w);
        s.u.push_back(cdf(x));
    }
    return s;
}

double Sum(const std::vector<double>& v) {
    return std::accumulate(v.begin(), v.end(), 0.0);
}

// A² and D against Stephens' formulas at 40 digits.

class EdfReference : public ::testing::TestWithParam<gofref::EdfCase> {};

TEST_P(EdfReference, MatchesStephensFormulas) {
    const gofref::EdfCase& c = GetParam();
    const Sample s = MakeSample(c.sample, c.type, c.params);
    const double* w = c.sample == 2 ? s.w.data() : nullptr;
    const double total = Sum(s.w);
    // u carries about 1e-15 relative error; A² sums n terms of ln u, so 1e-11 leaves room.
    EXPECT_NEAR_REL(ComputeAndersonDarling(s.u.data(), w, s.u.size(), total), c.a2, 1e-11);
    EXPECT_NEAR_REL(ComputeKolmogorovSmirnov(s.u.data(), w, s.u.size(), total), c.d, 1e-13);
}

INSTANTIATE_TEST_SUITE_P(RealData, EdfReference, ::testing::ValuesIn(gofref::kEdfCases), ByName());

TEST(EdfStatistics, BlocksGiveTheWholeArrayResult) {
    const Sample s = MakeSample(2, kDistGamma, gofref::kEdfCases[3].params);
    const double total = Sum(s.w);
    for (std::size_t cut : {std::size_t{1}, std::size_t{37}, std::size_t{99}}) {
        DFCEdfState state;
        AccumulateEdfTerms(s.u.data(), s.w.data(), cut, total, true, true, state);
        AccumulateEdfTerms(s.u.data() + cut, s.w.data() + cut, s.u.size() - cut, total, true, true,
                           state);
        EXPECT_NEAR_REL(FinishAndersonDarling(state, total),
                        ComputeAndersonDarling(s.u.data(), s.w.data(), s.u.size(), total), 1e-14);
        EXPECT_EQ(state.fKSMax,
                  ComputeKolmogorovSmirnov(s.u.data(), s.w.data(), s.u.size(), total));
    }
}

TEST(EdfStatistics, IntegerWeightsEqualRepeatedRowsWithTies) {
    // Ties inside and across weighted entries: the weighted sums must collapse exactly.
    const std::vector<double> u = {0.05, 0.2, 0.2, 0.41, 0.6, 0.6, 0.6, 0.93};
    const std::vector<double> w = {2, 1, 3, 1, 4, 1, 2, 5};
    std::vector<double> expanded;
    for (std::size_t i = 0; i < u.size(); ++i) {
        expanded.insert(expanded.end(), static_cast<std::size_t>(w[i]), u[i]);
    }
    const double total = Sum(w);
    EXPECT_NEAR_REL(ComputeAndersonDarling(u.data(), w.data(), u.size(), total),
                    ComputeAndersonDarling(expanded.data(), nullptr, expanded.size(), total),
                    1e-13);
    EXPECT_NEAR_REL(ComputeKolmogorovSmirnov(u.data(), w.data(), u.size(), total),
                    ComputeKolmogorovSmirnov(expanded.data(), nullptr, expanded.size(), total),
                    1e-15);
}

TEST(EdfStatistics, WeightedLowerSideAndEntriesAtTheSupportEnds) {
    // The EDF is 0 below the first value, whatever its weight: D = |0.6 - 0| = 0.6 (the lower
    // side (C_i - 1)/W = 0.5 would give 0.2).
    const std::vector<double> v = {0.6, 0.95}, w = {3.0, 1.0};
    EXPECT_NEAR_REL(ComputeKolmogorovSmirnov(v.data(), w.data(), 2, 4.0), 0.6, 1e-15);
    // Entries at 0 and 1 only advance the weight: -3 + ((2·1 + 1)/3)·(ln 0.5 - ln 0.5) - 2·ln 0.5.
    const std::vector<double> u = {0.0, 0.5, 1.0};
    const double a2 = ComputeAndersonDarling(u.data(), nullptr, 3, 3.0);
    EXPECT_NEAR_REL(a2, -3.0 + 2.0 * std::log(2.0), 1e-15);
    // A non-positive A² is the best possible fit, not the worst.
    EXPECT_EQ(ComputeEdfSignificance(kDistUniform, 3.0, a2, kMissing, kMissing).fADPValue, 1.0);
}

// Distribution functions.

class CdfReference : public ::testing::TestWithParam<gofref::CdfCase> {};

TEST_P(CdfReference, MatchesFortyDigits) {
    const gofref::CdfCase& c = GetParam();
    EXPECT_NEAR_TOL(DFCFittedCdf(static_cast<DistType>(c.type), c.params)(c.x), c.f, 1e-13, 1e-300);
}

INSTANTIATE_TEST_SUITE_P(Points, CdfReference, ::testing::ValuesIn(gofref::kCdfCases), ByName());

// F over sorted values: the carried values against the exact ones, value by value.

struct SortedCdfCase {
    const char* name;
    DistType type;
    std::vector<double> params;
    std::size_t n;
};

//! n sorted values: quantiles of a grid with a fixed jitter, every seventh value repeated,
//! and a few outliers far beyond the bulk and outside the support.
std::vector<double> SortedValues(const SortedCdfCase& c) {
    std::vector<double> x;
    const bool beta = c.type == kDistBeta;
    for (std::size_t i = 0; i < c.n; ++i) {
        const double p = (static_cast<double>(i) + 0.5 + 0.4 * std::sin(3.7 * i)) / c.n;
        // Quantiles by bisection on the exact F: slow, independent of the code under test.
        const DFCFittedCdf cdf(c.type, c.params);
        double lo = c.type == kDistNormal ? -1e4 : 0.0;
        double hi = beta ? 1.0 : 1e4;
        for (int k = 0; k < 200 && hi - lo > 1e-15 * hi; ++k) {
            const double mid = 0.5 * (lo + hi);
            (cdf(mid) < p ? lo : hi) = mid;
        }
        x.push_back(0.5 * (lo + hi));
        if (i % 7 == 0) {
            x.push_back(x.back());
        }
    }
    for (double far : {beta ? 0.0 : -1.0, beta ? 1.0 : 5e3, beta ? 0.999999 : 900.0}) {
        x.push_back(far);
    }
    std::sort(x.begin(), x.end());
    return x;
}

class SortedCdf : public ::testing::TestWithParam<SortedCdfCase> {};

TEST_P(SortedCdf, MatchesTheExactFunctionValueByValue) {
    const SortedCdfCase& c = GetParam();
    const std::vector<double> x = SortedValues(c);
    const DFCFittedCdf cdf(c.type, c.params);
    std::vector<double> u(x.size());
    cdf.EvaluateSorted(x.data(), x.size(), u.data());
    std::vector<double> exact(x.size());
    for (std::size_t i = 0; i < x.size(); ++i) {
        exact[i] = cdf(x[i]);
        // Each tail keeps its relative accuracy; 1 - F only as far as F itself resolves it.
        const double scale = std::min(exact[i], 1.0 - exact[i]);
        ASSERT_NEAR(u[i], exact[i], 1e-12 * scale + 4e-16) << "x = " << x[i] << ", i = " << i;
        if (i > 0 && x[i] == x[i - 1]) {
            ASSERT_EQ(u[i], u[i - 1]);
        }
    }
    // A² of quantiles is nearly 0: its error is absolute, n terms of about 1e-12 each at most.
    const double n = static_cast<double>(x.size());
    EXPECT_NEAR(ComputeAndersonDarling(u.data(), nullptr, u.size(), n),
                ComputeAndersonDarling(exact.data(), nullptr, exact.size(), n), 1e-12 * n);
}

INSTANTIATE_TEST_SUITE_P(
    Table, SortedCdf,
    ::testing::Values(SortedCdfCase{"GammaShape2_5", kDistGamma, {2.5, 0.25}, 5000},
                      SortedCdfCase{"GammaPoleAtZero", kDistGamma, {0.3, 2.0}, 5000},
                      SortedCdfCase{"GammaLargeShape", kDistGamma, {400.0, 4.0}, 3000},
                      SortedCdfCase{"GammaFewValues", kDistGamma, {2.5, 0.25}, 40},
                      SortedCdfCase{"Beta2_5", kDistBeta, {2.0, 5.0}, 5000},
                      SortedCdfCase{"BetaPolesAtBothEnds", kDistBeta, {0.5, 0.7}, 5000},
                      SortedCdfCase{"BetaLargeShapes", kDistBeta, {300.0, 500.0}, 3000},
                      SortedCdfCase{"Normal", kDistNormal, {100.0, 15.0}, 5000},
                      SortedCdfCase{"NormalNarrow", kDistNormal, {0.5, 1e-6}, 3000},
                      SortedCdfCase{"LogNormal", kDistLognormal, {2.7, 0.5}, 5000},
                      SortedCdfCase{"LogNormalWide", kDistLognormal, {1.0, 3.0}, 5000},
                      SortedCdfCase{"WeibullIsExact", kDistWeibull, {5.0, 1.8, 0.0}, 500}),
    ByName());

struct BadCdf {
    const char* name;
    DistType type;
    std::vector<double> params;
};

class CdfBadParameters : public ::testing::TestWithParam<BadCdf> {};

TEST_P(CdfBadParameters, GiveMissing) {
    const BadCdf& c = GetParam();
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(DFCFittedCdf(c.type, c.params)(0.5)));
}

INSTANTIATE_TEST_SUITE_P(
    Table, CdfBadParameters,
    ::testing::Values(BadCdf{"NormalZeroSd", kDistNormal, {0.0, 0.0}},
                      BadCdf{"NormalTooFew", kDistNormal, {0.0}},
                      BadCdf{"LogNormalZeroB", kDistLognormal, {1.0, 0.0}},
                      BadCdf{"GammaNegativeShape", kDistGamma, {-1.0, 2.0}},
                      BadCdf{"BetaMissing", kDistBeta, {kMissing, 2.0}},
                      BadCdf{"UniformEmpty", kDistUniform, {1.0, 1.0}},
                      BadCdf{"TriangularModeOutside", kDistTriangular, {0.0, 1.0, 2.0}},
                      BadCdf{"WeibullZeroScale", kDistWeibull, {0.0, 1.0, 0.0}},
                      BadCdf{"ExponentialZeroRate", kDistExponential, {0.0}},
                      BadCdf{"NotContinuous", kDistPoisson, {1.0}}),
    ByName());

// Significance.

class SignificanceReference : public ::testing::TestWithParam<gofref::SigCase> {};

TEST_P(SignificanceReference, MatchesThePublishedFormulas) {
    const gofref::SigCase& c = GetParam();
    const DFCEdfSignificance s =
        ComputeEdfSignificance(static_cast<DistType>(c.type), c.n, c.a2, c.d, c.shape);
    EXPECT_NEAR_REL(s.fADZStar, c.zStar, 1e-13);
    EXPECT_NEAR_TOL(s.fADPValue, c.pAD, 1e-10, 1e-15);
    EXPECT_NEAR_REL(s.fKSDStat, c.dStar, 1e-13);
    EXPECT_NEAR_TOL(s.fKSPValue, c.pKS, 1e-10, 1e-15);
    // A statistic that was not computed gets no modified statistic or p-value.
    const DFCEdfSignificance none =
        ComputeEdfSignificance(static_cast<DistType>(c.type), c.n, kMissing, kMissing, c.shape);
    for (double v : {none.fADZStar, none.fADPValue, none.fKSDStat, none.fKSPValue}) {
        EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(v));
    }
}

INSTANTIATE_TEST_SUITE_P(Formulas, SignificanceReference, ::testing::ValuesIn(gofref::kSigCases),
                         ByName());

TEST(Significance, FormulasHitThePublishedCriticalValues) {
    // Upper-tail points of Z* (D'Agostino and Stephens 1986): Normal with estimated mean and
    // variance; Exponential with estimated scale. The formulas approximate the tables.
    const double levels[] = {0.10, 0.05, 0.025, 0.01};
    const double normal[] = {0.631, 0.752, 0.873, 1.035},
                 exponential[] = {1.062, 1.321, 1.591, 1.959};
    for (int i = 0; i < 4; ++i) {
        EXPECT_NEAR_REL(AndersonDarlingNormalPValue(normal[i]), levels[i], 0.03) << normal[i];
        EXPECT_NEAR_REL(AndersonDarlingExponentialPValue(exponential[i]), levels[i], 0.03)
            << exponential[i];
    }
}

TEST(Significance, LimitingAndersonDarlingAgreesWithTheSeries) {
    for (const auto& [z, g] : gofref::kADLimit) {
        EXPECT_NEAR_TOL(AndersonDarlingAsymptoticCdf(z), g, 0.0, 3e-5) << z;
    }
    EXPECT_EQ(AndersonDarlingAsymptoticCdf(0.0), 0.0);
}

TEST(Significance, KolmogorovTailAgreesWithScipy) {
    for (const auto& [x, p] : gofref::kKolmogorov) {
        EXPECT_NEAR_TOL(KolmogorovPValue(x), p, 1e-12, 1e-16) << x;
    }
    // The two series meet at x = 1.
    EXPECT_NEAR_REL(KolmogorovPValue(1.0 - 1e-12), KolmogorovPValue(1.0), 1e-11);
}

struct LookUpCase {
    const char* name;
    double value;
    std::vector<double> criticals;
    std::vector<double> levels;
    double expected;
};

class LookUp : public ::testing::TestWithParam<LookUpCase> {};

TEST_P(LookUp, FollowsTheTableRules) {
    const LookUpCase& c = GetParam();
    EXPECT_NEAR_REL(LookUpSignificance(c.value, c.criticals, c.levels), c.expected, 1e-15);
}

const std::vector<double> kCrit = {1.0, 2.0, 3.0};
const std::vector<double> kLevels = {0.3, 0.2, 0.1};

INSTANTIATE_TEST_SUITE_P(
    Table, LookUp,
    ::testing::Values(LookUpCase{"Below", 0.5, kCrit, kLevels, 0.3},
                      LookUpCase{"AtFirst", 1.0, kCrit, kLevels, 0.3},
                      LookUpCase{"Between", 1.25, kCrit, kLevels, 0.275},
                      LookUpCase{"AtMiddle", 2.0, kCrit, kLevels, 0.2},
                      LookUpCase{"AtLast", 3.0, kCrit, kLevels, 0.1},
                      LookUpCase{"Above", 9.0, kCrit, kLevels, 0.1},
                      LookUpCase{"LengthsDiffer", 1.5, kCrit, {0.3, 0.2}, kMissing},
                      LookUpCase{"Empty", 1.5, {}, {}, kMissing},
                      LookUpCase{"MissingValue", kMissing, kCrit, kLevels, kMissing}),
    ByName());

// Chi-square.

class ChiSquareReference : public ::testing::TestWithParam<gofref::ChiCase> {};

TEST_P(ChiSquareReference, MatchesScipy) {
    const gofref::ChiCase& c = GetParam();
    const DFCChiSquareResult r =
        ComputeChiSquareFit(static_cast<DistType>(c.type), c.params, c.counts, c.total, c.maximum);
    EXPECT_FALSE(r.fbZeroProbability);
    EXPECT_NEAR_REL(r.fStatistic, c.stat, 1e-11);
    EXPECT_EQ(r.fDegreesOfFreedom, c.df);
    EXPECT_NEAR_TOL(r.fPValue, c.p, 1e-9, 1e-300);
    EXPECT_EQ(r.fNLowExpected, c.nLow);
    EXPECT_EQ(r.fNBins, c.nBins);
}

INSTANTIATE_TEST_SUITE_P(Counts, ChiSquareReference, ::testing::ValuesIn(gofref::kChiCases),
                         ByName());

struct ChiFailure {
    const char* name;
    DistType type;
    std::vector<double> params;
    std::vector<double> counts;
    double maximum;
    bool zeroProbability; //!< else: a statistic without p-value
};

class ChiSquareFailures : public ::testing::TestWithParam<ChiFailure> {};

TEST_P(ChiSquareFailures, GiveNoUsableTest) {
    const ChiFailure& c = GetParam();
    const double total = Sum(c.counts);
    const DFCChiSquareResult r = ComputeChiSquareFit(c.type, c.params, c.counts, total, c.maximum);
    EXPECT_EQ(r.fbZeroProbability, c.zeroProbability);
    EXPECT_EQ(MCCommon_800::MCMV::IsMissing(r.fStatistic), c.zeroProbability);
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(r.fPValue));
}

INSTANTIATE_TEST_SUITE_P(
    Table, ChiSquareFailures,
    ::testing::Values(
        ChiFailure{"BinomialOneTrial", kDistBinomial, {1.0, 0.5}, {4, 6}, 1.0, true},
        ChiFailure{"BinomialValueAboveN", kDistBinomial, {3.0, 0.5}, {1, 3, 3, 1, 2}, 4.0, true},
        ChiFailure{"NotDiscrete", kDistNormal, {0.0, 1.0}, {4, 6}, 1.0, true},
        ChiFailure{"NegBinBadProbability", kDistNegbinomial, {2.0, 1.5, 2.0}, {4, 6, 2}, 2.0, true},
        ChiFailure{"PoissonNoDegreeOfFreedom", kDistPoisson, {0.6}, {4, 6}, 1.0, false},
        ChiFailure{
            "NegBinNoDegreeOfFreedom", kDistNegbinomial, {2.0, 0.5, 2.0}, {4, 6, 2}, 2.0, false}),
    ByName());

} // namespace
