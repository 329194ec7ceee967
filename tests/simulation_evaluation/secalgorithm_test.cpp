// The simulation driver end to end: scoring, target statistics, sensitivity measures, stop
// criteria, worker threads, the case sink, the host-driven way, and failures.
//
// The reference model is linear in independent inputs, t = 1 + 2·x0 − 3·x1 + e(region) with
// x0 ~ Normal(10, 2), x1 ~ Uniform(0, 4) and a category effect e of (0, 5, −3) for north, south
// and west (probabilities 0.5, 0.3, 0.2). Its mean is 15.9 and its variance
// 4·4 + 9·16/12 + Var(e) = 16 + 12 + 8.49 = 36.49; a delta of d standard deviations moves t by
// exactly ±a_k·d·s_k, and input k's share of the variance is a_k²·Var(x_k)/36.49.
#include "simulation_evaluation/secalgorithm.h"
#include "simulation_evaluation/secpolycorrtask.h"
#include "simulation_evaluation/secsimulator.h"

#include "data/simgen_plans.h"
#include "data/test_scorers.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cmath>
#include <cstring>
#include <thread>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCXML_800::IMCScoreComputer;
using scorers::LinearTarget;

namespace {

constexpr double kTrueMean = 15.9;
constexpr double kTrueVariance = 36.49;

//! The reference plan and a driver around it.
struct LinearRun {
    simgen::TestPlan tp;
    MCThread_800::MCStdThreadFactory threads;
    scorers::ScoreCounter counter;
    std::unique_ptr<SECAlgorithm> alg;

    //! The reference plan; or `inputs` in place of x0 and x1.
    LinearRun(int nThreads, std::uint32_t seed, int cases) {
        tp.settings.SetThreadFactory(&threads);
        tp.settings.SetMaxThreadNum(nThreads);
        tp.settings.SetSeed(seed);
        tp.plan.SetMaxCases(cases);
        tp.AddInput("x0", simgen::MakeDist(kDistNormal, {{"mean", 10.0}, {"stddev", 2.0}}));
        tp.AddInput("x1", simgen::MakeDist(kDistUniform, {{"min", 0.0}, {"max", 4.0}}));
        AddRegionAndTarget();
    }
    LinearRun(int nThreads, std::uint32_t seed, int cases,
              const std::vector<std::pair<std::string, std::vector<DistInfoElem>>>& inputs) {
        tp.settings.SetThreadFactory(&threads);
        tp.settings.SetMaxThreadNum(nThreads);
        tp.settings.SetSeed(seed);
        tp.plan.SetMaxCases(cases);
        for (const auto& input : inputs) {
            tp.AddInput(input.first, input.second);
        }
        AddRegionAndTarget();
    }
    void AddRegionAndTarget() {
        tp.AddInput("region", simgen::MakeCategorical({"north", "south", "west"}, {0.5, 0.3, 0.2}),
                    kLevelCategorical);
        SPCSettings::ModelFileTarget target;
        target.fName = "t";
        tp.plan.AddModelTarget(target);
    }

    static LinearTarget Model() {
        LinearTarget t;
        t.fName = "t";
        t.fIntercept = 1.0;
        t.fvCoefs = {{"x0", 2.0}, {"x1", -3.0}};
        t.fEffectInput = "region";
        t.fEffects = {{"north", 0.0}, {"south", 5.0}, {"west", -3.0}};
        return t;
    }

    //! Creates the algorithm and builds its model.
    void Build() {
        alg = std::make_unique<SECAlgorithm>(tp.settings, tp.plan, tp.vars);
        MCCommon_800::MCMemoryRecordIter data({MCXML_800::Record(1)});
        EXPECT_TRUE(alg->BuildModel(data, nullptr).IsOK());
    }

    //! Runs the component-driven simulation of the built algorithm with `factory` (default:
    //! the linear model as a regression "prediction").
    MCStatus Simulate(MCXML_800::IMCSPScoreFactory* factory = nullptr,
                      MCXML_800::SECAppDataProcess* sink = nullptr) {
        auto linear = scorers::MakeFactory([this]() -> std::unique_ptr<IMCScoreComputer> {
            return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{Model()},
                                                           IMCScoreComputer::kRegression, &counter);
        });
        return alg->SimulateData(factory != nullptr ? factory : &linear, sink);
    }

    MCStatus Run(MCXML_800::IMCSPScoreFactory* factory = nullptr,
                 MCXML_800::SECAppDataProcess* sink = nullptr) {
        Build();
        return Simulate(factory, sink);
    }

    const SECOutputStats& Results(std::size_t iteration = 0) const {
        std::vector<SECOutputStats*> all;
        EXPECT_TRUE(alg->GetOutputStats(all).IsOK());
        EXPECT_LT(iteration, all.size());
        return *all.at(iteration);
    }
    const SECContinuousTargetInfo& Target() const { return Results().GetContTargetInfo().at(0); }
};

//! Equal bit for bit, missing values included.
bool SameBits(const std::vector<double>& a, const std::vector<double>& b) {
    return a.size() == b.size() &&
           (a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof(double)) == 0);
}

//! Builds `alg` and runs it with `factory` and `sink`; its single results, or null when a step
//! fails.
SECOutputStats* BuildAndSimulate(SECAlgorithm& alg, MCXML_800::IMCSPScoreFactory& factory,
                                 MCXML_800::SECAppDataProcess* sink = nullptr) {
    MCCommon_800::MCMemoryRecordIter data({MCXML_800::Record(1)});
    SECOutputStats* res = nullptr;
    if (!alg.BuildModel(data, nullptr).IsOK() || !alg.SimulateData(&factory, sink).IsOK() ||
        !alg.GetOutputStats(res).IsOK()) {
        return nullptr;
    }
    return res;
}

