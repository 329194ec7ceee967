#include "mcmath/mcoptimizer.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <boost/math/special_functions/digamma.hpp>
#include <boost/math/special_functions/gamma.hpp>
#include <boost/math/special_functions/trigamma.hpp>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <numeric>
#include <stdexcept>
#include <thread>
#include <tuple>
#include <vector>

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using namespace MCMath_800;

namespace {

// -LL of the Beta from its sufficient statistics n, S1 = Σ ln x, S2 = Σ ln(1-x), with gradient,
// Hessian and constraint rows: LL(a, b) = n·(lnΓ(a+b) - lnΓ(a) - lnΓ(b)) + (a-1)·S1 + (b-1)·S2.
struct BetaAccum : IMCOptAccumStats {
    BetaAccum(std::vector<double>* params, double n, double s1, double s2)
        : fpParams(params), fN(n), fS1(s1), fS2(s2) {
        fHessian.SetNRows(2);
    }
    void Reset(int, bool) override {
        fObjective = 0.0;
        fvScores.assign(2, 0.0);
        fHessian.Reset();
    }
    int UpdateForRow(const std::vector<double>&, int) override { return 1; }
    double GetObjective() const override { return fObjective; }
    const std::vector<double>& GetScores() const override { return fvScores; }
    void GetHessian(MCSymMatrix& out) const override { out = fHessian; }
    int GetNConstr() const override { return static_cast<int>(fvRows.size()); }
    bool GetConstrVarCoeff(int index, std::vector<double>& coeffs,
                           double& constant) const override {
        if (index < 0 || index >= GetNConstr()) {
            return false;
        }
        std::tie(coeffs, constant) = fvRows[static_cast<std::size_t>(index)];
        return true;
    }
    void GetCounts(int& valid, int& invalid, double& weight) const override {
        valid = invalid = 0;
        weight = fN;
    }
    MCStatus GetStatus() const override { return MCStatus(); }
    bool FinishComputations(int flag) override {
        namespace bm = boost::math;
        const double a = (*fpParams)[0];
        const double b = (*fpParams)[1];
        if (!(a > 0.0 && b > 0.0)) {
            fObjective = std::numeric_limits<double>::infinity();
            return true;
        }
        fObjective = -(fN * (bm::lgamma(a + b) - bm::lgamma(a) - bm::lgamma(b)) + (a - 1.0) * fS1 +
                       (b - 1.0) * fS2);
        if (flag == 1) {
            const double psiAB = bm::digamma(a + b);
            fvScores = {-(fN * (psiAB - bm::digamma(a)) + fS1),
                        -(fN * (psiAB - bm::digamma(b)) + fS2)};
            const double triAB = bm::trigamma(a + b);
            fHessian.SetElem(0, 0, -fN * (triAB - bm::trigamma(a)));
            fHessian.SetElem(1, 0, -fN * triAB);
            fHessian.SetElem(1, 1, -fN * (triAB - bm::trigamma(b)));
        }
        return true;
    }

    std::vector<double>* fpParams;
    double fN, fS1, fS2;
    double fObjective = 0.0;
    std::vector<double> fvScores{0.0, 0.0};
    MCSymMatrix fHessian;
    //! Constraint rows c·θ + constant ≥ 0: the bounds a, b ≥ 1e-5, then any a test adds.
    std::vector<std::pair<std::vector<double>, double>> fvRows{{{1.0, 0.0}, -1e-5},
                                                               {{0.0, 1.0}, -1e-5}};
};

// A data handler without records: each evaluation only finishes the accumulator, recording the
// flags of every call; it can fail (or throw) at a chosen call.
struct StatsHandler : IMCOptDataHandler {
    void SetAccumStats(IMCOptAccumStats* accum) override { fpAccum = accum; }
    void ResetAccumStats(int mode, bool check) override {
        if (fpAccum) {
            fpAccum->Reset(mode, check);
        }
    }
    IMCOptAccumStats* GetAccumStats() override { return fpAccum; }
    const IMCOptAccumStats* GetAccumStatsPtr() const override { return fpAccum; }
    void ClearAccumStats() override { fpAccum = nullptr; }
    MCStatus ComputeStatsForOptimizer(int flags) override {
        fvFlags.push_back(flags);
        if (!fpAccum || flags == 0) {
            return MCStatus(kOptStatusNoStats, false);
        }
        if (static_cast<int>(fvFlags.size()) == fFailAt) {
            if (fbThrow) {
                throw std::runtime_error("handler failure");
            }
            return fFailStatus;
        }
        return fpAccum->FinishComputations((flags & 6) ? 1 : 0) ? MCStatus() : fpAccum->GetStatus();
    }
    const std::vector<MCStatus>& GetWarnings() const override { return fvWarnings; }
    void EndOptimization() override { ++fEnded; }

