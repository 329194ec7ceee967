// The parametric distribution families: one table that fitting and simulation both read.
//
// Each row knows, for one family of MCSPConst::DistType, the length and the domain of its
// stored parameter vector, its support, mean and variance, log-density (log-probability for
// the counts), distribution function and its complement, and quantile. The fitting takes its
// validity rules, distribution functions and starting values from here; the simulation its
// validity rules, moments, natural ranges and the exact inverse of the count families. The
// prepared fast forms of the continuous transforms (closed forms in z, tables in z) stay with
// the generation kernels, which are checked against these quantiles.
//
// Stored parameter vectors are those of the plan, in the order of the type's parameter names
// (GetDistributionParameterNames):
//   Binomial n, p (n rounded to the nearest whole number)   NegBin r, p, t (t = 1: trials,
//   values shifted by r; otherwise failures)   LogNormal a, b (x = a·e^(bZ))   Normal mean, sd
//   Poisson λ   Triangular min a, max b, mode c   Uniform a, b   Weibull scale a, shape b,
//   location c   Gamma shape k, rate β   Beta α, β   Exponential rate θ   Bernoulli p.
// The Gamma's second parameter is named "scale" in the plan but acts as a rate (density
// β^k·x^(k−1)·e^(−βx)/Γ(k)), and so does the Exponential's.
//
// Categorical, Empirical and UserRanges are tables of probabilities, not parametric families:
// they have no row (MCSPFindDistFamily gives null).
//
// Every function is evaluated through Boost.Math under MCMathPolicy (no exceptions). A NaN
// argument, a missing value or parameters outside the family's domain give missing; outside
// the support a log-density is −∞, a distribution function 0 or 1. A degenerate member (a
// Normal or LogNormal of spread 0, a Uniform of width 0) is valid for simulation, where it
// draws one value, but has no density: HasDensity is false for it and the fitting leaves it out.
#pragma once

#include "simulation_common/mcspconst.h"

#include <cstddef>
#include <vector>

namespace MCMCSP_800 {

//! What the moment estimates of the families read from a sample (weighted; W the total weight).
struct MCSPSampleMoments {
    double fMean = 0.0;      //!< m, weighted mean
    double fVariance = 0.0;  //!< v, weighted variance with divisor W − 1
    double fVarianceW = 0.0; //!< weighted variance with divisor W
    double fMinimum = 0.0;   //!< smallest value
    double fMaximum = 0.0;   //!< largest value
    double fMode = 0.0;      //!< mode of the moment-matched triangular distribution
    double fGeoMean = 0.0;   //!< exp(Σ w·ln x / W)
    double fVarLog = 0.0;    //!< Σ w·(ln x − mean of ln x)² / W
};

//! One row of the table. The functions take the stored vector's data (fNParams values).
struct MCSPDistFamily {
    MCSPConst::DistType fType = MCSPConst::kDistUnknown; //!< the family
    std::size_t fNParams = 0;                            //!< length of the stored vector
    bool fbDiscrete = false;                             //!< values are whole numbers (counts)
    //! Every parameter finite and inside the family's domain.
    bool (*fIsValid)(const double* p) = nullptr;
    //! Valid and not degenerate: the family has a density (or probabilities) to evaluate.
    bool (*fHasDensity)(const double* p) = nullptr;
    //! Lower and upper end of the support; missing where unbounded.
    void (*fSupport)(const double* p, double& lower, double& upper) = nullptr;
    double (*fMean)(const double* p) = nullptr;     //!< E X; missing when it overflows
    double (*fVariance)(const double* p) = nullptr; //!< Var X; missing when it overflows
    //! ln f(x), or ln P(X = x) for a count; −∞ outside the support.
    double (*fLogDensity)(const double* p, double x) = nullptr;
    double (*fCdf)(const double* p, double x) = nullptr;  //!< F(x) = P(X ≤ x)
    double (*fCcdf)(const double* p, double x) = nullptr; //!< 1 − F(x) = P(X > x), directly
    //! F⁻¹(u); for a count the smallest k with F(k) ≥ u.
    double (*fQuantile)(const double* p, double u) = nullptr;
    //! F⁻¹(1 − q) evaluated from q, so that the upper tail keeps its relative accuracy.
    double (*fQuantileComplement)(const double* p, double q) = nullptr;
    //! Method-of-moments (or starting) parameters from a sample; false when a needed moment
    //! does not exist. `threeParamWeibull` lets the Weibull start with a location.
    bool (*fMomentEstimate)(const MCSPSampleMoments& m, bool threeParamWeibull,
                            std::vector<double>& params) = nullptr;

    //! fIsValid after checking the vector's length.
    bool IsValid(const std::vector<double>& params) const {
        return params.size() == fNParams && fIsValid(params.data());
    }
    //! fHasDensity after checking the vector's length.
    bool HasDensity(const std::vector<double>& params) const {
        return params.size() == fNParams && fHasDensity(params.data());
    }
};

//! The row of `type`; null for Categorical, Empirical, UserRanges and unknown types.
const MCSPDistFamily* MCSPFindDistFamily(MCSPConst::DistType type);

//! True when `type` has a row and `params` is a valid vector of it.
bool MCSPIsValidDistParams(MCSPConst::DistType type, const std::vector<double>& params);

} // namespace MCMCSP_800
