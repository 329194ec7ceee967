// The NORTA correlation model: the root search on a known g, the pair split, the combination and
// its repair, g against closed forms and an independent one-dimensional integral, the
// simulator's model against normal-scale correlations integrated in 40 digits
// (data/make_norta_reference.py), thread-count independence, cancellation, and a failed repair
// that must stop all drawing.
#include "simulation_evaluation/secnorta.h"
#include "simulation_evaluation/secsimulator.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "data/simgen_plans.h"
#include "mccommon/mcmv.h"
#include "mcmath/mceigen.h"
#include "mcthread/mcthread.h"
#include "mctolerance.h"

#include <boost/math/quadrature/gauss_kronrod.hpp>
#include <boost/math/special_functions/erf.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <functional>
#include <limits>
#include <ostream>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using simgen::MakeDist;
using simgen::TestPlan;

namespace {

const double kMissing = MCMV::Missing();

// ---- The search on a known g ------------------------------------------------------------------

struct SearchCase {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const SearchCase& r) { return os << r.fName; }
    std::function<double(double)> fG;
    double fRho;
    double fExpected;  //!< the exact answer: ±1, missing, or the root of g(r) = ρ
    bool fbRoot;       //!< check |g(r) − ρ| ≤ 1e-6 rather than equality
    bool fbUnreachable; //!< ρ lies outside [g(−1), g(+1)]
};

class Search : public ::testing::TestWithParam<SearchCase> {};

TEST_P(Search, FindsTheNormalCorrelation) {
    const SearchCase& c = GetParam();
    const SECNortaSearchResult result = SECNortaSearch(c.fRho, c.fG, nullptr);
    EXPECT_FALSE(result.fbCancelled);
    EXPECT_LE(result.fEvaluations, 2 + 30);
    EXPECT_EQ(result.fbUnreachable, c.fbUnreachable);
    if (c.fbRoot) {
        EXPECT_LE(std::fabs(c.fG(result.fNormalCorr) - c.fRho), SECNortaConst::kSolveTolerance);
        EXPECT_NEAR(result.fNormalCorr, c.fExpected, 1e-9);
    } else {
        EXPECT_TRUE(mctest::Near(result.fNormalCorr, c.fExpected, 0.0));
    }
}

INSTANTIATE_TEST_SUITE_P(
    KnownG, Search,
    ::testing::Values(
        SearchCase{"Identity", [](double r) { return r; }, 0.37, 0.37, true, false},
        SearchCase{"Cubic", [](double r) { return 0.9 * r * r * r; }, 0.5, std::cbrt(0.5 / 0.9),
                   true, false},
        SearchCase{"Negative", [](double r) { return 0.8 * r; }, -0.5, -0.625, true, false},
        // Targets beyond g(±1): the ends of the normal scale, not g(±1) itself.
        SearchCase{"AboveReach", [](double r) { return 0.6 * r; }, 0.7, 1.0, false, true},
        SearchCase{"AtReach", [](double r) { return 0.6 * r; }, 0.6, 1.0, false, false},
        SearchCase{"BelowReach", [](double r) { return 0.6 * r; }, -0.8, -1.0, false, true},
        SearchCase{"MissingAtAnEnd", [](double r) { return r > 0.99 ? kMissing : r; }, 0.3,
                   kMissing, false, false},
        SearchCase{"MissingInside", [](double r) { return r < 0.5 && r > -0.5 ? kMissing : r; },
                   0.3, kMissing, false, false},
        SearchCase{"MissingTarget", [](double r) { return r; }, kMissing, kMissing, false, false}),
    [](const ::testing::TestParamInfo<SearchCase>& row) { return std::string(row.param.fName); });

//! A host cancel query that answers yes from its n-th question on.
class CancelAfter : public MCCommon_800::MCQueryCancel {
public:
    explicit CancelAfter(int n) : fLeft(n) {}
    bool IsCancelled() const override { return --fLeft < 0; }

private:
    mutable std::atomic<int> fLeft; //!< questions answered no before the first yes
};

TEST(SearchCancel, StopsBeforeTheNextEstimate) {
    CancelAfter query(3);
    MCMath_800::MCCancelInfo cancel(&query);
    const SECNortaSearchResult result = SECNortaSearch(
        0.3, [](double r) { return r; }, &cancel);
    EXPECT_TRUE(result.fbCancelled);
    EXPECT_EQ(result.fEvaluations, 3);
    EXPECT_TRUE(MCMV::IsMissing(result.fNormalCorr));
}

