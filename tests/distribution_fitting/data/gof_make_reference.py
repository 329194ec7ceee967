#!/usr/bin/python3
"""Reference numbers for the goodness-of-fit tests of the distribution fitting.

Data (real, public domain, as shipped by the Debian package python3-statsmodels in
statsmodels/datasets; copied here so that the tests need no such package):
  gof_nile.csv          Nile river annual flow at Aswan 1871-1970, 10^8 m^3 (Cobb 1978,
                        Biometrika 65, 243-251): 100 values.
  gof_engel_share.csv   Engel's food expenditure data (Koenker and Bassett 1982): the food
                        share foodexp/income of 235 households, rounded to 10 decimals.
  gof_mdvis_counts.csv  RAND Health Insurance Experiment (Cameron and Trivedi 2005): number of
                        outpatient visits, as a table of (visits, households), 20190 households.
`python3 gof_make_reference.py --extract` rewrites the three files from the installed package.

What is computed, independently of the C++ code:
  * maximum-likelihood estimates at 40 digits (mpmath.findroot on the likelihood equations):
    Gamma and two-parameter Weibull of the Nile flows, Beta of the food shares, the NegBin r
    of the visits (then rounded to a whole number, p = r/(r + mean));
  * u = F(x) at 40 digits, A² by Stephens' form -n - (1/n)·Σ(2i-1)·[ln u_i + ln(1-u_(n+1-i))],
    D = max(D+, D-) with D+ = max(i/n - u_i), D- = max(u_i - (i-1)/n) (Stephens 1974, JASA 69,
    730-737; D'Agostino and Stephens 1986, chapter 4);
  * a weighted case as repeated rows (integer weights) with the same unweighted formulas;
  * Pearson's chi-square with SciPy (scipy.stats pmf/sf, chi2.sf);
  * the upper tail of the Kolmogorov distribution with scipy.special.kolmogorov, and the
    limiting Anderson-Darling distribution by the series of Anderson and Darling (1954) with
    numerical integration (mpmath.quad);
  * the modified statistics and p-value formulas and tables, re-implemented here from the
    published formulas, for a table of (type, n, A², D, shape).
Writes gof_reference.inc, included by edfstats_test.cpp and fitgoodness_test.cpp.

Usage: /usr/bin/python3 gof_make_reference.py   (needs python3-scipy and python3-mpmath)
"""
import csv
import math
import os
import sys
from fractions import Fraction as F

import mpmath as mp
import scipy.special
import scipy.stats as st

mp.mp.dps = 40
HERE = os.path.dirname(os.path.abspath(__file__))
LOGNORMAL, NORMAL, TRIANGULAR, UNIFORM, WEIBULL, GAMMA, BETA, EXPONENTIAL = 3, 4, 6, 7, 8, 9, 10, 11
BINOMIAL, NEGBIN, POISSON = 0, 1, 5


def extract():
    base = "/usr/lib/python3/dist-packages/statsmodels/datasets"
    with open(os.path.join(base, "nile", "nile.csv")) as f:
        nile = [row["volume"] for row in csv.DictReader(f)]
    with open(os.path.join(HERE, "gof_nile.csv"), "w") as f:
        f.write("volume\n" + "".join(v + "\n" for v in nile))
    with open(os.path.join(base, "engel", "engel.csv")) as f:
        shares = [float(r["foodexp"]) / float(r["income"]) for r in csv.DictReader(f)]
    with open(os.path.join(HERE, "gof_engel_share.csv"), "w") as f:
        f.write("share\n" + "".join("%.10f\n" % s for s in shares))
    counts = {}
    with open(os.path.join(base, "randhie", "randhie.csv")) as f:
        for r in csv.DictReader(f):
            v = int(float(r["mdvis"]))
            counts[v] = counts.get(v, 0) + 1
    with open(os.path.join(HERE, "gof_mdvis_counts.csv"), "w") as f:
        f.write("visits,households\n")
        for v in sorted(counts):
            f.write("%d,%d\n" % (v, counts[v]))


def read_column(name):
    with open(os.path.join(HERE, name)) as f:
        rows = list(csv.reader(f))[1:]
    return [[r for r in row] for row in rows]


# ---------------------------------------------------------------------------------------------
# Distribution functions at 40 digits


