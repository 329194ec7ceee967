#include "distribution_fitting/dfcsettings.h"

#include "component/mcspassert.h"
#include "mccommon/display.h"

#include <string>

namespace MCMCSP_800 {

namespace {

using namespace MCDisplay_800;

//! The twelve flag lines, level and correlations-only line of one field.
void DisplayVarInfo(const DFCSettings::VarInfoElem& info, const std::string& corrOnlyLabel) {
    for (int k = 0; k < kNFitDistTypes; ++k) {
        const auto type = static_cast<MCSPConst::DistType>(k);
        DisplayText(
            std::string(info.fbDistAllowed[static_cast<std::size_t>(k)] ? "true " : "false ") +
            " = " + GetDistTypeDisplayWord(type));
    }
    DisplayText("Measurement Level: = " + GetMeasureLevelDisplayWord(info.fMeasureLevel));
    DisplayB(corrOnlyLabel, info.fbCorrOnly);
}

void DisplayDefined(const std::string& what, bool defined) {
    DisplayText(what + (defined ? " is defined" : " is undefined"));
}

} // namespace

DFCSettings::VarInfoElem::VarInfoElem(const std::vector<MCSPConst::DistType>& dists,
                                      MCSPConst::MeasureLevel level, bool corrOnly)
    : fbCorrOnly(corrOnly), fMeasureLevel(level) {
    fbDistAllowed.fill(false);
    for (MCSPConst::DistType type : dists) {
        if (type >= 0 && type < kNFitDistTypes) {
            fbDistAllowed[static_cast<std::size_t>(type)] = true;
        }
    }
}

bool DFCSettings::VarInfoElem::IsDistAllowed(MCSPConst::DistType type) const {
    return type >= 0 && type < kNFitDistTypes && fbDistAllowed[static_cast<std::size_t>(type)];
}

DFCSettings::VarRole DFCSettings::GetVarRole(int varIndex) const {
    const auto it = fVarRoles.find(varIndex);
    return it == fVarRoles.end() ? kRoleFree : it->second;
}

int DFCSettings::AddFactor(int varIndex, int nLevels, const std::vector<MCSPConst::DistType>& dists,
                           MCSPConst::MeasureLevel level, bool corrOnly) {
    if (!MCSP_ASSERT(varIndex >= 0, "DFCSettings::AddFactor: varIndex >= 0") ||
        !MCSP_ASSERT(nLevels >= 1, "DFCSettings::AddFactor: nLevels >= 1") ||
        !MCSP_ASSERT(IsNewVar(varIndex), "DFCSettings::AddFactor: varIndex is new")) {
        return -1;
    }
    fVarRoles[varIndex] = kRoleFactor;
    fFactors.push_back(varIndex);
    fFactorSizes.push_back(nLevels);
    fFactorInfo.emplace_back(dists, level, corrOnly);
    return static_cast<int>(fFactors.size());
}

int DFCSettings::AddCovariate(int varIndex, const std::vector<MCSPConst::DistType>& dists,
                              MCSPConst::MeasureLevel level, bool corrOnly) {
    if (!MCSP_ASSERT(varIndex >= 0, "DFCSettings::AddCovariate: varIndex >= 0") ||
        !MCSP_ASSERT(IsNewVar(varIndex), "DFCSettings::AddCovariate: varIndex is new")) {
        return -1;
    }
    fVarRoles[varIndex] = kRoleCovariate;
    fCovariates.push_back(varIndex);
    fCovariateInfo.emplace_back(dists, level, corrOnly);
    return static_cast<int>(fCovariates.size());
}

bool DFCSettings::SetFactors(const std::vector<int>& indices) {
    for (int index : indices) {
        if (AddFactor(index, 1, {}, MCSPConst::kLevelUnknown, false) < 0) {
            return false;
        }
    }
    return true;
}

bool DFCSettings::SetFactorNCategs(const std::vector<int>& factorNCategs) {
    if (!MCSP_ASSERT(fFactors.size() == factorNCategs.size(),
                     "DFCSettings::SetFactorNCategs: fFactors.size() == factorNCategs.size()")) {
        return false;
    }
    for (int n : factorNCategs) {
        if (!MCSP_ASSERT(n >= 1, "DFCSettings::SetFactorNCategs: factorNCategs[ i ] >= 1")) {
            return false;
        }
    }
    fFactorSizes = factorNCategs;
    return true;
}

bool DFCSettings::SetFactorVarInfors(const std::vector<VarInfoElem>& infos) {
    if (!MCSP_ASSERT(fFactors.size() == infos.size(),
                     "DFCSettings::SetFactorNCategs: fFactors.size() == factorNCategs.size()")) {
        return false;
    }
    fFactorInfo = infos;
    return true;
}

bool DFCSettings::SetFrequencyWeightVar(int varIndex) {
    // The index is stored only once both checks pass: a rejected call must not turn a factor
    // or covariate into the weight of every record.
    if (!MCSP_ASSERT(varIndex >= 0, "varIndex >= 0 in DFCSettings::SetFrequencyWeightVar") ||
        !MCSP_ASSERT(IsNewVar(varIndex),
                     "Variable must be new in DFCSettings::SetFrequencyWeightVar")) {
        return false;
    }
    fFrequencyWeightVar = varIndex;
    fVarRoles[varIndex] = kRoleWeight;
    return true;
}

void DFCSettings::Display(std::ostream& os) const {
    ScopedOutStream redirect(os);
    DisplayFrame frame("Start of display DFCSettings object", "End of display DFCSettings object");
    {
        DisplayFrame factors("Start of display Factor Variable Information",
                             "End of display Factor Variable Information");
        for (std::size_t i = 0; i < fFactorInfo.size(); ++i) {
            DisplayI("Variable ", i < fFactors.size() ? fFactors[i] : -1);
            DisplayI("Number of Categorices ", i < fFactorSizes.size() ? fFactorSizes[i] : 0);
            DisplayVarInfo(fFactorInfo[i], "Correlations only: ");
        }
    }
    DisplayB("Crosstabs used for Categorical Distribution:", fbUseCrosstabs);
    DisplayB("Crosstabs exported for Categorical Distribution:", fbExportCrosstabs);
    {
        DisplayFrame covariates("Start of display Covariate Variable Information",
                                "End of display Covariate Variable Information");
        for (std::size_t i = 0; i < fCovariateInfo.size(); ++i) {
            DisplayI("Variable ", i < fCovariates.size() ? fCovariates[i] : -1);
            DisplayVarInfo(fCovariateInfo[i], "Correlation only: ");
        }
    }
    DisplayI("The number of cases in to use for distribution fitting:", fNCases);
    DisplayI("The max iterations use for distribution fitting:", fAutoFitMaxIterations);
    DisplayI("The number of bins use for distribution fitting:", fBins);
    DisplayText("The Type of Fit Test for scale variables = " + GetGoodFitTypeDisplayWord(fGFType));
    DisplayI("The maximum number of threads:", fMaxThreadNum);
    DisplayI("The memory cache limit in KB:", fMemCacheKB);
    DisplayDefined("Progress Listener", fpProgressListener != nullptr);
    DisplayDefined("Procedure Cancel", fpCancel != nullptr);
    DisplayDefined("Thread Factory", fpThreadFactory != nullptr);
    DisplayDefined("Thread Iterator Factory", fpThreadIterFactory != nullptr);
    DisplayB("Distribution Fitting used in Interactive Mode:", fbInteractiveMode);
}

} // namespace MCMCSP_800