TEST(SplitPairs, ConsecutiveSlicesTheFirstOnesLarger) {
    EXPECT_EQ(SECSplitPairs(10, 3), (std::vector<int>{0, 4, 7, 10}));
    EXPECT_EQ(SECSplitPairs(3, 5), (std::vector<int>{0, 1, 2, 3}));
    EXPECT_EQ(SECSplitPairs(6, 1), (std::vector<int>{0, 6}));
    EXPECT_EQ(SECSplitPairs(7, 0), (std::vector<int>{0, 7}));
    EXPECT_EQ(SECSplitPairs(0, 4), (std::vector<int>{0}));
}

// ---- Combination and repair ---------------------------------------------------------------------

SECNortaPair Pair(int i, int j, double target, double result, bool computed = true) {
    SECNortaPair pair;
    pair.fRow = i;
    pair.fCol = j;
    pair.fTarget = target;
    pair.fNormalCorr = result;
    pair.fbComputed = computed;
    return pair;
}

// Positive definite results are kept as they are; a missing or not computed (cancelled) result
// takes its target cut to the unit interval.
TEST(Combine, ResultsAreKeptOrReplacedByTheirTarget) {
    MCMath_800::MCSymMatrix q;
    EXPECT_TRUE(SECCombineNormalCorrelations(
                    3, {Pair(1, 0, 0.5, 0.55), Pair(2, 0, 0.2, 0.21), Pair(2, 1, 0.0, 0.0)}, q)
                    .IsOK());
    ASSERT_EQ(q.GetNRows(), 3);
    EXPECT_TRUE(q.GetElem(1, 0) == 0.55 && q.GetElem(2, 0) == 0.21 && q.GetElem(2, 2) == 1.0);
    ASSERT_TRUE(
        SECCombineNormalCorrelations(
            3, {Pair(1, 0, 0.3, kMissing), Pair(2, 0, 0.2, 0.9, false), Pair(2, 1, 0.0, 0.1)}, q)
            .IsOK());
    EXPECT_TRUE(q.GetElem(1, 0) == 0.3 && q.GetElem(2, 0) == 0.2);
}

TEST(Combine, AnInconsistentMatrixIsRepairedWithAWarning) {
    MCMath_800::MCSymMatrix q;
    const MCCommon_800::MCStatus status = SECCombineNormalCorrelations(
        3, {Pair(1, 0, 0.9, 0.9), Pair(2, 0, 0.9, 0.9), Pair(2, 1, -0.9, -0.9)}, q);
    EXPECT_TRUE(status.IsWarning());
    EXPECT_EQ(status.GetErrorCode(), MCSPStatus::kCorrelationAdjusted);
    ASSERT_EQ(q.GetNRows(), 3);
    MCMath_800::MCEigenValues eigen(q, 1e-12, 30);
    ASSERT_TRUE(eigen.IsValid());
    EXPECT_GT(eigen.GetEigenValues().front(), 0.0);
    for (int i = 0; i < 3; ++i) {
        EXPECT_NEAR_REL(q.GetElem(i, i), 1.0, 1e-12);
    }
}

// The ±1 of an unreachable target makes Q singular, not indefinite: it is moved just inside
// without the repair warning (the unreachable target has its own).
TEST(Combine, ASingularMatrixIsMovedInsideSilently) {
    MCMath_800::MCSymMatrix q;
    EXPECT_TRUE(SECCombineNormalCorrelations(2, {Pair(1, 0, -0.9, -1.0)}, q).IsOK());
    ASSERT_EQ(q.GetNRows(), 2);
    EXPECT_LT(q.GetElem(1, 0), -0.999);
}

TEST(Combine, NoRepairIsError390010WithAnEmptyMatrix) {
    const double inf = std::numeric_limits<double>::infinity();
    for (const std::vector<SECNortaPair>& pairs :
         {std::vector<SECNortaPair>{Pair(1, 0, 0.2, inf)},
          std::vector<SECNortaPair>{Pair(1, 0, kMissing, kMissing)},
          std::vector<SECNortaPair>{Pair(2, 0, 0.2, 0.2)}}) {
        MCMath_800::MCSymMatrix q(2);
        const MCCommon_800::MCStatus status = SECCombineNormalCorrelations(2, pairs, q);
        EXPECT_TRUE(status.IsError());
        EXPECT_EQ(status.GetErrorCode(), MCSPStatus::kMergeFailed);
        EXPECT_EQ(q.GetNRows(), 0);
    }
}

