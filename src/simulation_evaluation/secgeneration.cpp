#include "simulation_evaluation/secgeneration.h"

#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"
#include "mcmath/mcmathfun.h"
#include "mcmath/mcpower.h"

#include <algorithm>
#include <cmath>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCMath_800::MCDistFun;
using MCSPConst::DistType;

namespace {

bool IsFinite(double x) {
    return std::isfinite(x);
}

bool IsProbability(double p) {
    return p >= 0.0 && p <= 1.0;
}

//! Γ(x) through ln Γ of the math services; missing where ln Γ is.
double GammaFunction(double x) {
    const double lnGamma = MCDistFun::norvanednlgam(x);
    return MCMV::IsMissing(lnGamma) ? MCMV::Missing() : std::exp(lnGamma);
}

//! Poisson distribution function at a whole x ≥ 0: P(X ≤ x) = Q(x + 1, λ) = 1 − P(x + 1, λ),
//! the regularised incomplete gamma of shape x + 1 at λ with unit rate.
double PoissonCdf(double lambda, double x) {
    const double lower = MCDistFun::CdfGam(lambda, x + 1.0, 1.0);
    return MCMV::IsMissing(lower) ? MCMV::Missing() : 1.0 - lower;
}

//! Negative binomial distribution function of the failures before the r-th success:
//! P(X ≤ x) = I_p(r, x + 1).
double NegBinCdf(double r, double p, double x) {
    return MCDistFun::CdfBeta(p, r, x + 1.0);
}

//! Exact inverse of a discrete distribution function F on 0, 1, 2, … by a search on whole
//! numbers: the k with F(k − 1) ≤ u < F(k), given a `lo` ≥ −1 with F(lo) ≤ u (F(−1) = 0).
//! Upper bracket by doubling, then bisection; about 2·log2(k) evaluations of F. Missing when
//! F is missing on the way or no k below 2^52 qualifies (u ≥ 1).
//!
//! Why whole numbers: F's continuous extension F(x) (the incomplete gamma or beta in x + 1)
//! crosses u at some x* in (k − 1, k]; rounding a root found on the reals, floor(x* + 0.5),
//! gives k − 1 whenever x* lies in the lower half of that interval, which moves probability
//! from every value to its predecessor. The draw must be k itself, the inverse by inversion.
template <class Cdf> double IntegerInverse(const Cdf& cdf, double lo, double u) {
    constexpr double kLimit = 4503599627370496.0; // 2^52: whole numbers stay exact
    double hi = std::max(2.0 * lo + 1.0, 1.0);
    for (;;) {
        const double f = cdf(hi);
        if (MCMV::IsMissing(f)) {
            return MCMV::Missing();
        }
        if (f > u) {
            break;
        }
        lo = hi;
        hi = 2.0 * hi + 1.0;
        if (hi > kLimit) {
            return MCMV::Missing();
        }
    }
    // Invariant: F(lo) ≤ u < F(hi).
    while (hi - lo > 1.0) {
        const double mid = std::floor(0.5 * (lo + hi));
        const double f = cdf(mid);
        if (MCMV::IsMissing(f)) {
            return MCMV::Missing();
        }
        if (f > u) {
            hi = mid;
        } else {
            lo = mid;
        }
    }
    return hi;
}

//! The prepared exact inverse: a lookup in the table 0, F(0), F(1), …, F(K − 1) while u lies
//! below its last entry, the search on F beyond it. Both give the k with F(k − 1) ≤ u < F(k).
template <class Cdf>
double TableInverse(const std::vector<double>& table, const Cdf& cdf, double u) {
    if (u < table.back()) {
        return static_cast<double>(SECDrawCell(table, u));
    }
    return IntegerInverse(cdf, static_cast<double>(table.size()) - 2.0, u);
}

//! Fills `table` with 0, F(0), F(1), … until F reaches 1 or the table holds kMaxInverseTable
//! values of F. False when F is missing somewhere.
template <class Cdf> bool BuildInverseTable(const Cdf& cdf, std::vector<double>& table) {
    table.assign(1, 0.0);
    for (int k = 0; k < SECGenerationConst::kMaxInverseTable; ++k) {
        const double f = cdf(static_cast<double>(k));
        if (MCMV::IsMissing(f)) {
            table.clear();
            return false;
        }
        table.push_back(f);
        if (f >= 1.0) {
            break;
        }
    }
    return true;
}

//! The normal approximation of a discrete input with mean m ≥ 20: the nearest whole number to
//! m + s·z, that is floor(m + s·z + 0.5). The continuity correction (+0.5) keeps the mean at m;
//! a plain floor would shift every value down by half a unit on average.
double NormalApproximation(const SECInputGenerator& gen, double z) {
    return std::floor(z * gen.fStdDev + gen.fMean + 0.5);
}

//! Position of a value inside cell i of a cumulative table: (u − t_i)/(t_(i+1) − t_i) ∈ [0, 1).
//! The cell's width is its normalised probability; BinSearch never picks a cell of width 0.
double PositionInCell(const std::vector<double>& table, int i, double u) {
    const double width =
        table[static_cast<std::size_t>(i) + 1] - table[static_cast<std::size_t>(i)];
    return width > 0.0 ? (u - table[static_cast<std::size_t>(i)]) / width : 0.0;
}

//! ln φ(z) = −z²/2 − ln √(2π), the standard normal log density.
double LogNormalDensity(double z) {
    constexpr double kLnSqrtTwoPi = 0.91893853320467274178;
    return -0.5 * z * z - kLnSqrtTwoPi;
}

//! E(z) = −ln(1 − Φ(z)) = −ln Φ(−z), a unit exponential value of the normal score: through
//! log1p(−Φ(z)) in the lower half, where Φ(−z) is near 1 and its logarithm would cancel, and
//! through ln Φ(−z) in the upper half, where Φ(−z) keeps its relative accuracy.
double UnitExponential(double z) {
    return z < 0.0 ? -std::log1p(-MCDistFun::CdfStdNorm(z)) : -std::log(MCDistFun::CdfStdNorm(-z));
}

//! A quantile at u = Φ(z), from the upper-tail probability Φ(−z) when z > 0 so that the upper
//! tail keeps its relative accuracy (see MCGammaQuantile::Complement).
template <class Quantile> double QuantileOfScore(const Quantile& quantile, double z) {
    return z <= 0.0 ? quantile(MCDistFun::CdfStdNorm(z))
                    : quantile.Complement(MCDistFun::CdfStdNorm(-z));
}

// ---- The table in z ---------------------------------------------------------------------------
//
// The points of MCNormalScoreTable for each tabulated type: x = g(z) by the exact transform, a
// coordinate y of it, and dy/dz, d²y/dz² from g' = φ(z)/f(x) and g'' = g'·(−z − ℓ(x)·g'),
// ℓ = f'/f the log-density slope (derivation in mcquantile.h). In the coordinates used:
//   linear y = x:            y' = φ/f,  y'' = y'·(−z − ℓ·y')
//   log y = ln(x − o):       y' = φ/((x − o)·f),  y'' = y'·(−z − (L + 1)·y'),  L = ℓ·(x − o)
//   logistic y = ln(x/(1 − x)): y' = φ/(x(1 − x)f),  y'' = y'·(−z − y'·(α(1 − x) − βx)) (Beta)
// With E = −ln Φ(−z): Uniform on [a, b]: y' = (b − a)φ. Triangular below the mode c,
// x − a = √((c − a)(b − a)u): y' = (c − a)(b − a)φ/(2(x − a)), ℓ = 1/(x − a); above it,
// b − x = √((b − a)(b − c)(1 − u)): y' = (b − a)(b − c)φ/(2(b − x)), ℓ = −1/(b − x). Weibull
// (scale a, shape b, location c; the Exponential of rate θ is a = 1/θ, b = 1, c = 0), w = x − c
// = a·E^(1/b): y = ln w, y' = φ/(b·Φ(−z)·E), L + 1 = b(1 − E). Gamma (shape k, rate β):
// ln(x·f(x)) = k·ln(βx) − βx − ln Γ(k), L + 1 = k − βx. Beta (α, β):
// ln(x(1 − x)f(x)) = α·ln x + β·ln(1 − x) − ln B(α, β).

//! Values of x − o below this are treated as underflowed: the point is left out.
constexpr double kTinyValue = 1e-300;

using ScorePoint = MCMath_800::MCNormalScoreTable::Point;

//! The log-scale point of a value w = x − o > 0 with y' = exp(lnPhi − ln(w·f(x))) and
//! L + 1 = lPlusOne. False when w underflows or a derivative is not finite.
bool LogScalePoint(double w, double lnPhi, double lnWf, double lPlusOne, double z, ScorePoint& pt) {
    if (!(w >= kTinyValue) || !IsFinite(w)) {
        return false;
    }
    pt.fY = std::log(w);
    pt.fDy = std::exp(lnPhi - lnWf);
    pt.fD2y = pt.fDy * (-z - lPlusOne * pt.fDy);
    return IsFinite(pt.fDy) && IsFinite(pt.fD2y);
}

//! The Weibull point (location c, scale a, shape b), which also serves the Exponential.
bool WeibullPoint(double a, double b, double z, double lnPhi, ScorePoint& pt) {
    const double e = UnitExponential(z);
    const double q = MCDistFun::CdfStdNorm(-z);
    if (!(e > 0.0) || !(q > 0.0)) {
        return false;
    }
    // y' = φ/(b·q·E), so ln(w·f) = ln b + ln q + ln E.
    return LogScalePoint(a * std::pow(e, 1.0 / b), lnPhi, std::log(b) + std::log(q) + std::log(e),
                         b * (1.0 - e), z, pt);
}

//! The point of `gen` at z (`side` −1 or +1 at the Triangular's mode: which branch gives the
//! derivatives). False where the exact transform gives no usable value.
bool ScorePointOf(const SECInputGenerator& gen, double z, int side, ScorePoint& pt) {
    pt.fX = SECTransformExact(gen, z);
    if (!IsFinite(pt.fX)) {
        return false;
    }
    const double* p = gen.fvParams.data();
    const double x = pt.fX;
    const double lnPhi = LogNormalDensity(z);
    switch (gen.fDistType) {
    case MCSPConst::kDistUniform:
        pt.fY = x;
        pt.fDy = (p[1] - p[0]) * std::exp(lnPhi);
        pt.fD2y = -z * pt.fDy;
        return true;
    case MCSPConst::kDistTriangular: {
        const double a = p[0];
        const double b = p[1];
        const double c = p[2];
        const bool lower = side != 0 ? side < 0 : x < c;
        const double distance = lower ? x - a : b - x; // to the end the branch's root is taken at
        if (!(distance > 0.0)) {
            return false;
        }
        const double width = lower ? (c - a) * (b - a) : (b - a) * (b - c);
        pt.fY = x;
        pt.fDy = width * std::exp(lnPhi) / (2.0 * distance);
        // ℓ·y' = ±y'/distance: + below the mode, − above it.
        pt.fD2y = pt.fDy * (-z - (lower ? 1.0 : -1.0) * pt.fDy / distance);
        return IsFinite(pt.fDy) && IsFinite(pt.fD2y);
    }
    case MCSPConst::kDistExponential:
        return WeibullPoint(1.0 / p[0], 1.0, z, lnPhi, pt);
    case MCSPConst::kDistWeibull:
        return WeibullPoint(p[0], p[1], z, lnPhi, pt);
    case MCSPConst::kDistGamma: {
        const double k = p[0];
        const double bx = p[1] * x;
        const double lnXf = k * std::log(bx) - bx - MCDistFun::norvanednlgam(k);
        return LogScalePoint(x, lnPhi, lnXf, k - bx, z, pt);
    }
    case MCSPConst::kDistBeta: {
        const double alpha = p[0];
        const double beta = p[1];
        const double xc = 1.0 - x;
        if (!(x >= kTinyValue) || !(xc > 0.0)) {
            return false;
        }
        const double lnX = std::log(x);
        const double lnXc = std::log1p(-x);
        const double lnBeta = MCDistFun::norvanednlgam(alpha) + MCDistFun::norvanednlgam(beta) -
                              MCDistFun::norvanednlgam(alpha + beta);
        pt.fY = lnX - lnXc;
        pt.fDy = std::exp(lnPhi - (alpha * lnX + beta * lnXc - lnBeta));
        pt.fD2y = pt.fDy * (-z - pt.fDy * (alpha * xc - beta * x));
        return IsFinite(pt.fY) && IsFinite(pt.fDy) && IsFinite(pt.fD2y);
    }
    default:
        return false;
    }
}

//! Builds gen.fScoreTable for the tabulated types (see the header); leaves it empty for the
//! others. A table that could not be built leaves every draw to the exact transform.
void BuildScoreTable(SECInputGenerator& gen) {
    using MCMath_800::MCNormalScoreTable;
    MCNormalScoreTable::Setup setup;
    const double* p = gen.fvParams.data();
    // The natural range bounds the pieces that interpolate the value itself.
    if (!MCMV::IsMissing(gen.fLower)) {
        setup.fLower = gen.fLower;
    }
    if (!MCMV::IsMissing(gen.fUpper)) {
        setup.fUpper = gen.fUpper;
    }
    switch (gen.fDistType) {
    case MCSPConst::kDistUniform:
    case MCSPConst::kDistTriangular:
        setup.fScale = MCNormalScoreTable::Scale::kLinear;
        setup.fAbsScale = gen.fStdDev;
        if (gen.fDistType == MCSPConst::kDistTriangular && p[2] > p[0] && p[2] < p[1]) {
            // The mode: u = (c − a)/(b − a), where the density has its corner.
            setup.fKink = MCDistFun::IdfNorm((p[2] - p[0]) / (p[1] - p[0]), 0.0, 1.0);
        }
        break;
    case MCSPConst::kDistExponential:
    case MCSPConst::kDistGamma:
        setup.fScale = MCNormalScoreTable::Scale::kLog;
        break;
    case MCSPConst::kDistWeibull:
        setup.fScale = MCNormalScoreTable::Scale::kLog;
        setup.fOrigin = p[2];
        setup.fAbsScale = std::fabs(p[2]);
        break;
    case MCSPConst::kDistBeta:
        setup.fScale = MCNormalScoreTable::Scale::kLogistic;
        break;
    default:
        return;
    }
    const SECInputGenerator& exact = gen;
    (void)gen.fScoreTable.Build(setup, [&exact](double z, int side, ScorePoint& pt) {
        return ScorePointOf(exact, z, side, pt);
    });
}

//! m, s, the range, the tables and the validity of each type. `p` is the stored vector, whose
//! length SECBuildStoredParams has checked (it is checked again here for callers that build
//! vectors by hand).
bool PrepareByType(DistType type, const std::vector<double>& params, SECInputGenerator& gen) {
    const double* p = params.data();
    const std::size_t n = params.size();
    const double missing = MCMV::Missing();
    const bool allFinite = std::all_of(params.begin(), params.end(), IsFinite);
    if (!allFinite) {
        return false;
    }
    switch (type) {
    case MCSPConst::kDistBinomial: {
        if (n != 2 || p[0] < 0.0 || !IsProbability(p[1])) {
            return false;
        }
        const double trials = p[0];
        const double prob = p[1];
        gen.fMean = trials * prob;
        gen.fStdDev = std::sqrt(trials * prob * (1.0 - prob));
        gen.fLower = 0.0;
        gen.fUpper = trials;
        gen.fbExactDiscrete = gen.fMean < SECGenerationConst::kDiscreteThreshold;
        if (trials == 1.0) {
            gen.fvCumTable = {0.0, 1.0 - prob, 1.0};
        } else if (gen.fbExactDiscrete) {
            // 0, F(0), …, F(N − 1), 1.0 with N = n rounded. The table stops early once F has
            // reached 1 in double precision: the cells beyond have width 0 and are never
            // chosen, so the draws are the same and a huge n with a small mean costs nothing.
            // The normal approximation (m ≥ 20) does not read the table, which is not built.
            const double nRounded = std::floor(trials + 0.5);
            gen.fvCumTable.assign(1, 0.0);
            for (double k = 0.0; k < nRounded; k += 1.0) {
                int err = 0;
                const double f = MCDistFun::CdfBin(k, trials, prob, err);
                if (err != 0 || MCMV::IsMissing(f)) {
                    return false;
                }
                gen.fvCumTable.push_back(f);
                if (f >= 1.0) {
                    break;
                }
            }
            gen.fvCumTable.push_back(1.0);
        }
        return true;
    }
    case MCSPConst::kDistNegbinomial: {
        if (n != 3 || !(p[0] > 0.0) || !(p[1] > 0.0 && p[1] <= 1.0)) {
            return false;
        }
        const double r = p[0];
        const double prob = p[1];
        gen.fMean = r * (1.0 - prob) / prob;
        gen.fStdDev = std::sqrt(r * (1.0 - prob)) / prob;
        gen.fLower = p[2] == 1.0 ? r : 0.0;
        gen.fUpper = missing;
        gen.fbExactDiscrete = gen.fMean < SECGenerationConst::kDiscreteThreshold;
        if (gen.fbExactDiscrete) {
            return BuildInverseTable([r, prob](double x) { return NegBinCdf(r, prob, x); },
                                     gen.fvInverseTable);
        }
        return true;
    }
    case MCSPConst::kDistLognormal:
        if (n != 2 || !(p[0] > 0.0) || p[1] < 0.0) {
            return false;
        }
        gen.fMean = p[0] * std::exp(0.5 * p[1] * p[1]);
        gen.fStdDev = p[0] * std::sqrt(std::expm1(p[1] * p[1]) * std::exp(p[1] * p[1]));
        gen.fLower = 0.0;
        gen.fUpper = missing;
        gen.fbHasSensitivity = true;
        return true; // s may overflow for a large b; the draws do not need it
    case MCSPConst::kDistNormal:
        if (n != 2 || p[1] < 0.0) {
            return false;
        }
        gen.fMean = p[0];
        gen.fStdDev = p[1];
        gen.fLower = missing;
        gen.fUpper = missing;
        gen.fbHasSensitivity = true;
        return true;
    case MCSPConst::kDistPoisson: {
        if (n != 1 || !(p[0] > 0.0)) {
            return false;
        }
        const double lambda = p[0];
        gen.fMean = lambda;
        gen.fStdDev = std::sqrt(lambda);
        gen.fLower = 0.0;
        gen.fUpper = missing;
        gen.fbExactDiscrete = gen.fMean < SECGenerationConst::kDiscreteThreshold;
        if (gen.fbExactDiscrete) {
            return BuildInverseTable([lambda](double x) { return PoissonCdf(lambda, x); },
                                     gen.fvInverseTable);
        }
        return true;
    }
    case MCSPConst::kDistTriangular: {
        const double a = p[0];
        const double b = n == 3 ? p[1] : 0.0;
        const double c = n == 3 ? p[2] : 0.0;
        if (n != 3 || !(a < b) || c < a || c > b) {
            return false;
        }
        gen.fMean = (a + b + c) / 3.0;
        gen.fStdDev = std::sqrt((a * a + b * b + c * c - a * b - a * c - b * c) / 18.0);
        gen.fLower = a;
        gen.fUpper = b;
        gen.fbHasSensitivity = true;
        return true;
    }
    case MCSPConst::kDistUniform:
        if (n != 2 || p[0] > p[1]) {
            return false;
        }
        gen.fMean = 0.5 * (p[0] + p[1]);
        gen.fStdDev = (p[1] - p[0]) / std::sqrt(12.0);
        gen.fLower = p[0];
        gen.fUpper = p[1];
        gen.fbHasSensitivity = true;
        return true;
    case MCSPConst::kDistWeibull: {
        if (n != 3 || !(p[0] > 0.0) || !(p[1] > 0.0)) {
            return false;
        }
        const double g1 = GammaFunction(1.0 + 1.0 / p[1]);
        const double g2 = GammaFunction(1.0 + 2.0 / p[1]);
        gen.fMean = p[2] + p[0] * g1;
        gen.fStdDev = p[0] * std::sqrt(g2 - g1 * g1);
        gen.fLower = p[2];
        gen.fUpper = missing;
        gen.fbHasSensitivity = true;
        return true; // m and s may overflow for a tiny shape b; the draws do not need them
    }
    case MCSPConst::kDistGamma: {
        if (n != 2 || !(p[0] > 0.0) || !(p[1] > 0.0)) {
            return false;
        }
        // Shape k, rate β: mean k/β, standard deviation √k/β.
        gen.fMean = p[0] / p[1];
        gen.fStdDev = std::sqrt(p[0]) / p[1];
        gen.fLower = 0.0;
        gen.fUpper = missing;
        gen.fbHasSensitivity = true;
        gen.fQuantile = MCMath_800::MCGammaQuantile(p[0], p[1]);
        return std::get<MCMath_800::MCGammaQuantile>(gen.fQuantile).IsValid();
    }
    case MCSPConst::kDistBeta: {
        if (n != 2 || !(p[0] > 0.0) || !(p[1] > 0.0)) {
            return false;
        }
        const double sum = p[0] + p[1];
        gen.fMean = p[0] / sum;
        gen.fStdDev = std::sqrt(p[0] * p[1] / (sum * sum * (sum + 1.0)));
        gen.fLower = 0.0;
        gen.fUpper = 1.0;
        gen.fbHasSensitivity = true;
        gen.fQuantile = MCMath_800::MCBetaQuantile(p[0], p[1]);
        return std::get<MCMath_800::MCBetaQuantile>(gen.fQuantile).IsValid();
    }
    case MCSPConst::kDistExponential:
        if (n != 1 || !(p[0] > 0.0)) {
            return false;
        }
        gen.fMean = 1.0 / p[0];
        gen.fStdDev = 1.0 / p[0];
        gen.fLower = 0.0;
        gen.fUpper = missing;
        gen.fbHasSensitivity = true;
        return true;
    case MCSPConst::kDistBernoulli:
        if (n != 1 || !IsProbability(p[0])) {
            return false;
        }
        gen.fMean = p[0];
        gen.fStdDev = std::sqrt(p[0] * (1.0 - p[0]));
        gen.fLower = 0.0;
        gen.fUpper = 1.0;
        gen.fvCumTable = {0.0, 1.0 - p[0], 1.0};
        return true;
    case MCSPConst::kDistEmpirical: {
        if (n < 5 || p[0] > p[1] || p[2] < 0.0) {
            return false;
        }
        const std::vector<double> probs(params.begin() + 4, params.end());
        if (!SECBuildCumulativeTable(probs, gen.fvCumTable)) {
            return false;
        }
        gen.fbContinuousEmpirical = p[3] == 1.0;
        const double width = (p[1] - p[0]) / static_cast<double>(probs.size());
        double mean = 0.0;
        for (std::size_t i = 0; i < probs.size(); ++i) {
            const double share = gen.fvCumTable[i + 1] - gen.fvCumTable[i];
            const double centre = gen.fbContinuousEmpirical
                                      ? p[0] + width * (static_cast<double>(i) + 0.5)
                                      : static_cast<double>(i);
            mean += share * centre;
        }
        gen.fMean = mean;
        gen.fStdDev = p[2];
        gen.fLower = p[0];
        gen.fUpper = p[1];
        gen.fbHasSensitivity = gen.fbContinuousEmpirical;
        return true;
    }
    case MCSPConst::kDistUserRanges: {
        if (n < 3 || n % 3 != 0) {
            return false;
        }
        const std::size_t k = n / 3;
        for (std::size_t i = 0; i < k; ++i) {
            if (p[i] > p[k + i]) {
                return false;
            }
        }
        const std::vector<double> probs(params.begin() + static_cast<std::ptrdiff_t>(2 * k),
                                        params.end());
        if (!SECBuildCumulativeTable(probs, gen.fvCumTable)) {
            return false;
        }
        gen.fMean = missing;
        gen.fStdDev = missing;
        gen.fLower = *std::min_element(p, p + k);
        gen.fUpper = *std::max_element(p + k, p + 2 * k);
        return true;
    }
    default:
        return false;
    }
}

} // namespace

