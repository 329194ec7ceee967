#include "distribution_fitting/dfcoutputstats.h"

#include "mccommon/display.h"
#include "mccommon/mcmv.h"

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using namespace MCDisplay_800;

namespace {

//! The name of variable `varIndex`, "" when the list has no such variable.
std::string VarName(const MCXML_800::MCVarList& variables, int varIndex) {
    const MCXML_800::IMCVariable* var = variables.GetVarAt(varIndex);
    return var ? var->GetName() : std::string();
}

} // namespace

const char* DFCDropReasonText(DFCDropReason reason) {
    switch (reason) {
    case kDropNone:
        return "";
    case kDropSupport:
        return "a value lies outside the family's support";
    case kDropNoVariance:
        return "the field does not vary";
    case kDropNoEstimate:
        return "the estimate is not a finite number";
    case kDropFailedSearch:
        return "the maximum-likelihood search failed";
    case kDropUnderDispersion:
        return "variance not above the mean: no maximum-likelihood estimate (its limit is the "
               "Poisson)";
    case kDropOverDispersion:
        return "variance not below the mean";
    case kDropRangeOverflow:
        return "the range of the values overflows";
    case kDropNoCategoryCounts:
        return "no category counts (continuous field)";
    case kDropZeroProbability:
        return "an observed value has probability 0";
    case kDropNoDistributionFunction:
        return "the distribution function could not be evaluated";
    case kDropTooFewValues:
        return "too few values strictly inside the fitted support";
    case kDropNoPValue:
        return "no p-value (no degrees of freedom left)";
    case kDropBelowThreshold:
        return "p-value below the threshold";
    }
    return "";
}

// ------------------------------------------------------------------------------------------
// The implementation object: the referenced settings and variables and the results proper.

class DFCOutputStats::DFCOutStatsImpl {
public:
    DFCOutStatsImpl(const DFCSettings& settings, const MCXML_800::MCVarList& variables)
        : fpSettings(&settings), fpVariables(&variables) {
        const std::vector<int>& factors = settings.GetFactors();
        const std::vector<DFCSettings::VarInfoElem>& factorInfo = settings.GetFactorInfoElems();
        for (std::size_t i = 0; i < factorInfo.size(); ++i) {
            const int varIndex = i < factors.size() ? factors[i] : -1;
            fFactorInfo.emplace_back(VarName(variables, varIndex), factorInfo[i]);
        }
        const std::vector<int>& covariates = settings.GetCovariates();
        const std::vector<DFCSettings::VarInfoElem>& covInfo = settings.GetCovariateInfoElems();
        for (std::size_t i = 0; i < covInfo.size(); ++i) {
            const int varIndex = i < covariates.size() ? covariates[i] : -1;
            fCovariateInfo.emplace_back(VarName(variables, varIndex), covInfo[i]);
        }
    }
    virtual ~DFCOutStatsImpl() = default;
    DFCOutStatsImpl(const DFCOutStatsImpl&) = default;
    DFCOutStatsImpl& operator=(const DFCOutStatsImpl&) = default;

    virtual void Display() const {
        {
            DisplayFrame frame("Start of display distribution information for covariates",
                               "End of display distribution information for covariates");
            for (std::size_t i = 0; i < fCovariateInfo.size(); ++i) {
                DisplayI("Covariate Variable Index:", static_cast<long long>(i));
                fCovariateInfo[i].Display();
            }
        }
        DisplayFrame frame("Start of display distribution information for factors",
                           "End of display distribution information for factors");
        for (std::size_t i = 0; i < fFactorInfo.size(); ++i) {
            DisplayI("Factor Variable Index:", static_cast<long long>(i));
            fFactorInfo[i].Display();
        }
    }

    const DFCSettings* fpSettings;                        //!< the host's settings, not owned
    const MCXML_800::MCVarList* fpVariables;              //!< the host's variables, not owned
    std::vector<DFCVarDistInfo> fCovariateInfo;           //!< per covariate
    std::vector<DFCVarDistInfo> fFactorInfo;              //!< per factor
    MCMath_800::MCSymMatrix fCorrMatrix;                  //!< covariate correlations
    std::vector<std::vector<std::string>> fCrstabsMatrix; //!< category texts per cell
    std::vector<double> fCrstabsProbs;                    //!< probability per cell
    MCCommon_800::MCWarnings fWarnings;                   //!< warnings of the results
    std::vector<MCStatus> fStatComputeWarnings;           //!< warnings of the computation
    MCStatus fStatus;                                     //!< success unless set
};

