// SECSimulator: the generation model of one sensitivity iteration of a simulation, and the
// thread task that draws its cases.
//
// SECAlgorithm builds one master simulator per sensitivity iteration, lets it prepare the
// correlation model (PrepareCorrelationModel: the NORTA pairs, spread over worker copies on the
// host's thread factory, then combined and repaired), and runs worker copies (CreateWorker),
// each with its own stream seeded from the master's, as thread tasks that draw cases. In the
// host-driven way the algorithm asks a simulator for one case of predictors at a time
// (SimulatePredictors).
//
// Construction turns the completed plan into the generation model:
//   - per simulated input, in plan order: its distribution (the final one; for the sensitivity
//     input the one whose index is the iteration), its natural range narrowed by the truncation
//     bounds, and its truncation bounds;
//   - the correlated set (every input that is not Categorical): a prepared generator each
//     (SECInputGenerator: stored parameters, m, s, tables, prepared quantile), the tornado
//     delta and the contribution-to-variance flag;
//   - the categorical inputs with their cumulative tables and contingency columns, and the
//     contingency table itself;
//   - the fixed inputs, with the value of this iteration;
//   - the plan's target correlation matrix R over the correlated set.
//
// A case is one value per simulated input, in plan order: a correlated input holds its drawn
// value, a categorical input its category index (the code of the contingency cell for a
// contingency factor) as a number. Drawing allocates nothing: the working vectors are sized
// when the generation is prepared.
//
// Scoring and statistics (secscoring.cpp, secaccumulate.cpp): StartScoring lays out the input
// record (simulated inputs, then fixed inputs) and the score computer's output record; the target
// set-up (ProcessTargetInfo with a score computer, PrepareTargetInfo from the plan for the
// host-driven way) decides which values of a score are targets, their filters, chart budget and
// stop criterion. A case is accepted when its inputs lie inside their truncation bounds and its
// targets are present and inside their filters; an accepted case is accumulated into the
// simulator's results (SECOutputStats), the means and cross products and the contingency cell
// counts. The master merges its workers' statistics in thread order and completes the results. The
// sensitivity measures (secsensitivity.cpp) re-score variants of each accepted case.
//
// Threads: a simulator is used by one thread at a time. The NORTA workers and the case workers
// share nothing but the read-only settings, plan and variable list and the cancel record.
#pragma once

#include "mccommon/hostinterfaces.h"
#include "mccommon/mcstatus.h"
#include "mccommon/records.h"
#include "mccommon/scoring.h"
#include "mccommon/variables.h"
#include "mcmath/mccancelinfo.h"
#include "mcmath/mcrandom.h"
#include "mcmath/mcsymmatrix.h"
#include "mcthread/mcthread.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/seccase.h"
#include "simulation_evaluation/secfirstorder.h"
#include "simulation_evaluation/secgeneration.h"
#include "simulation_evaluation/secnorta.h"
#include "simulation_evaluation/secoutputstats.h"
#include "simulation_evaluation/secsettings.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace MCMCSP_800 {

class SECSimulator : public MCThread_800::IMCThreadTask {
public:
    //! One simulated input in plan order: where its value comes from and what bounds it.
    struct SimInput {
        std::string fName;                                       //!< variable name
        int fVarIndex = -1;                                      //!< index in the host's list
        MCSPConst::DistType fDistType = MCSPConst::kDistUnknown; //!< chosen distribution type
        bool fbCategorical = false; //!< drawn outside the copula, from a category table
        int fGroupIndex = -1;       //!< position in the correlated set or categorical list
        double fLower = 0.0;      //!< natural lower bound narrowed by the minimum; missing if none
        double fUpper = 0.0;      //!< natural upper bound narrowed by the maximum; missing if none
        double fTruncMin = 0.0;   //!< truncation minimum; missing when not set
        double fTruncMax = 0.0;   //!< truncation maximum; missing when not set
        double fAcceptLow = 0.0;  //!< fTruncMin, or −∞ without one (the acceptance test)
        double fAcceptHigh = 0.0; //!< fTruncMax, or +∞ without one
        bool fbOutput = true;     //!< SimInputSpecs::GetOutput
    };

    //! One input of the correlated set.
    struct CorrelatedInput {
        SECInputGenerator fGenerator; //!< the prepared distribution
        int fCasePos = -1;            //!< its place in the case
        //! s × the settings' delta when UseTornadoStddev is set and the type carries a delta;
        //! missing otherwise.
        double fTornadoDelta = 0.0;
        //! Takes part in the contribution-to-variance measure.
        bool fbVarianceContrib = false;
    };

