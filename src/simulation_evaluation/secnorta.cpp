#include "simulation_evaluation/secnorta.h"

#include "component/mcspcomponent.h"
#include "mcmath/mcdistfun.h"
#include "mcmath/mceigen.h"

#include <boost/math/quadrature/gauss.hpp>
#include <boost/math/tools/toms748_solve.hpp>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;

namespace {

//! Tolerance and iteration limit of the eigen-decomposition behind the repair, the smallest
//! eigenvalue the repaired matrix keeps, and the eigenvalue below which Q counts as not
//! positive semi-definite (rounding leaves about 1e-15 on a singular Q).
constexpr double kEigenTolerance = 1e-12;
constexpr int kEigenIterations = 30;
constexpr double kRepairEpsilon = 1e-6;
constexpr double kIndefinite = -1e-9;

//! Integration range in z: φ(37) ≈ 1e-298, and Φ(−37) still a normal double, so the upper-tail
//! transforms (−ln Φ(−z)) stay finite at every node.
constexpr double kRange = 37.0;
//! Longest Gauss–Legendre piece: at k = 512 the Hermite functions oscillate with a wavelength
//! of about 0.2, which 20 nodes on 0.5 integrate to ~1e-13.
constexpr double kPiece = 0.5;
//! Range on a side where the transform is bounded (a finite end of the natural range): beyond
//! it the values lie between T(±10) and that end and carry Φ̄(10) ≈ 7.6e-24 of the mass, while
//! the exact quantiles of the far tails (Gamma, Beta) cost microseconds each.
constexpr double kBoundedRange = 10.0;
//! Range of the inner standard normal W of the direct integral (φ(12) ≈ 5e-32).
constexpr double kInnerRange = 12.0;
//! Beyond 9 standard deviations Φ̄ is 0 or 1 to 1e-19.
constexpr double kSaturation = 9.0;
//! Floor of a coefficient tail, relative to σ²: the rounding of σ² − Σ c_k².
constexpr double kTailFloor = 1e-16;
//! Width of the final bracket of the root search.
constexpr double kRootBracket = 1e-12;

constexpr double kInvSqrt2Pi = 0.39894228040143267794;

double Pdf(double z) {
    return kInvSqrt2Pi * std::exp(-0.5 * z * z);
}
//! Φ̄(z) = Φ(−z), the standard normal upper tail.
double UpperTail(double z) {
    return MCMath_800::MCDistFun::CdfStdNorm(-z);
}
//! Φ⁻¹(p), with the ends of the scale for p = 0 and p = 1 (the cut below a count's first value
//! or above its last).
double NormalQuantile(double p) {
    if (!(p > 0.0)) {
        return -std::numeric_limits<double>::infinity();
    }
    if (!(p < 1.0)) {
        return std::numeric_limits<double>::infinity();
    }
    return MCMath_800::MCDistFun::IdfNorm(p, 0.0, 1.0);
}

//! The 20-point Gauss–Legendre rule on [−1, 1] (Boost stores the non-negative half).
struct LegendreRule {
    std::vector<double> fvNodes;
    std::vector<double> fvWeights;
};
const LegendreRule& Legendre() {
    static const LegendreRule rule = [] {
        using Gauss = boost::math::quadrature::gauss<double, 20>;
        LegendreRule r;
        const auto& x = Gauss::abscissa();
        const auto& w = Gauss::weights();
        for (std::size_t i = 0; i < x.size(); ++i) {
            r.fvNodes.push_back(x[i]);
            r.fvWeights.push_back(w[i]);
            r.fvNodes.push_back(-x[i]);
            r.fvWeights.push_back(w[i]);
        }
        return r;
    }();
    return rule;
}

//! Calls f(z, weight) at the Gauss–Legendre nodes of every piece between consecutive points
//! (sorted and deduplicated here), each piece cut to at most kPiece.
template <class F> void ForEachNode(std::vector<double>& points, F&& f) {
    std::sort(points.begin(), points.end());
    points.erase(std::unique(points.begin(), points.end()), points.end());
    const LegendreRule& rule = Legendre();
    for (std::size_t p = 0; p + 1 < points.size(); ++p) {
        const double length = points[p + 1] - points[p];
        const int pieces = static_cast<int>(std::ceil(length / kPiece));
        const double half = 0.5 * length / pieces;
        for (int q = 0; q < pieces; ++q) {
            const double centre = points[p] + half * (2 * q + 1);
            for (std::size_t i = 0; i < rule.fvNodes.size(); ++i) {
                f(centre + half * rule.fvNodes[i], half * rule.fvWeights[i]);
            }
        }
    }
}

//! The points [−below, above] in steps of kPiece plus the finite `breaks` inside.
std::vector<double> Mesh(double below, double above, const std::vector<double>& breaks) {
    std::vector<double> points;
    for (double z = -below; z <= above; z += kPiece) {
        points.push_back(z);
    }
    for (const double b : breaks) {
        if (b > -below && b < above) {
            points.push_back(b);
        }
    }
    return points;
}

std::vector<double> Mesh(double range, const std::vector<double>& breaks) {
    return Mesh(range, range, breaks);
}

//! The mesh of a continuous transform: kRange on an unbounded side, kBoundedRange on a
//! bounded one.
std::vector<double> TransformMesh(const SECInputGenerator& gen, const std::vector<double>& breaks) {
    return Mesh(MCMV::IsMissing(gen.fLower) ? kRange : kBoundedRange,
                MCMV::IsMissing(gen.fUpper) ? kRange : kBoundedRange, breaks);
}

//! The z where a continuous transform has a kink or a jump: the Triangular's mode and the cell
//! boundaries of an Empirical or UserRanges table.
std::vector<double> ContinuousBreaks(const SECInputGenerator& gen) {
    std::vector<double> breaks;
    const std::vector<double>& p = gen.fvParams;
    if (gen.fDistType == MCSPConst::kDistTriangular) {
        breaks.push_back(NormalQuantile((p[2] - p[0]) / (p[1] - p[0])));
    } else if (gen.fDistType == MCSPConst::kDistEmpirical ||
               gen.fDistType == MCSPConst::kDistUserRanges) {
        for (std::size_t k = 1; k + 1 < gen.fvCumTable.size(); ++k) {
            breaks.push_back(NormalQuantile(gen.fvCumTable[k]));
        }
    }
    return breaks;
}

//! T(z), or where that is not a number far in a tail (a quantile that gives up beyond
//! |z| = 8, φ < 1e-15) the natural bound on that side, when there is one.
double BoundedTransform(const SECInputGenerator& gen, double z) {
    const double t = SECTransform(gen, z);
    if (std::isfinite(t) || std::fabs(z) < 8.0) {
        return t;
    }
    const double bound = z > 0.0 ? gen.fUpper : gen.fLower;
    return MCMV::IsMissing(bound) ? t : bound;
}

//! The ratios of the recurrence below: 1/√(k + 1) and √k/√(k + 1).
struct HermiteRatios {
    std::vector<double> fvInvRoot;
    std::vector<double> fvRatio;
};
const HermiteRatios& Ratios() {
    static const HermiteRatios ratios = [] {
        HermiteRatios h;
        for (int k = 0; k <= SECNortaConst::kMaxTermsDiscrete; ++k) {
            h.fvInvRoot.push_back(1.0 / std::sqrt(k + 1.0));
            h.fvRatio.push_back(std::sqrt(k / (k + 1.0)));
        }
        return h;
    }();
    return ratios;
}

//! out[k] += Σ_i scale_i·u_k(z_i)·(divide ? 1/√(k + 1) : 1), k = 0 … out.size() − 1, with the
//! normalised Hermite functions u_k(z) = He_k(z)·√φ(z)/√k! by their three-term recurrence
//! u_{k+1} = (z·u_k − √k·u_{k−1})/√(k + 1), which stays within [−1, 1] where they oscillate and
//! decays beyond. Four points at a time, so that four recurrences overlap.
void AddHermite(const std::vector<double>& z, const std::vector<double>& scale, bool divide,
                std::vector<double>& out) {
    const HermiteRatios& h = Ratios();
    constexpr std::size_t kBlock = 4;
    for (std::size_t i = 0; i < z.size(); i += kBlock) {
        double x[kBlock] = {};
        double a[kBlock] = {};
        double previous[kBlock] = {};
        double current[kBlock] = {};
        for (std::size_t j = 0; j < kBlock && i + j < z.size(); ++j) {
            x[j] = z[i + j];
            a[j] = scale[i + j];
            current[j] = std::sqrt(Pdf(x[j]));
        }
        for (std::size_t k = 0; k < out.size(); ++k) {
            const double factor = divide ? h.fvInvRoot[k] : 1.0;
            double sum = 0.0;
            for (std::size_t j = 0; j < kBlock; ++j) {
                sum += a[j] * current[j];
                const double next = x[j] * current[j] * h.fvInvRoot[k] - h.fvRatio[k] * previous[j];
                previous[j] = current[j];
                current[j] = next;
            }
            out[k] += sum * factor;
        }
    }
}

//! The tails σ² − Σ_{l≤k} c_l² (floored), and the coefficients cut where the tail reaches the
//! floor.
void FinishTails(SECNortaMargin& m) {
    const double variance = m.fStdDev * m.fStdDev;
    const double floor = kTailFloor * variance;
    m.fvTails.assign(1, variance);
    for (std::size_t k = 0; k < m.fvCoefs.size(); ++k) {
        m.fvTails.push_back(std::max(m.fvTails.back() - m.fvCoefs[k] * m.fvCoefs[k], floor));
        if (m.fvTails.back() <= floor) {
            m.fvCoefs.resize(k + 1);
            break;
        }
    }
}

bool PrepareDiscrete(const std::vector<double>& cdf, SECNortaMargin& m) {
    const std::vector<double>& x = m.fvValues;
    double mean = 0.0;
    for (std::size_t i = 0; i < x.size(); ++i) {
        mean += (cdf[i] - (i > 0 ? cdf[i - 1] : 0.0)) * x[i];
    }
    double variance = 0.0;
    for (std::size_t i = 0; i < x.size(); ++i) {
        variance += (cdf[i] - (i > 0 ? cdf[i - 1] : 0.0)) * (x[i] - mean) * (x[i] - mean);
    }
    m.fMean = mean;
    m.fStdDev = std::sqrt(variance);
    for (std::size_t i = 0; i + 1 < x.size(); ++i) {
        m.fvCuts.push_back(NormalQuantile(cdf[i]));
    }
    m.fvBreaks = m.fvCuts;
    // c_k = Σ_m Δx_m φ(a_m) He_{k−1}(a_m)/√k! = Σ_m Δx_m √φ(a_m) u_{k−1}(a_m)/√k.
    std::vector<double> points;
    std::vector<double> scales;
    for (std::size_t i = 0; i < m.fvCuts.size(); ++i) {
        if (std::isfinite(m.fvCuts[i])) {
            points.push_back(m.fvCuts[i]);
            scales.push_back((x[i + 1] - x[i]) * std::sqrt(Pdf(m.fvCuts[i])));
        }
    }
    m.fvCoefs.assign(SECNortaConst::kMaxTermsDiscrete, 0.0);
    AddHermite(points, scales, true, m.fvCoefs);
    return variance > 0.0 && std::isfinite(variance);
}

bool PrepareContinuous(const SECInputGenerator& gen, SECNortaMargin& m) {
    m.fvBreaks = ContinuousBreaks(gen);
    std::vector<double> points = TransformMesh(gen, m.fvBreaks);
    std::vector<double> nodes;
    std::vector<double> weights;
    std::vector<double> values;
    bool finite = true;
    ForEachNode(points, [&](double z, double w) {
        const double t = BoundedTransform(gen, z);
        finite = finite && std::isfinite(t);
        nodes.push_back(z);
        weights.push_back(w * Pdf(z));
        values.push_back(t);
    });
    if (!finite) {
        return false;
    }
    double mean = 0.0;
    for (std::size_t i = 0; i < nodes.size(); ++i) {
        mean += weights[i] * values[i];
    }
    double variance = 0.0;
    for (std::size_t i = 0; i < nodes.size(); ++i) {
        variance += weights[i] * (values[i] - mean) * (values[i] - mean);
    }
    m.fMean = mean;
    m.fStdDev = std::sqrt(variance);
    // c_k = ∫ (T − μ) He_k φ/√k! = Σ w φ (T − μ) u_k/√φ.
    std::vector<double> scales(nodes.size());
    for (std::size_t i = 0; i < nodes.size(); ++i) {
        scales[i] = weights[i] * (values[i] - mean) / std::sqrt(Pdf(nodes[i]));
    }
    std::vector<double> coefs(SECNortaConst::kMaxTermsContinuous + 1, 0.0);
    AddHermite(nodes, scales, false, coefs);
    m.fvCoefs.assign(coefs.begin() + 1, coefs.end());
    return variance > 0.0 && std::isfinite(variance);
}

//! T(z) of a prepared input: the step function of a discrete one, the generator's transform
//! otherwise.
double MarginTransform(const SECNortaMargin& m, double z) {
    if (m.fbDiscrete) {
        const auto at = std::upper_bound(m.fvCuts.begin(), m.fvCuts.end(), z) - m.fvCuts.begin();
        return m.fvValues[static_cast<std::size_t>(at)];
    }
    return BoundedTransform(*m.fpGenerator, z);
}

//! E[T(μ + s·W)], W standard normal: in closed form over the cuts of a discrete input (terms
//! beyond kSaturation standard deviations are 0 or their full step), by Gauss–Legendre over W
//! split where T breaks otherwise.
double InnerMean(const SECNortaMargin& m, double mu, double s) {
    if (s == 0.0) {
        return MarginTransform(m, mu);
    }
    if (m.fbDiscrete) {
        const auto& a = m.fvCuts;
        const auto lo = std::lower_bound(a.begin(), a.end(), mu - kSaturation * s) - a.begin();
        const auto hi = std::upper_bound(a.begin(), a.end(), mu + kSaturation * s) - a.begin();
        double value = m.fvValues[static_cast<std::size_t>(lo)];
        for (auto i = static_cast<std::size_t>(lo); i < static_cast<std::size_t>(hi); ++i) {
            value += (m.fvValues[i + 1] - m.fvValues[i]) * UpperTail((a[i] - mu) / s);
        }
        return value;
    }
    std::vector<double> breaks;
    for (const double b : m.fvBreaks) {
        breaks.push_back((b - mu) / s);
    }
    std::vector<double> points = Mesh(kInnerRange, breaks);
    double sum = 0.0;
    // Nodes beyond kRange carry a share of at most Φ̄(37) of the pair's mass.
    ForEachNode(points, [&](double w, double weight) {
        const double z = mu + s * w;
        if (std::fabs(z) <= kRange) {
            sum += weight * Pdf(w) * MarginTransform(m, z);
        }
    });
    return sum;
}

//! g(±1) of two discrete inputs: T_a(z)·T_b(±z) is constant between the merged cuts, so
//! E[(T_a(Z) − μ_a)·T_b(±Z)] is a sum over those intervals of their normal mass.
double PairedSteps(const SECNortaMargin& a, const SECNortaMargin& b, double r) {
    std::vector<double> points = a.fvCuts;
    for (const double cut : b.fvCuts) {
        points.push_back(r * cut);
    }
    points.erase(
        std::remove_if(points.begin(), points.end(), [](double p) { return !std::isfinite(p); }),
        points.end());
    std::sort(points.begin(), points.end());
    points.erase(std::unique(points.begin(), points.end()), points.end());
    double sum = 0.0;
    for (std::size_t i = 0; i <= points.size(); ++i) {
        const double lo = i == 0 ? -std::numeric_limits<double>::infinity() : points[i - 1];
        const double hi = i == points.size() ? std::numeric_limits<double>::infinity() : points[i];
        const double mid = i == 0 ? hi - 1.0 : (i == points.size() ? lo + 1.0 : 0.5 * (lo + hi));
        const double mass = points.empty() ? 1.0 : UpperTail(lo) - UpperTail(hi);
        sum += mass * (MarginTransform(a, mid) - a.fMean) * MarginTransform(b, r * mid);
    }
    return sum / (a.fStdDev * b.fStdDev);
}

//! g(r) by the direct integral E[(T_o(X) − μ_o)·E[T_i(rX + sW) | X]], s = √(1 − r²), with the
//! discrete input (if any) inside. The outer mesh adds, around each point X = β/r where the
//! inner expectation steps (β a break of the inner input), points at distances s/|r|·2^m so
//! that pieces near a steep change are no longer than their distance to it.
double DirectCorrelation(const SECNortaMargin& a, const SECNortaMargin& b, double r) {
    if (a.fbDiscrete && b.fbDiscrete && std::fabs(r) == 1.0) {
        return PairedSteps(a, b, r);
    }
    const bool swap = a.fbDiscrete && !b.fbDiscrete;
    const SECNortaMargin& outer = swap ? b : a;
    const SECNortaMargin& inner = swap ? a : b;
    const double s = std::sqrt(std::max(0.0, 1.0 - r * r));
    std::vector<double> points = outer.fbDiscrete || outer.fpGenerator == nullptr
                                     ? Mesh(kRange, outer.fvBreaks)
                                     : TransformMesh(*outer.fpGenerator, outer.fvBreaks);
    if (r != 0.0) {
        const double width = s / std::fabs(r);
        for (const double beta : inner.fvBreaks) {
            const double centre = beta / r;
            if (!(std::fabs(centre) < kRange)) {
                continue;
            }
            points.push_back(centre);
            for (double h = width; h > 0.0 && h < kPiece; h *= 2.0) {
                points.push_back(centre - h);
                points.push_back(centre + h);
            }
        }
    }
    double sum = 0.0;
    ForEachNode(points, [&](double x, double w) {
        if (std::fabs(x) <= kRange) {
            sum +=
                w * Pdf(x) * (MarginTransform(outer, x) - outer.fMean) * InnerMean(inner, r * x, s);
        }
    });
    return sum / (a.fStdDev * b.fStdDev);
}

//! The truncated Mehler series of one pair: d_k = c_ik·c_jk/(σ_i σ_j), and the radius within
//! which its remainder, at most √(tail_i(K)·tail_j(K))·|r|^{K+1}/(σ_i σ_j), is below
//! kSeriesError.
struct PairSeries {
    std::vector<double> fvTerms;
    double fRadius = 1.0;

