#include "cli/fitbootstrap.h"

#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/mcmv.h"
#include "mccommon/variables.h"
#include "simulation_common/mcspdistfamily.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <random>

namespace MCHost {

using MCCommon_800::MCMV;
using MCMCSP_800::DFCOutputStats;
using namespace MCSPConst;

namespace {

//! SplitMix64's finaliser (Steele, Lea and Flood 2014): consecutive inputs give unrelated seeds.
std::uint64_t Mix(std::uint64_t x) {
    x += 0x9E3779B97F4A7C15ULL;
    x = (x ^ (x >> 30)) * 0xBF58476D1CE4E5B9ULL;
    x = (x ^ (x >> 27)) * 0x94D049BB133111EBULL;
    return x ^ (x >> 31);
}

//! The seed of replicate `r` of family `type` of covariate `covariate`.
std::uint64_t StreamSeed(std::uint32_t seed, std::size_t covariate, DistType type, int r) {
    std::uint64_t s = Mix(seed);
    s = Mix(s ^ covariate);
    s = Mix(s ^ static_cast<std::uint64_t>(type));
    return Mix(s ^ static_cast<std::uint64_t>(r));
}

//! The statistic the bootstrap compares: chi-square of a count candidate, else the configured
//! EDF statistic.
double StatisticOf(const DFCOutputStats::DFCVarDistElement& e, MeasureLevel level,
                   GoodFitType gfType) {
    if (level != kLevelContinuous) {
        return e.fChiSquareFit;
    }
    return gfType == kKolmogorovSmirnov ? e.fKSFit : e.fADFit;
}

//! One replicate: a sample drawn from the fitted candidate by inversion, fitted again by a
//! one-field run of the component with the same family, level and statistic.
class ReplicateTask : public MCThread_800::IMCThreadTask {
public:
    ReplicateTask(DistType type, MeasureLevel level, GoodFitType gfType,
                  const std::vector<double>& params, std::int64_t n, std::uint64_t seed,
                  const std::function<bool()>& cancelled)
        : fType(type), fLevel(level), fGFType(gfType), fpParams(&params), fN(n), fSeed(seed),
          fpCancelled(&cancelled) {}

    void RunTask() override {
        if (*fpCancelled && (*fpCancelled)()) {
            return;
        }
        const MCMCSP_800::MCSPDistFamily* family = MCMCSP_800::MCSPFindDistFamily(fType);
        std::mt19937_64 engine(fSeed);
        std::vector<MCXML_800::Record> records;
        records.reserve(static_cast<std::size_t>(fN));
        for (std::int64_t i = 0; i < fN; ++i) {
            const double u = UnitFromBits(engine() >> 11);
            records.emplace_back(std::vector<double>{family->fQuantile(fpParams->data(), u)});
        }
        MCMCSP_800::DFCSettings settings;
        if (settings.AddCovariate(0, {fType}, fLevel, false) < 0) {
            return;
        }
        settings.SetGFType(fGFType);
        settings.SetMaxThreadNum(1);
        MCXML_800::MCVarList vars;
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>("x"));
        MCCommon_800::MCMemoryRecordIter data(std::move(records));
        MCMCSP_800::DFCAlgorithm algorithm(settings, vars);
        if (algorithm.BuildModel(data, nullptr).IsError()) {
            return;
        }
        const DFCOutputStats::DFCVarDistElement& e = algorithm.GetOutCovarDistInfo(0, fType);
        if (!e.fbDistAllowed || !family->IsValid(e.fDistParams)) {
            return;
        }
        fvParams = e.fDistParams;
        fStatistic = StatisticOf(e, fLevel, fGFType);
        fbDone = true;
    }

