#include "simulation_common/mcspdistfamily.h"

#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"

#include <boost/math/distributions/bernoulli.hpp>
#include <boost/math/distributions/beta.hpp>
#include <boost/math/distributions/binomial.hpp>
#include <boost/math/distributions/exponential.hpp>
#include <boost/math/distributions/gamma.hpp>
#include <boost/math/distributions/lognormal.hpp>
#include <boost/math/distributions/negative_binomial.hpp>
#include <boost/math/distributions/normal.hpp>
#include <boost/math/distributions/poisson.hpp>
#include <boost/math/distributions/triangular.hpp>
#include <boost/math/distributions/uniform.hpp>
#include <boost/math/distributions/weibull.hpp>
#include <boost/math/special_functions/gamma.hpp>

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCMath_800::MCMathPolicy;
using namespace MCSPConst;

namespace {

namespace bm = boost::math;

//! The counts' quantiles under the services' policy, rounded up: the smallest k with
//! F(k) ≥ u (Boost's default rounds outwards, which draws one too low below the median).
using CountPolicy =
    bm::policies::normalise<MCMathPolicy,
                            bm::policies::discrete_quantile<bm::policies::integer_round_up>>::type;

constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kLnSqrtTwoPi = 0.91893853320467274178;

double Missing() {
    return MCMV::Missing();
}

//! A Boost result with anything that is not finite made missing.
double Finite(double x) {
    return std::isfinite(x) ? x : Missing();
}

bool AllFinite(const double* p, std::size_t n) {
    for (std::size_t i = 0; i < n; ++i) {
        if (!std::isfinite(p[i])) {
            return false;
        }
    }
    return true;
}

bool IsProbability(double p) {
    return p >= 0.0 && p <= 1.0;
}

double LnGamma(double x) {
    return bm::lgamma(x, MCMathPolicy());
}

//! x·ln y with 0·ln 0 = 0 (a count of 0 at a probability of 0).
double XLogY(double x, double y) {
    return x == 0.0 ? 0.0 : x * std::log(y);
}

//! Evaluation helpers shared by the rows: a distribution object `d` built from the stored
//! vector, the support [lo, hi] (missing ends unbounded), and F, 1 − F, F⁻¹ through Boost with
//! the ends of the support handled here so that Boost is asked only inside it.
struct Support {
    double fLo;
    double fHi;
    bool Below(double x) const { return !MCMV::IsMissing(fLo) && x < fLo; }
    bool Above(double x) const { return !MCMV::IsMissing(fHi) && x >= fHi; }
};

template <class Dist> double CdfOf(const Dist& d, Support s, double x) {
    if (MCMV::IsMissing(x) || std::isnan(x)) {
        return Missing();
    }
    if (s.Below(x)) {
        return 0.0;
    }
    if (s.Above(x)) {
        return 1.0;
    }
    return Finite(bm::cdf(d, x));
}

template <class Dist> double CcdfOf(const Dist& d, Support s, double x) {
    if (MCMV::IsMissing(x) || std::isnan(x)) {
        return Missing();
    }
    if (s.Below(x)) {
        return 1.0;
    }
    if (s.Above(x)) {
        return 0.0;
    }
    return Finite(bm::cdf(bm::complement(d, x)));
}

template <class Dist> double QuantileOf(const Dist& d, Support s, double u) {
    if (!(u >= 0.0 && u <= 1.0)) {
        return Missing();
    }
    if (u == 0.0) {
        return s.fLo;
    }
    if (u == 1.0) {
        return s.fHi;
    }
    return Finite(bm::quantile(d, u));
}

template <class Dist> double QuantileComplementOf(const Dist& d, Support s, double q) {
    if (!(q >= 0.0 && q <= 1.0)) {
        return Missing();
    }
    if (q == 0.0) {
        return s.fHi;
    }
    if (q == 1.0) {
        return s.fLo;
    }
    return Finite(bm::quantile(bm::complement(d, q)));
}

//! ln P(X = k) of a count: the logarithm of Boost's probability, accurate to a few ulps
//! (Boost evaluates it through the incomplete beta or gamma derivative, Loader's saddle-point
//! form in effect), where it does not underflow; the log-gamma sum `byLogGamma`, which loses
//! about |ln Γ|·1e-16 absolute, where it does.
template <class Dist, class ByLogGamma>
double CountLogPdf(const Dist& d, double k, const ByLogGamma& byLogGamma) {
    const double f = bm::pdf(d, k);
    return f > 1e-280 && std::isfinite(f) ? std::log(f) : byLogGamma();
}

// ---- The rows -----------------------------------------------------------------------------
//
// Each family is one struct of static functions: Valid, Dense (has a density), Range, Mean,
// Var, LogPdf, and Make, the Boost distribution of its parameters (with Shift, a value added
// to Boost's variable, for the located and shifted families). Moments from Johnson, Kotz and
// Balakrishnan, "Continuous Univariate Distributions" (1994/1995) and "Univariate Discrete
// Distributions" (2005), the chapter of each family.

struct Binomial {
    static constexpr std::size_t kN = 2;
    static double Trials(const double* p) { return std::floor(p[0] + 0.5); }
    static bool Valid(const double* p) {
        return AllFinite(p, kN) && p[0] >= 0.0 && IsProbability(p[1]);
    }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double* p) { return {0.0, Trials(p)}; }
    static double Mean(const double* p) { return Trials(p) * p[1]; }
    static double Var(const double* p) { return Trials(p) * p[1] * (1.0 - p[1]); }
    static double LogPdf(const double* p, double k) {
        const double n = Trials(p);
        if (k != std::floor(k) || k < 0.0 || k > n) {
            return -kInf;
        }
        return CountLogPdf(Make(p), k, [&] {
            return LnGamma(n + 1.0) - LnGamma(k + 1.0) - LnGamma(n - k + 1.0) + XLogY(k, p[1]) +
                   XLogY(n - k, 1.0 - p[1]);
        });
    }
    static bm::binomial_distribution<double, CountPolicy> Make(const double* p) {
        return {Trials(p), p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    // n·p = m, n·p·(1 − p) = v → n = m/(1 − v/m) rounded, at least 1; p = m/n.
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        const double n = std::max(std::floor(s.fMean / (1.0 - s.fVariance / s.fMean) + 0.5), 1.0);
        out = {n, s.fMean / n};
        return true;
    }
};

struct NegBin {
    static constexpr std::size_t kN = 3;
    static bool Valid(const double* p) {
        return AllFinite(p, kN) && p[0] > 0.0 && p[1] > 0.0 && p[1] <= 1.0;
    }
    static bool Dense(const double* p) { return Valid(p); }
    static double Shift(const double* p) { return p[2] == 1.0 ? p[0] : 0.0; }
    static Support Range(const double* p) { return {Shift(p), Missing()}; }
    static double Mean(const double* p) { return Shift(p) + p[0] * (1.0 - p[1]) / p[1]; }
    static double Var(const double* p) { return p[0] * (1.0 - p[1]) / (p[1] * p[1]); }
    static double LogPdf(const double* p, double x) {
        const double k = x - Shift(p);
        if (k != std::floor(k) || k < 0.0) {
            return -kInf;
        }
        const double r = p[0];
        return CountLogPdf(Make(p), k, [&] {
            return LnGamma(k + r) - LnGamma(r) - LnGamma(k + 1.0) + r * std::log(p[1]) +
                   XLogY(k, 1.0 - p[1]);
        });
    }
    static bm::negative_binomial_distribution<double, CountPolicy> Make(const double* p) {
        return {p[0], p[1]};
    }
    // r·(1 − p)/p = m, r·(1 − p)/p² = v → r = m²/(v − m) when v > m (else 1), p = r/(m + r);
    // failures (type 2).
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        const double m = s.fMean;
        const double r = s.fVariance > m ? m * m / (s.fVariance - m) : 1.0;
        out = {r, r / (m + r), 2.0};
        return true;
    }
};