//! Collects what a sink receives.
struct CollectingSink : MCXML_800::SECAppDataProcess {
    int fBegins = 0;
    std::vector<std::string> fNames;
    int fNProbs = -1;
    long long fCases = 0;
    double fTargetSum = 0.0;
    std::size_t fValuesPerCase = 0;
    void BeginData(const std::vector<std::string>& names, int nProbs, int) override {
        ++fBegins;
        fNames = names;
        fNProbs = nProbs;
    }
    void AddCase(const std::vector<double>&, const std::vector<double>& targets, int) override {
        ++fCases;
        fTargetSum += targets.at(0);
        fValuesPerCase = targets.size();
    }
};

} // namespace

// ---- The algorithm contract
// ----------------------------------------------------------------------

TEST(SECAlgorithmContract, BuildModelResultsAndExport) {
    LinearRun run(1, 7u, 100);
    SECAlgorithm alg(run.tp.settings, run.tp.plan, run.tp.vars);
    std::ostringstream os;
    EXPECT_EQ(alg.ExportModel(os, nullptr).GetErrorCode(), MCSPStatus::kModelNotBuilt);
    EXPECT_EQ(alg.GetComponentVersion().rfind("Simulation Component Ver. 1.0", 0), 0u);
    SECOutputStats* out = reinterpret_cast<SECOutputStats*>(&alg);
    EXPECT_EQ(alg.GetOutputStats(out).GetErrorCode(), MCSPStatus::kNoData);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(alg.SimulateData(nullptr, nullptr).GetErrorCode(), MCSPStatus::kModelNotBuilt);

    MCCommon_800::MCMemoryRecordIter empty;
    EXPECT_EQ(alg.BuildModel(empty, nullptr).GetErrorCode(), MCSPStatus::kNoData);
    EXPECT_FALSE(alg.IsModelBuilt());

    ASSERT_TRUE(run.Run().IsOK());
    EXPECT_TRUE(run.alg->GetOutputStats(out).IsOK());
    EXPECT_EQ(out, &run.Results());
    EXPECT_TRUE(run.alg->ExportModel(os, nullptr).IsOK());
    EXPECT_EQ(out->GetModelType(), IMCScoreComputer::kRegression);
    std::ostringstream display;
    run.alg->Display(display);
    EXPECT_NE(display.str().find("SECSimulator display start"), std::string::npos);
}

// ---- Target statistics --------------------------------------------------------------------------

TEST(LinearModel, StatisticsAgreeWithTheModel) {
    LinearRun run(2, 11u, 200000);
    ASSERT_TRUE(run.Run().IsOK());
    const SECOutputStats& res = run.Results();
    EXPECT_EQ(res.GetSimCaseCount(), 200000);
    EXPECT_EQ(res.GetValidCaseCount(), 200000);
    EXPECT_EQ(res.GetInvalidCaseCount() + res.GetFilteredCaseCount(), 0);
    EXPECT_FALSE(res.GetStopCriteria());
    const SECContinuousTargetInfo& t = run.Target();
    EXPECT_NEAR(t.fMean, kTrueMean, 4.0 * std::sqrt(kTrueVariance / 200000.0));
    EXPECT_NEAR_REL(t.fStdDev, std::sqrt(kTrueVariance), 0.01);
    EXPECT_NEAR(t.fCiUpper - t.fMean, 1.959964 * t.fStdDev / std::sqrt(200000.0), 1e-9);
    EXPECT_NEAR(t.fMean - t.fCiLower, t.fCiUpper - t.fMean, 1e-12);
    EXPECT_LE(t.fMinimum, t.fMean);
    EXPECT_GE(t.fMaximum, t.fMean);
    EXPECT_DOUBLE_EQ(t.fHistogram.GetTotalWeight(), 200000.0);
    EXPECT_EQ(t.fHistogram.GetNBins(), 1000);
    // Correlation of t with x0: 2·2/√36.49; with x1: −3·(4/√12)/√36.49.
    ASSERT_EQ(t.fvPearsonCorrs.size(), 2u);
    EXPECT_NEAR(t.fvPearsonCorrs[0], 4.0 / std::sqrt(kTrueVariance), 0.01);
    EXPECT_NEAR(t.fvPearsonCorrs[1], -3.0 * 4.0 / std::sqrt(12.0) / std::sqrt(kTrueVariance), 0.01);
    EXPECT_NEAR(res.GetSimulCorr().GetElem(1, 0), 0.0, 0.01);
    EXPECT_EQ(res.GetCovarStats().size(), 2u);
    // Both measures off: every case scored once, plus the 1000 pilot cases.
    EXPECT_EQ(run.counter.fCount.load(), 200000 + 1000);
}

TEST(LinearModel, ConfidenceIntervalsCoverTheMeanAtTheirLevel) {
    int covered = 0;
    constexpr int kRuns = 200;
    for (int seed = 1; seed <= kRuns; ++seed) {
        LinearRun run(1, static_cast<std::uint32_t>(seed), 500);
        run.tp.settings.SetCiLevel(0.9);
        ASSERT_TRUE(run.Run().IsOK());
        const SECContinuousTargetInfo& t = run.Target();
        covered += t.fCiLower <= kTrueMean && kTrueMean <= t.fCiUpper ? 1 : 0;
    }
    // 90 % intervals: the count is Binomial(200, 0.9), sd 4.2.
    EXPECT_GE(covered, 165);
    EXPECT_LE(covered, 195);
}

