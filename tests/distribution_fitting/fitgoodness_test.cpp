// BuildModel's goodness-of-fit steps end to end on real data (data/gof_*.csv, numbers from
// data/gof_make_reference.py): EDF statistics, p-values and best fit of the Nile flows,
// chi-square of the visit counts, Empirical fallbacks, weights against repeated rows,
// thread-count independence and cancellation.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"

#include "fit_host.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {
constexpr double kMissing = MCCommon_800::MCMV::Missing();
} // namespace

#include "data/diag_reference.inc"
#include "data/gof_reference.inc"

using namespace MCMCSP_800;
using namespace MCSPConst;
using namespace dfctest;
using MCCommon_800::MCMemoryRecordIter;
using MCCommon_800::MCMV;
using MCXML_800::Record;
using Element = DFCOutputStats::DFCVarDistElement;

namespace {

const std::vector<DistType> kContinuous = {kDistLognormal, kDistNormal,     kDistTriangular,
                                           kDistUniform,   kDistWeibull,    kDistGamma,
                                           kDistBeta,      kDistExponential};

Rows Column(const std::vector<double>& values) {
    Rows rows;
    for (double v : values) {
        rows.push_back({v});
    }
    return rows;
}

DFCSettings OneCovariate(const std::vector<DistType>& types, MeasureLevel level, GoodFitType gf,
                         bool interactive) {
    DFCSettings settings;
    EXPECT_EQ(settings.AddCovariate(0, types, level, false), 1);
    settings.SetGFType(gf);
    settings.SetInteractiveMode(interactive);
    settings.SetBins(10);
    return settings;
}

//! The Nile reference of `type`; Uniform and Triangular with A² and D over the 98 values
//! strictly inside their support (diag_reference.inc).
gofref::FitCase NileFit(DistType type) {
    gofref::FitCase fit =
        *std::find_if(gofref::kNileFits.begin(), gofref::kNileFits.end(),
                      [type](const gofref::FitCase& c) { return c.type == type; });
    const std::string interior = type == kDistUniform ? "NileUniform" : "NileTriangular";
    for (const diagref::EdfCase& c : diagref::kEdfCases) {
        if ((type == kDistUniform || type == kDistTriangular) && interior == c.name) {
            fit.a2 = c.a2;
            fit.d = c.d;
        }
    }
    return fit;
}

std::vector<DistType> ReportedTypes(const DFCOutputStats::DFCVarDistInfo& info) {
    std::vector<DistType> types;
    for (const Element& e : info.fReportedElements) {
        types.push_back(e.fDistType);
    }
    return types;
}

//! The Empirical proportions of the Nile flows in 10 equal bins over [min, max], counted here.
std::vector<double> NileBinProportions() {
    const auto [lo, hi] = std::minmax_element(gofref::kNile.begin(), gofref::kNile.end());
    std::vector<double> p(10, 0.0);
    for (double x : gofref::kNile) {
        const int b = std::min(9, static_cast<int>((x - *lo) / ((*hi - *lo) / 10.0)));
        p[static_cast<std::size_t>(b)] += 0.01;
    }
    return p;
}

// The Nile flows: every continuous candidate, both statistics.

TEST(NileFits, StatisticsPValuesAndBestFit) {
    FitRun run(Column(gofref::kNile),
               OneCovariate(kContinuous, kLevelContinuous, kAndersonDarling, true));
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    EXPECT_FALSE(info.fDistElements[kDistBeta].fbDistAllowed); // flows above 1
    for (const gofref::FitCase& c : gofref::kNileFits) {
        const Element& e = info.fDistElements[static_cast<std::size_t>(c.type)];
        SCOPED_TRACE(e.fDistName);
        ASSERT_TRUE(e.fbDistAllowed);
        // The root searches stop at |F| ≤ 1e-6 on the likelihood equation: Weibull's shape
        // lands within about 1e-6 relative, the Gamma's large shape (≈ 30) within 1e-4.
        const bool rootSearch = c.type == kDistGamma || c.type == kDistWeibull;
        const double paramTol = c.type == kDistGamma ? 2e-4 : (rootSearch ? 1e-5 : 1e-13);
        ASSERT_EQ(e.fDistParams.size(), c.params.size());
        for (std::size_t j = 0; j < c.params.size(); ++j) {
            EXPECT_NEAR_TOL(e.fDistParams[j], c.params[j], paramTol, 1e-300);
        }
        // Uniform and Triangular: A² and D over the interior values, fitdiagnostics_test.cpp.
        if (c.type == kDistUniform || c.type == kDistTriangular) {
            continue;
        }
        const double statTol = rootSearch ? 1e-3 : 1e-10;
        EXPECT_NEAR_REL(e.fADFit, c.a2, statTol);
        EXPECT_NEAR_REL(e.fKSFit, c.d, statTol);
        EXPECT_NEAR_REL(e.fADZStar, c.zStar, statTol);
        EXPECT_NEAR_REL(e.fKSDStat, c.dStar, statTol);
        if (c.type == kDistTriangular) {
            // The placeholder p-value is not reported.
            EXPECT_TRUE(MCMV::IsMissing(e.fADPValue) && MCMV::IsMissing(e.fKSPValue));
        } else {
            EXPECT_NEAR_TOL(e.fADPValue, c.pAD, statTol, rootSearch ? 2e-3 : 1e-12);
            EXPECT_NEAR_TOL(e.fKSPValue, c.pKS, statTol, rootSearch ? 2e-3 : 1e-12);
        }
    }
    const gofref::FitCase best = NileFit(static_cast<DistType>(gofref::kNileBestAD));
    EXPECT_EQ(info.fDistBestType, gofref::kNileBestAD);
    EXPECT_EQ(info.fDistBestADType, gofref::kNileBestAD);
    EXPECT_EQ(info.fDistBestKSType, gofref::kNileBestKS);
    EXPECT_NEAR_REL(info.fBestFitStat, best.a2, 1e-10);
    EXPECT_NEAR_REL(info.fBestFitPValue, best.pAD, 1e-10);
    EXPECT_EQ(info.fDistBestParams, info.fDistElements[gofref::kNileBestAD].fDistParams);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kPoorBestFit), 0); // p ≈ 0.2
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kNoFit), 0);

    // Reported: the seven tested candidates by A² ascending, then the Empirical fallback.
    std::vector<gofref::FitCase> byA2;
    for (const gofref::FitCase& c : gofref::kNileFits) {
        byA2.push_back(NileFit(static_cast<DistType>(c.type)));
    }
    std::sort(byA2.begin(), byA2.end(), [](auto& a, auto& b) { return a.a2 < b.a2; });
    std::vector<DistType> expected;
    for (const auto& c : byA2) {
        expected.push_back(static_cast<DistType>(c.type));
    }
    expected.push_back(kDistEmpirical);
    EXPECT_EQ(ReportedTypes(info), expected);
    const Element& empirical = info.fReportedElements.back();
    const std::vector<double> bins = NileBinProportions();
    ASSERT_EQ(empirical.fDistParams.size(), 3 + bins.size());
    EXPECT_EQ(empirical.fDistParams[0], 456.0);
    EXPECT_EQ(empirical.fDistParams[1], 1370.0);
    EXPECT_NEAR_REL(empirical.fDistParams[2], std::sqrt(gofref::kNileVariance), 1e-12);
    for (std::size_t b = 0; b < bins.size(); ++b) {
        EXPECT_NEAR_REL(empirical.fDistParams[3 + b], bins[b], 1e-12);
    }
}