    bool fbDone = false;                 //!< the refit gave an estimate
    std::vector<double> fvParams;        //!< its parameters
    double fStatistic = MCMV::Missing(); //!< its statistic

private:
    DistType fType;                           //!< the candidate
    MeasureLevel fLevel;                      //!< the field's level
    GoodFitType fGFType;                      //!< the configured statistic
    const std::vector<double>* fpParams;      //!< the fitted parameters, not owned
    std::int64_t fN;                          //!< sample size
    std::uint64_t fSeed;                      //!< the stream's seed
    const std::function<bool()>* fpCancelled; //!< interrupt query, not owned
};

//! The replicates of one candidate.
struct CandidateRun {
    std::size_t fCovariate;                              //!< covariate position
    const DFCOutputStats::DFCVarDistElement* fpElement;  //!< the fitted candidate
    std::vector<std::unique_ptr<ReplicateTask>> fvTasks; //!< its replicates
};

//! Intervals and p-value of one candidate from its finished replicates.
FitBootstrap Summarise(const CandidateRun& run, const DFCOutputStats::DFCVarDistInfo& info,
                       GoodFitType gfType, double level) {
    const DFCOutputStats::DFCVarDistElement& e = *run.fpElement;
    FitBootstrap out;
    out.fField = info.fFittedVarName;
    out.fType = e.fDistType;
    out.fLevel = level;
    const std::size_t k = e.fDistParams.size();
    std::vector<std::vector<double>> columns(k);
    std::vector<double> stats;
    for (const auto& task : run.fvTasks) {
        if (!task->fbDone || task->fvParams.size() != k) {
            continue;
        }
        ++out.fReplicates;
        for (std::size_t j = 0; j < k; ++j) {
            columns[j].push_back(task->fvParams[j]);
        }
        stats.push_back(task->fStatistic);
    }
    out.fvLower.assign(k, MCMV::Missing());
    out.fvUpper.assign(k, MCMV::Missing());
    for (std::size_t j = 0; j < k; ++j) {
        PercentileInterval(columns[j], level, out.fvLower[j], out.fvUpper[j]);
    }
    // Only where the p-value is no formula's: a table's bounds, or none (Triangular, Beta).
    const bool ks = gfType == kKolmogorovSmirnov;
    const bool bounded = !MCMV::IsMissing(ks ? e.fKSPValueLower : e.fADPValueLower) ||
                         !MCMV::IsMissing(ks ? e.fKSPValueUpper : e.fADPValueUpper) ||
                         MCMV::IsMissing(ks ? e.fKSPValue : e.fADPValue);
    const double observed = StatisticOf(e, info.fMeasureLevel, gfType);
    if (info.fMeasureLevel == kLevelContinuous && bounded && !MCMV::IsMissing(observed) &&
        out.fReplicates > 0) {
        // (1 + #{T*_r ≥ T}) / (B + 1), Davison and Hinkley (1997), eq. 4.11.
        const auto atLeast = std::count_if(stats.begin(), stats.end(), [observed](double t) {
            return !MCMV::IsMissing(t) && t >= observed;
        });
        out.fPValue = (1.0 + static_cast<double>(atLeast)) / (out.fReplicates + 1.0);
    }
    return out;
}

} // namespace

double UnitFromBits(std::uint64_t bits) {
    return (static_cast<double>(bits & ((std::uint64_t{1} << 53) - 1)) + 0.5) * 0x1p-53;
}

void PercentileInterval(std::vector<double>& values, double level, double& lower, double& upper) {
    lower = upper = MCMV::Missing();
    if (values.empty()) {
        return;
    }
    std::sort(values.begin(), values.end());
    const auto at = [&values](double q) {
        const double h = (static_cast<double>(values.size()) - 1.0) * q;
        const auto i = static_cast<std::size_t>(std::floor(h));
        const std::size_t j = std::min(i + 1, values.size() - 1);
        return values[i] + (h - static_cast<double>(i)) * (values[j] - values[i]);
    };
    lower = at((1.0 - level) / 2.0);
    upper = at((1.0 + level) / 2.0);
}

std::vector<FitBootstrap> RunFitBootstrap(const DFCOutputStats& results,
                                          const FitBootstrapRequest& request,
                                          MCThread_800::IMCThreadFactory& threads) {
    const GoodFitType gfType = results.GetGFType();
    const auto& covariates = results.GetCovarDistInfo();
    std::vector<CandidateRun> runs;
    std::vector<MCThread_800::IMCThreadTask*> tasks;
    for (std::size_t i = 0; i < covariates.size(); ++i) {
        const DFCOutputStats::DFCVarDistInfo& info = covariates[i];
        if (info.fMeasureLevel == kLevelCategorical) {
            continue;
        }
        for (const DFCOutputStats::DFCVarDistElement& e : info.fDistElements) {
            const MCMCSP_800::MCSPDistFamily* family = MCMCSP_800::MCSPFindDistFamily(e.fDistType);
            if (!e.fbDistAllowed || !family || !family->HasDensity(e.fDistParams)) {
                continue;
            }
            CandidateRun run{i, &e, {}};
            for (int r = 0; r < request.fReplicates; ++r) {
                run.fvTasks.push_back(std::make_unique<ReplicateTask>(
                    e.fDistType, info.fMeasureLevel, gfType, e.fDistParams, request.fSampleSize,
                    StreamSeed(request.fSeed, i, e.fDistType, r), request.fCancelled));
                tasks.push_back(run.fvTasks.back().get());
            }
            runs.push_back(std::move(run));
        }
    }
    if (!tasks.empty()) {
        threads.CreateThreadGroup(std::max(1, request.fThreads))->Run(tasks);
    }
    std::vector<FitBootstrap> out;
    for (const CandidateRun& run : runs) {
        out.push_back(Summarise(run, covariates[run.fCovariate], gfType, request.fLevel));
    }
    return out;
}

} // namespace MCHost