    IMCOptAccumStats* fpAccum = nullptr;
    std::vector<MCStatus> fvWarnings;
    std::vector<int> fvFlags; //!< flags of every call
    int fFailAt = -1;         //!< call (from 1) that fails
    MCStatus fFailStatus;     //!< what it returns
    bool fbThrow = false;     //!< throw instead
    int fEnded = 0;           //!< EndOptimization calls
};

// Data sets x_i = g((i + 0.5)/n), i = 0 .. n-1, and their estimates by mpmath at 40 digits:
//
//   from mpmath import mp, mpf, log, digamma, findroot
//   mp.dps = 40
//   def fit(xs):
//       n = len(xs); s1 = sum(log(x) for x in xs)/n; s2 = sum(log(1-x) for x in xs)/n
//       f = lambda a, b: [digamma(a)-digamma(a+b)-s1, digamma(b)-digamma(a+b)-s2]
//       a, b = findroot(f, (1, 1))                     # unconstrained maximum
//       ac = a*mpf('0.8')                                # bound a <= ac, active
//       bb = findroot(lambda b: digamma(b)-digamma(ac+b)-s2, b)
//       sc = (a+b)*mpf('0.7')                            # row a + b <= sc, active
//       t = findroot(lambda t: digamma(sc-t)-digamma(t)-(s2-s1), a*mpf('0.7'))
//       return a, b, ac, bb, sc, t, sc-t
//   e.g. fit([((mpf(i)+mpf('0.5'))/40)**2 for i in range(40)])
//
// On the line a + b = s, lnΓ(a+b) is constant: the maximum solves ψ(s-t) - ψ(t) = (S2 - S1)/n.
struct BetaCase {
    const char* fName;
    double (*fData)(double u); //!< x = g(u)
    int fN;
    double fA, fB;               //!< unconstrained estimate
    double fBoundA, fBoundB;     //!< estimate under a ≤ fBoundA
    double fSum, fLineA, fLineB; //!< estimate under a + b ≤ fSum
};

// clang-format off
const BetaCase kBetaCases[] = {
    {"Square40", [](double u) { return u * u; }, 40, 0.51061011618689355279, 1.0265246553492867695,
     0.40848809294951484223, 0.88799367219835992807, 1.0759943400753262256,
     0.38978764557834553845, 0.68620669449698068718},
    {"Sqrt200", [](double u) { return std::sqrt(u); }, 200, 2.0112983546250382372,
     1.0049457598199743262, 1.6090386837000305897, 0.87568043270245783639, 2.1113708801115087944,
     1.3655313281929311952, 0.74583955191857759913},
    {"Narrow25", [](double u) { return 0.3 + 0.4 * u; }, 25, 9.170442851348686019,
     9.170442851348686019, 7.3363542810789488152, 7.4331557939382639741, 12.838619991888160427,
     6.4193099959440802133, 6.4193099959440802133},
    {"Cube60", [](double u) { return u * u * u; }, 60, 0.33762522776087413198,
     1.0192946775589153125, 0.27010018220869930559, 0.88065710160898133064,
     0.94984393372385261112, 0.27486082864741401535, 0.67498310507643859576},
};
// clang-format on

// One Beta problem: parameters starting at the moment estimates (divisor n-1, as the fitting
// does), its accumulator and a handler.
struct BetaProblem {
    explicit BetaProblem(const BetaCase& c) {
        std::vector<double> x;
        double s1 = 0.0, s2 = 0.0, var = 0.0;
        for (int i = 0; i < c.fN; ++i) {
            x.push_back(c.fData((i + 0.5) / c.fN));
            s1 += std::log(x.back());
            s2 += std::log1p(-x.back());
        }
        const double mean = std::accumulate(x.begin(), x.end(), 0.0) / c.fN;
        for (double v : x) {
            var += (v - mean) * (v - mean) / (c.fN - 1);
        }
        const double t = (1.0 - mean) * mean / var - 1.0;
        fvParams = fvStart = {mean * t, (1.0 - mean) * t};
        fpAccum = std::make_unique<BetaAccum>(&fvParams, c.fN, s1, s2);
    }
    MCStatus Run(const MCOptimParams& settings = MCOptimParams()) {
        fpOptimizer = MCOptimFactory::OptimFactory(&fHandler, fpAccum.get(), fvParams, settings);
        return fpOptimizer->Optimize();
    }