// ---- g against closed forms and an independent integral -------------------------------------

//! A prepared input of one type; the generator lives as long as the margin.
struct Input {
    SECInputGenerator fGen;
    SECNortaMargin fMargin;
    Input(DistType type, const std::vector<double>& params) {
        EXPECT_TRUE(SECPrepareGenerator(type, params, fGen));
        EXPECT_TRUE(SECPrepareNortaMargin(fGen, fMargin));
    }
};

double Phi(double z) {
    return 0.5 * std::erfc(-z / std::sqrt(2.0));
}

//! P(Z1 > a, Z2 > b) for correlation r by adaptive Gauss–Kronrod over the conditional
//! probability: ∫_a^∞ φ(x) Φ((r x − b)/√(1 − r²)) dx.
double UpperOrthant(double a, double b, double r) {
    if (std::fabs(r) == 1.0) {
        return r > 0 ? 1.0 - Phi(std::max(a, b)) : std::max(0.0, Phi(-a) - Phi(b));
    }
    const double s = std::sqrt(1.0 - r * r);
    const auto f = [&](double x) {
        return std::exp(-0.5 * x * x) / std::sqrt(2.0 * M_PI) * Phi((r * x - b) / s);
    };
    return boost::math::quadrature::gauss_kronrod<double, 61>::integrate(f, a, 40.0, 15, 1e-13);
}

struct ClosedForm {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const ClosedForm& c) { return os << c.fName; }
    DistType fType1;
    std::vector<double> fParams1;
    DistType fType2;
    std::vector<double> fParams2;
    std::function<double(double)> fG;
};

class ClosedForms : public ::testing::TestWithParam<ClosedForm> {};

TEST_P(ClosedForms, GMatchesOverTheWholeRange) {
    const ClosedForm& c = GetParam();
    const Input first(c.fType1, c.fParams1);
    const Input second(c.fType2, c.fParams2);
    for (double r = -1.0; r <= 1.0 + 1e-9; r += 0.05) {
        for (const double at : {r, std::clamp(r, -1.0, 1.0) * 0.999}) {
            const double x = std::clamp(at, -1.0, 1.0);
            EXPECT_NEAR(SECNortaCorrelation(first.fMargin, second.fMargin, x), c.fG(x), 1e-7)
                << "r = " << x;
        }
    }
}

//! LogNormal x = a·e^(b z): g(r) = (e^(r b1 b2) − 1)/√((e^(b1²) − 1)(e^(b2²) − 1)); with a Normal
//! (b2 → 0) r·b1/√(e^(b1²) − 1).
double LogNormalG(double b1, double b2, double r) {
    return std::expm1(r * b1 * b2) / std::sqrt(std::expm1(b1 * b1) * std::expm1(b2 * b2));
}

//! Bernoulli(p1), Bernoulli(p2): (P(Z1 > a, Z2 > b) − p1 p2)/√(p1 q1 p2 q2), a = Φ⁻¹(1 − p1).
double BernoulliG(double p1, double p2, double r) {
    const double a = -boost::math::erfc_inv(2.0 * (1.0 - p1)) * std::sqrt(2.0);
    const double b = -boost::math::erfc_inv(2.0 * (1.0 - p2)) * std::sqrt(2.0);
    return (UpperOrthant(a, b, r) - p1 * p2) / std::sqrt(p1 * (1 - p1) * p2 * (1 - p2));
}

INSTANTIATE_TEST_SUITE_P(
    Exact, ClosedForms,
    ::testing::Values(
        ClosedForm{"NormalNormal", kDistNormal, {3.0, 2.0}, kDistNormal, {0.0, 1.0},
                   [](double r) { return r; }},
        ClosedForm{"NormalLogNormal05", kDistNormal, {3.0, 2.0}, kDistLognormal, {2.0, 0.5},
                   [](double r) { return r * 0.5 / std::sqrt(std::expm1(0.25)); }},
        ClosedForm{"NormalLogNormal1", kDistNormal, {0.0, 1.0}, kDistLognormal, {1.0, 1.0},
                   [](double r) { return r / std::sqrt(std::expm1(1.0)); }},
        ClosedForm{"LogNormalPair", kDistLognormal, {1.0, 0.5}, kDistLognormal, {3.0, 1.0},
                   [](double r) { return LogNormalG(0.5, 1.0, r); }},
        ClosedForm{"LogNormalSame", kDistLognormal, {1.0, 1.0}, kDistLognormal, {1.0, 1.0},
                   [](double r) { return LogNormalG(1.0, 1.0, r); }},
        ClosedForm{"BernoulliPair", kDistBernoulli, {0.3}, kDistBernoulli, {0.6},
                   [](double r) { return BernoulliG(0.3, 0.6, r); }},
        ClosedForm{"BernoulliSame", kDistBernoulli, {0.2}, kDistBernoulli, {0.2},
                   [](double r) { return BernoulliG(0.2, 0.2, r); }}),
    [](const ::testing::TestParamInfo<ClosedForm>& row) { return std::string(row.param.fName); });

