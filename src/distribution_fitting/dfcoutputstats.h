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

//! Why a candidate distribution is no longer a candidate. kDropNone while it is one, and for a
//! family the settings never allowed.
enum DFCDropReason {
    kDropNone = 0,               //!< still a candidate
    kDropSupport,                //!< a value lies outside the family's support
    kDropNoVariance,             //!< the field is constant or has too little weight to vary
    kDropNoEstimate,             //!< the estimate is not a finite number
    kDropFailedSearch,           //!< the maximum-likelihood search failed
    kDropUnderDispersion,        //!< NegBin: variance not above the mean, no ML estimate
    kDropOverDispersion,         //!< Binomial: variance not below the mean
    kDropRangeOverflow,          //!< maximum - minimum overflows
    kDropNoCategoryCounts,       //!< NegBin of a continuous field: no counts to fit
    kDropZeroProbability,        //!< an observed value has probability 0 under the fit
    kDropNoDistributionFunction, //!< F(x) could not be evaluated at a value
    kDropTooFewValues,           //!< fewer than two values strictly inside the fitted support
    kDropNoPValue,               //!< no p-value (no degrees of freedom left)
    kDropBelowThreshold          //!< p-value below the settings' threshold
};

//! A short English text of `reason` ("" for kDropNone).
const char* DFCDropReasonText(DFCDropReason reason);

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
        // Added results. A p-value read from a table of critical values is only known to lie
        // between two of its levels (or beyond the first or last): its ends are given below,
        // either missing when unbounded; both missing when the p-value comes from a formula.
        double fADPValueLower;         //!< lower end of the A² p-value's table interval
        double fADPValueUpper;         //!< upper end of the A² p-value's table interval
        double fKSPValueLower;         //!< lower end of the D p-value's table interval
        double fKSPValueUpper;         //!< upper end of the D p-value's table interval
        double fEdfWeight;             //!< weight of the values strictly inside the fitted
                                       //!< support, over which A² and D were computed
        double fChiSquarePooled;       //!< chi-square over bins pooled to expected counts ≥ 5
        double fChiSquarePooledDF;     //!< its degrees of freedom
        double fChiSquarePooledPValue; //!< its p-value
        double fLogLikelihood;         //!< Σ w·ln f(x) at the estimate
        int fNEstimatedParams;         //!< k, parameters estimated from the data
        double fAIC;                   //!< 2k - 2·ln L
        double fBIC;                   //!< k·ln W - 2·ln L
        double fAICc;                  //!< AIC + 2k(k + 1)/(W - k - 1); missing when W ≤ k + 1
        std::string fLogLikReason;     //!< why ln L (and AIC, BIC, AICc) is missing, or ""
        DFCDropReason fDropReason;     //!< why the candidate was dropped, kDropNone if it was not
        // Standard errors from the observed information at the estimate (dfcfitdiagnostics.h):
        // one per entry of fDistParams, missing for a parameter the fitting does not estimate
        // by maximum likelihood at an interior point; fStdErrorReason says why any is missing.
        std::vector<double> fvStdErrors;         //!< SE of each parameter, or empty
        std::vector<double> fvParamCorrelations; //!< their correlations, row-major, or empty
        std::string fStdErrorReason;             //!< why an SE is missing, or ""
        // Q-Q and P-P points at the plotting positions p_i = i/100, i = 1 .. 99 (empty when the
        // candidate was not evaluated).
        std::vector<double> fvPlotSampleQuantiles; //!< x_i, the sample's p_i quantile
        std::vector<double> fvPlotSampleProbs;     //!< F_n(x_i), the sample's EDF at x_i
        std::vector<double> fvPlotFittedQuantiles; //!< F⁻¹(p_i) of the fitted distribution
        std::vector<double> fvPlotFittedProbs;     //!< F(x_i) of the fitted distribution

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
