// The maximum-likelihood step (DFCAlgorithm::OptimizeDistParams) through BuildModel on real
// data against data/ml_make_reference.py; thread-count independence and the runner's threads;
// cancellation from another thread; the data handler's and worker task's failure paths.
#include "component/mcspassert.h"
#include "distribution_fitting/dfcaccumstats.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcdatahandler.h"
#include "mccommon/mcmv.h"

#include "fit_host.h"
#include "mctolerance.h"

#include <boost/math/special_functions/digamma.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstring>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "data/ml_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;
using namespace dfctest;
using MCCommon_800::MCMemoryRecordIter;
using MCCommon_800::MultiPassRecordIter;
using MCXML_800::Record;

namespace {

//! A thread factory that records the groups it makes and what they run, and can raise a
//! cancel from another thread while a group runs.
class RecordingFactory : public MCThread_800::IMCThreadFactory {
public:
    struct GroupRun {
        int fNThreads;    //!< threads requested for the group
        int fNOptimTasks; //!< DFCOptimThreadTask among its tasks
    };

    std::unique_ptr<MCThread_800::IMCThreadGroup> CreateThreadGroup(int nThreads) override {
        return std::make_unique<Group>(*this, nThreads);
    }
    std::unique_ptr<MCThread_800::IMCLock> CreateLock() override { return fStd.CreateLock(); }

    //! The algorithm to cancel from another thread while the optimisation tasks run.
    void CancelDuringOptimisation(DFCAlgorithm* algorithm) { fpToCancel = algorithm; }
    std::vector<GroupRun> fRuns;

private:
    class Group : public MCThread_800::IMCThreadGroup {
    public:
        Group(RecordingFactory& owner, int nThreads)
            : fOwner(owner), fNThreads(nThreads), fpInner(owner.fStd.CreateThreadGroup(nThreads)) {}
        void Run(const std::vector<MCThread_800::IMCThreadTask*>& tasks) override {
            const auto nOptim = std::count_if(tasks.begin(), tasks.end(), [](auto* t) {
                return dynamic_cast<DFCOptimThreadTask*>(t) != nullptr;
            });
            fOwner.fRuns.push_back({fNThreads, static_cast<int>(nOptim)});
            std::thread canceller;
            if (nOptim > 0 && fOwner.fpToCancel) {
                canceller = std::thread([this]() { fOwner.fpToCancel->Cancel(); });
            }
            fpInner->Run(tasks);
            if (canceller.joinable()) {
                canceller.join();
            }
        }

    private:
        RecordingFactory& fOwner;
        int fNThreads;
        std::unique_ptr<MCThread_800::IMCThreadGroup> fpInner;
    };