// ---- The simulator's correlation model against integrated references ----------------------------

struct ReferenceRow {
    const char* fName;
    friend std::ostream& operator<<(std::ostream& os, const ReferenceRow& r) {
        return os << r.fName;
    }
    int fType1;
    std::vector<double> fParams1;
    int fType2;
    std::vector<double> fParams2;
    double fRho;                 //!< target Pearson correlation of the transformed inputs
    double fNormalCorr;          //!< r with g(r) = ρ by numerical integration (±1 beyond reach)
    double fGLow;                //!< g(−1)
    double fGHigh;               //!< g(+1)
    std::vector<double> fGTable; //!< g(r) at r = −1, −0.99, …, 1 (12 digits)
};

const ReferenceRow kReference[] = {
#include "data/norta_reference.inc"
};

//! The plan-level distribution of a reference row's type and stored parameters.
DistInfoElem DistOf(int type, const std::vector<double>& params) {
    std::vector<std::string> names;
    GetDistributionParameterNames(static_cast<DistType>(type), names);
    std::vector<std::pair<std::string, double>> named;
    for (std::size_t i = 0; i < names.size(); ++i) {
        named.emplace_back(names[i], params.at(i));
    }
    return MakeDist(static_cast<DistType>(type), named);
}

class NortaReference : public ::testing::TestWithParam<ReferenceRow> {};

TEST_P(NortaReference, FindsTheIntegratedNormalCorrelation) {
    const ReferenceRow& row = GetParam();
    TestPlan t;
    t.AddInput("x1", DistOf(row.fType1, row.fParams1),
               row.fType1 == kDistPoisson ? kLevelOrdinal : kLevelContinuous);
    t.AddInput("x2", DistOf(row.fType2, row.fParams2),
               row.fType2 == kDistPoisson ? kLevelOrdinal : kLevelContinuous);
    t.plan.SetCorrMatrixCell("x2", "x1", row.fRho);
    auto sim = t.MakeSimulator();
    ASSERT_TRUE(sim->PrepareCorrelationModel().IsOK());
    ASSERT_EQ(sim->GetNortaPairs().size(), 1u);
    const SECNortaPair& pair = sim->GetNortaPairs()[0];
    EXPECT_NEAR(pair.fNormalCorr, row.fNormalCorr, 1e-6);
    EXPECT_NEAR(pair.fGLow, row.fGLow, 1e-7);
    EXPECT_NEAR(pair.fGHigh, row.fGHigh, 1e-7);
    const bool beyondReach = std::fabs(row.fNormalCorr) == 1.0;
    EXPECT_EQ(pair.fbUnreachable, beyondReach);
    EXPECT_EQ(sim->GetWarnings().HasCode(MCSPStatus::kCorrelationUnreachable), beyondReach);
    EXPECT_FALSE(sim->GetWarnings().HasCode(MCSPStatus::kCorrelationAdjusted));
    // g itself along the reference grid (printed to 12 digits).
    const auto& gens = sim->GetCorrelatedInputs();
    SECNortaMargin first, second;
    ASSERT_TRUE(SECPrepareNortaMargin(gens[0].fGenerator, first));
    ASSERT_TRUE(SECPrepareNortaMargin(gens[1].fGenerator, second));
    for (std::size_t k = 0; k < row.fGTable.size(); k += 7) {
        const double r = -1.0 + 0.01 * static_cast<double>(k);
        EXPECT_NEAR(SECNortaCorrelation(first, second, r), row.fGTable[k], 1e-7) << "r = " << r;
    }
}

INSTANTIATE_TEST_SUITE_P(Integrated, NortaReference, ::testing::ValuesIn(kReference),
                         [](const ::testing::TestParamInfo<ReferenceRow>& row) {
                             return std::string(row.param.fName);
                         });

// ---- The simulator's correlation model: threads, special pairs, failures -----------------------

