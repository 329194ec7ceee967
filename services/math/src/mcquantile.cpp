#include "mcmath/mcquantile.h"

#include "mcmath/mcdistfun.h"

#include "mccommon/mcmv.h"

#include <boost/math/special_functions/beta.hpp>
#include <boost/math/special_functions/gamma.hpp>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <exception>

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

//! The quintic Hermite piece between two nodes h apart, in u = (z − z_a)/h ∈ [0, 1]: with
//! d = h·y' and c = h²·y'' at both ends, y(u) = y_a + d_a·u + c_a/2·u² + k3·u³ + k4·u⁴ + k5·u⁵,
//! where the last three solve y(1) = y_b, y'(1) = d_b, y''(1) = c_b:
//!   A = y_b − y_a − d_a − c_a/2,  B = d_b − d_a − c_a,  C = c_b − c_a,
//!   k3 = 10A − 4B + C/2,  k4 = −15A + 7B − C,  k5 = 6A − 3B + C/2.
void QuinticHermite(const MCNormalScoreTable::Point& a, const MCNormalScoreTable::Point& b,
                    double h, double* k) {
    const double da = h * a.fDy;
    const double db = h * b.fDy;
    const double ca = h * h * a.fD2y;
    const double cb = h * h * b.fD2y;
    const double bigA = b.fY - a.fY - da - 0.5 * ca;
    const double bigB = db - da - ca;
    const double bigC = cb - ca;
    k[0] = a.fY;
    k[1] = da;
    k[2] = 0.5 * ca;
    k[3] = 10.0 * bigA - 4.0 * bigB + 0.5 * bigC;
    k[4] = -15.0 * bigA + 7.0 * bigB - bigC;
    k[5] = 6.0 * bigA - 3.0 * bigB + 0.5 * bigC;
}

//! A Point of the exact function and whether it could be computed.
struct Sample {
    MCNormalScoreTable::Point fPoint; //!< the values at z
    bool fbOk = false;                //!< computed
};

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

// Boost 1.74's root finders raise an evaluation error with the default policy, whatever the
// caller's (ibetac_inv(2, 5, 1e-300) does): the plain inverses are called inside a catch that
// turns any exception into missing, so that none leaves the prepared quantiles.
double MCGammaQuantile::Fallback(double p, double q) const {
    try {
        if (p <= 0.5) {
            return MCDistFun::IdfGam(p, fShape, fRate);
        }
        const double x = boost::math::gamma_q_inv(fShape, q, MCMathPolicy()) / fRate;
        return std::isfinite(x) ? x : MCMV::Missing();
    } catch (const std::exception&) {
        return MCMV::Missing();
    }
}

double MCGammaQuantile::operator()(double p) const {
    if (!fbValid || !(p > 0.0 && p < 1.0)) {
        return fbValid ? MCDistFun::IdfGam(p, fShape, fRate) : MCMV::Missing();
    }
    return Evaluate(p, 1.0 - p);
}

double MCGammaQuantile::Complement(double q) const {
    if (!fbValid || !(q > 0.0 && q < 1.0)) {
        return fbValid && q == 1.0 ? 0.0 : MCMV::Missing();
    }
    return Evaluate(1.0 - q, q);
}