TEST(LinearModel, TornadoDeltasAndVarianceContributions) {
    LinearRun run(2, 5u, 100000);
    run.tp.settings.SetTornadoDeltaStddev(1.5);
    run.tp.settings.SetTornadoVariance(true);
    ASSERT_TRUE(run.Run().IsOK());
    const SECContinuousTargetInfo& t = run.Target();
    const double s1 = 4.0 / std::sqrt(12.0);
    ASSERT_EQ(t.fvPositiveDelta.size(), 2u);
    EXPECT_NEAR(t.fvPositiveDelta[0], 2.0 * 1.5 * 2.0, 1e-9);
    EXPECT_NEAR(t.fvNegativeDelta[0], -2.0 * 1.5 * 2.0, 1e-9);
    EXPECT_NEAR(t.fvPositiveDelta[1], -3.0 * 1.5 * s1, 1e-9);
    EXPECT_NEAR(t.fvNegativeDelta[1], 3.0 * 1.5 * s1, 1e-9);
    EXPECT_NEAR(t.fvVarianceContrib[0], 16.0 / kTrueVariance, 0.03);
    EXPECT_NEAR(t.fvVarianceContrib[1], 12.0 / kTrueVariance, 0.03);
    // Each case: once, x0 shifted both ways, x1 shifted where it stays inside [0, 4], once
    // for the further case, once per input of the variance measure.
    const std::int64_t x1Shifts =
        t.fvPositiveDeltaStats[1].GetCount() + t.fvNegativeDeltaStats[1].GetCount();
    EXPECT_EQ(run.counter.fCount.load(), 1000 + 100000LL * (1 + 2 + 1 + 2) + x1Shifts);
    EXPECT_EQ(t.fvDeltaSkipped[0], 0);
    // x1 ± 1.5·(4/√12) leaves [0, 4] on one side unless 1.73 ≤ x1 ≤ 2.27 (both sides fit).
    EXPECT_NEAR(static_cast<double>(t.fvDeltaSkipped[1]), 100000.0 * (1.0 - 0.134), 700.0);
    EXPECT_EQ(t.fvVarianceSkipped, (std::vector<std::int64_t>{0, 0}));
}

TEST(LinearModel, SensitivityMeasuresNeverChangeTheBaseRun) {
    // x1 shifted by 1.5 standard deviations leaves its range for most cases, and the model
    // fails on a tenth of all inputs (base cases and variants alike): the base results stay bit
    // for bit those of a run without the measures, on one thread and on two.
    for (const int threads : {1, 2}) {
        LinearRun off(threads, 23u, 20000);
        LinearRun on(threads, 23u, 20000);
        on.tp.settings.SetTornadoDeltaStddev(1.5);
        on.tp.settings.SetTornadoVariance(true);
        on.tp.settings.SetQuantilesAndIndices(true);
        off.tp.settings.SetQuantilesAndIndices(true);
        auto failing = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
            return std::make_unique<scorers::FailingScorer>(
                std::vector<LinearTarget>{LinearRun::Model()}, 0.1, -1);
        });
        ASSERT_TRUE(off.Run(&failing).IsOK());
        ASSERT_TRUE(on.Run(&failing).IsOK());
        const SECContinuousTargetInfo& a = off.Target();
        const SECContinuousTargetInfo& b = on.Target();
        EXPECT_EQ(on.Results().GetValidCaseCount(), off.Results().GetValidCaseCount());
        EXPECT_EQ(on.Results().GetInvalidCaseCount(), off.Results().GetInvalidCaseCount());
        EXPECT_GT(b.fvDeltaSkipped[0], 0); // x0 shifted: the model fails on some variants
        EXPECT_GT(b.fvVarianceSkipped[0], 0);
        EXPECT_TRUE(SameBits({a.fMean, a.fStdDev, a.fMinimum, a.fMaximum},
                             {b.fMean, b.fStdDev, b.fMinimum, b.fMaximum}));
        EXPECT_TRUE(SameBits(a.fvPearsonCorrs, b.fvPearsonCorrs));
        EXPECT_EQ(a.fHistogram.GetBinFreqCounts(), b.fHistogram.GetBinFreqCounts());
        EXPECT_EQ(off.Results().GetSimulCorr().GetElem(1, 0),
                  on.Results().GetSimulCorr().GetElem(1, 0));
        EXPECT_GT(b.fvDeltaSkipped[1], 0);
        EXPECT_EQ(b.fQuantiles.GetCount(), on.Results().GetValidCaseCount());
        for (const double q : {0.001, 0.5, 0.999}) {
            EXPECT_EQ(a.fQuantiles.Quantile(q), b.fQuantiles.Quantile(q)) << q;
        }
    }
}

TEST(LinearModel, ATargetIndependentOfAnInputHasNoEffectFromIt) {
    LinearRun run(1, 9u, 50000);
    run.tp.settings.SetTornadoDeltaStddev(1.0);
    run.tp.settings.SetTornadoVariance(true);
    auto onlyX0 = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        LinearTarget t;
        t.fName = "t";
        t.fvCoefs = {{"x0", 1.0}};
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{t},
                                                       IMCScoreComputer::kTransformsOnly, nullptr);
    });
    ASSERT_TRUE(run.Run(&onlyX0).IsOK());
    const SECContinuousTargetInfo& t = run.Target();
    EXPECT_EQ(t.fvPositiveDelta[1], 0.0);
    EXPECT_EQ(t.fvNegativeDelta[1], 0.0);
    EXPECT_NEAR(t.fvVarianceContrib[1], 0.0, 0.03);
    EXPECT_NEAR(t.fvVarianceContrib[0], 1.0, 0.03);
}

