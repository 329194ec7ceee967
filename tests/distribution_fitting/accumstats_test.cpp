// The likelihood accumulators: the Weibull root search against maximum-likelihood estimates of
// real data (data/ml_make_reference.py: 40-digit mpmath, checked against SciPy; Beta, Gamma and
// NegBin are checked through BuildModel in optimize_test.cpp); scores and Hessians against
// finite differences, rows against sufficient statistics, weights against repeated rows; the
// root search's bracketing, rounding and failures; the constraint rows.
#include "component/mcspassert.h"
#include "distribution_fitting/dfcaccumstats.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcsettings.h"
#include "mccommon/mcmv.h"

#include "fit_host.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <memory>
#include <numeric>
#include <random>
#include <string>
#include <vector>

#include "data/ml_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;
using dfctest::ByName;
using MCCommon_800::MCMV;

namespace {

//! The weighted sample of one reference case, with its sufficient statistics.
struct Sample {
    std::vector<double> fValues;
    std::vector<double> fWeights; //!< one per value (1.0 without weights)
    double fW = 0.0, fMean = 0.0, fSumLog = 0.0;
    double fVariance = 0.0; //!< divisor W - 1
};

Sample MakeSample(const mlref::MLCase& c) {
    Sample s;
    s.fValues = *c.fpData;
    s.fWeights = c.fpWeights ? *c.fpWeights : std::vector<double>(s.fValues.size(), 1.0);
    for (std::size_t i = 0; i < s.fValues.size(); ++i) {
        const double w = s.fWeights[i];
        const double x = s.fValues[i];
        s.fW += w;
        s.fMean += w * x;
        s.fSumLog += w * std::log(x);
    }
    s.fMean /= s.fW;
    for (std::size_t i = 0; i < s.fValues.size(); ++i) {
        s.fVariance += s.fWeights[i] * (s.fValues[i] - s.fMean) * (s.fValues[i] - s.fMean);
    }
    s.fVariance /= s.fW - 1.0;
    return s;
}

//! The field's entries sorted by value (ties by ordinal), as the goodness-of-fit pass makes
//! them, and the weight of each ordinal.
std::vector<DFCGoodFitEntry> SortedEntries(const std::vector<double>& values) {
    std::vector<DFCGoodFitEntry> entries;
    for (std::size_t i = 0; i < values.size(); ++i) {
        entries.push_back({values[i], static_cast<std::int32_t>(i)});
    }
    std::sort(entries.begin(), entries.end(),
              [](const DFCGoodFitEntry& a, const DFCGoodFitEntry& b) {
                  return a.fValue < b.fValue || (a.fValue == b.fValue && a.fRecord < b.fRecord);
              });
    return entries;
}

//! An accumulator of `type` for one variable with the given totals.
std::unique_ptr<DFCAccumStats> MakeAccum(DistType type, const DFCSettings& settings,
                                         std::vector<double>& params, double w, double mean,
                                         double disp) {
    const std::vector<int> v{0};
    switch (type) {
    case kDistBeta:
        return std::make_unique<DFCAccumStatsBeta>(settings, params, v, w, std::vector{mean},
                                                   std::vector{disp});
    case kDistGamma:
        return std::make_unique<DFCAccumStatsGamma>(settings, params, v, w, std::vector{mean},
                                                    std::vector{disp});
    case kDistNegbinomial:
        return std::make_unique<DFCAccumStatsNegBin>(settings, params, v, w, std::vector{mean},
                                                     std::vector{disp});
    default:
        return std::make_unique<DFCAccumStatsWeibTwo>(settings, params, v, w, std::vector{mean},
                                                      std::vector{disp});
    }
}

//! The Weibull estimates (scale, shape, location) of the sample `s` whose values are given in
//! `values` order with `weights` (null: unweighted).
std::vector<double> SolveWeibull(const Sample& s, const std::vector<double>& values,
                                 const std::vector<double>* weights,
                                 const std::vector<double>& minimums = {}) {
    const std::vector<DFCGoodFitEntry> entries = SortedEntries(values);
    DFCSettings settings;
    std::vector<double> p{1.0, 1.0, 0.0};
    DFCAccumStatsWeibTwo accum(settings, p, {0}, s.fW, {s.fMean}, {s.fVariance}, minimums);
    accum.SetData(&entries, weights, s.fW, s.fSumLog);
    EXPECT_TRUE(accum.SolveParameters());
    return p;
}

// Gamma and Weibull stop at |F| ≤ 1e-6. Near the root F(x) ≈ F'(x*)·(x - x*), so the shape is
// within 1e-6/|F'(x*)| of the reference; 10% margin for the curvature over that interval.
double ShapeBound(double derivative) {
    return 1.1e-6 / std::fabs(derivative);
}

class WeibullReference : public ::testing::TestWithParam<mlref::MLCase> {};

TEST_P(WeibullReference, RootSearchMatchesMaximumLikelihood) {
    const mlref::MLCase& c = GetParam();
    const Sample s = MakeSample(c);
    const std::vector<double> params =
        SolveWeibull(s, s.fValues, c.fpWeights ? &s.fWeights : nullptr, {0.0});
    EXPECT_EQ(params[2], 0.0); // the location is left alone

    // Residual and closed-form scale, evaluated here from the data in long double without the
    // accumulator's rescaling of the powers.
    const long double b = params[1];
    long double sumPow = 0.0L, sumPowLog = 0.0L;
    for (std::size_t i = 0; i < s.fValues.size(); ++i) {
        const long double v = s.fValues[i];
        sumPow += s.fWeights[i] * std::pow(v, b);
        sumPowLog += s.fWeights[i] * std::pow(v, b) * std::log(v);
    }
    const long double residual = s.fSumLog / s.fW + 1.0L / b - sumPowLog / sumPow;
    EXPECT_LE(std::fabs(static_cast<double>(residual)), 1e-6 * (1.0 + 1e-9));
    EXPECT_NEAR_REL(params[0], static_cast<double>(std::pow(sumPow / s.fW, 1.0L / b)), 1e-13);

    EXPECT_NEAR_TOL(params[1], c.fParam2, 0.0, ShapeBound(c.fDerivative));
    // d ln a/db is of order ln(max)/b; 1e-4 relative is far above what the shape's bound
    // allows for every reference case and far below any real error.
    EXPECT_NEAR_REL(params[0], c.fParam1, 1e-4);
}

INSTANTIATE_TEST_SUITE_P(RealData, WeibullReference, ::testing::ValuesIn(mlref::kWeibullCases),
                         ByName());

// Objective, scores and Hessian of every accumulator: finite differences and the per-row path.

//! One accumulator over one data set at a parameter point, with a way to refill it.
struct LikelihoodCase {
    std::string fName;
    DistType fType;
    std::vector<double> fParams;  //!< the point at which derivatives are checked
    std::vector<double> fValues;  //!< rows (variable 0)
    std::vector<double> fWeights; //!< frequency weights (variable 1)
};

class AccumHarness {
public:
    explicit AccumHarness(const LikelihoodCase& c) : fCase(c), fParams(c.fParams) {
        fSettings.AddCovariate(0, {}, kLevelContinuous, false);
        EXPECT_TRUE(fSettings.SetFrequencyWeightVar(1));
        double w = 0.0, sx = 0.0, slog = 0.0, slog1m = 0.0;
        MCMath_800::MCCatStats counts;
        for (std::size_t i = 0; i < c.fValues.size(); ++i) {
            const double x = c.fValues[i];
            const double wi = c.fWeights[i];
            w += wi;
            sx += wi * x;
            slog += x > 0.0 ? wi * std::log(x) : 0.0;
            slog1m += x < 1.0 ? wi * std::log1p(-x) : 0.0;
            static_cast<void>(counts.Update(x, wi));
        }
        fEntries = SortedEntries(c.fValues);
        fpAccum = MakeAccum(c.fType, fSettings, fParams, w, sx / w, 1.0);
        if (auto* beta = dynamic_cast<DFCAccumStatsBeta*>(fpAccum.get())) {
            beta->SetSumLogXi(slog);
            beta->SetSumLog1MinusXi(slog1m);
        } else if (auto* gamma = dynamic_cast<DFCAccumStatsGamma*>(fpAccum.get())) {
            gamma->SetSumLogXi(slog);
        } else if (auto* negbin = dynamic_cast<DFCAccumStatsNegBin*>(fpAccum.get())) {
            negbin->SetCatStats(counts);
        } else {
            dynamic_cast<DFCAccumStatsWeibTwo&>(*fpAccum).SetData(&fEntries, &fCase.fWeights, w,
                                                                  slog);
        }
    }