    MCThread_800::MCStdThreadFactory fStd;
    DFCAlgorithm* fpToCancel = nullptr;
};

// Estimates through BuildModel against the reference.

struct BuildCase {
    const mlref::MLCase* fpCase;
    DistType fType;
    MeasureLevel fLevel;
};

std::string BuildCaseName(const ::testing::TestParamInfo<BuildCase>& param) {
    return std::string(DistType2String(param.param.fType)) + "_" + param.param.fpCase->fName;
}

std::vector<BuildCase> AllBuildCases() {
    std::vector<BuildCase> cases;
    for (const auto& c : mlref::kBetaCases) {
        cases.push_back({&c, kDistBeta, kLevelContinuous});
    }
    for (const auto& c : mlref::kGammaCases) {
        cases.push_back({&c, kDistGamma, kLevelContinuous});
    }
    for (const auto& c : mlref::kNegBinCases) {
        cases.push_back({&c, kDistNegbinomial, kLevelOrdinal});
    }
    return cases;
}

class BuildModelReference : public ::testing::TestWithParam<BuildCase> {};

TEST_P(BuildModelReference, EstimatesAreMaximumLikelihood) {
    const BuildCase& bc = GetParam();
    const mlref::MLCase& c = *bc.fpCase;
    Rows rows;
    for (std::size_t i = 0; i < c.fpData->size(); ++i) {
        rows.push_back({(*c.fpData)[i], c.fpWeights ? (*c.fpWeights)[i] : 1.0});
    }
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {bc.fType}, bc.fLevel, false), 1);
    if (c.fpWeights) {
        ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    }
    MCThread_800::MCStdThreadFactory factory;
    settings.SetThreadFactory(&factory);
    settings.SetMaxThreadNum(2);
    FitRun host(rows, settings);
    ASSERT_FALSE(host.Build().IsError());
    const std::vector<double>& p = host.Params(0, bc.fType);
    ASSERT_GE(p.size(), 2u);
    switch (bc.fType) {
    case kDistBeta:
        // The optimiser stops at 1e-10 relative change of the parameters.
        EXPECT_NEAR_REL(p[0], c.fParam1, 1e-6);
        EXPECT_NEAR_REL(p[1], c.fParam2, 1e-6);
        break;
    case kDistGamma: {
        // The root search stops at |F| ≤ 1e-6. The residual of the likelihood equation,
        // evaluated here from the data in long double:
        long double w = 0.0L, sum = 0.0L, sumLog = 0.0L;
        for (const auto& row : rows) {
            w += row[1];
            sum += row[1] * static_cast<long double>(row[0]);
            sumLog += row[1] * std::log(static_cast<long double>(row[0]));
        }
        const long double alpha = p[0];
        const long double residual =
            std::log(alpha * w / sum) - boost::math::digamma(alpha) + sumLog / w;
        EXPECT_LE(std::fabs(static_cast<double>(residual)), 1e-6 * (1.0 + 1e-6));
        // Near the root F(α) ≈ F'(α*)·(α - α*): the shape is within 1e-6/|F'| (10% margin
        // for the curvature); the rate α/mean carries the same relative error.
        const double bound = 1.1e-6 / std::fabs(c.fDerivative);
        EXPECT_NEAR_TOL(p[0], c.fParam1, 0.0, bound);
        EXPECT_NEAR_REL(p[1], c.fParam2, bound / c.fParam1 + 1e-12);
        break;
    }
    default:
        EXPECT_EQ(p[0], c.fParam1);
        EXPECT_NEAR_REL(p[1], c.fParam2, 1e-13);
        EXPECT_EQ(p[2], 2.0);
        break;
    }
    // The initial parameters keep the moment estimates.
    const auto& element = host.Algo().GetOutCovarDistInfo(0, bc.fType);
    EXPECT_NE(element.fInitParams, element.fDistParams);
}

INSTANTIATE_TEST_SUITE_P(RealData, BuildModelReference, ::testing::ValuesIn(AllBuildCases()),
                         BuildCaseName);

// Threads.

//! 944 respondents of the election study: age and TV-news days (counts), and age/100 as a
//! proportion. Five optimisation tasks: NegBin and Gamma of age, NegBin of TV news (Gamma is
//! dropped by its zeros), Beta and Gamma of the proportion.
Rows AnesRows() {
    Rows rows;
    for (std::size_t i = 0; i < mlref::kAnesAge.size(); ++i) {
        rows.push_back({mlref::kAnesAge[i], mlref::kAnesTVNews[i], mlref::kAnesAge[i] / 100.0});
    }
    return rows;
}

DFCSettings AnesSettings(MCThread_800::IMCThreadFactory* factory, int maxThreads) {
    DFCSettings settings;
    EXPECT_EQ(settings.AddCovariate(0, {kDistNegbinomial, kDistGamma}, kLevelOrdinal, false), 1);
    EXPECT_EQ(settings.AddCovariate(1, {kDistNegbinomial, kDistGamma}, kLevelOrdinal, false), 2);
    EXPECT_EQ(settings.AddCovariate(2, {kDistBeta, kDistGamma}, kLevelContinuous, false), 3);
    settings.SetThreadFactory(factory);
    settings.SetMaxThreadNum(maxThreads);
    return settings;
}

bool SameBits(const std::vector<double>& a, const std::vector<double>& b) {
    return a.size() == b.size() &&
           (a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof(double)) == 0);
}

