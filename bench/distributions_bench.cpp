// Cost of the distribution functions, quantiles and random draws on the simulation's hot
// paths: per case, one normal vector of the correlated inputs, one Φ(z) per input and one
// inverse distribution function per Gamma or Beta input; per fitted candidate, many CDFs.
#include "mcmath/mcdistfun.h"
#include "mcmath/mcquantile.h"
#include "mcmath/mcrandom.h"
#include "mcmath/mcsymmatrix.h"

#include <benchmark/benchmark.h>

#include <cmath>
#include <cstddef>
#include <vector>

namespace {

using namespace MCMath_800;

constexpr std::size_t kPool = 4096; // power of two: the index wraps with a mask

//! A fixed pool of probabilities Φ(z) for standard normal z, as the copula produces them,
//! cycled so that the generator's cost stays out of the timing.
std::vector<double> MakeProbabilities() {
    MCURandom stream(20240601u);
    MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    (void)normal.SetParamNormal();
    std::vector<double> ps(kPool);
    for (double& p : ps) {
        p = MCDistFun::CdfStdNorm(normal.GetRandom());
    }
    return ps;
}

//! Gamma-distributed points of shape α (unit rate) for the CDF timings.
std::vector<double> MakeGammaPoints(double alpha) {
    std::vector<double> ps = MakeProbabilities();
    for (double& p : ps) {
        p = MCDistFun::IdfGam(p, alpha, 1.0);
    }
    return ps;
}

void BM_IdfGam(benchmark::State& state, double alpha) {
    const std::vector<double> ps = MakeProbabilities();
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(MCDistFun::IdfGam(ps[i++ & (kPool - 1)], alpha, 2.0));
    }
}
BENCHMARK_CAPTURE(BM_IdfGam, shape_0_3, 0.3);
BENCHMARK_CAPTURE(BM_IdfGam, shape_2_5, 2.5);
BENCHMARK_CAPTURE(BM_IdfGam, shape_50, 50.0);

void BM_GammaQuantile(benchmark::State& state, double alpha) {
    const std::vector<double> ps = MakeProbabilities();
    const MCGammaQuantile quantile(alpha, 2.0);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(quantile(ps[i++ & (kPool - 1)]));
    }
}
BENCHMARK_CAPTURE(BM_GammaQuantile, shape_0_3, 0.3);
BENCHMARK_CAPTURE(BM_GammaQuantile, shape_2_5, 2.5);
BENCHMARK_CAPTURE(BM_GammaQuantile, shape_50, 50.0);

void BM_GammaQuantileSetup(benchmark::State& state) {
    for (auto _ : state) {
        const MCGammaQuantile quantile(2.5, 2.0);
        benchmark::DoNotOptimize(quantile.IsValid());
    }
}
BENCHMARK(BM_GammaQuantileSetup)->Unit(benchmark::kMicrosecond);

void BM_IdfBeta(benchmark::State& state, double a, double b) {
    const std::vector<double> ps = MakeProbabilities();
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(MCDistFun::IdfBeta(ps[i++ & (kPool - 1)], a, b));
    }
}
BENCHMARK_CAPTURE(BM_IdfBeta, a_0_5_b_3, 0.5, 3.0);
BENCHMARK_CAPTURE(BM_IdfBeta, a_2_b_5, 2.0, 5.0);
BENCHMARK_CAPTURE(BM_IdfBeta, a_50_b_80, 50.0, 80.0);

void BM_BetaQuantile(benchmark::State& state, double a, double b) {
    const std::vector<double> ps = MakeProbabilities();
    const MCBetaQuantile quantile(a, b);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(quantile(ps[i++ & (kPool - 1)]));
    }
}
BENCHMARK_CAPTURE(BM_BetaQuantile, a_0_5_b_3, 0.5, 3.0);
BENCHMARK_CAPTURE(BM_BetaQuantile, a_2_b_5, 2.0, 5.0);
BENCHMARK_CAPTURE(BM_BetaQuantile, a_50_b_80, 50.0, 80.0);

void BM_BetaQuantileSetup(benchmark::State& state) {
    for (auto _ : state) {
        const MCBetaQuantile quantile(2.0, 5.0);
        benchmark::DoNotOptimize(quantile.IsValid());
    }
}
BENCHMARK(BM_BetaQuantileSetup)->Unit(benchmark::kMicrosecond);

void BM_IdfNorm(benchmark::State& state) {
    const std::vector<double> ps = MakeProbabilities();
    const MCNormalQuantile quantile(1.0, 2.0);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(quantile(ps[i++ & (kPool - 1)]));
    }
}
BENCHMARK(BM_IdfNorm);

void BM_CdfGam(benchmark::State& state, double alpha) {
    const std::vector<double> xs = MakeGammaPoints(alpha);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(MCDistFun::CdfGam(xs[i++ & (kPool - 1)], alpha, 1.0));
    }
}
BENCHMARK_CAPTURE(BM_CdfGam, shape_0_3, 0.3);
BENCHMARK_CAPTURE(BM_CdfGam, shape_2_5, 2.5);
BENCHMARK_CAPTURE(BM_CdfGam, shape_50, 50.0);

void BM_CdfStdNorm(benchmark::State& state) {
    MCURandom stream(7u);
    MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    (void)normal.SetParamNormal();
    std::vector<double> zs(kPool);
    for (double& z : zs) {
        z = normal.GetRandom();
    }
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(MCDistFun::CdfStdNorm(zs[i++ & (kPool - 1)]));
    }
}
BENCHMARK(BM_CdfStdNorm);

void BM_UniformDraw(benchmark::State& state) {
    MCURandom stream(629111597u);
    for (auto _ : state) {
        benchmark::DoNotOptimize(stream.GetRandom());
    }
}
BENCHMARK(BM_UniformDraw);

void BM_NormalDraw(benchmark::State& state) {
    MCURandom stream(629111597u);
    MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    (void)normal.SetParamNormal();
    for (auto _ : state) {
        benchmark::DoNotOptimize(normal.GetRandom());
    }
}
BENCHMARK(BM_NormalDraw);

//! A 6 x 6 correlation matrix of the kind the copula produces: AR(1)-like, ρ_ij = 0.6^|i−j|.
MCSymMatrix AutoregressiveSix() {
    MCSymMatrix m(6);
    for (int i = 0; i < 6; ++i) {
        for (int j = 0; j <= i; ++j) {
            m.SetElem(i, j, std::pow(0.6, i - j));
        }
    }
    return m;
}

void BM_MultivariateNormal6(benchmark::State& state) {
    MCURandom stream(629111597u);
    MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    if (!normal.SetParamNormal(std::vector<double>(6, 0.0), 1.0, AutoregressiveSix())) {
        state.SkipWithError("matrix refused");
        return;
    }
    std::vector<double> x(6);
    for (auto _ : state) {
        benchmark::DoNotOptimize(normal.GetRandom(x));
        benchmark::DoNotOptimize(x.data());
    }
}
BENCHMARK(BM_MultivariateNormal6);

} // namespace

BENCHMARK_MAIN();