    //! One categorical input.
    struct CategoricalInput {
        SECCategoricalInput fSampler; //!< categories and their cumulative table
        int fCasePos = -1;            //!< its place in the case
    };

    //! One fixed input with the value this iteration gives it.
    struct FixedInput {
        std::string fName;     //!< variable name
        int fVarIndex = -1;    //!< index in the host's list
        bool fbString = false; //!< the value is a text
        double fNumber = 0.0;  //!< the value as a number (missing for a text)
        std::string fText;     //!< the value as a text
    };

    //! The contingency table of the categorical factors.
    struct Crosstab {
        std::vector<std::string> fvFactors;    //!< factor names, one column each
        std::vector<std::vector<int>> fvCodes; //!< per cell, one category code per factor
        std::vector<double> fvCumTable;        //!< cumulative cell probabilities, ending at 1.0
    };

    //! Builds the generation model of sensitivity iteration `iteration` (see the header note).
    //! The settings, plan and variable list are borrowed and must outlive the simulator. With
    //! `sharedStream` (borrowed) the simulator draws from it; without, it owns a stream seeded
    //! by SeedFromValue(seedValue). A non-null `normalCorrelations` is copied as the normal
    //! correlation matrix, and the correlation model counts as prepared.
    SECSimulator(const SECSettings* settings, const SPCSettings* plan,
                 const MCXML_800::MCVarList* variables, int iteration,
                 MCMath_800::MCURandom* sharedStream, double seedValue,
                 const MCMath_800::MCSymMatrix* normalCorrelations);
    ~SECSimulator() override;
    SECSimulator(const SECSimulator&) = delete;
    SECSimulator& operator=(const SECSimulator&) = delete;

    //! The thread task: the NORTA pair work when pairs were assigned (SetNortaPairs), else the
    //! case loop (PrepareGeneration, then DrawCase until the quota, cancellation or code
    //! 390014). The outcome is GetStatus; an exception becomes code 390005.
    void RunTask() override;
    //! `out` = this simulator's results; success.
    virtual MCCommon_800::MCStatus GetOutputStats(SECOutputStats*& out);

    // ---- Preparation -------------------------------------------------------------------

    //! The correlation model (master only): with R and at least two correlated inputs, each
    //! input prepared once (SECPrepareNortaMargin), the normal correlation of every pair
    //! (SECNortaNormalCorrelation) on worker copies in one thread group, then
    //! CombineNortaNormalCorrs. With one correlated input R itself. Runs once; later calls
    //! return the first outcome. Code 1 when cancelled (nothing kept), 390010 when no
    //! positive-definite repair exists (the simulator then refuses to draw); in GetWarnings
    //! 390015 when the matrix was adjusted and 390017 once per pair whose target lies outside
    //! its attainable range.
    MCCommon_800::MCStatus PrepareCorrelationModel();
    //! Takes the prepared correlation model of `other` (another sensitivity iteration of the
    //! same plan) when this simulator's correlated set has the same inputs, distributions and
    //! target matrix, so that iterations that vary a fixed input or a categorical one do not
    //! compute it again. False, with nothing taken, otherwise; its warnings stay with `other`.
    bool AdoptCorrelationModel(const SECSimulator& other);
    //! Resets the case to missing and parameterises the normal generator: one input, a
    //! standard normal; several with a normal matrix, the multivariate normal over it; several
    //! without R, independent normals. Prepares the correlation model first when R exists and
    //! it has not been prepared. Code 390010 when the correlation model failed or its matrix
    //! cannot parameterise the generator; no case is drawn until a preparation succeeds.
    MCCommon_800::MCStatus PrepareGeneration();
    //! Sets every value of the case and every normal value to missing.
    void ResetCaseValues();

    // ---- Drawing -------------------------------------------------------------------------