struct Poisson {
    static constexpr std::size_t kN = 1;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0; }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double*) { return {0.0, Missing()}; }
    static double Mean(const double* p) { return p[0]; }
    static double Var(const double* p) { return p[0]; }
    static double LogPdf(const double* p, double k) {
        if (k != std::floor(k) || k < 0.0) {
            return -kInf;
        }
        return CountLogPdf(Make(p), k,
                           [&] { return k * std::log(p[0]) - p[0] - LnGamma(k + 1.0); });
    }
    static bm::poisson_distribution<double, CountPolicy> Make(const double* p) { return {p[0]}; }
    static double Shift(const double*) { return 0.0; }
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fMean};
        return true;
    }
};

struct Bernoulli {
    static constexpr std::size_t kN = 1;
    static bool Valid(const double* p) { return AllFinite(p, kN) && IsProbability(p[0]); }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double*) { return {0.0, 1.0}; }
    static double Mean(const double* p) { return p[0]; }
    static double Var(const double* p) { return p[0] * (1.0 - p[0]); }
    static double LogPdf(const double* p, double k) {
        return k == 1.0 ? std::log(p[0]) : (k == 0.0 ? std::log1p(-p[0]) : -kInf);
    }
    static bm::bernoulli_distribution<double, CountPolicy> Make(const double* p) { return {p[0]}; }
    static double Shift(const double*) { return 0.0; }
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fMean};
        return true;
    }
};

