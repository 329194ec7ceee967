#!/usr/bin/python3
"""Normal-scale correlations of the NORTA reference pairs, by numerical integration.

For inputs X1 = T1(Z1), X2 = T2(Z2), T = F^-1(Phi(z)) the generator's transforms and (Z1, Z2)
standard bivariate normal with correlation r, the correlation of the transformed pair is

    g(r) = (E[T1(Z1) T2(Z2)] - E[T1] E[T2]) / (sd(T1) sd(T2)).

For each pair and target rho this script finds the r with g(r) = rho (and g(-1), g(+1)), with
every integral in 40-digit mpmath, reducing each double integral to one dimension:

  * second input Normal(mu, s): E[T1(Z1) (mu + s Z2)] = mu E[T1] + s r E[T1(Z) Z], so
    g(r) = r E[T1(Z) Z] / sd(T1). For a discrete T1 taking value k on [a_k, a_(k+1)),
    a_k = Phi^-1(F(k - 1)), E[T1(Z) Z] = sum_(k >= 1) phi(a_k).
  * Uniform(a, b) first: E[Phi(Z1) | Z2 = z] = Phi(r z / sqrt(2 - r^2)), so
    E[T1 T2] = a E[T2] + (b - a) int T2(z) Phi(r z / sqrt(2 - r^2)) phi(z) dz.
  * LogNormal(a1, b1) and LogNormal(a2, b2) (x = a e^(b z)): closed form
    g(r) = (e^(b1 b2 r) - 1) / sqrt((e^(b1^2) - 1)(e^(b2^2) - 1)).

Every one-dimensional formula is cross-checked against a direct two-dimensional integration
(scipy dblquad) at one r, and the script stops if they differ by more than 1e-6.

The parameters follow the generator's conventions: Gamma (shape, rate), Exponential (rate),
LogNormal (a, b) with x = a e^(b z), Poisson (mean) inverted exactly.

Writes norta_reference.inc, included by secnorta_test.cpp: per pair and target, the normal
correlation r with g(r) = rho, g(-1), g(+1), and g on the grid r = -1, -0.99, ..., 1, from which
the test reads the correlation that a normal correlation found by the simulator really gives.
Usage: python3 make_norta_reference.py   (from this folder; needs python3-mpmath, python3-scipy)
"""
import math

import mpmath
from scipy import integrate, stats

mpmath.mp.dps = 40

NORMAL, LOGNORMAL, POISSON, UNIFORM, GAMMA, EXPONENTIAL = 4, 3, 5, 7, 9, 11
TARGETS = [-0.5, 0.3, 0.7]
# Targets that no normal correlation reaches (below g(-1)): the search must give -1.
BEYOND = {"LogNormalLogNormal": [-0.8]}


def phi(z):
    return mpmath.npdf(z)


def Phi(z):
    return mpmath.ncdf(z)


def Phi_inv(p):
    return -mpmath.sqrt(2) * mpmath.erfinv(1 - 2 * p) if p != 0.5 else mpmath.mpf(0)


def exp_quantile(rate):
    # -ln(1 - u)/rate with 1 - u = Phi(-z)
    return lambda z: -mpmath.log(Phi(-z)) / rate


def gamma_quantile(shape, rate):
    """The Gamma quantile at Phi(z) by bisection on ln x (40 digits)."""
    def q(z):
        p = Phi(z)
        f = lambda x: mpmath.gammainc(shape, 0, rate * x, regularized=True) - p
        lo, hi = mpmath.mpf(-200), mpmath.mpf(10)
        while f(mpmath.exp(hi)) < 0:
            hi += 10
        for _ in range(160):
            mid = (lo + hi) / 2
            if f(mpmath.exp(mid)) < 0:
                lo = mid
            else:
                hi = mid
        return mpmath.exp((lo + hi) / 2)
    return q


def poisson_cuts(lam):
    """a_k = Phi^-1(F(k - 1)) for k = 1, 2, ... until F is 1 to 40 digits."""
    cuts, k, cdf, term = [], 0, mpmath.mpf(0), mpmath.exp(-lam)
    while cdf < 1 - mpmath.mpf(10) ** -35:
        cdf += term
        cuts.append(Phi_inv(cdf))  # a_(k+1)
        k += 1
        term = term * lam / k
    return cuts