double MCGammaQuantile::Evaluate(double p, double q) const {
    double y = fTable.Interpolate(std::log(p / q));
    if (std::isnan(y)) {
        return Fallback(p, q);
    }
    const MCMathPolicy pol;
    double x = std::exp(y);
    for (int step = 0; step < kMaxSteps; ++step) {
        // F(x) − p, from the complement in the upper half.
        const double r = p <= 0.5 ? boost::math::gamma_p(fShape, x, pol) - p
                                  : q - boost::math::gamma_q(fShape, x, pol);
        const double f = std::exp((fShape - 1.0) * y - x - fLnGammaShape);
        if (!(f > 0.0) || !std::isfinite(f) || !std::isfinite(r)) {
            return Fallback(p, q);
        }
        const double delta = r / f;
        const double dx = delta / HalleyDenominator(delta, (fShape - 1.0) / x - 1.0);
        const double next = x - dx;
        if (!(next > 0.0) || !std::isfinite(next)) {
            return Fallback(p, q);
        }
        x = next;
        if (std::fabs(dx) <= kStepTol * x) {
            return x / fRate;
        }
        y = std::log(x);
    }
    return Fallback(p, q);
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

double MCBetaQuantile::Fallback(double p, double q) const {
    try {
        if (p <= 0.5) {
            return MCDistFun::IdfBeta(p, fA, fB);
        }
        const double x = boost::math::ibetac_inv(fA, fB, q, MCMathPolicy());
        return std::isfinite(x) ? x : MCMV::Missing();
    } catch (const std::exception&) {
        return MCMV::Missing();
    }
}

double MCBetaQuantile::operator()(double p) const {
    if (!fbValid || fbClosedForm || !(p > 0.0 && p < 1.0)) {
        return fbValid ? MCDistFun::IdfBeta(p, fA, fB) : MCMV::Missing();
    }
    return Evaluate(p, 1.0 - p);
}

double MCBetaQuantile::Complement(double q) const {
    if (!fbValid || !(q >= 0.0 && q <= 1.0)) {
        return MCMV::Missing();
    }
    if (q == 0.0 || q == 1.0) {
        return 1.0 - q;
    }
    if (fbClosedForm) {
        return Fallback(1.0 - q, q);
    }
    return Evaluate(1.0 - q, q);
}

double MCBetaQuantile::Evaluate(double p, double q) const {
    const double y = fTable.Interpolate(std::log(p / q));
    if (std::isnan(y)) {
        return Fallback(p, q);
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
            return Fallback(p, q);
        }
        const double delta = r / f;
        const double dx = delta / HalleyDenominator(delta, (fA - 1.0) / x - (fB - 1.0) / xc);
        const double next = x - dx;
        if (!(next > 0.0 && next < 1.0)) {
            return Fallback(p, q);
        }
        x = next;
        // Relative to the nearer end of the support; a step at rounding level also ends it,
        // since near 1 the spacing of doubles exceeds kStepTol·(1 − x).
        if (std::fabs(dx) <= kStepTol * std::fmin(x, 1.0 - x) + 4.0 * DBL_EPSILON * x) {
            return x;
        }
    }
    return Fallback(p, q);
}

MCNormalQuantile::MCNormalQuantile(double mean, double sd)
    : fMean(mean), fSd(sd), fbValid(IsPositiveParam(sd) && std::isfinite(mean)) {}

double MCNormalQuantile::operator()(double p) const {
    if (!fbValid) {
        return MCMV::Missing();
    }
    return MCDistFun::IdfNorm(p, fMean, fSd);
}

// x' and x'' of a point given in the table's coordinate, from x = T(y):
//   log:      x − o = e^y,          x' = (x − o)·y',  x'' = (x − o)·(y'' + y'²)
//   logistic: x − o = w·σ(y), σ' = σ(1 − σ),  x' = wσ(1 − σ)·y',
//             x'' = wσ(1 − σ)·(y'' + (1 − 2σ)·y'²),  with σ = 1/(1 + e^(−y)), 1 − σ = 1/(1 + e^y).
MCNormalScoreTable::Point MCNormalScoreTable::InX(const Point& p) const {
    Point q = p;
    q.fY = p.fX;
    if (fScale == Scale::kLog) {
        const double w = std::exp(p.fY);
        q.fDy = w * p.fDy;
        q.fD2y = w * (p.fD2y + p.fDy * p.fDy);
    } else if (fScale == Scale::kLogistic) {
        const double sigma = 1.0 / (1.0 + std::exp(-p.fY));
        const double sigmaC = 1.0 / (1.0 + std::exp(p.fY));
        const double g = fWidth * sigma * sigmaC;
        q.fDy = g * p.fDy;
        q.fD2y = g * (p.fD2y + (sigmaC - sigma) * p.fDy * p.fDy);
    }
    return q;
}

