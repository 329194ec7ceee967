// Input generation: draws of every type against Boost.Math's distribution functions (called
// directly), count inputs at every mean, stored parameters, moments and ranges, unusable plans,
// and the simulator's truncation, categories, contingency tables, sensitivity and seeding.
// Fixed seeds; each goodness-of-fit check fails with probability at most 1e-6 for a correct
// generator: Kolmogorov-Smirnov by the DKW inequality P(sup|F_n − F| > ε) ≤ 2·exp(−2nε²)
// (Massart 1990), Pearson's chi-square with expected cell counts ≥ 20 at the upper 1e-6 point.
#include "simulation_evaluation/secgeneration.h"
#include "simulation_evaluation/secsimulator.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "data/simgen_plans.h"
#include "distribution_fitting/dfcfitgoodness.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcrandom.h"
#include "mctolerance.h"

#include <boost/math/distributions.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <map>
#include <ostream>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using simgen::MakeCategorical;
using simgen::MakeDist;
using simgen::TestPlan;

namespace {

namespace bm = boost::math;

constexpr double kAlpha = 1e-6; // false-failure rate of one goodness-of-fit check
constexpr int kDraws = 100000;

//! Values of `gen` for kDraws standard normal draws of a fixed stream.
std::vector<double> Draw(const SECInputGenerator& gen, std::uint32_t seed = 20240611u) {
    MCMath_800::MCURandom stream(seed);
    MCMath_800::MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    EXPECT_TRUE(normal.SetParamNormal());
    std::vector<double> values(kDraws);
    for (double& x : values) {
        x = SECTransform(gen, normal.GetRandom());
    }
    return values;
}

//! sup |F_n − F| of the sample against a continuous F, and the DKW bound it must stay under.
::testing::AssertionResult PassesKS(std::vector<double> values,
                                    const std::function<double(double)>& cdf) {
    std::sort(values.begin(), values.end());
    const double n = static_cast<double>(values.size());
    double d = 0.0;
    for (std::size_t i = 0; i < values.size(); ++i) {
        if (MCMV::IsMissing(values[i])) {
            return ::testing::AssertionFailure() << "missing value drawn";
        }
        const double f = cdf(values[i]);
        d = std::max({d, f - static_cast<double>(i) / n, static_cast<double>(i + 1) / n - f});
    }
    const double bound = std::sqrt(std::log(2.0 / kAlpha) / (2.0 * n));
    if (d > bound) {
        return ::testing::AssertionFailure() << "KS distance " << d << " > " << bound;
    }
    return ::testing::AssertionSuccess();
}

//! Pearson's chi-square of whole values v = offset + k against P(k ≤ K) = cdf(K), with cells of
//! expected count ≥ 20 built upward from k = 0 (the first cell also holds everything below).
::testing::AssertionResult PassesChiSquare(const std::vector<double>& values,
                                           const std::function<double(double)>& cdf,
                                           double offset = 0.0) {
    const double n = static_cast<double>(values.size());
    std::vector<double> ends; // cell c holds k ≤ ends[c] (and > ends[c − 1])
    double previous = 0.0;
    for (double k = 0.0; cdf(k) < 1.0 - 20.0 / n && k < 1e7; k += 1.0) {
        if (n * (cdf(k) - previous) >= 20.0) {
            ends.push_back(k);
            previous = cdf(k);
        }
    }
    if (ends.empty()) {
        return ::testing::AssertionFailure() << "no cells";
    }
    // Every end has F < 1 − 20/n, so the cell above the last end (the upper tail) also has an
    // expected count above 20.
    std::vector<double> observed(ends.size() + 1, 0.0);
    for (const double v : values) {
        const double k = v - offset;
        if (MCMV::IsMissing(v) || k != std::floor(k)) {
            return ::testing::AssertionFailure() << "value " << v << " is not whole";
        }
        observed[static_cast<std::size_t>(std::lower_bound(ends.begin(), ends.end(), k) -
                                          ends.begin())] += 1.0;
    }
    double chi2 = 0.0;
    double low = 0.0;
    for (std::size_t c = 0; c < observed.size(); ++c) {
        const double high = c < ends.size() ? cdf(ends[c]) : 1.0;
        const double expected = n * (high - low);
        chi2 += (observed[c] - expected) * (observed[c] - expected) / expected;
        low = high;
    }
    const double df = static_cast<double>(observed.size() - 1);
    const double critical = bm::quantile(bm::complement(bm::chi_squared(df), kAlpha));
    if (chi2 > critical) {
        return ::testing::AssertionFailure()
               << "chi-square " << chi2 << " > " << critical << " (" << df << " df)";
    }
    return ::testing::AssertionSuccess();
}

//! Piecewise-uniform distribution function of the intervals [lo_i, hi_i] with probabilities p_i.
double PiecewiseCdf(const std::vector<double>& lo, const std::vector<double>& hi,
                    const std::vector<double>& p, double x) {
    double f = 0.0;
    for (std::size_t i = 0; i < p.size(); ++i) {
        f += p[i] * std::clamp((x - lo[i]) / (hi[i] - lo[i]), 0.0, 1.0);
    }
    return f;
}

//! Distribution function of the whole values 0, 1, …, K with P(v ≤ k) = cumulative[k] for
//! k < K and 1 from K on.
std::function<double(double)> StepCdf(std::vector<double> cumulative) {
    return [cumulative](double k) {
        return k < 0.0 ? 0.0
               : k < static_cast<double>(cumulative.size())
                   ? cumulative[static_cast<std::size_t>(k)]
                   : 1.0;
    };
}

template <class Row> std::string ByName(const ::testing::TestParamInfo<Row>& row) {
    return row.param.fName;
}

double Phi(double z) {
    return bm::cdf(bm::normal(), z);
}

struct FitCase {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const FitCase& r) { return os << r.fName; }
    DistType fType;
    std::vector<double> fParams;        //!< stored vector
    bool fbDiscrete;                    //!< chi-square rather than KS
    std::function<double(double)> fCdf; //!< reference distribution function
    double fOffset = 0.0;               //!< discrete: values are offset + k
};

