#!/usr/bin/python3
"""Reference numbers for the descriptive passes and initial estimates of the fitting.

Generates a small weighted dataset with missing and unusable values (fixed seed), applies the
record rules by hand (a weight must be a finite number > 0; every fitted covariate and factor
value must be present; a factor value v > -0.5 has category int(v + 0.5)), and computes every
statistic from exact rational arithmetic (fractions) on the decimal values, with logarithms in
50-digit mpmath. Writes fitting_sample.csv (the data, for reading) and fitting_reference.inc
(the data and the numbers, included by the tests).

Usage: python3 make_reference.py   (from this folder; needs python3-mpmath)
"""
import csv
import random
from fractions import Fraction as F

import mpmath

mpmath.mp.dps = 50

NAMES = ["wt", "height", "share", "visits", "claims", "group", "plan", "tier", "junk"]
WEIGHT, COVARIATES, FACTORS = 0, [1, 2, 3, 4], [5, 6, 7]
# Category texts of the factors (code order).
FACTOR_CATEGORIES = {5: ["north", "south", "west"], 6: ["10", "20"], 7: ["a", "b", "c"]}
LEVELS = {1: 1, 2: 1, 3: 3, 4: 3}  # 1 continuous, 3 ordinal
ALL = list(range(12))
# Candidate types per covariate (DistType values).
ALLOWED = {1: ALL, 2: ALL, 3: [0, 1, 3, 4, 5, 9, 11], 4: [0, 1, 5, 8, 9]}
BINOMIAL, NEGBIN, CATEGORICAL, LOGNORMAL, NORMAL, POISSON = 0, 1, 2, 3, 4, 5
TRIANGULAR, UNIFORM, WEIBULL, GAMMA, BETA, EXPONENTIAL = 6, 7, 8, 9, 10, 11
MISSING = None


def make_rows():
    rng = random.Random(20240611)
    rows = []
    for r in range(48):
        wt = rng.choice([1, 1, 1, 2, 2, 3])
        height = round(rng.gauss(172, 9), 1)
        share = round(rng.betavariate(2, 5), 3)
        share = min(max(share, 0.001), 0.999)
        visits = sum(1 for _ in range(8) if rng.random() < 0.4)
        lam = rng.gammavariate(0.8, 3.0)
        claims, p = 0, rng.random()
        # Poisson(lam) by inversion: a gamma-mixed Poisson, overdispersed.
        term = mpmath.e ** (-lam)
        cum = term
        while p > cum and claims < 60:
            claims += 1
            term = term * lam / claims
            cum += term
        group = rng.choice([0, 1, 2])
        plan = rng.choice([0, 1])
        tier = rng.choice([0, 1, 2])
        junk = round(rng.random(), 3)
        rows.append([wt, height, share, visits, claims, group, plan, tier, junk])
    rows[3][0] = 0            # weight 0: invalid
    rows[7][0] = MISSING      # missing weight: invalid
    rows[11][1] = MISSING     # missing covariate: invalid
    rows[15][5] = MISSING     # missing factor: invalid
    rows[19][7] = -1.0        # factor value at or below -0.5: invalid
    rows[23][6] = -0.4        # factor value -0.4: category 0, valid
    rows[25][5] = 1.4         # factor value 1.4: category 1, valid
    rows[27][0] = -2          # negative weight: invalid
    rows[31][8] = MISSING     # a variable that is not fitted: still valid
    rows[35][0] = 2.5         # fractional weight: valid
    return rows


def valid(row):
    w = row[WEIGHT]
    if w is None or w <= 0:
        return False
    if any(row[c] is None for c in COVARIATES):
        return False
    return all(row[f] is not None and row[f] > -0.5 for f in FACTORS)


def code(v):
    return int(F(str(v)) + F(1, 2))


def fr(x):
    return F(str(x))


def ln(x):
    return mpmath.log(mpmath.mpf(x.numerator) / x.denominator)


