// The data side of the fitting's maximum-likelihood step, and its worker task.
//
// DFCDataHandler feeds the records of a multi-pass iterator (if any) to a likelihood
// accumulator for one evaluation of the math services' optimiser, and has the accumulator
// complete its objective and derivatives. The fitting hands it no data: the Beta accumulator
// completes everything from its sufficient statistics.
//
// DFCOptimThreadTask is one (covariate, distribution) pair of DFCAlgorithm::OptimizeDistParams:
// it runs the optimiser (Beta) or the accumulator's root search (NegBin, Gamma) on a thread of
// the host's thread factory, writing only the parameter vector of its own result element.
#pragma once

#include "component/mcspcomponent.h"
#include "mccommon/hostinterfaces.h"
#include "mcmath/mccancelinfo.h"
#include "mcmath/mcoptimizer.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspconst.h"

#include <vector>

namespace MCMCSP_800 {

class DFCAccumStats;

// ------------------------------------------------------------------------------------------
//! Runs the records, if any, through the attached accumulator for one optimiser evaluation.
class DFCDataHandler : public MCMath_800::IMCOptDataHandler {
public:
    //! A handler over `data` (null: the accumulator's sums are sufficient), polling
    //! `cancelInfo` (may be null) and collecting into `warnings` (may be null). None is owned.
    DFCDataHandler(MCCommon_800::MultiPassRecordIter* data, MCMath_800::MCCancelInfo* cancelInfo,
                   MCWarnings* warnings);
    ~DFCDataHandler() override = default;
    DFCDataHandler(const DFCDataHandler&) = delete;
    DFCDataHandler& operator=(const DFCDataHandler&) = delete;

    // The optimiser's data-handler interface, in its slot order.

    void SetAccumStats(MCMath_800::IMCOptAccumStats* accumStats) override {
        fpAccStats = accumStats;
    }
    //! Forwards to the accumulator's reset (nothing without an accumulator).
    void ResetAccumStats(int mode, bool separationCheck) override;
    MCMath_800::IMCOptAccumStats* GetAccumStats() override { return fpAccStats; }
    const MCMath_800::IMCOptAccumStats* GetAccumStatsPtr() const override { return fpAccStats; }
    void ClearAccumStats() override { fpAccStats = nullptr; }
    //! One evaluation. `compFlags` 1 asks for the objective, 2 or 4 (alike) for the
    //! derivatives as well. Without data only the accumulator's FinishComputations runs.
    //! Errors: 307 (restart failed), 303 (no accumulator, empty data, nothing asked), 304 (no
    //! record), 1 (a cancel is pending), or the accumulator's status. The result is also
    //! kept (GetStatus).
    MCStatus ComputeStatsForOptimizer(int compFlags) override;
    //! The statuses of the warnings object; an empty list without one.
    const std::vector<MCStatus>& GetWarnings() const override;
    void EndOptimization() override {}

    //! The result of the last evaluation.
    MCStatus GetStatus() const { return fStatus; }

private:
    //! One pass over the data with `derivFlag`, then FinishComputations(derivFlag).
    MCStatus RunPass(int derivFlag);

    MCStatus fStatus;                                   //!< result of the last evaluation
    MCWarnings* fpWarnings;                             //!< collected warnings, not owned
    MCCommon_800::MultiPassRecordIter* fpData;          //!< records, not owned; may be null
    MCMath_800::MCCancelInfo* fpCancelInfo;             //!< the algorithm's cancel flag
    MCMath_800::IMCOptAccumStats* fpAccStats = nullptr; //!< the accumulator, not owned
};

// ------------------------------------------------------------------------------------------
//! One maximum-likelihood fit of the optimisation step. The task owns nothing: the creator
//! keeps the accumulator, the optimiser and the handler alive until the task has run.
class DFCOptimThreadTask : public MCThread_800::IMCThreadTask {
public:
    DFCOptimThreadTask() = default;
    //! A task for covariate position `covariate` and distribution `type` with its
    //! accumulator, optimiser (null: the accumulator's root search) and training data (null:
    //! no records; the optimiser then works on the sufficient statistics).
    DFCOptimThreadTask(int covariate, MCSPConst::DistType type, DFCAccumStats* accumStats,
                       MCMath_800::IMCOptimizer* optimizer,
                       MCCommon_800::MultiPassRecordIter* trainData = nullptr);
    ~DFCOptimThreadTask() override = default;

    //! With an optimiser: restarts the training data unless the type is Beta, then runs the
    //! optimiser when there is no training data or the debug-optimizer switch is on. Without
    //! one: the accumulator's SolveParameters (NegBin, Gamma). The outcome is the task's
    //! status; an exception becomes status 390005 (error).
    void RunTask() override;

    int GetCovariate() const { return fCovariate; }
    MCSPConst::DistType GetDistType() const { return fDistType; }
    bool HasOptimizer() const { return fpOptimizer != nullptr; }
    MCStatus GetStatus() const { return fStatus; }

private:
    int fCovariate = -1;                                      //!< covariate position
    MCSPConst::DistType fDistType = MCSPConst::kDistUnknown;  //!< 1, 9 or 10
    MCCommon_800::MultiPassRecordIter* fpTrainData = nullptr; //!< null for the fitting
    MCMath_800::IMCOptimizer* fpOptimizer = nullptr;          //!< Beta only
    MCStatus fStatus;                                         //!< result of the task
    DFCAccumStats* fpAccStats = nullptr;                      //!< the task's accumulator
};

} // namespace MCMCSP_800
