#include "mcmath/mcoptimizer.h"

#include "mccommon/display.h"
#include "mccommon/mcmv.h"

#include <nlopt.h>

#include <algorithm>
#include <cmath>
#include <exception>

namespace MCMath_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;

namespace {

MCStatus Error(long code) {
    return MCStatus(code, false);
}

//! Relative amount by which a constraint row with several coefficients may miss.
constexpr double kRowTolerance = 1e-11;

//! One constraint row with several coefficients: coeffs·θ + constant ≥ 0.
struct LinearRow {
    std::vector<double> fvCoeffs; //!< one coefficient per parameter
    double fConstant;             //!< the constant term
};

//! Destroys an NLopt object when the run ends, however it ends.
struct NLoptHandle {
    nlopt_opt fOpt = nullptr; //!< owned
    ~NLoptHandle() {
        if (fOpt) {
            nlopt_destroy(fOpt);
        }
    }
};

// The optimiser behind MCOptimFactory; the method is described in mcoptimizer.h.
class MCNLoptOptimizer final : public IMCOptimizer {
public:
    MCNLoptOptimizer(IMCOptDataHandler* handler, IMCOptAccumStats* accumStats,
                     std::vector<double>& parameters, const MCOptimParams& params)
        : fpHandler(handler), fpAccum(accumStats), fpParams(&parameters), fParams(params) {}

    MCStatus Optimize() override;
    int GetNEvaluations() const override { return fNEvals; }
    double GetObjective() const override { return fObjective; }

private:
    MCStatus CheckSettings() const;
    MCStatus ReadConstraints(std::vector<double>& lower, std::vector<double>& upper);
    MCStatus PlaceStart(std::vector<double>& x, const std::vector<double>& lower,
                        const std::vector<double>& upper) const;
    MCStatus Search(std::vector<double>& x, const std::vector<double>& lower,
                    const std::vector<double>& upper);
    //! One evaluation at x with the handler flags `compFlags`; the objective into `value`
    //! and, when `grad` is not null, the scores into it.
    MCStatus Evaluate(const double* x, int compFlags, double& value, double* grad);
    static double ObjectiveCallback(unsigned n, const double* x, double* grad, void* data);
    static double ConstraintCallback(unsigned n, const double* x, double* grad, void* data);