TEST(LinearModel, ConstantTargetHasNoVarianceContribution) {
    LinearRun run(1, 9u, 5000);
    run.tp.settings.SetTornadoVariance(true);
    auto constant = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        LinearTarget t;
        t.fName = "t";
        t.fIntercept = 3.0;
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{t},
                                                       IMCScoreComputer::kTransformsOnly, nullptr);
    });
    ASSERT_TRUE(run.Run(&constant).IsOK());
    const SECContinuousTargetInfo& t = run.Target();
    EXPECT_EQ(t.fMean, 3.0);
    EXPECT_TRUE(MCMV::IsMissing(t.fvVarianceContrib[0]));
    EXPECT_TRUE(MCMV::IsMissing(t.fvPearsonCorrs[0]));
}

// ---- Reproducibility and threads --------------------------------------------------------------

TEST(SimulationThreads, SameSeedAndThreadCountGiveIdenticalResults) {
    for (const int threads : {1, 2, 3}) {
        LinearRun a(threads, 42u, 30001);
        LinearRun b(threads, 42u, 30001);
        a.tp.settings.SetTornadoDeltaStddev(1.0);
        b.tp.settings.SetTornadoDeltaStddev(1.0);
        a.tp.settings.SetScatterplotDisplay(true);
        b.tp.settings.SetScatterplotDisplay(true);
        ASSERT_TRUE(a.Run().IsOK());
        ASSERT_TRUE(b.Run().IsOK());
        const SECContinuousTargetInfo& ta = a.Target();
        const SECContinuousTargetInfo& tb = b.Target();
        EXPECT_EQ(a.Results().GetSimCaseCount(), 30001);
        EXPECT_EQ(ta.fMean, tb.fMean) << threads;
        EXPECT_EQ(ta.fStdDev, tb.fStdDev);
        EXPECT_EQ(ta.fMinimum, tb.fMinimum);
        EXPECT_EQ(ta.fvPearsonCorrs, tb.fvPearsonCorrs);
        EXPECT_TRUE(SameBits(ta.fvPositiveDelta, tb.fvPositiveDelta));
        EXPECT_EQ(ta.fHistogram.GetBinFreqCounts(), tb.fHistogram.GetBinFreqCounts());
        EXPECT_TRUE(SameBits(ta.fHistogram.GetBinMeans(), tb.fHistogram.GetBinMeans()));
        ASSERT_EQ(ta.fvScatterPlots.size(), 3u);
        EXPECT_EQ(ta.fvScatterPlots[2].GetCellFreqCounts(),
                  tb.fvScatterPlots[2].GetCellFreqCounts());
        EXPECT_EQ(a.Results().GetSimulCorr().GetElem(1, 0),
                  b.Results().GetSimulCorr().GetElem(1, 0));
    }
}

TEST(SimulationThreads, QuotasAddUpToTheCaseLimit) {
    LinearRun run(3, 1u, 10);
    ASSERT_TRUE(run.Run().IsOK());
    EXPECT_EQ(run.Results().GetSimCaseCount(), 10);
    EXPECT_EQ(run.Results().GetValidCaseCount(), 10);
    EXPECT_EQ(run.alg->GetSimulatedCaseCount(), 10);
}

TEST(SimulationThreads, SinkReceivesEveryGoodCaseUnderTheLock) {
    for (const int threads : {1, 3}) {
        LinearRun run(threads, 3u, 25000);
        CollectingSink sink;
        ASSERT_TRUE(run.Run(nullptr, &sink).IsOK());
        EXPECT_EQ(sink.fBegins, 1);
        EXPECT_EQ(sink.fNames, std::vector<std::string>{"t"});
        EXPECT_EQ(sink.fNProbs, 0);
        EXPECT_EQ(sink.fCases, 25000);
        EXPECT_NEAR_REL(sink.fTargetSum / 25000.0, run.Target().fMean, 1e-9);
    }
}

TEST(SimulationCancel, FromAnotherThreadEndsWithStatus1AndMergedResults) {
    LinearRun run(2, 8u, 50000000);
    run.Build();
    SECAlgorithm* alg = run.alg.get();
    std::thread canceller([alg]() {
        while (alg->GetSimulatedCaseCount() < 20000) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        alg->Cancel();
    });
    const MCStatus status = run.Simulate();
    canceller.join();
    EXPECT_EQ(status.GetErrorCode(), MCSPStatus::kCancelled);
    const SECOutputStats& res = run.Results();
    EXPECT_GE(res.GetValidCaseCount(), 20000);
    EXPECT_LT(res.GetValidCaseCount(), 50000000);
    EXPECT_EQ(run.Target().fContStats.GetSumFreqWeights(), res.GetValidCaseCount());
    EXPECT_NEAR(run.Target().fMean, kTrueMean, 0.3);
}

// ---- Stop criteria
// --------------------------------------------------------------------------------

TEST(StopCriteria, PointValueNeverStopsBefore1000Weights) {
    LinearRun loose(4, 2u, 100000);
    loose.tp.plan.SetStopCriteriaMean("t", 1e9, kUnitValue, 0.95);
    ASSERT_TRUE(loose.Run().IsOK());
    EXPECT_EQ(loose.Results().GetValidCaseCount(), 1000);
    EXPECT_TRUE(loose.Results().GetStopCriteria());

    // 1 % of the mean at 95 %: h = 1.96·6.04/√n <= 0.159 from n of about 5550 on.
    LinearRun relative(4, 2u, 100000);
    relative.tp.plan.SetStopCriteriaMean("t", 1.0, kUnitPercent, 0.95);
    ASSERT_TRUE(relative.Run().IsOK());
    EXPECT_TRUE(relative.Results().GetStopCriteria());
    EXPECT_NEAR(relative.Results().GetValidCaseCount(), 5550, 500);

    LinearRun never(1, 2u, 3000);
    never.tp.plan.SetStopCriteriaMean("t", 0.0, kUnitValue, 0.95);
    ASSERT_TRUE(never.Run().IsOK());
    EXPECT_EQ(never.Results().GetValidCaseCount(), 3000);
    EXPECT_FALSE(never.Results().GetStopCriteria());
}