TEST(NileFits, KolmogorovSmirnovAloneChoosesByD) {
    FitRun run(Column(gofref::kNile),
               OneCovariate(kContinuous, kLevelContinuous, kKolmogorovSmirnov, false));
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    EXPECT_EQ(info.fDistBestType, gofref::kNileBestKS);
    EXPECT_EQ(info.fDistBestKSType, gofref::kNileBestKS);
    EXPECT_EQ(info.fDistBestADType, kDistUnknown); // not computed
    EXPECT_NEAR_REL(info.fBestFitStat, NileFit(static_cast<DistType>(gofref::kNileBestKS)).d,
                    1e-10);
    for (const Element& e : info.fReportedElements) {
        EXPECT_TRUE(MCMV::IsMissing(e.fADFit)) << e.fDistName;
    }
    for (std::size_t k = 1; k + 1 < info.fReportedElements.size(); ++k) {
        EXPECT_LE(info.fReportedElements[k - 1].fKSFit, info.fReportedElements[k].fKSFit);
    }
}

TEST(NileFits, IntegerWeightsEqualRepeatedRows) {
    Rows weighted;
    Rows repeated;
    for (std::size_t i = 0; i < gofref::kNile.size(); ++i) {
        const double w = 1.0 + static_cast<double>(i % 3);
        weighted.push_back({gofref::kNile[i], w});
        repeated.insert(repeated.end(), static_cast<std::size_t>(w), {gofref::kNile[i], 1.0});
    }
    DFCSettings settings = OneCovariate(kContinuous, kLevelContinuous, kAndersonDarling, true);
    FitRun plain(repeated, settings);
    ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    FitRun withWeights(weighted, settings);
    ASSERT_FALSE(plain.Build().IsError() || withWeights.Build().IsError());
    for (DistType type : kContinuous) {
        const Element& a = plain.Covariate(0).fDistElements[type];
        const Element& b = withWeights.Covariate(0).fDistElements[type];
        SCOPED_TRACE(a.fDistName);
        // The sums run in another order; the root searches may then stop a step apart.
        const double tol = type == kDistGamma || type == kDistWeibull ? 1e-3 : 1e-11;
        EXPECT_EQ(a.fbDistAllowed, b.fbDistAllowed);
        EXPECT_NEAR_REL(b.fADFit, a.fADFit, tol);
        EXPECT_NEAR_REL(b.fKSFit, a.fKSFit, tol);
        EXPECT_NEAR_REL(b.fKSPValue, a.fKSPValue, tol);
    }
}

