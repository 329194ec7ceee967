// Likelihood accumulators of the distribution fitting: the sufficient statistics of one
// covariate for one two-parameter distribution (Beta, Gamma, NegBin, two-parameter Weibull),
// and two ways to the maximum-likelihood estimate:
//
//  - as the model side of the math services' optimiser (IMCOptAccumStats): the negative
//    log-likelihood with its score vector and Hessian, and linear constraints that keep the
//    parameters inside their domain. The fitting drives the Beta accumulator this way, through
//    a DFCDataHandler without data (the sums are sufficient);
//  - by a one-dimensional root search on the likelihood equation of the shape parameter
//    (SolveParameters), after which the second parameter follows in closed form. The fitting
//    solves Gamma and NegBin this way in its optimisation step and the Weibull in its
//    goodness-of-fit step.
//
// Each accumulator works on the caller's parameter vector in place (the "Distribution
// Parameters" of the field's result element), so the estimate lands in the results directly.
// One accumulator is used by one task at a time; the data it points to is read only.
#pragma once

#include "component/mcspcomponent.h"
#include "mcmath/mcaccumulators.h"
#include "mcmath/mcoptimizer.h"
#include "mcmath/mcsymmatrix.h"
#include "simulation_common/mcspconst.h"

#include <vector>

namespace MCMCSP_800 {

class DFCSettings;
struct DFCGoodFitEntry;

// ------------------------------------------------------------------------------------------
//! The shared part of the likelihood accumulators: dimensions, the current parameter vector,
//! the accumulated objective, scores and Hessian, the counters of the row interface, the
//! linear constraints of positive shapes, the bracketing root search and the diagnostic
//! listing. The distribution-specific likelihoods live in the subclasses.
class DFCAccumStats : public MCMath_800::IMCOptAccumStats {
public:
    //! Accumulator of distribution `type` over `params` (not owned; it must outlive the
    //! accumulator), for the fitted variables `fitVars` with total weight `totalWeight`, per
    //! variable means, dispersions (the variance with divisor W - 1) and minimum values (zeros
    //! when empty). `fNParameters` is the length of `params`. The frequency weight variable is
    //! read from `settings` (not owned). Asserts "fNFitVars > 0" and
    //! "fNParameters % fNFitVars == 0".
    DFCAccumStats(const DFCSettings& settings, MCSPConst::DistType type,
                  std::vector<double>& params, const std::vector<int>& fitVars, double totalWeight,
                  const std::vector<double>& means, const std::vector<double>& dispersions,
                  const std::vector<double>& minimums = std::vector<double>());
    ~DFCAccumStats() override = default;
    DFCAccumStats(const DFCAccumStats&) = delete;
    DFCAccumStats& operator=(const DFCAccumStats&) = delete;

    // The optimiser's accumulator interface, in its slot order.

    //! Zeroes the objective, the scores, the Hessian and the three counters; stores `mode` and
    //! `separationCheck`.
    void Reset(int mode, bool separationCheck) override;
    bool IsLogLikelihood() const override { return true; }
    //! Asserts "DFCAccumStats::UpdateForRow should be in derived class" and returns 0.
    int UpdateForRow(const std::vector<double>& values, int derivFlag) override;
    bool FinishWithDerivatives() override { return FinishComputations(1); }
    //! The accumulated negative log-likelihood.
    double GetObjective() const override { return fNegLogLik; }
    //! The accumulated gradient of the negative log-likelihood.
    const std::vector<double>& GetScores() const override { return fvScores; }
    //! Copies the accumulated Hessian of the negative log-likelihood into `out`.
    void GetHessian(MCMath_800::MCSymMatrix& out) const override { out = fHessian; }
    bool HasObjective() const override { return true; }
    bool HasScores() const override { return true; }
    bool HasHessian() const override { return true; }
    bool HasConstraints() const override { return true; }
    void PrepareEvaluation() override {}
    //! `fNConstr`.
    int GetNConstr() const override { return fNConstr; }
    //! Constraint row `index` as coeffs·θ + constant ≥ 0: coefficient 1.0 at `index` and the
    //! constant -1e-5 (a parameter of at least 1e-5). False with a diagnostic for an index
    //! outside 0 .. fNParameters - 1.
    bool GetConstrVarCoeff(int index, std::vector<double>& coeffs, double& constant) const override;
    //! Rows accepted, rows rejected and the accumulated weight.
    void GetCounts(int& validRows, int& invalidCalls, double& weight) const override;
    //! The outcome of the last solve (or of the last rejected row).
    MCStatus GetStatus() const override { return fStatus; }
    //! "DisplayBase display start" ... "DisplayBase display end" through the display stream;
    //! subclasses append their sums in a frame of their own.
    void Display(bool full) const override;
    //! Completes the objective (and with `flag` 1 the scores and Hessian). The base asserts
    //! "DFCAccumStats::FinishComputations should be in derived class" and returns true.
    bool FinishComputations(int flag) override;