class GoodnessOfFit : public ::testing::TestWithParam<FitCase> {};

TEST_P(GoodnessOfFit, DrawsFollowTheirDistribution) {
    const FitCase& c = GetParam();
    SECInputGenerator gen;
    ASSERT_TRUE(SECPrepareGenerator(c.fType, c.fParams, gen));
    const std::vector<double> values = Draw(gen);
    if (c.fbDiscrete) {
        EXPECT_TRUE(PassesChiSquare(values, c.fCdf, c.fOffset));
    } else {
        EXPECT_TRUE(PassesKS(values, c.fCdf));
    }
}

// clang-format off
// The references: Boost's distribution functions.
INSTANTIATE_TEST_SUITE_P(EveryType, GoodnessOfFit, ::testing::Values(
    FitCase{"Normal", kDistNormal, {100.0, 15.0}, false, [](double x) { return bm::cdf(bm::normal(100.0, 15.0), x); }},
    FitCase{"LogNormal", kDistLognormal, {std::exp(1.0), 0.5}, false, [](double x) { return bm::cdf(bm::lognormal(1.0, 0.5), x); }},
    FitCase{"Triangular", kDistTriangular, {1.0, 10.0, 4.0}, false, [](double x) { return bm::cdf(bm::triangular(1.0, 4.0, 10.0), x); }},
    FitCase{"Uniform", kDistUniform, {-2.0, 3.0}, false, [](double x) { return bm::cdf(bm::uniform(-2.0, 3.0), x); }},
    FitCase{"Weibull", kDistWeibull, {2.0, 1.5, 1.0}, false, [](double x) { return x <= 1.0 ? 0.0 : bm::cdf(bm::weibull(1.5, 2.0), x - 1.0); }},
    FitCase{"Gamma", kDistGamma, {2.0, 0.5}, false, [](double x) { return bm::cdf(bm::gamma_distribution<>(2.0, 2.0), x); }},
    FitCase{"GammaSmallShape", kDistGamma, {0.3, 2.0}, false, [](double x) { return bm::cdf(bm::gamma_distribution<>(0.3, 0.5), x); }},
    FitCase{"Beta", kDistBeta, {2.0, 5.0}, false, [](double x) { return bm::cdf(bm::beta_distribution<>(2.0, 5.0), x); }},
    FitCase{"BetaUShape", kDistBeta, {0.5, 0.4}, false, [](double x) { return bm::cdf(bm::beta_distribution<>(0.5, 0.4), x); }},
    FitCase{"Exponential", kDistExponential, {0.5}, false, [](double x) { return bm::cdf(bm::exponential(0.5), x); }},
    FitCase{"EmpiricalContinuous", kDistEmpirical, {0.0, 10.0, 2.7, 1.0, 0.1, 0.2, 0.4, 0.3}, false, [](double x) { return PiecewiseCdf({0.0, 2.5, 5.0, 7.5}, {2.5, 5.0, 7.5, 10.0}, {0.1, 0.2, 0.4, 0.3}, x); }},
    FitCase{"UserRanges", kDistUserRanges, {0.0, 5.0, 20.0, 5.0, 10.0, 30.0, 0.2, 0.5, 0.3}, false, [](double x) { return PiecewiseCdf({0.0, 5.0, 20.0}, {5.0, 10.0, 30.0}, {0.2, 0.5, 0.3}, x); }},
    FitCase{"Binomial", kDistBinomial, {10.0, 0.3}, true, [](double k) { return bm::cdf(bm::binomial(10.0, 0.3), k); }},
    FitCase{"BinomialOneTrial", kDistBinomial, {1.0, 0.3}, true, [](double k) { return bm::cdf(bm::binomial(1.0, 0.3), k); }},
    FitCase{"BinomialLargeMean", kDistBinomial, {200.0, 0.25}, true, [](double k) { return bm::cdf(bm::binomial(200.0, 0.25), k); }},
    FitCase{"Poisson", kDistPoisson, {3.5}, true, [](double k) { return bm::cdf(bm::poisson(3.5), k); }},
    FitCase{"PoissonSmallMean", kDistPoisson, {0.2}, true, [](double k) { return bm::cdf(bm::poisson(0.2), k); }},
    FitCase{"PoissonLargeMean", kDistPoisson, {30.0}, true, [](double k) { return bm::cdf(bm::poisson(30.0), k); }},
    FitCase{"NegBinFailures", kDistNegbinomial, {3.0, 0.4, 0.0}, true, [](double k) { return bm::cdf(bm::negative_binomial(3.0, 0.4), k); }},
    FitCase{"NegBinTrials", kDistNegbinomial, {2.5, 0.3, 1.0}, true, [](double k) { return bm::cdf(bm::negative_binomial(2.5, 0.3), k); }, 2.5},
    // A long tail: draws beyond the prepared table go to the quantile.
    FitCase{"NegBinLongTail", kDistNegbinomial, {0.02, 0.002, 0.0}, true, [](double k) { return bm::cdf(bm::negative_binomial(0.02, 0.002), k); }},
    FitCase{"Bernoulli", kDistBernoulli, {0.3}, true, [](double k) { return bm::cdf(bm::bernoulli(0.3), k); }},
    FitCase{"EmpiricalBins", kDistEmpirical, {0.0, 10.0, 2.7, 0.0, 0.1, 0.2, 0.4, 0.3}, true, StepCdf({0.1, 0.3, 0.7})}),
    ByName<FitCase>);
