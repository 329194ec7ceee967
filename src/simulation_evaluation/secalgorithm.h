// SECAlgorithm: the simulation the host drives through the algorithm interface.
//
// It owns copies of the run settings and of the completed plan, borrows the host's variable
// list, owns one uniform stream seeded with the settings' seed, and one SECSimulator (with its
// SECOutputStats) per sensitivity iteration. Two ways of running:
//
//   Component-driven: BuildModel, then SimulateData(score factory, sink). For each sensitivity
//   iteration a master simulator prepares the correlation model, the scoring and the targets,
//   runs a pilot of up to 2000 cases that fixes the chart ranges, then hands case quotas to
//   worker copies that run as thread tasks on the host's thread factory. Each worker scores
//   with its own score computer and accumulates into its own statistics; the master merges them
//   in thread order and completes the results.
//
//   Host-driven: BuildModel, PrepareGeneration(-1), then per iteration PrepareEvaluation(i),
//   per case SimulatePredictors(values, i), the host's scoring, UpdateStatsForRecord(values,
//   targets, i), and CompleteEvaluation(i).
//
// Reproducibility: workers are seeded from the master's stream in thread order and merged in
// thread order, so a given seed, case limit and thread count give the same results bit for bit
// whatever the scheduling.
//
// Threads: the public operations are called from one host thread; only Cancel (and the host's
// cancel query) may be used from another thread while SimulateData runs.
#pragma once

#include "component/mcspcomponent.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/scoring.h"
#include "mccommon/variables.h"
#include "mcmath/mcrandom.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secoutputstats.h"
#include "simulation_evaluation/secsettings.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <ostream>
#include <vector>

namespace MCMCSP_800 {

class SECSimulator;

class SECAlgorithm : public MCAlgorithmCommon<SECAlgorithm> {
public:
    //! Copies the settings and the plan, borrows `variables` (which must outlive the
    //! algorithm), and seeds the uniform stream with the settings' seed. No simulator yet.
    SECAlgorithm(const SECSettings& settings, const SPCSettings& plan,
                 const MCXML_800::MCVarList& variables);
    ~SECAlgorithm() override;
    SECAlgorithm(const SECAlgorithm&) = delete;
    SECAlgorithm& operator=(const SECAlgorithm&) = delete;

    // ---- The algorithm contract ------------------------------------------------------------

    //! Checks the run settings; the iterator only has to report data (it is not read). 390002
    //! when it has none; a stored error is returned unchanged.
    MCStatus BuildModel(MCCommon_800::MultiPassRecordIter& trainData,
                        MCCommon_800::MultiPassRecordIter* unused) override;
    //! "SECAlgorithm display start", the settings, the variable list, each simulator, "SECAlgorithm
    //! display end", to `os`.
    void Display(std::ostream& os) const override;
    //! The results when the model is built and exactly one simulator exists; otherwise null
    //! and 390002. The status is stored.
    virtual MCStatus GetOutputStats(SECOutputStats*& out);
    //! One result object per sensitivity iteration (null where a simulator is missing); the
    //! first error is stored and returned.
    MCStatus GetOutputStats(std::vector<SECOutputStats*>& out);
    //! 6 when the model is not built, 390003 when `os` is not good; writes nothing.
    MCStatus ExportStatXML(std::ostream& os) const { return CheckExport(os); }

    MCWarnings& GetWarningMessages() { return fWarnings; }
    void ClearWarnings() { fWarnings.ClearWarnings(); }

    // ---- Component-driven run ---------------------------------------------------------------

    //! Runs every sensitivity iteration: generation, scoring through `factory`, accumulation
    //! and completion. `sink` (may be null) receives every good case. Status 1 when cancelled
    //! (the partial results are merged and kept), 390005 when an exception was raised.
    MCStatus SimulateData(MCXML_800::IMCSPScoreFactory* factory,
                          MCXML_800::SECAppDataProcess* sink);

    // ---- Host-driven run -------------------------------------------------------------------

    //! iter < 0: creates and prepares a simulator for every sensitivity iteration; iter >= 0:
    //! that one simulator, when it does not exist yet.
    MCStatus PrepareGeneration(int iter);
    //! One case of predictors of iteration `iter` into `values` (sized to the number of
    //! simulated inputs when empty); 390014 after 1000 rejected attempts.
    MCStatus SimulatePredictors(std::vector<double>& values, int iter);
    //! Starts the evaluation of iteration `iter`: targets from the plan, start-up range search.
    MCStatus PrepareEvaluation(int iter);
    //! One scored case. The first 2000 records after PrepareEvaluation only fix the chart
    //! ranges; every later one is accumulated.
    MCStatus UpdateStatsForRecord(const std::vector<double>& predictors,
                                  const std::vector<double>& targets, int iter);
    //! Completes the statistics of iteration `iter`.
    MCStatus CompleteEvaluation(int iter);

    // ---- State -------------------------------------------------------------------------------

    //! Number of simulators in use (sensitivity iterations).
    int GetNIterations() const { return fNIterations; }
    //! Cases simulated so far by the running and the finished iterations of SimulateData (pilot
    //! cases excluded); safe to read from another thread while the run goes on, so a host can
    //! show progress whatever the number of worker threads.
    std::int64_t GetSimulatedCaseCount() const {
        return fSimulatedCases.load(std::memory_order_relaxed);
    }
    const SECSettings& GetSettings() const { return fSettings; }
    const SPCSettings& GetPlan() const { return fPlan; }

    // Hooks of MCAlgorithmCommon.
    void StoreProgressListener(MCCommon_800::ProgressListener* listener);
    void StoreCancelPointer(MCCommon_800::MCQueryCancel* cancel);

private:
    //! A fresh simulator of iteration `iter` drawing from the algorithm's stream.
    std::unique_ptr<SECSimulator> CreateMaster(int iter);
    //! Creates, prepares and appends the simulator of iteration `iter` (host-driven).
    MCStatus CreateHostSimulator(int iter);
    //! Runs one iteration's master: pilot, workers, merge, completion.
    MCStatus RunIteration(SECSimulator& master, MCXML_800::IMCSPScoreFactory* factory,
                          MCXML_800::SECAppDataProcess* sink);
    //! The simulator index a host-driven operation uses; `complete` for CompleteEvaluation.
    int ResolveIteration(int iter, bool complete) const;

    SECSettings fSettings;                      //!< run settings (copy)
    SPCSettings fPlan;                          //!< the completed plan (copy)
    const MCXML_800::MCVarList* fpVarList;      //!< host's variables, not owned
    std::unique_ptr<MCMath_800::MCURandom> fpStream; //!< the masters' uniform stream
    int fCaseLimit;                             //!< SPCSettings::GetMaxCases
    int fThreadLimit;                           //!< SECSettings::GetMaxThreadNum
    int fCacheLimit;                            //!< SECSettings::GetMemCacheKB
    int fNIterations = 1;                       //!< simulators in use
    int fCaseCounter = 0;                       //!< host-driven cases
    int fRecordCounter = 0;                     //!< records since PrepareEvaluation
    MCThread_800::IMCThreadFactory* fpThreadFactory; //!< host's, not owned
    std::vector<std::unique_ptr<SECSimulator>> fvSimulators; //!< index = iteration
    std::atomic<std::int64_t> fSimulatedCases{0}; //!< progress of SimulateData
};

} // namespace MCMCSP_800
