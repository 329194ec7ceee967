#!/usr/bin/python3
"""Maximum-likelihood reference table for the likelihood accumulators and the optimisation step.

Data (real, shipped with the Debian package python3-statsmodels 0.13.5, under
/usr/lib/python3/dist-packages/statsmodels/datasets/):
  strikes/strikes.csv  "duration": lengths in days of 62 contract strikes in US manufacturing
                       (Kennan 1985, J. Econometrics 28, 5-28; Bureau of Labor Statistics).
  star98/star98.csv    "PR50M"/"MATHTOT": share of the students of 303 California school
                       districts above the national median in maths (1998); "MATHTOT" (the
                       number of students) also serves as a frequency weight.
  cancer/cancer.csv    "cancer": breast-cancer deaths in 301 counties (Rice, "Mathematical
                       Statistics and Data Analysis").
  engel/engel.csv      "income": household income of 235 Belgian working-class households
                       (Koenker and Bassett 1982, Econometrica 50, 43-61).
  anes96/anes96.csv    "age", "TVnews": age and days per week of TV news of 944 respondents of
                       the 1996 American National Election Study (tab-separated).
  fair/fair.csv        "age": age class of 6366 women (Fair 1978, J. Political Economy 86,
                       45-61); only six distinct values, so the tests also fit it as six rows
                       whose frequency weights are the class counts.

Reference estimates, independent of the C++ code: the likelihood equations solved by
mpmath.findroot at 40 significant digits (Beta: both score equations jointly; Gamma, Weibull,
NegBin: the profile equation of the shape, then the closed form), cross-checked against
SciPy's general-purpose fitters (scipy.stats.*.fit with the location fixed at 0, and for NegBin
a Nelder-Mead search of both parameters with r continuous, giving the unrounded root; printed
below each row of the generated file as a comment, they agree to their own optimiser's
accuracy, about 1e-5 relative). For the profile equations the file also holds F'(root), so
that a test can bound the parameter error that a stop at |F| <= 1e-6 allows.

Writes ml_reference.inc (data and numbers) next to this script.
Usage: /usr/bin/python3 ml_make_reference.py   (needs python3-statsmodels, -scipy, -mpmath)
"""
import csv
import os

import mpmath
import numpy as np
import scipy
from scipy import optimize, stats

mpmath.mp.dps = 40
DATASETS = "/usr/lib/python3/dist-packages/statsmodels/datasets"
HERE = os.path.dirname(os.path.abspath(__file__))


def column(name, field, delimiter=","):
    with open(os.path.join(DATASETS, name, name + ".csv"), newline="") as f:
        rows = csv.DictReader(f, delimiter=delimiter)
        rows.fieldnames = [n.strip("'") for n in rows.fieldnames]
        return [float(row[field]) for row in rows]


def wsum(values, weights):
    return mpmath.fsum(mpmath.mpf(w) * v for v, w in zip(values, weights))


# ------------------------------------------------------------------------------------------
# Likelihood equations (the same formulas the accumulators document, evaluated here in
# 40-digit arithmetic from the raw data).

def beta_mle(x, w):
    W = mpmath.fsum(mpmath.mpf(v) for v in w)
    s1 = wsum([mpmath.log(mpmath.mpf(v)) for v in x], w) / W
    s2 = wsum([mpmath.log(1 - mpmath.mpf(v)) for v in x], w) / W
    # Start from the moment estimates.
    xs = np.repeat(x, np.asarray(w, dtype=int)) if all(float(v).is_integer() for v in w) else x
    m, v = np.mean(xs), np.var(xs, ddof=1)
    t = m * (1 - m) / v - 1
    f = lambda a, b: [mpmath.digamma(a) - mpmath.digamma(a + b) - s1,
                      mpmath.digamma(b) - mpmath.digamma(a + b) - s2]
    a, b = mpmath.findroot(f, (mpmath.mpf(m * t), mpmath.mpf((1 - m) * t)))
    return a, b


def gamma_mle(x, w):
    W = mpmath.fsum(mpmath.mpf(v) for v in w)
    mean = wsum([mpmath.mpf(v) for v in x], w) / W
    meanlog = wsum([mpmath.log(mpmath.mpf(v)) for v in x], w) / W
    F = lambda a: mpmath.log(a / mean) - mpmath.digamma(a) + meanlog
    # ln a - psi(a) ~ 1/(2a): start from that approximation.
    a = mpmath.findroot(F, 1 / (2 * (mpmath.log(mean) - meanlog)))
    dF = 1 / a - mpmath.psi(1, a)
    return a, a / mean, dF


