// Distribution functions, quantiles and the log-gamma function of the math services.
//
// The fitting calls these for likelihoods (ln Γ), goodness-of-fit tests (CdfNorm, CdfGam,
// CdfBeta, CdfChi) and initial tables; the simulation calls them to build cumulative tables
// (CdfBin), to turn normal draws into uniforms (CdfStdNorm) and to invert distribution
// functions (IdfGam, IdfBeta, IdfNorm). For a quantile evaluated very often with fixed
// parameters, prefer the prepared objects of mcquantile.h.
//
// Every function is a thin, checked wrapper over Boost.Math, evaluated under MCMathPolicy:
// errors are ignored by Boost (a domain or pole error yields NaN, an overflow yields ±∞), no
// exception is thrown, and double arithmetic is not promoted to long double (the promoted
// evaluation is about ten times slower and differs between platforms whose long double
// differs). Each wrapper then turns every result that is not a finite number into
// MCMV::Missing(), so no NaN or infinity of Boost's leaks out. Accuracy, measured against
// 60-digit references over shapes from 0.01 to 1e4 and both tails: distribution functions
// within 2e-14 relative (Φ within 6e-14 down to z = −37.5, where the rounding of −z/√2 costs
// about z²·1e-16), quantiles within 2e-14 relative as far as the conditioning of the inverse
// allows (a Gamma quantile near 0 has condition number 1/α; near p = 1 the double p itself
// holds only 1e-16/(1 − p) relative information), ln Γ, ψ and ψ' within 1e-15.
//
// Edges, for every function: a NaN argument or a parameter outside its domain (shapes, rates
// and standard deviations must be finite and > 0) gives missing. A distribution function at
// or below the lower end of the support gives 0, at or above the upper end 1 (±∞ included).
// A quantile at p = 0 gives the lower end of the support, at p = 1 the upper end; an infinite
// end (the Normal at both, the Gamma at p = 1) is not a usable number and gives missing, as
// does p outside [0, 1].
#pragma once

#include <boost/math/policies/policy.hpp>

namespace MCMath_800 {

//! The Boost.Math policy of the math services: no exceptions, no errno, no promotion of
//! double to long double. Errors come back as NaN or ±∞ and are mapped to missing by the
//! callers.
using MCMathPolicy = boost::math::policies::policy<
    boost::math::policies::domain_error<boost::math::policies::ignore_error>,
    boost::math::policies::pole_error<boost::math::policies::ignore_error>,
    boost::math::policies::overflow_error<boost::math::policies::ignore_error>,
    boost::math::policies::underflow_error<boost::math::policies::ignore_error>,
    boost::math::policies::denorm_error<boost::math::policies::ignore_error>,
    boost::math::policies::evaluation_error<boost::math::policies::ignore_error>,
    boost::math::policies::rounding_error<boost::math::policies::ignore_error>,
    boost::math::policies::indeterminate_result_error<boost::math::policies::ignore_error>,
    boost::math::policies::promote_float<false>, boost::math::policies::promote_double<false>>;

//! Distribution functions (Cdf*), quantiles (Idf*) and ln Γ. All static, all thread-safe,
//! none allocates or throws.
struct MCDistFun {
    //! Φ(z), the standard normal distribution function: 0.5·erfc(−z/√2).
    static double CdfStdNorm(double z);
    //! Φ((x − mean)/sd); sd > 0.
    static double CdfNorm(double x, double mean, double sd);
    //! Gamma distribution function with shape α and RATE β (density
    //! β^α·x^(α−1)·e^(−βx)/Γ(α)): the regularised lower incomplete gamma P(α, βx). x ≤ 0
    //! gives 0.
    static double CdfGam(double x, double alpha, double beta);
    //! Beta distribution function: the regularised incomplete beta I_x(a, b). x ≤ 0 gives 0,
    //! x ≥ 1 gives 1.
    static double CdfBeta(double x, double a, double b);
    //! Chi-square distribution function with df > 0 degrees of freedom (df need not be whole):
    //! P(df/2, x/2). x ≤ 0 gives 0; df ≤ 0 gives missing.
    static double CdfChi(double x, double df);
    //! Binomial distribution function P(X ≤ k) for n trials of probability p:
    //! I_(1−p)(n − ⌊k⌋, ⌊k⌋ + 1) for 0 ≤ k < n, 0 for k < 0, 1 for k ≥ n. n ≥ 0 is meant to be
    //! whole; a fractional n gives the continuous extension of the same formula. `err` becomes
    //! 0 on success; 1 when an argument is NaN or outside its domain (n < 0 or not finite, p
    //! outside [0, 1]), 2 when the evaluation failed; the result is then missing.
    static double CdfBin(double k, double n, double p, int& err);
    //! The same without the error code (missing on failure).
    static double CdfBin(double k, double n, double p);

    //! The normal quantile mean + sd·Φ⁻¹(p), Φ⁻¹(p) = −√2·erfc⁻¹(2p). p = 0 and p = 1 give
    //! missing (the quantile is infinite).
    static double IdfNorm(double p, double mean, double sd);
    //! The Gamma quantile with shape α and rate β: P⁻¹(α, p)/β. p = 0 gives 0, p = 1 missing.
    //! For a tiny α the quantile of a moderate p can underflow: the result is then 0 (or a
    //! subnormal number), the correctly rounded value.
    static double IdfGam(double p, double alpha, double beta);
    //! The Beta quantile I⁻¹(a, b, p). p = 0 gives 0, p = 1 gives 1.
    static double IdfBeta(double p, double a, double b);

    //! ln Γ(x) where Γ(x) > 0: every x > 0, and negative non-integral x in the intervals
    //! (−2, −1), (−4, −3), ... where Γ is positive. The poles 0, −1, −2, ... and the intervals
    //! where Γ(x) < 0 (its logarithm is not real) give missing, as does an overflow (x beyond
    //! about 2.5e305).
    static double norvanednlgam(double x);
};

} // namespace MCMath_800
