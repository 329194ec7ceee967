// Per-update cost of the weighted accumulators on their hot paths: one MCContStats update per
// simulated target value, one six-variable MCProvMeans row per case, one histogram update per
// record or case.
#include "mcmath/mcaccumulators.h"

#include <benchmark/benchmark.h>

#include <random>
#include <vector>

namespace {

using namespace MCMath_800;

// A fixed pool of inputs, cycled, so the generator's cost stays out of the timing.
std::vector<double> MakeValues(std::size_t n, unsigned seed) {
    std::mt19937_64 gen(seed);
    std::normal_distribution<double> normal(5.0, 2.0);
    std::vector<double> v(n);
    for (double& x : v) {
        x = normal(gen);
    }
    return v;
}

constexpr std::size_t kPool = 4096; // power of two: the index wraps with a mask

void BM_ContStatsUpdate(benchmark::State& state) {
    const std::vector<double> values = MakeValues(kPool, 1);
    MCContStats stats;
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(stats.Update(values[i], 1.0));
        i = (i + 1) & (kPool - 1);
    }
    benchmark::DoNotOptimize(stats.GetVariance());
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_ContStatsUpdate);

void BM_ProvMeansUpdate6(benchmark::State& state) {
    constexpr int kVars = 6;
    const std::vector<double> values = MakeValues(kPool * kVars, 2);
    MCProvMeans means(kVars, true);
    std::size_t row = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(means.Update(values.data() + row * kVars, kVars, 1.0));
        row = (row + 1) & (kPool - 1);
    }
    benchmark::DoNotOptimize(means.GetXProds().GetElem(5, 0));
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_ProvMeansUpdate6);

void BM_HistogramUpdateData(benchmark::State& state) {
    const std::vector<double> values = MakeValues(kPool, 3);
    // The simulation's 1000 bins over a range that leaves a few values outside.
    MCHistogramData hist(static_cast<int>(state.range(0)), -1.0, 11.0, true);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(hist.UpdateData(1.0, 1.0, values[i]));
        i = (i + 1) & (kPool - 1);
    }
    benchmark::DoNotOptimize(hist.GetTotalWeight());
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_HistogramUpdateData)->Arg(20)->Arg(1000);

} // namespace

BENCHMARK_MAIN();
