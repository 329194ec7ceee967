// Throughput of the simulation's input generation on the W-SIM-1 input set: six correlated
// continuous inputs (Normal(100, 15), LogNormal(a = e, b = 0.5), Triangular(1, 10, 4),
// Uniform(0, 1), Gamma(shape 2, rate 0.5), Beta(2, 5)) and one categorical input with three
// categories. One case is one correlated normal vector (one triangular multiply), six
// transforms (two prepared quantiles) and one categorical draw, with truncation by rejection.
//
//   BM_DrawCase                  cases per second of one simulator (items_per_second)
//   BM_DrawCase_Truncated        the same with bounds that reject about a third of the attempts
//   BM_CaseWorkers/threads:n     cases per second of n case workers on the standard thread
//                                factory (wall clock)
//   BM_CorrelationModel/n        the NORTA model of the 15 pairs on n threads (wall clock)
//   BM_Transform/<type>          one transform z → value of a single input
//   BM_PrepareCount/<type>       preparing the exact inverse of a count input
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secgeneration.h"
#include "simulation_evaluation/secsettings.h"
#include "simulation_evaluation/secsimulator.h"

#include "mcmath/mcrandom.h"
#include "mcthread/mcthread.h"

#include <benchmark/benchmark.h>

#include "wsim1_plan.h"

#include <cmath>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

using namespace MCMCSP_800;
using namespace MCSPConst;
using wsim1::WSim1;

void DrawCases(benchmark::State& state, bool truncated) {
    const WSim1 w(truncated);
    auto sim = w.Master();
    if (!sim) {
        state.SkipWithError("preparation failed");
        return;
    }
    long long rejections = 0;
    for (auto _ : state) {
        if (!sim->DrawCase().IsOK()) {
            state.SkipWithError("case failed");
            break;
        }
        rejections += sim->GetLastRejections();
        benchmark::DoNotOptimize(sim->GetCaseValues().data());
    }
    state.SetItemsProcessed(state.iterations());
    state.counters["rejected_per_case"] =
        static_cast<double>(rejections) / static_cast<double>(state.iterations());
}

void BM_DrawCase(benchmark::State& state) {
    DrawCases(state, false);
}
BENCHMARK(BM_DrawCase);

void BM_DrawCase_Truncated(benchmark::State& state) {
    DrawCases(state, true);
}
BENCHMARK(BM_DrawCase_Truncated);

//! Case workers of one master, each drawing its quota on its own thread.
void BM_CaseWorkers(benchmark::State& state) {
    const int threads = static_cast<int>(state.range(0));
    constexpr int kCasesPerWorker = 200000;
    WSim1 w(false, threads);
    auto master = w.Master();
    if (!master) {
        state.SkipWithError("preparation failed");
        return;
    }
    for (auto _ : state) {
        std::vector<std::unique_ptr<SECSimulator>> workers;
        std::vector<MCThread_800::IMCThreadTask*> tasks;
        for (int t = 0; t < threads; ++t) {
            workers.push_back(master->CreateWorker(master->GetStream()->GetRandom()));
            workers.back()->SetCaseQuota(kCasesPerWorker);
            tasks.push_back(workers.back().get());
        }
        w.factory.CreateThreadGroup(threads)->Run(tasks);
    }
    state.SetItemsProcessed(state.iterations() * threads * kCasesPerWorker);
}
BENCHMARK(BM_CaseWorkers)->Arg(1)->Arg(2)->UseRealTime()->Unit(benchmark::kMillisecond);

void BM_CorrelationModel(benchmark::State& state) {
    const WSim1 w(false, static_cast<int>(state.range(0)));
    for (auto _ : state) {
        SECSimulator sim(&w.settings, &w.plan, &w.vars, 0, nullptr, -1.0, nullptr);
        if (!sim.PrepareCorrelationModel().IsOK()) {
            state.SkipWithError("correlation model failed");
            break;
        }
        benchmark::DoNotOptimize(sim.GetNormalCorrelations().GetElem(1, 0));
    }
}
BENCHMARK(BM_CorrelationModel)->Arg(1)->Arg(2)->UseRealTime()->Unit(benchmark::kMillisecond);

