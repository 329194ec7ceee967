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
// Threads: a simulator is used by one thread at a time. The NORTA workers and the case workers
// share nothing but the read-only settings, plan and variable list and the cancel record.
#pragma once

#include "mccommon/mcstatus.h"
#include "mccommon/variables.h"
#include "mcmath/mccancelinfo.h"
#include "mcmath/mcrandom.h"
#include "mcmath/mcsymmatrix.h"
#include "mcthread/mcthread.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secgeneration.h"
#include "simulation_evaluation/secnorta.h"
#include "simulation_evaluation/secoutputstats.h"
#include "simulation_evaluation/secsettings.h"

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
        double fLower = 0.0;    //!< natural lower bound narrowed by the minimum; missing if none
        double fUpper = 0.0;    //!< natural upper bound narrowed by the maximum; missing if none
        double fTruncMin = 0.0; //!< truncation minimum; missing when not set
        double fTruncMax = 0.0; //!< truncation maximum; missing when not set
        bool fbOutput = true;   //!< SimInputSpecs::GetOutput
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

    //! The correlation model (master only): with R and at least two correlated inputs, the
    //! normal correlation of every pair (SECNortaNormalCorrelation) on worker copies in one
    //! thread group, each pair seeded from this simulator's stream in pair order, then
    //! CombineNortaNormalCorrs. With one correlated input R itself. Runs once; later calls
    //! return the first outcome. Code 1 when cancelled (nothing kept), 390010 when no
    //! positive-definite repair exists (the simulator then refuses to draw), warning 390015
    //! in GetWarnings when the matrix was adjusted.
    MCCommon_800::MCStatus PrepareCorrelationModel();
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
    MCCommon_800::MCStatus GenerateAttempt();
    //! True when every value of the case is present and inside its truncation bounds.
    bool AreInputsWithinBounds() const;
    //! A case with truncation by rejection on the inputs: up to 1000 attempts, code 390014
    //! when all are rejected. GetLastRejections tells how many attempts were rejected.
    MCCommon_800::MCStatus DrawCase();
    //! The host-driven draw: DrawCase into `values`, which is sized to the number of simulated
    //! inputs (filled with 0.0) when its size differs; missing values on failure.
    MCCommon_800::MCStatus SimulatePredictors(std::vector<double>& values);

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
    //! set).
    void SetNortaPairs(const std::vector<SECNortaPair>& pairs);
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
    const std::vector<double>& GetCaseValues() const { return fvCaseValues; }
    //! The normal vector of the last attempt, one value per correlated input.
    const std::vector<double>& GetNormalValues() const { return fvZ; }
    //! The contingency cell of the last attempt; −1 without a table.
    int GetCrosstabCell() const { return fCrosstabCell; }
    //! Rejected attempts of the last DrawCase.
    int GetLastRejections() const { return fLastRejections; }
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
    bool fbNortaTask = false;                //!< the thread task is NORTA work

    bool fbGenerationPrepared = false;     //!< the normal generator is set
    MCCommon_800::MCStatus fPrepareStatus; //!< outcome of the last preparation
    std::vector<double> fvZ;               //!< normal vector of the case
    std::vector<double> fvCaseValues;      //!< the case
    int fCrosstabCell = -1;                //!< chosen contingency cell
    int fLastRejections = 0;               //!< rejected attempts of the last case

    int fCaseQuota = 0;         //!< cases the case loop draws
    int fSimCaseCount = 0;      //!< cases drawn, valid or failed
    int fFilteredCaseCount = 0; //!< rejected attempts
    int fValidCaseCount = 0;    //!< cases accepted
    int fInvalidCaseCount = 0;  //!< cases that failed

    MCCommon_800::MCStatus fStatus;     //!< outcome of the last task or preparation
    MCCommon_800::MCWarnings fWarnings; //!< warnings (390015)
};

} // namespace MCMCSP_800