TEST(NileFits, ShiftToNegativeValuesKeepsTheLocationScaleFits) {
    // x - 845 spans both signs; 845 occurs three times, once made -0.0, which ties with 0.0.
    // Normal, Uniform and Triangular move with the data, so u, A² and D stay those of the
    // flows: the values must sort the same.
    std::vector<double> shifted;
    bool negativeZero = true;
    for (double x : gofref::kNile) {
        shifted.push_back(x == 845.0 && negativeZero ? -0.0 : x - 845.0);
        negativeZero = negativeZero && x != 845.0;
    }
    FitRun run(Column(shifted), OneCovariate({kDistNormal, kDistTriangular, kDistUniform},
                                             kLevelContinuous, kAndersonDarling, true));
    ASSERT_FALSE(run.Build().IsError());
    for (DistType type : {kDistNormal, kDistTriangular, kDistUniform}) {
        const Element& e = run.Covariate(0).fDistElements[type];
        SCOPED_TRACE(e.fDistName);
        EXPECT_NEAR_REL(e.fADFit, NileFit(type).a2, 1e-9);
        EXPECT_NEAR_REL(e.fKSFit, NileFit(type).d, 1e-9);
    }
}

// Special bests and the Empirical fallback of continuous fields.

TEST(BestFit, TriangularHasNoPValueNoneLeftIsEmpirical) {
    FitRun tri(Column(gofref::kNile),
               OneCovariate({kDistTriangular}, kLevelContinuous, kAndersonDarling, false));
    ASSERT_FALSE(tri.Build().IsError());
    EXPECT_EQ(tri.Covariate(0).fDistBestType, kDistTriangular);
    EXPECT_EQ(tri.Covariate(0).fBestFitStat,
              tri.Covariate(0).fDistElements[kDistTriangular].fADFit);
    EXPECT_TRUE(MCMV::IsMissing(tri.Covariate(0).fBestFitPValue));
    EXPECT_EQ(tri.CountWarnings(MCSPStatus::kPoorBestFit), 0);
    ASSERT_EQ(tri.Covariate(0).fReportedElements.size(), 2u);
    EXPECT_TRUE(MCMV::IsMissing(tri.Covariate(0).fReportedElements[0].fADPValue));

    // Beta is the only candidate and the flows lie above 1: the histogram is the Empirical best.
    FitRun run(Column(gofref::kNile),
               OneCovariate({kDistBeta}, kLevelContinuous, kAndersonDarling, false));
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    EXPECT_EQ(info.fDistBestType, kDistEmpirical);
    EXPECT_EQ(info.fDistBestName, "Empirical");
    const std::vector<double> bins = NileBinProportions();
    ASSERT_EQ(info.fDistBestParams.size(), 3 + bins.size());
    for (std::size_t b = 0; b < bins.size(); ++b) {
        EXPECT_NEAR_REL(info.fDistBestParams[3 + b], bins[b], 1e-12);
    }
    EXPECT_EQ(ReportedTypes(info), std::vector<DistType>{kDistEmpirical});
}

// Chi-square of the visit counts (an ordinal covariate with frequency weights).