def moments_1d(t, lo=-12, hi=12):
    mean = mpmath.quad(lambda z: t(z) * phi(z), [lo, -4, 0, 4, hi])
    second = mpmath.quad(lambda z: t(z) ** 2 * phi(z), [lo, -4, 0, 4, hi])
    ez = mpmath.quad(lambda z: t(z) * z * phi(z), [lo, -4, 0, 4, hi])
    return mean, mpmath.sqrt(second - mean ** 2), ez


def bisect_root(g, rho):
    lo, hi = mpmath.mpf(-1), mpmath.mpf(1)
    for _ in range(200):
        mid = (lo + hi) / 2
        if g(mid) < rho:
            lo = mid
        else:
            hi = mid
    return (lo + hi) / 2


def pair_normal_second(name, t1, sd1, ez1, check2d):
    slope = ez1 / sd1
    g = lambda r: r * slope
    return name, g, check2d


def main():
    rows = []

    # Normal(100, 15) - Exponential(rate 0.5): g(r) = r E[T(Z) Z]/sd(T).
    t_exp = exp_quantile(mpmath.mpf("0.5"))
    _, sd_exp, ez_exp = moments_1d(t_exp)
    g_ne = lambda r: r * ez_exp / sd_exp
    rows.append(("NormalExponential", (NORMAL, [100.0, 15.0]), (EXPONENTIAL, [0.5]), g_ne,
                 lambda z1, z2: 100 + 15 * z1, lambda z1, z2: -math.log(stats.norm.sf(z2)) / 0.5))

    # Uniform(0, 1) - Gamma(shape 2, rate 0.5).
    t_gam = gamma_quantile(2, mpmath.mpf("0.5"))
    zs = [mpmath.mpf(i) / 16 for i in range(-160, 161)]  # z in [-10, 10]
    # tabulate the Gamma transform once (smooth), integrate with the table by Simpson's rule
    gam_vals = [t_gam(z) for z in zs]
    mean_g, sd_g = mpmath.mpf(4), mpmath.sqrt(2) / mpmath.mpf("0.5")

    def g_ug(r):
        r = mpmath.mpf(r)
        s = mpmath.sqrt(2 - r * r)
        f = [gam_vals[i] * Phi(r * zs[i] / s) * phi(zs[i]) for i in range(len(zs))]
        h = zs[1] - zs[0]
        simpson = h / 3 * (f[0] + f[-1] + 4 * sum(f[1:-1:2]) + 2 * sum(f[2:-1:2]))
        cov = simpson - mpmath.mpf("0.5") * mean_g
        return cov / (mpmath.sqrt(mpmath.mpf(1) / 12) * sd_g)

    rows.append(("UniformGamma", (UNIFORM, [0.0, 1.0]), (GAMMA, [2.0, 0.5]), g_ug,
                 lambda z1, z2: stats.norm.cdf(z1), lambda z1, z2: stats.gamma.ppf(stats.norm.cdf(z2), 2.0, scale=2.0)))

    # LogNormal(e, 0.5) - LogNormal(1, 0.8): closed form.
    b1, b2 = mpmath.mpf("0.5"), mpmath.mpf("0.8")
    den = mpmath.sqrt(mpmath.expm1(b1 * b1) * mpmath.expm1(b2 * b2))
    g_ll = lambda r: mpmath.expm1(b1 * b2 * r) / den
    rows.append(("LogNormalLogNormal", (LOGNORMAL, [math.e, 0.5]), (LOGNORMAL, [1.0, 0.8]), g_ll,
                 lambda z1, z2: math.e * math.exp(0.5 * z1), lambda z1, z2: math.exp(0.8 * z2)))

    # Poisson(4) - Normal(0, 1): E[T(Z) Z] = sum_(k >= 1) phi(a_k).
    lam = mpmath.mpf(4)
    cuts = poisson_cuts(lam)
    ez_poi = sum(phi(a) for a in cuts)
    g_pn = lambda r: r * ez_poi / mpmath.sqrt(lam)
    poisson_value = lambda z: float(stats.poisson.ppf(stats.norm.cdf(z), 4.0))
    rows.append(("PoissonNormal", (POISSON, [4.0]), (NORMAL, [0.0, 1.0]), g_pn,
                 lambda z1, z2: poisson_value(z1), None))

    out = []
    for name, first, second, g, t1, t2 in rows:
        check(name, g, t1, t2)
        g_low, g_high = g(-1), g(1)
        grid = [g(mpmath.mpf(k - 100) / 100) for k in range(201)]
        for rho in TARGETS + BEYOND.get(name, []):
            r = bisect_root(g, rho) if g_low < rho < g_high else (-1 if rho <= g_low else 1)
            label = "%s_%s" % (name, ("m%g" % -rho if rho < 0 else "p%g" % rho).replace(".", "_"))
            out.append('    {"%s", %d, {%s}, %d, {%s}, %.1f, %s, %s, %s,\n     {%s}},' % (
                label, first[0], ", ".join(repr(v) for v in first[1]), second[0],
                ", ".join(repr(v) for v in second[1]), rho, mpmath.nstr(r, 17),
                mpmath.nstr(g_low, 17), mpmath.nstr(g_high, 17),
                ", ".join(mpmath.nstr(v, 12) for v in grid)))
            print(label, mpmath.nstr(r, 10), mpmath.nstr(g_low, 8), mpmath.nstr(g_high, 8))

    with open("norta_reference.inc", "w") as f:
        f.write("// Generated by make_norta_reference.py: do not edit.\n")
        f.write("// name, first type, its parameters, second type, its parameters, target rho,\n")
        f.write("// normal correlation r with g(r) = rho, g(-1), g(+1), and g(r) at r = -1, -0.99, ..., 1.\n")
        f.write("\n".join(out) + "\n")