def weibull_mle(x, w):
    W = mpmath.fsum(mpmath.mpf(v) for v in w)
    lx = [mpmath.log(mpmath.mpf(v)) for v in x]
    S = wsum(lx, w)

    def F(b):
        p = [mpmath.exp(b * l) for l in lx]
        return S / W + 1 / b - wsum([pi * l for pi, l in zip(p, lx)], w) / wsum(p, w)

    b = mpmath.findroot(F, 1.0 if F(1.0) > 0 else 0.5, solver="secant")
    a = (wsum([mpmath.exp(b * l) for l in lx], w) / W) ** (1 / b)
    dF = mpmath.diff(F, b)
    return a, b, dF


def negbin_mle(x, w):
    counts = {}
    for v, wt in zip(x, w):
        counts[int(v)] = counts.get(int(v), 0) + wt
    Wc = mpmath.mpf(sum(counts.values()))
    mean = mpmath.fsum(mpmath.mpf(k) * n for k, n in counts.items()) / Wc
    # The equation divided by Wc (same root, better scaled for the solver's tolerance).
    F = lambda r: (mpmath.log(r / (r + mean)) - mpmath.digamma(r)
                   + mpmath.fsum(n * mpmath.digamma(k + r) for k, n in counts.items()) / Wc)
    var = np.var(np.repeat(x, np.asarray(w, dtype=int)), ddof=1)
    r0 = mpmath.mpf(float(mean) ** 2 / (var - float(mean)))
    lo, hi = r0, r0
    while F(lo) * F(hi) > 0:
        lo, hi = lo / 2, hi * 2
    r = mpmath.findroot(F, (lo, hi), solver="anderson")
    rr = max(1, int(mpmath.floor(r + mpmath.mpf(0.5))))
    return r, rr, rr / (rr + mean), mean


# ------------------------------------------------------------------------------------------

def scipy_check(kind, x, w):
    xs = np.repeat(np.asarray(x), np.asarray(w, dtype=int))
    if kind == "beta":
        a, b, _, _ = stats.beta.fit(xs, floc=0, fscale=1)
        return [a, b]
    if kind == "gamma":
        a, _, scale = stats.gamma.fit(xs, floc=0)
        return [a, 1 / scale]
    if kind == "weibull":
        c, _, scale = stats.weibull_min.fit(xs, floc=0)
        return [scale, c]
    if kind == "negbin":
        # Both parameters free (r continuous): the unrounded root and its p.
        nll = lambda t: -np.sum(stats.nbinom.logpmf(xs, np.exp(t[0]), 1 / (1 + np.exp(-t[1]))))
        m = np.mean(xs)
        r0 = m * m / max(np.var(xs, ddof=1) - m, 1e-3)
        res = optimize.minimize(nll, [np.log(r0), np.log(r0 / m)], method="Nelder-Mead",
                                options={"xatol": 1e-10, "fatol": 1e-12, "maxiter": 10000})
        return [np.exp(res.x[0]), 1 / (1 + np.exp(-res.x[1]))]
    return []


def fmt(v):
    return mpmath.nstr(mpmath.mpf(v), 17, min_fixed=-3, max_fixed=3)


def array(name, values, kind="double"):
    body = ", ".join(fmt(v) if kind == "double" else str(int(v)) for v in values)
    return f"const std::vector<{kind}> {name}{{{body}}};\n"