TEST(StopCriteria, APlanWithACriterionRunsOnOneThread) {
    LinearRun four(4, 6u, 4000);
    LinearRun one(1, 6u, 4000);
    four.tp.plan.SetStopCriteriaMean("t", 0.0, kUnitValue, 0.95);
    one.tp.plan.SetStopCriteriaMean("t", 0.0, kUnitValue, 0.95);
    ASSERT_TRUE(four.Run().IsOK());
    ASSERT_TRUE(one.Run().IsOK());
    EXPECT_EQ(four.Target().fMean, one.Target().fMean);
}

TEST(StopCriteria, ValueTailStopsOnceActiveAndCounted) {
    // Active once 0.95 % of the mean (0.151) exceeds 1.96·6.04/√n, near n = 6100; by then far
    // more than 50 values lie above 25.
    LinearRun run(1, 4u, 100000);
    run.tp.plan.SetStopCriteriaTails("t", 25.0, kSideRight, kTailValue, 50);
    ASSERT_TRUE(run.Run().IsOK());
    EXPECT_TRUE(run.Results().GetStopCriteria());
    EXPECT_NEAR(run.Results().GetValidCaseCount(), 6100, 600);
}

// ---- Kinds of score
// ------------------------------------------------------------------------------

TEST(ScoreKinds, CategoricalPredictionWithProbabilities) {
    // x ~ Beta(2, 5): P(high) = P(x > 0.5) = 1 − 57/64; mean P(high) = E[x] = 2/7.
    for (const bool probs : {true, false}) {
        simgen::TestPlan tp;
        MCThread_800::MCStdThreadFactory threads;
        tp.settings.SetThreadFactory(&threads);
        tp.settings.SetMaxThreadNum(2);
        tp.plan.SetMaxCases(100000);
        tp.AddInput("x", simgen::MakeDist(kDistBeta, {{"shape1", 2.0}, {"shape2", 5.0}}));
        auto factory = scorers::MakeFactory([probs]() -> std::unique_ptr<IMCScoreComputer> {
            return std::make_unique<scorers::CategoricalScorer>("x", probs);
        });
        SECAlgorithm alg(tp.settings, tp.plan, tp.vars);
        CollectingSink sink;
        SECOutputStats* res = BuildAndSimulate(alg, factory, &sink);
        ASSERT_NE(res, nullptr);
        ASSERT_EQ(res->GetCateTargetInfo().size(), 1u);
        const SECCategoricalTargetInfo& t = res->GetCateTargetInfo()[0];
        EXPECT_EQ(t.fName, "risk");
        EXPECT_EQ(sink.fNProbs, probs ? 2 : 0);
        EXPECT_EQ(sink.fValuesPerCase, probs ? 3u : 1u);
        ASSERT_EQ(t.fvCatCounts.size(), 2u);
        EXPECT_NEAR(t.fvCatCounts[1] / 100000.0, 7.0 / 64.0, 0.005);
        ASSERT_EQ(t.fvMeanProbs.size(), probs ? 2u : 0u);
        if (probs) {
            EXPECT_NEAR(t.fvMeanProbs[1], 2.0 / 7.0, 0.003);
            EXPECT_NEAR(t.fvMeanProbs[0] + t.fvMeanProbs[1], 1.0, 1e-12);
            EXPECT_DOUBLE_EQ(t.fvProbHistograms.at(1).GetTotalWeight(), 100000.0);
        }
    }
}

TEST(ScoreKinds, ClusterIdentifierIsACategoricalTargetNamedByThePlan) {
    simgen::TestPlan tp;
    tp.plan.SetMaxCases(20000);
    tp.AddInput("x", simgen::MakeDist(kDistUniform, {{"min", 0.0}, {"max", 1.0}}));
    SPCSettings::ModelFileTarget target;
    target.fName = "segment";
    tp.plan.AddModelTarget(target);
    auto factory = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        return std::make_unique<scorers::ClusterScorer>("x", 0.25);
    });
    SECAlgorithm alg(tp.settings, tp.plan, tp.vars);
    SECOutputStats* res = BuildAndSimulate(alg, factory);
    ASSERT_NE(res, nullptr);
    ASSERT_EQ(res->GetCateTargetInfo().size(), 1u);
    const SECCategoricalTargetInfo& t = res->GetCateTargetInfo()[0];
    EXPECT_EQ(t.fName, "segment");
    ASSERT_EQ(t.fvCatCounts.size(), 3u); // clusters 1 and 2
    EXPECT_NEAR(t.fvCatCounts[1] / 20000.0, 0.25, 0.01);
    EXPECT_EQ(res->GetModelType(), IMCScoreComputer::kClustering);
}

TEST(ScoreKinds, TransformationWithTwoTargetsReadsEveryField) {
    LinearRun run(2, 12u, 20000);
    auto two = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        LinearTarget sum;
        sum.fName = "sum";
        sum.fvCoefs = {{"x0", 1.0}, {"x1", 1.0}};
        LinearTarget twice;
        twice.fName = "twice";
        twice.fvCoefs = {{"x0", 2.0}};
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{sum, twice},
                                                       IMCScoreComputer::kTransformsOnly, nullptr);
    });
    ASSERT_TRUE(run.Run(&two).IsOK());
    const std::vector<SECContinuousTargetInfo>& targets = run.Results().GetContTargetInfo();
    ASSERT_EQ(targets.size(), 2u);
    EXPECT_EQ(targets[1].fName, "twice");
    EXPECT_NEAR(targets[0].fMean, 12.0, 0.05);
    EXPECT_NEAR(targets[1].fMean, 20.0, 0.1);
    EXPECT_NEAR(targets[1].fStdDev, 4.0, 0.1);
    // Cross products run over x0, x1, sum, twice: twice is x0 doubled.
    EXPECT_NEAR(targets[1].fvPearsonCorrs[0], 1.0, 1e-9);
    EXPECT_EQ(run.Results().GetModelType(), IMCScoreComputer::kTransformsOnly);
}