// clang-format on

// Count inputs are exact at every mean: 10^6 draws per family and mean against Boost's
// distribution function, in 100 cells of equal expected count placed by its quantiles, and
// never a value outside the support.

struct CountCase {
    DistType fType;
    double fMean;
    friend std::ostream& operator<<(std::ostream& os, const CountCase& c) {
        return os << DistType2String(c.fType) << " mean " << c.fMean;
    }
};

class CountDraws : public ::testing::TestWithParam<CountCase> {};

template <class Dist>
::testing::AssertionResult CountsFollow(const Dist& dist, const std::vector<double>& values,
                                        double shift) {
    std::vector<double> ends; // cell c holds k ≤ ends[c] (and > ends[c − 1])
    for (int c = 1; c < 100; ++c) {
        const double k = bm::quantile(dist, c / 100.0);
        if (ends.empty() || k > ends.back()) {
            ends.push_back(k);
        }
    }
    std::vector<double> observed(ends.size() + 1, 0.0);
    for (const double v : values) {
        const double k = v - shift;
        if (MCMV::IsMissing(v) || k != std::floor(k) || k < 0.0 || k > bm::support(dist).second) {
            return ::testing::AssertionFailure() << "value " << v << " outside the support";
        }
        observed[static_cast<std::size_t>(std::lower_bound(ends.begin(), ends.end(), k) -
                                          ends.begin())] += 1.0;
    }
    const double n = static_cast<double>(values.size());
    double chi2 = 0.0;
    double low = 0.0;
    for (std::size_t c = 0; c < observed.size(); ++c) {
        const double high = c < ends.size() ? bm::cdf(dist, ends[c]) : 1.0;
        const double expected = n * (high - low);
        chi2 += (observed[c] - expected) * (observed[c] - expected) / expected;
        low = high;
    }
    const double critical =
        bm::quantile(bm::complement(bm::chi_squared(static_cast<double>(ends.size())), kAlpha));
    if (chi2 > critical) {
        return ::testing::AssertionFailure() << "chi-square " << chi2 << " > " << critical;
    }
    return ::testing::AssertionSuccess();
}

TEST_P(CountDraws, FollowTheirDistributionInsideTheSupport) {
    const auto [type, mean] = GetParam();
    SECInputGenerator gen;
    std::vector<double> values;
    const auto draw = [&](const std::vector<double>& params) {
        ASSERT_TRUE(SECPrepareGenerator(type, params, gen));
        MCMath_800::MCURandom stream(977u);
        MCMath_800::MCRandomValues normal;
        normal.SetURNGPtr(&stream);
        ASSERT_TRUE(normal.SetParamNormal());
        values.resize(1000000);
        for (double& x : values) {
            x = SECTransform(gen, normal.GetRandom());
        }
    };
    if (type == kDistPoisson) {
        draw({mean});
        EXPECT_TRUE(CountsFollow(bm::poisson(mean), values, 0.0));
    } else if (type == kDistBinomial) {
        // n·p = mean with p = 0.25, and a Binomial(25, 0.96) near its upper end.
        const double n = mean == 24.0 ? 25.0 : std::floor(mean / 0.25);
        const double p = mean == 24.0 ? 0.96 : mean / n;
        draw({n, p});
        EXPECT_TRUE(CountsFollow(bm::binomial(n, p), values, 0.0));
    } else {
        // Failures before the 3rd success, counted as trials (shifted by 3).
        const double p = 3.0 / (mean + 3.0);
        draw({3.0, p, 1.0});
        EXPECT_TRUE(CountsFollow(bm::negative_binomial(3.0, p), values, 3.0));
    }
}