    //! One attempt: the normal vector, each correlated input's value, the contingency cell and
    //! the categorical values, into the case. Code 390007 (the case all missing) when the
    //! normal generator fails; the preparation's error when generation is not prepared.
    MCCommon_800::MCStatus GenerateAttempt() {
        return GenerateAttempt(fCase, fRandomValues, *fpStream);
    }
    //! The same into `c`, from the normal generator `normals` and the uniform stream `stream`.
    MCCommon_800::MCStatus GenerateAttempt(SECCase& c, MCMath_800::MCRandomValues& normals,
                                           MCMath_800::MCURandom& stream) const;
    //! True when every value of the case is present and inside its truncation bounds.
    bool AreInputsWithinBounds() const { return AreInputsWithinBounds(fCase.fvInputs); }
    bool AreInputsWithinBounds(const std::vector<double>& inputs) const;
    //! A case with truncation by rejection on the inputs: up to 1000 attempts, code 390014
    //! when all are rejected. GetLastRejections tells how many attempts were rejected.
    MCCommon_800::MCStatus DrawCase();
    //! The one retry loop of truncation by rejection: attempts until the inputs lie inside
    //! their bounds and, with `score` and a score computer, the scored targets pass their
    //! filters; up to 1000 attempts, then code 390014. GetLastRejections counts the rejected.
    MCCommon_800::MCStatus DrawAcceptedCase(SECCase& c, MCMath_800::MCRandomValues& normals,
                                            MCMath_800::MCURandom& stream, bool score);
    //! The host-driven draw: DrawCase into `values`, which is sized to the number of simulated
    //! inputs (filled with 0.0) when its size differs; missing values on failure.
    MCCommon_800::MCStatus SimulatePredictors(std::vector<double>& values);

    // ---- Scoring and targets -----------------------------------------------------------

    //! One target: where its value is read from a score, its filter and its chart range.
    struct Target {
        std::string fName;                                  //!< target name
        const MCXML_800::IMCVariable* fpVariable = nullptr; //!< host's variable; may be null
        bool fbCategorical = false;        //!< measurement kind 2 or 3 (or a cluster identifier)
        int fListIndex = -1;               //!< position among the continuous or categorical targets
        int fValuePos = -1;                //!< position of its value among the values of a score
        int fNProbs = 0;                   //!< category probabilities following the value
        std::vector<std::string> fvLabels; //!< category labels (categorical targets)
        bool fbHasFilter = false;          //!< the plan gives it a filter range
        double fFilterLow = 0.0;           //!< lower filter bound; lowest double when open
        double fFilterHigh = 0.0;          //!< upper filter bound; highest double when open
        bool fbIncludeLow = true;          //!< the lower bound belongs to the range
        bool fbIncludeHigh = true;         //!< the upper bound belongs to the range
        double fChartMin = 0.0;            //!< chart range; missing while open
        double fChartMax = 0.0;            //!< chart range; missing while open
        bool fbScatter = false;            //!< gets scatter plots against the inputs for output
    };

    //! Resets the working values, computes the confidence interval's critical value from the
    //! settings' level, and prepares the correlation model.
    MCCommon_800::MCStatus PrepareForSimulation();
    //! Obtains this simulator's score computer from `factory` and records its model type in the
    //! results. Null `factory`: nothing happens.
    MCCommon_800::MCStatus CreateScoreComputer(MCXML_800::IMCSPScoreFactory* factory);
    //! Gives the score computer back once the iteration's results are complete: a run of
    //! thousands of sensitivity iterations keeps their results, not a model instance each.
    void ReleaseScoreComputer() { fpScoreComputer.reset(); }
    //! PrepareGeneration, StartScoring and ProcessTargetInfo, as every simulator that scores
    //! does before its first case.
    MCCommon_800::MCStatus PrepareScoring();
    //! The input and output records of the score computer.
    MCCommon_800::MCStatus StartScoring();
    //! Target set-up from the score computer (component-driven way).
    MCCommon_800::MCStatus ProcessTargetInfo();
    //! Target set-up from the plan's model targets (host-driven way): each record carries one
    //! value per target, a categorical target followed by its category probabilities when the
    //! settings' GetUseTargCatProbs is set. Also marks the open chart ranges for the start-up
    //! range search.
    MCCommon_800::MCStatus PrepareTargetInfo();
    //! The pilot run: up to 2000 scored cases, stopping at 1000 valid ones, fixing the open
    //! chart ranges; then the chart accumulators. 390011 below 1000 valid cases.
    MCCommon_800::MCStatus RunPilot();
    //! Scores the inputs `inputs` (one value per simulated input): fills the input record, calls
    //! the score computer, reads the values of the score into `values` (all missing when the
    //! score fails).
    MCCommon_800::MCStatus ScoreInputs(const std::vector<double>& inputs,
                                       std::vector<double>& values);
    //! One accepted case: drawn with truncation by rejection on the inputs and the target
    //! filters (up to 1000 attempts, 390014), scored.
    MCCommon_800::MCStatus DrawAndScoreCase();
    //! Adds the current case (inputs, score values, contingency cell) to the statistics.
    void AccumulateCase();
    //! Pools the statistics of `workers` into this simulator's, in order. 390010 when the means
    //! and cross products or a chart cannot be merged.
    MCCommon_800::MCStatus
    MergeStatsFromThreads(const std::vector<std::unique_ptr<SECSimulator>>& workers);
    //! Completes the results: counts, target statistics, confidence intervals, correlations,
    //! sensitivity measures, simulated correlations and cell shares. 390011 without a valid
    //! case.
    MCCommon_800::MCStatus CompleteStats();