TEST(ScoreKinds, TargetFilterRejectsAndCountsFilteredAttempts) {
    LinearRun run(2, 13u, 20000);
    SPCSettings::ModelFileTarget target;
    target.fName = "t";
    target.fbHasTargetFilter = true;
    target.fFilterLow = 15.9;
    run.tp.plan.SetModelTarget(0, target);
    ASSERT_TRUE(run.Run().IsOK());
    const SECOutputStats& res = run.Results();
    EXPECT_EQ(res.GetValidCaseCount(), 20000);
    EXPECT_GE(run.Target().fMinimum, 15.9);
    EXPECT_NEAR(static_cast<double>(res.GetFilteredCaseCount()) / 20000.0, 1.0, 0.05);
    EXPECT_GE(run.Target().fHistogram.GetMinimum(), 15.9);
}

// ---- Scatter-plot budget
// ----------------------------------------------------------------------------

TEST(ScatterBudget, AHundredPlotsOverAllIterations) {
    struct Case {
        int inputs;
        std::vector<int> kept;
        bool warned;
    };
    for (const Case& c : {Case{5, {10, 10, 10}, false}, Case{30, {60, 40, 0}, true}}) {
        simgen::TestPlan tp;
        tp.settings.SetScatterplotDisplay(true);
        for (int i = 0; i < c.inputs; ++i) {
            tp.AddInput("x" + std::to_string(i),
                        simgen::MakeDist(kDistUniform, {{"min", 0.0}, {"max", 1.0}}));
        }
        tp.plan.AddFixedInput("k", std::vector<double>{1.0, 2.0, 3.0}, "");
        for (const char* name : {"a", "b"}) {
            SPCSettings::ModelFileTarget target;
            target.fName = name;
            tp.plan.AddModelTarget(target);
            tp.vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
        }
        for (int iter = 0; iter < 3; ++iter) {
            auto sim = tp.MakeSimulator(iter);
            ASSERT_TRUE(sim->PrepareTargetInfo().IsOK());
            EXPECT_EQ(sim->GetScatterBudget(), c.kept[static_cast<std::size_t>(iter)]) << iter;
            EXPECT_EQ(sim->GetWarnings().HasCode(MCSPStatus::kScatterPlotsLimited),
                      c.warned && iter > 0);
        }
    }
}

// ---- Several sensitivity iterations
// --------------------------------------------------------------

TEST(SensitivityIterations, OneResultPerIteration) {
    LinearRun run(2, 21u, 3000);
    run.tp.plan.AddFixedInput("k", std::vector<double>{1.0, 2.0, 3.0}, "");
    ASSERT_TRUE(run.Run().IsOK());
    EXPECT_EQ(run.alg->GetNIterations(), 3);
    SECOutputStats* single = nullptr;
    EXPECT_EQ(run.alg->GetOutputStats(single).GetErrorCode(), MCSPStatus::kNoData);
    EXPECT_EQ(single, nullptr);
    std::vector<SECOutputStats*> all;
    ASSERT_TRUE(run.alg->GetOutputStats(all).IsOK());
    ASSERT_EQ(all.size(), 3u);
    for (const SECOutputStats* res : all) {
        EXPECT_EQ(res->GetValidCaseCount(), 3000);
        EXPECT_EQ(res->GetSensIteraName(), "k");
    }
    EXPECT_NE(all[0]->GetContTargetInfo()[0].fMean, all[1]->GetContTargetInfo()[0].fMean);
}

// ---- Host-driven way
// --------------------------------------------------------------------------------

TEST(HostDriven, StartupRecordsFixTheRangesThenEveryRecordCounts) {
    LinearRun run(1, 17u, 1000000);
    SECAlgorithm& alg =
        *(run.alg = std::make_unique<SECAlgorithm>(run.tp.settings, run.tp.plan, run.tp.vars));
    MCCommon_800::MCMemoryRecordIter data({MCXML_800::Record(1)});
    ASSERT_TRUE(alg.BuildModel(data, nullptr).IsOK());
    ASSERT_TRUE(alg.PrepareGeneration(-1).IsOK());
    ASSERT_TRUE(alg.PrepareEvaluation(0).IsOK());
    const double effects[] = {0.0, 5.0, -3.0};
    std::vector<double> values;
    for (int i = 0; i < 12000; ++i) {
        ASSERT_TRUE(alg.SimulatePredictors(values, -1).IsOK());
        ASSERT_EQ(values.size(), 3u);
        // Every tenth record has no target: invalid, not accumulated.
        const double t = i % 10 == 9 ? MCMV::Missing()
                                     : 1.0 + 2.0 * values[0] - 3.0 * values[1] +
                                           effects[static_cast<int>(values[2])];
        ASSERT_TRUE(alg.UpdateStatsForRecord(values, {t}, -1).IsOK());
    }
    ASSERT_TRUE(alg.CompleteEvaluation(-1).IsOK());
    const SECOutputStats& res = run.Results();
    EXPECT_EQ(res.GetSimCaseCount(), 10000);
    EXPECT_EQ(res.GetInvalidCaseCount(), 1000);
    EXPECT_EQ(res.GetValidCaseCount(), 9000);
    EXPECT_NEAR(run.Target().fMean, kTrueMean, 0.25);
    EXPECT_DOUBLE_EQ(run.Target().fHistogram.GetTotalWeight(), 9000.0);
}