struct LogNormal {
    static constexpr std::size_t kN = 2;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0 && p[1] >= 0.0; }
    static bool Dense(const double* p) { return Valid(p) && p[1] > 0.0; }
    static Support Range(const double*) { return {0.0, Missing()}; }
    static double Mean(const double* p) { return Finite(p[0] * std::exp(0.5 * p[1] * p[1])); }
    static double Var(const double* p) {
        const double b2 = p[1] * p[1];
        return Finite(p[0] * p[0] * std::expm1(b2) * std::exp(b2));
    }
    static double LogPdf(const double* p, double x) {
        if (!(x > 0.0)) {
            return -kInf;
        }
        const double t = std::log(x / p[0]) / p[1];
        return -0.5 * t * t - std::log(x * p[1]) - kLnSqrtTwoPi;
    }
    static bm::lognormal_distribution<double, MCMathPolicy> Make(const double* p) {
        return {std::log(p[0]), p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    // a = exp(mean of ln x), b = sd of ln x (divisor W).
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fGeoMean, std::sqrt(s.fVarLog)};
        return true;
    }
};

struct Normal {
    static constexpr std::size_t kN = 2;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[1] >= 0.0; }
    static bool Dense(const double* p) { return Valid(p) && p[1] > 0.0; }
    static Support Range(const double*) { return {Missing(), Missing()}; }
    static double Mean(const double* p) { return p[0]; }
    static double Var(const double* p) { return p[1] * p[1]; }
    static double LogPdf(const double* p, double x) {
        const double t = (x - p[0]) / p[1];
        return -0.5 * t * t - std::log(p[1]) - kLnSqrtTwoPi;
    }
    static bm::normal_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0], p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fMean, std::sqrt(s.fVarianceW)};
        return true;
    }
};

struct Triangular {
    static constexpr std::size_t kN = 3;
    static bool Valid(const double* p) {
        return AllFinite(p, kN) && p[0] < p[1] && p[2] >= p[0] && p[2] <= p[1];
    }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double* p) { return {p[0], p[1]}; }
    static double Mean(const double* p) { return (p[0] + p[1] + p[2]) / 3.0; }
    static double Var(const double* p) {
        const double a = p[0];
        const double b = p[1];
        const double c = p[2];
        return (a * a + b * b + c * c - a * b - a * c - b * c) / 18.0;
    }
    // 2(x − a)/((b − a)(c − a)) on [a, c), 2(b − x)/((b − a)(b − c)) on [c, b].
    static double LogPdf(const double* p, double x) {
        const double a = p[0];
        const double b = p[1];
        const double c = p[2];
        if (x < a || x > b) {
            return -kInf;
        }
        const double f = x < c ? 2.0 * (x - a) / ((b - a) * (c - a))
                               : (c == b ? 2.0 / (b - a) : 2.0 * (b - x) / ((b - a) * (b - c)));
        return std::log(f);
    }
    static bm::triangular_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0], p[2], p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    // The extremes and the moment-matched mode.
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fMinimum, s.fMaximum, s.fMode};
        return true;
    }
};

struct Uniform {
    static constexpr std::size_t kN = 2;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] <= p[1]; }
    static bool Dense(const double* p) { return Valid(p) && p[0] < p[1]; }
    static Support Range(const double* p) { return {p[0], p[1]}; }
    static double Mean(const double* p) { return 0.5 * (p[0] + p[1]); }
    static double Var(const double* p) { return (p[1] - p[0]) * (p[1] - p[0]) / 12.0; }
    static double LogPdf(const double* p, double x) {
        return x < p[0] || x > p[1] ? -kInf : -std::log(p[1] - p[0]);
    }
    static bm::uniform_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0], p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {s.fMinimum, s.fMaximum};
        return true;
    }
};

