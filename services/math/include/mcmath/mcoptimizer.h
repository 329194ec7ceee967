// The constrained optimiser of the math services and the two interfaces through which it
// reaches a caller's model.
//
// The fitting estimates distribution parameters by maximum likelihood: its likelihood
// accumulators implement IMCOptAccumStats (objective = the negative log-likelihood, its
// gradient and Hessian, and linear constraints on the parameters), its data handler implements
// IMCOptDataHandler (feeds the records, if any, to the accumulator and has it finish). The
// optimiser minimises the objective over the parameter vector that the caller hands to
// MCOptimFactory::OptimFactory, in place, subject to the accumulator's constraints; each
// constraint row reads coefficients·θ + constant ≥ 0.
//
// Method. NLopt's SLSQP (Kraft 1988, "A software package for sequential quadratic
// programming", DFVLR-FB 88-28; NLopt algorithm LD_SLSQP): a sequential quadratic programming
// method with a BFGS approximation of the Hessian, driven by the objective and its gradient
// (the accumulator's scores), handling the linear inequality constraints exactly in its
// quadratic subproblems. Constraint rows with one non-zero coefficient are passed as bounds,
// which NLopt never lets a trial point violate, so the objective is only evaluated where each
// parameter lies inside its own range (a shape parameter stays positive); rows with several
// coefficients are passed as linear inequality constraints, which the estimate meets up to
// 1e-11·max(1, |constant|). NLopt needs a start inside the bounds; a start outside them is
// moved inside (MCOptimParams::fConstraintMode). With fDerivativeLevel 0 the derivative-free
// COBYLA (Powell 1994; NLopt LN_COBYLA) is used instead. SLSQP converges superlinearly near
// the optimum; for a smooth two-parameter likelihood it ends within some tens of evaluations,
// the estimate within about 1e-8 relative of the exact maximum (parameter rule, tolerance
// 1e-10).
//
// Every run creates its own NLopt object, and SLSQP and COBYLA keep their working state in it,
// so optimisers over different accumulators may run on several threads at once.
//
// Each evaluation: write the trial point into the parameter vector, the accumulator's
// PrepareEvaluation, the handler's ResetAccumStats(fResetMode, fbSeparationCheck), then one
// ComputeStatsForOptimizer call: kOptCompObjective when only the value is wanted,
// kOptCompScores when the gradient is wanted too. A handler's derivative pass also completes
// the objective (FinishComputations always completes it), so the optimiser never asks for the
// objective and the derivatives in one call: a handler that runs a value pass and then a
// derivative pass over its records would otherwise feed every record to the accumulator twice.
#pragma once

#include "mccommon/mcstatus.h"
#include "mcmath/mcsymmatrix.h"

#include <memory>
#include <vector>