    //! Host-driven record `recordIndex` (0-based since PrepareEvaluation): the first 2000 fix
    //! the chart ranges, later ones are accumulated.
    MCCommon_800::MCStatus UpdateStatsForRecord(const std::vector<double>& predictors,
                                                const std::vector<double>& targets,
                                                int recordIndex);

    //! The target names, in target order.
    std::vector<std::string> GetTargetNames() const;
    const std::vector<Target>& GetTargets() const { return fvTargets; }
    //! Values read from a score per case.
    int GetNValuesPerCase() const { return fNValuesPerCase; }
    //! Category probabilities a score delivers per case.
    int GetNProbabilities() const;
    //! The score has a "prediction" or "clustering-clusterid" field.
    bool HasPredictedField() const { return fPredictedIndex >= 0; }
    bool HasCategoricalTarget() const;
    //! The plan has a point-value or tails stop criterion on one of the targets.
    bool HasStopCriterion() const {
        return fStopPoint.fKind != StopKind::kNone || fStopTails.fKind != StopKind::kNone;
    }
    //! Values read from the last score.
    const std::vector<double>& GetScoreValues() const { return fCase.fvValues; }
    //! Number of scores computed (each re-score of the sensitivity measures counts).
    std::int64_t GetScoreCount() const { return fScoreCount; }
    //! The contingency cell counts of the accumulated cases.
    const std::vector<double>& GetCellCounts() const { return fvCellCounts; }
    //! The means and cross products over the correlated inputs and the targets.
    const MCMath_800::MCProvMeans& GetProvMeans() const { return fProvMeans; }
    //! Critical value of the confidence interval of the means.
    double GetCiZ() const { return fCiZ; }
    //! The largest number of scatter plots this simulator fills.
    int GetScatterBudget() const { return fScatterBudget; }
    //! Chart range of simulated input `i`: its natural range, the pilot's range where open.
    double GetInputChartMin(int i) const { return fvInputChartMin[static_cast<std::size_t>(i)]; }
    double GetInputChartMax(int i) const { return fvInputChartMax[static_cast<std::size_t>(i)]; }

    // ---- Case sink and progress ----------------------------------------------------------

    //! Good cases go to `sink` (may be null): at once without `lock`, in batches of up to
    //! 10000 under `lock` with one.
    void SetSink(MCXML_800::SECAppDataProcess* sink, MCThread_800::IMCLock* lock);
    //! Passes the buffered cases to the sink.
    void FlushSink();
    //! Reports a SECReporter with the cases simulated so far after every case.
    void SetRecordProgressListener(MCCommon_800::ProgressListener* listener) {
        fpRecordListener = listener;
    }
    //! A counter shared with the algorithm that the case loop advances as cases are simulated.
    void SetProgressCounter(std::atomic<std::int64_t>* counter) { fpProgressCounter = counter; }
    //! True when the case loop ended by a stop criterion.
    bool IsStopped() const { return fbStopped; }

    // ---- Workers ------------------------------------------------------------------------

    //! A worker copy: a fresh simulator of the same settings, plan, variables and iteration,
    //! with its own stream seeded by SeedFromValue(seedValue), this simulator's normal
    //! correlation matrix, bounds, cancel record and correlation-model outcome.
    std::unique_ptr<SECSimulator> CreateWorker(double seedValue) const;
    //! The seed of an own stream: the low 32 bits of the integer part of u × 4294967295.0 for
    //! a seed value u ≥ 0, else `settingsSeed`.
    static std::uint32_t SeedFromValue(double seedValue, std::uint32_t settingsSeed);
    //! Cases the case loop draws.
    void SetCaseQuota(int quota) { fCaseQuota = quota; }
    //! Makes the thread task the NORTA work on `pairs` (rows and columns of the correlated
    //! set) over the prepared `margins`, one per input of the correlated set.
    void SetNortaPairs(const std::vector<SECNortaPair>& pairs,
                       std::shared_ptr<const std::vector<SECNortaMargin>> margins);
    //! The pairs with their results after the NORTA work; on the master, every pair of the
    //! last correlation model in pair order.
    const std::vector<SECNortaPair>& GetNortaPairs() const { return fvNortaPairs; }
    //! Borrows `cancel` (the algorithm's record) instead of the simulator's own record on the
    //! settings' cancel query; null restores the own record.
    void SetCancelInfo(MCMath_800::MCCancelInfo* cancel);
    MCMath_800::MCCancelInfo* GetCancelInfo() const { return fpCancel; }