struct Weibull {
    static constexpr std::size_t kN = 3;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0 && p[1] > 0.0; }
    static bool Dense(const double* p) { return Valid(p); }
    static double Shift(const double* p) { return p[2]; }
    static Support Range(const double* p) { return {p[2], Missing()}; }
    static double Mean(const double* p) {
        return Finite(p[2] + p[0] * bm::tgamma(1.0 + 1.0 / p[1], MCMathPolicy()));
    }
    static double Var(const double* p) {
        const double g1 = bm::tgamma(1.0 + 1.0 / p[1], MCMathPolicy());
        const double g2 = bm::tgamma(1.0 + 2.0 / p[1], MCMathPolicy());
        return Finite(p[0] * p[0] * (g2 - g1 * g1));
    }
    // (b/a)·w^(b−1)·e^(−w^b), w = (x − c)/a.
    static double LogPdf(const double* p, double x) {
        const double w = (x - p[2]) / p[0];
        if (w == 0.0) {
            // The density at the location: 1/a for shape 1, unbounded below it, 0 above.
            return p[1] == 1.0 ? -std::log(p[0]) : (p[1] < 1.0 ? kInf : -kInf);
        }
        if (!(w > 0.0)) {
            return -kInf;
        }
        return std::log(p[1] / p[0]) + (p[1] - 1.0) * std::log(w) - std::pow(w, p[1]);
    }
    static bm::weibull_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[1], p[0]};
    }
    // No closed form: (1, 1, 0), or a location just below the data, starts the root search.
    static bool Moments(const MCSPSampleMoments& s, bool threeParam, std::vector<double>& out) {
        out = {1.0, 1.0, threeParam ? s.fMinimum - 1e-5 : 0.0};
        return true;
    }
};

struct Gamma {
    static constexpr std::size_t kN = 2;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0 && p[1] > 0.0; }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double*) { return {0.0, Missing()}; }
    static double Mean(const double* p) { return p[0] / p[1]; }
    static double Var(const double* p) { return p[0] / (p[1] * p[1]); }
    static double LogPdf(const double* p, double x) {
        if (!(x >= 0.0)) {
            return -kInf;
        }
        const double k = p[0];
        const double beta = p[1];
        return k * std::log(beta) + XLogY(k - 1.0, x) - beta * x - LnGamma(k);
    }
    static bm::gamma_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0], 1.0 / p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    // k/β = m, k/β² = v → k = m²/v, β = m/v.
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        if (!(s.fVariance > 0.0)) {
            return false;
        }
        out = {s.fMean * s.fMean / s.fVariance, s.fMean / s.fVariance};
        return true;
    }
};

struct Beta {
    static constexpr std::size_t kN = 2;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0 && p[1] > 0.0; }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double*) { return {0.0, 1.0}; }
    static double Mean(const double* p) { return p[0] / (p[0] + p[1]); }
    static double Var(const double* p) {
        const double sum = p[0] + p[1];
        return p[0] * p[1] / (sum * sum * (sum + 1.0));
    }
    static double LogPdf(const double* p, double x) {
        if (!(x >= 0.0 && x <= 1.0)) {
            return -kInf;
        }
        const double lnB = LnGamma(p[0]) + LnGamma(p[1]) - LnGamma(p[0] + p[1]);
        return XLogY(p[0] - 1.0, x) + (p[1] - 1.0) * std::log1p(-x) - lnB;
    }
    static bm::beta_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0], p[1]};
    }
    static double Shift(const double*) { return 0.0; }
    // t = m(1 − m)/v − 1 → a = m·t, b = (1 − m)·t.
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        if (!(s.fVariance > 0.0)) {
            return false;
        }
        const double t = (1.0 - s.fMean) * s.fMean / s.fVariance - 1.0;
        out = {s.fMean * t, (1.0 - s.fMean) * t};
        return true;
    }
};