def cdf(dist, params, x):
    x = mp.mpf(x)
    if dist == NORMAL:
        return mp.ncdf(x, params[0], params[1])
    if dist == LOGNORMAL:
        return mp.ncdf(mp.log(x / params[0]) / params[1]) if x > 0 else mp.mpf(0)
    if dist == EXPONENTIAL:
        return -mp.expm1(-x * params[0]) if x >= 0 else mp.mpf(0)
    if dist == GAMMA:  # shape, rate
        return mp.gammainc(params[0], 0, params[1] * x, regularized=True) if x > 0 else mp.mpf(0)
    if dist == WEIBULL:  # scale, shape, location
        return -mp.expm1(-((x - params[2]) / params[0]) ** params[1]) if x > params[2] else mp.mpf(0)
    if dist == BETA:
        return mp.betainc(params[0], params[1], 0, x, regularized=True) if 0 < x < 1 else mp.mpf(x >= 1)
    if dist == UNIFORM:
        a, b = params
        return mp.mpf(0) if x < a else (mp.mpf(1) if x > b else (x - a) / (b - a))
    if dist == TRIANGULAR:
        a, b, c = params
        if x < a:
            return mp.mpf(0)
        if x > b:
            return mp.mpf(1)
        if x < c:
            return (x - a) ** 2 / ((b - a) * (c - a))
        if x == c:
            return (c - a) / (b - a)
        return 1 - (b - x) ** 2 / ((b - a) * (b - c))
    raise ValueError(dist)


def a2_stephens(us):
    """A² = -n - (1/n) Σ (2i-1)[ln u_i + ln(1 - u_(n+1-i))] over sorted u, all in (0, 1)."""
    n = len(us)
    s = mp.fsum((2 * i - 1) * (mp.log(us[i - 1]) + mp.log(1 - us[n - i])) for i in range(1, n + 1))
    return -n - s / n


def a2_inner(us):
    """Stephens' sum term by term, the terms of u = 0 or 1 left out (their terms are infinite)."""
    n = len(us)
    total = mp.mpf(-n)
    for i, u in enumerate(us, start=1):
        if 0 < u < 1:
            total += mp.mpf(2 * i - 1) / n * (mp.log(1 - u) - mp.log(u)) - 2 * mp.log(1 - u)
    return total


def d_stephens(us):
    n = len(us)
    dplus = max(mp.mpf(i) / n - us[i - 1] for i in range(1, n + 1))
    dminus = max(us[i - 1] - mp.mpf(i - 1) / n for i in range(1, n + 1))
    return max(dplus, dminus)


# ---------------------------------------------------------------------------------------------
# Maximum-likelihood estimates


def gamma_mle(xs):
    n = len(xs)
    m = mp.fsum(xs) / n
    ml = mp.fsum(mp.log(x) for x in xs) / n
    s = mp.log(m) - ml
    shape = mp.findroot(lambda a: mp.log(a) - mp.digamma(a) - s, (3 - s + mp.sqrt((s - 3) ** 2 + 24 * s)) / (12 * s))
    return [shape, shape / m]  # shape, rate


def weibull_mle(xs):
    n = len(xs)
    ml = mp.fsum(mp.log(x) for x in xs) / n

    def f(b):
        sb = mp.fsum(x ** b for x in xs)
        return 1 / b + ml - mp.fsum(x ** b * mp.log(x) for x in xs) / sb

    b = mp.findroot(f, 5)
    a = (mp.fsum(x ** b for x in xs) / n) ** (1 / b)
    return [a, b, mp.mpf(0)]


def beta_mle(xs):
    n = len(xs)
    s1 = mp.fsum(mp.log(x) for x in xs) / n
    s2 = mp.fsum(mp.log(1 - x) for x in xs) / n
    m = mp.fsum(xs) / n
    v = mp.fsum((x - m) ** 2 for x in xs) / (n - 1)
    t = m * (1 - m) / v - 1
    a, b = mp.findroot(
        [lambda a, b: mp.digamma(a) - mp.digamma(a + b) - s1, lambda a, b: mp.digamma(b) - mp.digamma(a + b) - s2],
        (m * t, (1 - m) * t))
    return [a, b]


def negbin_r(counts):
    wc = mp.fsum(counts)
    m = mp.fsum(k * c for k, c in enumerate(counts)) / wc

    def f(r):
        return wc * mp.log(r / (r + m)) - wc * mp.digamma(r) + mp.fsum(c * mp.digamma(k + r) for k, c in enumerate(counts) if c)

    return mp.findroot(f, (mp.mpf('0.05'), mp.mpf(20)), solver='illinois'), m