bool SECBuildStoredParams(const DistInfoElem& dist, bool continuousLevel,
                          std::vector<double>& params) {
    params.clear();
    const DistType type = dist.GetDistType();
    const std::size_t count = dist.GetParameterSize();
    std::string name;
    switch (type) {
    case MCSPConst::kDistCategorical:
    case MCSPConst::kDistUnknown:
        return false;
    case MCSPConst::kDistEmpirical: {
        // min, max and stddev single values, then the bin probabilities.
        if (count != 4) {
            return false;
        }
        for (std::size_t i = 0; i < 3; ++i) {
            double value = MCMV::Missing();
            dist.GetParameterNameValue(i, name, value);
            params.push_back(value);
        }
        params.push_back(continuousLevel ? 1.0 : 0.0);
        std::vector<double> probs;
        dist.GetParameterNameValue(3, name, probs);
        if (probs.empty()) {
            params.clear();
            return false;
        }
        params.insert(params.end(), probs.begin(), probs.end());
        return true;
    }
    case MCSPConst::kDistUserRanges: {
        // Parallel lists of minimums, maximums and probabilities.
        if (count != 3) {
            return false;
        }
        std::vector<double> lows;
        std::vector<double> highs;
        std::vector<double> probs;
        dist.GetParameterNameValue(0, name, lows);
        dist.GetParameterNameValue(1, name, highs);
        dist.GetParameterNameValue(2, name, probs);
        if (lows.empty() || highs.size() != lows.size() || probs.size() != highs.size()) {
            return false;
        }
        params = lows;
        params.insert(params.end(), highs.begin(), highs.end());
        params.insert(params.end(), probs.begin(), probs.end());
        return true;
    }
    default:
        break;
    }
    if (type < 0 || type >= MCSPConst::kDistUnknown) {
        return false;
    }
    // Every other type: one value per parameter name of the type, placed in the order of the
    // names whatever the order the parameters were added in.
    std::vector<std::string> typeNames;
    GetDistributionParameterNames(type, typeNames);
    if (count != typeNames.size()) {
        return false;
    }
    std::vector<std::string> names;
    std::vector<double> values;
    dist.GetParameterNameValues(names, values);
    params.assign(typeNames.size(), MCMV::Missing());
    std::vector<bool> filled(typeNames.size(), false);
    for (std::size_t i = 0; i < names.size(); ++i) {
        const auto it = std::find(typeNames.begin(), typeNames.end(), names[i]);
        const auto pos = static_cast<std::size_t>(it - typeNames.begin());
        if (it == typeNames.end() || filled[pos]) {
            params.clear();
            return false;
        }
        params[pos] = values[i];
        filled[pos] = true;
    }
    return true;
}

