#!/usr/bin/python3
"""W-FIT-1 with NumPy/SciPy: the work `mcsim fit DATA.csv` does, end to end from the CSV file.

    wfit1_scipy.py DATA.csv OUT.json

Per column, as mcsim's fitting does it:
  * a text column is categorical: its category proportions;
  * a column of whole numbers with at most 20 distinct values is ordinal: Binomial (only when
    the variance is below the mean, n from the moments), negative binomial and Poisson by
    maximum likelihood, each tested by the chi-square statistic over the bins 0..max (the
    last bin holds the upper tail); the smallest statistic is the best;
  * any other column is continuous: every candidate whose support holds the data (LogNormal,
    Gamma and Weibull need x > 0, Exponential x >= 0, Beta 0 < x < 1) fitted by maximum
    likelihood with scipy.stats.<dist>.fit and the location fixed as mcsim fixes it (0 for
    lognorm, gamma, weibull_min and expon; 0 and scale 1 for beta; the sample extremes,
    widened by 1e-9 of the range, for triang, whose mode alone is estimated), then the
    Anderson-Darling A^2 of each fit on the sorted column; the smallest A^2 is the best.
The Pearson correlations of the numeric columns are computed as well.

Parameters are written in mcsim's parameterisation (Gamma's second parameter and the
Exponential's parameter are rates; LogNormal's a is exp(meanlog)). Prints one line with the
seconds spent; OUT.json holds the fits.
"""
import json
import sys
import time

import numpy as np
from scipy import optimize, stats

MAX_ORDINAL_VALUES = 20


def anderson_darling(u):
    """A^2 of the fitted distribution function values u of the sorted sample.

    A^2 = -n + sum_i [ (2i-1)/n (ln(1-u_i) - ln u_i) - 2 ln(1-u_i) ], which equals the usual
    -n - (1/n) sum (2i-1)[ln u_i + ln(1-u_(n+1-i))]. As in mcsim, values with u outside (0, 1)
    (a sample extreme on the edge of a fitted support) add nothing.
    """
    n = u.size
    i = np.arange(1, n + 1, dtype=float)
    ok = (u > 0.0) & (u < 1.0)
    uo = u[ok]
    l1 = np.log1p(-uo)
    return float(-n + np.sum((2.0 * i[ok] - 1.0) / n * (l1 - np.log(uo)) - 2.0 * l1))


def fit_continuous(x):
    xs = np.sort(x)
    lo, hi = xs[0], xs[-1]
    fits = {}

    def add(name, params, cdf):
        fits[name] = {"params": params, "stat": anderson_darling(cdf(xs))}

    mu, sd = stats.norm.fit(x)
    add("Normal", {"mean": mu, "stddev": sd}, lambda v: stats.norm.cdf(v, mu, sd))
    loc, scale = stats.uniform.fit(x)
    add("Uniform", {"min": loc, "max": loc + scale},
        lambda v: stats.uniform.cdf(v, loc, scale))
    if hi > lo:
        # Endpoints at the sample extremes, widened by 1e-9 of the range so that no value
        # sits where the density is 0; the mode by maximum likelihood.
        d = 1e-9 * (hi - lo)
        c, loc_t, scale_t = stats.triang.fit(x, floc=lo - d, fscale=hi - lo + 2 * d)
        add("Triangular", {"min": lo, "max": hi, "mode": loc_t + c * scale_t},
            lambda v: stats.triang.cdf(v, c, loc_t, scale_t))
    if lo > 0.0:
        s, _, sc = stats.lognorm.fit(x, floc=0)
        add("Lognormal", {"a": sc, "b": s}, lambda v: stats.lognorm.cdf(v, s, 0, sc))
        a, _, sc_g = stats.gamma.fit(x, floc=0)
        add("Gamma", {"shape": a, "scale": 1.0 / sc_g},
            lambda v: stats.gamma.cdf(v, a, 0, sc_g))
        k, _, sc_w = stats.weibull_min.fit(x, floc=0)
        add("Weibull", {"a": sc_w, "b": k, "c": 0.0},
            lambda v: stats.weibull_min.cdf(v, k, 0, sc_w))
    if lo >= 0.0:
        _, sc_e = stats.expon.fit(x, floc=0)
        add("Exponential", {"scale": 1.0 / sc_e}, lambda v: stats.expon.cdf(v, 0, sc_e))
    if lo > 0.0 and hi < 1.0:
        a_b, b_b, _, _ = stats.beta.fit(x, floc=0, fscale=1)
        add("Beta", {"shape1": a_b, "shape2": b_b}, lambda v: stats.beta.cdf(v, a_b, b_b))
    return fits