# ---------------------------------------------------------------------------------------------
# Significance, re-implemented from the published formulas


def lookup(value, crit, levels):
    if value <= crit[0]:
        return levels[0]
    if value >= crit[-1]:
        return levels[-1]
    for j in range(1, len(crit)):
        if value <= crit[j]:
            t = (value - crit[j - 1]) / (crit[j] - crit[j - 1])
            return levels[j - 1] + t * (levels[j] - levels[j - 1])


def ad_normal_p(z):
    if z <= 0.2:
        return 1 - math.exp(-13.436 + 101.14 * z - 223.73 * z * z)
    if z <= 0.34:
        return 1 - math.exp(-8.318 + 42.796 * z - 59.938 * z * z)
    if z <= 0.6:
        return math.exp(0.9177 - 4.279 * z - 1.38 * z * z)
    if z <= 153.467:
        return math.exp(1.2937 - 5.709 * z + 0.0186 * z * z)
    return 0.0


def ad_exponential_p(z):
    if z <= 0.26:
        return 1 - math.exp(-12.2204 + 67.459 * z - 110.3 * z * z)
    if z <= 0.51:
        return 1 - math.exp(-6.1327 + 20.218 * z - 18.663 * z * z)
    if z <= 0.95:
        return math.exp(0.9209 - 3.353 * z + 0.3 * z * z)
    if z <= 10.03:
        return math.exp(0.731 - 3.009 * z + 0.15 * z * z)
    return 0.0


def ad_limit_cdf_exact(z):
    """Anderson and Darling (1954): the limiting distribution of A² as a series."""
    z = mp.mpf(z)
    total = mp.mpf(0)
    for j in range(0, 40):
        k = 4 * j + 1
        coef = (-1) ** j * mp.gamma(j + mp.mpf(0.5)) / (mp.gamma(mp.mpf(0.5)) * mp.factorial(j))
        integral = mp.quad(lambda w: mp.exp(z / (8 * (w * w + 1)) - k * k * mp.pi ** 2 * w * w / (8 * z)), [0, mp.inf])
        term = coef * k * mp.exp(-k * k * mp.pi ** 2 / (8 * z)) * integral
        total += term
        if abs(term) < mp.mpf(10) ** -30:
            break
    return mp.sqrt(2 * mp.pi) / z * total


def ad_marsaglia(z):
    if z <= 0:
        return 0.0
    if z < 2:
        return math.exp(-1.2337141 / z) / math.sqrt(z) * (2.00012 + (0.247105 - (0.0649821 - (0.0347962 - (0.011672 - 0.00168691 * z) * z) * z) * z) * z)
    return math.exp(-math.exp(1.0776 - (2.30695 - (0.43424 - (0.082433 - (0.008056 - 0.0003146 * z) * z) * z) * z) * z))


MISSING = float("nan")


def significance(dist, n, a2, d, shape):
    """(Z*, AD p, D*, KS p) of one candidate; a2 or d None when not computed."""
    rn = math.sqrt(n)
    z = pad = dstar = pks = MISSING
    if dist in (NORMAL, LOGNORMAL):
        if a2 is not None:
            z = a2 * (1 + 0.75 / n + 2.25 / n ** 2)
            pad = ad_normal_p(z)
        if d is not None:
            dstar = d * (rn - 0.01 + 0.85 / rn)
            pks = lookup(dstar, [0.775, 0.819, 0.895, 0.995, 1.035], [0.15, 0.10, 0.05, 0.025, 0.01])
    elif dist in (TRIANGULAR, BETA):
        pad = 1.0 if a2 is not None else MISSING
        pks = 1.0 if d is not None else MISSING
    elif dist == UNIFORM:
        if a2 is not None:
            z = a2
            pad = 1 - ad_marsaglia(a2)
        if d is not None:
            dstar = rn * d
            pks = float(scipy.special.kolmogorov(dstar))
    elif dist == WEIBULL:
        if a2 is not None:
            z = (1 + 0.2 / rn) * a2
            pad = lookup(z, [0.474, 0.637, 0.757, 0.877, 1.038], [0.25, 0.10, 0.05, 0.025, 0.01])
        if d is not None:
            dstar = rn * d
            pks = lookup(dstar, [1.372, 1.477, 1.557, 1.671], [0.10, 0.05, 0.025, 0.01])
    elif dist == GAMMA:
        if a2 is not None:
            crit = ([0.486, 0.657, 0.786, 0.917, 1.092, 1.227] if shape <= 1 else
                    [0.473, 0.637, 0.759, 0.883, 1.048, 1.173] if shape <= 8 else
                    [0.470, 0.631, 0.752, 0.873, 1.035, 1.159])
            pad = lookup(a2, crit, [0.25, 0.10, 0.05, 0.025, 0.01, 0.005])
        if d is not None:
            dstar = (rn + 0.3 / rn) * d
            pks = lookup(dstar, [0.74, 0.78, 0.80, 0.858, 0.928, 0.99, 1.069, 1.13],
                         [0.25, 0.20, 0.15, 0.10, 0.05, 0.025, 0.01, 0.005])
    elif dist == EXPONENTIAL:
        if a2 is not None:
            z = a2 * (1 + 0.6 / n)
            pad = ad_exponential_p(z)
        if d is not None:
            dstar = (d - 0.2 / n) * (rn + 0.26 + 0.5 / rn)
            pks = lookup(dstar, [0.926, 0.995, 1.094, 1.184, 1.298], [0.15, 0.10, 0.05, 0.025, 0.01])
    return [z, pad, dstar, pks]