namespace MCMath_800 {

//! Computation flags of IMCOptDataHandler::ComputeStatsForOptimizer; the handler treats the
//! two derivative flags alike.
inline constexpr int kOptCompObjective = 1; //!< the objective value
inline constexpr int kOptCompScores = 2;    //!< the objective and its gradient (scores)
inline constexpr int kOptCompHessian = 4;   //!< the objective, scores and Hessian

//! Status codes of the optimiser and of the data handlers that feed it (all errors except
//! kOptStatusNoConvergence, a warning).
inline constexpr long kOptStatusBadSetup = 301; //!< unusable settings, no parameters, a
                                                //!< non-finite start (or one outside the
                                                //!< bounds without repair), a constraint or
                                                //!< score of the wrong size, contradictory
                                                //!< constraints
inline constexpr long kOptStatusFailed = 302;   //!< the search failed, or the objective is not
                                                //!< finite at the estimate
inline constexpr long kOptStatusNoStats = 303;  //!< handler: no accumulator, no data, or no
                                                //!< computation requested
inline constexpr long kOptStatusNoRecord = 304; //!< handler: the record iterator gave no record
inline constexpr long kOptStatusNoConvergence = 305; //!< warning: the evaluation limit ended
                                                     //!< the search; the best point is kept
inline constexpr long kOptStatusRestartFailed = 307; //!< handler: restarting the records failed

// ------------------------------------------------------------------------------------------
//! The model side of an optimisation: sufficient statistics or per-row sums from which the
//! objective, its gradient and Hessian at the current parameters are completed, and the
//! linear constraints on the parameters. The objective is a negative log-likelihood (or any
//! function to minimise); the accumulator reads the current parameters from the vector that
//! the caller also handed to the optimiser. The virtual operations are declared in the slot
//! order that implementations follow.
class IMCOptAccumStats {
public:
    virtual ~IMCOptAccumStats() = default;
    //! Zeroes the objective, scores, Hessian and row counters before a new evaluation.
    //! `mode` and `separationCheck` are the caller's (MCOptimParams::fResetMode and
    //! fbSeparationCheck); the optimiser passes them through unchanged.
    virtual void Reset(int mode, bool separationCheck) = 0;
    //! True when the objective is a negative log-likelihood.
    virtual bool IsLogLikelihood() const { return true; }
    //! Adds one row (the record's values indexed by variable index); `derivFlag` 1 asks for
    //! the row's contributions to the derivatives too. 0 for an accepted row, non-zero for a
    //! rejected one (GetStatus then tells why).
    virtual int UpdateForRow(const std::vector<double>& values, int derivFlag) = 0;
    //! Completes objective and derivatives: FinishComputations(1).
    virtual bool FinishWithDerivatives() { return FinishComputations(1); }
    //! The completed objective (negative log-likelihood).
    virtual double GetObjective() const = 0;
    //! The completed gradient of the objective, one entry per parameter.
    virtual const std::vector<double>& GetScores() const = 0;
    //! Copies the completed Hessian of the objective into `out`.
    virtual void GetHessian(MCSymMatrix& out) const = 0;
    //! What the accumulator offers: an objective, scores, a Hessian, constraints.
    virtual bool HasObjective() const { return true; }
    virtual bool HasScores() const { return true; }
    virtual bool HasHessian() const { return true; }
    virtual bool HasConstraints() const { return true; }
    //! Called by the optimiser before every evaluation, before the reset.
    virtual void PrepareEvaluation() {}
    //! Number of linear constraint rows.
    virtual int GetNConstr() const = 0;
    //! Row `index`: `coeffs` (resized to the number of parameters) and `constant` such that
    //! coeffs·θ + constant ≥ 0. False for an index outside 0 .. GetNConstr() - 1.
    virtual bool GetConstrVarCoeff(int index, std::vector<double>& coeffs,
                                   double& constant) const = 0;
    //! Rows accepted, calls that rejected a row, accumulated weight since the last reset.
    virtual void GetCounts(int& validRows, int& invalidCalls, double& weight) const = 0;
    //! The outcome of the last operation that failed (success when none did).
    virtual MCCommon_800::MCStatus GetStatus() const = 0;
    //! Diagnostic listing through the display stream; `full` adds the sums.
    virtual void Display(bool full) const { (void)full; }
    //! Completes the objective from the accumulated statistics at the current parameters,
    //! and the scores and Hessian when `flag` is 1. False on failure (GetStatus tells why).
    virtual bool FinishComputations(int flag) = 0;
};

// ------------------------------------------------------------------------------------------
//! The data side of an optimisation: runs the caller's records (if any) through the
//! accumulator for one evaluation. The virtual operations are declared in the slot order that
//! implementations follow.
class IMCOptDataHandler {
public:
    virtual ~IMCOptDataHandler() = default;
    //! Attaches the accumulator (not owned); the optimiser factory attaches its accumulator.
    virtual void SetAccumStats(IMCOptAccumStats* accumStats) = 0;
    //! Forwards to the accumulator's Reset.
    virtual void ResetAccumStats(int mode, bool separationCheck) = 0;
    //! The attached accumulator, null when none.
    virtual IMCOptAccumStats* GetAccumStats() = 0;
    //! The attached accumulator for reading, null when none.
    virtual const IMCOptAccumStats* GetAccumStatsPtr() const = 0;
    //! Detaches the accumulator.
    virtual void ClearAccumStats() = 0;
    //! One evaluation: `compFlags` is kOptCompObjective, or kOptCompScores and/or
    //! kOptCompHessian (see the header note). Errors: kOptStatusNoStats, kOptStatusNoRecord,
    //! kOptStatusRestartFailed, code 1 when cancelled, or the accumulator's status.
    virtual MCCommon_800::MCStatus ComputeStatsForOptimizer(int compFlags) = 0;
    //! Warnings the handler collected.
    virtual const std::vector<MCCommon_800::MCStatus>& GetWarnings() const = 0;
    //! Called by the optimiser when a run ends.
    virtual void EndOptimization() {}
};

// ------------------------------------------------------------------------------------------
//! Settings of an optimiser run. A value type: default-construct, then set members.
struct MCOptimParams {
    int fMaxEvaluations = 500;      //!< most objective evaluations (NLopt maxeval); at least 1
    double fParamTolerance = 1e-10; //!< relative change of every parameter that ends the search
    double fObjTolerance = 1e-12;   //!< relative change of the objective that ends the search
    int fResetMode = 1;             //!< mode passed to ResetAccumStats before each evaluation
    bool fbSeparationCheck = false; //!< flag passed to ResetAccumStats with it
    bool fbDebug = false;           //!< print each evaluation through the display stream
    //! 0: derivative-free search (COBYLA); 1: SLSQP on objective and scores; 2: as 1, and the
    //! last evaluation at the estimate also asks for the Hessian, so that the accumulator
    //! holds objective, scores and Hessian of the estimate (for standard errors).
    int fDerivativeLevel = 2;
    //! 1: stop when the parameters change by less than fParamTolerance (relative); 2: when the
    //! objective changes by less than fObjTolerance (relative); 3: whichever comes first.
    int fConvergenceRule = 1;
    //! Bit 1: apply the accumulator's constraints (without it the search is unconstrained).
    //! Bit 2: a start value outside its bounds is moved inside them before the search (one
    //! unit inside the violated bound, or to the middle of a narrower range); without it such
    //! a start is kOptStatusBadSetup.
    int fConstraintMode = 3;
};

// ------------------------------------------------------------------------------------------
//! An optimiser bound to one data handler, accumulator and parameter vector.
class IMCOptimizer {
public:
    virtual ~IMCOptimizer() = default;
    //! Runs the search from the current parameter vector. On success (or the warning
    //! kOptStatusNoConvergence) the vector holds the estimate and the accumulator holds the
    //! objective and scores there (and the Hessian with fDerivativeLevel 2). On an error the
    //! vector holds its start values again. Never throws.
    virtual MCCommon_800::MCStatus Optimize() = 0;
    //! Objective evaluations of the last run.
    virtual int GetNEvaluations() const = 0;
    //! The objective at the estimate of the last run; missing when there is none.
    virtual double GetObjective() const = 0;
};

//! Creates optimisers.
class MCOptimFactory {
public:
    //! A new optimiser over `parameters` (in place). Attaches `accumStats` to `dataHandler`
    //! (SetAccumStats). Neither pointer is owned; both, and `parameters`, must outlive the
    //! optimiser. A null handler or accumulator gives an optimiser whose Optimize returns
    //! kOptStatusNoStats.
    static std::unique_ptr<IMCOptimizer> OptimFactory(IMCOptDataHandler* dataHandler,
                                                      IMCOptAccumStats* accumStats,
                                                      std::vector<double>& parameters,
                                                      const MCOptimParams& params);
};

} // namespace MCMath_800
