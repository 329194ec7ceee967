// The distribution-fitting algorithm of plan creation. The host constructs it from a
// DFCSettings and its MCVarList, calls BuildModel with a multi-pass iterator over the active
// dataset, and reads the results through GetOutputStats.
//
// BuildModel runs, in order: the settings checks; two descriptive passes over the records
// (counts, moments, extremes, log sums, category counts, histograms, correlations and the
// factors' contingency table); the moment or start estimates of every candidate distribution
// and the factors' categorical distributions; then OptimizeDistParams (maximum likelihood),
// ComputeChiSquare (discrete covariates), a restart of the records and PerformFitGoodness
// (EDF tests and best fits of continuous covariates). Both descriptive passes stream: memory
// depends on the numbers of fields, categories, bins and contingency cells, not on the number
// of records; the EDF pass stores each continuous covariate's values for sorting.
#pragma once

#include "component/mcspcomponent.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "distribution_fitting/dfcsettings.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/records.h"
#include "mcmath/mcaccumulators.h"
#include "mcmath/mcfactortables.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspdistfamily.h"

#include <cstdint>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

//! The histogram of one continuous covariate.
class DFCHistogramData : public MCMath_800::MCHistogramData {
public:
    using MCMath_800::MCHistogramData::MCHistogramData;
    ~DFCHistogramData() override = default;
};

//! The switches of the environment variable SIMULATE_DEBUG_OPTIMIZER.
struct DFCDebugOptimizerSwitches {
    //! Value "1" or "2": the optimiser also runs on tasks that carry training data.
    bool fbDebugOptimizer = false;
    //! Value "1": the Weibull start location is the minimum less 1e-5 instead of 0, and the
    //! Weibull start values are kept in the algorithm's Weibull list.
    bool fbThreeParamWeibull = false;
};

//! The switches for a value of SIMULATE_DEBUG_OPTIMIZER (null: the variable is not set). Only
//! the exact texts "1" and "2" turn anything on.
DFCDebugOptimizerSwitches ParseDebugOptimizerValue(const char* value);
//! The switches read from the environment once, when the library was loaded.
const DFCDebugOptimizerSwitches& GetDebugOptimizerSwitches();

//! The descriptive statistics of one covariate from which its moment and start estimates
//! follow. Every entry that was not computed is missing.
using DFCMomentInputs = MCSPSampleMoments;

//! The moment or start estimate of distribution `type` (0 to 11 except Categorical) from the
//! statistics `in`, in parameter-name order, into `params`. False, with `params` empty, when
//! the statistics admit no estimate: Gamma or Beta with v ≤ 0, a result that is not a finite
//! number, or a type without an estimate. `threeParamWeibull` puts the Weibull location just
//! below the minimum.
bool ComputeMomentEstimate(MCSPConst::DistType type, const DFCMomentInputs& in,
                           bool threeParamWeibull, std::vector<double>& params);

//! One value of a covariate kept for the EDF tests: the value and the ordinal of its valid
//! record.
struct DFCGoodFitEntry {
    double fValue;        //!< the covariate's value
    std::int32_t fRecord; //!< ordinal of the valid record, from 0
};

class DFCAlgorithm : public MCAlgorithmCommon<DFCAlgorithm> {
public:
    //! Copies `settings` and borrows `variables`; the results refer to both host objects,
    //! which must outlive the algorithm. Reads no data.
    DFCAlgorithm(const DFCSettings& settings, const MCXML_800::MCVarList& variables);
    ~DFCAlgorithm() override;
    DFCAlgorithm(const DFCAlgorithm&) = delete;
    DFCAlgorithm& operator=(const DFCAlgorithm&) = delete;

