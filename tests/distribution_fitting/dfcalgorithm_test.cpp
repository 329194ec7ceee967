// The fitting driver's data passes and initial estimates against exact rational arithmetic
// (data/make_reference.py), the invariants of weights, listwise deletion and the case limit,
// support checks, the contingency table, cancellation and BuildModel's failure paths.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"

#include "fit_host.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

namespace {
constexpr double kMissing = MCCommon_800::MCMV::Missing();
} // namespace

#include "data/fitting_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;
using namespace dfctest;
using MCCommon_800::MCMemoryRecordIter;
using MCCommon_800::MCMV;
using MCCommon_800::MultiPassRecordIter;
using MCXML_800::MCCatNumEncoder;
using MCXML_800::MCCatVar;
using MCXML_800::MCScaleVar;
using MCXML_800::MCVarList;
using MCXML_800::Record;

namespace {

// Relative tolerance of statistics computed by one-pass weighted updates on 40 to 100 values
// whose mean is up to 30 standard deviations from zero: n·eps·(1 + |mean|/sd) ≈ 3e-13.
constexpr double kStatTol = 1e-12;

std::vector<DistType> Types(const std::vector<int>& values) {
    std::vector<DistType> types;
    for (int v : values) {
        types.push_back(static_cast<DistType>(v));
    }
    return types;
}

//! The variables of the reference sample; the factors carry their categories.
MCVarList ReferenceVariables() {
    MCVarList vars;
    for (const std::string& name : fitref::kNames) {
        if (name == "group" || name == "tier") {
            const std::size_t f = name == "group" ? 0 : 2;
            vars.Add(
                std::make_unique<MCCatVar>(name, MCCatNumEncoder(fitref::kFactorCategories[f])));
        } else if (name == "plan") {
            vars.Add(
                std::make_unique<MCCatVar>(name, MCCatNumEncoder(std::vector<double>{10, 20})));
        } else {
            vars.Add(std::make_unique<MCScaleVar>(name));
        }
    }
    return vars;
}

//! The reference run: covariates with their candidates and levels, factors with Categorical,
//! the weight, ten bins, crosstabs on.
DFCSettings ReferenceSettings(bool withWeight = true) {
    DFCSettings settings;
    for (std::size_t i = 0; i < fitref::kCovariates.size(); ++i) {
        EXPECT_GT(settings.AddCovariate(fitref::kCovariates[i], Types(fitref::kAllowed[i]),
                                        static_cast<MeasureLevel>(fitref::kCovariateLevels[i]),
                                        false),
                  0);
    }
    for (int f : fitref::kFactors) {
        EXPECT_GT(settings.AddFactor(f, 3, {kDistCategorical}, kLevelCategorical, false), 0);
    }
    if (withWeight) {
        EXPECT_TRUE(settings.SetFrequencyWeightVar(fitref::kWeightVar));
    }
    settings.SetBins(10);
    settings.SetUseCrosstabs(true);
    return settings;
}

//! A run over the reference sample's variables.
FitRun Reference(const Rows& rows, DFCSettings settings = ReferenceSettings()) {
    return FitRun(rows, std::move(settings), ReferenceVariables());
}

std::vector<double> Moments(const DFCAlgorithm& algorithm, int covariate) {
    const DFCMomentInputs m = algorithm.GetCovariateMoments(covariate);
    return {m.fMean,    m.fVariance, m.fVarianceW, m.fMinimum,
            m.fMaximum, m.fMode,     m.fGeoMean,   m.fVarLog};
}

void ExpectVectorNear(const std::vector<double>& actual, const std::vector<double>& expected,
                      double rel, const std::string& what) {
    ASSERT_EQ(actual.size(), expected.size()) << what;
    for (std::size_t i = 0; i < expected.size(); ++i) {
        EXPECT_TRUE(mctest::Near(actual[i], expected[i], rel)) << what << " entry " << i;
    }
}

//! Compares all the passes and initial estimates produced. `iterRel` applies to the iteratively
//! fitted NegBin, Weibull, Gamma and Beta: sums in another order may stop a little apart.
void ExpectSameResults(FitRun& a, FitRun& b, double rel, double iterRel) {
    const DFCOutputStats& ra = a.Results();
    const DFCOutputStats& rb = b.Results();
    EXPECT_TRUE(mctest::Near(a.Algo().GetValidWeight(), b.Algo().GetValidWeight(), rel));
    for (std::size_t i = 0; i < ra.GetCovarDistInfo().size(); ++i) {
        const int c = static_cast<int>(i);
        ExpectVectorNear(Moments(a.Algo(), c), Moments(b.Algo(), c), rel, "moments");
        const auto& ia = ra.GetCovarDistInfo()[i];
        const auto& ib = rb.GetCovarDistInfo()[i];
        ExpectVectorNear(ia.fCategoryCounts, ib.fCategoryCounts, rel, "category counts");
        for (int k = 0; k < kNFitDistTypes; ++k) {
            const auto uk = static_cast<std::size_t>(k);
            EXPECT_EQ(ia.fDistElements[uk].fbDistAllowed, ib.fDistElements[uk].fbDistAllowed)
                << "covariate " << i << " type " << k;
            const bool iterative =
                k == kDistNegbinomial || k == kDistWeibull || k == kDistGamma || k == kDistBeta;
            ExpectVectorNear(ia.fDistElements[uk].fDistParams, ib.fDistElements[uk].fDistParams,
                             iterative ? iterRel : rel, "parameters of type " + std::to_string(k));
        }
        const DFCHistogramData* ha = a.Algo().GetCovariateHistogram(c);
        const DFCHistogramData* hb = b.Algo().GetCovariateHistogram(c);
        ASSERT_EQ(ha == nullptr, hb == nullptr);
        if (ha) {
            ExpectVectorNear(ha->GetBinWeights(), hb->GetBinWeights(), rel, "histogram");
        }
        for (std::size_t j = 0; j < i; ++j) {
            EXPECT_TRUE(mctest::Near(ra.GetCorrMatrix().GetElem(c, static_cast<int>(j)),
                                     rb.GetCorrMatrix().GetElem(c, static_cast<int>(j)), rel));
        }
    }
    for (std::size_t f = 0; f < ra.GetFactorDistInfo().size(); ++f) {
        ExpectVectorNear(ra.GetFactorDistInfo()[f].fDistBestParams,
                         rb.GetFactorDistInfo()[f].fDistBestParams, rel, "factor probabilities");
    }
    EXPECT_EQ(ra.GetCrstabsMatrix(), rb.GetCrstabsMatrix());
    ExpectVectorNear(ra.GetCrstabsProbs(), rb.GetCrstabsProbs(), rel, "cell probabilities");
}

TEST(ReferenceRun, MatchesExactArithmetic) {
    FitRun run = Reference(fitref::kRows);
    ASSERT_TRUE(run.Build().IsOK());
    DFCAlgorithm& algo = run.Algo();
    EXPECT_TRUE(algo.IsModelBuilt());
    // Listwise deletion; weight 0, a negative and a missing weight count 0 in the invalid weight.
    EXPECT_EQ(algo.GetNRecords(), fitref::kNRecords);
    EXPECT_EQ(algo.GetNValidRecords(), fitref::kNValid);
    EXPECT_EQ(algo.GetNInvalidRecords(), fitref::kNInvalid);
    EXPECT_NEAR_REL(algo.GetValidWeight(), fitref::kValidWeight, kStatTol);
    EXPECT_NEAR_REL(algo.GetInvalidWeight(), fitref::kInvalidWeight, kStatTol);
    EXPECT_NEAR_REL(algo.GetTotalWeight(), fitref::kTotalWeight, kStatTol);
    // Later steps may drop further candidates; the passes and estimates drop these.
    EXPECT_GE(run.CountWarnings(MCSPStatus::kDistDropped), fitref::kDroppedWithWarning);

    const DFCOutputStats& results = run.Results();
    for (std::size_t i = 0; i < fitref::kCovariates.size(); ++i) {
        SCOPED_TRACE("covariate " + std::to_string(i));
        const int c = static_cast<int>(i);
        const fitref::Moments& e = fitref::kMoments[i];
        const DFCMomentInputs m = algo.GetCovariateMoments(c);
        EXPECT_NEAR_REL(m.fMean, e.mean, kStatTol);
        EXPECT_NEAR_REL(m.fVariance, e.var, kStatTol);
        EXPECT_NEAR_REL(m.fVarianceW, e.varW, kStatTol);
        EXPECT_TRUE(m.fMinimum == e.min && m.fMaximum == e.max);
        EXPECT_NEAR_REL(m.fGeoMean, e.geoMean, kStatTol);
        EXPECT_NEAR_REL(m.fVarLog, e.varLog, 1e-10); // two-pass, but of ln x near 5.14: 1e-3 spread
        const auto& allowed = fitref::kAllowed[i];
        if (std::count(allowed.begin(), allowed.end(), kDistTriangular) > 0) {
            EXPECT_NEAR_REL(m.fMode, e.mode, kStatTol);
        }
        // Initial estimates; candidates absent from the reference were dropped.
        const auto& info = results.GetCovarDistInfo()[i];
        EXPECT_EQ(info.fFittedVarName,
                  fitref::kNames[static_cast<std::size_t>(fitref::kCovariates[i])]);
        for (int k = 0; k < kNFitDistTypes; ++k) {
            const auto& element = info.fDistElements[static_cast<std::size_t>(k)];
            const auto expected = fitref::kEstimates[i].find(k);
            if (expected == fitref::kEstimates[i].end()) {
                EXPECT_FALSE(element.fbDistAllowed) << "type " << k;
                EXPECT_TRUE(element.fInitParams.empty()) << "type " << k;
            } else { // the geometric mean and the log variance come through exp and log
                ExpectVectorNear(element.fInitParams, expected->second, 1e-11,
                                 "initial parameters of type " + std::to_string(k));
            }
        }
        // Category counts, histograms and correlations.
        ExpectVectorNear(info.fCategoryCounts, fitref::kCovariateCatCounts[i], kStatTol, "counts");
        const bool continuous = fitref::kCovariateLevels[i] == kLevelContinuous;
        EXPECT_EQ(algo.GetCovariateCatStats(c) == nullptr, continuous);
        const DFCHistogramData* histogram = algo.GetCovariateHistogram(c);
        ASSERT_EQ(histogram != nullptr, continuous);
        if (histogram) {
            ExpectVectorNear(histogram->GetBinWeights(), fitref::kHistograms[i], 0.0, "bins");
        }
        for (std::size_t j = 0; j < fitref::kCovariates.size(); ++j) {
            EXPECT_NEAR_TOL(results.GetCorrMatrix().GetElem(c, static_cast<int>(j)),
                            fitref::kCorr[i][j], kStatTol, 1e-14);
        }
    }
    // Factors get their Categorical distribution as the best fit.
    for (std::size_t f = 0; f < fitref::kFactors.size(); ++f) {
        const auto& info = results.GetFactorDistInfo()[f];
        ExpectVectorNear(info.fCategoryCounts, fitref::kFactorCounts[f], kStatTol, "counts");
        std::vector<double> probs;
        for (double count : fitref::kFactorCounts[f]) {
            probs.push_back(count / fitref::kValidWeight);
        }
        EXPECT_EQ(info.fDistBestType, kDistCategorical);
        EXPECT_EQ(info.fDistBestName, "Categorical");
        ExpectVectorNear(info.fDistBestParams, probs, kStatTol, "probabilities");
        EXPECT_EQ(info.fDistBestParamNames, fitref::kFactorCategories[f]);
        EXPECT_EQ(info.fBestFitStat, 0.0);
        EXPECT_TRUE(MCMV::IsMissing(info.fBestFitPValue));
        const auto& element = info.fDistElements[kDistCategorical];
        EXPECT_EQ(element.fDistParamNames, fitref::kFactorCategories[f]);
        EXPECT_EQ(element.fInitParams, element.fDistParams);
    }
    // The contingency table of the three factors.
    std::vector<std::vector<std::string>> cells;
    for (const auto& codes : fitref::kCellCodes) {
        cells.emplace_back();
        for (std::size_t f = 0; f < codes.size(); ++f) {
            cells.back().push_back(
                fitref::kFactorCategories[f][static_cast<std::size_t>(codes[f])]);
        }
    }
    EXPECT_EQ(results.GetCrstabsMatrix(), cells);
    ExpectVectorNear(results.GetCrstabsProbs(), fitref::kCellProbs, kStatTol, "cells");
}

// Integer weights equal repeated rows; the case limit applies to both passes; a second build
// does not count twice.
TEST(FittingInvariants, IntegerWeightsEqualRepeatedRows) {
    Rows weighted, repeated;
    for (auto row : fitref::kRows) {
        const double w = row[fitref::kWeightVar];
        if (MCMV::IsMissing(w) || w <= 0.0) {
            continue;
        }
        row[fitref::kWeightVar] = std::floor(w);
        weighted.push_back(row);
        row[fitref::kWeightVar] = 1.0;
        repeated.insert(repeated.end(), static_cast<std::size_t>(std::floor(w)), row);
    }
    FitRun a = Reference(weighted, ReferenceSettings(true));
    FitRun b = Reference(repeated, ReferenceSettings(false));
    ASSERT_TRUE(a.Build().IsOK() && b.Build().IsOK());
    ExpectSameResults(a, b, kStatTol, 1e-4);
}

TEST(FittingInvariants, CaseLimitAppliesToBothPassesAndRebuildsDoNotCountTwice) {
    for (int limit : {1, 10, 20, 47}) {
        SCOPED_TRACE("limit " + std::to_string(limit));
        DFCSettings limited = ReferenceSettings();
        limited.SetNCases(limit);
        FitRun a = Reference(fitref::kRows, limited);
        FitRun b = Reference(Rows(fitref::kRows.begin(), fitref::kRows.begin() + limit));
        const MCStatus sa = a.Build();
        EXPECT_EQ(sa, b.Build());
        if (!sa.IsError()) {
            EXPECT_EQ(a.Algo().GetNRecords(), limit);
            EXPECT_EQ(a.Algo().GetNValidRecords(), b.Algo().GetNValidRecords());
            ExpectSameResults(a, b, 0.0, 0.0);
        }
    }
    FitRun run = Reference(fitref::kRows);
    ASSERT_TRUE(run.Build().IsOK());
    const int warnings = run.CountWarnings(MCSPStatus::kDistDropped);
    ASSERT_EQ(run.Data().Restart(), 0);
    EXPECT_TRUE(run.Build().IsOK());
    EXPECT_EQ(run.Algo().GetNRecords(), fitref::kNRecords);
    EXPECT_NEAR_REL(run.Algo().GetValidWeight(), fitref::kValidWeight, kStatTol);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kDistDropped), warnings);
}