void BM_Transform(benchmark::State& state, DistType type, std::vector<double> params) {
    SECInputGenerator gen;
    if (!SECPrepareGenerator(type, params, gen)) {
        state.SkipWithError("bad parameters");
        return;
    }
    constexpr std::size_t kPool = 4096;
    MCMath_800::MCURandom stream(20240601u);
    MCMath_800::MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    (void)normal.SetParamNormal();
    std::vector<double> zs(kPool);
    for (double& z : zs) {
        z = normal.GetRandom();
    }
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(SECTransform(gen, zs[i++ & (kPool - 1)]));
    }
}
BENCHMARK_CAPTURE(BM_Transform, Normal, kDistNormal, {100.0, 15.0});
BENCHMARK_CAPTURE(BM_Transform, LogNormal, kDistLognormal, {std::exp(1.0), 0.5});
BENCHMARK_CAPTURE(BM_Transform, Triangular, kDistTriangular, {1.0, 10.0, 4.0});
BENCHMARK_CAPTURE(BM_Transform, Uniform, kDistUniform, {0.0, 1.0});
BENCHMARK_CAPTURE(BM_Transform, Gamma, kDistGamma, {2.0, 0.5});
BENCHMARK_CAPTURE(BM_Transform, Beta, kDistBeta, {2.0, 5.0});
// Count inputs, inverted exactly at every mean: Poisson(m), NegBin(3, 3/(m + 3)) and
// Binomial(4m, 0.25) (Binomial(2, 0.25) for m = 0.5) at means 0.5, 33, 1000 and 10^6.
BENCHMARK_CAPTURE(BM_Transform, Poisson_0_5, kDistPoisson, {0.5});
BENCHMARK_CAPTURE(BM_Transform, Poisson_33, kDistPoisson, {33.0});
BENCHMARK_CAPTURE(BM_Transform, Poisson_1000, kDistPoisson, {1000.0});
BENCHMARK_CAPTURE(BM_Transform, Poisson_1e6, kDistPoisson, {1e6});
BENCHMARK_CAPTURE(BM_Transform, NegBin_0_5, kDistNegbinomial, {3.0, 3.0 / 3.5, 0.0});
BENCHMARK_CAPTURE(BM_Transform, NegBin_33, kDistNegbinomial, {3.0, 3.0 / 36.0, 0.0});
BENCHMARK_CAPTURE(BM_Transform, NegBin_1000, kDistNegbinomial, {3.0, 3.0 / 1003.0, 0.0});
BENCHMARK_CAPTURE(BM_Transform, NegBin_1e6, kDistNegbinomial, {3.0, 3.0 / 1000003.0, 0.0});
BENCHMARK_CAPTURE(BM_Transform, Binomial_0_5, kDistBinomial, {2.0, 0.25});
BENCHMARK_CAPTURE(BM_Transform, Binomial_33, kDistBinomial, {132.0, 0.25});
BENCHMARK_CAPTURE(BM_Transform, Binomial_1000, kDistBinomial, {4000.0, 0.25});
BENCHMARK_CAPTURE(BM_Transform, Binomial_1e6, kDistBinomial, {4e6, 0.25});

//! Preparing one count input: its table of F over the central 1 − 2·10^−12 of the mass.
void BM_PrepareCount(benchmark::State& state, DistType type, std::vector<double> params) {
    for (auto _ : state) {
        SECInputGenerator gen;
        benchmark::DoNotOptimize(SECPrepareGenerator(type, params, gen));
    }
}
BENCHMARK_CAPTURE(BM_PrepareCount, Poisson_1e6, kDistPoisson, {1e6})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_PrepareCount, NegBin_1e6, kDistNegbinomial, {3.0, 3.0 / 1000003.0, 0.0})
    ->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