INSTANTIATE_TEST_SUITE_P(
    EveryMean, CountDraws,
    ::testing::Values(CountCase{kDistPoisson, 0.5}, CountCase{kDistPoisson, 19.9},
                      CountCase{kDistPoisson, 20.0}, CountCase{kDistPoisson, 33.0},
                      CountCase{kDistPoisson, 1000.0}, CountCase{kDistPoisson, 1e6},
                      CountCase{kDistBinomial, 0.5}, CountCase{kDistBinomial, 19.9},
                      CountCase{kDistBinomial, 20.0}, CountCase{kDistBinomial, 24.0},
                      CountCase{kDistBinomial, 1000.0}, CountCase{kDistBinomial, 1e6},
                      CountCase{kDistNegbinomial, 0.5}, CountCase{kDistNegbinomial, 19.9},
                      CountCase{kDistNegbinomial, 20.0}, CountCase{kDistNegbinomial, 33.0},
                      CountCase{kDistNegbinomial, 1000.0}, CountCase{kDistNegbinomial, 1e6}));

// Moments, ranges and stored parameters.

struct MomentCase {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const MomentCase& r) { return os << r.fName; }
    DistType fType;
    std::vector<double> fParams;
    double fMean; //!< from Boost's distribution, or by hand where stated
    double fSd;
    double fLower; //!< missing when unbounded
    double fUpper;
};

class Moments : public ::testing::TestWithParam<MomentCase> {};

TEST_P(Moments, MeanStdDevAndNaturalRange) {
    const MomentCase& c = GetParam();
    SECInputGenerator gen;
    ASSERT_TRUE(SECPrepareGenerator(c.fType, c.fParams, gen));
    EXPECT_NEAR_REL(gen.fMean, c.fMean, 1e-12);
    EXPECT_NEAR_REL(gen.fStdDev, c.fSd, 1e-12);
    EXPECT_TRUE(mctest::Near(gen.fLower, c.fLower, 0.0));
    EXPECT_TRUE(mctest::Near(gen.fUpper, c.fUpper, 0.0));
}

const double kNone = MCMV::Missing();

// clang-format off
// Means and standard deviations from Boost's distributions, or by hand where given.
INSTANTIATE_TEST_SUITE_P(EveryType, Moments, ::testing::Values(
    MomentCase{"Binomial", kDistBinomial, {12.0, 0.25}, 3.0, bm::standard_deviation(bm::binomial(12.0, 0.25)), 0.0, 12.0},
    // Trials: the failures' mean plus the r successes.
    MomentCase{"NegBinTrials", kDistNegbinomial, {3.0, 0.4, 1.0}, 3.0 + bm::mean(bm::negative_binomial(3.0, 0.4)), bm::standard_deviation(bm::negative_binomial(3.0, 0.4)), 3.0, kNone},
    MomentCase{"LogNormal", kDistLognormal, {2.0, 0.5}, bm::mean(bm::lognormal(std::log(2.0), 0.5)), bm::standard_deviation(bm::lognormal(std::log(2.0), 0.5)), 0.0, kNone},
    MomentCase{"Normal", kDistNormal, {100.0, 15.0}, 100.0, 15.0, kNone, kNone},
    MomentCase{"Poisson", kDistPoisson, {4.0}, 4.0, 2.0, 0.0, kNone},
    MomentCase{"Triangular", kDistTriangular, {1.0, 10.0, 4.0}, bm::mean(bm::triangular(1.0, 4.0, 10.0)), bm::standard_deviation(bm::triangular(1.0, 4.0, 10.0)), 1.0, 10.0},
    MomentCase{"Uniform", kDistUniform, {0.0, 1.0}, 0.5, std::sqrt(1.0 / 12.0), 0.0, 1.0},
    MomentCase{"Weibull", kDistWeibull, {2.0, 1.5, 1.0}, 1.0 + bm::mean(bm::weibull(1.5, 2.0)), bm::standard_deviation(bm::weibull(1.5, 2.0)), 1.0, kNone},
    // Shape 2, rate 0.5: the standard deviation is √2/0.5, not 0.5/√2.
    MomentCase{"Gamma", kDistGamma, {2.0, 0.5}, 4.0, bm::standard_deviation(bm::gamma_distribution<>(2.0, 2.0)), 0.0, kNone},
    MomentCase{"Beta", kDistBeta, {2.0, 5.0}, bm::mean(bm::beta_distribution<>(2.0, 5.0)), bm::standard_deviation(bm::beta_distribution<>(2.0, 5.0)), 0.0, 1.0},
    MomentCase{"Exponential", kDistExponential, {0.5}, 2.0, 2.0, 0.0, kNone},
    MomentCase{"Bernoulli", kDistBernoulli, {0.3}, 0.3, std::sqrt(0.21), 0.0, 1.0},
    // Bin centres 1.25, 3.75, 6.25, 8.75 with shares 0.1, 0.2, 0.4, 0.3: mean 6.
    MomentCase{"Empirical", kDistEmpirical, {0.0, 10.0, 2.7, 1.0, 0.1, 0.2, 0.4, 0.3}, 6.0, 2.7, 0.0, 10.0},
    MomentCase{"UserRanges", kDistUserRanges, {5.0, 0.0, 10.0, 20.0, 0.5, 0.5}, kNone, kNone, 0.0, 20.0}),
    ByName<MomentCase>);