def main():
    rows = make_rows()
    good = [r for r in rows if valid(r)]
    bad = [r for r in rows if not valid(r)]
    W = sum(fr(r[WEIGHT]) for r in good)
    weight_or_zero = lambda r: fr(r[WEIGHT]) if r[WEIGHT] is not None and r[WEIGHT] > 0 else F(0)
    counts = dict(nRecords=len(rows), nValid=len(good), nInvalid=len(bad), validW=W,
                  invalidW=sum(weight_or_zero(r) for r in bad),
                  totalW=sum(weight_or_zero(r) for r in rows))

    cov = {}
    n_warnings = 0
    for c in COVARIATES:
        xs = [(fr(r[c]), fr(r[WEIGHT])) for r in good]
        m = sum(w * x for x, w in xs) / W
        ss = sum(w * (x - m) ** 2 for x, w in xs)
        v1, vW = ss / (W - 1), ss / W
        lo, hi = min(x for x, _ in xs), max(x for x, _ in xs)
        allowed = set(ALLOWED[c])
        # Support checks, in record order: each dropped type warns once.
        for x, _ in xs:
            fails = set()
            if not (x >= 0 and x.denominator == 1):
                fails |= {BINOMIAL, NEGBIN, POISSON}
            if not x > 0:
                fails |= {LOGNORMAL, GAMMA}
            if not x >= 0:
                fails |= {WEIBULL, EXPONENTIAL}
            if not (0 < x < 1):
                fails |= {BETA}
            n_warnings += len(fails & allowed)
            allowed -= fails
        if BINOMIAL in allowed and v1 >= m:
            allowed.discard(BINOMIAL)
            n_warnings += 1
        # No negative binomial maximum-likelihood estimate unless the variance (divisor W)
        # exceeds the mean.
        if NEGBIN in allowed and hi > lo and not vW > m:
            allowed.discard(NEGBIN)
            n_warnings += 1
        t = 3 * (m - lo) / (hi - lo) - 1
        mode = lo if t <= 0 else (hi if t >= 1 else lo + (hi - lo) * t)
        positive = all(x > 0 for x, _ in xs)
        meanlog = sum(w * ln(x) for x, w in xs) / W if positive else None
        geo = mpmath.exp(meanlog) if positive else None
        varlog = sum(w * (ln(x) - meanlog) ** 2 for x, w in xs) / W if positive else None
        est = {}
        for k in sorted(allowed):
            if k == BINOMIAL:
                n = max(1, int(mpmath.floor(m / (1 - v1 / m) + F(1, 2))))
                est[k] = [n, m / n]
            elif k == NEGBIN:
                r = m * m / (v1 - m) if v1 > m else F(1)
                est[k] = [r, r / (m + r), 2]
            elif k == CATEGORICAL:
                est[k] = []
            elif k == LOGNORMAL:
                est[k] = [geo, mpmath.sqrt(varlog)]
            elif k == NORMAL:
                est[k] = [m, mpmath.sqrt(vW.numerator) / mpmath.sqrt(vW.denominator)]
            elif k == POISSON:
                est[k] = [m]
            elif k == TRIANGULAR:
                est[k] = [lo, hi, mode]
            elif k == UNIFORM:
                est[k] = [lo, hi]
            elif k == WEIBULL:
                est[k] = [1, 1, 0]
            elif k == GAMMA:
                est[k] = [m * m / v1, m / v1]
            elif k == BETA:
                t2 = (1 - m) * m / v1 - 1
                est[k] = [m * t2, (1 - m) * t2]
            elif k == EXPONENTIAL:
                est[k] = [1 / m]
        cat_counts = []
        if LEVELS[c] != 1:
            for x, w in xs:
                cc = code(x)
                while len(cat_counts) <= cc:
                    cat_counts.append(F(0))
                cat_counts[cc] += w
        cov[c] = dict(m=m, v1=v1, vW=vW, lo=lo, hi=hi, mode=mode, geo=geo, varlog=varlog,
                      est=est, cat=cat_counts, xs=xs, ss=ss)

    corr = {}
    for i in COVARIATES:
        for j in COVARIATES:
            sij = sum(w * (x - cov[i]["m"]) * (y - cov[j]["m"])
                      for (x, w), (y, _) in zip(cov[i]["xs"], cov[j]["xs"]))
            den = cov[i]["ss"] * cov[j]["ss"]
            corr[(i, j)] = mpmath.mpf(sij.numerator) / sij.denominator / mpmath.sqrt(
                mpmath.mpf(den.numerator) / den.denominator)

    factor_counts = {}
    for f in FACTORS:
        cnt = [F(0)] * len(FACTOR_CATEGORIES[f])
        for r in good:
            cnt[code(r[f])] += fr(r[WEIGHT])
        factor_counts[f] = cnt
    cells = {}
    for r in good:
        key = tuple(code(r[f]) for f in FACTORS)
        cells[key] = cells.get(key, F(0)) + fr(r[WEIGHT])

    # Histograms of the continuous covariates: 10 equal bins over [min, max], max in the last.
    hist = {}
    for c in COVARIATES:
        if LEVELS[c] != 1:
            continue
        lo, hi = cov[c]["lo"], cov[c]["hi"]
        bins = [F(0)] * 10
        for x, w in cov[c]["xs"]:
            b = min(int((x - lo) / (hi - lo) * 10), 9)
            bins[b] += w
        hist[c] = bins

    with open("fitting_sample.csv", "w", newline="") as out:
        writer = csv.writer(out)
        writer.writerow(NAMES)
        for r in rows:
            writer.writerow(["" if v is None else v for v in r])

    num = lambda x: mpmath.nstr(mpmath.mpf(x.numerator) / x.denominator if isinstance(x, F)
                                else mpmath.mpf(x), 20, min_fixed=-1, max_fixed=-1)
    val = lambda v: "kMissing" if v is None else repr(float(F(str(v))))
    o = []
    o.append("// Generated by make_reference.py from this folder; do not edit.")
    o.append("// Values: exact rational arithmetic (fractions), logarithms in 50-digit mpmath.")
    o.append("namespace fitref {")
    o.append("inline const std::vector<std::string> kNames = {%s};" %
             ", ".join('"%s"' % n for n in NAMES))
    o.append("inline const std::vector<std::vector<double>> kRows = {")
    for r in rows:
        o.append("    {%s}," % ", ".join(val(v) for v in r))
    o.append("};")
    o.append("inline constexpr int kWeightVar = %d;" % WEIGHT)
    o.append("inline const std::vector<int> kCovariates = {%s};" % ", ".join(map(str, COVARIATES)))
    o.append("inline const std::vector<int> kCovariateLevels = {%s};" %
             ", ".join(str(LEVELS[c]) for c in COVARIATES))
    o.append("inline const std::vector<std::vector<int>> kAllowed = {%s};" % ", ".join(
        "{%s}" % ", ".join(map(str, ALLOWED[c])) for c in COVARIATES))
    o.append("inline const std::vector<int> kFactors = {%s};" % ", ".join(map(str, FACTORS)))
    o.append("inline const std::vector<std::vector<std::string>> kFactorCategories = {%s};" %
             ", ".join("{%s}" % ", ".join('"%s"' % t for t in FACTOR_CATEGORIES[f])
                       for f in FACTORS))
    o.append("inline constexpr int kNRecords = %d, kNValid = %d, kNInvalid = %d;" %
             (counts["nRecords"], counts["nValid"], counts["nInvalid"]))
    o.append("inline constexpr double kValidWeight = %s, kInvalidWeight = %s, kTotalWeight = %s;" %
             (num(counts["validW"]), num(counts["invalidW"]), num(counts["totalW"])))
    o.append("inline constexpr int kDroppedWithWarning = %d;" % n_warnings)
    o.append("struct Moments { double mean, var, varW, min, max, mode, geoMean, varLog; };")
    o.append("inline const std::vector<Moments> kMoments = {")
    for c in COVARIATES:
        d = cov[c]
        o.append("    {%s}," % ", ".join(
            "kMissing" if d[k] is None else num(d[k])
            for k in ["m", "v1", "vW", "lo", "hi", "mode", "geo", "varlog"]))
    o.append("};")
    o.append("// kEstimates[i][k]: parameters of type k for covariate i; absent types were dropped.")
    o.append("inline const std::vector<std::map<int, std::vector<double>>> kEstimates = {")
    for c in COVARIATES:
        o.append("    {%s}," % ", ".join(
            "{%d, {%s}}" % (k, ", ".join(num(x) for x in p)) for k, p in cov[c]["est"].items()))
    o.append("};")
    o.append("inline const std::vector<std::vector<double>> kCovariateCatCounts = {%s};" % ", ".join(
        "{%s}" % ", ".join(num(x) for x in cov[c]["cat"]) for c in COVARIATES))
    o.append("inline const double kCorr[%d][%d] = {%s};" % (len(COVARIATES), len(COVARIATES), ", ".join(
        "{%s}" % ", ".join(num(corr[(i, j)]) for j in COVARIATES) for i in COVARIATES)))
    o.append("inline const std::vector<std::vector<double>> kFactorCounts = {%s};" % ", ".join(
        "{%s}" % ", ".join(num(x) for x in factor_counts[f]) for f in FACTORS))
    o.append("// Contingency cells in code order (first factor slowest) with their probabilities.")
    o.append("inline const std::vector<std::vector<int>> kCellCodes = {%s};" % ", ".join(
        "{%s}" % ", ".join(map(str, key)) for key in sorted(cells)))
    o.append("inline const std::vector<double> kCellProbs = {%s};" % ", ".join(
        num(cells[key] / W) for key in sorted(cells)))
    o.append("// Ten-bin histograms of the continuous covariates (positions 0 and 1).")
    o.append("inline const std::vector<std::vector<double>> kHistograms = {%s};" % ", ".join(
        "{%s}" % ", ".join(num(x) for x in hist[c]) for c in COVARIATES if c in hist))
    o.append("} // namespace fitref")
    with open("fitting_reference.inc", "w") as out:
        out.write("\n".join(o) + "\n")


if __name__ == "__main__":
    main()