    //! The objective from the sufficient statistics at `theta`.
    double Objective(const std::vector<double>& theta, bool derivatives = false) {
        fParams = theta;
        fpAccum->Reset(1, false);
        EXPECT_TRUE(fpAccum->FinishComputations(derivatives ? 1 : 0));
        return fpAccum->GetObjective();
    }
    //! The objective fed row by row at `theta`.
    double RowObjective(const std::vector<double>& theta) {
        fParams = theta;
        fpAccum->Reset(1, false);
        for (std::size_t i = 0; i < fCase.fValues.size(); ++i) {
            EXPECT_EQ(fpAccum->UpdateForRow({fCase.fValues[i], fCase.fWeights[i]}, 1), 0);
        }
        EXPECT_TRUE(fpAccum->FinishComputations(1));
        return fpAccum->GetObjective();
    }
    DFCAccumStats& Accum() { return *fpAccum; }

private:
    LikelihoodCase fCase;
    DFCSettings fSettings;
    std::vector<double> fParams;
    std::vector<DFCGoodFitEntry> fEntries;
    std::unique_ptr<DFCAccumStats> fpAccum;
};

class LikelihoodDerivatives : public ::testing::TestWithParam<LikelihoodCase> {};

TEST_P(LikelihoodDerivatives, ScoresAndHessianAreFiniteDifferences) {
    const LikelihoodCase& c = GetParam();
    AccumHarness h(c);
    const double f0 = h.Objective(c.fParams, true);
    const std::vector<double> scores = h.Accum().GetScores();
    MCMath_800::MCSymMatrix hessian;
    h.Accum().GetHessian(hessian);
    ASSERT_EQ(hessian.GetNRows(), static_cast<int>(c.fParams.size()));
    // Central differences with step 1e-5·θ: truncation error ~1e-10·f''' and rounding
    // ~eps·|f|/1e-5; 1e-6 relative (with an absolute floor of 1e-6·|f|) covers both.
    for (std::size_t j = 0; j < 2; ++j) {
        const double step = 1e-5 * c.fParams[j];
        std::vector<double> up = c.fParams;
        std::vector<double> down = c.fParams;
        up[j] += step;
        down[j] -= step;
        const double fUp = h.Objective(up, true);
        const std::vector<double> scoresUp = h.Accum().GetScores();
        const double fDown = h.Objective(down, true);
        const std::vector<double> scoresDown = h.Accum().GetScores();
        EXPECT_NEAR_TOL(scores[j], (fUp - fDown) / (2 * step), 1e-6,
                        1e-6 * std::fabs(f0) / c.fParams[j])
            << c.fName << " score " << j;
        for (std::size_t i = 0; i < 2; ++i) {
            const double fd = (scoresUp[i] - scoresDown[i]) / (2 * step);
            EXPECT_NEAR_TOL(hessian.GetElem(static_cast<int>(i), static_cast<int>(j)), fd, 1e-5,
                            1e-6 * std::fabs(f0) / (c.fParams[i] * c.fParams[j]))
                << c.fName << " Hessian " << i << "," << j;
        }
    }
    // The non-estimated entries (NegBin "type", Weibull location) have no derivatives.
    for (std::size_t j = 2; j < c.fParams.size(); ++j) {
        EXPECT_EQ(scores[j], 0.0);
    }
}

// The Beta accumulator works on its sums only; the others also take rows.
class RowAccumulation : public ::testing::TestWithParam<LikelihoodCase> {};

TEST_P(RowAccumulation, RowsEqualSufficientStatistics) {
    const LikelihoodCase& c = GetParam();
    AccumHarness h(c);
    const double fromSums = h.Objective(c.fParams, true);
    const std::vector<double> scores = h.Accum().GetScores();
    const double fromRows = h.RowObjective(c.fParams);
    EXPECT_NEAR_REL(fromRows, fromSums, 1e-12);
    for (std::size_t j = 0; j < scores.size(); ++j) {
        EXPECT_NEAR_TOL(h.Accum().GetScores()[j], scores[j], 1e-10, 1e-10 * std::fabs(fromSums));
    }
    int valid = 0, invalid = 0;
    double weight = 0.0;
    h.Accum().GetCounts(valid, invalid, weight);
    EXPECT_EQ(valid, static_cast<int>(c.fValues.size()));
    EXPECT_EQ(invalid, 0);
}

// Small samples (strike durations, the first shares of star98) with uneven weights.
const std::vector<double> kCountRows{7, 9, 13, 14, 26, 29, 52, 130, 2, 0, 5, 37};
const std::vector<double> kShareRows{0.56, 0.39, 0.21, 0.63, 0.47, 0.33, 0.71, 0.44, 0.52, 0.28};
const std::vector<double> kWeights12{1, 2, 1, 3, 1, 1, 2, 1, 4, 1, 2, 1};

const std::vector<double> kCounts9(kCountRows.begin(), kCountRows.begin() + 9);
const std::vector<double> kWeights9(kWeights12.begin(), kWeights12.begin() + 9);
const std::vector<double> kWeights10(kWeights12.begin(), kWeights12.begin() + 10);
const LikelihoodCase kBetaLik{"Beta", kDistBeta, {2.3, 3.1}, kShareRows, kWeights10};
const LikelihoodCase kGammaLik{"Gamma", kDistGamma, {1.7, 0.05}, kCounts9, kWeights9};
const LikelihoodCase kNegBinLik{
    "NegBin", kDistNegbinomial, {1.4, 0.04, 2.0}, kCountRows, kWeights12};
const LikelihoodCase kWeibullLik{"Weibull", kDistWeibull, {30.0, 0.9, 0.0}, kCounts9, kWeights9};

INSTANTIATE_TEST_SUITE_P(Families, LikelihoodDerivatives,
                         ::testing::Values(kBetaLik, kGammaLik, kNegBinLik, kWeibullLik), ByName());
INSTANTIATE_TEST_SUITE_P(Families, RowAccumulation,
                         ::testing::Values(kGammaLik, kNegBinLik, kWeibullLik), ByName());

// Weights, order and the root search's failure paths.

TEST(WeightedFits, FrequencyWeightsEqualRepeatedRows) {
    // The six age classes of the fair data with their counts against the 6366 rows themselves.
    std::vector<double> expanded;
    for (std::size_t i = 0; i < mlref::kFairAgeClasses.size(); ++i) {
        expanded.insert(expanded.end(), static_cast<std::size_t>(mlref::kFairAgeCounts[i]),
                        mlref::kFairAgeClasses[i]);
    }
    const mlref::MLCase weighted{"w", &mlref::kFairAgeClasses, &mlref::kFairAgeCounts, 0, 0, 0};
    const mlref::MLCase repeated{"r", &expanded, nullptr, 0, 0, 0};
    std::vector<std::vector<double>> gamma, weibull;
    for (const mlref::MLCase& c : {weighted, repeated}) {
        const Sample s = MakeSample(c);
        DFCSettings settings;
        std::vector<double> g{s.fMean * s.fMean / s.fVariance, s.fMean / s.fVariance};
        DFCAccumStatsGamma ga(settings, g, {0}, s.fW, {s.fMean}, {s.fVariance});
        ga.SetSumLogXi(s.fSumLog);
        EXPECT_TRUE(ga.SolveParameters());
        gamma.push_back(g);
        weibull.push_back(SolveWeibull(s, s.fValues, c.fpWeights ? &s.fWeights : nullptr));
    }
    // The same bisection on sums that differ by rounding only.
    EXPECT_NEAR_REL(gamma[0][0], gamma[1][0], 1e-9);
    EXPECT_NEAR_REL(weibull[0][0], weibull[1][0], 1e-9);
    EXPECT_NEAR_REL(weibull[0][1], weibull[1][1], 1e-9);
}

TEST(WeightedFits, WeibullUsesEachEntrysOwnRecordWeight) {
    // Shuffling which record holds which (value, weight) pair reorders the sorted entries'
    // ordinals but not the weighted sample.
    const Sample s = MakeSample(mlref::kWeibullCases[2]); // star98 shares by students
    std::vector<std::size_t> order(s.fValues.size());
    std::iota(order.begin(), order.end(), 0);
    std::mt19937 rng(20240611);
    std::shuffle(order.begin(), order.end(), rng);
    std::vector<double> values, weights;
    for (std::size_t i : order) {
        values.push_back(s.fValues[i]);
        weights.push_back(s.fWeights[i]);
    }
    const std::vector<double> p1 = SolveWeibull(s, s.fValues, &s.fWeights);
    const std::vector<double> p2 = SolveWeibull(s, values, &weights);
    EXPECT_NEAR_REL(p2[0], p1[0], 1e-12);
    EXPECT_NEAR_REL(p2[1], p1[1], 1e-12);
    EXPECT_NEAR_REL(p1[1], mlref::kWeibullCases[2].fParam2,
                    ShapeBound(mlref::kWeibullCases[2].fDerivative) / p1[1]);
}

//! An accumulator whose likelihood equation is a given function, counting its evaluations.
class ScriptedRoot : public DFCAccumStatsNegBin {
public:
    ScriptedRoot(const DFCSettings& settings, std::vector<double>& params,
                 std::function<double(double)> f)
        : DFCAccumStatsNegBin(settings, params, {0}, 10.0, {3.0}, {5.0}), fF(std::move(f)) {}
    double EvaluateRootFunction(double x) override {
        ++fNCalls;
        return fF(x);
    }
    int fNCalls = 0;

private:
    std::function<double(double)> fF;
};

struct RootCase {
    const char* fName;
    double fStart;
    std::function<double(double)> fF;
    double fExpectedR; //!< rounded r; 0 when the search must fail
};

class RootSearch : public ::testing::TestWithParam<RootCase> {};

TEST_P(RootSearch, BracketBisectAndRound) {
    const RootCase& c = GetParam();
    DFCSettings settings;
    std::vector<double> params{c.fStart, 0.5, 2.0};
    const std::vector<double> before = params;
    ScriptedRoot accum(settings, params, c.fF);
    const bool solved = accum.SolveParameters();
    if (c.fExpectedR == 0.0) {
        EXPECT_FALSE(solved);
        EXPECT_EQ(accum.GetStatus(), MCStatus(MCSPStatus::kRootSearchFailed, false));
        EXPECT_EQ(params, before);
        return;
    }
    ASSERT_TRUE(solved);
    EXPECT_EQ(params[0], c.fExpectedR);
    EXPECT_NEAR_REL(params[1], c.fExpectedR / (c.fExpectedR + 3.0), 2 * mctest::kEps);
}

INSTANTIATE_TEST_SUITE_P(
    Scripted, RootSearch,
    ::testing::Values(
        RootCase{"RootBelowOneGivesOne", 2.0, [](double x) { return 0.3 - x; }, 1.0},
        RootCase{"HalfRoundsUp", 9.0, [](double x) { return 4.5 - x; }, 5.0},
        RootCase{"FoundByDoubling", 1.0, [](double x) { return std::log(700.0 / x); }, 700.0},
        RootCase{"FoundByHalving", 3.0, [](double x) { return 0.01 - x; }, 1.0},
        RootCase{"NoBracketWithinTenSteps", 1.0, [](double x) { return 1.0 / x + 1e-3; }, 0.0},
        RootCase{"RootBeyond1024TimesStart", 1.0, [](double x) { return 2000.0 - x; }, 0.0},
        RootCase{"MissingAtStart", 1.0, [](double) { return MCMV::Missing(); }, 0.0},
        RootCase{"MissingInBisection", 1.0,
                 [](double x) { return x > 1.2 && x < 1.8 ? MCMV::Missing() : 1.5 - x; }, 0.0}),
    ByName());

TEST(RootSearchFailure, StartAtOrBelowZeroEvaluatesNothing) {
    DFCSettings settings;
    std::vector<double> params{0.0, 0.5, 2.0};
    ScriptedRoot accum(settings, params, [](double x) { return 1.0 - x; });
    for (double start : {0.0, -2.0, MCMV::Missing()}) {
        EXPECT_TRUE(MCMV::IsMissing(accum.FindRoot(start)));
    }
    EXPECT_EQ(accum.fNCalls, 0);
    EXPECT_FALSE(accum.SolveParameters());
    EXPECT_EQ(accum.GetStatus().GetErrorCode(), MCSPStatus::kRootSearchFailed);
}

TEST(RootSearchFailure, GammaWithoutBracketKeepsItsStart) {
    // Nearly constant data: mean of ln x only 1e-9 below ln(mean), so F(α) ≈ 1/(2α) stays
    // positive from 1/1024 to 1024 times the start.
    DFCSettings settings;
    std::vector<double> params{1.0, 1.0};
    DFCAccumStatsGamma accum(settings, params, {0}, 100.0, {1.0}, {1e-9});
    accum.SetSumLogXi(-1e-7);
    EXPECT_FALSE(accum.SolveParameters());
    EXPECT_EQ(accum.GetStatus(), MCStatus(MCSPStatus::kRootSearchFailed, false));
    EXPECT_EQ(params, (std::vector<double>{1.0, 1.0}));
}

TEST(RootSearchFailure, WeibullWithoutUsableData) {
    DFCSettings settings;
    const std::vector<double> withZero{0.0, 1.5, 2.0, 3.5};
    const std::vector<DFCGoodFitEntry> entries = SortedEntries(withZero);
    // A value at the location: Σ w·ln x = -∞ and the likelihood is unbounded.
    std::vector<double> p{1.0, 1.0, 0.0};
    DFCAccumStatsWeibTwo zero(settings, p, {0}, 4.0, {1.75}, {2.0});
    zero.SetData(&entries, nullptr, 4.0, -std::numeric_limits<double>::infinity());
    EXPECT_FALSE(zero.SolveParameters());
    // A record ordinal beyond the weights.
    const std::vector<double> shortWeights{1.0, 1.0};
    DFCAccumStatsWeibTwo noWeight(settings, p, {0}, 4.0, {1.75}, {2.0});
    noWeight.SetData(&entries, &shortWeights, 4.0, 0.0);
    EXPECT_FALSE(noWeight.SolveParameters());
    // All values equal: F(b) = 1/b has no root; the search must not run off to a huge shape.
    const std::vector<DFCGoodFitEntry> same = SortedEntries({2.5, 2.5, 2.5, 2.5});
    DFCAccumStatsWeibTwo constant(settings, p, {0}, 4.0, {2.5}, {0.0});
    constant.SetData(&same, nullptr, 4.0, 4.0 * std::log(2.5));
    EXPECT_FALSE(constant.SolveParameters());
    // No entries at all.
    DFCAccumStatsWeibTwo empty(settings, p, {0}, 4.0, {1.75}, {2.0});
    EXPECT_FALSE(empty.SolveParameters());
    EXPECT_EQ(empty.GetStatus().GetErrorCode(), MCSPStatus::kRootSearchFailed);
    EXPECT_EQ(p, (std::vector<double>{1.0, 1.0, 0.0}));
}

TEST(WeibullRootFunction, LargeShapesDoNotOverflow) {
    // Values near 1e6 with a shape of 300: v^b alone would overflow a double.
    DFCSettings settings;
    std::vector<double> values;
    for (int i = 0; i < 50; ++i) {
        values.push_back(1e6 * (1.0 + 0.001 * std::sin(i)));
    }
    const std::vector<DFCGoodFitEntry> entries = SortedEntries(values);
    double sumLog = 0.0;
    for (double v : values) {
        sumLog += std::log(v);
    }
    std::vector<double> p{1.0, 300.0, 0.0};
    DFCAccumStatsWeibTwo accum(settings, p, {0}, 50.0, {1e6}, {1.0});
    accum.SetData(&entries, nullptr, 50.0, sumLog);
    EXPECT_FALSE(MCMV::IsMissing(accum.EvaluateRootFunction(300.0)));
    ASSERT_TRUE(accum.SolveParameters());
    EXPECT_GT(p[1], 300.0);
    EXPECT_NEAR_REL(p[0], 1e6, 2e-3);
}

// Constraints.

struct ConstraintCase {
    const char* fName;
    DistType fType;
    int fIndex;
    bool fOK;
    std::vector<double> fCoeffs;
    double fConstant;
};

class Constraints : public ::testing::TestWithParam<ConstraintCase> {};

TEST_P(Constraints, RowsAndOutOfRange) {
    const ConstraintCase& c = GetParam();
    DFCSettings settings;
    const bool twoParams = c.fType == kDistBeta || c.fType == kDistGamma;
    std::vector<double> params = twoParams ? std::vector{1.0, 1.0} : std::vector{1.0, 0.5, 2.0};
    const auto accum = MakeAccum(c.fType, settings, params, 1.0, 0.5, 1.0);
    EXPECT_EQ(accum->GetNConstr(), twoParams ? 2 : 3);
    ClearLastAssertion();
    std::vector<double> coeffs;
    double constant = 99.0;
    EXPECT_EQ(accum->GetConstrVarCoeff(c.fIndex, coeffs, constant), c.fOK);
    if (!c.fOK) {
        EXPECT_NE(GetLastAssertion().find("DFCAccumStats::GetConstrVarCoeff: index"),
                  std::string::npos);
        return;
    }
    EXPECT_EQ(coeffs, c.fCoeffs);
    EXPECT_EQ(constant, c.fConstant);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, Constraints,
    ::testing::Values(
        ConstraintCase{"BetaShape1", kDistBeta, 0, true, {1.0, 0.0}, -1e-5},
        ConstraintCase{"GammaRate", kDistGamma, 1, true, {0.0, 1.0}, -1e-5},
        ConstraintCase{"GammaPastEnd", kDistGamma, 2, false, {}, 0.0},
        ConstraintCase{"BetaNegative", kDistBeta, -1, false, {}, 0.0},
        ConstraintCase{"NegBinR", kDistNegbinomial, 0, true, {1.0, 0.0, 0.0}, 0.0},
        ConstraintCase{"NegBinP", kDistNegbinomial, 1, true, {0.0, 1.0, 0.0}, 0.0},
        ConstraintCase{"NegBinOneMinusP", kDistNegbinomial, 2, true, {0.0, -1.0, 0.0}, 1.0},
        ConstraintCase{"NegBinPastEnd", kDistNegbinomial, 3, false, {}, 0.0},
        ConstraintCase{"WeibullScale", kDistWeibull, 0, true, {1.0, 0.0, 0.0}, -1e-5},
        ConstraintCase{"WeibullShape", kDistWeibull, 1, true, {0.0, 1.0, 0.0}, -1e-5},
        ConstraintCase{"WeibullLocationFree", kDistWeibull, 2, true, {0.0, 0.0, 0.0}, 0.0},
        ConstraintCase{"WeibullPastEnd", kDistWeibull, 3, false, {}, 0.0}),
    ByName());

} // namespace
