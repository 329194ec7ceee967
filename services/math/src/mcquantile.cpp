#include "mcmath/mcquantile.h"

#include "mcmath/mcdistfun.h"

#include "mccommon/mcmv.h"

#include <boost/math/special_functions/beta.hpp>
#include <boost/math/special_functions/gamma.hpp>

#include <cfloat>
#include <cmath>

namespace MCMath_800 {

using MCCommon_800::MCMV;

namespace {

//! A Halley step smaller than this (relative to x) ends the refinement: with cubic
//! convergence the remaining error is then of the order of its cube.
constexpr double kStepTol = 1e-5;
//! Halley steps before the refinement gives up and falls back to the plain inverse.
constexpr int kMaxSteps = 4;
//! Node values below this are treated as underflowed: the table stops there.
constexpr double kTinyX = 1e-300;

bool IsPositiveParam(double v) {
    return v > 0.0 && std::isfinite(v);
}

//! The grid's probabilities of node i: p and q = 1 − p, each computed directly so that the
//! smaller one keeps its relative accuracy.
void NodeProbabilities(int i, double& p, double& q) {
    const double s = MCQuantileTable::NodeS(i);
    if (s <= 0.0) {
        p = 1.0 / (1.0 + std::exp(-s));
        q = 1.0 - p;
    } else {
        q = 1.0 / (1.0 + std::exp(s));
        p = 1.0 - q;
    }
}

//! The denominator of the Halley step, 1 − δ·(f'/f)/2; a value far from 1 means the start
//! was poor, and the step is then limited to a Newton step.
double HalleyDenominator(double delta, double logDensitySlope) {
    const double d = 1.0 - 0.5 * delta * logDensitySlope;
    return (d > 0.5 && d < 2.0) ? d : 1.0;
}

} // namespace

void MCQuantileTable::SetNode(int i, double y, double dyds) {
    const auto k = static_cast<std::size_t>(i);
    fY[k] = y;
    fDyDs[k] = dyds;
    fbUsable[k] = std::isfinite(y) && std::isfinite(dyds);
}

void MCQuantileTable::Finish() {
    fLo = 0;
    fHi = -1;
    int runStart = 0;
    for (int i = 0; i <= kNodes; ++i) {
        if (i < kNodes && fbUsable[static_cast<std::size_t>(i)]) {
            continue;
        }
        if (i - 1 - runStart > fHi - fLo) {
            fLo = runStart;
            fHi = i - 1;
        }
        runStart = i + 1;
    }
}

// Cubic Hermite interpolation on [s_i, s_(i+1)] with t = (s − s_i)/h:
//   y = (2t³ − 3t² + 1)·y_i + (t³ − 2t² + t)·h·y'_i + (−2t³ + 3t²)·y_(i+1) + (t³ − t²)·h·y'_(i+1).
double MCQuantileTable::Interpolate(double s) const {
    const double t = (s - kSMin) / kStep;
    if (!(t >= fLo && t <= fHi) || fHi <= fLo) {
        return MCMV::Missing();
    }
    int i = static_cast<int>(t);
    if (i >= fHi) {
        i = fHi - 1;
    }
    const double u = t - i;
    const auto k = static_cast<std::size_t>(i);
    const double u2 = u * u;
    const double u3 = u2 * u;
    return (2.0 * u3 - 3.0 * u2 + 1.0) * fY[k] + (u3 - 2.0 * u2 + u) * kStep * fDyDs[k] +
           (3.0 * u2 - 2.0 * u3) * fY[k + 1] + (u3 - u2) * kStep * fDyDs[k + 1];
}

// Nodes: x_i = P⁻¹(α, p_i) (or Q⁻¹(α, q_i) in the upper half), y_i = ln x_i and
// dy/ds = p·q/(x·f(x)) with f(x) = x^(α−1)·e^(−x)/Γ(α), the unit-rate density.
MCGammaQuantile::MCGammaQuantile(double shape, double rate)
    : fShape(shape), fRate(rate), fbValid(IsPositiveParam(shape) && IsPositiveParam(rate)) {
    if (!fbValid) {
        return;
    }
    const MCMathPolicy pol;
    fLnGammaShape = boost::math::lgamma(shape, pol);
    for (int i = 0; i < MCQuantileTable::kNodes; ++i) {
        double p = 0.0;
        double q = 0.0;
        NodeProbabilities(i, p, q);
        const double x = p <= 0.5 ? boost::math::gamma_p_inv(shape, p, pol)
                                  : boost::math::gamma_q_inv(shape, q, pol);
        if (!(x >= kTinyX) || !std::isfinite(x)) {
            fTable.SetNode(i, MCMV::Missing(), MCMV::Missing());
            continue;
        }
        const double f = boost::math::gamma_p_derivative(shape, x, pol);
        fTable.SetNode(i, std::log(x), p * q / (x * f));
    }
    fTable.Finish();
}

double MCGammaQuantile::Fallback(double p) const {
    return MCDistFun::IdfGam(p, fShape, fRate);
}

double MCGammaQuantile::operator()(double p) const {
    if (!fbValid || !(p > 0.0 && p < 1.0)) {
        return fbValid ? MCDistFun::IdfGam(p, fShape, fRate) : MCMV::Missing();
    }
    const double q = 1.0 - p;
    double y = fTable.Interpolate(std::log(p / q));
    if (std::isnan(y)) {
        return Fallback(p);
    }
    const MCMathPolicy pol;
    double x = std::exp(y);
    for (int step = 0; step < kMaxSteps; ++step) {
        // F(x) − p, from the complement in the upper half.
        const double r = p <= 0.5 ? boost::math::gamma_p(fShape, x, pol) - p
                                  : q - boost::math::gamma_q(fShape, x, pol);
        const double f = std::exp((fShape - 1.0) * y - x - fLnGammaShape);
        if (!(f > 0.0) || !std::isfinite(f) || !std::isfinite(r)) {
            return Fallback(p);
        }
        const double delta = r / f;
        const double dx = delta / HalleyDenominator(delta, (fShape - 1.0) / x - 1.0);
        const double next = x - dx;
        if (!(next > 0.0) || !std::isfinite(next)) {
            return Fallback(p);
        }
        x = next;
        if (std::fabs(dx) <= kStepTol * x) {
            return x / fRate;
        }
        y = std::log(x);
    }
    return Fallback(p);
}

// Nodes: x_i = I⁻¹(a, b, p_i) (or the complement's inverse in the upper half),
// y_i = ln(x/(1 − x)) and dy/ds = p·q/(x·(1 − x)·f(x)) with f the Beta density.
MCBetaQuantile::MCBetaQuantile(double a, double b)
    : fA(a), fB(b), fbValid(IsPositiveParam(a) && IsPositiveParam(b)),
      fbClosedForm(a == 1.0 || b == 1.0 || (a == 0.5 && b == 0.5)) {
    if (!fbValid || fbClosedForm) {
        return;
    }
    const MCMathPolicy pol;
    fLnBeta =
        boost::math::lgamma(a, pol) + boost::math::lgamma(b, pol) - boost::math::lgamma(a + b, pol);
    for (int i = 0; i < MCQuantileTable::kNodes; ++i) {
        double p = 0.0;
        double q = 0.0;
        NodeProbabilities(i, p, q);
        double x = 0.0;
        double xc = 0.0; // 1 − x, computed without cancellation where it is small
        if (p <= 0.5) {
            x = boost::math::ibeta_inv(a, b, p, &xc, pol);
        } else {
            x = boost::math::ibetac_inv(a, b, q, &xc, pol);
        }
        if (!(x >= kTinyX) || !(xc >= kTinyX) || !std::isfinite(x)) {
            fTable.SetNode(i, MCMV::Missing(), MCMV::Missing());
            continue;
        }
        const double f = boost::math::ibeta_derivative(a, b, x, pol);
        fTable.SetNode(i, std::log(x / xc), p * q / (x * xc * f));
    }
    fTable.Finish();
}

double MCBetaQuantile::Fallback(double p) const {
    return MCDistFun::IdfBeta(p, fA, fB);
}

double MCBetaQuantile::operator()(double p) const {
    if (!fbValid || fbClosedForm || !(p > 0.0 && p < 1.0)) {
        return fbValid ? MCDistFun::IdfBeta(p, fA, fB) : MCMV::Missing();
    }
    const double q = 1.0 - p;
    const double y = fTable.Interpolate(std::log(p / q));
    if (std::isnan(y)) {
        return Fallback(p);
    }
    const MCMathPolicy pol;
    // x = 1/(1 + e^(−y)) and 1 − x = 1/(1 + e^y), each without cancellation.
    double x = 1.0 / (1.0 + std::exp(-y));
    for (int step = 0; step < kMaxSteps; ++step) {
        const double xc = 1.0 - x;
        const double r = p <= 0.5 ? boost::math::ibeta(fA, fB, x, pol) - p
                                  : q - boost::math::ibetac(fA, fB, x, pol);
        const double f = std::exp((fA - 1.0) * std::log(x) + (fB - 1.0) * std::log1p(-x) - fLnBeta);
        if (!(f > 0.0) || !std::isfinite(f) || !std::isfinite(r)) {
            return Fallback(p);
        }
        const double delta = r / f;
        const double dx = delta / HalleyDenominator(delta, (fA - 1.0) / x - (fB - 1.0) / xc);
        const double next = x - dx;
        if (!(next > 0.0 && next < 1.0)) {
            return Fallback(p);
        }
        x = next;
        // Relative to the nearer end of the support; a step at rounding level also ends it,
        // since near 1 the spacing of doubles exceeds kStepTol·(1 − x).
        if (std::fabs(dx) <= kStepTol * std::fmin(x, 1.0 - x) + 4.0 * DBL_EPSILON * x) {
            return x;
        }
    }
    return Fallback(p);
}

MCNormalQuantile::MCNormalQuantile(double mean, double sd)
    : fMean(mean), fSd(sd), fbValid(IsPositiveParam(sd) && std::isfinite(mean)) {}

double MCNormalQuantile::operator()(double p) const {
    if (!fbValid) {
        return MCMV::Missing();
    }
    return MCDistFun::IdfNorm(p, fMean, fSd);
}

} // namespace MCMath_800