// ------------------------------------------------------------------------------------------
// DFCVarDistElement

DFCOutputStats::DFCVarDistElement::DFCVarDistElement(MCSPConst::DistType type, bool allowed)
    : fDistType(type), fDistName(DistType2String(type)), fbDistAllowed(allowed),
      fChiSquareFit(MCMV::Missing()), fChiSquarePValue(MCMV::Missing()), fADFit(MCMV::Missing()),
      fADZStar(MCMV::Missing()), fADPValue(MCMV::Missing()), fKSFit(MCMV::Missing()),
      fKSDStat(MCMV::Missing()), fKSPValue(MCMV::Missing()), fADPValueLower(MCMV::Missing()),
      fADPValueUpper(MCMV::Missing()), fKSPValueLower(MCMV::Missing()),
      fKSPValueUpper(MCMV::Missing()), fEdfWeight(MCMV::Missing()),
      fChiSquarePooled(MCMV::Missing()), fChiSquarePooledDF(MCMV::Missing()),
      fChiSquarePooledPValue(MCMV::Missing()), fLogLikelihood(MCMV::Missing()),
      fNEstimatedParams(0), fAIC(MCMV::Missing()), fBIC(MCMV::Missing()), fAICc(MCMV::Missing()),
      fDropReason(kDropNone) {
    GetDistributionParameterNames(type, fDistParamNames);
}

void DFCOutputStats::DFCVarDistElement::Display() const {
    DisplayFrame frame("Start of display distribution element information",
                       "End of display distribution element information");
    DisplayI("Distribution Type:", fDistType);
    DisplayS("Distribution Name:", fDistName);
    DisplayDV("Initial Parameters:", fInitParams);
    DisplayDV("Distribution Parameters:", fDistParams);
    DisplaySV("Distribution Parameter Names:", fDistParamNames);
    DisplayB("Distribution allowed:", fbDistAllowed);
    DisplayD("Chi Square Fit", fChiSquareFit);
    DisplayD("Chi Square P Value", fChiSquarePValue);
    DisplayD("Anderson-Darling Fit", fADFit);
    DisplayD("Anderson-Darling Z Star", fADZStar);
    DisplayD("Anderson-Darling P Value", fADPValue);
    DisplayD("Kolmogorov-Smirnov Fit", fKSFit);
    DisplayD("Kolmogorov-Smirnov D Statistic", fKSDStat);
    DisplayD("Kolmogorov-Smirnov P Value", fKSPValue);
    DisplayD("Log-likelihood", fLogLikelihood);
    DisplayD("AIC", fAIC);
    DisplayD("BIC", fBIC);
    DisplayS("Drop reason:", DFCDropReasonText(fDropReason));
}

// ------------------------------------------------------------------------------------------
// DFCVarDistInfo

DFCOutputStats::DFCVarDistInfo::DFCVarDistInfo(const std::string& name,
                                               const DFCSettings::VarInfoElem& info)
    : fFittedVarName(name), fMeasureLevel(info.fMeasureLevel),
      fDistBestType(MCSPConst::kDistUnknown), fDistBestADType(MCSPConst::kDistUnknown),
      fDistBestKSType(MCSPConst::kDistUnknown), fBestFitStat(MCMV::Missing()),
      fBestFitPValue(MCMV::Missing()) {
    fDistElements.reserve(kNFitDistTypes);
    for (int k = 0; k < kNFitDistTypes; ++k) {
        const auto type = static_cast<MCSPConst::DistType>(k);
        fDistElements.emplace_back(type, info.IsDistAllowed(type));
    }
}