    PairSeries(const SECNortaMargin& a, const SECNortaMargin& b) {
        const std::size_t k = std::min(a.fvCoefs.size(), b.fvCoefs.size());
        const double scale = 1.0 / (a.fStdDev * b.fStdDev);
        fvTerms.resize(k);
        for (std::size_t i = 0; i < k; ++i) {
            fvTerms[i] = a.fvCoefs[i] * b.fvCoefs[i] * scale;
        }
        const double bound = std::sqrt(a.fvTails[k] * b.fvTails[k]) * scale;
        if (bound > SECNortaConst::kSeriesError) {
            fRadius =
                std::pow(SECNortaConst::kSeriesError / bound, 1.0 / static_cast<double>(k + 1));
        }
    }
    double operator()(double r) const {
        double sum = 0.0;
        for (std::size_t i = fvTerms.size(); i-- > 0;) {
            sum = (sum + fvTerms[i]) * r;
        }
        return sum;
    }
};

double PairCorrelation(const SECNortaMargin& a, const SECNortaMargin& b, const PairSeries& series,
                       double r) {
    if (!(r >= -1.0 && r <= 1.0)) {
        return MCMV::Missing();
    }
    return std::fabs(r) <= series.fRadius ? series(r) : DirectCorrelation(a, b, r);
}

//! Thrown by the search's evaluation to leave TOMS 748 early.
struct SearchStopped {};

} // namespace