TEST(HostDriven, TooFewStartupRecordsFail) {
    LinearRun run(1, 17u, 1000);
    SECAlgorithm alg(run.tp.settings, run.tp.plan, run.tp.vars);
    MCCommon_800::MCMemoryRecordIter data({MCXML_800::Record(1)});
    ASSERT_TRUE(alg.BuildModel(data, nullptr).IsOK());
    ASSERT_TRUE(alg.PrepareGeneration(-1).IsOK());
    ASSERT_TRUE(alg.PrepareEvaluation(0).IsOK());
    std::vector<double> values;
    for (int i = 0; i < 1500; ++i) {
        ASSERT_TRUE(alg.SimulatePredictors(values, 0).IsOK());
        ASSERT_TRUE(alg.UpdateStatsForRecord(values, {1.0}, 0).IsOK());
    }
    EXPECT_EQ(alg.CompleteEvaluation(0).GetErrorCode(), MCSPStatus::kBadStream);

    ASSERT_TRUE(alg.PrepareEvaluation(0).IsOK());
    MCStatus last;
    for (int i = 0; i < 2000; ++i) {
        ASSERT_TRUE(alg.SimulatePredictors(values, 0).IsOK());
        last = alg.UpdateStatsForRecord(values, {i < 1200 ? MCMV::Missing() : 1.0}, 0);
    }
    EXPECT_EQ(last.GetErrorCode(), MCSPStatus::kNoValidCase);
}

// ---- Failures
// -------------------------------------------------------------------------------------

TEST(SimulationFailures, ModelErrorsExceptionsAndExhaustedAttempts) {
    const auto failing = [](double share, long long throwAfter) {
        return scorers::MakeFactory([=]() -> std::unique_ptr<IMCScoreComputer> {
            LinearTarget t;
            t.fName = "t";
            t.fvCoefs = {{"x0", 1.0}};
            return std::make_unique<scorers::FailingScorer>(std::vector<LinearTarget>{t}, share,
                                                            throwAfter);
        });
    };
    {
        // One case in a hundred fails: counted invalid, the run goes on.
        LinearRun run(2, 30u, 20000);
        auto f = failing(0.01, -1);
        ASSERT_TRUE(run.Run(&f).IsOK());
        const SECOutputStats& res = run.Results();
        EXPECT_EQ(res.GetSimCaseCount(), 20000);
        EXPECT_EQ(res.GetValidCaseCount() + res.GetInvalidCaseCount(), 20000);
        EXPECT_NEAR(res.GetInvalidCaseCount() / 20000.0, 0.01, 0.004);
    }
    {
        // Most cases fail: the pilot cannot find 1000 valid ones.
        LinearRun run(1, 30u, 20000);
        auto f = failing(0.6, -1);
        EXPECT_EQ(run.Run(&f).GetErrorCode(), MCSPStatus::kNoValidCase);
    }
    {
        LinearRun run(2, 30u, 20000);
        auto f = failing(0.0, 5000);
        EXPECT_EQ(run.Run(&f).GetErrorCode(), MCSPStatus::kLowExpectedOrException);
    }
    {
        // A filter no case passes.
        LinearRun run(1, 30u, 100);
        SPCSettings::ModelFileTarget target;
        target.fName = "t";
        target.fbHasTargetFilter = true;
        target.fFilterLow = 1e6;
        run.tp.plan.SetModelTarget(0, target);
        EXPECT_EQ(run.Run().GetErrorCode(), MCSPStatus::kAttemptsExhausted);
    }
}

// ---- Completion of the inputs' results
// -----------------------------------------------------------

TEST(Completion, CellSharesAndCorrelationsInThePlansOrder) {
    simgen::TestPlan tp;
    MCThread_800::MCStdThreadFactory threads;
    tp.settings.SetThreadFactory(&threads);
    tp.settings.SetMaxThreadNum(2);
    tp.plan.SetMaxCases(60000);
    for (const char* name : {"a", "b", "c"}) {
        tp.AddInput(name, simgen::MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    }
    tp.AddInput("f", simgen::MakeCategorical({"f0", "f1"}, {0.5, 0.5}), kLevelCategorical);
    tp.AddInput("g", simgen::MakeCategorical({"g0", "g1"}, {0.5, 0.5}), kLevelCategorical);
    tp.plan.SetCrstabsFactors({"f", "g"});
    tp.plan.SetCrstabsMatrix({{"f0", "g0"}, {"f0", "g1"}, {"f1", "g0"}, {"f1", "g1"}});
    tp.plan.SetCrstabsProbs({0.1, 0.2, 0.3, 0.4});
    // The plan lists its correlation variables as c, a, b.
    tp.plan.SetCorrMatrixCell("c", "c", 1.0);
    tp.plan.SetCorrMatrixCell("a", "c", 0.0);
    tp.plan.SetCorrMatrixCell("a", "a", 1.0);
    tp.plan.SetCorrMatrixCell("b", "c", 0.0);
    tp.plan.SetCorrMatrixCell("b", "a", 0.8);
    tp.plan.SetCorrMatrixCell("b", "b", 1.0);
    ASSERT_EQ(tp.plan.GetCorrVarList(), (std::vector<std::string>{"c", "a", "b"}));
    auto factory = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        LinearTarget t;
        t.fName = "t";
        t.fvCoefs = {{"a", 1.0}, {"c", 1.0}};
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{t},
                                                       IMCScoreComputer::kTransformsOnly, nullptr);
    });
    SECAlgorithm alg(tp.settings, tp.plan, tp.vars);
    SECOutputStats* res = BuildAndSimulate(alg, factory);
    ASSERT_NE(res, nullptr);
    const std::vector<double>& shares = res->GetCrstSimProbs();
    ASSERT_EQ(shares.size(), 4u);
    for (std::size_t i = 0; i < 4; ++i) {
        EXPECT_NEAR(shares[i], 0.1 * static_cast<double>(i + 1), 0.01);
    }
    const MCMath_800::MCSymMatrix& corr = res->GetSimulCorr();
    ASSERT_EQ(corr.GetNRows(), 3);
    EXPECT_NEAR(corr.GetElem(2, 1), 0.8, 0.01); // b with a
    EXPECT_NEAR(corr.GetElem(1, 0), 0.0, 0.02); // a with c
    EXPECT_EQ(corr.GetElem(0, 0), 1.0);
    EXPECT_EQ(res->GetFactorNames(), (std::vector<std::string>{"f", "g"}));
    EXPECT_EQ(res->GetCovariateNames(), (std::vector<std::string>{"a", "b", "c"}));
}