struct Exponential {
    static constexpr std::size_t kN = 1;
    static bool Valid(const double* p) { return AllFinite(p, kN) && p[0] > 0.0; }
    static bool Dense(const double* p) { return Valid(p); }
    static Support Range(const double*) { return {0.0, Missing()}; }
    static double Mean(const double* p) { return 1.0 / p[0]; }
    static double Var(const double* p) { return 1.0 / (p[0] * p[0]); }
    static double LogPdf(const double* p, double x) {
        return x < 0.0 ? -kInf : std::log(p[0]) - p[0] * x;
    }
    static bm::exponential_distribution<double, MCMathPolicy> Make(const double* p) {
        return {p[0]};
    }
    static double Shift(const double*) { return 0.0; }
    // Rate 1/m.
    static bool Moments(const MCSPSampleMoments& s, bool, std::vector<double>& out) {
        out = {1.0 / s.fMean};
        return true;
    }
};

//! Boost's variable is x − Shift: the support of the plan's variable moved by the shift.
template <class F> Support BoostRange(const double* p) {
    const Support s = F::Range(p);
    const double shift = F::Shift(p);
    return {MCMV::IsMissing(s.fLo) ? s.fLo : s.fLo - shift,
            MCMV::IsMissing(s.fHi) ? s.fHi : s.fHi - shift};
}

//! Boost's variable of x: shifted, and for a count the whole number at or below it (F is a
//! step function; Boost's discrete functions would extend it continuously).
template <class F, bool kDiscrete> double BoostVariable(const double* p, double x) {
    if (MCMV::IsMissing(x)) {
        return x;
    }
    return kDiscrete ? std::floor(x - F::Shift(p)) : x - F::Shift(p);
}

//! A count quantile made exact: Boost finds the root of the continuous extension of F, which
//! can land a whole number off where F(k) lies within a few ulps of u, and far off in extreme
//! tails of huge counts (a Binomial's upper tail beyond 1e-17). The smallest k with F(k) ≥ u
//! is then found by the distribution function itself: Boost's answer is checked against its
//! neighbour (two evaluations when it is right), else bracketed by doubling steps from it and
//! bisected. Missing when no bracket is found (F missing on the way).
template <class F, bool kUpper> double ExactCount(const double* p, double k, double u) {
    if (MCMV::IsMissing(k)) {
        return k;
    }
    const auto d = F::Make(p);
    const Support s = BoostRange<F>(p);
    // kUpper: u is the upper-tail probability q, the condition F(k) ≥ 1 − q is 1 − F(k) ≤ q.
    const auto reached = [&](double j) {
        return kUpper ? CcdfOf(d, s, j) <= u : CdfOf(d, s, j) >= u;
    };
    const double below = s.fLo - 1.0;               // F(below) = 0: never reached for u > 0
    constexpr double kMaxStep = 4503599627370496.0; // 2^52: whole numbers stay exact
    double lo = k;                                  // not reached (or below)
    double hi = k;                                  // reached
    if (reached(k)) {
        for (double step = 1.0;; step *= 2.0) {
            lo = std::max(k - step, below);
            if (lo == below || !reached(lo)) {
                break;
            }
            hi = lo;
            if (step > kMaxStep) {
                return Missing();
            }
        }
    } else {
        for (double step = 1.0;; step *= 2.0) {
            hi = MCMV::IsMissing(s.fHi) ? k + step : std::min(k + step, s.fHi);
            if (reached(hi)) {
                break;
            }
            lo = hi;
            if (step > kMaxStep || (!MCMV::IsMissing(s.fHi) && hi == s.fHi)) {
                return Missing();
            }
        }
    }
    while (hi - lo > 1.0) {
        const double mid = std::floor(0.5 * (lo + hi));
        (reached(mid) ? hi : lo) = mid;
    }
    return hi;
}