// Without a factory the tasks run on the calling thread: the same results again.
TEST(OptimisationThreads, ResultsDoNotDependOnTheThreadCount) {
    MCThread_800::MCStdThreadFactory factory;
    FitRun one(AnesRows(), AnesSettings(&factory, 1));
    ASSERT_FALSE(one.Build().IsError());
    for (int threads : {2, 4, -2}) {
        FitRun many(AnesRows(), AnesSettings(threads > 0 ? &factory : nullptr, std::abs(threads)));
        ASSERT_FALSE(many.Build().IsError());
        for (int i = 0; i < 3; ++i) {
            for (DistType type : {kDistNegbinomial, kDistGamma, kDistBeta}) {
                EXPECT_TRUE(SameBits(one.Params(i, type), many.Params(i, type)))
                    << threads << " threads, covariate " << i << " type " << type;
                EXPECT_EQ(one.Algo().GetOutCovarDistInfo(i, type).fbDistAllowed,
                          many.Algo().GetOutCovarDistInfo(i, type).fbDistAllowed);
            }
        }
        EXPECT_EQ(one.Algo().GetWarnings(), many.Algo().GetWarnings());
    }
    // The estimates moved from the moment estimates: the step ran.
    EXPECT_EQ(one.Params(0, kDistNegbinomial)[0], 10.0);
    EXPECT_NE(one.Params(2, kDistBeta), one.Algo().GetOutCovarDistInfo(2, kDistBeta).fInitParams);
}

TEST(OptimisationThreads, RunnerGetsAtMostOneThreadPerTask) {
    for (const auto& [maxThreads, expected] : {std::pair<int, int>{8, 5}, {3, 3}, {1, 1}, {0, 1}}) {
        RecordingFactory factory;
        FitRun host(AnesRows(), AnesSettings(&factory, maxThreads));
        ASSERT_FALSE(host.Build().IsError());
        const auto optimRun =
            std::find_if(factory.fRuns.begin(), factory.fRuns.end(),
                         [](const RecordingFactory::GroupRun& r) { return r.fNOptimTasks > 0; });
        ASSERT_NE(optimRun, factory.fRuns.end());
        EXPECT_EQ(optimRun->fNOptimTasks, 5) << "max threads " << maxThreads;
        EXPECT_EQ(optimRun->fNThreads, expected) << "max threads " << maxThreads;
    }
}

TEST(OptimisationCancel, CancelFromAnotherThreadEndsTheStepWithStatusOne) {
    RecordingFactory factory;
    DFCSettings settings = AnesSettings(&factory, 2);
    FitRun host(AnesRows(), settings);
    factory.CancelDuringOptimisation(&host.Algo());
    EXPECT_EQ(host.Build(), MCStatus(MCSPStatus::kCancelled, false));
    EXPECT_FALSE(host.Algo().IsModelBuilt());
    // The step ran its tasks once and stopped there: no goodness-of-fit group followed.
    ASSERT_EQ(factory.fRuns.size(), 1u);
    EXPECT_EQ(factory.fRuns[0].fNOptimTasks, 5);
}

TEST(OptimisationCancel, PendingCancelStopsTheBetaOptimiser) {
    // Armed before the build, the first pass stops at once; so arm it only for the
    // optimiser's handler, which is the only one that polls during this step.
    FlagCancel cancel;
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {kDistBeta}, kLevelContinuous, false), 1);
    settings.SetCancelPointer(&cancel);
    MCMath_800::MCCancelInfo info(&cancel);
    std::vector<double> params{2.0, 3.0};
    DFCAccumStatsBeta accum(settings, params, {0}, 303.0, {0.44}, {0.034});
    accum.SetSumLogXi(-270.0);
    accum.SetSumLog1MinusXi(-190.0);
    MCWarnings warnings;
    DFCDataHandler handler(nullptr, &info, &warnings);
    handler.SetAccumStats(&accum);
    EXPECT_TRUE(handler.ComputeStatsForOptimizer(MCMath_800::kOptCompScores).IsOK());
    cancel.fbRaised = true;
    EXPECT_EQ(handler.ComputeStatsForOptimizer(MCMath_800::kOptCompScores),
              MCStatus(MCSPStatus::kCancelled, false));
    EXPECT_TRUE(info.IsCancel());
    // Through the optimiser: the run fails and the start values are restored.
    auto optimizer = MCMath_800::MCOptimFactory::OptimFactory(&handler, &accum, params,
                                                              MCMath_800::MCOptimParams());
    EXPECT_TRUE(optimizer->Optimize().IsError());
    EXPECT_EQ(params, (std::vector<double>{2.0, 3.0}));
}

// Collection rules.

