// SECOutputStats: the results of one sensitivity iteration of a simulation.
//
// Each SECSimulator owns one and fills it, through the modifiable getters and the setters, when
// it completes its statistics; SECAlgorithm::GetOutputStats hands it to the host. It carries
// the case counts, the statistics and chart data of every target (SECContinuousTargetInfo,
// SECCategoricalTargetInfo), the names the host labels its tables with, the model type, whether
// a stop criterion ended the run, and the addresses of the run settings, the plan and the
// variable list, from which the host reads its display options.
//
// Ownership. The settings, the plan, the variable list and the means-and-cross-products
// accumulator (SetProvMeansPtr) are borrowed: the simulator that owns the results also owns
// (or holds copies of) all four and outlives its results, and a copy of the results points at
// the same objects. Everything else, the chart accumulators of the targets included, is held
// by value, so copies are deep and independent. The state lives in an implementation object
// (SECOutputStatsImpl) that the results create, copy and destroy with themselves.
#pragma once

#include "mccommon/mcmv.h"
#include "mccommon/mcstatus.h"
#include "mccommon/scoring.h"
#include "mcmath/mcaccumulators.h"
#include "mcmath/mcsymmatrix.h"
#include "simulation_common/mcsphistogramdata.h"
#include "simulation_common/mcspscatterplotdata.h"
#include "simulation_evaluation/secquantiles.h"

#include <cstdint>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace MCXML_800 {
class MCVarList;
} // namespace MCXML_800

namespace MCMCSP_800 {

class SECSettings;
class SPCSettings;
class SECOutputStatsImpl;

//! Results for one continuous target. Numbers not yet computed are missing; the per-covariate
//! vectors run in covariate order (SECOutputStats::GetCovariateNames).
struct SECContinuousTargetInfo {
    std::string fName;                                         //!< target name
    double fMinimum = MCCommon_800::MCMV::Missing();           //!< smallest valid value
    double fMaximum = MCCommon_800::MCMV::Missing();           //!< largest valid value
    double fMean = MCCommon_800::MCMV::Missing();              //!< mean of the valid values
    double fStdDev = MCCommon_800::MCMV::Missing();            //!< standard deviation, √variance
    double fCiLower = MCCommon_800::MCMV::Missing();           //!< lower end of the mean's CI
    double fCiUpper = MCCommon_800::MCMV::Missing();           //!< upper end of the mean's CI
    MCMath_800::MCContStats fContStats;                        //!< the target's values
    MCHistogramData fHistogram;                                //!< chart of the target's values
    std::vector<MCScatterPlotData> fvScatterPlots;             //!< against each input for output
    std::vector<double> fvPearsonCorrs;                        //!< with each covariate
    std::vector<double> fvPolyserialCorrs;                     //!< polyserial correlations
    std::vector<double> fvPolychoricCorrs;                     //!< polychoric correlations
    std::vector<double> fvPositiveDelta;                       //!< mean change, input + δ
    std::vector<MCMath_800::MCContStats> fvPositiveDeltaStats; //!< changes behind it
    std::vector<double> fvNegativeDelta;                       //!< mean change, input − δ
    std::vector<MCMath_800::MCContStats> fvNegativeDeltaStats; //!< changes behind it
    std::vector<double> fvVarianceContrib;                     //!< share of the variance
    std::vector<MCMath_800::MCContStats> fvVarianceContribStats; //!< products behind it
    //! Per covariate: accepted cases whose shifted re-scoring (delta measure, either side) or
    //! whose replaced-input re-scoring (variance measure) could not be evaluated and was left
    //! out of the measure: a shifted input outside its natural range, a failed or missing
    //! score, no further case. The evaluations used are the counts of the statistics above.
    std::vector<std::int64_t> fvDeltaSkipped;
    std::vector<std::int64_t> fvVarianceSkipped; //!< the same for the variance measure
    //! The valid values' percentiles (SECSettings::QuantilesAndIndices; empty otherwise).
    SECQuantileSummary fQuantiles;
    //! First-order sensitivity index S1 = Var(E[target | input]) / Var(target) of each
    //! simulated input, in predictor order (SECOutputStats::GetPredictorNames), from the
    //! run's cases (SECSettings::QuantilesAndIndices; empty otherwise, missing where it cannot
    //! be estimated, and in the host-driven way, which knows no normal scores).
    std::vector<double> fvFirstOrder;

    //! Diagnostic print through the display stream.
    void Display() const;
};

//! Results for one categorical target. The per-category vectors run in category order.
struct SECCategoricalTargetInfo {
    std::string fName;                                //!< target name
    std::vector<double> fvCategoryValues;             //!< category values
    std::vector<double> fvMeanProbs;                  //!< mean probability per category
    std::vector<double> fvCatCounts;                  //!< valid cases per category
    MCMath_800::MCCatStats fCatStats;                 //!< the predicted categories
    std::vector<MCMath_800::MCContStats> fvProbStats; //!< one per category probability
    std::vector<MCHistogramData> fvProbHistograms;    //!< one per category probability
    std::vector<MCScatterPlotData> fvScatterPlots;    //!< against each input for output
    std::vector<double> fvPearsonCorrs;               //!< with each covariate
    std::vector<double> fvPolyserialCorrs;            //!< polyserial correlations
    std::vector<double> fvPolychoricCorrs;            //!< polychoric correlations
    std::vector<double> fvClusterCounts;              //!< case counts for clusters