// Support checks of one covariate: candidates dropped with warning 390004 once per type, and
// those that received an initial estimate.
struct SupportCase {
    const char* fName;
    std::vector<double> fValues, fWeights; //!< no weights: no weight variable
    MeasureLevel fLevel;
    std::vector<int> fAllowed, fDropped, fRemaining;
};

class SupportChecks : public ::testing::TestWithParam<SupportCase> {};

TEST_P(SupportChecks, DropCandidatesOutsideTheirSupportOncePerType) {
    const SupportCase& c = GetParam();
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, Types(c.fAllowed), c.fLevel, false), 1);
    if (!c.fWeights.empty()) {
        ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    }
    Rows rows;
    for (std::size_t r = 0; r < c.fValues.size(); ++r) {
        rows.push_back({c.fValues[r], c.fWeights.empty() ? 1.0 : c.fWeights[r]});
    }
    FitRun run(rows, settings);
    ASSERT_TRUE(run.Build().IsOK());
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kDistDropped), static_cast<int>(c.fDropped.size()));
    for (int k : c.fDropped) {
        EXPECT_FALSE(run.Algo().GetOutCovarDistInfo(0, static_cast<DistType>(k)).fbDistAllowed)
            << "type " << k;
    }
    std::vector<int> remaining;
    for (int k = 0; k < kNFitDistTypes; ++k) {
        if (!run.Algo().GetOutCovarDistInfo(0, static_cast<DistType>(k)).fInitParams.empty()) {
            remaining.push_back(k);
        }
    }
    EXPECT_EQ(remaining, c.fRemaining);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, SupportChecks, ::testing::Values(
    // name, values, weights, level; allowed, dropped with a warning, with an estimate
    // Normal keeps its estimate but the chi-square step drops it: no count bin remains.
    SupportCase{"HalfLosesTheCounts", {1.0, 2.0, 2.5, 3.0}, {}, kLevelOrdinal,
                {0, 1, 4, 5}, {0, 1, 4, 5}, {4}},
    SupportCase{"ZeroLosesLogNormalAndGamma", {0.0, 1.0, 2.0, 3.5}, {}, kLevelContinuous,
                {3, 9, 11}, {3, 9}, {11}},
    // Triangular and Uniform keep one value inside their support: too few for the EDF tests.
    SupportCase{"NegativeLosesPositiveTypes", {-1.0, 0.5, 2.0}, {}, kLevelContinuous,
                {3, 4, 6, 7, 8, 9, 10, 11}, {3, 6, 7, 8, 9, 10, 11}, {4, 6, 7}},
    SupportCase{"ProportionsKeepBeta", {0.2, 0.5, 0.9}, {}, kLevelContinuous, {4, 10}, {}, {4, 10}},
    SupportCase{"OneLosesBeta", {0.2, 1.0, 0.4}, {}, kLevelContinuous, {10}, {10}, {}},
    SupportCase{"RepeatedFailuresWarnOnce", {2.5, 3.5, 4.5, 5.5}, {}, kLevelOrdinal, {5}, {5}, {}},
    SupportCase{"OverdispersedLosesBinomial", {0.0, 0.0, 5.0, 5.0}, {}, kLevelOrdinal,
                {0, 5}, {0}, {5}},
    // Triangular drops with a warning in the pass, the others silently as constant.
    SupportCase{"ConstantLosesEverything", {3.0, 3.0, 3.0}, {}, kLevelContinuous,
                {4, 6, 7}, {6}, {}},
    // W = 0.7: no variance with divisor W - 1, so no Gamma estimate; too little weight for
    // the EDF tests of the others.
    SupportCase{"UnderOneWeightUnitNoVariance", {1.0, 2.0}, {0.3, 0.4}, kLevelContinuous,
                {4, 7, 9}, {4, 7, 9}, {4, 7}}),
    ByName());
