// Moment and start estimates of every candidate distribution (DFCAlgorithm::
// SetInitialDistParams), the factors' categorical distributions, and the load-time switches
// of SIMULATE_DEBUG_OPTIMIZER.
#include "distribution_fitting/dfcalgorithm.h"

#include "component/mcspassert.h"

#include <cmath>
#include <cstdlib>
#include <string>

namespace MCMCSP_800 {

using namespace MCSPConst;

namespace {

//! Read when the library is loaded, never again.
const DFCDebugOptimizerSwitches gDebugSwitches =
    ParseDebugOptimizerValue(std::getenv("SIMULATE_DEBUG_OPTIMIZER"));

} // namespace

DFCDebugOptimizerSwitches ParseDebugOptimizerValue(const char* value) {
    DFCDebugOptimizerSwitches switches;
    if (value) {
        const std::string text(value);
        switches.fbDebugOptimizer = text == "1" || text == "2";
        switches.fbThreeParamWeibull = text == "1";
    }
    return switches;
}

const DFCDebugOptimizerSwitches& GetDebugOptimizerSwitches() {
    return gDebugSwitches;
}

// Method-of-moments estimates (m mean, v variance with divisor W - 1, s² variance with
// divisor W), each the solution of "model moments = sample moments":
//   Binomial(n, p):     n·p = m, n·p·(1-p) = v     → n = m/(1 - v/m) rounded, at least 1;
//                                                    p = m/n
//   NegBin(r, p):       r·(1-p)/p = m, r·(1-p)/p² = v → r = m²/(v - m) when v > m (else 1),
//                                                    p = r/(m + r); counts failures (type 2)
//   LogNormal(a, b):    a = exp(mean of ln x), b = sd of ln x (divisor W)
//   Normal:             mean m, sd s
//   Poisson:            λ = m
//   Triangular, Uniform: the extremes (and the moment-matched mode)
//   Gamma(α, β), rate β: α/β = m, α/β² = v     → α = m²/v, β = m/v
//   Beta(a, b):         t = m(1-m)/v - 1        → a = m·t, b = (1-m)·t
//   Exponential:        rate 1/m
//   Weibull(a, b, c):   no closed form; (1, 1, 0) starts the likelihood root search.
// Johnson, Kotz and Balakrishnan, "Continuous Univariate Distributions" (1994/1995) and
// "Univariate Discrete Distributions" (2005), the chapters of each family.
bool ComputeMomentEstimate(DistType type, const DFCMomentInputs& in, bool threeParamWeibull,
                           std::vector<double>& params) {
    params.clear();
    const double m = in.fMean;
    const double v = in.fVariance;
    std::vector<double> p;
    switch (type) {
    case kDistBinomial: {
        double n = std::floor(m / (1.0 - v / m) + 0.5);
        if (n < 1.0) {
            n = 1.0;
        }
        p = {n, m / n};
        break;
    }
    case kDistNegbinomial: {
        const double r = v > m ? m * m / (v - m) : 1.0;
        p = {r, r / (m + r), 2.0};
        break;
    }
    case kDistLognormal:
        p = {in.fGeoMean, std::sqrt(in.fVarLog)};
        break;
    case kDistNormal:
        p = {m, std::sqrt(in.fVarianceW)};
        break;
    case kDistPoisson:
        p = {m};
        break;
    case kDistTriangular:
        p = {in.fMinimum, in.fMaximum, in.fMode};
        break;
    case kDistUniform:
        p = {in.fMinimum, in.fMaximum};
        break;
    case kDistWeibull:
        p = {1.0, 1.0, threeParamWeibull ? in.fMinimum - 1e-5 : 0.0};
        break;
    case kDistGamma:
        if (!(v > 0.0)) {
            return false;
        }
        p = {m * m / v, m / v};
        break;
    case kDistBeta: {
        if (!(v > 0.0)) {
            return false;
        }
        const double t = (1.0 - m) * m / v - 1.0;
        p = {m * t, (1.0 - m) * t};
        break;
    }
    case kDistExponential:
        p = {1.0 / m};
        break;
    default:
        return false;
    }
    // A statistic that does not exist (the variance of less than two weight units, say) must
    // not become a parameter.
    for (double x : p) {
        if (!std::isfinite(x)) {
            return false;
        }
    }
    params = std::move(p);
    return true;
}

std::string DFCAlgorithm::GetCategoryText(const MCXML_800::IMCVariable* variable, int code) {
    const MCXML_800::MCCatNumEncoder* encoder = variable ? variable->GetCategorical() : nullptr;
    if (encoder && code >= 0 && code < encoder->GetNCategories()) {
        return encoder->GetCategoryText(code);
    }
    return std::to_string(code);
}

MCStatus DFCAlgorithm::SetInitialDistParams() {
    const std::vector<int>& covariates = fSettings.GetCovariates();
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        DFCOutputStats::DFCVarDistInfo& info = GetOutCovarVarInfo(i);
        if (fvpCatStatsCovars[ui]) {
            info.fCategoryCounts = fvpCatStatsCovars[ui]->GetCatCounts();
        }
        const DFCMomentInputs moments = GetCovariateMoments(i);
        for (int k = 0; k < kNFitDistTypes; ++k) {
            const auto type = static_cast<DistType>(k);
            DFCOutputStats::DFCVarDistElement& element =
                info.fDistElements[static_cast<std::size_t>(k)];
            if (!element.fbDistAllowed) {
                continue;
            }
            // A constant field has no distribution to fit.
            if (moments.fMinimum == moments.fMaximum) {
                element.fbDistAllowed = false;
                fvAllowedMask[ui] &= static_cast<std::uint16_t>(~(1u << k));
                continue;
            }
            element.fDistParams.clear();
            if (type == kDistCategorical) {
                // A covariate has no categorical estimate; the chi-square step drops it.
                static_cast<void>(MCSP_ASSERT(false, "DFCAlgorithm::DFCAlgorithm: false"));
                element.fInitParams = element.fDistParams;
                continue;
            }
            if (!ComputeMomentEstimate(type, moments, fbThreeParamWeibull, element.fDistParams)) {
                DropCovarDist(i, type);
                continue;
            }
            element.fInitParams = element.fDistParams;
            if (type == kDistNegbinomial) {
                fvNegBinCovars.push_back(i);
                fvNegBinVarIndices.push_back(covariates[ui]);
                fvNegBinParams.push_back(element.fDistParams[0]);
                fvNegBinParams.push_back(element.fDistParams[1]);
            } else if (type == kDistWeibull) {
                fvWeibullCovars.push_back(i);
                fvWeibullVarIndices.push_back(covariates[ui]);
                if (fbThreeParamWeibull) {
                    fvWeibullParams.insert(fvWeibullParams.end(), element.fDistParams.begin(),
                                           element.fDistParams.end());
                }
            }
        }
    }