# ---------------------------------------------------------------------------------------------
# Chi-square with SciPy


def chi_square(dist, params, counts, total, maximum):
    if dist == POISSON:
        upper, q = maximum + 1, 1
        d = st.poisson(params[0])
    elif dist == NEGBIN:
        upper, q = maximum + 1, 2
        d = st.nbinom(params[0], params[1])
    else:
        upper, q = params[0] + 1, 2
        d = st.binom(int(params[0]), params[1])
    bins = max(len(counts), int(upper + 0.5))
    stat, low = 0.0, 0
    for c in range(bins):
        if dist == BINOMIAL:
            p = d.pmf(c) if c <= params[0] else 0.0
        else:
            p = d.sf(c - 1) if c == bins - 1 else d.pmf(c)
        e = p * total
        low += e < 5
        o = counts[c] if c < len(counts) else 0.0
        stat += (o - e) ** 2 / e
    df = upper - 1 - q
    return [stat, df, float(st.chi2.sf(stat, df)), low, bins]


# ---------------------------------------------------------------------------------------------


def f17(x):
    x = float(x)
    return "kMissing" if math.isnan(x) else repr(x)


def vec(values):
    items = [f17(v) for v in values]
    lines, line = [], ""
    for item in items:
        if len(line) + len(item) + 2 > 92:
            lines.append(line)
            line = ""
        line += item + ", "
    lines.append(line)
    return "{\n    " + "\n    ".join(l.rstrip() for l in lines) + "\n}"


def ivec(values):
    return "{" + ", ".join(f17(v) for v in values) + "}"