    // The root search of the likelihood equation.

    //! The likelihood equation of the shape parameter at `x`; missing where it is not
    //! defined. The base asserts and returns the missing value.
    virtual double EvaluateRootFunction(double x);
    //! Root search from the current shape and closed-form completion of the other parameter.
    //! True with the estimate in the parameter vector; false with status 390012 (error) and
    //! the parameters unchanged when no root was found. The base asserts and returns false.
    virtual bool SolveParameters();

    //! The root of EvaluateRootFunction found from `x0`: x0 itself when |F(x0)| ≤
    //! `tolerance`; otherwise a sign change is bracketed by doubling and halving (10 steps
    //! each; a probe with |F| ≤ `tolerance` is the root) and bisected until |F| ≤
    //! `tolerance` or the interval no longer shrinks. Missing when x0 ≤ 0, F(x0) or a value
    //! in the bisection is missing, or no bracket is found.
    double FindRoot(double x0, double tolerance = kRootTolerance);

    // Dimensions and data for the callers.

    MCSPConst::DistType GetDistType() const { return fDistType; }
    int GetNParameters() const { return fNParameters; }
    //! The parameter vector being estimated (the caller's).
    const std::vector<double>& GetParameters() const { return *fpParameters; }
    //! Sets the accumulated weight (for NegBin the sum of the category counts, for Weibull W).
    void SetAccumWeight(double weight) { fAccumWeight = weight; }

    //! |F| at which the root search stops.
    static constexpr double kRootTolerance = 1e-6;

protected:
    //! The weight of a row: the frequency weight variable's value, or 1.0 without one. 0 when
    //! the value is missing, not positive, not finite or outside `values`.
    double GetRowWeight(const std::vector<double>& values) const;
    //! The value of fitted variable `var` in a row; missing when outside `values`.
    double GetRowValue(const std::vector<double>& values, int var = 0) const;
    //! Counts a rejected row: the invalid-call counter, and `status` as the status.
    int RejectRow();
    //! Sets the status to 390012 (error) and returns false: the root search failed.
    bool FailRootSearch();

    const DFCSettings* fpSettings;     //!< source of the frequency weight variable
    MCSPConst::DistType fDistType;     //!< 10 Beta, 9 Gamma, 1 NegBin, 8 Weibull
    int fNParameters;                  //!< length of the parameter vector
    std::vector<double>* fpParameters; //!< the parameters being estimated (not owned)
    double fTotalWeight;               //!< W, weighted number of valid cases
    int fNFitVars;                     //!< number of fitted variables
    std::vector<int> fvFitVarIndices;  //!< variable indices of the fitted fields
    int fNBaseParams;                  //!< fNParameters / fNFitVars
    int fNConstr;                      //!< number of linear constraints
    int fFreqWeightVar;                //!< frequency weight variable, -1 none
    std::vector<double> fvMeans;       //!< per fitted variable
    std::vector<double> fvDispersions; //!< per fitted variable, variance with divisor W - 1
    std::vector<double> fvMinimums;    //!< per fitted variable
    double fNegLogLik = 0.0;           //!< accumulated negative log-likelihood
    std::vector<double> fvScores;      //!< gradient of the negative log-likelihood
    MCMath_800::MCSymMatrix fHessian;  //!< Hessian of the negative log-likelihood
    int fNValidRows = 0;               //!< rows accepted by UpdateForRow
    int fNInvalidCalls = 0;            //!< rows rejected by UpdateForRow
    double fAccumWeight = 0.0;         //!< accumulated weight
    int fMode = 1;                     //!< mode of the last reset
    bool fbSeparationCheck = false;    //!< separation-check flag of the last reset
    bool fbValid = false;              //!< the Hessian has order fNParameters
    MCStatus fStatus;                  //!< outcome of the last solve
};

// ------------------------------------------------------------------------------------------
//! Beta (shape1 a, shape2 b) on 0 < x < 1 from S1 = Σ w·ln x and S2 = Σ w·ln(1 - x):
//! ln L = W·(lnΓ(a+b) - lnΓ(a) - lnΓ(b)) + (a-1)·S1 + (b-1)·S2. Fitted by the optimiser
//! without data; there is no root search.
class DFCAccumStatsBeta : public DFCAccumStats {
public:
    //! Asserts "fNBaseParams == 2", "fNFitVars == 1" and "fNConstr == 2".
    DFCAccumStatsBeta(const DFCSettings& settings, std::vector<double>& params,
                      const std::vector<int>& fitVars, double totalWeight,
                      const std::vector<double>& means, const std::vector<double>& dispersions,
                      const std::vector<double>& minimums = std::vector<double>());