TEST(OptimisationCollection, NegBinOfAContinuousCovariateIsDropped) {
    // Whole numbers at the continuous level have no category counts.
    Rows rows;
    for (double x : mlref::kStrikesDuration) {
        rows.push_back({x});
    }
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {kDistNegbinomial, kDistGamma}, kLevelContinuous, false), 1);
    FitRun host(rows, settings);
    ASSERT_FALSE(host.Build().IsError());
    EXPECT_FALSE(host.Algo().GetOutCovarDistInfo(0, kDistNegbinomial).fbDistAllowed);
    EXPECT_GE(host.CountWarnings(MCSPStatus::kDistDropped), 1);
    // Gamma of the same covariate is fitted all the same.
    EXPECT_NEAR_TOL(host.Params(0, kDistGamma)[0], mlref::kGammaCases[0].fParam1, 0.0,
                    1.1e-6 / std::fabs(mlref::kGammaCases[0].fDerivative));
}

TEST(OptimisationCollection, FailedRootSearchKeepsTheMomentEstimate) {
    // Counts whose variance is below the mean: the NegBin equation has no finite root. The
    // moment estimate (r = 1) stays, and the candidate stays allowed.
    Rows rows;
    for (double x : {3.0, 4.0, 4.0, 5.0, 5.0, 5.0, 6.0, 6.0, 4.0, 5.0}) {
        rows.push_back({x});
    }
    DFCSettings settings;
    ASSERT_EQ(settings.AddCovariate(0, {kDistNegbinomial}, kLevelOrdinal, false), 1);
    FitRun host(rows, settings);
    ASSERT_FALSE(host.Build().IsError());
    const auto& element = host.Algo().GetOutCovarDistInfo(0, kDistNegbinomial);
    EXPECT_EQ(element.fDistParams, element.fInitParams);
    EXPECT_EQ(host.CountWarnings(MCSPStatus::kRootSearchFailed), 0);
}

// The data handler and the worker task.

//! Records whose restart fails, or whose fetch fails.
class FaultyRecords : public MultiPassRecordIter {
public:
    FaultyRecords(bool failRestart, bool failFetch)
        : fbFailRestart(failRestart), fbFailFetch(failFetch) {}
    bool HasMore() override { return fNext < 3; }
    const Record* NextRecord() override {
        ++fNext;
        return fbFailFetch ? nullptr : &fRecord;
    }
    int Restart() override {
        fNext = 0;
        return fbFailRestart ? 1 : 0;
    }

private:
    bool fbFailRestart;
    bool fbFailFetch;
    int fNext = 0;
    Record fRecord{std::vector<double>{2.0}};
};

struct HandlerCase {
    const char* fName;
    int fData; //!< 0 none, 1 empty, 2 restart fails, 3 fetch fails, 4 three records
    bool fbAccum;
    int fFlags;
    long fCode;
    const char* fAssertion; //!< expected diagnostic, "" for none
};

class HandlerFailures : public ::testing::TestWithParam<HandlerCase> {};

TEST_P(HandlerFailures, StatusForBadInput) {
    const HandlerCase& c = GetParam();
    MCMemoryRecordIter empty;
    FaultyRecords restartFails(true, false);
    FaultyRecords fetchFails(false, true);
    FaultyRecords good(false, false);
    MultiPassRecordIter* data[] = {nullptr, &empty, &restartFails, &fetchFails, &good};
    DFCSettings settings;
    std::vector<double> params{2.0, 1.0};
    DFCAccumStatsGamma accum(settings, params, {0}, 3.0, {2.0}, {1.0});
    DFCDataHandler handler(data[c.fData], nullptr, nullptr);
    if (c.fbAccum) {
        handler.SetAccumStats(&accum);
    }
    ClearLastAssertion();
    const MCStatus status = handler.ComputeStatsForOptimizer(c.fFlags);
    EXPECT_EQ(status.GetErrorCode(), c.fCode);
    EXPECT_EQ(handler.GetStatus(), status);
    if (c.fCode != 0) {
        EXPECT_TRUE(status.IsError());
    }
    EXPECT_EQ(GetLastAssertion(), c.fAssertion);
    EXPECT_TRUE(handler.GetWarnings().empty());
}