    //! Runs the whole fit over `trainData` (the second iterator is not used). A built model
    //! is not built again: its status is returned. After a failed build the object is spent:
    //! the failure is returned again.
    MCStatus BuildModel(MCCommon_800::MultiPassRecordIter& trainData,
                        MCCommon_800::MultiPassRecordIter* unused) override;
    //! The results once the model is built (owned by the algorithm); otherwise null and
    //! 390002. The status is also stored.
    virtual MCStatus GetOutputStats(DFCOutputStats*& out);
    //! 6 when the model is not built, 390003 when `os` is not good, else success; writes
    //! nothing.
    MCStatus ExportStatXML(std::ostream& os) const { return CheckExport(os); }

    MCWarnings& GetWarningMessages() { return fWarnings; }
    void ClearWarnings() { fWarnings.ClearWarnings(); }

    // Single records of the results. The index must be a valid covariate or factor position
    // and the type lie in 0 to 11.

    DFCOutputStats::DFCVarDistInfo& GetOutCovarVarInfo(int covariate);
    DFCOutputStats::DFCVarDistElement& GetOutCovarDistInfo(int covariate, MCSPConst::DistType type);
    DFCOutputStats::DFCVarDistInfo& GetOutFactorVarInfo(int factor);
    DFCOutputStats::DFCVarDistElement& GetOutFactorDistInfo(int factor, MCSPConst::DistType type);

    // What the descriptive passes counted (records within the case limit).

    std::int64_t GetNRecords() const { return fNRecords; }
    std::int64_t GetNValidRecords() const { return fNValid; }
    std::int64_t GetNInvalidRecords() const { return fNInvalid; }
    double GetTotalWeight() const { return fTotalWeight; }
    //! W, the weight of the valid records.
    double GetValidWeight() const { return fValidWeight; }
    double GetInvalidWeight() const { return fInvalidWeight; }
    //! The descriptive statistics of covariate `covariate` (a valid position).
    DFCMomentInputs GetCovariateMoments(int covariate) const;
    //! The category counts of covariate `covariate` (a valid position); null for a
    //! continuous covariate.
    const MCMath_800::MCCatStats* GetCovariateCatStats(int covariate) const {
        return fvpCatStatsCovars[static_cast<std::size_t>(covariate)].get();
    }
    //! The histogram of covariate `covariate` (a valid position); null unless it is
    //! continuous and not constant.
    const DFCHistogramData* GetCovariateHistogram(int covariate) const {
        return fvpHistograms[static_cast<std::size_t>(covariate)].get();
    }

    //! "DFCAlgorithm display start", the variable list, "DFCAlgorithm display end", through the
    //! display stream redirected to `os`.
    void Display(std::ostream& os) const override;

private:
    friend class MCAlgorithmCommon<DFCAlgorithm>;

    //! Hands a host pointer to the settings copy (called by the shared setters).
    void StoreProgressListener(MCCommon_800::ProgressListener* p) {
        fSettings.SetProgressListener(p);
    }
    void StoreCancelPointer(MCCommon_800::MCQueryCancel* p) { fSettings.SetCancelPointer(p); }

    //! The steps of BuildModel from the settings checks to the goodness of fit.
    MCStatus RunBuildSteps(MCCommon_800::MultiPassRecordIter& trainData);
    //! Reads one record into the buffers; true when it is valid. With `update` the counts,
    //! extremes, support checks and log sums of the first pass are updated.
    bool GetRecordValues(const MCXML_800::Record& record, bool update);
    //! Support checks, extremes and log sums of one valid record (first pass).
    void UpdateCovariateChecks();
    //! Clears the element of (covariate, type), records `reason` in it and adds warning 390004.
    void DropCovarDist(int covariate, MCSPConst::DistType type, DFCDropReason reason);
    //! The two descriptive passes.
    MCStatus ComputeBasicStats(MCCommon_800::MultiPassRecordIter& trainData);
    //! One pass over at most the case limit of records; `onValid` runs for each valid one.
    template <class OnValid>
    MCStatus RunPass(MCCommon_800::MultiPassRecordIter& trainData, bool update, OnValid onValid);
    //! Means, variances, ranges, modes, histograms and correlations after the first pass.
    void FinishFirstPass();
    //! Second-moment sums, category counts, histograms and cells of one valid record.
    void UpdateSecondPass();
    //! Means of x², x⁴, the variance of ln x and the contingency rows after the second pass.
    void FinishSecondPass();
    //! Moment or start estimates of every candidate; the factors' Categorical and best fit.
    MCStatus SetInitialDistParams();
    //! Maximum-likelihood step of the NegBin, Gamma and Beta candidates, in worker tasks.
    MCStatus OptimizeDistParams(MCCommon_800::MultiPassRecordIter& trainData);
    //! Chi-square tests and best fits of the discrete covariates.
    MCStatus ComputeChiSquare();
    //! EDF pass, Anderson-Darling and Kolmogorov-Smirnov tests and best fits of the
    //! continuous covariates.
    MCStatus PerformFitGoodness(MCCommon_800::MultiPassRecordIter& trainData);
    //! The text of category `code` of a factor variable: its encoder's text, or the code in
    //! decimal when the variable has no such category (so distinct codes keep distinct texts).
    static std::string GetCategoryText(const MCXML_800::IMCVariable* variable, int code);