    // ---- Generation model --------------------------------------------------------------

    int GetIteration() const { return fIteration; }
    //! Number of sensitivity iterations: the sensitivity input's distributions or values, 1
    //! without a sensitivity input.
    int GetNSensIterations() const { return fNSensIterations; }
    //! Name of the sensitivity input; empty without one.
    const std::string& GetSensIterName() const { return fSensIterName; }
    //! The simulated inputs in plan order (the case layout).
    const std::vector<SimInput>& GetSimInputs() const { return fvSimInputs; }
    const std::vector<CorrelatedInput>& GetCorrelatedInputs() const { return fvCorrelated; }
    const std::vector<CategoricalInput>& GetCategoricalInputs() const { return fvCategorical; }
    const std::vector<FixedInput>& GetFixedInputs() const { return fvFixedInputs; }
    //! True when the plan has a usable contingency table.
    bool HasCrosstab() const { return fbHasCrosstab; }
    const Crosstab& GetCrosstab() const { return fCrosstab; }
    //! True when the plan has a correlation matrix (R).
    bool HasTargetCorrelations() const { return fbHasTargetCorr; }
    //! R over the correlated set, unit diagonal.
    const MCMath_800::MCSymMatrix& GetTargetCorrelations() const { return fTargetCorr; }
    //! The normal correlation matrix; empty when there is none.
    const MCMath_800::MCSymMatrix& GetNormalCorrelations() const { return fNormalCorr; }
    //! True when some input has a missing natural bound (its chart range is searched).
    bool HasOpenRange() const { return fbOpenRange; }

    // ---- The current case and counters -----------------------------------------------

    //! The case: one value per simulated input in plan order.
    const std::vector<double>& GetCaseValues() const { return fCase.fvInputs; }
    //! The normal vector of the last attempt, one value per correlated input.
    const std::vector<double>& GetNormalValues() const { return fCase.fvZ; }
    //! The contingency cell of the last attempt; −1 without a table.
    int GetCrosstabCell() const { return fCase.fCell; }
    //! Rejected attempts of the last DrawCase.
    int GetLastRejections() const { return fCase.fRejections; }
    //! Counters of the case loop: cases drawn (valid or failed), rejected attempts, valid
    //! cases, failed cases.
    int GetSimCaseCount() const { return fSimCaseCount; }
    int GetFilteredCaseCount() const { return fFilteredCaseCount; }
    int GetValidCaseCount() const { return fValidCaseCount; }
    int GetInvalidCaseCount() const { return fInvalidCaseCount; }

    //! The stream the simulator draws from.
    MCMath_800::MCURandom* GetStream() const { return fpStream; }
    //! Outcome of the last task run or preparation.
    MCCommon_800::MCStatus GetStatus() const { return fStatus; }
    //! Warnings gathered (390015).
    const MCCommon_800::MCWarnings& GetWarnings() const { return fWarnings; }

    //! Diagnostic print between "SECSimulator display start" and "SECSimulator display end".
    void Display() const;

private:
    struct WorkerTag {};
    //! A worker of `master`: its generation model copied rather than rebuilt from the plan (the
    //! prepared quantile tables take milliseconds per input), its own stream seeded by
    //! SeedFromValue(seedValue).
    SECSimulator(const SECSimulator& master, double seedValue, WorkerTag);
    //! The names of the inputs in the results.
    void SetResultNames();
    //! Algorithm 1: the inputs, fixed inputs, contingency table and R.
    void BuildGenerationModel();
    //! Adds one simulated input at case position `pos`.
    void AddSimulatedInput(const SimInputSpecs& specs, int pos);
    //! The distribution of `specs` this iteration uses; null when there is none.
    const DistInfoElem* ChooseDistribution(const SimInputSpecs& specs);
    //! Adds a categorical input.
    void AddCategoricalInput(const SimInputSpecs& specs, const DistInfoElem* dist, int pos,
                             SimInput& info);
    //! Adds an input of the correlated set.
    void AddCorrelatedInput(const SimInputSpecs& specs, const DistInfoElem* dist, int pos,
                            SimInput& info);
    void BuildFixedInputs();
    void BuildCrosstab();
    void BuildTargetCorrelations();
    //! The plan's correlation of correlation variables a and b (either triangle); missing when
    //! the matrix has no such entry.
    double PlanCorrelation(std::size_t a, std::size_t b) const;
    //! Notes a sensitivity input with `count` distributions or values; the first one decides.
    void NoteSensitivityInput(const std::string& name, std::size_t count);
    //! The index of distribution or value this iteration uses among `count` of them.
    std::size_t IterationIndex(std::size_t count) const;

