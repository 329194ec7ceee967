// What a statistician reads beside a candidate's test statistics: the standard errors of its
// estimated parameters with their correlations (from the observed information), and the Q-Q
// and P-P points of the fit. The goodness-of-fit task of a continuous candidate and the
// chi-square step of a count candidate call SetFitDiagnostics once the estimate is final;
// the kernels below take the log-likelihood or the sorted sample as plain functions so they
// can be tested alone.
#pragma once

#include "distribution_fitting/dfcoutputstats.h"
#include "simulation_common/mcspconst.h"

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace MCMCSP_800 {

//! A weighted sample in ascending order: value(i) and weight(i) for i < n, total weight W.
struct DFCSortedSample {
    std::size_t fN = 0;                         //!< number of entries
    std::function<double(std::size_t)> fValue;  //!< the i-th smallest value
    std::function<double(std::size_t)> fWeight; //!< its weight
    double fTotalWeight = 0.0;                  //!< W = Σ weight(i)
};

//! Which entries of `params` of candidate `type` the fitting estimates by maximum likelihood at
//! an interior point, so that the observed information gives their standard errors. `reason`
//! says why any entry is not (a moment-estimated Binomial n, a whole-number NegBin threshold,
//! endpoints at the sample extremes, a Weibull location), "" when none is left out.
std::vector<bool> RegularMLParams(MCSPConst::DistType type, const std::vector<double>& params,
                                  std::string& reason);

//! Standard errors and correlations of the estimated parameters.
struct DFCStdErrors {
    std::vector<double> fvStdErrors;    //!< one per parameter, missing where not computed
    std::vector<double> fvCorrelations; //!< row-major, missing where not computed
    std::string fReason;                //!< why any is missing, "" when none is
};

//! Standard errors of the parameters marked in `estimated` from the observed information
//! I = -∂²ln L/∂θ∂θᵀ at `params`, where `logLik` gives ln L (Σ w·ln f) of a full parameter
//! vector: SE_j = √(I⁻¹)_jj, correlation (I⁻¹)_jk/(SE_j·SE_k). The unmarked parameters are
//! held at their values (the errors of the others are conditional on them). Missing, with the
//! reason, when ln L is not finite near the estimate or I is not positive definite (the
//! estimate is not an interior maximum). `isValid` tells whether a perturbed vector is inside
//! the parameter space.
DFCStdErrors ComputeStdErrors(const std::vector<double>& params, const std::vector<bool>& estimated,
                              const std::function<double(const std::vector<double>&)>& logLik,
                              const std::function<bool(const std::vector<double>&)>& isValid);

//! The number of plotting positions p_i = i/(kDFCPlotPoints + 1).
constexpr int kDFCPlotPoints = 99;

//! The sample's p_i quantiles x_i (the smallest value whose cumulative weight reaches p_i·W,
//! the inverse of the weighted EDF) and the EDF F_n(x_i) there, for i = 1 .. 99.
void ComputeSampleQuantiles(const DFCSortedSample& sample, std::vector<double>& quantiles,
                            std::vector<double>& probs);

//! Writes the standard errors and the Q-Q and P-P points of `element` (its final estimate)
//! fitted to `sample`; `logLik` as in ComputeStdErrors, over the same sample.
void SetFitDiagnostics(DFCOutputStats::DFCVarDistElement& element, const DFCSortedSample& sample,
                       const std::function<double(const std::vector<double>&)>& logLik);

} // namespace MCMCSP_800