// clang-format on

MCVarList FactorVariables(int nFactors) {
    MCVarList vars;
    vars.Add(std::make_unique<MCScaleVar>("w"));
    for (int f = 0; f < nFactors; ++f) {
        vars.Add(std::make_unique<MCCatVar>(
            "f" + std::to_string(f), MCCatNumEncoder(std::vector<std::string>{"lo", "mid", "hi"})));
    }
    return vars;
}

TEST(FittingFactors, CodesRoundHalfUpAndValuesAtMinusHalfAreInvalid) {
    DFCSettings settings;
    ASSERT_EQ(settings.AddFactor(1, 3, {kDistCategorical}, kLevelCategorical, false), 1);
    ASSERT_TRUE(settings.SetFrequencyWeightVar(0));
    // A value too large for a category code (1e300 would overflow int) has no category.
    const Rows rows = {{1.0, -0.4},    {1.0, 0.4},      {2.0, 1.5},  {1.0, -0.5},
                       {1.0, 0.49999}, {1.0, kMissing}, {1.0, 1e300}};
    FitRun run(rows, settings, FactorVariables(1));
    ASSERT_TRUE(run.Build().IsOK());
    EXPECT_EQ(run.Algo().GetNInvalidRecords(), 3);
    const auto& info = run.Results().GetFactorDistInfo()[0];
    EXPECT_EQ(info.fCategoryCounts, (std::vector<double>{3.0, 0.0, 2.0}));
    ExpectVectorNear(info.fDistBestParams, {0.6, 0.0, 0.4}, 1e-15, "probabilities");
    EXPECT_EQ(info.fDistBestParamNames, (std::vector<std::string>{"lo", "mid", "hi"}));
}

