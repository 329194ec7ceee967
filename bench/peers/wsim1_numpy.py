#!/usr/bin/python3
"""W-SIM-1 with NumPy/SciPy: the simulation `mcsim simulate wsim1.xml` runs.

    wsim1_numpy.py OUT.json [CASES [SEED]]      CASES defaults to 1,000,000

Six continuous inputs joined by a Gaussian copula, one independent categorical input, and
the linear target of wsim1.model:
  z = L e, e standard normal, L the Cholesky factor of the correlation matrix below (the
  plan's matrix taken as the normal copula's, without NORTA's adjustment);
  u = Phi(z); each input is its inverse distribution function at u (scipy.stats ppf; Normal
  and LogNormal straight from z, which is the same number);
  target = 2 normal + 3 lognormal - 1.5 triangular + 10 uniform + 0.7 gamma + 20 beta
           + (0, 5, -3) by region (north, south, west at 0.5, 0.3, 0.2).
Statistics of the target: mean, standard deviation, 95% confidence interval of the mean,
and a 1000-bin histogram between its extremes. Prints one line; OUT.json holds the figures.
"""
import json
import sys
import time

import numpy as np
from scipy import special, stats

CORRELATIONS = np.array([
    [1.0, 0.5, 0.3, 0.2, -0.2, 0.1],
    [0.5, 1.0, 0.3, 0.1, 0.4, 0.2],
    [0.3, 0.3, 1.0, 0.0, 0.2, -0.1],
    [0.2, 0.1, 0.0, 1.0, 0.3, 0.3],
    [-0.2, 0.4, 0.2, 0.3, 1.0, 0.0],
    [0.1, 0.2, -0.1, 0.3, 0.0, 1.0]])
COEFFICIENTS = np.array([2.0, 3.0, -1.5, 10.0, 0.7, 20.0])
REGION_PROBS = [0.5, 0.3, 0.2]
REGION_EFFECT = np.array([0.0, 5.0, -3.0])
BINS = 1000
Z95 = 1.959963984540054


def main():
    if not 2 <= len(sys.argv) <= 4:
        sys.exit("usage: wsim1_numpy.py OUT.json [CASES [SEED]]")
    n = int(sys.argv[2]) if len(sys.argv) > 2 else 1000000
    seed = int(sys.argv[3]) if len(sys.argv) > 3 else 20261206
    start = time.perf_counter()
    rng = np.random.default_rng(seed)
    chol = np.linalg.cholesky(CORRELATIONS)
    z = rng.standard_normal((n, 6)) @ chol.T
    u = special.ndtr(z)
    x = np.empty_like(z)
    x[:, 0] = 100.0 + 15.0 * z[:, 0]                            # Normal(100, 15)
    x[:, 1] = np.exp(1.0 + 0.5 * z[:, 1])                       # LogNormal, median e, b 0.5
    x[:, 2] = stats.triang.ppf(u[:, 2], (4.0 - 1.0) / 9.0, 1.0, 9.0)  # Triangular(1, 10, 4)
    x[:, 3] = stats.uniform.ppf(u[:, 3], 0.0, 1.0)              # Uniform(0, 1)
    x[:, 4] = stats.gamma.ppf(u[:, 4], 2.0, scale=1.0 / 0.5)    # Gamma, shape 2, rate 0.5
    x[:, 5] = stats.beta.ppf(u[:, 5], 2.0, 5.0)                 # Beta(2, 5)
    region = rng.choice(3, size=n, p=REGION_PROBS)
    target = x @ COEFFICIENTS + REGION_EFFECT[region]

    mean = float(target.mean())
    sd = float(target.std(ddof=1))
    half = Z95 * sd / np.sqrt(n)
    counts, edges = np.histogram(target, bins=BINS, range=(target.min(), target.max()))
    seconds = time.perf_counter() - start
    result = {"tool": "numpy " + np.__version__ + ", scipy " + __import__("scipy").__version__,
              "cases": n, "seed": seed, "seconds": seconds, "mean": mean, "sd": sd,
              "ci95": [mean - half, mean + half], "histogram_range": [edges[0], edges[-1]],
              "histogram_counts": counts.tolist()}
    with open(sys.argv[1], "w", encoding="utf-8") as f:
        json.dump(result, f)
    print(f"numpy sim: {n} cases in {seconds:.3f} s ({n / seconds:.0f} cases/s); "
          f"mean {mean:.4f} [{mean - half:.4f}, {mean + half:.4f}], sd {sd:.4f}")


if __name__ == "__main__":
    main()