    const std::vector<int>& factors = fSettings.GetFactors();
    for (int f = 0; f < fNFactors; ++f) {
        const auto uf = static_cast<std::size_t>(f);
        const MCMath_800::MCCatStats& stats = *fvpCatStatsFactors[uf];
        const double total = stats.GetSumCounts();
        const int nCategories = stats.GetNCategories(true);
        DFCOutputStats::DFCVarDistInfo& info = GetOutFactorVarInfo(f);
        info.fCategoryCounts = stats.GetCatCounts();
        DFCOutputStats::DFCVarDistElement& element = GetOutFactorDistInfo(f, kDistCategorical);
        if (element.fbDistAllowed) {
            const MCXML_800::IMCVariable* variable = fpVarList->GetVarAt(factors[uf]);
            element.fDistParams.clear();
            element.fDistParamNames.clear();
            for (int c = 0; c < nCategories; ++c) {
                element.fDistParams.push_back(stats.GetCatCount(c) / total);
                element.fDistParamNames.push_back(GetCategoryText(variable, c));
            }
            element.fInitParams = element.fDistParams;
            info.fDistBestType = kDistCategorical;
            info.fDistBestName = element.fDistName;
            info.fDistBestParams = element.fDistParams;
            info.fDistBestParamNames = element.fDistParamNames;
        } else {
            info.fDistBestType = kDistUnknown;
        }
        info.fBestFitStat = 0.0;
    }
    return MCStatus();
}

} // namespace MCMCSP_800