TEST(FittingFactors, ContingencyTableNeedsTwoFactorsAndTheSwitch) {
    const Rows rows = {{1.0, 0.0, 1.0}, {1.0, 1.0, 1.0}, {2.0, 0.0, 1.0}};
    for (const auto& [nFactors, crosstabs, expectedCells] :
         std::vector<std::tuple<int, bool, std::size_t>>{
             {2, true, 2}, {2, false, 0}, {1, true, 0}}) {
        DFCSettings settings;
        for (int f = 0; f < nFactors; ++f) {
            ASSERT_GT(settings.AddFactor(f + 1, 3, {kDistCategorical}, kLevelCategorical, false),
                      0);
        }
        ASSERT_TRUE(settings.SetFrequencyWeightVar(0));
        settings.SetUseCrosstabs(crosstabs);
        FitRun run(rows, settings, FactorVariables(2));
        ASSERT_TRUE(run.Build().IsOK());
        EXPECT_EQ(run.Results().GetCrstabsMatrix().size(), expectedCells);
        EXPECT_EQ(run.Results().GetCrstabsProbs().size(), expectedCells);
        if (expectedCells == 2) {
            EXPECT_EQ(run.Results().GetCrstabsMatrix(),
                      (std::vector<std::vector<std::string>>{{"lo", "mid"}, {"mid", "mid"}}));
            EXPECT_EQ(run.Results().GetCrstabsProbs(), (std::vector<double>{0.75, 0.25}));
        }
    }
}