    IMCOptDataHandler* fpHandler;        //!< not owned
    IMCOptAccumStats* fpAccum;           //!< not owned
    std::vector<double>* fpParams;       //!< the parameter vector worked on in place, not owned
    MCOptimParams fParams;               //!< settings
    std::vector<LinearRow> fvRows;       //!< constraint rows with several coefficients
    nlopt_opt fOpt = nullptr;            //!< the running NLopt object (for the forced stop)
    MCStatus fEvalStatus;                //!< first error raised inside an evaluation
    int fNEvals = 0;                     //!< evaluations of the last run
    double fObjective = MCMV::Missing(); //!< objective at the estimate of the last run
};

MCStatus MCNLoptOptimizer::CheckSettings() const {
    const MCOptimParams& p = fParams;
    const bool valid = p.fMaxEvaluations >= 1 && std::isfinite(p.fParamTolerance) &&
                       p.fParamTolerance >= 0.0 && std::isfinite(p.fObjTolerance) &&
                       p.fObjTolerance >= 0.0 && p.fDerivativeLevel >= 0 &&
                       p.fDerivativeLevel <= 2 && p.fConvergenceRule >= 1 &&
                       p.fConvergenceRule <= 3 && p.fConstraintMode >= 0 && p.fConstraintMode <= 3;
    return valid ? MCStatus() : Error(kOptStatusBadSetup);
}

// Rows with one non-zero coefficient c at parameter j are bounds θ_j ≥ -constant/c (c > 0) or
// θ_j ≤ -constant/c (c < 0); rows without coefficients must hold as they stand.
MCStatus MCNLoptOptimizer::ReadConstraints(std::vector<double>& lower, std::vector<double>& upper) {
    const std::size_t n = fpParams->size();
    std::vector<double> coeffs;
    for (int k = 0; k < fpAccum->GetNConstr(); ++k) {
        double constant = 0.0;
        if (!fpAccum->GetConstrVarCoeff(k, coeffs, constant) || coeffs.size() != n ||
            !std::isfinite(constant) ||
            !std::all_of(coeffs.begin(), coeffs.end(), [](double c) { return std::isfinite(c); })) {
            return Error(kOptStatusBadSetup);
        }
        const auto nonZero =
            std::count_if(coeffs.begin(), coeffs.end(), [](double c) { return c != 0.0; });
        if (nonZero == 0) {
            if (constant < 0.0) {
                return Error(kOptStatusBadSetup);
            }
            continue;
        }
        if (nonZero == 1) {
            const auto j = static_cast<std::size_t>(
                std::find_if(coeffs.begin(), coeffs.end(), [](double c) { return c != 0.0; }) -
                coeffs.begin());
            const double bound = -constant / coeffs[j];
            if (coeffs[j] > 0.0) {
                lower[j] = std::max(lower[j], bound);
            } else {
                upper[j] = std::min(upper[j], bound);
            }
            continue;
        }
        fvRows.push_back(LinearRow{coeffs, constant});
    }
    for (std::size_t j = 0; j < n; ++j) {
        if (!(lower[j] <= upper[j])) {
            return Error(kOptStatusBadSetup);
        }
    }
    return MCStatus();
}

MCStatus MCNLoptOptimizer::PlaceStart(std::vector<double>& x, const std::vector<double>& lower,
                                      const std::vector<double>& upper) const {
    const bool repair = (fParams.fConstraintMode & 2) != 0;
    for (std::size_t j = 0; j < x.size(); ++j) {
        if (x[j] >= lower[j] && x[j] <= upper[j]) {
            continue;
        }
        if (!repair) {
            return Error(kOptStatusBadSetup);
        }
        const double width = upper[j] - lower[j];
        if (width <= 2.0) {
            x[j] = lower[j] + 0.5 * width;
        } else if (x[j] < lower[j]) {
            x[j] = lower[j] + 1.0;
        } else {
            x[j] = upper[j] - 1.0;
        }
    }
    return MCStatus();
}

MCStatus MCNLoptOptimizer::Evaluate(const double* x, int compFlags, double& value, double* grad) {
    std::vector<double>& params = *fpParams;
    std::copy(x, x + params.size(), params.begin());
    fpAccum->PrepareEvaluation();
    fpHandler->ResetAccumStats(fParams.fResetMode, fParams.fbSeparationCheck);
    const MCStatus status = fpHandler->ComputeStatsForOptimizer(compFlags);
    ++fNEvals;
    if (status.IsError()) {
        return status;
    }
    value = fpAccum->GetObjective();
    if (grad) {
        const std::vector<double>& scores = fpAccum->GetScores();
        if (scores.size() != params.size()) {
            return Error(kOptStatusBadSetup);
        }
        std::copy(scores.begin(), scores.end(), grad);
    }
    if (fParams.fbDebug) {
        MCDisplay_800::DisplayDV("Optimizer parameters", params);
        MCDisplay_800::DisplayD("Optimizer objective", value);
        if (grad) {
            MCDisplay_800::DisplayDV("Optimizer scores", fpAccum->GetScores());
        }
    }
    return MCStatus();
}

double MCNLoptOptimizer::ObjectiveCallback(unsigned n, const double* x, double* grad, void* data) {
    auto* self = static_cast<MCNLoptOptimizer*>(data);
    double value = HUGE_VAL;
    MCStatus status;
    // Nothing may unwind through NLopt's C frames: a throwing handler ends the search here.
    try {
        status = self->Evaluate(x, grad ? kOptCompScores : kOptCompObjective, value, grad);
    } catch (const std::exception&) {
        status = Error(kOptStatusFailed);
    } catch (...) {
        status = Error(kOptStatusFailed);
    }
    if (status.IsError()) {
        self->fEvalStatus = status;
        nlopt_force_stop(self->fOpt);
        return HUGE_VAL;
    }
    if (!std::isfinite(value)) {
        // Outside the objective's domain: report a value no step will accept.
        if (grad) {
            std::fill(grad, grad + n, 0.0);
        }
        return HUGE_VAL;
    }
    return value;
}

// NLopt's inequality constraints read fc(θ) ≤ 0; a row coeffs·θ + constant ≥ 0 becomes
// fc(θ) = -(coeffs·θ + constant), with gradient -coeffs.
double MCNLoptOptimizer::ConstraintCallback(unsigned n, const double* x, double* grad, void* data) {
    const auto* row = static_cast<const LinearRow*>(data);
    double s = row->fConstant;
    for (unsigned j = 0; j < n; ++j) {
        s += row->fvCoeffs[j] * x[j];
        if (grad) {
            grad[j] = -row->fvCoeffs[j];
        }
    }
    return -s;
}

MCStatus MCNLoptOptimizer::Search(std::vector<double>& x, const std::vector<double>& lower,
                                  const std::vector<double>& upper) {
    const bool useScores = fParams.fDerivativeLevel >= 1 && fpAccum->HasScores();
    NLoptHandle handle;
    handle.fOpt =
        nlopt_create(useScores ? NLOPT_LD_SLSQP : NLOPT_LN_COBYLA, static_cast<unsigned>(x.size()));
    if (!handle.fOpt) {
        return Error(kOptStatusFailed);
    }
    fOpt = handle.fOpt;
    bool ok = nlopt_set_lower_bounds(fOpt, lower.data()) == NLOPT_SUCCESS &&
              nlopt_set_upper_bounds(fOpt, upper.data()) == NLOPT_SUCCESS &&
              nlopt_set_min_objective(fOpt, &ObjectiveCallback, this) == NLOPT_SUCCESS &&
              nlopt_set_maxeval(fOpt, fParams.fMaxEvaluations) == NLOPT_SUCCESS;
    // A row counts as satisfied up to rounding (NLopt returns the best point that it deems
    // feasible, so a zero tolerance would discard a point on the row that misses it by an ulp).
    for (LinearRow& row : fvRows) {
        const double tolerance = kRowTolerance * std::max(1.0, std::fabs(row.fConstant));
        ok = ok && nlopt_add_inequality_constraint(fOpt, &ConstraintCallback, &row, tolerance) ==
                       NLOPT_SUCCESS;
    }
    if (fParams.fConvergenceRule & 1) {
        ok = ok && nlopt_set_xtol_rel(fOpt, fParams.fParamTolerance) == NLOPT_SUCCESS;
    }
    if (fParams.fConvergenceRule & 2) {
        ok = ok && nlopt_set_ftol_rel(fOpt, fParams.fObjTolerance) == NLOPT_SUCCESS;
    }
    if (!ok) {
        fOpt = nullptr;
        return Error(kOptStatusBadSetup);
    }
    double minimum = HUGE_VAL;
    const nlopt_result result = nlopt_optimize(fOpt, x.data(), &minimum);
    fOpt = nullptr;
    if (fEvalStatus.IsError()) {
        return fEvalStatus;
    }
    switch (result) {
    case NLOPT_SUCCESS:
    case NLOPT_STOPVAL_REACHED:
    case NLOPT_FTOL_REACHED:
    case NLOPT_XTOL_REACHED:
    // Rounding stopped further progress: the point is as good as the arithmetic allows.
    case NLOPT_ROUNDOFF_LIMITED:
        break;
    case NLOPT_MAXEVAL_REACHED:
    case NLOPT_MAXTIME_REACHED:
        return MCStatus(kOptStatusNoConvergence, true);
    case NLOPT_INVALID_ARGS:
        return Error(kOptStatusBadSetup);
    default:
        return Error(kOptStatusFailed);
    }
    return std::isfinite(minimum) ? MCStatus() : Error(kOptStatusFailed);
}

MCStatus MCNLoptOptimizer::Optimize() {
    fNEvals = 0;
    fObjective = MCMV::Missing();
    fEvalStatus = MCStatus();
    fvRows.clear();
    if (!fpHandler || !fpAccum) {
        return Error(kOptStatusNoStats);
    }
    std::vector<double>& params = *fpParams;
    const std::vector<double> start = params;
    MCStatus status = CheckSettings();
    if (status.IsError()) {
        return status;
    }
    if (params.empty() || !fpAccum->HasObjective() ||
        !std::all_of(params.begin(), params.end(), [](double v) { return std::isfinite(v); })) {
        return Error(kOptStatusBadSetup);
    }
    try {
        std::vector<double> lower(params.size(), -HUGE_VAL);
        std::vector<double> upper(params.size(), HUGE_VAL);
        if ((fParams.fConstraintMode & 1) && fpAccum->HasConstraints()) {
            status = ReadConstraints(lower, upper);
        }
        std::vector<double> x = params;
        if (!status.IsError()) {
            status = PlaceStart(x, lower, upper);
        }
        if (!status.IsError()) {
            status = Search(x, lower, upper);
        }
        if (!status.IsError()) {
            // Leave the accumulator's state at the estimate: NLopt's last evaluation need not
            // have been at the best point it returns.
            const bool hessian = fParams.fDerivativeLevel == 2 && fpAccum->HasHessian();
            const int flags = fpAccum->HasScores()
                                  ? kOptCompScores | (hessian ? kOptCompHessian : 0)
                                  : kOptCompObjective;
            double value = MCMV::Missing();
            const MCStatus last = Evaluate(x.data(), flags, value, nullptr);
            if (last.IsError()) {
                status = last;
            } else if (!std::isfinite(value)) {
                status = Error(kOptStatusFailed);
            } else {
                fObjective = value;
            }
        }
    } catch (...) {
        status = Error(kOptStatusFailed);
    }
    if (status.IsError()) {
        params = start;
    }
    fpHandler->EndOptimization();
    return status;
}

} // namespace

std::unique_ptr<IMCOptimizer> MCOptimFactory::OptimFactory(IMCOptDataHandler* dataHandler,
                                                           IMCOptAccumStats* accumStats,
                                                           std::vector<double>& parameters,
                                                           const MCOptimParams& params) {
    if (dataHandler && accumStats) {
        dataHandler->SetAccumStats(accumStats);
    }
    return std::make_unique<MCNLoptOptimizer>(dataHandler, accumStats, parameters, params);
}

} // namespace MCMath_800