def main():
    duration = column("strikes", "duration")
    pr50 = column("star98", "PR50M")
    mathtot = column("star98", "MATHTOT")
    share = [p / t for p, t in zip(pr50, mathtot)]
    cancer = column("cancer", "cancer")
    income = column("engel", "income")
    anes_age = column("anes96", "age", "\t")
    tv_news = column("anes96", "TVnews", "\t")
    age = column("fair", "age")
    ages = sorted(set(age))
    age_counts = [float(age.count(a)) for a in ages]
    ones = lambda v: [1.0] * len(v)

    # (name, data, weights, distribution); weights by name so the file can refer to them.
    cases = [
        ("strikes_duration", "kStrikesDuration", "", duration, ones(duration)),
        ("star98_share", "kStar98Share", "", share, ones(share)),
        ("star98_share_weighted", "kStar98Share", "kStar98Students", share, mathtot),
        ("cancer_deaths", "kCancerDeaths", "", cancer, ones(cancer)),
        ("anes96_age", "kAnesAge", "", anes_age, ones(anes_age)),
        ("anes96_tvnews", "kAnesTVNews", "", tv_news, ones(tv_news)),
        ("engel_income", "kEngelIncome", "", income, ones(income)),
        ("fair_age_classes", "kFairAgeClasses", "kFairAgeCounts", ages, age_counts),
    ]

    out = []
    out.append("// Generated by ml_make_reference.py from data of the Debian package\n")
    out.append("// python3-statsmodels 0.13.5 (see the script for the sources); do not edit.\n")
    out.append(f"// mpmath {mpmath.__version__} at {mpmath.mp.dps} digits; SciPy {scipy.__version__}.\n")
    out.append("namespace mlref {\n\n")
    out.append(array("kStrikesDuration", duration))
    out.append(array("kStar98Share", share))
    out.append(array("kStar98Students", mathtot))
    out.append(array("kCancerDeaths", cancer))
    out.append(array("kAnesAge", anes_age))
    out.append(array("kAnesTVNews", tv_news))
    out.append(array("kEngelIncome", income))
    out.append(array("kFairAgeClasses", ages))
    out.append(array("kFairAgeCounts", age_counts))
    out.append("\n")
    out.append("//! One reference fit: the data (and weights, null for unit weights), the two\n")
    out.append("//! estimated parameters in the accumulator's order, and F'(root) of the profile\n")
    out.append("//! equation (0 for Beta, which is solved jointly).\n")
    out.append("struct MLCase {\n    const char* fName;\n    const std::vector<double>* fpData;\n"
               "    const std::vector<double>* fpWeights;\n    double fParam1;\n"
               "    double fParam2;\n    double fDerivative;\n};\n\n")

    def ref(var):
        return "&" + var if var else "nullptr"

    beta_rows, gamma_rows, weib_rows, nb_rows = [], [], [], []
    for name, data, weights, x, w in cases:
        positive = all(v > 0 for v in x)
        unit = all(0 < v < 1 for v in x)
        whole = all(float(v).is_integer() for v in x)
        if unit:
            a, b = beta_mle(x, w)
            beta_rows.append((name, data, weights, a, b, 0, scipy_check("beta", x, w)))
        if positive:
            a, rate, dF = gamma_mle(x, w)
            gamma_rows.append((name, data, weights, a, rate, dF, scipy_check("gamma", x, w)))
            a, b, dF = weibull_mle(x, w)
            weib_rows.append((name, data, weights, a, b, dF, scipy_check("weibull", x, w)))
        if whole:
            r, rr, p, mean = negbin_mle(x, w)
            nb_rows.append((name, data, weights, rr, p, r, scipy_check("negbin", x, w)))

    def table(var, rows, comment):
        out.append(f"// {comment}\n")
        out.append(f"const std::vector<MLCase> {var}{{\n")
        for name, data, weights, p1, p2, d, check in rows:
            out.append(f"    {{\"{name}\", &{data}, {ref(weights)}, {fmt(p1)}, {fmt(p2)}, "
                       f"{fmt(d)}}},\n")
            if check:
                out.append("    // SciPy: " + ", ".join(f"{c:.10g}" for c in check) + "\n")
        out.append("};\n\n")

    table("kBetaCases", beta_rows, "Beta: shape1, shape2.")
    table("kGammaCases", gamma_rows, "Gamma: shape, rate (= shape/mean); F'(shape).")
    table("kWeibullCases", weib_rows, "Weibull (location 0): scale a, shape b; F'(b).")
    table("kNegBinCases", nb_rows,
          "NegBin: r rounded to a whole number >= 1, p = r/(r + mean); the third number is "
          "the unrounded root.")
    out.append("} // namespace mlref\n")
    with open(os.path.join(HERE, "ml_reference.inc"), "w") as f:
        f.write("".join(out))


if __name__ == "__main__":
    main()
