#!/usr/bin/python3
"""W-SIM-1 with OpenTURNS: the simulation `mcsim simulate wsim1.xml` runs.

    wsim1_openturns.py OUT.json [CASES [SEED]]      CASES defaults to 1,000,000

The six continuous inputs form a ComposedDistribution with a NormalCopula whose matrix is the
plan's correlation matrix (taken as the normal copula's, without NORTA's adjustment); the
categorical region is an independent UserDefined distribution of the codes 0, 1, 2 (north,
south, west at 0.5, 0.3, 0.2). The target of wsim1.model is a SymbolicFunction of the seven
columns; its mean, standard deviation, 95% confidence interval of the mean and a 1000-bin
histogram over its range (HistogramFactory) come from the output Sample. Prints one line;
OUT.json holds the figures.
"""
import json
import math
import sys
import time

import openturns as ot

CORRELATIONS = [
    [1.0, 0.5, 0.3, 0.2, -0.2, 0.1],
    [0.5, 1.0, 0.3, 0.1, 0.4, 0.2],
    [0.3, 0.3, 1.0, 0.0, 0.2, -0.1],
    [0.2, 0.1, 0.0, 1.0, 0.3, 0.3],
    [-0.2, 0.4, 0.2, 0.3, 1.0, 0.0],
    [0.1, 0.2, -0.1, 0.3, 0.0, 1.0]]
BINS = 1000
Z95 = 1.959963984540054


def main():
    if not 2 <= len(sys.argv) <= 4:
        sys.exit("usage: wsim1_openturns.py OUT.json [CASES [SEED]]")
    n = int(sys.argv[2]) if len(sys.argv) > 2 else 1000000
    seed = int(sys.argv[3]) if len(sys.argv) > 3 else 20261206
    start = time.perf_counter()
    ot.RandomGenerator.SetSeed(seed)
    corr = ot.CorrelationMatrix(6)
    for i in range(6):
        for j in range(i):
            corr[i, j] = CORRELATIONS[i][j]
    marginals = [
        ot.Normal(100.0, 15.0),
        ot.LogNormal(1.0, 0.5, 0.0),      # ln x ~ Normal(1, 0.5): median e
        ot.Triangular(1.0, 4.0, 10.0),    # a, mode, b
        ot.Uniform(0.0, 1.0),
        ot.Gamma(2.0, 0.5, 0.0),          # shape k, rate lambda, location
        ot.Beta(2.0, 5.0, 0.0, 1.0)]
    inputs = ot.ComposedDistribution(marginals, ot.NormalCopula(corr))
    region = ot.UserDefined(ot.Sample([[0.0], [1.0], [2.0]]), [0.5, 0.3, 0.2])
    # x0..x5 are normal, lognormal, triangular, uniform, gamma, beta ("gamma" and "beta" are
    # function names of the expression parser); x6 is the region code.
    model = ot.SymbolicFunction(
        ["x0", "x1", "x2", "x3", "x4", "x5", "x6"],
        ["2*x0 + 3*x1 - 1.5*x2 + 10*x3 + 0.7*x4 + 20*x5 + 5*(x6 == 1) - 3*(x6 == 2)"])

    sample = inputs.getSample(n)
    sample.stack(region.getSample(n))
    target = model(sample)

    mean = target.computeMean()[0]
    sd = target.computeStandardDeviation()[0]
    half = Z95 * sd / math.sqrt(n)
    histogram = ot.HistogramFactory().buildAsHistogram(target, BINS)
    seconds = time.perf_counter() - start
    low = histogram.getFirst()
    widths = list(histogram.getWidth())
    high = low + sum(widths)
    counts = [h * w * n for h, w in zip(histogram.getHeight(), widths)]
    result = {"tool": "openturns " + ot.__version__, "cases": n, "seed": seed,
              "seconds": seconds, "mean": mean, "sd": sd, "ci95": [mean - half, mean + half],
              "histogram_range": [low, high],
              "histogram_counts": counts}
    with open(sys.argv[1], "w", encoding="utf-8") as f:
        json.dump(result, f)
    print(f"openturns sim: {n} cases in {seconds:.3f} s ({n / seconds:.0f} cases/s); "
          f"mean {mean:.4f} [{mean - half:.4f}, {mean + half:.4f}], sd {sd:.4f}")


if __name__ == "__main__":
    main()
