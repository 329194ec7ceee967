// The NORTA correlation model: which correlation the underlying standard normal pair must have
// so that two transformed inputs show the correlation the plan asks for, and the assembly of
// those pairwise values into one positive-definite normal correlation matrix.
//
// Method (Cario & Nelson, "Modeling and generating random vectors with arbitrary marginal
// distributions and correlation matrix", Northwestern Univ. tech. report, 1997; Ghosh &
// Henderson, ACM TOMACS 13 (2003) 276–294). Inputs X_i = T_i(Z_i), T = F⁻¹(Φ(·)), with
// (Z_i, Z_j) standard bivariate normal of correlation r have the correlation
//     g(r) = (E[T_i(Z_i) T_j(Z_j)] − μ_i μ_j) / (σ_i σ_j),
// a non-decreasing function of r on [−1, 1] with g(0) = 0 (Cario & Nelson, Theorem 1). For a
// target ρ inside [g(−1), g(+1)] the normal correlation is the root of g(r) = ρ; outside it no
// normal correlation reaches ρ: the nearer end, −1 or +1, is taken and the pair is flagged.
//
// g is computed, not sampled, to about 1e-8 (the search stops at |g(r) − ρ| ≤ 1e-6 or better):
//   - Each input is prepared once (SECNortaMargin): its mean, standard deviation and the
//     normalised Hermite coefficients c_k = E[T(Z) He_k(Z)]/√k!, by Mehler's expansion of the
//     bivariate normal density (Kendall & Stuart, vol. 2, 1979, §10.2)
//         g(r) = Σ_{k≥1} c_ik c_jk r^k / (σ_i σ_j),   σ² = Σ_{k≥1} c_k².
//     A discrete input x_0 < x_1 < … (SECDiscreteSupport) is the step function
//     T(z) = x_0 + Σ_m Δx_m 1{z > a_m}, a_m = Φ⁻¹(F(x_{m−1})), whose coefficients are exact:
//     c_k = Σ_m Δx_m φ(a_m) He_{k−1}(a_m)/√k!. A continuous input's coefficients are
//     Gauss–Legendre sums over [−37, 37] split at the kinks and jumps of T (Triangular mode,
//     Empirical and UserRanges cells), accurate to ~1e-12 of σ. A pair then costs a dot product
//     and a polynomial per r.
//   - The series converges like |r|^K times the coefficients' tails, whose energy is known
//     exactly (σ² − Σ_{k≤K} c_k²). Smooth transforms (Normal, LogNormal, Gamma, Weibull, …) have
//     negligible tails and the series holds on all of [−1, 1]. Steps and kinks leave a tail that
//     decays like a power of K, so near r = ±1 (the bound |r|^{K+1}·tail > 1e-8) g is instead
//     integrated directly: E[T_i(X) E[T_j(rX + √(1 − r²)W) | X]], the inner expectation in
//     closed form for a discrete input (x_0 + Σ_m Δx_m Φ̄((a_m − r x)/√(1 − r²))) or by
//     Gauss–Legendre, the outer by Gauss–Legendre on a mesh graded towards the points where the
//     inner expectation changes fast. g(±1) are the same integrals of the comonotone and
//     antithetic pairings.
//   - The root of g(r) = ρ by TOMS 748 (Alefeld, Potra & Shi, ACM TOMS 21 (1995) 327–344,
//     boost::math::tools::toms748_solve) to a bracket of 1e-12.
// Nothing here depends on a seed.
//
// The pairwise results need not form a positive-definite matrix; the combination repairs it
// with the nearest correlation matrix of Higham (2002), MCEigenValues::GetPDHMatrix.
#pragma once

#include "mccommon/mcmv.h"
#include "mccommon/mcstatus.h"
#include "mcmath/mccancelinfo.h"
#include "mcmath/mcsymmatrix.h"
#include "simulation_evaluation/secgeneration.h"

#include <cstddef>
#include <functional>
#include <vector>

