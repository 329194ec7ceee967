// Everything a distribution-fitting run produces: per factor and per covariate the candidate
// distributions with their parameters and goodness-of-fit statistics and the chosen best one,
// the covariates' correlation matrix, and the factors' contingency table.
//
// DFCAlgorithm owns one and fills it during BuildModel; the host reads it through
// DFCAlgorithm::GetOutputStats and hands it to SPCSettings::SetDFCOutput and to the writer of
// the fitting statistics document. It refers to the DFCSettings and MCVarList given at
// construction (the host's objects, not copies), which must outlive it.
#pragma once

#include "distribution_fitting/dfcsettings.h"
#include "mccommon/mcstatus.h"
#include "mccommon/variables.h"
#include "mcmath/mcsymmatrix.h"
#include "simulation_common/mcspconst.h"

#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

class DFCOutputStats {
public:
    //! One candidate distribution of one field: its parameters and test statistics. Every
    //! number that was not computed is the missing value.
    class DFCVarDistElement {
    public:
        //! Type `type` with its distribution name and parameter names, allowed as `allowed`
        //! says, no parameters, every statistic missing.
        DFCVarDistElement(MCSPConst::DistType type, bool allowed);

        MCSPConst::DistType fDistType;            //!< the distribution type
        std::string fDistName;                    //!< DistType2String of the type
        std::vector<double> fInitParams;          //!< start or moment estimate
        std::vector<double> fDistParams;          //!< final estimate, in parameter-name order
        std::vector<std::string> fDistParamNames; //!< parameter names (category texts for a
                                                  //!< factor's Categorical)
        bool fbDistAllowed;                       //!< still a candidate
        double fChiSquareFit;                     //!< chi-square statistic
        double fChiSquarePValue;                  //!< its p-value
        double fADFit;                            //!< Anderson-Darling A²
        double fADZStar;                          //!< modified A² (Z*)
        double fADPValue;                         //!< its p-value
        double fKSFit;                            //!< Kolmogorov-Smirnov D
        double fKSDStat;                          //!< modified D
        double fKSPValue;                         //!< its p-value

        //! Diagnostic listing through the display stream.
        void Display() const;
    };

    //! Everything about one fitted field.
    class DFCVarDistInfo {
    public:
        //! The field named `name` at the level of `info`, no best distribution, and the
        //! twelve candidate elements allowed as `info` says.
        DFCVarDistInfo(const std::string& name, const DFCSettings::VarInfoElem& info);

        std::string fFittedVarName;                       //!< the variable's name
        MCSPConst::MeasureLevel fMeasureLevel;            //!< the level from the settings
        std::vector<double> fCategoryCounts;              //!< weighted count per category
        MCSPConst::DistType fDistBestType;                //!< best distribution, 15 none
        MCSPConst::DistType fDistBestADType;              //!< best by Anderson-Darling, 15 none
        MCSPConst::DistType fDistBestKSType;              //!< best by Kolmogorov-Smirnov, 15 none
        std::string fDistBestName;                        //!< name of the best distribution
        std::vector<double> fDistBestParams;              //!< its parameters
        std::vector<std::string> fDistBestParamNames;     //!< their names
        double fBestFitStat;                              //!< its test statistic
        double fBestFitPValue;                            //!< its p-value
        std::vector<DFCVarDistElement> fDistElements;     //!< element k for DistType k, 0 to 11
        std::vector<DFCVarDistElement> fReportedElements; //!< elements that received a
                                                          //!< statistic, in report order

        //! Diagnostic listing through the display stream.
        void Display() const;
    };

    class DFCOutStatsImpl;

    //! One record per factor and per covariate, in settings order; no correlations, no table.
    DFCOutputStats(const DFCSettings& settings, const MCXML_800::MCVarList& variables);
    virtual ~DFCOutputStats();
    DFCOutputStats(const DFCOutputStats& other);
    DFCOutputStats& operator=(const DFCOutputStats& other);

    const DFCSettings& GetSettings() const;
    const MCXML_800::MCVarList& GetMCVarList() const;
    //! The goodness-of-fit type of the referenced settings.
    MCSPConst::GoodFitType GetGFType() const;
    //! Whether the referenced settings ask for the contingency table.
    bool GetUseCrosstabs() const;

    //! One record per covariate, in settings order.
    std::vector<DFCVarDistInfo>& GetCovarDistInfo();
    const std::vector<DFCVarDistInfo>& GetCovarDistInfo() const;
    //! One record per factor, in settings order.
    std::vector<DFCVarDistInfo>& GetFactorDistInfo();
    const std::vector<DFCVarDistInfo>& GetFactorDistInfo() const;
    //! Covariate correlations; diagonal 1.0, missing where a variance is zero.
    MCMath_800::MCSymMatrix& GetCorrMatrix();
    const MCMath_800::MCSymMatrix& GetCorrMatrix() const;
    //! One row per contingency-table cell: the factors' category texts in factor order.
    std::vector<std::vector<std::string>>& GetCrstabsMatrix();
    const std::vector<std::vector<std::string>>& GetCrstabsMatrix() const;
    //! One probability per cell: cell weight / W.
    std::vector<double>& GetCrstabsProbs();
    const std::vector<double>& GetCrstabsProbs() const;

    //! Warnings of the statistics computation; BuildModel passes each on to the run.
    const std::vector<MCCommon_800::MCStatus>& GetStatComputeWarnings() const;
    //! Adds one warning of the statistics computation.
    void AddStatComputeWarning(const MCCommon_800::MCStatus& status);
    //! Warnings of the results object.
    MCCommon_800::MCWarnings& GetWarnings();
    //! Success unless set; BuildModel treats an error here as the run's error.
    MCCommon_800::MCStatus GetStatus() const;
    void SetStatus(const MCCommon_800::MCStatus& status);

    //! Diagnostic listing through the display stream redirected to `os`.
    virtual void Display(std::ostream& os) const;

private:
    std::unique_ptr<DFCOutStatsImpl> fpImpl; //!< the results, owned
};

} // namespace MCMCSP_800