//! The row of family F: the generic F, 1 − F and F⁻¹ over Boost, shifted by F::Shift, with
//! every function refusing invalid parameters. A degenerate member (no density) is a point
//! mass at its mean: its F is a step there.
template <class F, bool kDiscrete> MCSPDistFamily MakeRow(DistType type) {
    MCSPDistFamily row;
    row.fType = type;
    row.fNParams = F::kN;
    row.fbDiscrete = kDiscrete;
    row.fIsValid = &F::Valid;
    row.fHasDensity = &F::Dense;
    row.fSupport = [](const double* p, double& lo, double& hi) {
        const Support s = F::Range(p);
        lo = s.fLo;
        hi = s.fHi;
    };
    row.fMean = [](const double* p) { return F::Valid(p) ? Finite(F::Mean(p)) : Missing(); };
    row.fVariance = [](const double* p) { return F::Valid(p) ? Finite(F::Var(p)) : Missing(); };
    row.fLogDensity = [](const double* p, double x) {
        if (!F::Dense(p) || MCMV::IsMissing(x) || std::isnan(x)) {
            return Missing();
        }
        const double v = F::LogPdf(p, x);
        return std::isnan(v) ? Missing() : v;
    };
    row.fCdf = [](const double* p, double x) {
        if (!F::Valid(p)) {
            return Missing();
        }
        if (!F::Dense(p)) {
            return MCMV::IsMissing(x) ? Missing() : (x < F::Mean(p) ? 0.0 : 1.0);
        }
        return CdfOf(F::Make(p), BoostRange<F>(p), BoostVariable<F, kDiscrete>(p, x));
    };
    row.fCcdf = [](const double* p, double x) {
        if (!F::Valid(p)) {
            return Missing();
        }
        if (!F::Dense(p)) {
            return MCMV::IsMissing(x) ? Missing() : (x < F::Mean(p) ? 1.0 : 0.0);
        }
        return CcdfOf(F::Make(p), BoostRange<F>(p), BoostVariable<F, kDiscrete>(p, x));
    };
    row.fQuantile = [](const double* p, double u) {
        if (!F::Valid(p)) {
            return Missing();
        }
        if (!F::Dense(p)) {
            return IsProbability(u) ? F::Mean(p) : Missing();
        }
        double x = QuantileOf(F::Make(p), BoostRange<F>(p), u);
        if (kDiscrete && u > 0.0 && u < 1.0) {
            x = ExactCount<F, false>(p, x, u);
        }
        return MCMV::IsMissing(x) ? x : x + F::Shift(p);
    };
    row.fQuantileComplement = [](const double* p, double q) {
        if (!F::Valid(p)) {
            return Missing();
        }
        if (!F::Dense(p)) {
            return IsProbability(q) ? F::Mean(p) : Missing();
        }
        double x = QuantileComplementOf(F::Make(p), BoostRange<F>(p), q);
        if (kDiscrete && q > 0.0 && q < 1.0) {
            x = ExactCount<F, true>(p, x, q);
        }
        return MCMV::IsMissing(x) ? x : x + F::Shift(p);
    };
    row.fMomentEstimate = &F::Moments;
    return row;
}

const std::array<MCSPDistFamily, kNDistTypes>& Table() {
    static const std::array<MCSPDistFamily, kNDistTypes> kTable = [] {
        std::array<MCSPDistFamily, kNDistTypes> t{};
        t[kDistBinomial] = MakeRow<Binomial, true>(kDistBinomial);
        t[kDistNegbinomial] = MakeRow<NegBin, true>(kDistNegbinomial);
        t[kDistLognormal] = MakeRow<LogNormal, false>(kDistLognormal);
        t[kDistNormal] = MakeRow<Normal, false>(kDistNormal);
        t[kDistPoisson] = MakeRow<Poisson, true>(kDistPoisson);
        t[kDistTriangular] = MakeRow<Triangular, false>(kDistTriangular);
        t[kDistUniform] = MakeRow<Uniform, false>(kDistUniform);
        t[kDistWeibull] = MakeRow<Weibull, false>(kDistWeibull);
        t[kDistGamma] = MakeRow<Gamma, false>(kDistGamma);
        t[kDistBeta] = MakeRow<Beta, false>(kDistBeta);
        t[kDistExponential] = MakeRow<Exponential, false>(kDistExponential);
        t[kDistBernoulli] = MakeRow<Bernoulli, true>(kDistBernoulli);
        return t;
    }();
    return kTable;
}

} // namespace

const MCSPDistFamily* MCSPFindDistFamily(DistType type) {
    if (type < 0 || type >= kNDistTypes) {
        return nullptr;
    }
    const MCSPDistFamily& row = Table()[static_cast<std::size_t>(type)];
    return row.fIsValid != nullptr ? &row : nullptr;
}

bool MCSPIsValidDistParams(DistType type, const std::vector<double>& params) {
    const MCSPDistFamily* family = MCSPFindDistFamily(type);
    return family != nullptr && family->IsValid(params);
}

} // namespace MCMCSP_800
