// The settings of one distribution-fitting run (plan creation): which fields of the host's
// dataset are fitted and in which role, the candidate distributions of each field, the
// goodness-of-fit test, the case, bin, iteration and thread limits, and the host's callbacks.
//
// The host fills a DFCSettings through its setters and hands it to the DFCAlgorithm
// constructor, which keeps a private copy; DFCOutputStats refers to the very object the host
// passed, so the host keeps it alive while it reads the results. A field is a factor (a
// categorical field, counted by category), a covariate (a numeric field) or the frequency
// weight; it is named by its index in the host's MCVarList. DFCSettings is a value: copies
// copy everything, the host's pointers as pointers.
#pragma once

#include "mccommon/hostinterfaces.h"
#include "mccommon/mcstatus.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspconst.h"

#include <array>
#include <cstdint>
#include <map>
#include <ostream>
#include <vector>

namespace MCMCSP_800 {

//! Number of distribution types that can be fitting candidates: DistType 0 (Binomial) to 11
//! (Exponential). Bernoulli, Empirical and UserRanges are never candidates.
inline constexpr int kNFitDistTypes = 12;

class DFCSettings {
public:
    //! What the host says about one factor or covariate.
    struct VarInfoElem {
        //! Flag k is true when DistType k (0 to 11) is a candidate for the field. A default
        //! element allows all twelve; AddFactor and AddCovariate allow exactly the listed ones.
        std::array<bool, kNFitDistTypes> fbDistAllowed;
        //! The field only takes part in the correlations (or the contingency table); no
        //! distribution is fitted to it.
        bool fbCorrOnly = false;
        //! The level the host declared for the field.
        MCSPConst::MeasureLevel fMeasureLevel = MCSPConst::kLevelUnknown;

        VarInfoElem() { fbDistAllowed.fill(true); }
        //! Exactly the types of `dists` allowed (types outside 0 to 11 are ignored).
        VarInfoElem(const std::vector<MCSPConst::DistType>& dists, MCSPConst::MeasureLevel level,
                    bool corrOnly);

        //! True when `type` lies in 0 to 11 and is allowed.
        bool IsDistAllowed(MCSPConst::DistType type) const;
    };

    //! Role codes of the variable-role table.
    enum VarRole : std::int32_t {
        kRoleFree = 0,
        kRoleWeight = 1,
        kRoleFactor = 2,
        kRoleCovariate = 3
    };

    //! No fields; 100 iterations, 100 bins, one thread, 1048576 KB cache, Anderson-Darling.
    DFCSettings() = default;

    // Scalar settings.

    int GetNCases() const { return fNCases; }
    //! Case limit of every data pass; below 1 means all records. A negative value is stored
    //! as 0.
    void SetNCases(int nCases) { fNCases = nCases < 0 ? 0 : nCases; }
    MCSPConst::GoodFitType GetGFType() const { return fGFType; }
    void SetGFType(MCSPConst::GoodFitType type) { fGFType = type; }
    int GetAutoFitMaxIterations() const { return fAutoFitMaxIterations; }
    void SetAutoFitMaxIterations(int maxIterations) { fAutoFitMaxIterations = maxIterations; }
    int GetBins() const { return fBins; }
    void SetBins(int bins) { fBins = bins; }
    bool GetUseCrosstabs() const { return fbUseCrosstabs; }
    void SetUseCrosstabs(bool use) { fbUseCrosstabs = use; }
    bool GetExportCrosstabs() const { return fbExportCrosstabs; }
    void SetExportCrosstabs(bool exportTabs) { fbExportCrosstabs = exportTabs; }
    int GetMaxThreadNum() const { return fMaxThreadNum; }
    void SetMaxThreadNum(int maxThreads) { fMaxThreadNum = maxThreads; }
    int GetMemCacheKB() const { return fMemCacheKB; }
    void SetMemCacheKB(int memCacheKB) { fMemCacheKB = memCacheKB; }
    bool GetInteractiveMode() const { return fbInteractiveMode; }
    void SetInteractiveMode(bool interactive) { fbInteractiveMode = interactive; }

    // Fields.

    //! Registers variable `varIndex` as a factor with `nLevels` categories, the candidate
    //! distributions `dists`, its level and correlations-only flag. Returns the new number of
    //! factors, or -1 (nothing changed) when varIndex < 0, nLevels < 1 or the variable already
    //! has a role.
    int AddFactor(int varIndex, int nLevels, const std::vector<MCSPConst::DistType>& dists,
                  MCSPConst::MeasureLevel level, bool corrOnly);
    //! Registers variable `varIndex` as a covariate. Returns the new number of covariates, or
    //! -1 (nothing changed) when varIndex < 0 or the variable already has a role.
    int AddCovariate(int varIndex, const std::vector<MCSPConst::DistType>& dists,
                     MCSPConst::MeasureLevel level, bool corrOnly);
    //! AddFactor(index, 1, no distribution, level 0, false) for each index in order; stops
    //! with false at the first rejection (the indices before it stay added).
    bool SetFactors(const std::vector<int>& indices);
    //! Replaces the factor sizes; false (nothing changed) when the length differs from the
    //! number of factors or an entry is below 1.
    bool SetFactorNCategs(const std::vector<int>& factorNCategs);
    //! Replaces the factor information; false (nothing changed) when the length differs from
    //! the number of factors.
    bool SetFactorVarInfors(const std::vector<VarInfoElem>& infos);
    //! Makes variable `varIndex` the frequency weight. False (nothing changed) when
    //! varIndex < 0 or the variable already has a role. A variable once made the weight keeps
    //! that role when another weight is set later.
    bool SetFrequencyWeightVar(int varIndex);