// The build of the note in the header: nodes on the coarsest grid, then per level the pieces,
// their middles checked against the exact function, and a halved step (old nodes and middles
// become the new nodes) while an interval fails and the step is above the finest. Each
// interval first tries the piece in x (no exp to evaluate), then, on a log or logistic table,
// the piece in the table's coordinate.
bool MCNormalScoreTable::Build(const Setup& setup, const PointFunction& point) {
    Clear();
    fScale = setup.fScale;
    fOrigin = setup.fOrigin;
    fWidth = setup.fWidth;
    fLower = setup.fLower;
    fUpper = setup.fUpper;
    const bool hasKink = std::isfinite(setup.fKink) && std::fabs(setup.fKink) < kZMax;
    double h = kFirstStep;
    const double z0 = hasKink ? setup.fKink - std::ceil((setup.fKink + kZMax) / h) * h : -kZMax;
    auto n = static_cast<std::size_t>(std::ceil((kZMax - z0) / h));
    constexpr std::size_t kNoKink = static_cast<std::size_t>(-1);
    std::size_t kink =
        hasKink ? static_cast<std::size_t>(std::lround((setup.fKink - z0) / h)) : kNoKink;

    std::vector<Sample> nodes(n + 1);
    Sample kinkLeft; // the left limit at the kink, for the piece that ends there
    for (std::size_t i = 0; i <= n; ++i) {
        const bool atKink = i == kink;
        const double z = atKink ? setup.fKink : z0 + h * static_cast<double>(i);
        nodes[i].fbOk = point(z, atKink ? 1 : 0, nodes[i].fPoint);
    }
    if (hasKink) {
        kinkLeft.fbOk = point(setup.fKink, -1, kinkLeft.fPoint);
    }

    const double nan = std::numeric_limits<double>::quiet_NaN();
    std::vector<double> records;
    std::vector<Sample> middles;
    std::vector<bool> passed;
    double worst = 0.0;
    // The error of the piece `k` at the middle, as a share of the tolerance there.
    const auto midpointShare = [&](const double* k, double exact, bool inX) {
        const double y =
            k[0] + 0.5 * (k[1] + 0.5 * (k[2] + 0.5 * (k[3] + 0.5 * (k[4] + 0.5 * k[5]))));
        const double error = std::fabs((inX ? Clamp(y) : ValueOf(y)) - exact);
        return error == 0.0 ? 0.0
                            : error / (kTolerance * std::fmax(std::fabs(exact), setup.fAbsScale));
    };
    for (;;) {
        records.assign(kRecord * n, nan);
        middles.assign(n, Sample());
        passed.assign(n, false);
        int failures = 0;
        worst = 0.0;
        for (std::size_t i = 0; i < n; ++i) {
            const double zm = z0 + h * (static_cast<double>(i) + 0.5);
            middles[i].fbOk = point(zm, 0, middles[i].fPoint);
            const Sample& a = nodes[i];
            const Sample& b = i + 1 == kink ? kinkLeft : nodes[i + 1];
            if (!a.fbOk || !b.fbOk) {
                continue; // a gap of the exact function: left out, refining cannot help
            }
            if (!middles[i].fbOk) {
                ++failures;
                continue;
            }
            double* k = records.data() + kRecord * i;
            const double exact = middles[i].fPoint.fX;
            QuinticHermite(InX(a.fPoint), InX(b.fPoint), h, k);
            k[kPieceSlot] = 0.0;
            double share = midpointShare(k, exact, true);
            if (!(share <= 0.5) && fScale != Scale::kLinear) {
                QuinticHermite(a.fPoint, b.fPoint, h, k);
                k[kPieceSlot] = 1.0;
                share = midpointShare(k, exact, false);
            }
            if (share <= 0.5) {
                passed[i] = true;
                worst = std::fmax(worst, share);
            } else {
                ++failures;
            }
        }
        if (failures == 0 || h <= kFinestStep) {
            break;
        }
        // Halve the step: node 2i is the old node i, node 2i + 1 the old middle i.
        std::vector<Sample> finer(2 * n + 1);
        for (std::size_t i = 0; i < n; ++i) {
            finer[2 * i] = nodes[i];
            finer[2 * i + 1] = middles[i];
        }
        finer[2 * n] = nodes[n];
        nodes.swap(finer);
        n *= 2;
        h *= 0.5;
        kink = kink == kNoKink ? kNoKink : 2 * kink;
    }
    int usable = 0;
    for (std::size_t i = 0; i < n; ++i) {
        if (passed[i]) {
            ++usable;
        } else {
            std::fill_n(records.begin() + static_cast<std::ptrdiff_t>(kRecord * i), kRecord, nan);
        }
    }
    if (usable == 0) {
        Clear();
        return false;
    }
    fNUsable = usable;
    fWorstMidpoint = worst;
    fZ0 = z0;
    fStep = h;
    fInvStep = 1.0 / h;
    fNIntervalsAsDouble = static_cast<double>(n);
    fvCoefficients.swap(records);
    return true;
}

} // namespace MCMath_800