TEST(FittingCovariates, ConstantCovariateCorrelatesWithNothingAndHasNoHistogram) {
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {kDistNormal}, kLevelContinuous, false), 1);
    ASSERT_EQ(settings.AddCovariate(1, {kDistNormal, kDistTriangular}, kLevelContinuous, false), 2);
    FitRun run({{1.0, 4.0}, {2.0, 4.0}, {4.0, 4.0}}, settings);
    ASSERT_TRUE(run.Build().IsOK());
    const auto& corr = run.Results().GetCorrMatrix();
    EXPECT_TRUE(corr.GetElem(0, 0) == 1.0 && corr.GetElem(1, 1) == 1.0);
    EXPECT_TRUE(MCMV::IsMissing(corr.GetElem(1, 0)));
    EXPECT_NE(run.Algo().GetCovariateHistogram(0), nullptr);
    EXPECT_EQ(run.Algo().GetCovariateHistogram(1), nullptr);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kDistDropped), 1); // Triangular; Normal silently
    EXPECT_FALSE(run.Algo().GetOutCovarDistInfo(1, kDistNormal).fbDistAllowed);
}

TEST(FittingCovariates, InfiniteValuesAndWeightsMakeARecordInvalid) {
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {kDistNormal}, kLevelContinuous, false), 1);
    ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    const double inf = std::numeric_limits<double>::infinity();
    FitRun run({{1.0, 1.0}, {inf, 1.0}, {3.0, inf}, {5.0, 2.0}}, settings);
    ASSERT_TRUE(run.Build().IsOK());
    EXPECT_EQ(run.Algo().GetNInvalidRecords(), 2);
    EXPECT_EQ(run.Algo().GetInvalidWeight(), 1.0);
    const DFCMomentInputs m = run.Algo().GetCovariateMoments(0);
    EXPECT_NEAR_REL(m.fMean, 11.0 / 3.0, 1e-15);
    EXPECT_NEAR_REL(m.fVariance, (1.0 * 64.0 / 9.0 + 2.0 * 16.0 / 9.0) / 2.0, 1e-14);
}

