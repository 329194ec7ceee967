// Hot path of the chart accumulators: one UpdateData per simulated case and target, with the
// layouts the simulation uses (1000-bin histograms keeping the second moment, 200 x 200
// scatter-plot grids). Values are drawn beforehand and cycled, so only the update is timed.
#include "simulation_common/mcsphistogramdata.h"
#include "simulation_common/mcspscatterplotdata.h"

#include <benchmark/benchmark.h>

#include <random>
#include <vector>

using namespace MCMCSP_800;

namespace {

constexpr std::size_t kValues = 1 << 14; // cycled; a power of 2 for a cheap wrap

//! Values in [0, 10), except a share `outlierPercent` / 100 in [-5, 0) and [10, 15).
std::vector<double> MakeValues(int outlierPercent, unsigned seed) {
    std::mt19937_64 rng(seed);
    std::uniform_real_distribution<double> inside(0.0, 10.0), side(0.0, 5.0);
    std::bernoulli_distribution isOutlier(outlierPercent / 100.0), below(0.5);
    std::vector<double> values(kValues);
    for (double& x : values) {
        x = isOutlier(rng) ? (below(rng) ? -side(rng) : 10.0 + side(rng)) : inside(rng);
    }
    return values;
}

// Argument: percentage of values outside the range (they go to the ordered outlier map; with
// 1000 bins of width 0.01 there are up to 1000 distinct outlier bins).
void BM_HistogramUpdate(benchmark::State& state) {
    const std::vector<double> values = MakeValues(static_cast<int>(state.range(0)), 1);
    MCHistogramData histogram(1000, 0.0, 10.0, true);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(histogram.UpdateData(1.0, 1.0, values[i]));
        i = (i + 1) & (kValues - 1);
    }
    benchmark::DoNotOptimize(histogram.GetMean());
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_HistogramUpdate)->Arg(0)->Arg(10)->Arg(100);

// Argument: percentage of pairs whose x lies off the grid.
void BM_ScatterPlotUpdateBinned(benchmark::State& state) {
    const std::vector<double> xs = MakeValues(static_cast<int>(state.range(0)), 2);
    const std::vector<double> ys = MakeValues(0, 3);
    MCScatterPlotData scatter(200, 200, 0.0, 0.0, 10.0, 10.0, true);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(scatter.UpdateData(1.0, 1.0, xs[i], ys[i]));
        i = (i + 1) & (kValues - 1);
    }
    benchmark::DoNotOptimize(scatter.GetTotalWeight());
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_ScatterPlotUpdateBinned)->Arg(0)->Arg(10);

} // namespace

BENCHMARK_MAIN();