    //! Diagnostic print through the display stream.
    void Display() const;
};

//! One pair of correlated inputs (a non-zero target in the plan): what the plan asks, what the
//! correlation model could give, and what the cases show. Numbers not known are missing.
struct SECInputCorrelationPair {
    std::string fFirst;                                     //!< input
    std::string fSecond;                                    //!< input
    double fTarget = MCCommon_800::MCMV::Missing();         //!< the plan's correlation ρ
    double fNormalCorr = MCCommon_800::MCMV::Missing();     //!< the normal-scale value used
    double fAttainableLow = MCCommon_800::MCMV::Missing();  //!< g(−1), the lowest attainable
    double fAttainableHigh = MCCommon_800::MCMV::Missing(); //!< g(+1), the highest attainable
    double fSimulated = MCCommon_800::MCMV::Missing();      //!< correlation of the valid cases
    bool fbUnreachable = false; //!< ρ lies outside [fAttainableLow, fAttainableHigh]
};

class SECOutputStats {
public:
    using PMMLModelType = MCXML_800::IMCScoreComputer::PMMLModelType;

    //! Keeps the three addresses; every other member takes its default (no cases, stopped by
    //! criteria true, model type 17 "Other", success status).
    SECOutputStats(const SECSettings& settings, const SPCSettings& plan,
                   const MCXML_800::MCVarList& variables);
    //! Deep copy of the results; the borrowed objects are shared.
    SECOutputStats(const SECOutputStats& other);
    SECOutputStats& operator=(const SECOutputStats& other);
    virtual ~SECOutputStats();

    // ---- Borrowed objects ---------------------------------------------------------------

    //! The run settings the results were made under; never null.
    const SECSettings* GetSECSettings() const;
    //! The plan that was simulated; never null.
    const SPCSettings* GetSPCSettings() const;
    //! The host's variable list; never null.
    const MCXML_800::MCVarList* GetMCVarList() const;
    //! Means and cross products over the correlated inputs followed by the targets; null until
    //! the simulator hands its accumulator over. Not owned.
    const MCMath_800::MCProvMeans* GetProvMeansPtr() const;
    void SetProvMeansPtr(const MCMath_800::MCProvMeans* provMeans);

    // ---- Case counts ---------------------------------------------------------------------

    //! Cases drawn, valid or not.
    int GetSimCaseCount() const;
    void SetSimCaseCount(int n);
    //! Attempts rejected by the truncation bounds and target filters.
    int GetFilteredCaseCount() const;
    void SetFilteredCaseCount(int n);
    //! Cases scored and accumulated.
    int GetValidCaseCount() const;
    void SetValidCaseCount(int n);
    //! Cases that failed.
    int GetInvalidCaseCount() const;
    void SetInvalidCaseCount(int n);
    //! True when a stop criterion ended the run.
    bool GetStopCriteria() const;
    void SetStopCriteria(bool stopped);
    //! Worker threads the run of this iteration really used: one, whatever the settings allow,
    //! for a stop criterion, a sink without a lock, or categorical targets of a score without a
    //! predicted field; 0 until the run has set it.
    int GetThreadsUsed() const;
    void SetThreadsUsed(int n);

    // ---- Targets -------------------------------------------------------------------------

    //! One entry per continuous target, in target order.
    const std::vector<SECContinuousTargetInfo>& GetContTargetInfo() const;
    std::vector<SECContinuousTargetInfo>& GetContTargetInfo();
    //! One entry per categorical target, in target order.
    const std::vector<SECCategoricalTargetInfo>& GetCateTargetInfo() const;
    std::vector<SECCategoricalTargetInfo>& GetCateTargetInfo();

    // ---- Inputs --------------------------------------------------------------------------

    //! Names of the simulated inputs of the correlated set (the non-categorical ones).
    const std::vector<std::string>& GetCovariateNames() const;
    void SetCovariateNames(const std::vector<std::string>& names);
    //! Names of the categorical simulated inputs.
    const std::vector<std::string>& GetFactorNames() const;
    void SetFactorNames(const std::vector<std::string>& names);
    //! Names of all simulated inputs.
    const std::vector<std::string>& GetPredictorNames() const;
    void SetPredictorNames(const std::vector<std::string>& names);
    //! Name of the input that varies over the sensitivity iterations; empty when none.
    const std::string& GetSensIteraName() const;
    void SetSensIteraName(const std::string& name);
    //! Statistics of each covariate, in covariate order.
    const std::vector<MCMath_800::MCContStats>& GetCovarStats() const;
    std::vector<MCMath_800::MCContStats>& GetCovarStats();
    //! Simulated correlations among the covariates.
    const MCMath_800::MCSymMatrix& GetSimulCorr() const;
    MCMath_800::MCSymMatrix& GetSimulCorr();
    //! The pairs of the correlation model with a non-zero target, in pair order.
    const std::vector<SECInputCorrelationPair>& GetInputCorrelationPairs() const;
    std::vector<SECInputCorrelationPair>& GetInputCorrelationPairs();
    //! Share of the valid cases in each contingency cell; empty without a contingency table.
    const std::vector<double>& GetCrstSimProbs() const;
    std::vector<double>& GetCrstSimProbs();

    // ---- Model and status ----------------------------------------------------------------

    PMMLModelType GetModelType() const;
    void SetModelType(PMMLModelType type);
    const std::vector<MCCommon_800::MCStatus>& GetStatComputeWarnings() const;
    MCCommon_800::MCStatus GetStatus() const;

    //! Diagnostic listing to `os`, between "SECOutputStats display start" and "SECOutputStats
    //! display end".
    virtual void Display(std::ostream& os) const;

private:
    std::unique_ptr<SECOutputStatsImpl> fpImpl; //!< the state; never null
};

} // namespace MCMCSP_800