bool SECPrepareNortaMargin(const SECInputGenerator& gen, SECNortaMargin& margin) {
    margin = SECNortaMargin();
    margin.fpGenerator = &gen;
    if (!gen.fbValid) {
        return false;
    }
    margin.fbNormal = gen.fDistType == MCSPConst::kDistNormal;
    std::vector<double> cdf;
    margin.fbDiscrete = SECDiscreteSupport(gen, SECNortaConst::kMaxSupport, margin.fvValues, cdf);
    const bool ok =
        margin.fbDiscrete ? PrepareDiscrete(cdf, margin) : PrepareContinuous(gen, margin);
    if (!ok) {
        margin.fvCoefs.clear();
        return false;
    }
    FinishTails(margin);
    margin.fbValid = true;
    return true;
}

double SECNortaCorrelation(const SECNortaMargin& first, const SECNortaMargin& second, double r) {
    if (!first.fbValid || !second.fbValid || !(r >= -1.0 && r <= 1.0)) {
        return MCMV::Missing();
    }
    if (first.fbNormal && second.fbNormal) {
        return r;
    }
    return PairCorrelation(first, second, PairSeries(first, second), r);
}

SECNortaSearchResult SECNortaSearch(double rho, const std::function<double(double)>& g,
                                    MCMath_800::MCCancelInfo* cancel) {
    SECNortaSearchResult result;
    result.fNormalCorr = MCMV::Missing();
    const auto evaluate = [&](double r) {
        if (cancel != nullptr && cancel->WillCancel()) {
            result.fbCancelled = true;
            throw SearchStopped();
        }
        ++result.fEvaluations;
        const double value = g(r);
        if (MCMV::IsMissing(value)) {
            throw SearchStopped();
        }
        return value;
    };
    if (MCMV::IsMissing(rho)) {
        return result;
    }
    try {
        result.fGLow = evaluate(-1.0);
        result.fGHigh = evaluate(1.0);
        // A target beyond what any normal correlation reaches: the nearer end of the normal
        // scale. (g(±1) are correlations of the transformed values, not normal correlations.)
        if (rho <= result.fGLow || rho >= result.fGHigh) {
            result.fbUnreachable = rho < result.fGLow || rho > result.fGHigh;
            result.fNormalCorr = rho <= result.fGLow ? -1.0 : 1.0;
            return result;
        }
        std::uintmax_t iterations = 200;
        const auto [lo, hi] = boost::math::tools::toms748_solve(
            [&](double r) { return evaluate(r) - rho; }, -1.0, 1.0, result.fGLow - rho,
            result.fGHigh - rho,
            [](double a, double b) { return std::fabs(b - a) <= kRootBracket; }, iterations);
        result.fNormalCorr = 0.5 * (lo + hi);
    } catch (const SearchStopped&) {
        result.fNormalCorr = MCMV::Missing();
    } catch (const std::exception&) {
        result.fNormalCorr = MCMV::Missing();
    }
    return result;
}