//! The reference records; when record `cancelAt` (from 1, across passes) is fetched, another
//! thread cancels the algorithm.
class CancellingIter : public MultiPassRecordIter {
public:
    CancellingIter(int cancelAt, DFCAlgorithm& algorithm)
        : fData(ToRecords(fitref::kRows)), fCancelAt(cancelAt), fAlgorithm(algorithm) {}
    bool HasMore() override { return fData.HasMore(); }
    const Record* NextRecord() override {
        if (++fFetched == fCancelAt) {
            std::thread([this]() { fAlgorithm.Cancel(); }).join();
        }
        return fData.NextRecord();
    }
    int Restart() override { return fData.Restart(); }
    int fFetched = 0;

private:
    MCMemoryRecordIter fData;
    int fCancelAt;
    DFCAlgorithm& fAlgorithm;
};

class CancelDuringPass : public ::testing::TestWithParam<int> {};

TEST_P(CancelDuringPass, EndsThePassWithStatusOne) {
    const MCVarList vars = ReferenceVariables();
    const DFCSettings settings = ReferenceSettings();
    DFCAlgorithm algorithm(settings, vars);
    CancellingIter data(GetParam(), algorithm);
    EXPECT_EQ(algorithm.BuildModel(data, nullptr), MCStatus(MCSPStatus::kCancelled, false));
    EXPECT_EQ(data.fFetched, GetParam()); // the pass stops before the next record
    EXPECT_FALSE(algorithm.IsModelBuilt());
    DFCOutputStats elsewhere(settings, vars);
    DFCOutputStats* out = &elsewhere;
    EXPECT_TRUE(algorithm.GetOutputStats(out).IsError());
    EXPECT_EQ(out, nullptr);
}