    // ---- Scoring and statistics internals ------------------------------------------------

    enum class StopKind { kNone, kPointValue, kTails };
    //! The stop criterion of the run and its state.
    struct StopState {
        StopKind fKind = StopKind::kNone;
        int fTarget = -1;            //!< index among the continuous targets
        double fZ = 0.0;             //!< critical value of the criterion's level
        double fThreshold = 0.0;     //!< point value: allowed half-width; tails: tail value
        bool fbPercent = false;      //!< point value: threshold in percent of the mean
        bool fbPercentile = false;   //!< tails: percentile-type tail
        bool fbUpper = true;         //!< tails: the upper tail
        int fRequired = 0;           //!< tails: values required in the tail
        int fTailCount = 0;          //!< tails: values counted in the tail
        double fTailThreshold = 0.0; //!< tails: mean + h once active
        double fTailHalfWidth = 0.0; //!< tails: h at activation
        bool fbActive = false;       //!< tails: the criterion is active
    };

    //! Common part of the two target set-ups: filters, result records, scatter budget, stop
    //! criteria, working tables.
    MCCommon_800::MCStatus FinishTargetSetup();
    //! Applies the plan's filter of the target named `target.fName`.
    void ApplyTargetFilter(Target& target) const;
    //! Scatter-plot budget of this iteration (and warning 390016).
    void ApplyScatterBudget();
    void SetupStopCriteria();
    //! True when every target value in `values` is present and inside its filter.
    bool AreTargetsAccepted(const std::vector<double>& values) const;
    //! Reads the output record into `values` (one per value of a score).
    void ReadScore(std::vector<double>& values);
    //! Sets the chart ranges that are still open from the pilot's or start-up statistics.
    void FixChartRanges(const std::vector<MCMath_800::MCContStats>& inputStats,
                        const std::vector<MCMath_800::MCContStats>& targetStats);
    //! Feeds a valid pilot or start-up case to the range statistics.
    void UpdateRangeStats(const std::vector<double>& inputs, const std::vector<double>& values,
                          std::vector<MCMath_800::MCContStats>& inputStats,
                          std::vector<MCMath_800::MCContStats>& targetStats) const;
    //! The histograms and scatter plots of the results, over the chart ranges.
    void CreateChartAccumulators();
    //! Adds a case given by `inputs`, `values` and `cell` to the statistics.
    void AccumulateValues(const std::vector<double>& inputs, const std::vector<double>& values,
                          int cell, int rejections);
    //! The stop check before each case of the case loop.
    bool ShouldStop();
    //! Hands the current good case to the sink.
    void PassCaseToSink();
    //! Copies the chart ranges of the master into this worker.
    void CopyTemplatesFrom(const SECSimulator& master);
    //! Tails criterion bookkeeping for one accumulated value of its target.
    void UpdateTailCount(double value, const MCMath_800::MCContStats& stats);

    // ---- Sensitivity measures (secsensitivity.cpp) --------------------------------------

    //! Sizes the working tables of the sensitivity measures and the results' vectors.
    void PrepareSensitivity();
    //! The re-scored variants of the accepted current case (delta and variance measures). A
    //! variant that cannot be evaluated leaves its cells missing (skipped and counted); the
    //! base case, its values and the base stream are never changed.
    void ComputeCaseSensitivity();
    //! The variance measure's further independent case, drawn and scored from its own stream
    //! into fFurther; false when no acceptable case could be drawn.
    bool DrawFurtherCase();
    //! Adds the current case's differences and products to the statistics.
    void AccumulateSensitivity();
    //! Positive and negative deltas and variance contributions of every continuous target.
    void CompleteSensitivity();
    bool UsesSensitivity() const { return fbDeltaMeasure || fbVarianceMeasure; }
    //! Sizes the quantile summaries and first-order accumulator (SECSettings::
    //! QuantilesAndIndices) once the centres of the continuous targets are known.
    void PrepareAddedResults();
    //! Adds the accepted case to the quantile summaries and, with its normal scores
    //! (`withScores`), to the first-order accumulator.
    void AccumulateAddedResults(const std::vector<double>& inputs,
                                const std::vector<double>& values, bool withScores);
    //! The first-order indices of every continuous target.
    void CompleteAddedResults();