//! Four correlated inputs (six pairs, one with target 0) and a categorical one.
TestPlan FourInputs() {
    TestPlan t;
    t.AddInput("n", MakeDist(kDistNormal, {{"mean", 100.0}, {"stddev", 15.0}}));
    t.AddInput("e", MakeDist(kDistExponential, {{"scale", 0.5}}));
    t.AddInput("c", simgen::MakeCategorical({"a", "b", "c"}, {0.2, 0.3, 0.5}), kLevelCategorical);
    t.AddInput("g", MakeDist(kDistGamma, {{"shape", 2.0}, {"scale", 0.5}}));
    t.AddInput("l", MakeDist(kDistLognormal, {{"a", std::exp(1.0)}, {"b", 0.5}}));
    t.plan.SetCorrMatrixCell("e", "n", 0.4);
    t.plan.SetCorrMatrixCell("g", "n", -0.3);
    t.plan.SetCorrMatrixCell("g", "e", 0.5);
    t.plan.SetCorrMatrixCell("l", "n", 0.2);
    t.plan.SetCorrMatrixCell("l", "e", 0.0);
    t.plan.SetCorrMatrixCell("l", "g", 0.6);
    return t;
}

TEST(CorrelationModel, ResultsDoNotDependOnTheThreadCount) {
    MCThread_800::MCStdThreadFactory factory;
    std::vector<MCMath_800::MCSymMatrix> matrices;
    std::vector<std::vector<double>> cases;
    std::vector<double> nextDraws;
    for (const int threads : {0, 1, 2, 4, 7}) {
        TestPlan t = FourInputs();
        t.settings.SetMaxThreadNum(std::max(threads, 1));
        t.settings.SetThreadFactory(threads == 0 ? nullptr : &factory);
        auto sim = t.MakeSimulator();
        ASSERT_TRUE(sim->PrepareCorrelationModel().IsOK()) << threads;
        ASSERT_EQ(sim->GetNortaPairs().size(), 6u);
        EXPECT_EQ(sim->GetNortaPairs()[4].fNormalCorr, 0.0); // pair (l, e): target 0
        matrices.push_back(sim->GetNormalCorrelations());
        ASSERT_TRUE(sim->PrepareGeneration().IsOK());
        std::vector<double> drawn;
        for (int i = 0; i < 50; ++i) {
            ASSERT_TRUE(sim->DrawCase().IsOK());
            drawn.insert(drawn.end(), sim->GetCaseValues().begin(), sim->GetCaseValues().end());
        }
        cases.push_back(drawn);
        nextDraws.push_back(sim->GetStream()->GetRandom());
    }
    for (std::size_t k = 1; k < matrices.size(); ++k) {
        EXPECT_TRUE(matrices[k] == matrices[0]) << "thread setting " << k;
        EXPECT_EQ(cases[k], cases[0]);
        EXPECT_EQ(nextDraws[k], nextDraws[0]);
    }
}

TEST(CorrelationModel, CaseWorkersOnThreadsRepeatTheirSequentialRuns) {
    MCThread_800::MCStdThreadFactory factory;
    TestPlan t = FourInputs();
    t.settings.SetThreadFactory(&factory);
    t.settings.SetMaxThreadNum(3);
    auto master = t.MakeSimulator();
    ASSERT_TRUE(master->PrepareCorrelationModel().IsOK());
    std::vector<std::unique_ptr<SECSimulator>> threaded;
    std::vector<std::unique_ptr<SECSimulator>> sequential;
    std::vector<MCThread_800::IMCThreadTask*> tasks;
    for (const double seed : {0.1, 0.2, 0.3}) {
        threaded.push_back(master->CreateWorker(seed));
        sequential.push_back(master->CreateWorker(seed));
        threaded.back()->SetCaseQuota(2000);
        sequential.back()->SetCaseQuota(2000);
        tasks.push_back(threaded.back().get());
    }
    factory.CreateThreadGroup(3)->Run(tasks);
    for (std::size_t w = 0; w < 3; ++w) {
        sequential[w]->RunTask();
        EXPECT_TRUE(threaded[w]->GetStatus().IsOK());
        EXPECT_EQ(threaded[w]->GetValidCaseCount(), 2000);
        EXPECT_EQ(threaded[w]->GetCaseValues(), sequential[w]->GetCaseValues());
    }
}