def chi_square(counts, pmf):
    """Chi-square over the bins 0..K-1 of the observed counts; the last bin takes the tail."""
    k = counts.size
    p = pmf(np.arange(k))
    p[-1] = 1.0 - p[:-1].sum()
    w = counts.sum()
    e = p * w
    ok = p > 0
    return float(np.sum((counts[ok] - e[ok]) ** 2 / e[ok]))


def fit_ordinal(x):
    counts = np.bincount(x.astype(np.int64)).astype(float)
    values = np.arange(counts.size, dtype=float)
    m = x.mean()
    v = x.var(ddof=1)
    fits = {}
    lam = m  # Poisson ML
    fits["Poisson"] = {"params": {"mean": lam},
                       "stat": chi_square(counts, lambda k: stats.poisson.pmf(k, lam))}

    # Negative binomial (failures before the r-th success) by ML over the value counts,
    # on (ln r, logit p) from the moment estimates; scipy.stats has no fit for discrete
    # families other than the generic global search of scipy.stats.fit.
    def nll(theta):
        r = np.exp(theta[0])
        p = 1.0 / (1.0 + np.exp(-theta[1]))
        return -np.sum(counts * stats.nbinom.logpmf(values, r, p))

    r0 = m * m / (v - m) if v > m else 1.0
    p0 = r0 / (r0 + m)
    res = optimize.minimize(nll, [np.log(r0), np.log(p0 / (1 - p0))], method="L-BFGS-B",
                            bounds=[(np.log(1e-3), np.log(1e7)), (-30, 30)])
    r = float(np.exp(res.x[0]))
    p = float(1.0 / (1.0 + np.exp(-res.x[1])))
    fits["Negbinomial"] = {"params": {"thresh": r, "prob": p},
                           "stat": chi_square(counts, lambda k: stats.nbinom.pmf(k, r, p))}
    if v < m:
        n = max(1.0, np.floor(m / (1.0 - v / m) + 0.5))
        if n > 1 and counts.size <= n + 1:
            q = m / n  # ML of the probability for a known n
            fits["Binomial"] = {"params": {"n": n, "prob": q},
                                "stat": chi_square(counts, lambda k: stats.binom.pmf(k, n, q))}
    return fits


def main():
    if len(sys.argv) != 3:
        sys.exit("usage: wfit1_scipy.py DATA.csv OUT.json")
    start = time.perf_counter()
    with open(sys.argv[1], encoding="utf-8") as f:
        header = f.readline().strip().split(",")
    table = np.loadtxt(sys.argv[1], delimiter=",", skiprows=1, dtype=str)
    result = {"tool": "scipy " + __import__("scipy").__version__, "fields": {}}
    numeric = []
    for j, name in enumerate(header):
        column = table[:, j]
        try:
            x = column.astype(float)
        except ValueError:
            cats, counts = np.unique(column, return_counts=True)
            result["fields"][name] = {
                "level": "categorical", "best": "Categorical",
                "candidates": {"Categorical": {"params": dict(
                    zip(cats.tolist(), (counts / counts.sum()).tolist())), "stat": None}}}
            continue
        numeric.append(x)
        whole = np.all(x == np.round(x)) and x.min() >= 0
        if whole and np.unique(x).size <= MAX_ORDINAL_VALUES:
            level, fits = "ordinal", fit_ordinal(x)
        else:
            level, fits = "continuous", fit_continuous(x)
        best = min(fits, key=lambda d: fits[d]["stat"])
        result["fields"][name] = {"level": level, "best": best, "candidates": fits}
    result["correlations"] = np.corrcoef(np.vstack(numeric)).tolist()
    result["seconds"] = time.perf_counter() - start
    with open(sys.argv[2], "w", encoding="utf-8") as f:
        json.dump(result, f, indent=1)
    print(f"scipy fit: {result['seconds']:.3f} s")


if __name__ == "__main__":
    main()
