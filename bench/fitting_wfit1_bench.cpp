// DFCAlgorithm::BuildModel on the fitting workload W-FIT-1 (wfit1_data.h), held in memory:
// four continuous fields with every default continuous candidate (LogNormal, Normal,
// Triangular, Uniform, Weibull, Gamma, Beta, Exponential; each field keeps those its support
// allows), two ordinal counts with Binomial, NegBin and Poisson, one categorical factor;
// interactive mode, so both Anderson-Darling and Kolmogorov-Smirnov are computed. The whole
// fit: the descriptive passes, the estimates, the likelihood fits, the chi-square tests, the
// EDF pass, the sort and the goodness-of-fit tasks. The argument is the number of threads.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/hostinterfaces.h"

#include "wfit1_data.h"

#include <benchmark/benchmark.h>

#include <sys/resource.h>

#include <memory>
#include <string>
#include <vector>

namespace {

using namespace MCMCSP_800;
using namespace MCSPConst;

//! The rows, made once.
const std::vector<MCXML_800::Record>& Rows() {
    static const std::vector<MCXML_800::Record> rows = [] {
        std::vector<MCXML_800::Record> out;
        out.reserve(static_cast<std::size_t>(wfit1::kRows));
        wfit1::Generator generator;
        for (long r = 0; r < wfit1::kRows; ++r) {
            const wfit1::Row row = generator.Next();
            std::vector<double> values(row.values, row.values + wfit1::kNFields - 1);
            values.push_back(static_cast<double>(row.group));
            out.emplace_back(std::move(values));
        }
        return out;
    }();
    return rows;
}

MCXML_800::MCVarList Variables() {
    MCXML_800::MCVarList vars;
    for (int f = 0; f + 1 < wfit1::kNFields; ++f) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>(wfit1::kFieldNames[f]));
    }
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        wfit1::kFieldNames[wfit1::kNFields - 1],
        MCXML_800::MCCatNumEncoder(std::vector<std::string>{"A", "B", "C"})));
    return vars;
}

DFCSettings Settings(int threads, MCThread_800::IMCThreadFactory* factory) {
    const std::vector<DistType> continuous = {kDistLognormal, kDistNormal,     kDistTriangular,
                                              kDistUniform,   kDistWeibull,    kDistGamma,
                                              kDistBeta,      kDistExponential};
    const std::vector<DistType> ordinal = {kDistBinomial, kDistNegbinomial, kDistPoisson};
    DFCSettings settings;
    for (int f = 0; f < 4; ++f) {
        static_cast<void>(settings.AddCovariate(f, continuous, kLevelContinuous, false));
    }
    for (int f = 4; f < 6; ++f) {
        static_cast<void>(settings.AddCovariate(f, ordinal, kLevelOrdinal, false));
    }
    static_cast<void>(settings.AddFactor(6, 3, {kDistCategorical}, kLevelCategorical, false));
    settings.SetInteractiveMode(true);
    settings.SetMaxThreadNum(threads);
    settings.SetThreadFactory(factory);
    return settings;
}

double PeakResidentMB() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    return static_cast<double>(usage.ru_maxrss) / 1024.0;
}

void BM_BuildModelWFit1(benchmark::State& state) {
    const auto& rows = Rows();
    const MCXML_800::MCVarList vars = Variables();
    MCThread_800::MCStdThreadFactory factory;
    const DFCSettings settings = Settings(static_cast<int>(state.range(0)), &factory);
    for (auto _ : state) {
        state.PauseTiming();
        MCCommon_800::MCMemoryRecordIter data(rows);
        state.ResumeTiming();
        DFCAlgorithm algorithm(settings, vars);
        const MCCommon_800::MCStatus status = algorithm.BuildModel(data, nullptr);
        if (status.IsError()) {
            state.SkipWithError("BuildModel failed");
            break;
        }
        benchmark::DoNotOptimize(algorithm.GetOutCovarVarInfo(0).fBestFitStat);
    }
    state.SetItemsProcessed(state.iterations() * wfit1::kRows);
    state.counters["peak_rss_MB"] = PeakResidentMB();
}
BENCHMARK(BM_BuildModelWFit1)->Arg(1)->Arg(2)->Unit(benchmark::kMillisecond)->UseRealTime();

} // namespace

BENCHMARK_MAIN();