SECNortaSearchResult SECNortaNormalCorrelation(const SECNortaMargin& first,
                                               const SECNortaMargin& second, double rho,
                                               MCMath_800::MCCancelInfo* cancel) {
    SECNortaSearchResult result;
    if (rho == 0.0 || std::isinf(rho)) {
        // An infinite target is no correlation: it is kept, and the combination refuses it.
        result.fNormalCorr = rho;
        return result;
    }
    if (first.fbNormal && second.fbNormal && first.fbValid && second.fbValid) {
        result.fGLow = -1.0;
        result.fGHigh = 1.0;
        result.fbUnreachable = std::fabs(rho) > 1.0;
        result.fNormalCorr = std::clamp(rho, -1.0, 1.0);
        return result;
    }
    if (!first.fbValid || !second.fbValid) {
        result.fNormalCorr = MCMV::Missing();
        return result;
    }
    const PairSeries series(first, second);
    return SECNortaSearch(
        rho, [&](double r) { return PairCorrelation(first, second, series, r); }, cancel);
}

std::vector<int> SECSplitPairs(int nPairs, int nSlices) {
    nPairs = std::max(nPairs, 0);
    nSlices = std::min(std::max(nSlices, 1), std::max(nPairs, 1));
    std::vector<int> bounds(1, 0);
    if (nPairs == 0) {
        return bounds;
    }
    const int base = nPairs / nSlices;
    const int larger = nPairs % nSlices;
    for (int s = 0; s < nSlices; ++s) {
        bounds.push_back(bounds.back() + base + (s < larger ? 1 : 0));
    }
    return bounds;
}