    void SetSumLogXi(double sum) { fSumLogXi = sum; }
    void SetSumLog1MinusXi(double sum) { fSumLog1MinusXi = sum; }

    //! -ln L at the current (a, b); with `flag` 1 also its scores and Hessian (digamma and
    //! trigamma). False with status 302 (the optimiser's "objective not finite") when a
    //! parameter is not positive or a value is not finite.
    bool FinishComputations(int flag) override;
    void Display(bool full) const override;

private:
    double fSumLogXi = 0.0;       //!< Σ w·ln x
    double fSumLog1MinusXi = 0.0; //!< Σ w·ln(1 - x)
};

// ------------------------------------------------------------------------------------------
//! Gamma (shape α, rate β, density β^α·x^(α-1)·e^(-βx)/Γ(α); β is stored as "scale") from
//! S = Σ w·ln x and the mean. Likelihood equation of the shape:
//! F(α) = ln(α/mean) - ψ(α) + S/W, then β = α/mean.
class DFCAccumStatsGamma : public DFCAccumStats {
public:
    //! Asserts "fNBaseParams == 2", "fNFitVars == 1" and "fNConstr == 2". Σ x is taken as
    //! mean·W.
    DFCAccumStatsGamma(const DFCSettings& settings, std::vector<double>& params,
                       const std::vector<int>& fitVars, double totalWeight,
                       const std::vector<double>& means, const std::vector<double>& dispersions,
                       const std::vector<double>& minimums = std::vector<double>());

    void SetSumLogXi(double sum) { fSumLogXi = sum; }

    //! Adds the row's -ln f(x; α, β) (and its derivatives with `derivFlag` 1); a row with
    //! x ≤ 0, a missing value or an unusable weight is rejected.
    int UpdateForRow(const std::vector<double>& values, int derivFlag) override;
    //! Without accepted rows since the reset: -ln L from the sums; otherwise the row sums
    //! stand.
    bool FinishComputations(int flag) override;
    double EvaluateRootFunction(double x) override;
    bool SolveParameters() override;
    void Display(bool full) const override;

private:
    //! Adds w·(-ln f) of the sums (W, Σ w·ln x, Σ w·x) at the current parameters.
    bool AddTerms(double weight, double sumLog, double sumX, bool derivatives);

    double fSumLogXi = 0.0; //!< Σ w·ln x
    double fSumXi = 0.0;    //!< Σ w·x
};

// ------------------------------------------------------------------------------------------
//! Negative binomial (r "thresh", p "prob", then the "type" entry) counting failures:
//! Γ(r+x)/(Γ(r)·x!)·p^r·(1-p)^x for whole x ≥ 0, from the weighted counts n_k of the values
//! k = 0 .. K-1. Likelihood equation of r with p profiled out (p = r/(r + mean)):
//! F(r) = Wc·ln(r/(r + mean)) - Wc·ψ(r) + Σ n_k·ψ(k + r); the estimate rounds r to a whole
//! number of at least 1 and sets p = r/(r + mean).
class DFCAccumStatsNegBin : public DFCAccumStats {
public:
    //! `fNConstr` = 3·fNFitVars: r ≥ 0, p ≥ 0, 1 - p ≥ 0 per fitted variable.
    DFCAccumStatsNegBin(const DFCSettings& settings, std::vector<double>& params,
                        const std::vector<int>& fitVars, double totalWeight,
                        const std::vector<double>& means, const std::vector<double>& dispersions,
                        const std::vector<double>& minimums = std::vector<double>());

    //! Takes the counts of `catStats` (GetCatCounts), their sum as the accumulated weight
    //! (GetSumCounts) and the number of categories (GetNCategories(true)).
    void SetCatStats(const MCMath_800::MCCatStats& catStats);

    //! Row k = 3·j + c of fitted variable j (m = 2·j): c = 0: r ≥ 0; c = 1: p ≥ 0;
    //! c = 2: 1 - p ≥ 0. False with a diagnostic for an index outside 0 .. fNConstr - 1.
    bool GetConstrVarCoeff(int index, std::vector<double>& coeffs, double& constant) const override;
    //! Adds the row's -ln f(x; r, p); a value that is not a whole number ≥ 0, a missing value
    //! or an unusable weight is rejected.
    int UpdateForRow(const std::vector<double>& values, int derivFlag) override;
    //! Without accepted rows since the reset: -ln L from the counts.
    bool FinishComputations(int flag) override;
    double EvaluateRootFunction(double x) override;
    bool SolveParameters() override;
    void Display(bool full) const override;

private:
    //! Adds weight·(-ln f(k)) at the current (r, p) and, with `derivatives`, its gradient and
    //! Hessian in (r, p).
    bool AddTerm(double weight, double k, bool derivatives);