    // Goodness of fit (dfcfitgoodness.cpp)
    //! The EDF pass, the sort of each listed covariate's values, one goodness-of-fit task per
    //! (listed covariate, continuous candidate) and the best-fit choice; 1 when cancelled.
    MCStatus ComputeFitGoodness(MCCommon_800::MultiPassRecordIter& trainData);
    //! The EDF pass: every valid record's weight and the values of the listed covariates.
    MCStatus StoreGoodFitValues(MCCommon_800::MultiPassRecordIter& trainData);
    //! The best fit, best A² and best D types, reported elements and warnings of listed
    //! covariate `covariate` once its tasks have run.
    void ChooseEdfBestFit(int covariate);
    //! Appends the Empirical element of continuous covariate `covariate` (extremes, standard
    //! deviation, histogram proportions) and makes it the best when there is none.
    void AddContinuousEmpirical(int covariate);

    // 1. Settings and variables.
    DFCSettings fSettings;                 //!< private copy of the host's settings
    const MCXML_800::MCVarList* fpVarList; //!< the host's variables, not owned
    // 2. Results.
    DFCOutputStats fOutputStats; //!< refers to the host's settings and variables
    // 3. Flags from the settings.
    MCSPConst::GoodFitType fGFType; //!< configured goodness-of-fit type
    bool fbUseCrosstabs;            //!< crosstabs requested
    bool fbInteractiveMode;         //!< interactive mode
    bool fbComputeAD;               //!< Anderson-Darling computed
    bool fbComputeKS;               //!< Kolmogorov-Smirnov computed
    // 4. Goodness-of-fit threshold.
    double fPValueThreshold = 0.0; //!< candidates below it are dropped
    // 5. Threads.
    int fMaxThreadNum;                               //!< worker threads at most
    int fMemCacheKB;                                 //!< memory cache limit (not read by any step)
    MCThread_800::IMCThreadFactory* fpThreadFactory; //!< host's thread factory
    // 6. Field counts.
    int fNFactors;    //!< NF
    int fNCovariates; //!< NC
    // 7. Contingency table.
    std::unique_ptr<MCMath_800::MCFactorTables> fpFactorTables; //!< when crosstabs and NF ≥ 2
    int fNCells = 0;                                            //!< number of contingency cells
    std::vector<double> fvCellWeights;                          //!< weight per cell
    // 8. Covariate kinds.
    std::vector<bool> fvbContinuous;   //!< level 1 (Continuous)
    std::vector<bool> fvbDiscreteMark; //!< other levels, until record reading clears it
    // 9. Record buffers.
    std::vector<double> fvFactorValues;    //!< raw factor values
    std::vector<int> fvFactorCodes;        //!< factor category codes
    std::vector<double> fvCovariateValues; //!< covariate values
    int fWeightVar;                        //!< frequency weight variable, -1 none
    double fWeight = 1.0;                  //!< weight of the current record
    // 10. Goodness-of-fit weights, one per valid record.
    std::vector<double> fvGoodFitWeights;
    // 11. Per-covariate accumulators.
    std::vector<std::unique_ptr<MCMath_800::MCCatStats>> fvpCatStatsCovars; //!< discrete ones
    std::vector<std::unique_ptr<DFCHistogramData>> fvpHistograms; //!< continuous, not constant
    // 12. Goodness-of-fit covariates and their entries.
    std::vector<int> fvGoodFitCovars;                            //!< covariate positions
    std::vector<std::vector<DFCGoodFitEntry>> fvvGoodFitEntries; //!< per listed covariate
    // 13. Per-factor category counts.
    std::vector<std::unique_ptr<MCMath_800::MCCatStats>> fvpCatStatsFactors;
    // 15. Means and cross products of the covariates.
    std::unique_ptr<MCMath_800::MCProvMeans> fpProvMeans; //!< when NC > 0
    // 16. Per-covariate statistics.
    std::vector<double> fvMeans;                       //!< m
    std::vector<double> fvVariances;                   //!< divisor W - 1
    std::vector<double> fvVariancesW;                  //!< divisor W
    std::vector<double> fvMinimums;                    //!< smallest value
    std::vector<double> fvMaximums;                    //!< largest value
    std::vector<double> fvRanges;                      //!< maximum - minimum
    std::vector<double> fvModes;                       //!< triangular mode
    std::vector<double> fvSumLogX;                     //!< Σ w·ln x
    std::vector<double> fvMeanLogX;                    //!< Σ w·ln x / W
    std::vector<double> fvGeoMeans;                    //!< exp(mean of ln x)
    std::vector<double> fvSumSqLogDev;                 //!< Σ w·(ln x - mean of ln x)²
    std::vector<double> fvVarLogX;                     //!< Σ w·(ln x - mean of ln x)² / W
    std::vector<double> fvSumLog1MinusX;               //!< Σ w·ln(1 - x)
    std::vector<double> fvSumX;                        //!< Σ w·x
    std::vector<double> fvSumLogGammaX1;               //!< Σ w·ln Γ(x + 1)
    const MCMath_800::MCSymMatrix* fpXProds = nullptr; //!< cross products of the means object
    // 17. Case limit and counts.
    int fNCasesLimit;            //!< below 1: all records
    std::int64_t fNValid = 0;    //!< valid records
    std::int64_t fNInvalid = 0;  //!< invalid records
    std::int64_t fNRecords = 0;  //!< all records read
    double fValidWeight = 0.0;   //!< W
    double fInvalidWeight = 0.0; //!< weight of the invalid records
    double fTotalWeight = 0.0;   //!< weight of all records
    // 18. Second moments for the Weibull candidates.
    std::vector<double> fvSumX2;  //!< Σ w·x²
    std::vector<double> fvMeanX2; //!< Σ w·x² / W
    std::vector<double> fvSumX4;  //!< Σ w·x⁴
    std::vector<double> fvMeanX4; //!< Σ w·x⁴ / W
    // 19. Candidates recorded by the initial estimates.
    std::vector<int> fvNegBinCovars;      //!< covariate positions with NegBin
    std::vector<int> fvNegBinVarIndices;  //!< their variable indices
    std::vector<double> fvNegBinParams;   //!< (r, p) per NegBin candidate
    std::vector<int> fvWeibullCovars;     //!< covariate positions with Weibull
    std::vector<int> fvWeibullVarIndices; //!< their variable indices
    std::vector<double> fvWeibullParams;  //!< (a, b, c) per candidate, three-parameter mode
    // Bookkeeping of this implementation.
    //! Per covariate, bit k set while DistType k is still allowed (mirrors the elements'
    //! flags during the passes, so a record touches no element).
    std::vector<std::uint16_t> fvAllowedMask;
    bool fbBuildRan = false;  //!< a build has run
    bool fbThreeParamWeibull; //!< from SIMULATE_DEBUG_OPTIMIZER
};

} // namespace MCMCSP_800