INSTANTIATE_TEST_SUITE_P(
    Table, HandlerFailures,
    ::testing::Values(
        HandlerCase{"NoAccumulator", 0, false, 1, 303,
                    "DFCDataHandler::ComputeStatsForOptimizer: fpAccStats"},
        HandlerCase{"NothingRequested", 0, true, 0, 303,
                    "DFCDataHandler::ComputeStatsForOptimizer: Valid compFlag"},
        HandlerCase{"EmptyData", 1, true, 1, 303,
                    "DFCDataHandler::ComputeStatsForOptimizer: fpData == 0 || fpData->HasMore()"},
        HandlerCase{"RestartFails", 2, true, 2, 307, ""},
        HandlerCase{"FetchFails", 3, true, 1, 304, ""}, HandlerCase{"SumsOnly", 0, true, 1, 0, ""},
        HandlerCase{"ThreeRecords", 4, true, 3, 0, ""}),
    [](const ::testing::TestParamInfo<HandlerCase>& param) {
        return std::string(param.param.fName);
    });

TEST(DataHandler, ValueAndDerivativesFeedEachRecordOnce) {
    // Asked for the objective and the scores at once, the handler makes one pass: the
    // objective equals the one of the sufficient statistics, not twice it.
    MCMemoryRecordIter records;
    double sumLog = 0.0;
    for (double x : mlref::kStrikesDuration) {
        records.Add(Record(std::vector<double>{x}));
        sumLog += std::log(x);
    }
    const double w = static_cast<double>(mlref::kStrikesDuration.size());
    double mean = 0.0;
    for (double x : mlref::kStrikesDuration) {
        mean += x / w;
    }
    DFCSettings settings;
    std::vector<double> params{0.9, 0.02};
    DFCAccumStatsGamma rows(settings, params, {0}, w, {mean}, {1.0});
    DFCAccumStatsGamma sums(settings, params, {0}, w, {mean}, {1.0});
    sums.SetSumLogXi(sumLog);
    ASSERT_TRUE(sums.FinishComputations(1));
    DFCDataHandler handler(&records, nullptr, nullptr);
    handler.SetAccumStats(&rows);
    handler.ResetAccumStats(1, false);
    ASSERT_TRUE(
        handler.ComputeStatsForOptimizer(MCMath_800::kOptCompObjective | MCMath_800::kOptCompScores)
            .IsOK());
    int valid = 0, invalid = 0;
    double weight = 0.0;
    rows.GetCounts(valid, invalid, weight);
    EXPECT_EQ(valid, static_cast<int>(mlref::kStrikesDuration.size()));
    EXPECT_NEAR_REL(rows.GetObjective(), sums.GetObjective(), 1e-12);
    EXPECT_NEAR_REL(rows.GetScores()[0], sums.GetScores()[0], 1e-10);
}

TEST(OptimThreadTask, OptimiserOverRecordsMatchesTheRootSearch) {
    // The Gamma likelihood driven row by row through the handler and the optimiser reaches
    // the reference estimate that the root search approximates: an independent path to the
    // same maximum.
    const mlref::MLCase& c = mlref::kGammaCases[0]; // strike durations
    MCMemoryRecordIter records;
    double mean = 0.0;
    for (double x : *c.fpData) {
        records.Add(Record(std::vector<double>{x}));
        mean += x / static_cast<double>(c.fpData->size());
    }
    DFCSettings settings;
    std::vector<double> params{1.0, 1.0 / mean};
    DFCAccumStatsGamma accum(settings, params, {0}, static_cast<double>(c.fpData->size()), {mean},
                             {1.0});
    MCWarnings warnings;
    MCMath_800::MCCancelInfo info;
    DFCDataHandler handler(&records, &info, &warnings);
    MCMath_800::MCOptimParams optimParams;
    auto optimizer =
        MCMath_800::MCOptimFactory::OptimFactory(&handler, &accum, params, optimParams);

    // With training data the optimiser runs only under the debug switch (off here).
    DFCOptimThreadTask withData(0, kDistGamma, &accum, optimizer.get(), &records);
    withData.RunTask();
    EXPECT_TRUE(withData.GetStatus().IsOK());
    EXPECT_EQ(params, (std::vector<double>{1.0, 1.0 / mean}));

    DFCOptimThreadTask task(0, kDistGamma, &accum, optimizer.get());
    task.RunTask();
    ASSERT_TRUE(task.GetStatus().IsOK()) << task.GetStatus().GetErrorCode();
    EXPECT_NEAR_REL(params[0], c.fParam1, 1e-6);
    EXPECT_NEAR_REL(params[1], c.fParam2, 1e-6);
}

} // namespace