def check(name, g, t1, t2, r=0.45):
    """The 1-D formula of g against a direct 2-D integration at one r. A step function T1
    against a Normal (t2 None) defeats the 2-D quadrature; there the slope E[T1(Z) Z]/sd(T1)
    (Stein's identity Cov(T1(Z1), Z2) = r E[T1(Z1) Z1]) is integrated piece by piece between
    the jumps of scipy's quantile instead."""
    if t2 is None:
        jumps = [stats.norm.ppf(stats.poisson.cdf(k, 4.0)) for k in range(40)]
        jumps = [j for j in jumps if -8 < j < 8]
        edges = [-8.0] + jumps + [8.0]
        ez = sum(integrate.quad(lambda z: t1(z, z) * z * stats.norm.pdf(z), a, b)[0]
                 for a, b in zip(edges[:-1], edges[1:]) if b > a)
        direct = r * ez / 2.0
        formula = float(g(r))
        print("%s: g(%.2f) formula %.10f, piecewise integral %.10f" % (name, r, formula, direct))
        if abs(direct - formula) > 1e-6:
            raise SystemExit("%s: the two integrations disagree" % name)
        return
    s = math.sqrt(1 - r * r)
    dens = lambda z2, z1: stats.norm.pdf(z1) * stats.norm.pdf((z2 - r * z1) / s) / s
    lim = 7.5
    m1 = integrate.quad(lambda z: t1(z, z) * stats.norm.pdf(z), -lim, lim, limit=400)[0]
    m2 = integrate.quad(lambda z: t2(z, z) * stats.norm.pdf(z), -lim, lim, limit=400)[0]
    v1 = integrate.quad(lambda z: (t1(z, z) - m1) ** 2 * stats.norm.pdf(z), -lim, lim,
                        limit=400)[0]
    v2 = integrate.quad(lambda z: (t2(z, z) - m2) ** 2 * stats.norm.pdf(z), -lim, lim,
                        limit=400)[0]
    cross = integrate.dblquad(lambda z2, z1: (t1(z1, z1) - m1) * (t2(z2, z2) - m2) *
                              dens(z2, z1), -lim, lim, -lim, lim, epsabs=1e-10,
                              epsrel=1e-9)[0]
    direct = cross / math.sqrt(v1 * v2)
    formula = float(g(r))
    print("%s: g(%.2f) formula %.10f, 2-D integral %.10f" % (name, r, formula, direct))
    if abs(direct - formula) > 1e-6:
        raise SystemExit("%s: the two integrations disagree" % name)


if __name__ == "__main__":
    main()