// Two normal inputs keep the plan's correlation; one correlated input takes the matrix as it
// is; an inconsistent plan is repaired with warning 390015.
TEST(CorrelationModel, SmallPlansNeedNoSearch) {
    TestPlan two, one, three;
    two.AddInput("a", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    two.AddInput("b", MakeDist(kDistNormal, {{"mean", 5.0}, {"stddev", 2.0}}));
    two.plan.SetCorrMatrixCell("b", "a", 0.42);
    auto sim = two.MakeSimulator();
    ASSERT_TRUE(sim->PrepareCorrelationModel().IsOK());
    EXPECT_EQ(sim->GetNormalCorrelations().GetElem(1, 0), 0.42);
    EXPECT_TRUE(sim->GetWarnings().IsEmpty());

    one.AddInput("a", MakeDist(kDistGamma, {{"shape", 2.0}, {"scale", 1.0}}));
    one.plan.SetCorrMatrixCell("a", "a", 1.0);
    sim = one.MakeSimulator();
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    EXPECT_EQ(sim->GetNormalCorrelations().GetNRows(), 1);
    EXPECT_TRUE(sim->DrawCase().IsOK());

    for (const char* name : {"a", "b", "c"}) {
        three.AddInput(name, MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    }
    three.plan.SetCorrMatrixCell("b", "a", 0.9);
    three.plan.SetCorrMatrixCell("c", "a", 0.9);
    three.plan.SetCorrMatrixCell("c", "b", -0.9);
    sim = three.MakeSimulator();
    ASSERT_TRUE(sim->PrepareGeneration().IsOK());
    EXPECT_TRUE(sim->GetWarnings().HasCode(MCSPStatus::kCorrelationAdjusted));
    EXPECT_TRUE(sim->DrawCase().IsOK());
}

TEST(CorrelationModel, AnUnusableInputFallsBackToItsTarget) {
    ClearLastAssertion();
    TestPlan t;
    t.AddInput("n", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    t.AddInput("bad", MakeDist(kDistGamma, {{"shape", -1.0}, {"scale", 1.0}}));
    t.plan.SetCorrMatrixCell("bad", "n", 0.3);
    auto sim = t.MakeSimulator();
    EXPECT_EQ(GetLastAssertion(),
              "SECSimulator: a distribution's parameters lie inside their domain");
    ASSERT_TRUE(sim->PrepareCorrelationModel().IsOK());
    EXPECT_TRUE(MCMV::IsMissing(sim->GetNortaPairs().at(0).fNormalCorr));
    EXPECT_EQ(sim->GetNormalCorrelations().GetElem(1, 0), 0.3);
}

TEST(CorrelationModel, AFailedRepairStopsEveryDraw) {
    TestPlan t;
    t.AddInput("a", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    t.AddInput("b", MakeDist(kDistNormal, {{"mean", 0.0}, {"stddev", 1.0}}));
    t.plan.SetCorrMatrixCell("b", "a", std::numeric_limits<double>::infinity());
    auto sim = t.MakeSimulator();
    EXPECT_EQ(sim->PrepareCorrelationModel().GetErrorCode(), MCSPStatus::kMergeFailed);
    EXPECT_EQ(sim->GetNormalCorrelations().GetNRows(), 0);
    EXPECT_EQ(sim->PrepareGeneration().GetErrorCode(), MCSPStatus::kMergeFailed);
    EXPECT_EQ(sim->DrawCase().GetErrorCode(), MCSPStatus::kMergeFailed);
    std::vector<double> values;
    EXPECT_EQ(sim->SimulatePredictors(values).GetErrorCode(), MCSPStatus::kMergeFailed);
    EXPECT_TRUE(MCMV::IsMissing(values.at(0)));
    // A worker copy must not fall back to independent draws.
    auto worker = sim->CreateWorker(0.5);
    worker->SetCaseQuota(10);
    worker->RunTask();
    EXPECT_EQ(worker->GetStatus().GetErrorCode(), MCSPStatus::kMergeFailed);
    EXPECT_EQ(worker->GetSimCaseCount(), 0);
}

TEST(CorrelationModel, CancellationEndsWithCode1AndKeepsNothing) {
    MCThread_800::MCStdThreadFactory factory;
    CancelAfter query(2);
    TestPlan t = FourInputs();
    t.settings.SetThreadFactory(&factory);
    t.settings.SetMaxThreadNum(2);
    t.settings.SetCancelPointer(&query);
    auto sim = t.MakeSimulator();
    EXPECT_EQ(sim->PrepareCorrelationModel().GetErrorCode(), MCSPStatus::kCancelled);
    EXPECT_EQ(sim->GetNormalCorrelations().GetNRows(), 0);
    EXPECT_TRUE(sim->GetCancelInfo()->IsCancel());
}

} // namespace