// Record 5 of the first pass, record 10 of the second.
INSTANTIATE_TEST_SUITE_P(Passes, CancelDuringPass,
                         ::testing::Values(5, static_cast<int>(fitref::kRows.size()) + 10));

class CancelAfter : public MCCommon_800::MCQueryCancel {
public:
    explicit CancelAfter(int polls) : fPolls(polls) {}
    bool IsCancelled() const override { return ++fCount > fPolls; }

private:
    int fPolls;
    mutable std::atomic<int> fCount{0};
};

TEST(FittingCancel, HostCancelQueryIsPolledBeforeEachRecord) {
    CancelAfter query(7);
    DFCSettings settings = ReferenceSettings();
    settings.SetCancelPointer(&query);
    FitRun run = Reference(fitref::kRows, settings);
    EXPECT_EQ(run.Build().GetErrorCode(), MCSPStatus::kCancelled);
    EXPECT_EQ(run.Algo().GetNRecords(), 7);
}

//! An iterator whose records or restarts fail on request.
class FailingIter : public MultiPassRecordIter {
public:
    FailingIter(bool nullRecord, bool failRestart)
        : fData(ToRecords(fitref::kRows)), fbNullRecord(nullRecord), fbFailRestart(failRestart) {}
    bool HasMore() override { return fData.HasMore(); }
    const Record* NextRecord() override {
        const Record* record = fData.NextRecord();
        return fbNullRecord ? nullptr : record;
    }
    int Restart() override { return fbFailRestart ? 1 : fData.Restart(); }

private:
    MCMemoryRecordIter fData;
    bool fbNullRecord, fbFailRestart;
};

