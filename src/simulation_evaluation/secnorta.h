// The NORTA correlation model: which correlation the underlying standard normal pair must have
// so that two transformed inputs show the correlation the plan asks for, and the assembly of
// those pairwise values into one positive-definite normal correlation matrix.
//
// Method (Cario & Nelson, "Modeling and generating random vectors with arbitrary marginal
// distributions and correlation matrix", Northwestern Univ. tech. report, 1997; Ghosh &
// Henderson, ACM TOMACS 13 (2003) 276–294). Inputs X_i = F_i⁻¹(Φ(Z_i)) with (Z_i, Z_j) standard
// bivariate normal of correlation r have the correlation
//     g(r) = Corr(F_i⁻¹(Φ(Z_i)), F_j⁻¹(Φ(Z_j))),
// a non-decreasing function of r on [−1, 1] with g(0) = 0 (Cario & Nelson, Theorem 1). For a
// target ρ inside [g(−1), g(+1)] the normal correlation is the root of g(r) = ρ; outside it
// no normal correlation reaches ρ and the nearest end, −1 or +1, is taken. Here g(r) is
// estimated as the Pearson correlation of 1000 transformed pairs and the root found by
// bisection to 0.01, so the result carries a sampling error of a few hundredths, inherent to
// an estimate from 1000 pairs.
//
// Common random numbers: every estimate of g for one pair restarts the pair's stream from the
// pair's own seed, so all of them use the same 1000 normal pairs. The estimated g is then a
// fixed, smooth function of r and the bisection converges to its root instead of chasing
// independent noise at every step; and because the seed belongs to the pair, not to the
// worker that computes it, the result does not depend on how the pairs are split over threads.
//
// The pairwise results need not form a positive-definite matrix; the combination repairs it
// with the nearest correlation matrix of Higham (2002), MCEigenValues::GetPDHMatrix.
#pragma once

#include "mccommon/mcstatus.h"
#include "mcmath/mccancelinfo.h"
#include "mcmath/mcrandom.h"
#include "mcmath/mcsymmatrix.h"
#include "simulation_evaluation/secgeneration.h"

#include <cstdint>
#include <functional>
#include <vector>

namespace MCMCSP_800 {

//! One pair (i, j), j < i, of the correlated set: its target and, once computed, its normal
//! correlation.
struct SECNortaPair {
    int fRow = 0;             //!< i, position in the correlated set
    int fCol = 0;             //!< j < i
    double fTarget = 0.0;     //!< ρ, the plan's correlation of the transformed inputs
    std::uint32_t fSeed = 0;  //!< seed of the pair's stream (common random numbers)
    double fNormalCorr = 0.0; //!< the result on the normal scale; missing when not found
    bool fbComputed = false;  //!< the search ran to its end (not cancelled)
};

//! The outcome of one search.
struct SECNortaSearchResult {
    double fNormalCorr = 0.0; //!< the normal correlation; missing when g was missing
    bool fbCancelled = false; //!< the search stopped because cancellation was pending
    int fEvaluations = 0;     //!< estimates of g made
};

//! g(r): the Pearson correlation C01/√(C00·C11) of `nPairs` transformed pairs
//! (SECTransform(first, x0), SECTransform(second, x1)), (x0, x1) standard bivariate normal
//! with correlation r drawn from `stream` restarted at `seed`. Missing when r is not in
//! [−1, 1], a transformed value is missing, or either variance is 0.
double SECNortaPairCorrelation(const SECInputGenerator& first, const SECInputGenerator& second,
                               double r, int nPairs, MCMath_800::MCURandom& stream,
                               std::uint32_t seed);

//! The bisection for the normal correlation of target ρ, given g:
//!   - g(−1) or g(+1) missing: missing; ρ ≤ g(−1): −1; ρ ≥ g(+1): +1 (the normal-scale ends);
//!   - otherwise r = midpoint of [lo, hi] = [−1, 1]; g(r) missing: missing; |g(r) − ρ| < 0.01
//!     or hi − lo < 0.01: r; else the upper half when ρ > g(r), the lower half otherwise.
//! Cancellation (polled before every estimate of g; `cancel` may be null) ends the search
//! with a missing result.
SECNortaSearchResult SECNortaSearch(double rho, const std::function<double(double)>& g,
                                    MCMath_800::MCCancelInfo* cancel);

//! The normal correlation of one pair with target ρ: 0 for ρ = 0, ρ for two Normal inputs,
//! otherwise SECNortaSearch over SECNortaPairCorrelation with 1000 pairs from `seed`.
SECNortaSearchResult SECNortaNormalCorrelation(const SECInputGenerator& first,
                                               const SECInputGenerator& second, double rho,
                                               MCMath_800::MCURandom& stream, std::uint32_t seed,
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
//! status is the warning 390015 when it differs from Q. Failure: the error 390010 and an
//! empty `normalCorr`.
MCCommon_800::MCStatus SECCombineNormalCorrelations(int n, const std::vector<SECNortaPair>& pairs,
                                                    MCMath_800::MCSymMatrix& normalCorr);

} // namespace MCMCSP_800