    //! The thread task of a NORTA worker.
    MCCommon_800::MCStatus RunNortaPairs();
    //! The thread task of a case worker.
    MCCommon_800::MCStatus RunCaseLoop();
    //! Step 4 of the correlation model: the workers' results into Q, repaired.
    MCCommon_800::MCStatus
    CombineNortaNormalCorrs(const std::vector<std::unique_ptr<SECSimulator>>& workers);

    const SECSettings* fpSettings;         //!< run settings, not owned
    const SPCSettings* fpPlan;             //!< completed plan, not owned
    const MCXML_800::MCVarList* fpVarList; //!< host's variables, not owned
    int fIteration;                        //!< sensitivity iteration index

    std::unique_ptr<MCMath_800::MCURandom> fpOwnedStream; //!< own stream, when not shared
    MCMath_800::MCURandom* fpStream;                      //!< the stream drawn from
    MCMath_800::MCRandomValues fRandomValues;             //!< normal generator on fpStream
    MCMath_800::MCCancelInfo fOwnCancel;                  //!< on the settings' cancel query
    MCMath_800::MCCancelInfo* fpCancel;                   //!< fOwnCancel or the borrowed one
    std::unique_ptr<SECOutputStats> fpOutputStats;        //!< this iteration's results

    std::vector<SimInput> fvSimInputs;           //!< simulated inputs, plan order
    std::vector<CorrelatedInput> fvCorrelated;   //!< the correlated set
    std::vector<CategoricalInput> fvCategorical; //!< the categorical inputs
    std::vector<FixedInput> fvFixedInputs;       //!< the fixed inputs
    Crosstab fCrosstab;                          //!< contingency table
    bool fbHasCrosstab = false;                  //!< fCrosstab is usable
    int fNSensIterations = 1;                    //!< sensitivity iterations
    std::string fSensIterName;                   //!< sensitivity input's name
    bool fbOpenRange = false;                    //!< some natural bound is missing

    MCMath_800::MCSymMatrix fTargetCorr;     //!< R
    bool fbHasTargetCorr = false;            //!< the plan has a correlation matrix
    MCMath_800::MCSymMatrix fNormalCorr;     //!< normal correlations, empty when none
    bool fbCorrModelPrepared = false;        //!< the correlation model has run
    bool fbCorrelationFailed = false;        //!< its repair failed: no case is drawn
    MCCommon_800::MCStatus fCorrModelStatus; //!< outcome of the correlation model
    std::vector<SECNortaPair> fvNortaPairs;  //!< pairs of the NORTA work
    //! The prepared inputs the NORTA work reads (shared by the master and its NORTA workers).
    std::shared_ptr<const std::vector<SECNortaMargin>> fpNortaMargins;
    bool fbNortaTask = false; //!< the thread task is NORTA work

    bool fbGenerationPrepared = false;     //!< the normal generator is set
    MCCommon_800::MCStatus fPrepareStatus; //!< outcome of the last preparation
    SECCase fCase;                         //!< the current case

    int fCaseQuota = 0;         //!< cases the case loop draws
    int fSimCaseCount = 0;      //!< cases drawn, valid or failed
    int fFilteredCaseCount = 0; //!< rejected attempts
    int fValidCaseCount = 0;    //!< cases accepted
    int fInvalidCaseCount = 0;  //!< cases that failed