    std::vector<double> fvStart;
    std::vector<double> fvParams;
    std::unique_ptr<BetaAccum> fpAccum;
    StatsHandler fHandler;
    std::unique_ptr<IMCOptimizer> fpOptimizer;
};

// The fitting's default settings (Hessian at the end, parameter rule, start repair) with one or
// two changed.
MCOptimParams With(int MCOptimParams::*field, int value, int MCOptimParams::*field2 = nullptr,
                   int value2 = 0) {
    MCOptimParams p;
    p.*field = value;
    if (field2 != nullptr) {
        p.*field2 = value2;
    }
    return p;
}

// The search stops at a relative step below 1e-10; SLSQP's last steps are superlinear, not yet
// quadratic, and leave errors up to about 1e-8 here.
constexpr double kEstimateTol = 1e-7;

void ExpectEstimate(const std::vector<double>& params, double a, double b, double rel) {
    EXPECT_NEAR_REL(params[0], a, rel);
    EXPECT_NEAR_REL(params[1], b, rel);
}

class BetaFit : public ::testing::TestWithParam<BetaCase> {};

TEST_P(BetaFit, ReachesTheEstimateFreeAndUnderActiveConstraints) {
    const BetaCase& c = GetParam();
    BetaProblem p(c);
    const MCStatus status = p.Run();
    ASSERT_TRUE(status.IsOK()) << status.GetErrorCode();
    EXPECT_EQ(p.fHandler.GetAccumStats(), p.fpAccum.get());
    ExpectEstimate(p.fvParams, c.fA, c.fB, kEstimateTol);
    // The accumulator holds the estimate's objective, scores (near 0 at an interior maximum)
    // and Hessian: the last call asked for all of them.
    EXPECT_EQ(p.fpAccum->GetObjective(), p.fpOptimizer->GetObjective());
    EXPECT_EQ(p.fHandler.fvFlags.back(), kOptCompScores | kOptCompHessian);
    for (double s : p.fpAccum->GetScores()) {
        EXPECT_LT(std::fabs(s), 1e-5 * c.fN);
    }
    for (const int f : p.fHandler.fvFlags) { // no call mixes value and derivatives
        EXPECT_FALSE((f & kOptCompObjective) && (f & (kOptCompScores | kOptCompHessian))) << f;
    }
    EXPECT_EQ(p.fHandler.fEnded, 1);
    EXPECT_LT(p.fpOptimizer->GetNEvaluations(), 200);

    // An active bound and an active general row stop the search on them.
    BetaProblem bound(c);
    bound.fpAccum->fvRows.push_back({{-1.0, 0.0}, c.fBoundA}); // a ≤ fBoundA: passed as a bound
    ASSERT_TRUE(bound.Run().IsOK());
    EXPECT_LE(bound.fvParams[0], c.fBoundA);
    ExpectEstimate(bound.fvParams, c.fBoundA, c.fBoundB, kEstimateTol);
    EXPECT_NEAR_REL(bound.fvParams[0], c.fBoundA, 1e-10);

    BetaProblem row(c);
    row.fpAccum->fvRows.push_back({{-1.0, -1.0}, c.fSum}); // a + b ≤ fSum: a general row
    ASSERT_TRUE(row.Run().IsOK());
    // Feasible up to the row tolerance 1e-11, and on the row.
    EXPECT_LE(row.fvParams[0] + row.fvParams[1], c.fSum + 1e-11 * std::max(1.0, c.fSum));
    ExpectEstimate(row.fvParams, c.fLineA, c.fLineB, kEstimateTol);

    // The objective rule (1e-12 relative leaves about sqrt(1e-12·|LL|/(n·ψ')) < 1e-6 on the
    // parameters) and COBYLA (whose linear models end less sharply) reach the estimate too.
    BetaProblem byObjective(c);
    ASSERT_TRUE(byObjective.Run(With(&MCOptimParams::fConvergenceRule, 2)).IsOK());
    ExpectEstimate(byObjective.fvParams, c.fA, c.fB, 1e-5);

    BetaProblem derivativeFree(c);
    ASSERT_TRUE(
        derivativeFree
            .Run(With(&MCOptimParams::fDerivativeLevel, 0, &MCOptimParams::fMaxEvaluations, 5000))
            .IsOK());
    ExpectEstimate(derivativeFree.fvParams, c.fA, c.fB, 1e-5);
    for (int f : derivativeFree.fHandler.fvFlags) {
        EXPECT_TRUE(f == kOptCompObjective || f == kOptCompScores);
    }
}

INSTANTIATE_TEST_SUITE_P(Reference, BetaFit, ::testing::ValuesIn(kBetaCases),
                         [](const ::testing::TestParamInfo<BetaCase>& p) { return p.param.fName; });

TEST(MCOptimizer, StartOutsideTheBoundsIsMovedInsideAndEvaluationLimitWarns) {
    BetaProblem p(kBetaCases[0]);
    p.fvParams = {-2.0, 0.5};
    ASSERT_TRUE(p.Run().IsOK());
    ExpectEstimate(p.fvParams, kBetaCases[0].fA, kBetaCases[0].fB, kEstimateTol);

    // The evaluation limit gives a warning and a feasible point.
    BetaProblem limited(kBetaCases[2]);
    limited.fvParams = {0.5, 30.0};
    const MCStatus status = limited.Run(With(&MCOptimParams::fMaxEvaluations, 3));
    EXPECT_TRUE(status.IsWarning());
    EXPECT_EQ(status.GetErrorCode(), kOptStatusNoConvergence);
    EXPECT_TRUE(limited.fvParams[0] >= 1e-5 && limited.fvParams[1] >= 1e-5);
    EXPECT_TRUE(std::isfinite(limited.fpOptimizer->GetObjective()));
}

// A failure reported (or thrown) by the handler at its third call ends the run with that status
// and restores the start values.
struct FailCase {
    const char* fName;
    long fCode;
    bool fbThrow; //!< throw instead
    long fExpected;
};

class OptimizerFailure : public ::testing::TestWithParam<FailCase> {};

TEST_P(OptimizerFailure, HandlerErrorEndsTheRun) {
    const FailCase& c = GetParam();
    BetaProblem p(kBetaCases[1]);
    p.fHandler.fFailAt = 3;
    p.fHandler.fFailStatus = MCStatus(c.fCode, false);
    p.fHandler.fbThrow = c.fbThrow;
    const MCStatus status = p.Run();
    EXPECT_TRUE(status.IsError());
    EXPECT_EQ(status.GetErrorCode(), c.fExpected);
    EXPECT_EQ(p.fvParams, p.fvStart);
    EXPECT_EQ(p.fHandler.fvFlags.size(), 3u);
    EXPECT_TRUE(MCMV::IsMissing(p.fpOptimizer->GetObjective()));
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, OptimizerFailure, ::testing::Values(
    FailCase{"NoRecord", kOptStatusNoRecord, false, kOptStatusNoRecord},
    FailCase{"RestartFailed", kOptStatusRestartFailed, false, kOptStatusRestartFailed},
    FailCase{"Cancelled", MCCommon_800::kCancelledCode, false, MCCommon_800::kCancelledCode},
    FailCase{"Throws", 0, true, kOptStatusFailed}),
    [](const ::testing::TestParamInfo<FailCase>& p) { return p.param.fName; });
// clang-format on

// Unusable set-ups are refused before any evaluation, the parameters left as they were.
struct SetupCase {
    const char* fName;
    std::vector<double> fvStart;
    std::vector<double> fvRow; //!< extra constraint row (empty: none)
    double fConstant;
    MCOptimParams fSettings;
};

class OptimizerSetup : public ::testing::TestWithParam<SetupCase> {};

TEST_P(OptimizerSetup, IsRefusedWithoutEvaluating) {
    const SetupCase& c = GetParam();
    BetaProblem p(kBetaCases[0]);
    p.fvParams = c.fvStart;
    if (!c.fvRow.empty()) {
        p.fpAccum->fvRows.push_back({c.fvRow, c.fConstant});
    }
    EXPECT_EQ(p.Run(c.fSettings).GetErrorCode(), kOptStatusBadSetup);
    EXPECT_TRUE(p.fHandler.fvFlags.empty());
    EXPECT_TRUE(std::equal(p.fvParams.begin(), p.fvParams.end(), c.fvStart.begin(), c.fvStart.end(),
                           [](double x, double y) {
                               return static_cast<bool>(mctest::Near(x, y, 0.0)); // NaN kept
                           }));
}

const MCOptimParams kDefault;

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, OptimizerSetup, ::testing::Values(
    SetupCase{"ContradictoryBounds", {1.0, 1.0}, {-1.0, 0.0}, -1.0, kDefault},
    SetupCase{"RowThatNeverHolds", {1.0, 1.0}, {0.0, 0.0}, -1.0, kDefault},
    SetupCase{"RowOfWrongLength", {1.0, 1.0}, {1.0, 1.0, 1.0}, 0.0, kDefault},
    SetupCase{"NonFiniteStart", {MCMV::Missing(), 1.0}, {}, 0.0, kDefault},
    SetupCase{"NoParameters", {}, {}, 0.0, kDefault},
    SetupCase{"StartOutsideWithoutRepair", {-2.0, 0.5}, {}, 0.0,
              With(&MCOptimParams::fConstraintMode, 1)},
    SetupCase{"NoRule", {1.0, 1.0}, {}, 0.0, With(&MCOptimParams::fConvergenceRule, 0)},
    SetupCase{"NoEvaluations", {1.0, 1.0}, {}, 0.0, With(&MCOptimParams::fMaxEvaluations, 0)}),
    [](const ::testing::TestParamInfo<SetupCase>& p) { return p.param.fName; });