// clang-format on

TEST(StoredParams, PlacedInTheOrderOfTheTypesNames) {
    // A Triangular built mode first: the vector is still min, max, mode.
    const DistInfoElem dist =
        MakeDist(kDistTriangular, {{"mode", 4.0}, {"min", 1.0}, {"max", 10.0}});
    std::vector<double> params;
    ASSERT_TRUE(SECBuildStoredParams(dist, true, params));
    EXPECT_EQ(params, (std::vector<double>{1.0, 10.0, 4.0}));

    DistInfoElem empirical;
    empirical.SetDistType(kDistEmpirical);
    empirical.AddParameter("min", 0.0);
    empirical.AddParameter("max", 4.0);
    empirical.AddParameter("stddev", 1.0);
    empirical.AddParameter("probs", std::vector<double>{0.5, 0.5});
    ASSERT_TRUE(SECBuildStoredParams(empirical, false, params));
    EXPECT_EQ(params, (std::vector<double>{0.0, 4.0, 1.0, 0.0, 0.5, 0.5}));
}

struct BadParamsCase {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const BadParamsCase& r) {
        return os << r.fName;
    }
    DistInfoElem fDist;
};

class BadStoredParams : public ::testing::TestWithParam<BadParamsCase> {};

TEST_P(BadStoredParams, AreRefused) {
    std::vector<double> params{1.0};
    EXPECT_FALSE(SECBuildStoredParams(GetParam().fDist, true, params));
    EXPECT_TRUE(params.empty());
}

DistInfoElem UserRanges(const std::vector<double>& lo, const std::vector<double>& hi,
                        const std::vector<double>& p) {
    DistInfoElem dist;
    dist.SetDistType(kDistUserRanges);
    dist.AddParameter("min", lo);
    dist.AddParameter("max", hi);
    dist.AddParameter("probs", p);
    return dist;
}

INSTANTIATE_TEST_SUITE_P(
    PlanInconsistencies, BadStoredParams,
    ::testing::Values(
        BadParamsCase{"MissingParameter", MakeDist(kDistNormal, {{"mean", 1.0}})},
        BadParamsCase{"ExtraParameter", MakeDist(kDistPoisson, {{"mean", 1.0}, {"stddev", 1.0}})},
        BadParamsCase{"RepeatedName", MakeDist(kDistUniform, {{"min", 1.0}, {"min", 2.0}})},
        BadParamsCase{"UnknownName", MakeDist(kDistGamma, {{"shape", 1.0}, {"rate", 2.0}})},
        BadParamsCase{"UserRangesLengths", UserRanges({0.0, 1.0}, {1.0}, {0.5, 0.5})},
        BadParamsCase{"EmpiricalWithoutBins",
                      MakeDist(kDistEmpirical, {{"min", 0.0}, {"max", 1.0}, {"stddev", 1.0}})},
        BadParamsCase{"Categorical", MakeCategorical({"a"}, {1.0})},
        BadParamsCase{"NoDistribution", DistInfoElem()}),
    ByName<BadParamsCase>);

struct BadValuesCase {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const BadValuesCase& r) {
        return os << r.fName;
    }
    DistType fType;
    std::vector<double> fParams;
};

class BadParamValues : public ::testing::TestWithParam<BadValuesCase> {};

TEST_P(BadParamValues, AreRefusedByTheSimulationAndTheFittingAlike) {
    SECInputGenerator gen;
    EXPECT_FALSE(SECPrepareGenerator(GetParam().fType, GetParam().fParams, gen));
    EXPECT_TRUE(MCMV::IsMissing(SECTransform(gen, 0.3)));
    EXPECT_TRUE(MCMV::IsMissing(DFCFittedCdf(GetParam().fType, GetParam().fParams)(0.5)));
}