    const std::vector<int>& GetFactors() const { return fFactors; }
    const std::vector<int>& GetFactorSizes() const { return fFactorSizes; }
    const std::vector<VarInfoElem>& GetFactorInfoElems() const { return fFactorInfo; }
    const std::vector<int>& GetCovariates() const { return fCovariates; }
    const std::vector<VarInfoElem>& GetCovariateInfoElems() const { return fCovariateInfo; }
    //! The frequency weight variable, -1 when none.
    int GetFrequencyWeightVar() const { return fFrequencyWeightVar; }
    //! The role of variable `varIndex` (kRoleFree for a variable never registered).
    VarRole GetVarRole(int varIndex) const;
    //! Number of factors plus number of covariates.
    int GetNVars() const { return static_cast<int>(fFactorInfo.size() + fCovariateInfo.size()); }

    // Host callbacks (borrowed, never owned).

    MCCommon_800::ProgressListener* GetProgressListener() const { return fpProgressListener; }
    void SetProgressListener(MCCommon_800::ProgressListener* p) { fpProgressListener = p; }
    MCCommon_800::MCQueryCancel* GetCancelPointer() const { return fpCancel; }
    void SetCancelPointer(MCCommon_800::MCQueryCancel* p) { fpCancel = p; }
    MCThread_800::IMCThreadFactory* GetThreadFactory() const { return fpThreadFactory; }
    void SetThreadFactory(MCThread_800::IMCThreadFactory* p) { fpThreadFactory = p; }
    MCThread_800::MCThreadIterFactory* GetThreadIterFactory() const { return fpThreadIterFactory; }
    void SetThreadIterFactory(MCThread_800::MCThreadIterFactory* p) { fpThreadIterFactory = p; }

    //! Warnings that the host attached to the settings; the fitting passes them on.
    MCCommon_800::MCWarnings& GetWarningMessages() { return fWarningMessages; }
    const MCCommon_800::MCWarnings& GetWarningMessages() const { return fWarningMessages; }

    // Checks run at the start of model building: both answer success today. A warning result
    // is passed on as a warning, an error ends the build, so stricter checks fit in here
    // without touching the caller.

    MCCommon_800::MCStatus IsValidSettings() const { return MCCommon_800::MCStatus(); }
    MCCommon_800::MCStatus DoubleCheckSettings() const { return MCCommon_800::MCStatus(); }

    //! Diagnostic listing of every setting through the display stream redirected to `os`.
    void Display(std::ostream& os) const;

private:
    //! True when `varIndex` has no role yet.
    bool IsNewVar(int varIndex) const { return GetVarRole(varIndex) == kRoleFree; }

    int fNCases = 0;                                              //!< case limit, 0 = all
    MCSPConst::GoodFitType fGFType = MCSPConst::kAndersonDarling; //!< test for scale fields
    int fAutoFitMaxIterations = 100;                              //!< optimiser iterations
    int fBins = 100;                                              //!< histogram and chi-square bins
    std::vector<VarInfoElem> fFactorInfo;                         //!< per factor
    bool fbUseCrosstabs = false;             //!< build the factors' joint table
    bool fbExportCrosstabs = false;          //!< write it to the statistics document
    std::vector<VarInfoElem> fCovariateInfo; //!< per covariate
    std::vector<int> fFactors;               //!< factor variable indices
    std::vector<int> fFactorSizes;           //!< categories per factor
    std::vector<int> fCovariates;            //!< covariate variable indices
    int fFrequencyWeightVar = -1;            //!< weight variable, -1 none
    //! Role of each registered variable index; absent indices are free. Kept sparse so that a
    //! large index costs no memory.
    std::map<int, VarRole> fVarRoles;
    MCCommon_800::ProgressListener* fpProgressListener = nullptr;     //!< host's listener
    MCCommon_800::MCQueryCancel* fpCancel = nullptr;                  //!< host's cancel query
    int fMaxThreadNum = 1;                                            //!< worker threads at most
    int fMemCacheKB = 1048576;                                        //!< memory cache limit
    MCThread_800::IMCThreadFactory* fpThreadFactory = nullptr;        //!< host's thread factory
    MCThread_800::MCThreadIterFactory* fpThreadIterFactory = nullptr; //!< host's iterator factory
    bool fbInteractiveMode = false;                                   //!< compute AD and KS both
    MCCommon_800::MCWarnings fWarningMessages;                        //!< host's warnings
};

} // namespace MCMCSP_800