namespace MCMCSP_800 {

//! Constants of the correlation model.
struct SECNortaConst {
    //! The search stops when |g(r) − ρ| is below this (it usually ends far below it).
    static constexpr double kSolveTolerance = 1e-6;
    //! Error allowed to a truncated Hermite series before g is integrated directly.
    static constexpr double kSeriesError = 1e-8;
    //! Widest discrete support summed exactly; a wider one is integrated as continuous.
    static constexpr std::size_t kMaxSupport = 1000;
    //! Hermite coefficients kept for a continuous input and for a discrete one.
    static constexpr int kMaxTermsContinuous = 512;
    static constexpr int kMaxTermsDiscrete = 2048;
};

//! One input of the correlated set prepared for the correlation model (see the note above).
//! Borrows its generator, which must outlive it.
struct SECNortaMargin {
    const SECInputGenerator* fpGenerator = nullptr; //!< the input, borrowed
    bool fbValid = false;                           //!< prepared; else g is missing
    bool fbNormal = false;                          //!< a Normal input (T linear)
    bool fbDiscrete = false;                        //!< summed over its support
    double fMean = 0.0;                             //!< μ = E[T(Z)]
    double fStdDev = 0.0;                           //!< σ
    std::vector<double> fvValues; //!< discrete: support x_0 < x_1 < …
    std::vector<double> fvCuts;   //!< discrete: a_m = Φ⁻¹(F(x_{m−1})), m = 1, 2, …
    //! z where T jumps or has a kink (discrete: the cuts); empty for a smooth T.
    std::vector<double> fvBreaks;
    std::vector<double> fvCoefs; //!< c_1, c_2, …, c_K
    //! tail[k] = σ² − Σ_{l≤k} c_l², k = 0 … K, never below a floor of 1e-16·σ² (the
    //! rounding of the difference).
    std::vector<double> fvTails;
};

//! Prepares `margin` for `gen`: moments, cuts, breaks and Hermite coefficients. False (margin
//! invalid) for an unusable generator, a zero or infinite variance or a transform that is
//! missing inside the integration range.
bool SECPrepareNortaMargin(const SECInputGenerator& gen, SECNortaMargin& margin);

//! g(r) for two prepared inputs, r ∈ [−1, 1]; missing for an invalid margin or r outside.
double SECNortaCorrelation(const SECNortaMargin& first, const SECNortaMargin& second, double r);

//! One pair (i, j), j < i, of the correlated set: its target and, once computed, its normal
//! correlation and attainable range.
struct SECNortaPair {
    int fRow = 0;                                  //!< i, position in the correlated set
    int fCol = 0;                                  //!< j < i
    double fTarget = 0.0;                          //!< ρ, the plan's correlation
    double fNormalCorr = 0.0;                      //!< result on the normal scale; may be missing
    double fGLow = MCCommon_800::MCMV::Missing();  //!< g(−1); missing when not computed
    double fGHigh = MCCommon_800::MCMV::Missing(); //!< g(+1); missing when not computed
    bool fbUnreachable = false;                    //!< ρ lies outside [g(−1), g(+1)]
    bool fbComputed = false;                       //!< the search ran to its end
};

//! The outcome of one search.
struct SECNortaSearchResult {
    double fNormalCorr = 0.0;                      //!< the normal correlation; may be missing
    double fGLow = MCCommon_800::MCMV::Missing();  //!< g(−1)
    double fGHigh = MCCommon_800::MCMV::Missing(); //!< g(+1)
    bool fbUnreachable = false; //!< ρ outside [g(−1), g(+1)]: the nearer end was taken
    bool fbCancelled = false;   //!< the search stopped because cancellation was pending
    int fEvaluations = 0;       //!< evaluations of g
};

//! The search for the normal correlation of target ρ, given a non-decreasing g:
//!   - g(−1) or g(+1) missing, or ρ missing: missing;
//!   - ρ < g(−1): −1, ρ > g(+1): +1, both flagged unreachable;
//!   - otherwise the root of g(r) = ρ by TOMS 748 on [−1, 1], bracketed to 1e-12 (the end of
//!     the final bracket nearer to ρ); missing when g is missing on the way.
//! Cancellation (polled before every evaluation of g; `cancel` may be null) ends the search
//! with a missing result.
SECNortaSearchResult SECNortaSearch(double rho, const std::function<double(double)>& g,
                                    MCMath_800::MCCancelInfo* cancel);

//! The normal correlation of one pair with target ρ: 0 for ρ = 0 and ρ itself for an infinite
//! ρ (range not computed), ρ for two Normal inputs (range [−1, 1]), otherwise SECNortaSearch
//! over SECNortaCorrelation.
SECNortaSearchResult SECNortaNormalCorrelation(const SECNortaMargin& first,
                                               const SECNortaMargin& second, double rho,
                                               MCMath_800::MCCancelInfo* cancel);

//! Splits `nPairs` into `nSlices` consecutive slices of equal size, the first
//! (nPairs mod nSlices) one larger: the result holds nSlices + 1 boundaries, slice s running
//! from result[s] to result[s + 1]. nSlices is raised to 1 and cut to nPairs (one boundary 0
//! for no pairs).
std::vector<int> SECSplitPairs(int nPairs, int nSlices);

//! Assembles the n × n normal correlation matrix Q (unit diagonal, each pair's result at
//! (i, j)) and repairs it: MCEigenValues(Q, 1e-12, 30), then GetPDHMatrix(1e-6). A pair whose
//! result is missing takes its target ρ cut to [−1, 1], the normal correlation of two Normal
//! inputs and the usual first guess. Success: `normalCorr` is the repaired matrix, and the
//! status is the warning 390015 when Q was not positive semi-definite (an eigenvalue below
//! −1e-9): a Q that is only singular, as the ±1 of an unreachable target makes it, is moved
//! just inside without that warning. Failure: the error 390010 and an empty `normalCorr`.
MCCommon_800::MCStatus SECCombineNormalCorrelations(int n, const std::vector<SECNortaPair>& pairs,
                                                    MCMath_800::MCSymMatrix& normalCorr);

} // namespace MCMCSP_800
