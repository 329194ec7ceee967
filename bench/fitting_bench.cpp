// Records per second through DFCAlgorithm::BuildModel on 1,000,000 rows with 5 covariates and
// 2 factors, every default candidate of each covariate's level, crosstabs on.
//
// The rows are synthesised on the fly from the row number (a counter-based generator with a
// fixed seed), so every pass sees the same data and no record is held in memory: the peak
// resident size reported beside the rate shows that the passes stream.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/hostinterfaces.h"

#include <benchmark/benchmark.h>

#include <sys/resource.h>

#include <cmath>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace {

using namespace MCMCSP_800;
using namespace MCSPConst;

constexpr std::int64_t kRows = 1000000;
constexpr std::uint64_t kSeed = 0x5eed2024ULL;
constexpr int kNVars = 7; // 5 covariates, then 2 factors

//! splitmix64 (Steele, Lea and Flood 2014): a counter-based generator, so row i is a pure
//! function of i and the seed.
std::uint64_t SplitMix64(std::uint64_t& state) {
    std::uint64_t z = (state += 0x9e3779b97f4a7c15ULL);
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ULL;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebULL;
    return z ^ (z >> 31);
}

//! A uniform in (0, 1) from the top 53 bits.
double Uniform(std::uint64_t& state) {
    return (static_cast<double>(SplitMix64(state) >> 11) + 0.5) * 0x1.0p-53;
}

//! The rows of the dataset, made as they are read:
//!   0 normal (mean 50, sd 10, Box-Muller), 1 gamma(2, 1), 2 uniform(10, 20),
//!   3 a proportion u1·u2 in (0, 1), 4 a geometric count (ordinal),
//!   5 a factor with 3 categories, 6 a factor with 4 categories.
class SyntheticRows : public MCCommon_800::MultiPassRecordIter {
public:
    explicit SyntheticRows(std::int64_t nRows) : fNRows(nRows), fRecord(kNVars) {}
    bool HasMore() override { return fNext < fNRows; }
    const MCXML_800::Record* NextRecord() override {
        std::uint64_t state = kSeed ^ (static_cast<std::uint64_t>(fNext) * 0x2545f4914f6cdd1dULL);
        const double u1 = Uniform(state);
        const double u2 = Uniform(state);
        const double u3 = Uniform(state);
        const double u4 = Uniform(state);
        fRecord[0] =
            50.0 + 10.0 * std::sqrt(-2.0 * std::log(u1)) * std::cos(6.283185307179586 * u2);
        fRecord[1] = -std::log(u1) - std::log(u3);
        fRecord[2] = 10.0 + 10.0 * u4;
        fRecord[3] = u2 * u3;
        fRecord[4] = std::floor(-3.0 * std::log(u4));
        fRecord[5] = std::floor(3.0 * u3);
        fRecord[6] = std::floor(4.0 * Uniform(state));
        ++fNext;
        return &fRecord;
    }
    int Restart() override {
        fNext = 0;
        return 0;
    }

private:
    std::int64_t fNRows;       //!< rows per pass
    std::int64_t fNext = 0;    //!< next row of this pass
    MCXML_800::Record fRecord; //!< the row last made
};

MCXML_800::MCVarList Variables() {
    MCXML_800::MCVarList vars;
    for (const char* name : {"normal", "gamma", "uniform", "share", "count"}) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
    }
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "f3", MCXML_800::MCCatNumEncoder(std::vector<std::string>{"a", "b", "c"})));
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "f4", MCXML_800::MCCatNumEncoder(std::vector<double>{1.0, 2.0, 3.0, 4.0})));
    return vars;
}

DFCSettings Settings() {
    const std::vector<DistType> continuous = {kDistLognormal, kDistNormal,     kDistTriangular,
                                              kDistUniform,   kDistWeibull,    kDistGamma,
                                              kDistBeta,      kDistExponential};
    const std::vector<DistType> ordinal = {kDistBinomial, kDistNegbinomial, kDistPoisson};
    DFCSettings settings;
    for (int i = 0; i < 4; ++i) {
        static_cast<void>(settings.AddCovariate(i, continuous, kLevelContinuous, false));
    }
    static_cast<void>(settings.AddCovariate(4, ordinal, kLevelOrdinal, false));
    static_cast<void>(settings.AddFactor(5, 3, {kDistCategorical}, kLevelCategorical, false));
    static_cast<void>(settings.AddFactor(6, 4, {kDistCategorical}, kLevelCategorical, false));
    settings.SetUseCrosstabs(true);
    return settings;
}

double PeakResidentMB() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    return static_cast<double>(usage.ru_maxrss) / 1024.0;
}

//! The whole BuildModel: settings checks, both passes, estimates.
void BM_BuildModel(benchmark::State& state) {
    const MCXML_800::MCVarList vars = Variables();
    const DFCSettings settings = Settings();
    for (auto _ : state) {
        DFCAlgorithm algorithm(settings, vars);
        SyntheticRows rows(kRows);
        const MCCommon_800::MCStatus status = algorithm.BuildModel(rows, nullptr);
        if (!status.IsOK()) {
            state.SkipWithError("BuildModel failed");
            break;
        }
        benchmark::DoNotOptimize(algorithm.GetValidWeight());
    }
    state.SetItemsProcessed(state.iterations() * kRows);
    state.counters["peak_rss_MB"] = PeakResidentMB();
}
BENCHMARK(BM_BuildModel)->Unit(benchmark::kMillisecond)->UseRealTime();

//! The synthetic rows alone, read twice as BuildModel reads them: the part of the above that
//! is the benchmark's own data source.
void BM_SyntheticRowsTwoPasses(benchmark::State& state) {
    for (auto _ : state) {
        SyntheticRows rows(kRows);
        double sum = 0.0;
        for (int pass = 0; pass < 2; ++pass) {
            static_cast<void>(rows.Restart());
            while (rows.HasMore()) {
                sum += (*rows.NextRecord())[0];
            }
        }
        benchmark::DoNotOptimize(sum);
    }
    state.SetItemsProcessed(state.iterations() * kRows);
}
BENCHMARK(BM_SyntheticRowsTwoPasses)->Unit(benchmark::kMillisecond)->UseRealTime();

} // namespace

BENCHMARK_MAIN();