    double fSumXi = 0.0;             //!< Σ n_k·k
    double fSumLogGammaXi1 = 0.0;    //!< Σ n_k·lnΓ(k + 1)
    double fSumCounts = 0.0;         //!< Wc = Σ n_k (kept apart from the accumulated weight,
                                     //!< which a reset zeroes)
    std::vector<double> fvCatCounts; //!< n_k, weighted count of the value k
    int fNCategories = 0;            //!< K
};

// ------------------------------------------------------------------------------------------
//! Two-parameter Weibull (scale a, shape b, location c = 0; c is left as it is):
//! (b/a)·(x/a)^(b-1)·e^(-(x/a)^b) for x > 0, over the field's sorted (value, record) entries
//! with the per-record weights. Likelihood equation of the shape:
//! F(b) = S/W + 1/b - Σ w_i·v_i^b·ln v_i / Σ w_i·v_i^b, then a = (Σ w_i·v_i^b / W)^(1/b).
class DFCAccumStatsWeibTwo : public DFCAccumStats {
public:
    //! `fNConstr` = fNParameters; rows 0 and 1 (a, b) keep the shapes positive.
    DFCAccumStatsWeibTwo(const DFCSettings& settings, std::vector<double>& params,
                         const std::vector<int>& fitVars, double totalWeight,
                         const std::vector<double>& means, const std::vector<double>& dispersions,
                         const std::vector<double>& minimums = std::vector<double>());

    //! The field's entries sorted by value (not owned; they must outlive every solve).
    void SetSortedEntries(const std::vector<DFCGoodFitEntry>* entries);
    //! The weight of each valid record by its ordinal (not owned); null or empty: every
    //! weight is 1.0.
    void SetWeights(const std::vector<double>* weights) {
        fpWeights = weights;
        fbCacheValid = false;
    }
    //! S = Σ w·ln x of the field.
    void SetSumLogXi(double sum) { fSumLogXi = sum; }
    //! All data at once: entries, weights (null for none), W as accumulated weight, and S.
    void SetData(const std::vector<DFCGoodFitEntry>* entries, const std::vector<double>* weights,
                 double totalWeight, double sumLogXi);

    //! Row `index` with `index` mod fNBaseParams ≤ 1: the parameter is at least 1e-5; other
    //! rows have no coefficient (the location is free).
    bool GetConstrVarCoeff(int index, std::vector<double>& coeffs, double& constant) const override;
    //! Adds the row's -ln f(x; a, b) (location 0); x ≤ 0, a missing value or an unusable
    //! weight is rejected.
    int UpdateForRow(const std::vector<double>& values, int derivFlag) override;
    //! Without accepted rows since the reset: -ln L over the entries.
    bool FinishComputations(int flag) override;
    double EvaluateRootFunction(double x) override;
    bool SolveParameters() override;
    void Display(bool full) const override;

private:
    //! The weight of entry `i`: its record's weight, 1.0 without weights, 0 when the record
    //! ordinal has no weight.
    double EntryWeight(std::size_t i) const;
    //! Adds w·(-ln f(x)) at (a, b) and, with `derivatives`, its gradient and Hessian.
    bool AddTerm(double weight, double x, bool derivatives);
    //! Fills the (ln v, w) cache of the entries with v > 0 and w > 0; false when the data are
    //! unusable (no entry, a weight that does not exist).
    bool BuildLogCache();
    //! Frees the cache (it is rebuilt when needed again).
    void ReleaseLogCache();
    //! F(b) of the likelihood equation, its slope F'(b) and Σ w_i·v_i^b / v_max^b; false
    //! where they are not defined.
    bool EvaluateEquation(double b, double& f, double& slope, double& sumPow);
    //! W of the likelihood equation: the accumulated weight, or the total weight when unset.
    double GetEquationWeight() const { return fAccumWeight > 0.0 ? fAccumWeight : fTotalWeight; }

    const std::vector<DFCGoodFitEntry>* fpEntries = nullptr; //!< sorted entries, not owned
    const std::vector<double>* fpWeights = nullptr;          //!< record weights, not owned
    int fNEntries = 0;                                       //!< number of entries
    double fSumLogXi = 0.0;                                  //!< S = Σ w·ln x
    // Cache of the root search, rebuilt when the data change.
    bool fbCacheValid = false;        //!< the cache matches the data
    bool fbCacheUsable = false;       //!< the data gave a usable cache
    std::vector<double> fvLogValues;  //!< ln v of the entries with v > 0 (and w > 0)
    std::vector<double> fvLogWeights; //!< their weights
    double fMaxLogValue = 0.0;        //!< largest ln v, the scale of the sums
};

} // namespace MCMCSP_800
