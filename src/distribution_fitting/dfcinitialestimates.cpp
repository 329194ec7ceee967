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

// Method-of-moments estimates, each the solution of "model moments = sample moments", are the
// family table's (mcspdistfamily.cpp, one per family with its derivation).
bool ComputeMomentEstimate(DistType type, const DFCMomentInputs& in, bool threeParamWeibull,
                           std::vector<double>& params) {
    params.clear();
    const MCSPDistFamily* family = MCSPFindDistFamily(type);
    std::vector<double> p;
    if (family == nullptr || !family->fMomentEstimate(in, threeParamWeibull, p)) {
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
                element.fDropReason = kDropNoVariance;
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
                DropCovarDist(i, type, moments.fVariance > 0.0 ? kDropNoEstimate : kDropNoVariance);
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
