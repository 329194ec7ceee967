// The fit diagnostics against R (data/diag_make_reference.R, data/se_make_reference.R,
// fitdistrplus): log-likelihood and information criteria, standard errors and their
// correlation, A² and D over the values strictly inside a fitted support (the inputs that once
// gave negative A²), pooled chi-square, p-value bounds from the tables, the reasons of dropped
// candidates, and the sample quantiles of the Q-Q and P-P points.
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcfitdiagnostics.h"
#include "distribution_fitting/dfcfitgoodness.h"
#include "mccommon/mcmv.h"

#include "fit_host.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

namespace {
constexpr double kMissing = MCCommon_800::MCMV::Missing();
} // namespace

#include "data/diag_reference.inc"
#include "data/gof_reference.inc"
#include "data/se_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;
using namespace dfctest;
using MCCommon_800::MCMV;
using Element = DFCOutputStats::DFCVarDistElement;

namespace {

const std::vector<DistType> kContinuous = {kDistLognormal, kDistNormal,     kDistTriangular,
                                           kDistUniform,   kDistWeibull,    kDistGamma,
                                           kDistBeta,      kDistExponential};
//! Test names from the reference rows' name.
struct RefName {
    template <class T> std::string operator()(const ::testing::TestParamInfo<T>& row) const {
        return row.param.name;
    }
};

const std::vector<DistType> kCounts = {kDistBinomial, kDistNegbinomial, kDistPoisson};

//! Rows of (value, weight).
Rows Weighted(const std::vector<double>& values, const std::vector<double>& weights) {
    Rows rows;
    for (std::size_t i = 0; i < values.size(); ++i) {
        rows.push_back({values[i], weights.empty() ? 1.0 : weights[i]});
    }
    return rows;
}

//! One fitting run of the first column over `types`, the second column the frequency weight.
FitRun Fit(const Rows& rows, const std::vector<DistType>& types, MeasureLevel level) {
    DFCSettings settings;
    EXPECT_EQ(settings.AddCovariate(0, types, level, false), 1);
    settings.SetGFType(kAndersonDarling);
    settings.SetInteractiveMode(true);
    EXPECT_TRUE(settings.SetFrequencyWeightVar(1));
    return FitRun(rows, settings);
}

Rows Sample(int sample) {
    switch (sample) {
    case 0:
        return Weighted(gofref::kNile, {});
    case 1:
        return Weighted(gofref::kShares, {});
    default:
        return Weighted(gofref::kVisits, gofref::kHouseholds);
    }
}

// ln L, k, AIC, BIC and AICc of every candidate that fitdistrplus fits as well. The closed-form
// estimates agree to rounding; the searched ones (Gamma, Weibull, Beta) lie within 1e-5 of R's
// maximum, where ln L is flat: the difference is second order, below 1e-9 relative.
class Likelihood : public ::testing::TestWithParam<diagref::LikCase> {};

TEST_P(Likelihood, AgreesWithFitdistrplus) {
    const diagref::LikCase& c = GetParam();
    const auto type = static_cast<DistType>(c.type);
    const bool counts = c.sample == 2;
    FitRun run = Fit(Sample(c.sample), counts ? kCounts : kContinuous,
                     counts ? kLevelOrdinal : kLevelContinuous);
    ASSERT_FALSE(run.Build().IsError());
    const Element& e = run.Covariate(0).fDistElements[static_cast<std::size_t>(type)];
    EXPECT_NEAR_REL(e.fLogLikelihood, c.logLik, 1e-8);
    EXPECT_EQ(e.fNEstimatedParams, c.k);
    EXPECT_NEAR_REL(e.fAIC, c.aic, 1e-8);
    EXPECT_NEAR_REL(e.fBIC, c.bic, 1e-8);
    EXPECT_NEAR_REL(e.fAICc, c.aicc, 1e-8);
    EXPECT_EQ(e.fLogLikReason, "");
}

INSTANTIATE_TEST_SUITE_P(R, Likelihood, ::testing::ValuesIn(diagref::kLikCases), RefName());

// Standard errors from the observed information against fitdist's (or, for the ill-conditioned
// Gamma of the flows, the closed form): 1e-3 relative, the searched estimates being within 1e-5
// of R's. Parameters the fitting does not estimate by maximum likelihood are missing.
class StdErrors : public ::testing::TestWithParam<seref::SeCase> {};

TEST_P(StdErrors, AgreeWithFitdistrplus) {
    const seref::SeCase& c = GetParam();
    const auto type = static_cast<DistType>(c.type);
    const bool counts = c.sample == 2;
    FitRun run = Fit(Sample(c.sample), counts ? kCounts : kContinuous,
                     counts ? kLevelOrdinal : kLevelContinuous);
    ASSERT_FALSE(run.Build().IsError());
    const Element& e = run.Covariate(0).fDistElements[static_cast<std::size_t>(type)];
    ASSERT_EQ(e.fvStdErrors.size(), e.fDistParams.size());
    for (std::size_t i = 0; i < e.fDistParams.size(); ++i) {
        EXPECT_NEAR_REL(e.fvStdErrors[i], c.se[i], 1e-3) << i;
    }
    if (!MCMV::IsMissing(c.corr)) {
        EXPECT_NEAR_TOL(e.fvParamCorrelations[1], c.corr, 1e-3, 1e-6);
    }
    EXPECT_EQ(e.fStdErrorReason.empty(), type != kDistNegbinomial);
}

INSTANTIATE_TEST_SUITE_P(R, StdErrors, ::testing::ValuesIn(seref::kSeCases), RefName());

// Endpoints at the sample extremes are no regular estimate: every error missing, with the reason.
TEST(StdErrorsMissing, EndpointsAtTheSampleExtremes) {
    FitRun run = Fit(Sample(0), kContinuous, kLevelContinuous);
    ASSERT_FALSE(run.Build().IsError());
    for (DistType type : {kDistUniform, kDistTriangular}) {
        const Element& e = run.Covariate(0).fDistElements[static_cast<std::size_t>(type)];
        for (double se : e.fvStdErrors) {
            EXPECT_TRUE(MCMV::IsMissing(se)) << e.fDistName;
        }
        EXPECT_NE(e.fStdErrorReason, "") << e.fDistName;
    }
}

// The sample quantiles of the plotting positions: the inverse of the weighted EDF, so integer
// weights equal repeated rows, and 1 .. 100 gives x_i = i exactly (the target i/100·W equals a
// sum of weights, which rounding must not push past).
TEST(SampleQuantiles, InverseOfTheWeightedEdf) {
    const auto quantiles = [](std::vector<double> x, std::vector<double> w) {
        double total = 0.0;
        for (double v : w) {
            total += v;
        }
        DFCSortedSample sample{x.size(), [x](std::size_t i) { return x[i]; },
                               [w](std::size_t i) { return w[i]; }, total};
        std::vector<double> q;
        std::vector<double> p;
        ComputeSampleQuantiles(sample, q, p);
        return std::make_pair(q, p);
    };
    const auto weighted = quantiles({1, 2, 3}, {2, 1, 3});
    const auto repeated = quantiles({1, 1, 2, 3, 3, 3}, {1, 1, 1, 1, 1, 1});
    EXPECT_EQ(weighted, repeated);
    EXPECT_EQ(weighted.first[32], 1.0); // p = 0.33 ≤ 2/6
    EXPECT_EQ(weighted.first[33], 2.0); // p = 0.34
    EXPECT_NEAR_REL(weighted.second[33], 0.5, 1e-15);
    std::vector<double> hundred;
    for (int i = 1; i <= 100; ++i) {
        hundred.push_back(0.1 * i);
    }
    const auto h = quantiles(hundred, std::vector<double>(100, 0.1));
    for (std::size_t i = 0; i < 99; ++i) {
        EXPECT_EQ(h.first[i], hundred[i]) << i;
    }
}

const diagref::EdfCase& EdfRef(const std::string& name) {
    for (const diagref::EdfCase& c : diagref::kEdfCases) {
        if (name == c.name) {
            return c;
        }
    }
    throw std::out_of_range(name);
}

// Candidates whose fitted support ends at sample values: A² and D over the values strictly
// inside, never negative. Formerly the 8 values gave the Uniform A² = -0.6 and made it the
// best fit; the three values repeated hundreds of times gave the Triangular A² = -999.6.
struct InteriorRow {
    std::string fName;
    Rows fRows;
    DistType fType;
};

class InteriorEdf : public ::testing::TestWithParam<InteriorRow> {};

TEST_P(InteriorEdf, StatisticsOverTheValuesInsideTheSupport) {
    const InteriorRow& row = GetParam();
    const diagref::EdfCase& ref = EdfRef(row.fName);
    FitRun run = Fit(row.fRows, kContinuous, kLevelContinuous);
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    const Element& e = info.fDistElements[static_cast<std::size_t>(row.fType)];
    EXPECT_EQ(e.fEdfWeight, ref.n);
    EXPECT_NEAR_REL(e.fADFit, ref.a2, 1e-12);
    EXPECT_NEAR_REL(e.fKSFit, ref.d, 1e-12);
    for (const Element& r : info.fReportedElements) {
        EXPECT_FALSE(r.fADFit < 0.0) << r.fDistName;
    }
}

Rows ThreeValues() {
    return Weighted({1.0, 2.0, 3.0}, {300.0, 400.0, 300.0});
}

INSTANTIATE_TEST_SUITE_P(
    R, InteriorEdf,
    ::testing::Values(InteriorRow{"NileUniform", Sample(0), kDistUniform},
                      InteriorRow{"NileTriangular", Sample(0), kDistTriangular},
                      InteriorRow{"EightUniform", Weighted(diagref::kEight, {}), kDistUniform},
                      InteriorRow{"ThreeValuesTriangular", ThreeValues(), kDistTriangular}),
    ByName());

// The reasons of dropped candidates, with the inputs that call for each.
struct DropRow {
    std::string fName;
    Rows fRows;
    MeasureLevel fLevel;
    DistType fType;
    DFCDropReason fReason;
};

class DropReason : public ::testing::TestWithParam<DropRow> {};

TEST_P(DropReason, IsRecordedInTheElement) {
    const DropRow& row = GetParam();
    FitRun run = Fit(row.fRows, row.fLevel == kLevelOrdinal ? kCounts : kContinuous, row.fLevel);
    ASSERT_FALSE(run.Build().IsError());
    const Element& e = run.Covariate(0).fDistElements[static_cast<std::size_t>(row.fType)];
    EXPECT_FALSE(e.fbDistAllowed);
    EXPECT_EQ(e.fDropReason, row.fReason);
    EXPECT_NE(std::string(DFCDropReasonText(e.fDropReason)), "");
}

// Counts 3, 7, 9, 6, 3, 2 of the values 0 to 5: mean 2.17, variance (divisor W) 1.81.
Rows UnderDispersed() {
    return Weighted({0, 1, 2, 3, 4, 5}, {3, 7, 9, 6, 3, 2});
}

INSTANTIATE_TEST_SUITE_P(
    Inputs, DropReason,
    ::testing::Values(DropRow{"UnderDispersedNegBin", UnderDispersed(), kLevelOrdinal,
                              kDistNegbinomial, kDropUnderDispersion},
                      DropRow{"OverDispersedBinomial", Sample(2), kLevelOrdinal, kDistBinomial,
                              kDropOverDispersion},
                      DropRow{"BetaAboveOne", Sample(0), kLevelContinuous, kDistBeta, kDropSupport},
                      DropRow{"UniformOfThreeValues", Weighted({1.0, 2.0, 3.0}, {}),
                              kLevelContinuous, kDistUniform, kDropTooFewValues}),
    ByName());

// Pooled chi-square beside the unpooled one, which keeps its value.
class Pooled : public ::testing::TestWithParam<diagref::PooledCase> {};

TEST_P(Pooled, AgreesWithR) {
    const diagref::PooledCase& c = GetParam();
    const std::string name = c.name;
    const bool small = name == "SmallPoisson";
    const DistType type = name == "VisitsNegBin" ? kDistNegbinomial : kDistPoisson;
    const gofref::ChiCase* chi = nullptr;
    for (const gofref::ChiCase& g : gofref::kChiCases) {
        chi = name == g.name ? &g : chi;
    }
    ASSERT_NE(chi, nullptr);
    const DFCChiSquareResult r =
        ComputeChiSquareFit(type, chi->params, chi->counts, chi->total, chi->maximum);
    EXPECT_NEAR_REL(r.fStatistic, chi->stat, 1e-10);
    EXPECT_NEAR_REL(r.fPooledStatistic, c.stat, 1e-10);
    EXPECT_EQ(r.fPooledDegreesOfFreedom, c.df);
    EXPECT_NEAR_TOL(r.fPooledPValue, c.p, 1e-9, small ? 0.0 : 1e-300);
}

INSTANTIATE_TEST_SUITE_P(R, Pooled, ::testing::ValuesIn(diagref::kPooledCases), RefName());

// What a table of critical values says of a statistic: beyond its ends a bound, between two
// critical values the interval of their levels (D'Agostino and Stephens 1986, table 4.17).
TEST(PValueBounds, TableEndsAndIntervals) {
    const std::vector<double> crit = {0.474, 0.637, 0.757, 0.877, 1.038};
    const std::vector<double> levels = {0.25, 0.10, 0.05, 0.025, 0.01};
    struct Row {
        double value, lower, upper;
    };
    for (const Row& r : {Row{0.3, 0.25, kMissing}, Row{2.0, kMissing, 0.01}, Row{0.8, 0.025, 0.05},
                         Row{0.757, 0.05, 0.05}}) {
        double lower = 0.0;
        double upper = 0.0;
        LookUpSignificanceBounds(r.value, crit, levels, lower, upper);
        EXPECT_NEAR_REL(lower, r.lower, 0.0) << r.value;
        EXPECT_NEAR_REL(upper, r.upper, 0.0) << r.value;
    }
    // A formula's p-value (the Normal's A²) has no bounds; the Gamma's table does.
    const DFCEdfSignificance normal = ComputeEdfSignificance(kDistNormal, 100, 0.5, 0.05, 1.0);
    EXPECT_TRUE(MCMV::IsMissing(normal.fADPLower) && MCMV::IsMissing(normal.fADPUpper));
    const DFCEdfSignificance gamma = ComputeEdfSignificance(kDistGamma, 100, 8.75, 0.05, 72.0);
    EXPECT_TRUE(MCMV::IsMissing(gamma.fADPLower));
    EXPECT_EQ(gamma.fADPUpper, 0.005);
}

// Where ln L is not finite it is missing with its reason: the moment-matched Triangular of the
// Nile flows has density 0 at both sample extremes.
TEST(LikelihoodMissing, TriangularDensityZeroAtTheExtremes) {
    FitRun run = Fit(Sample(0), kContinuous, kLevelContinuous);
    ASSERT_FALSE(run.Build().IsError());
    const Element& e = run.Covariate(0).fDistElements[kDistTriangular];
    EXPECT_TRUE(MCMV::IsMissing(e.fLogLikelihood) && MCMV::IsMissing(e.fAIC));
    EXPECT_EQ(e.fLogLikReason, "the density is 0 at a sample value");
}

} // namespace