bool SECPrepareGenerator(DistType type, const std::vector<double>& params, SECInputGenerator& gen) {
    gen.fDistType = type;
    gen.fvParams = params;
    gen.fMean = MCMV::Missing();
    gen.fStdDev = MCMV::Missing();
    gen.fLower = MCMV::Missing();
    gen.fUpper = MCMV::Missing();
    gen.fvCumTable.clear();
    gen.fvInverseTable.clear();
    gen.fbContinuousEmpirical = false;
    gen.fbExactDiscrete = false;
    gen.fbHasSensitivity = false;
    gen.fQuantile = std::monostate();
    gen.fScoreTable.Clear();
    gen.fbValid = !params.empty() && PrepareByType(type, params, gen);
    if (gen.fbValid) {
        BuildScoreTable(gen);
    }
    return gen.fbValid;
}

bool SECBuildCumulativeTable(const std::vector<double>& probs, std::vector<double>& table) {
    table.clear();
    double total = 0.0;
    for (const double p : probs) {
        if (!(p >= 0.0) || !IsFinite(p)) {
            return false;
        }
        total += p;
    }
    if (!(total > 0.0) || !IsFinite(total)) {
        return false;
    }
    table.reserve(probs.size() + 1);
    table.push_back(0.0);
    double sum = 0.0;
    for (std::size_t i = 0; i + 1 < probs.size(); ++i) {
        sum += probs[i];
        table.push_back(std::min(sum / total, 1.0));
    }
    table.push_back(1.0);
    return true;
}