def main():
    if "--extract" in sys.argv:
        extract()
    nile = [int(r[0]) for r in read_column("gof_nile.csv")]
    shares = [F(r[0]) for r in read_column("gof_engel_share.csv")]
    table = [(int(r[0]), int(r[1])) for r in read_column("gof_mdvis_counts.csv")]
    out = []
    emit = out.append
    emit("// Generated by gof_make_reference.py from gof_nile.csv, gof_engel_share.csv and")
    emit("// gof_mdvis_counts.csv; do not edit. Needs kMissing in the including file.")
    emit("namespace gofref {")
    emit("const std::vector<double> kNile = %s;" % vec(nile))
    emit("const std::vector<double> kShares = %s;" % vec(shares))
    emit("const std::vector<double> kVisits = %s;" % vec([v for v, _ in table]))
    emit("const std::vector<double> kHouseholds = %s;" % vec([c for _, c in table]))

    # --- Parameters of the Nile flows and the shares
    n = len(nile)
    xs = sorted(mp.mpf(x) for x in nile)
    mean = F(sum(nile), n)
    varn = sum((F(x) - mean) ** 2 for x in nile) / n
    mlog = mp.fsum(mp.log(x) for x in xs) / n
    vlog = mp.fsum((mp.log(x) - mlog) ** 2 for x in xs) / n
    var1 = sum((F(x) - mean) ** 2 for x in nile) / (n - 1)
    lo, hi = min(nile), max(nile)
    t = 3 * (mean - lo) / (hi - lo) - 1
    mode = lo if t <= 0 else (hi if t >= 1 else lo + (hi - lo) * t)
    params = {
        NORMAL: [mp.mpf(mean.numerator) / mean.denominator, mp.sqrt(mp.mpf(varn.numerator) / varn.denominator)],
        LOGNORMAL: [mp.exp(mlog), mp.sqrt(vlog)],
        EXPONENTIAL: [mp.mpf(mean.denominator) / mean.numerator],
        GAMMA: gamma_mle(xs),
        WEIBULL: weibull_mle(xs),
        UNIFORM: [mp.mpf(lo), mp.mpf(hi)],
        TRIANGULAR: [mp.mpf(lo), mp.mpf(hi), mp.mpf(mode.numerator) / mode.denominator],
    }
    sx = sorted(mp.mpf(s.numerator) / s.denominator for s in shares)
    beta = beta_mle(sx)

    # --- Kernel cases: A² and D of whole samples at given parameters (all u inside (0, 1))
    emit("")
    emit("//! A² and D by Stephens' formulas at 40 digits: sample, type, parameters.")
    emit("struct EdfCase { const char* name; int sample; int type; std::vector<double> params;")
    emit("                 double a2; double d; };")
    emit("//! sample 0: Nile flows, 1: food shares, 2: Nile flows with weights 1, 2, 3, 1, 2, 3, ...")
    kernel = [("NileNormal", 0, NORMAL, params[NORMAL]), ("NileLogNormal", 0, LOGNORMAL, params[LOGNORMAL]),
              ("NileExponential", 0, EXPONENTIAL, params[EXPONENTIAL]), ("NileGamma", 0, GAMMA, params[GAMMA]),
              ("NileWeibull", 0, WEIBULL, params[WEIBULL]),
              ("NileWeibullShifted", 0, WEIBULL, [params[WEIBULL][0], params[WEIBULL][1], mp.mpf(300)]),
              ("NileUniformWide", 0, UNIFORM, [mp.mpf(400), mp.mpf(1400)]),
              ("NileTriangularWide", 0, TRIANGULAR, [mp.mpf(400), mp.mpf(1400), mp.mpf(850)]),
              ("SharesBeta", 1, BETA, beta),
              ("WeightedNileNormal", 2, NORMAL, params[NORMAL]),
              ("WeightedNileGamma", 2, GAMMA, params[GAMMA])]
    emit("const std::vector<EdfCase> kEdfCases = {")
    for name, sample, dist, p in kernel:
        if sample == 1:
            values = sx
        elif sample == 0:
            values = xs
        else:  # repeated rows: value i of the file order taken 1 + i % 3 times
            values = sorted(mp.mpf(x) for i, x in enumerate(nile) for _ in range(1 + i % 3))
        us = [cdf(dist, p, x) for x in values]
        emit("    {\"%s\", %d, %d, %s, %s, %s}," % (name, sample, dist, ivec(p), f17(a2_stephens(us)), f17(d_stephens(us))))
    emit("};")

    # --- Distribution functions at single points
    emit("")
    emit("//! F(x) at 40 digits: type, parameters, x, F.")
    emit("struct CdfCase { const char* name; int type; std::vector<double> params; double x; double f; };")
    points = [("LogNormalMid", LOGNORMAL, [2.0, 0.5], 2.7), ("LogNormalZero", LOGNORMAL, [2.0, 0.5], 0.0),
              ("NormalTail", NORMAL, [10.0, 2.0], -3.0), ("TriangularLeft", TRIANGULAR, [1.0, 5.0, 2.0], 1.5),
              ("TriangularMode", TRIANGULAR, [1.0, 5.0, 2.0], 2.0), ("TriangularRight", TRIANGULAR, [1.0, 5.0, 2.0], 4.0),
              ("TriangularAbove", TRIANGULAR, [1.0, 5.0, 2.0], 6.0), ("UniformMid", UNIFORM, [1.0, 5.0], 2.2),
              ("UniformAbove", UNIFORM, [1.0, 5.0], 7.0), ("WeibullLocation", WEIBULL, [2.0, 1.5, 1.0], 2.5),
              ("WeibullBelowLocation", WEIBULL, [2.0, 1.5, 1.0], 0.5), ("WeibullSmall", WEIBULL, [3.0, 2.0, 0.0], 1e-5),
              ("GammaRate", GAMMA, [2.5, 4.0], 0.3), ("GammaNegative", GAMMA, [2.5, 4.0], -1.0),
              ("BetaMid", BETA, [2.0, 5.0], 0.3), ("ExponentialRate", EXPONENTIAL, [0.25], 3.0),
              ("ExponentialTiny", EXPONENTIAL, [0.25], 1e-12)]
    emit("const std::vector<CdfCase> kCdfCases = {")
    for name, dist, p, x in points:
        emit("    {\"%s\", %d, %s, %s, %s}," % (name, dist, ivec(p), f17(x), f17(cdf(dist, [mp.mpf(v) for v in p], mp.mpf(x)))))
    emit("};")

    # --- Significance rows
    emit("")
    emit("//! Z*, AD p, D*, KS p from (type, n, A², D, shape), re-implemented from the published")
    emit("//! formulas and tables.")
    emit("struct SigCase { const char* name; int type; double n; double a2; double d; double shape;")
    emit("                 double zStar; double pAD; double dStar; double pKS; };")
    rows = [("NormalSmall", NORMAL, 50, 0.15, 0.05, 0), ("NormalMidLow", NORMAL, 50, 0.3, 0.11, 0),
            ("NormalMidHigh", NORMAL, 50, 0.5, 0.125, 0), ("NormalLarge", NORMAL, 200, 1.2, 0.2, 0),
            ("LogNormalHuge", LOGNORMAL, 1000, 200.0, 0.4, 0), ("TriangularAny", TRIANGULAR, 30, 0.7, 0.1, 0),
            ("BetaAny", BETA, 30, 2.7, 0.3, 0), ("UniformSmall", UNIFORM, 40, 0.8, 0.08, 0),
            ("UniformLarge", UNIFORM, 40, 3.1, 0.3, 0), ("WeibullBetween", WEIBULL, 100, 0.6, 0.145, 0),
            ("WeibullBelow", WEIBULL, 100, 0.2, 0.05, 0), ("WeibullAbove", WEIBULL, 100, 1.5, 0.3, 0),
            ("GammaSmallShape", GAMMA, 80, 0.7, 0.09, 0.8), ("GammaMidShape", GAMMA, 80, 0.7, 0.09, 3.0),
            ("GammaLargeShape", GAMMA, 80, 0.7, 0.09, 30.0), ("GammaShapeOne", GAMMA, 80, 0.5, 0.2, 1.0),
            ("ExponentialLow", EXPONENTIAL, 60, 0.2, 0.1, 0), ("ExponentialMid", EXPONENTIAL, 60, 0.4, 0.12, 0),
            ("ExponentialHigh", EXPONENTIAL, 60, 0.8, 0.14, 0), ("ExponentialTail", EXPONENTIAL, 60, 3.0, 0.3, 0)]
    emit("const std::vector<SigCase> kSigCases = {")
    for name, dist, nn, a2, d, shape in rows:
        s = significance(dist, nn, a2, d, shape)
        emit("    {\"%s\", %d, %s, %s, %s, %s, %s, %s, %s, %s}," % (name, dist, f17(nn), f17(a2), f17(d), f17(shape), *[f17(v) for v in s]))
    emit("};")

    # --- Limiting distributions
    emit("")
    emit("//! G(z), the limiting A² distribution (Anderson and Darling 1954 series, 40 digits).")
    emit("const std::vector<std::pair<double, double>> kADLimit = {")
    for z in [0.3, 0.75, 1.2, 1.933, 2.492, 3.857, 6.0]:
        g = ad_limit_cdf_exact(z)
        assert abs(float(g) - ad_marsaglia(z)) < 3e-5, (z, g, ad_marsaglia(z))
        emit("    {%s, %s}," % (f17(z), f17(g)))
    emit("};")
    emit("//! 1 - K(x), the upper tail of the Kolmogorov distribution (scipy.special.kolmogorov).")
    emit("const std::vector<std::pair<double, double>> kKolmogorov = {")
    for x in [0.02, 0.1, 0.3, 0.5, 0.8, 0.99, 1.0, 1.2, 1.36, 2.0, 3.0, 5.0]:
        emit("    {%s, %s}," % (f17(x), f17(scipy.special.kolmogorov(x))))
    emit("};")

    # --- Chi-square tests
    counts = [0.0] * (max(v for v, _ in table) + 1)
    for v, c in table:
        counts[v] = float(c)
    total = sum(counts)
    maximum = len(counts) - 1
    mvis = sum(k * c for k, c in enumerate(counts)) / total
    root, _ = negbin_r(counts)
    r = max(1, math.floor(float(root) + 0.5))
    assert abs(float(root) + 0.5 - math.floor(float(root) + 0.5)) > 0.05, "r too close to a rounding edge"
    small = [3.0, 7.0, 9.0, 6.0, 3.0, 2.0]  # values 0..5, total 30
    binom_counts = [1.0, 6.0, 12.0, 14.0, 9.0, 3.0]  # values 0..5, total 45
    emit("")
    emit("//! Chi-square tests with SciPy: type, parameters, counts, W, maximum; statistic, df,")
    emit("//! p, bins with E < 5, number of bins.")
    emit("struct ChiCase { const char* name; int type; std::vector<double> params;")
    emit("                 std::vector<double> counts; double total; double maximum;")
    emit("                 double stat; double df; double p; int nLow; int nBins; };")
    emit("const std::vector<ChiCase> kChiCases = {")
    chi = [("VisitsPoisson", POISSON, [mvis], counts, total, maximum),
           ("VisitsNegBin", NEGBIN, [r, r / (r + mvis), 2.0], counts, total, maximum),
           ("SmallPoisson", POISSON, [sum(k * c for k, c in enumerate(small)) / 30.0], small, 30.0, 5.0),
           ("SmallNegBin", NEGBIN, [4.0, 4.0 / (4.0 + 2.0), 2.0], small, 30.0, 5.0),
           ("Binomial", BINOMIAL, [6.0, 0.42], binom_counts, 45.0, 5.0)]
    for name, dist, p, cnt, tot, mx in chi:
        s = chi_square(dist, p, cnt, tot, mx)
        emit("    {\"%s\", %d, %s, %s, %s, %s, %s, %s, %s, %d, %d}," % (
            name, dist, ivec(p), vec(cnt), f17(tot), f17(mx), f17(s[0]), f17(s[1]), f17(s[2]), s[3], s[4]))
    emit("};")
    emit("//! The visits' weighted mean and the NegBin root before rounding.")
    emit("constexpr double kVisitsMean = %s;" % f17(mvis))
    emit("constexpr double kVisitsNegBinRoot = %s;" % f17(root))

    # --- End to end: the Nile flows as one continuous covariate with every continuous candidate
    emit("")
    emit("//! BuildModel on the Nile flows (W = n = 100): per candidate its parameters, A², D and")
    emit("//! significance; Uniform and Triangular with the terms of u = 0 or 1 left out.")
    emit("struct FitCase { int type; std::vector<double> params; double a2; double d;")
    emit("                 double zStar; double pAD; double dStar; double pKS; };")
    emit("const std::vector<FitCase> kNileFits = {")
    fits = {}
    for dist in [LOGNORMAL, NORMAL, TRIANGULAR, UNIFORM, WEIBULL, GAMMA, EXPONENTIAL]:
        p = params[dist]
        us = [cdf(dist, p, x) for x in xs]
        a2 = float(a2_inner(us)) if dist in (UNIFORM, TRIANGULAR) else float(a2_stephens(us))
        d = float(d_stephens(us))
        s = significance(dist, n, a2, d, float(p[0]))
        fits[dist] = (a2, d, s)
        emit("    {%d, %s, %s, %s, %s, %s, %s, %s}," % (dist, ivec(p), f17(a2), f17(d), *[f17(v) for v in s]))
    emit("};")
    for label, col, pcol in [("AD", 0, 1), ("KS", 1, 3)]:
        cands = [(fits[k][col], k) for k in sorted(fits) if not math.isnan(fits[k][2][pcol])]
        best = min(cands)[1]
        emit("constexpr int kNileBest%s = %d;" % (label, best))
    emit("constexpr double kNileVariance = %s;" % f17(var1))
    emit("//! Beta of the food shares by maximum likelihood.")
    emit("const std::vector<double> kSharesBeta = %s;" % vec(beta))
    emit("}  // namespace gofref")
    with open(os.path.join(HERE, "gof_reference.inc"), "w") as f:
        f.write("\n".join(out) + "\n")


if __name__ == "__main__":
    main()