TEST(DegenerateParams, DrawOneValueButHaveNoDensityToFit) {
    for (const auto& [type, params] : {std::pair{kDistNormal, std::vector<double>{2.0, 0.0}},
                                       {kDistLognormal, std::vector<double>{2.0, 0.0}},
                                       {kDistUniform, std::vector<double>{2.0, 2.0}}}) {
        SECInputGenerator gen;
        ASSERT_TRUE(SECPrepareGenerator(type, params, gen));
        EXPECT_EQ(SECTransform(gen, -1.3), 2.0);
        EXPECT_TRUE(MCMV::IsMissing(DFCFittedCdf(type, params)(2.5)));
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(OutsideTheirDomain, BadParamValues, ::testing::Values(
    BadValuesCase{"NormalNegativeSd", kDistNormal, {0.0, -1.0}},
    BadValuesCase{"NormalNotFinite", kDistNormal, {kNone, 1.0}},
    BadValuesCase{"GammaZeroShape", kDistGamma, {0.0, 1.0}},
    BadValuesCase{"BetaZeroShape", kDistBeta, {2.0, 0.0}},
    BadValuesCase{"TriangularModeOutside", kDistTriangular, {0.0, 1.0, 2.0}},
    BadValuesCase{"UniformReversed", kDistUniform, {1.0, 0.0}},
    BadValuesCase{"PoissonZeroMean", kDistPoisson, {0.0}},
    BadValuesCase{"NegBinZeroProb", kDistNegbinomial, {2.0, 0.0, 0.0}},
    BadValuesCase{"BinomialProbAboveOne", kDistBinomial, {5.0, 1.5}},
    BadValuesCase{"ExponentialZeroRate", kDistExponential, {0.0}},
    BadValuesCase{"WeibullZeroShape", kDistWeibull, {1.0, 0.0, 0.0}},
    BadValuesCase{"EmpiricalNoMass", kDistEmpirical, {0.0, 1.0, 1.0, 1.0, 0.0, 0.0}},
    BadValuesCase{"UserRangesReversed", kDistUserRanges, {2.0, 1.0, 1.0}},
    BadValuesCase{"WrongLength", kDistLognormal, {1.0}},
    BadValuesCase{"Unknown", kDistUnknown, {1.0}}),
    ByName<BadValuesCase>);
// clang-format on

TEST(CumulativeTable, NormalisedToItsTotalAndEndingAtOne) {
    std::vector<double> table;
    ASSERT_TRUE(SECBuildCumulativeTable({0.2, 0.2, 0.4}, table));
    ASSERT_EQ(table.size(), 4u);
    EXPECT_NEAR_REL(table[1], 0.25, 4 * mctest::kEps);
    EXPECT_NEAR_REL(table[2], 0.5, 4 * mctest::kEps);
    EXPECT_EQ(table[3], 1.0);
    EXPECT_FALSE(SECBuildCumulativeTable({0.5, -0.1, 0.6}, table));
    EXPECT_FALSE(SECBuildCumulativeTable({0.0, 0.0}, table));
    EXPECT_FALSE(SECBuildCumulativeTable({}, table));
    EXPECT_TRUE(table.empty());
}

TEST(Transform, TailsStayFiniteAndOverflowIsMissing) {
    SECInputGenerator exponential;
    ASSERT_TRUE(SECPrepareGenerator(kDistExponential, {1.0}, exponential));
    // 1 − Φ(9) is 1.1e-19: the value is −ln of it, about 43.6, not infinity.
    EXPECT_NEAR_REL(SECTransform(exponential, 9.0),
                    -std::log(bm::cdf(bm::complement(bm::normal(), 9.0))), 1e-12);
    SECInputGenerator lognormal;
    ASSERT_TRUE(SECPrepareGenerator(kDistLognormal, {1.0, 100.0}, lognormal));
    EXPECT_TRUE(MCMV::IsMissing(SECTransform(lognormal, 8.0)));
    EXPECT_TRUE(MCMV::IsMissing(SECTransform(exponential, MCMV::Missing())));
}

// The simulator: cases, bounds, categories.

TEST(SimulatorCases, TruncationNeverLetsAValueOutside) {
    TestPlan t;
    SimInputSpecs& normal =
        t.AddInput("n", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    normal.SetMinimum(-0.5);
    normal.SetMaximum(1.0);
    t.AddInput("p", MakeDist(kDistPoisson, {{"mean", 25.0}}), kLevelOrdinal).SetMinimum(20.0);
    t.AddInput("g", MakeDist(kDistGamma, {{"shape", 2.0}, {"scale", 0.5}})).SetMaximum(3.0);
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    std::vector<double> normals;
    int rejections = 0;
    for (int i = 0; i < 20000; ++i) {
        ASSERT_TRUE(sim->DrawCase().IsOK());
        const std::vector<double>& c = sim->GetCaseValues();
        ASSERT_TRUE(c[0] >= -0.5 && c[0] <= 1.0) << c[0];
        ASSERT_GE(c[1], 20.0);
        ASSERT_TRUE(c[2] >= 0.0 && c[2] <= 3.0) << c[2];
        normals.push_back(c[0]);
        rejections += sim->GetLastRejections();
    }
    EXPECT_GT(rejections, 0);
    // The accepted values follow the normal distribution truncated to [−0.5, 1].
    const double lo = Phi(-0.5);
    const double mass = Phi(1.0) - lo;
    EXPECT_TRUE(PassesKS(normals, [&](double x) { return (Phi(x) - lo) / mass; }));
}

TEST(SimulatorCases, AThousandRejectionsEndWith390014) {
    TestPlan t;
    t.AddInput("u", MakeDist(kDistUniform, {{"min", 0.0}, {"max", 1.0}})).SetMinimum(2.0);
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    EXPECT_EQ(sim->DrawCase().GetErrorCode(), MCSPStatus::kAttemptsExhausted);
    EXPECT_EQ(sim->GetLastRejections(), 1000);
    std::vector<double> values;
    EXPECT_EQ(sim->SimulatePredictors(values).GetErrorCode(), MCSPStatus::kAttemptsExhausted);
    ASSERT_EQ(values.size(), 1u);
    EXPECT_TRUE(MCMV::IsMissing(values[0]));

    // The case loop stops at once and reports the code.
    sim->SetCaseQuota(10);
    sim->RunTask();
    EXPECT_EQ(sim->GetStatus().GetErrorCode(), MCSPStatus::kAttemptsExhausted);
    EXPECT_EQ(sim->GetSimCaseCount(), 0);
}

TEST(SimulatorCases, CategoricalDrawsMatchTheirProbabilities) {
    TestPlan t;
    t.AddInput("x", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    t.AddInput("c", MakeCategorical({"red", "green", "blue"}, {0.2, 0.5, 0.3}), kLevelCategorical);
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    const SECSimulator::CategoricalInput& cat = sim->GetCategoricalInputs().at(0);
    EXPECT_TRUE(cat.fSampler.fbString);
    EXPECT_TRUE(MCMV::IsMissing(cat.fSampler.fvCategoryValues[0]));
    std::vector<double> values; // the host-driven draw sizes an empty vector
    ASSERT_TRUE(sim->SimulatePredictors(values).IsOK());
    ASSERT_EQ(values.size(), 2u);
    EXPECT_TRUE(values[1] == 0.0 || values[1] == 1.0 || values[1] == 2.0);
    std::vector<double> draws;
    for (int i = 0; i < kDraws; ++i) {
        ASSERT_TRUE(sim->DrawCase().IsOK());
        draws.push_back(sim->GetCaseValues()[1]);
    }
    EXPECT_TRUE(PassesChiSquare(draws, StepCdf({0.2, 0.7})));
}

//! A plan with two factors in a contingency table and a third categorical input on its own.
TestPlan CrosstabPlan(bool encoded) {
    TestPlan t;
    t.AddInput("a", MakeCategorical({"a0", "a1"}, {0.5, 0.5}), kLevelCategorical);
    t.AddInput("x", MakeDist(kDistUniform, {{"min", 0.0}, {"max", 1.0}}));
    t.AddInput("b", MakeCategorical({"b0", "b1", "b2"}, {0.3, 0.3, 0.4}), kLevelCategorical);
    t.AddInput("d", MakeCategorical({"d0", "d1"}, {0.9, 0.1}), kLevelCategorical);
    t.plan.SetCrstabsFactors({"b", "a"});
    t.plan.SetCrstabsMatrix({{"b0", "a0"}, {"b2", "a0"}, {"b1", "a1"}, {"b0", "a1"}});
    // The probabilities total 0.9: the cells are drawn in proportion to them.
    t.plan.SetCrstabsProbs({0.09, 0.36, 0.27, 0.18});
    if (encoded) {
        t.plan.GetCrstabsEncod() = {{0, 0}, {2, 0}, {1, 1}, {0, 1}};
    }
    return t;
}

class Crosstab : public ::testing::TestWithParam<bool> {};

TEST_P(Crosstab, CellsMatchTheirShareAndFactorsTakeTheCellsCodes) {
    const TestPlan t = CrosstabPlan(GetParam());
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->HasCrosstab());
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    const std::vector<std::vector<int>> codes{{0, 0}, {2, 0}, {1, 1}, {0, 1}};
    std::vector<double> cells;
    std::vector<double> others;
    for (int i = 0; i < kDraws; ++i) {
        ASSERT_TRUE(sim->DrawCase().IsOK());
        const int cell = sim->GetCrosstabCell();
        const std::vector<double>& c = sim->GetCaseValues();
        ASSERT_EQ(c[2], codes.at(static_cast<std::size_t>(cell))[0]); // b is column 0
        ASSERT_EQ(c[0], codes.at(static_cast<std::size_t>(cell))[1]); // a is column 1
        cells.push_back(cell);
        others.push_back(c[3]);
    }
    EXPECT_TRUE(PassesChiSquare(cells, StepCdf({0.1, 0.5, 0.8})));
    EXPECT_TRUE(PassesChiSquare(others, StepCdf({0.9})));
}

INSTANTIATE_TEST_SUITE_P(EncodedOrNot, Crosstab, ::testing::Bool());

TEST(SimulatorModel, RangesNarrowedByTruncationAndTornadoDeltas) {
    TestPlan t;
    t.settings.SetTornadoDeltaStddev(0.5);
    t.settings.SetTornadoVariance(true);
    SimInputSpecs& u = t.AddInput("u", MakeDist(kDistUniform, {{"min", 0.0}, {"max", 10.0}}));
    u.SetMinimum(2.0);
    u.SetMaximum(5.0);
    t.AddInput("g", MakeDist(kDistGamma, {{"shape", 2.0}, {"scale", 0.5}})).SetMinimum(1.0);
    SimInputSpecs& b = t.AddInput("b", MakeDist(kDistBeta, {{"shape1", 2.0}, {"shape2", 5.0}}));
    b.SetMinimum(0.8);
    b.SetMaximum(0.2);
    t.AddInput("p", MakeDist(kDistPoisson, {{"mean", 3.0}}), kLevelOrdinal);
    auto sim = t.MakeSimulator();
    const auto& in = sim->GetSimInputs();
    EXPECT_EQ(in[0].fLower, 2.0);
    EXPECT_EQ(in[0].fUpper, 5.0);
    EXPECT_EQ(in[1].fLower, 1.0);
    EXPECT_TRUE(MCMV::IsMissing(in[1].fUpper));
    EXPECT_EQ(in[2].fLower, 0.8); // crossed bounds: the upper one is dropped
    EXPECT_TRUE(MCMV::IsMissing(in[2].fUpper));
    EXPECT_TRUE(sim->HasOpenRange());
    const auto& cov = sim->GetCorrelatedInputs();
    EXPECT_NEAR_REL(cov[1].fTornadoDelta, 0.5 * std::sqrt(2.0) / 0.5, 1e-14);
    EXPECT_TRUE(cov[1].fbVarianceContrib);
    EXPECT_TRUE(MCMV::IsMissing(cov[3].fTornadoDelta)); // a discrete input carries none
    EXPECT_FALSE(cov[3].fbVarianceContrib);
}

TEST(SimulatorModel, SensitivityIterationChoosesItsDistributionAndFixedValue) {
    TestPlan t;
    t.AddInput("s", {MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}),
                     MakeDist(kDistNormal, {{"mean", 10.0}, {"stddev", 1.0}}),
                     MakeDist(kDistUniform, {{"min", 0.0}, {"max", 1.0}})});
    t.AddInput("c", MakeCategorical({"1", "2.5"}, {0.5, 0.5}), kLevelCategorical);
    t.vars.Add(std::make_unique<MCXML_800::MCScaleVar>("f"));
    t.plan.AddFixedInput("f", std::vector<double>{7.0}, "");
    for (int iteration = 0; iteration < 3; ++iteration) {
        auto sim = t.MakeSimulator(iteration);
        EXPECT_EQ(sim->GetNSensIterations(), 3);
        EXPECT_EQ(sim->GetSensIterName(), "s");
        EXPECT_EQ(sim->GetCorrelatedInputs()[0].fGenerator.fDistType,
                  iteration == 2 ? kDistUniform : kDistNormal);
        EXPECT_EQ(sim->GetFixedInputs().at(0).fNumber, 7.0);
    }
    EXPECT_EQ(t.MakeSimulator(1)->GetCorrelatedInputs()[0].fGenerator.fMean, 10.0);
    SECOutputStats* results = nullptr;
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->GetOutputStats(results).IsOK());
    EXPECT_EQ(results->GetPredictorNames(), (std::vector<std::string>{"s", "c"}));
    EXPECT_EQ(results->GetCovariateNames(), (std::vector<std::string>{"s"}));
    EXPECT_EQ(results->GetFactorNames(), (std::vector<std::string>{"c"}));
    EXPECT_EQ(results->GetSensIteraName(), "s");

    TestPlan fixed;
    fixed.AddInput("x", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    fixed.vars.Add(std::make_unique<MCXML_800::MCScaleVar>("f"));
    fixed.plan.AddFixedInput("f", std::vector<double>{1.0, 2.0, 4.0}, "");
    auto second = fixed.MakeSimulator(2);
    EXPECT_EQ(second->GetNSensIterations(), 3);
    EXPECT_EQ(second->GetSensIterName(), "f");
    EXPECT_EQ(second->GetFixedInputs().at(0).fNumber, 4.0);
}

TEST(SimulatorModel, AnUnusableDistributionIsReportedAndRejectsEveryCase) {
    ClearLastAssertion();
    TestPlan t;
    t.AddInput("bad", MakeDist(kDistNormal, {{"mean", 0.0}}));
    auto sim = t.MakeSimulator();
    EXPECT_EQ(GetLastAssertion(), "SECSimulator: a distribution has the parameters its type needs");
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    EXPECT_EQ(sim->DrawCase().GetErrorCode(), MCSPStatus::kAttemptsExhausted);
}

TEST(SimulatorSeeding, WorkersAreSeededFromTheirValueAndRepeatable) {
    EXPECT_EQ(SECSimulator::SeedFromValue(0.5, 11u), 2147483647u);
    EXPECT_EQ(SECSimulator::SeedFromValue(0.0, 11u), 0u);
    EXPECT_EQ(SECSimulator::SeedFromValue(-1.0, 11u), 11u);
    TestPlan t;
    t.AddInput("x", MakeDist(kDistGamma, {{"shape", 2.0}, {"scale", 0.5}}));
    t.AddInput("c", MakeCategorical({"a", "b"}, {0.4, 0.6}), kLevelCategorical);
    auto master = t.MakeSimulator();
    auto w1 = master->CreateWorker(0.25);
    auto w2 = master->CreateWorker(0.25);
    EXPECT_EQ(w1->GetStream()->GetSeed(), SECSimulator::SeedFromValue(0.25, 0u));
    ASSERT_TRUE(w1->PrepareGeneration().IsOK());
    ASSERT_TRUE(w2->PrepareGeneration().IsOK());
    for (int i = 0; i < 100; ++i) {
        ASSERT_TRUE(w1->DrawCase().IsOK());
        ASSERT_TRUE(w2->DrawCase().IsOK());
        ASSERT_EQ(w1->GetCaseValues(), w2->GetCaseValues());
    }
    w1->SetCaseQuota(250);
    w1->RunTask();
    EXPECT_TRUE(w1->GetStatus().IsOK());
    EXPECT_EQ(w1->GetSimCaseCount(), 250);
    EXPECT_EQ(w1->GetValidCaseCount(), 250);
}

} // namespace
