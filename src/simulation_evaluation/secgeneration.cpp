#include "simulation_evaluation/secgeneration.h"

#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"
#include "mcmath/mcmathfun.h"
#include "mcmath/mcpower.h"
#include "simulation_common/mcspdistfamily.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCMath_800::MCDistFun;
using MCSPConst::DistType;

namespace {

bool IsFinite(double x) {
    return std::isfinite(x);
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

//! The prepared exact inverse of a count input: F(k) for the whole numbers k around the centre
//! of the distribution, from the (kCountTailMass)-quantile up to the complementary one and at
//! most kMaxCountTable of them. A u inside the table is inverted by a binary search (about
//! log2 of the table's length comparisons); the rare u beyond it by the family's quantile.
void BuildCountTable(const MCSPDistFamily& family, SECInputGenerator& gen) {
    const double* p = gen.fvParams.data();
    gen.fvCountTable.clear();
    const double first = family.fQuantile(p, SECGenerationConst::kCountTailMass);
    const double last = family.fQuantileComplement(p, SECGenerationConst::kCountTailMass);
    if (MCMV::IsMissing(first) || MCMV::IsMissing(last)) {
        return; // every draw goes to the quantile
    }
    const double below = family.fCdf(p, first - 1.0);
    if (MCMV::IsMissing(below)) {
        return;
    }
    gen.fCountBase = first;
    gen.fCountBelow = below;
    const double count =
        std::min(last - first + 1.0, static_cast<double>(SECGenerationConst::kMaxCountTable));
    gen.fvCountTable.reserve(static_cast<std::size_t>(count));
    for (double k = 0.0; k < count; k += 1.0) {
        const double f = family.fCdf(p, first + k);
        if (MCMV::IsMissing(f)) {
            gen.fvCountTable.clear();
            return;
        }
        gen.fvCountTable.push_back(f);
    }
}

//! m, s, the range and the validity of every parametric family from its row of the family
//! table; the cumulative tables, prepared quantiles and sensitivity flags the generation adds.
bool PrepareFamily(const MCSPDistFamily& family, SECInputGenerator& gen) {
    if (!family.IsValid(gen.fvParams)) {
        return false;
    }
    const double* p = gen.fvParams.data();
    gen.fMean = family.fMean(p);
    const double variance = family.fVariance(p);
    gen.fStdDev = MCMV::IsMissing(variance) ? variance : std::sqrt(variance);
    family.fSupport(p, gen.fLower, gen.fUpper);
    // m and s may overflow (a LogNormal of large b, a Weibull of tiny shape); the draws do not
    // need them.
    gen.fbHasSensitivity = !family.fbDiscrete;
    switch (family.fType) {
    case MCSPConst::kDistBernoulli:
        gen.fvCumTable = {0.0, 1.0 - p[0], 1.0};
        return true;
    case MCSPConst::kDistBinomial:
    case MCSPConst::kDistNegbinomial:
    case MCSPConst::kDistPoisson:
        BuildCountTable(family, gen);
        return true;
    case MCSPConst::kDistGamma:
        gen.fQuantile = MCMath_800::MCGammaQuantile(p[0], p[1]);
        return std::get<MCMath_800::MCGammaQuantile>(gen.fQuantile).IsValid();
    case MCSPConst::kDistBeta:
        gen.fQuantile = MCMath_800::MCBetaQuantile(p[0], p[1]);
        return std::get<MCMath_800::MCBetaQuantile>(gen.fQuantile).IsValid();
    default:
        return true;
    }
}

//! The tabled types, Empirical and UserRanges: m, s, the range and the cumulative table.
bool PrepareTabled(DistType type, const std::vector<double>& params, SECInputGenerator& gen) {
    const double* p = params.data();
    const std::size_t n = params.size();
    if (!std::all_of(params.begin(), params.end(), IsFinite)) {
        return false;
    }
    switch (type) {
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
        gen.fMean = MCMV::Missing();
        gen.fStdDev = MCMV::Missing();
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
    gen.fpFamily = MCSPFindDistFamily(type);
    gen.fMean = MCMV::Missing();
    gen.fStdDev = MCMV::Missing();
    gen.fLower = MCMV::Missing();
    gen.fUpper = MCMV::Missing();
    gen.fvCumTable.clear();
    gen.fvCountTable.clear();
    gen.fCountBase = 0.0;
    gen.fCountBelow = 0.0;
    gen.fbContinuousEmpirical = false;
    gen.fbHasSensitivity = false;
    gen.fQuantile = std::monostate();
    gen.fScoreTable.Clear();
    gen.fbValid = !params.empty() && (gen.fpFamily != nullptr ? PrepareFamily(*gen.fpFamily, gen)
                                                              : PrepareTabled(type, params, gen));
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

bool SECDiscreteSupport(const SECInputGenerator& gen, std::size_t maxPoints,
                        std::vector<double>& values, std::vector<double>& cdf) {
    values.clear();
    cdf.clear();
    if (!gen.fbValid) {
        return false;
    }
    const double* p = gen.fvParams.data();
    // Two-point and tabled supports: 0, 1, …, K − 1 with the cumulative table's entries.
    const auto fromTable = [&](const std::vector<double>& table) {
        for (std::size_t k = 1; k < table.size(); ++k) {
            if (table[k] > table[k - 1]) {
                values.push_back(static_cast<double>(k - 1));
                cdf.push_back(table[k]);
            }
        }
    };
    switch (gen.fDistType) {
    case MCSPConst::kDistBernoulli:
        fromTable(gen.fvCumTable);
        break;
    case MCSPConst::kDistEmpirical:
        if (gen.fbContinuousEmpirical) {
            return false;
        }
        fromTable(gen.fvCumTable);
        break;
    case MCSPConst::kDistBinomial:
    case MCSPConst::kDistNegbinomial:
    case MCSPConst::kDistPoisson: {
        // From the first whole number whose probability does not underflow, upwards until F
        // reaches 1; a support wider than maxPoints is refused as soon as it is seen to be.
        const MCSPDistFamily& family = *gen.fpFamily;
        const double first = family.fQuantile(p, std::numeric_limits<double>::min());
        double previous = MCMV::IsMissing(first) ? first : family.fCdf(p, first - 1.0);
        if (MCMV::IsMissing(previous)) {
            return false;
        }
        for (double k = first; previous < 1.0 && values.size() <= maxPoints; k += 1.0) {
            const double f = family.fCdf(p, k);
            if (MCMV::IsMissing(f)) {
                values.clear();
                cdf.clear();
                return false;
            }
            if (f > previous) {
                values.push_back(k);
                cdf.push_back(f);
                previous = f;
            }
            if (!MCMV::IsMissing(gen.fUpper) && k >= gen.fUpper) {
                break;
            }
        }
        break;
    }
    default:
        return false;
    }
    if (values.empty() || values.size() > maxPoints) {
        values.clear();
        cdf.clear();
        return false;
    }
    cdf.back() = 1.0;
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

namespace {

//! The exact inverse of a count input at u = Φ(z): the k with F(k − 1) ≤ u < F(k), from the
//! prepared table where u falls inside it, else from the family's quantile, taken from the
//! upper-tail probability Φ(−z) above the median so that the upper tail keeps its relative
//! accuracy. Every value lies in the support: no approximation is involved at any mean.
double CountInverse(const SECInputGenerator& gen, double z) {
    const double u = MCDistFun::CdfStdNorm(z);
    const std::vector<double>& table = gen.fvCountTable;
    if (!table.empty() && u >= gen.fCountBelow && u < table.back()) {
        const auto cell = std::upper_bound(table.begin(), table.end(), u) - table.begin();
        return gen.fCountBase + static_cast<double>(cell);
    }
    // A tail probability that underflows (|z| beyond about 38) is taken as the smallest positive
    // double: the quantile of 0 would be the end of the support, which may carry no mass.
    constexpr double kTiny = std::numeric_limits<double>::denorm_min();
    const double* p = gen.fvParams.data();
    return z <= 0.0 ? gen.fpFamily->fQuantile(p, std::max(u, kTiny))
                    : gen.fpFamily->fQuantileComplement(
                          p, std::max(MCDistFun::CdfStdNorm(-z), kTiny));
}

} // namespace

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
    case MCSPConst::kDistBinomial:
    case MCSPConst::kDistNegbinomial:
    case MCSPConst::kDistPoisson:
        return CountInverse(gen, z);
    case MCSPConst::kDistLognormal: {
        const double bz = p[1] * z;
        if (bz > MCMath_800::MCPower::gMachineMaxExp) {
            return MCMV::Missing();
        }
        return p[0] * std::exp(bz);
    }
    case MCSPConst::kDistNormal:
        return p[0] + p[1] * z;
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