Rows VisitRows() {
    Rows rows;
    for (std::size_t i = 0; i < gofref::kVisits.size(); ++i) {
        rows.push_back({gofref::kVisits[i], gofref::kHouseholds[i]});
    }
    return rows;
}

const gofref::ChiCase& Chi(const std::string& name) {
    return *std::find_if(gofref::kChiCases.begin(), gofref::kChiCases.end(),
                         [&name](const gofref::ChiCase& c) { return name == c.name; });
}

TEST(VisitCounts, ChiSquareAgainstScipyAndBestFit) {
    DFCSettings settings = OneCovariate({kDistBinomial, kDistNegbinomial, kDistPoisson},
                                        kLevelOrdinal, kAndersonDarling, false);
    ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    FitRun run(VisitRows(), settings);
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    EXPECT_FALSE(info.fDistElements[kDistBinomial].fbDistAllowed); // variance above the mean
    const gofref::ChiCase& poisson = Chi("VisitsPoisson");
    const gofref::ChiCase& negbin = Chi("VisitsNegBin");
    const Element& p = info.fDistElements[kDistPoisson];
    const Element& nb = info.fDistElements[kDistNegbinomial];
    EXPECT_NEAR_REL(p.fDistParams[0], gofref::kVisitsMean, 1e-13);
    EXPECT_NEAR_REL(p.fChiSquareFit, poisson.stat, 1e-10);
    EXPECT_NEAR_TOL(p.fChiSquarePValue, poisson.p, 1e-9, 1e-300);
    // r = max(1, round(root)); the root (≈ 0.68) is far from a rounding edge.
    EXPECT_EQ(nb.fDistParams[0], negbin.params[0]);
    EXPECT_NEAR_REL(nb.fDistParams[1], negbin.params[1], 1e-13);
    EXPECT_NEAR_REL(nb.fChiSquareFit, negbin.stat, 1e-10);
    EXPECT_NEAR_TOL(nb.fChiSquarePValue, negbin.p, 1e-9, 1e-300);

    const bool negbinBest = negbin.stat < poisson.stat;
    const gofref::ChiCase& best = negbinBest ? negbin : poisson;
    EXPECT_EQ(info.fDistBestType, negbinBest ? kDistNegbinomial : kDistPoisson);
    EXPECT_NEAR_REL(info.fBestFitStat, best.stat, 1e-10);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kPoorBestFit), best.p < 0.05 ? 1 : 0);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kLowExpectedOrException), poisson.nLow + negbin.nLow);
    // Reported: both tests by statistic, then the observed proportions.
    const std::vector<DistType> order =
        negbinBest ? std::vector<DistType>{kDistNegbinomial, kDistPoisson, kDistEmpirical}
                   : std::vector<DistType>{kDistPoisson, kDistNegbinomial, kDistEmpirical};
    EXPECT_EQ(ReportedTypes(info), order);
    const Element& empirical = info.fReportedElements.back();
    ASSERT_EQ(empirical.fDistParams.size(), 3 + poisson.counts.size());
    EXPECT_EQ(empirical.fDistParams[1], poisson.maximum);
    for (std::size_t c = 0; c < poisson.counts.size(); ++c) {
        EXPECT_NEAR_REL(empirical.fDistParams[3 + c], poisson.counts[c] / poisson.total, 1e-14);
    }
}

TEST(VisitCounts, NothingFitsGivesTheEmpiricalBestAndAWarning) {
    DFCSettings settings = OneCovariate({kDistBinomial}, kLevelOrdinal, kAndersonDarling, false);
    ASSERT_TRUE(settings.SetFrequencyWeightVar(1));
    FitRun run(VisitRows(), settings);
    ASSERT_FALSE(run.Build().IsError());
    const auto& info = run.Covariate(0);
    EXPECT_EQ(run.CountWarnings(MCSPStatus::kNoFit), 1);
    EXPECT_EQ(info.fDistBestType, kDistEmpirical);
    EXPECT_EQ(info.fDistBestParams[0], 0.0);
    EXPECT_EQ(info.fDistBestParams[1], 77.0);
}

// Threads and cancellation.

//! The Nile flows beside the first 100 food shares: two covariates, 15 tasks.
Rows TwoCovariates() {
    Rows rows;
    for (std::size_t i = 0; i < gofref::kNile.size(); ++i) {
        rows.push_back({gofref::kNile[i], gofref::kShares[i]});
    }
    return rows;
}