void DFCOutputStats::DFCVarDistInfo::Display() const {
    DisplayFrame frame("Start of display variable element information",
                       "End of display variable element information");
    DisplayS("Fitted Variable Name:", fFittedVarName);
    DisplayDV("Category counts:", fCategoryCounts);
    DisplayI("Best Distribution Type:", fDistBestType);
    DisplayI("Best AD Distribution Type:", fDistBestADType);
    DisplayI("Best KS Distribution Type:", fDistBestKSType);
    DisplayS("Best Distribution Name:", fDistBestName);
    DisplayDV("Best Distribution Parameters:", fDistBestParams);
    DisplaySV("Best Distribution Parameter Names:", fDistBestParamNames);
    DisplayD("Best Fit Statistics", fBestFitStat);
    DisplayD("Best Fit P Value", fBestFitPValue);
    DisplayFrame elements("Start of display information on all distribution elements",
                          "End of display information on all distribution elements");
    for (const DFCVarDistElement& element : fDistElements) {
        element.Display();
    }
}

// ------------------------------------------------------------------------------------------
// DFCOutputStats

DFCOutputStats::DFCOutputStats(const DFCSettings& settings, const MCXML_800::MCVarList& variables)
    : fpImpl(std::make_unique<DFCOutStatsImpl>(settings, variables)) {}

DFCOutputStats::~DFCOutputStats() = default;

DFCOutputStats::DFCOutputStats(const DFCOutputStats& other)
    : fpImpl(std::make_unique<DFCOutStatsImpl>(*other.fpImpl)) {}

DFCOutputStats& DFCOutputStats::operator=(const DFCOutputStats& other) {
    if (this != &other) {
        *fpImpl = *other.fpImpl;
    }
    return *this;
}

const DFCSettings& DFCOutputStats::GetSettings() const {
    return *fpImpl->fpSettings;
}
const MCXML_800::MCVarList& DFCOutputStats::GetMCVarList() const {
    return *fpImpl->fpVariables;
}
MCSPConst::GoodFitType DFCOutputStats::GetGFType() const {
    return fpImpl->fpSettings->GetGFType();
}
bool DFCOutputStats::GetUseCrosstabs() const {
    return fpImpl->fpSettings->GetUseCrosstabs();
}

std::vector<DFCOutputStats::DFCVarDistInfo>& DFCOutputStats::GetCovarDistInfo() {
    return fpImpl->fCovariateInfo;
}
const std::vector<DFCOutputStats::DFCVarDistInfo>& DFCOutputStats::GetCovarDistInfo() const {
    return fpImpl->fCovariateInfo;
}
std::vector<DFCOutputStats::DFCVarDistInfo>& DFCOutputStats::GetFactorDistInfo() {
    return fpImpl->fFactorInfo;
}
const std::vector<DFCOutputStats::DFCVarDistInfo>& DFCOutputStats::GetFactorDistInfo() const {
    return fpImpl->fFactorInfo;
}
MCMath_800::MCSymMatrix& DFCOutputStats::GetCorrMatrix() {
    return fpImpl->fCorrMatrix;
}
const MCMath_800::MCSymMatrix& DFCOutputStats::GetCorrMatrix() const {
    return fpImpl->fCorrMatrix;
}
std::vector<std::vector<std::string>>& DFCOutputStats::GetCrstabsMatrix() {
    return fpImpl->fCrstabsMatrix;
}
const std::vector<std::vector<std::string>>& DFCOutputStats::GetCrstabsMatrix() const {
    return fpImpl->fCrstabsMatrix;
}
std::vector<double>& DFCOutputStats::GetCrstabsProbs() {
    return fpImpl->fCrstabsProbs;
}
const std::vector<double>& DFCOutputStats::GetCrstabsProbs() const {
    return fpImpl->fCrstabsProbs;
}

const std::vector<MCStatus>& DFCOutputStats::GetStatComputeWarnings() const {
    return fpImpl->fStatComputeWarnings;
}
void DFCOutputStats::AddStatComputeWarning(const MCStatus& status) {
    fpImpl->fStatComputeWarnings.push_back(status);
}
MCCommon_800::MCWarnings& DFCOutputStats::GetWarnings() {
    return fpImpl->fWarnings;
}
MCStatus DFCOutputStats::GetStatus() const {
    return fpImpl->fStatus;
}
void DFCOutputStats::SetStatus(const MCStatus& status) {
    fpImpl->fStatus = status;
}

void DFCOutputStats::Display(std::ostream& os) const {
    ScopedOutStream redirect(os);
    DisplayFrame frame("DFCOutputStats display start", "DFCOutputStats display end");
    fpImpl->Display();
}

} // namespace MCMCSP_800