    // Scoring and statistics.
    std::unique_ptr<MCXML_800::IMCScoreComputer> fpScoreComputer; //!< this simulator's
    MCXML_800::ValueRecord fInputRecord;  //!< simulated inputs, then fixed inputs
    MCXML_800::ValueRecord fOutputRecord; //!< filled by the score computer
    int fPredictedIndex = -1;             //!< "clustering-clusterid" or "prediction", or −1
    int fProbIndex = -1;                  //!< "probcategory", or −1
    int fNValuesPerCase = 0;              //!< values read from a score
    bool fbHostDriven = false;            //!< targets from the plan (PrepareTargetInfo)
    std::vector<Target> fvTargets;        //!< target order
    std::vector<int> fvLastCode;          //!< category last written to the input record
    //! Extremes of each covariate; their moments are in the cross products (fProvMeans).
    std::vector<double> fvCovarMin;
    std::vector<double> fvCovarMax;
    // The results' vectors the case loop writes to (they keep their size once set up).
    std::vector<MCMath_800::MCContStats>* fpCovarStats = nullptr;
    std::vector<SECContinuousTargetInfo>* fpContInfo = nullptr;
    std::vector<SECCategoricalTargetInfo>* fpCatInfo = nullptr;
    std::vector<double> fvCombined;      //!< correlated inputs, then targets
    std::vector<double> fvInputChartMin; //!< chart range per simulated input
    std::vector<double> fvInputChartMax;
    MCMath_800::MCProvMeans fProvMeans;       //!< means and cross products
    std::vector<double> fvCellCounts;         //!< accumulated contingency cells
    double fCiZ = 0.0;                        //!< critical value of the means' intervals
    int fScatterBudget = 100;                 //!< scatter plots this simulator fills at most
    bool fbChartsReady = false;               //!< chart accumulators created
    StopState fStopPoint;                     //!< point-value stop criterion
    StopState fStopTails;                     //!< tails stop criterion
    int fStartRecords = 0;                    //!< host-driven records seen in the start-up
    const SECSimulator* fpTemplate = nullptr; //!< the master of a worker (chart ranges)
    std::vector<int> fvOutputInputs;          //!< simulated inputs marked for output
    bool fbStopped = false;                   //!< a stop criterion ended the case loop
    std::int64_t fScoreCount = 0;             //!< scores computed
    std::vector<MCMath_800::MCContStats> fvStartInputStats;  //!< host-driven range search
    std::vector<MCMath_800::MCContStats> fvStartTargetStats; //!< host-driven range search
    int fStartValid = 0;                                     //!< valid start-up records

    // Sink and progress.
    MCXML_800::SECAppDataProcess* fpSink = nullptr;             //!< host's, not owned
    MCThread_800::IMCLock* fpLock = nullptr;                    //!< host's, not owned
    std::vector<double> fvSinkInputs;                           //!< buffered cases' inputs
    std::vector<double> fvSinkValues;                           //!< buffered cases' score values
    int fSinkCount = 0;                                         //!< buffered cases
    MCCommon_800::ProgressListener* fpRecordListener = nullptr; //!< host's, not owned
    std::atomic<std::int64_t>* fpProgressCounter = nullptr;     //!< the algorithm's

    // Sensitivity measures.
    bool fbDeltaMeasure = false;       //!< UseTornadoStddev
    bool fbVarianceMeasure = false;    //!< TornadoVariance
    std::vector<double> fvPosDiff;     //!< continuous target × covariate
    std::vector<double> fvNegDiff;     //!< continuous target × covariate
    std::vector<double> fvProducts;    //!< continuous target × covariate
    std::vector<double> fvWorkInputs;  //!< a variant of the case's inputs
    std::vector<double> fvWorkValues;  //!< the variant's score
    SECCase fFurther;                  //!< the further independent case
    //! Stream and normal generator of the further cases: apart from the base stream, so that
    //! the variance measure does not move the base cases (created on first use).
    std::unique_ptr<MCMath_800::MCURandom> fpFurtherStream;
    MCMath_800::MCRandomValues fFurtherValues; //!< normal generator on fpFurtherStream
    std::vector<int> fvContTargetPos;          //!< value position of each continuous target
    //! Centre of each continuous target's products in the variance measure: its pilot (or
    //! start-up) mean, 0 until one is known.
    std::vector<double> fvContCentre;

    // Added results (SECSettings::QuantilesAndIndices).
    bool fbAddedResults = false;        //!< quantile summaries and first-order indices on
    SECFirstOrderIndices fFirstOrder;   //!< bins of every simulated input × continuous target
    //! Per simulated input: its values when it is discrete with few of them (a bin each);
    //! empty for the other inputs.
    std::vector<std::vector<double>> fvFirstOrderValues;
    //! Per simulated input: its place among the normal scores when it is binned by them, −1
    //! otherwise.
    std::vector<int> fvFirstOrderScore;
    std::vector<std::size_t> fvFirstOrderCats; //!< categories of a categorical input, else 0
    std::vector<int> fvFirstOrderBin;      //!< the case's bin of each simulated input
    std::vector<double> fvFirstOrderY;     //!< the case's continuous targets

    MCCommon_800::MCStatus fStatus;     //!< outcome of the last task or preparation
    MCCommon_800::MCWarnings fWarnings; //!< warnings (390015)
};

} // namespace MCMCSP_800