// clang-format on

TEST(MCOptimizer, MissingAccumulatorIsReportedAsNoStatistics) {
    std::vector<double> params{1.0, 1.0};
    StatsHandler handler;
    const auto optimizer = MCOptimFactory::OptimFactory(&handler, nullptr, params, MCOptimParams());
    EXPECT_EQ(optimizer->Optimize().GetErrorCode(), kOptStatusNoStats);
    EXPECT_EQ(params, (std::vector<double>{1.0, 1.0}));
}

// The fitting runs one optimiser per (field, distribution) task on several threads at once:
// each run owns its NLopt state, so concurrent runs give the serial results bit for bit.
TEST(MCOptimizer, ConcurrentRunsGiveTheSerialResults) {
    std::vector<std::vector<double>> serial;
    for (const BetaCase& c : kBetaCases) {
        BetaProblem p(c);
        ASSERT_TRUE(p.Run().IsOK());
        serial.push_back(p.fvParams);
    }
    std::vector<std::vector<double>> concurrent(serial.size());
    std::vector<std::thread> threads;
    for (std::size_t k = 0; k < serial.size(); ++k) {
        threads.emplace_back([k, &concurrent] {
            for (int repeat = 0; repeat < 20; ++repeat) {
                BetaProblem p(kBetaCases[k]);
                if (p.Run().IsOK()) {
                    concurrent[k] = p.fvParams;
                }
            }
        });
    }
    for (std::thread& t : threads) {
        t.join();
    }
    EXPECT_EQ(concurrent, serial);
}

} // namespace