MCStatus SECCombineNormalCorrelations(int n, const std::vector<SECNortaPair>& pairs,
                                      MCMath_800::MCSymMatrix& normalCorr) {
    const MCStatus failed(MCSPStatus::kMergeFailed, false);
    normalCorr.SetNRows(0);
    if (n < 1) {
        return failed;
    }
    MCMath_800::MCSymMatrix q;
    q.SetIdentity(n);
    for (const SECNortaPair& pair : pairs) {
        if (pair.fRow < 0 || pair.fRow >= n || pair.fCol < 0 || pair.fCol >= n ||
            pair.fRow == pair.fCol) {
            return failed;
        }
        double value = pair.fNormalCorr;
        if (!pair.fbComputed || MCMV::IsMissing(value)) {
            value = std::clamp(pair.fTarget, -1.0, 1.0);
        }
        q.SetElem(pair.fRow, pair.fCol, value);
    }
    MCMath_800::MCEigenValues eigen(q, kEigenTolerance, kEigenIterations);
    MCMath_800::MCSymMatrix repaired;
    bool adjusted = false;
    if (!eigen.GetPDHMatrix(kRepairEpsilon, repaired, adjusted) || repaired.GetNRows() != n) {
        return failed;
    }
    normalCorr = repaired;
    const std::vector<double>& eigenvalues = eigen.GetEigenValues();
    const bool indefinite = !eigenvalues.empty() &&
                            *std::min_element(eigenvalues.begin(), eigenvalues.end()) < kIndefinite;
    return adjusted && indefinite ? MCStatus(MCSPStatus::kCorrelationAdjusted, true) : MCStatus();
}

} // namespace MCMCSP_800