DFCSettings TwoCovariateSettings(int threads, MCThread_800::IMCThreadFactory* factory) {
    DFCSettings settings;
    EXPECT_EQ(settings.AddCovariate(0, kContinuous, kLevelContinuous, false), 1);
    EXPECT_EQ(settings.AddCovariate(1, kContinuous, kLevelContinuous, false), 2);
    settings.SetInteractiveMode(true);
    settings.SetMaxThreadNum(threads);
    settings.SetThreadFactory(factory);
    return settings;
}

bool SameBits(double a, double b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
}

TEST(Threads, OneAndTwoThreadsGiveIdenticalResults) {
    MCThread_800::MCStdThreadFactory factory;
    FitRun one(TwoCovariates(), TwoCovariateSettings(1, &factory));
    FitRun two(TwoCovariates(), TwoCovariateSettings(2, &factory));
    ASSERT_FALSE(one.Build().IsError() || two.Build().IsError());
    EXPECT_EQ(one.Algo().GetWarnings(), two.Algo().GetWarnings());
    for (int i = 0; i < 2; ++i) {
        const auto& a = one.Covariate(i);
        const auto& b = two.Covariate(i);
        EXPECT_EQ(a.fDistBestType, b.fDistBestType);
        EXPECT_TRUE(SameBits(a.fBestFitStat, b.fBestFitStat));
        ASSERT_EQ(ReportedTypes(a), ReportedTypes(b));
        for (std::size_t k = 0; k < a.fDistElements.size(); ++k) {
            const Element& ea = a.fDistElements[k];
            const Element& eb = b.fDistElements[k];
            ASSERT_EQ(ea.fDistParams.size(), eb.fDistParams.size());
            for (std::size_t j = 0; j < ea.fDistParams.size(); ++j) {
                EXPECT_TRUE(SameBits(ea.fDistParams[j], eb.fDistParams[j])) << ea.fDistName;
            }
            for (auto m : {&Element::fADFit, &Element::fADZStar, &Element::fADPValue,
                           &Element::fKSFit, &Element::fKSDStat, &Element::fKSPValue}) {
                EXPECT_TRUE(SameBits(ea.*m, eb.*m)) << ea.fDistName;
            }
        }
    }
}

//! Records in memory; on pass `pass` (from 1) another thread cancels: through the algorithm at
//! the pass's first record, or through the host's query once the pass has no more records.
class CancelOnPass : public MCCommon_800::MultiPassRecordIter {
public:
    CancelOnPass(MCMemoryRecordIter& data, int pass, bool viaQuery)
        : fData(data), fPass(pass), fbViaQuery(viaQuery) {}
    DFCAlgorithm* fpAlgorithm = nullptr;
    FlagCancel fQuery;
    bool HasMore() override {
        const bool more = fData.HasMore();
        if (!more && fbViaQuery && fData.GetPassCount() == fPass) {
            std::thread([this]() { fQuery.fbRaised = true; }).join();
        }
        return more;
    }
    const Record* NextRecord() override {
        if (!fbViaQuery && fData.GetPassCount() == fPass && !fbDone) {
            fbDone = true;
            std::thread([this]() { fpAlgorithm->Cancel(); }).join();
        }
        return fData.NextRecord();
    }
    int Restart() override { return fData.Restart(); }

private:
    MCMemoryRecordIter& fData;
    int fPass;
    bool fbViaQuery;
    bool fbDone = false;
};

class Cancel : public ::testing::TestWithParam<bool> {};

TEST_P(Cancel, DuringTheGoodnessOfFitStepEndsWithStatusOne) {
    MCThread_800::MCStdThreadFactory factory;
    FitRun run(TwoCovariates(), TwoCovariateSettings(2, &factory));
    CancelOnPass data(run.Data(), 3, GetParam());
    data.fpAlgorithm = &run.Algo();
    run.Algo().SetCancelPtr(&data.fQuery);
    EXPECT_EQ(run.Algo().BuildModel(data, nullptr), MCStatus(MCSPStatus::kCancelled, false));
    EXPECT_FALSE(run.Algo().IsModelBuilt());
}

INSTANTIATE_TEST_SUITE_P(Ways, Cancel, ::testing::Values(false, true), [](const auto& row) {
    return row.param ? std::string("QueryDuringTasks") : std::string("AlgorithmDuringPass");
});

} // namespace