TEST(FittingFailures, EachFailureIsNoDataAndNothingIsBuilt) {
    const MCVarList vars = ReferenceVariables();
    const DFCSettings settings = ReferenceSettings();
    Rows allInvalid = fitref::kRows;
    for (auto& row : allInvalid) {
        row[fitref::kWeightVar] = 0.0;
    }
    std::vector<std::pair<const char*, std::unique_ptr<MultiPassRecordIter>>> cases;
    cases.emplace_back("no records", std::make_unique<MCMemoryRecordIter>());
    cases.emplace_back("no valid record",
                       std::make_unique<MCMemoryRecordIter>(ToRecords(allInvalid)));
    cases.emplace_back("read failure", std::make_unique<FailingIter>(true, false));
    cases.emplace_back("restart failure", std::make_unique<FailingIter>(false, true));
    for (auto& [name, data] : cases) {
        SCOPED_TRACE(name);
        DFCAlgorithm algorithm(settings, vars);
        const MCStatus status = algorithm.BuildModel(*data, nullptr);
        EXPECT_EQ(status, MCStatus(MCSPStatus::kNoData, false));
        EXPECT_FALSE(algorithm.IsModelBuilt());
        EXPECT_EQ(algorithm.GetStatus(), status);
        // A failed object stays failed.
        MCMemoryRecordIter good(ToRecords(fitref::kRows));
        EXPECT_EQ(algorithm.BuildModel(good, nullptr), status);
    }
}

TEST(FittingContract, ResultsBeforeTheBuildAreRefusedWithoutSpoilingTheBuild) {
    FitRun run = Reference(fitref::kRows);
    DFCOutputStats* out = nullptr;
    EXPECT_EQ(run.Algo().GetOutputStats(out).GetErrorCode(), MCSPStatus::kNoData);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(run.Algo().GetStatus().GetErrorCode(), MCSPStatus::kNoData);
    std::ostringstream os;
    EXPECT_EQ(run.Algo().ExportModel(os, nullptr).GetErrorCode(), MCSPStatus::kModelNotBuilt);
    EXPECT_EQ(run.Algo().ExportStatXML(os).GetErrorCode(), MCSPStatus::kModelNotBuilt);

    ASSERT_TRUE(run.Build().IsOK());
    EXPECT_TRUE(run.Algo().GetOutputStats(out).IsOK());
    EXPECT_NE(out, nullptr);
    EXPECT_TRUE(run.Algo().ExportModel(os, nullptr).IsOK());
    EXPECT_TRUE(os.str().empty());
    os.setstate(std::ios::badbit);
    EXPECT_EQ(run.Algo().ExportStatXML(os).GetErrorCode(), MCSPStatus::kBadStream);
}

TEST(FittingContract, SettingsWarningsAreReportedAndTheirErrorsEndTheBuild) {
    DFCSettings settings = ReferenceSettings();
    settings.GetWarningMessages().AddWarning(MCStatus(777, true), 0);
    FitRun warned = Reference(fitref::kRows, settings);
    EXPECT_TRUE(warned.Build().IsOK());
    EXPECT_EQ(warned.CountWarnings(777), 1);

    settings.GetWarningMessages().AddWarning(MCStatus(778, false), 0);
    FitRun failed = Reference(fitref::kRows, settings);
    EXPECT_EQ(failed.Build(), MCStatus(778, false));
    EXPECT_EQ(failed.Algo().GetNRecords(), 0);
}

} // namespace