int SECDrawCell(const std::vector<double>& table, double u) {
    if (table.size() < 2) {
        return -1;
    }
    return MCMath_800::MCMathFun::BinSearch(table, 0, static_cast<int>(table.size()) - 1, u,
                                            false) -
           1;
}

double SECPoissonInverse(double lambda, double u) {
    if (!(lambda > 0.0) || !IsFinite(lambda) || !(u >= 0.0 && u < 1.0)) {
        return MCMV::Missing();
    }
    return IntegerInverse([lambda](double x) { return PoissonCdf(lambda, x); }, -1.0, u);
}

double SECNegBinInverse(double r, double p, double u) {
    if (!(r > 0.0) || !IsFinite(r) || !(p > 0.0 && p <= 1.0) || !(u >= 0.0 && u < 1.0)) {
        return MCMV::Missing();
    }
    return IntegerInverse([r, p](double x) { return NegBinCdf(r, p, x); }, -1.0, u);
}

namespace {

// The transforms of the distribution table. u = Φ(z); where a formula needs 1 − u it is taken
// as Φ(−z), which keeps its relative accuracy in the upper tail (1 − Φ(z) would round to 0
// beyond z ≈ 8.3 and turn an Exponential or Weibull value infinite), and −ln(1 − u) is taken
// as log1p(−u) in the lower half, where 1 − u is near 1. The Gamma and Beta quantiles take the
// upper-tail probability Φ(−z) for z > 0 for the same reason.
double ExactTransform(const SECInputGenerator& gen, double z) {
    if (MCMV::IsMissing(z) || !gen.fbValid) {
        return MCMV::Missing();
    }
    const double* p = gen.fvParams.data();
    switch (gen.fDistType) {
    case MCSPConst::kDistBinomial: {
        if (p[0] == 1.0) {
            return MCDistFun::CdfStdNorm(z) >= 1.0 - p[1] ? 1.0 : 0.0;
        }
        if (gen.fbExactDiscrete) {
            return static_cast<double>(SECDrawCell(gen.fvCumTable, MCDistFun::CdfStdNorm(z)));
        }
        return NormalApproximation(gen, z);
    }
    case MCSPConst::kDistNegbinomial: {
        const double r = p[0];
        const double prob = p[1];
        const double failures =
            gen.fbExactDiscrete
                ? TableInverse(
                      gen.fvInverseTable, [r, prob](double x) { return NegBinCdf(r, prob, x); },
                      MCDistFun::CdfStdNorm(z))
                : NormalApproximation(gen, z);
        return p[2] == 1.0 ? failures + r : failures;
    }
    case MCSPConst::kDistLognormal: {
        const double bz = p[1] * z;
        if (bz > MCMath_800::MCPower::gMachineMaxExp) {
            return MCMV::Missing();
        }
        return p[0] * std::exp(bz);
    }
    case MCSPConst::kDistNormal:
        return p[0] + p[1] * z;
    case MCSPConst::kDistPoisson: {
        if (!gen.fbExactDiscrete) {
            return NormalApproximation(gen, z);
        }
        const double lambda = p[0];
        return TableInverse(
            gen.fvInverseTable, [lambda](double x) { return PoissonCdf(lambda, x); },
            MCDistFun::CdfStdNorm(z));
    }
    case MCSPConst::kDistTriangular: {
        // Inverse of the triangular distribution function on [a, b] with mode c.
        const double a = p[0];
        const double b = p[1];
        const double c = p[2];
        const double u = MCDistFun::CdfStdNorm(z);
        if ((c - a) > (b - a) * u) {
            return a + std::sqrt((c - a) * (b - a) * u);
        }
        return b - std::sqrt(MCDistFun::CdfStdNorm(-z) * (b - a) * (b - c));
    }
    case MCSPConst::kDistUniform:
        return p[0] + MCDistFun::CdfStdNorm(z) * (p[1] - p[0]);
    case MCSPConst::kDistWeibull:
        // c + a·(−ln(1 − u))^(1/b).
        return p[2] + p[0] * std::pow(UnitExponential(z), 1.0 / p[1]);
    case MCSPConst::kDistGamma:
        return QuantileOfScore(std::get<MCMath_800::MCGammaQuantile>(gen.fQuantile), z);
    case MCSPConst::kDistBeta:
        return QuantileOfScore(std::get<MCMath_800::MCBetaQuantile>(gen.fQuantile), z);
    case MCSPConst::kDistExponential:
        // −ln(1 − u)/θ: the parameter acts as a rate.
        return UnitExponential(z) / p[0];
    case MCSPConst::kDistBernoulli:
        return MCDistFun::CdfStdNorm(z) >= 1.0 - p[0] ? 1.0 : 0.0;
    case MCSPConst::kDistEmpirical: {
        const double u = MCDistFun::CdfStdNorm(z);
        const int i = SECDrawCell(gen.fvCumTable, u);
        if (!gen.fbContinuousEmpirical) {
            return static_cast<double>(i);
        }
        // min + w·(i + position in bin), w = (max − min)/K.
        const double bins = static_cast<double>(gen.fvCumTable.size() - 1);
        const double width = (p[1] - p[0]) / bins;
        return p[0] + width * (static_cast<double>(i) + PositionInCell(gen.fvCumTable, i, u));
    }
    case MCSPConst::kDistUserRanges: {
        // lo_i + (position in cell i)·(hi_i − lo_i).
        const double u = MCDistFun::CdfStdNorm(z);
        const int i = SECDrawCell(gen.fvCumTable, u);
        const auto k = gen.fvCumTable.size() - 1;
        const double lo = p[static_cast<std::size_t>(i)];
        const double hi = p[k + static_cast<std::size_t>(i)];
        return lo + PositionInCell(gen.fvCumTable, i, u) * (hi - lo);
    }
    default:
        return MCMV::Missing();
    }
}

} // namespace

// The table first, where it has a value; the exact transform is a direct call within this
// file (no call through the library's symbol table), which the types without a table (Normal,
// LogNormal, the discrete ones) take every time.
double SECTransform(const SECInputGenerator& gen, double z) {
    if (gen.fScoreTable.IsReady()) {
        const double x = gen.fScoreTable(z);
        if (!std::isnan(x)) {
            return x;
        }
    }
    return ExactTransform(gen, z);
}

double SECTransformExact(const SECInputGenerator& gen, double z) {
    return ExactTransform(gen, z);
}

} // namespace MCMCSP_800