TEST(Completion, PolyCorrTaskRunsOnTheThreadServiceAndLeavesTheListsEmpty) {
    LinearRun run(1, 3u, 2000);
    ASSERT_TRUE(run.Run().IsOK());
    SECOutputStats* res = nullptr;
    ASSERT_TRUE(run.alg->GetOutputStats(res).IsOK());
    SECPolyCorrTask task(0, 1, res, {{0, 0}}, 0.0, false);
    MCThread_800::MCStdThreadFactory threads;
    threads.CreateThreadGroup(1)->Run({&task});
    EXPECT_TRUE(task.GetStatus().IsOK());
    EXPECT_TRUE(run.Target().fvPolyserialCorrs.empty());
}

TEST(LinearModel, VarianceContributionDoesNotMoveWithTheTargetsLocation) {
    // t and t + 1000 over correlated inputs: the products are centred at each target's pilot
    // mean, so both targets get the same shares (raw products would add noise of order
    // 1000·sd/√n to the second).
    simgen::TestPlan tp;
    tp.settings.SetTornadoVariance(true);
    tp.plan.SetMaxCases(20000);
    for (const char* name : {"a", "b"}) {
        tp.AddInput(name, simgen::MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    }
    tp.plan.SetCorrMatrixCell("a", "a", 1.0);
    tp.plan.SetCorrMatrixCell("b", "a", 0.6);
    tp.plan.SetCorrMatrixCell("b", "b", 1.0);
    auto factory = scorers::MakeFactory([]() -> std::unique_ptr<IMCScoreComputer> {
        LinearTarget near;
        near.fName = "near";
        near.fvCoefs = {{"a", 1.0}, {"b", 2.0}};
        LinearTarget far = near;
        far.fName = "far";
        far.fIntercept = 1000.0;
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{near, far},
                                                       IMCScoreComputer::kTransformsOnly, nullptr);
    });
    SECAlgorithm alg(tp.settings, tp.plan, tp.vars);
    SECOutputStats* res = BuildAndSimulate(alg, factory);
    ASSERT_NE(res, nullptr);
    const std::vector<SECContinuousTargetInfo>& t = res->GetContTargetInfo();
    for (std::size_t k = 0; k < 2; ++k) {
        EXPECT_NEAR(t[0].fvVarianceContrib[k], t[1].fvVarianceContrib[k], 1e-6) << k;
    }
    // V = Var(a + 2b) = 1 + 4 + 4·0.6 = 7.4. The further case's a' is independent of the case,
    // so Cov(Y, a' + 2b) = 2·0.6 + 4 = 5.2 and a's share is (7.4 − 5.2)/7.4.
    EXPECT_NEAR(t[0].fvVarianceContrib[0], 2.2 / 7.4, 0.03);
}

TEST(AddedResults, FirstOrderIndicesMatchTheClosedForms) {
    // t = 1 + 2·x0 − 3·e + 1.5·l + effect(region), independent inputs: x0 ~ Normal(10, 2),
    // e ~ Exponential(rate 0.5), l ~ LogNormal(a = 1, b = 1) (variance e·(e − 1)) and the
    // region effect of variance 8.49. S1 of an input is its term's share of Var(t).
    LinearRun run(2, 31u, 1000000,
                  {{"x0", {simgen::MakeDist(kDistNormal, {{"mean", 10.0}, {"stddev", 2.0}})}},
                   {"e", {simgen::MakeDist(kDistExponential, {{"scale", 0.5}})}},
                   {"l", {simgen::MakeDist(kDistLognormal, {{"a", 1.0}, {"b", 1.0}})}}});
    run.tp.settings.SetQuantilesAndIndices(true);
    LinearTarget model = LinearRun::Model();
    model.fvCoefs = {{"x0", 2.0}, {"e", -3.0}, {"l", 1.5}};
    auto factory = scorers::MakeFactory([&model]() -> std::unique_ptr<IMCScoreComputer> {
        return std::make_unique<scorers::LinearScorer>(std::vector<LinearTarget>{model},
                                                       IMCScoreComputer::kRegression, nullptr);
    });
    ASSERT_TRUE(run.Run(&factory).IsOK());
    const double terms[] = {4.0 * 4.0, 9.0 * 4.0, 2.25 * std::exp(1.0) * (std::exp(1.0) - 1.0),
                            8.49};
    const double total = terms[0] + terms[1] + terms[2] + terms[3];
    const std::vector<double>& s1 = run.Target().fvFirstOrder;
    ASSERT_EQ(s1.size(), 4u);
    for (std::size_t k = 0; k < 4; ++k) {
        EXPECT_NEAR(s1[k], terms[k] / total, 0.01) << run.Results().GetPredictorNames()[k];
    }
    EXPECT_EQ(run.Target().fQuantiles.GetCount(), run.Results().GetValidCaseCount());
}
