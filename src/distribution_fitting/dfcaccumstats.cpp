#include "distribution_fitting/dfcaccumstats.h"

#include "component/mcspassert.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcsettings.h"
#include "mccommon/display.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"
#include "mcmath/mcmathfun.h"

#include <cmath>
#include <limits>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCMath_800::MCDistFun;
using MCMath_800::MCMathFun;
using namespace MCSPConst;

namespace {

//! Lower bound of a positive shape in the constraint rows: θ - 1e-5 ≥ 0.
constexpr double kMinShape = 1e-5;
//! Doubling and halving steps of the bracket search.
constexpr int kBracketSteps = 10;

//! The status of an objective that cannot be completed (a parameter outside its domain).
MCStatus ObjectiveFailed() {
    return MCStatus(MCMath_800::kOptStatusFailed, false);
}

bool AllFinite(std::initializer_list<double> values) {
    for (double v : values) {
        if (!std::isfinite(v)) {
            return false;
        }
    }
    return true;
}

} // namespace

// ------------------------------------------------------------------------------------------
// DFCAccumStats

DFCAccumStats::DFCAccumStats(const DFCSettings& settings, DistType type,
                             std::vector<double>& params, const std::vector<int>& fitVars,
                             double totalWeight, const std::vector<double>& means,
                             const std::vector<double>& dispersions,
                             const std::vector<double>& minimums)
    : fpSettings(&settings), fDistType(type), fNParameters(static_cast<int>(params.size())),
      fpParameters(&params), fTotalWeight(totalWeight), fNFitVars(static_cast<int>(fitVars.size())),
      fvFitVarIndices(fitVars), fNBaseParams(0), fNConstr(fNParameters),
      fFreqWeightVar(settings.GetFrequencyWeightVar()), fvMeans(means), fvDispersions(dispersions),
      fvMinimums(minimums) {
    const bool fitVarsOK = MCSP_ASSERT(fNFitVars > 0, "fNFitVars > 0");
    if (fitVarsOK) {
        static_cast<void>(
            MCSP_ASSERT(fNParameters % fNFitVars == 0, "fNParameters % fNFitVars == 0"));
        fNBaseParams = fNParameters / fNFitVars;
    }
    const auto nVars = static_cast<std::size_t>(fNFitVars);
    fvMeans.resize(nVars, MCMV::Missing());
    fvDispersions.resize(nVars, MCMV::Missing());
    fvMinimums.resize(nVars, 0.0);
    fvScores.assign(static_cast<std::size_t>(fNParameters), 0.0);
    fHessian.SetNRows(fNParameters);
    fbValid = fHessian.GetNRows() == fNParameters;
}

void DFCAccumStats::Reset(int mode, bool separationCheck) {
    fNegLogLik = 0.0;
    fvScores.assign(static_cast<std::size_t>(fNParameters), 0.0);
    fNValidRows = 0;
    fNInvalidCalls = 0;
    fAccumWeight = 0.0;
    // The matrix's own reset zeroes it; it takes no mode.
    fHessian.Reset();
    fMode = mode;
    fbSeparationCheck = separationCheck;
}

int DFCAccumStats::UpdateForRow(const std::vector<double>& /*values*/, int /*derivFlag*/) {
    static_cast<void>(MCSP_ASSERT(false, "DFCAccumStats::UpdateForRow should be in derived class"));
    return 0;
}

bool DFCAccumStats::GetConstrVarCoeff(int index, std::vector<double>& coeffs,
                                      double& constant) const {
    coeffs.assign(static_cast<std::size_t>(fNParameters), 0.0);
    constant = 0.0;
    if (!MCSP_ASSERT(index >= 0, "DFCAccumStats::GetConstrVarCoeff: index > 0.") ||
        !MCSP_ASSERT(index <= fNParameters - 1,
                     "DFCAccumStats::GetConstrVarCoeff: index <= fNParameters - 1.")) {
        return false;
    }
    coeffs[static_cast<std::size_t>(index)] = 1.0;
    constant = -kMinShape;
    return true;
}

void DFCAccumStats::GetCounts(int& validRows, int& invalidCalls, double& weight) const {
    validRows = fNValidRows;
    invalidCalls = fNInvalidCalls;
    weight = fAccumWeight;
}

void DFCAccumStats::Display(bool /*full*/) const {
    using namespace MCDisplay_800;
    DisplayFrame frame("DisplayBase display start", "DisplayBase display end");
    DisplayD("Accumulated log-likelihood", fNegLogLik);
    DisplayI("Distribution type", fDistType);
    DisplayI("Number of estimated parameters in the model", fNParameters);
    DisplayD("Total count of cases (weighted)", fTotalWeight);
    DisplayI("Number of fitted variables in the model", fNFitVars);
    DisplayIV("Fitted Variable indices", fvFitVarIndices);
    DisplayI("Number of base parameters in the model", fNBaseParams);
    if (fFreqWeightVar >= 0) {
        DisplayI("Frequency weight variable", fFreqWeightVar);
    } else {
        DisplayText("Frequency weight variable is not set");
    }
    DisplayI("Number of constraints", fNConstr);
    DisplayDV("Means", fvMeans);
    DisplayDV("Standard Deviations", fvDispersions);
    DisplayDV("Minimum Values", fvMinimums);
    DisplayDV("Accumulated vector of scores", fvScores);
    std::vector<std::vector<double>> rows(static_cast<std::size_t>(fHessian.GetNRows()));
    for (int i = 0; i < fHessian.GetNRows(); ++i) {
        static_cast<void>(fHessian.GetRow(i, rows[static_cast<std::size_t>(i)]));
    }
    DisplayDVV("Accumulated Hessian:", rows);
    DisplayI("Number of valid rows processed", fNValidRows);
    DisplayI("Number of invalid calls to UpdateForRow()", fNInvalidCalls);
    DisplayD("Accumulated weight", fAccumWeight);
    DisplayB("Separation check", fbSeparationCheck);
    DisplayB("Validity indicator", fbValid);
}

bool DFCAccumStats::FinishComputations(int /*flag*/) {
    static_cast<void>(
        MCSP_ASSERT(false, "DFCAccumStats::FinishComputations should be in derived class"));
    return true;
}

double DFCAccumStats::EvaluateRootFunction(double /*x*/) {
    static_cast<void>(
        MCSP_ASSERT(false, "DFCAccumStats::EvaluateRootFunction should be in derived class"));
    return MCMV::Missing();
}

bool DFCAccumStats::SolveParameters() {
    static_cast<void>(
        MCSP_ASSERT(false, "DFCAccumStats::SolveParameters should be in derived class"));
    return false;
}

// Root of a one-dimensional likelihood equation F(x) = 0 on x > 0: a sign change is bracketed
// by doubling (x0·2^k) and halving (x0/2^k) the start, up to 10 steps each (a probe with
// |F| ≤ tolerance is taken as the root at once), then bisected
// (Press et al., "Numerical Recipes", 3rd ed., 2007, section 9.1). Bisection halves the
// bracket each step, so it cannot fail once a sign change is bracketed; it stops when
// |F(mid)| ≤ tolerance or when the bracket can no longer be split in double precision (then
// mid is the root to the last bit, and |F| is at the level of its rounding error: equations
// scaled by a large weight total may never reach the absolute tolerance).
double DFCAccumStats::FindRoot(double x0, double tolerance) {
    if (!(x0 > 0.0) || !std::isfinite(x0)) {
        return MCMV::Missing();
    }
    const double f0 = EvaluateRootFunction(x0);
    if (MCMV::IsMissing(f0)) {
        return MCMV::Missing();
    }
    if (std::fabs(f0) <= tolerance) {
        return x0;
    }
    double lo = x0;
    double hi = x0;
    double flo = f0;
    bool bracketed = false;
    for (int step = 0; step < kBracketSteps && !bracketed; ++step) {
        hi *= 2.0;
        const double fhi = EvaluateRootFunction(hi);
        // A probe that meets the tolerance is the root (a probe exactly at the root has
        // F = 0 and brackets no sign change).
        if (std::fabs(fhi) <= tolerance) {
            return hi;
        }
        if (!MCMV::IsMissing(fhi) && fhi * f0 < 0.0) {
            lo = x0;
            flo = f0;
            bracketed = true;
            break;
        }
        lo /= 2.0;
        const double fl = EvaluateRootFunction(lo);
        if (std::fabs(fl) <= tolerance) {
            return lo;
        }
        if (!MCMV::IsMissing(fl) && fl * f0 < 0.0) {
            hi = x0;
            flo = fl;
            bracketed = true;
        }
    }
    if (!bracketed) {
        return MCMV::Missing();
    }
    for (;;) {
        const double mid = 0.5 * (lo + hi);
        if (!(mid > lo && mid < hi)) {
            return mid;
        }
        const double fmid = EvaluateRootFunction(mid);
        if (MCMV::IsMissing(fmid)) {
            return MCMV::Missing();
        }
        if (std::fabs(fmid) <= tolerance) {
            return mid;
        }
        if (fmid * flo >= 0.0) {
            lo = mid;
            flo = fmid;
        } else {
            hi = mid;
        }
    }
}

double DFCAccumStats::GetRowWeight(const std::vector<double>& values) const {
    if (fFreqWeightVar < 0) {
        return 1.0;
    }
    const auto index = static_cast<std::size_t>(fFreqWeightVar);
    const double w = index < values.size() ? values[index] : MCMV::Missing();
    return std::isfinite(w) && w > 0.0 ? w : 0.0;
}

double DFCAccumStats::GetRowValue(const std::vector<double>& values, int var) const {
    const int varIndex = fvFitVarIndices[static_cast<std::size_t>(var)];
    if (varIndex < 0 || static_cast<std::size_t>(varIndex) >= values.size()) {
        return MCMV::Missing();
    }
    return values[static_cast<std::size_t>(varIndex)];
}

int DFCAccumStats::RejectRow() {
    ++fNInvalidCalls;
    return 1;
}

bool DFCAccumStats::FailRootSearch() {
    fStatus = MCStatus(MCSPStatus::kRootSearchFailed, false);
    return false;
}

// ------------------------------------------------------------------------------------------
// DFCAccumStatsBeta

DFCAccumStatsBeta::DFCAccumStatsBeta(const DFCSettings& settings, std::vector<double>& params,
                                     const std::vector<int>& fitVars, double totalWeight,
                                     const std::vector<double>& means,
                                     const std::vector<double>& dispersions,
                                     const std::vector<double>& minimums)
    : DFCAccumStats(settings, kDistBeta, params, fitVars, totalWeight, means, dispersions,
                    minimums) {
    static_cast<void>(MCSP_ASSERT(fNBaseParams == 2, "fNBaseParams == 2"));
    static_cast<void>(MCSP_ASSERT(fNFitVars == 1, "fNFitVars == 1"));
    static_cast<void>(MCSP_ASSERT(fNConstr == 2, "fNConstr == 2"));
}

// Beta log-likelihood from its sufficient statistics S1 = Σ w·ln x, S2 = Σ w·ln(1 - x)
// (Johnson, Kotz and Balakrishnan, "Continuous Univariate Distributions", vol. 2, 1995,
// ch. 25, section 4.1):
//   ln L = W·(lnΓ(a+b) - lnΓ(a) - lnΓ(b)) + (a-1)·S1 + (b-1)·S2,
//   ∂ln L/∂a = W·(ψ(a+b) - ψ(a)) + S1,        ∂ln L/∂b = W·(ψ(a+b) - ψ(b)) + S2,
//   ∂²ln L/∂a² = W·(ψ'(a+b) - ψ'(a)),  ∂²ln L/∂a∂b = W·ψ'(a+b),  ∂²ln L/∂b² = W·(ψ'(a+b) - ψ'(b)).
// The objective is -ln L, so scores and Hessian carry the opposite signs. -ln L is convex in
// (a, b) (the Beta family is an exponential family in its natural parameters), so the
// optimiser's stationary point is the maximum-likelihood estimate.
bool DFCAccumStatsBeta::FinishComputations(int flag) {
    const std::vector<double>& theta = *fpParameters;
    const double a = theta[0];
    const double b = theta[1];
    const double w = fTotalWeight;
    if (!(a > 0.0 && b > 0.0) || !AllFinite({a, b})) {
        fStatus = ObjectiveFailed();
        return false;
    }
    const double logLik = w * (MCDistFun::norvanednlgam(a + b) - MCDistFun::norvanednlgam(a) -
                               MCDistFun::norvanednlgam(b)) +
                          (a - 1.0) * fSumLogXi + (b - 1.0) * fSumLog1MinusXi;
    if (!std::isfinite(logLik)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    fNegLogLik = -logLik;
    if (flag == 1) {
        const double psiAB = MCMathFun::Digamma(a + b);
        const double triAB = MCMathFun::Trigamma(a + b);
        const double triA = MCMathFun::Trigamma(a);
        const double triB = MCMathFun::Trigamma(b);
        fvScores[0] = -(w * (psiAB - MCMathFun::Digamma(a)) + fSumLogXi);
        fvScores[1] = -(w * (psiAB - MCMathFun::Digamma(b)) + fSumLog1MinusXi);
        fHessian.SetElem(0, 0, -w * (triAB - triA));
        fHessian.SetElem(1, 0, -w * triAB);
        fHessian.SetElem(1, 1, -w * (triAB - triB));
        if (!AllFinite({fvScores[0], fvScores[1], triAB, triA, triB})) {
            fStatus = ObjectiveFailed();
            return false;
        }
    }
    return true;
}

void DFCAccumStatsBeta::Display(bool full) const {
    DFCAccumStats::Display(full);
    MCDisplay_800::DisplayFrame frame("DFCAccumStatsBeta display start",
                                      "DFCAccumStatsBeta display end");
    MCDisplay_800::DisplayD("fSumLogXi", fSumLogXi);
    MCDisplay_800::DisplayD("fSumLog1MinusXi", fSumLog1MinusXi);
}

// ------------------------------------------------------------------------------------------
// DFCAccumStatsGamma

DFCAccumStatsGamma::DFCAccumStatsGamma(const DFCSettings& settings, std::vector<double>& params,
                                       const std::vector<int>& fitVars, double totalWeight,
                                       const std::vector<double>& means,
                                       const std::vector<double>& dispersions,
                                       const std::vector<double>& minimums)
    : DFCAccumStats(settings, kDistGamma, params, fitVars, totalWeight, means, dispersions,
                    minimums) {
    static_cast<void>(MCSP_ASSERT(fNBaseParams == 2, "fNBaseParams == 2"));
    static_cast<void>(MCSP_ASSERT(fNFitVars == 1, "fNFitVars == 1"));
    static_cast<void>(MCSP_ASSERT(fNConstr == 2, "fNConstr == 2"));
    fSumXi = fvMeans[0] * totalWeight;
}

// Gamma with shape α and rate β: -ln f(x) = -α·ln β + lnΓ(α) - (α-1)·ln x + β·x, so over the
// sums W, S = Σ w·ln x and T = Σ w·x
//   -ln L = W·(lnΓ(α) - α·ln β) - (α-1)·S + β·T,
//   ∂/∂α = W·(ψ(α) - ln β) - S,  ∂/∂β = -W·α/β + T,
//   ∂²/∂α² = W·ψ'(α),  ∂²/∂α∂β = -W/β,  ∂²/∂β² = W·α/β².
bool DFCAccumStatsGamma::AddTerms(double weight, double sumLog, double sumX, bool derivatives) {
    const std::vector<double>& theta = *fpParameters;
    const double alpha = theta[0];
    const double beta = theta[1];
    if (!(alpha > 0.0 && beta > 0.0) || !AllFinite({alpha, beta})) {
        fStatus = ObjectiveFailed();
        return false;
    }
    const double logBeta = std::log(beta);
    fNegLogLik += weight * (MCDistFun::norvanednlgam(alpha) - alpha * logBeta) -
                  (alpha - 1.0) * sumLog + beta * sumX;
    if (derivatives) {
        fvScores[0] += weight * (MCMathFun::Digamma(alpha) - logBeta) - sumLog;
        fvScores[1] += -weight * alpha / beta + sumX;
        fHessian.AddToElem(0, 0, weight * MCMathFun::Trigamma(alpha));
        fHessian.AddToElem(1, 0, -weight / beta);
        fHessian.AddToElem(1, 1, weight * alpha / (beta * beta));
    }
    if (!std::isfinite(fNegLogLik)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    return true;
}

int DFCAccumStatsGamma::UpdateForRow(const std::vector<double>& values, int derivFlag) {
    const double x = GetRowValue(values);
    const double w = GetRowWeight(values);
    if (!(x > 0.0) || !std::isfinite(x) || w <= 0.0) {
        return RejectRow();
    }
    if (!AddTerms(w, w * std::log(x), w * x, derivFlag == 1)) {
        return RejectRow();
    }
    ++fNValidRows;
    fAccumWeight += w;
    return 0;
}

bool DFCAccumStatsGamma::FinishComputations(int flag) {
    if (fNValidRows > 0) {
        return std::isfinite(fNegLogLik);
    }
    return AddTerms(fTotalWeight, fSumLogXi, fSumXi, flag == 1);
}

// Profile likelihood equation of the Gamma shape (Johnson, Kotz and Balakrishnan, vol. 1,
// 1994, ch. 17, eq. 17.51): with β = α/mean, ∂ln L/∂α = 0 reduces to
//   F(α) = ln(α/mean) - ψ(α) + S/W = 0.
// ln α - ψ(α) falls from +∞ to 0 as α grows, so a root exists exactly when the mean of ln x
// is below ln(mean) (Jensen), i.e. the data are not constant.
double DFCAccumStatsGamma::EvaluateRootFunction(double x) {
    const double mean = fvMeans[0];
    if (!(x > 0.0) || !(mean > 0.0) || !(fTotalWeight > 0.0)) {
        return MCMV::Missing();
    }
    const double psi = MCMathFun::Digamma(x);
    const double f = std::log(x / mean) - psi + fSumLogXi / fTotalWeight;
    return std::isfinite(f) ? f : MCMV::Missing();
}

bool DFCAccumStatsGamma::SolveParameters() {
    std::vector<double>& theta = *fpParameters;
    const double root = FindRoot(theta[0]);
    if (MCMV::IsMissing(root)) {
        return FailRootSearch();
    }
    theta[0] = root;
    theta[1] = root / fvMeans[0];
    fStatus = MCStatus();
    return true;
}

void DFCAccumStatsGamma::Display(bool full) const {
    DFCAccumStats::Display(full);
    MCDisplay_800::DisplayFrame frame("DFCAccumStatsGamma display start",
                                      "DFCAccumStatsGamma display end");
    MCDisplay_800::DisplayD("fSumLogXi", fSumLogXi);
    MCDisplay_800::DisplayD("fSumXi", fSumXi);
}

// ------------------------------------------------------------------------------------------
// DFCAccumStatsNegBin

DFCAccumStatsNegBin::DFCAccumStatsNegBin(const DFCSettings& settings, std::vector<double>& params,
                                         const std::vector<int>& fitVars, double totalWeight,
                                         const std::vector<double>& means,
                                         const std::vector<double>& dispersions,
                                         const std::vector<double>& minimums)
    : DFCAccumStats(settings, kDistNegbinomial, params, fitVars, totalWeight, means, dispersions,
                    minimums) {
    fNConstr = 3 * fNFitVars;
}

void DFCAccumStatsNegBin::SetCatStats(const MCMath_800::MCCatStats& catStats) {
    fvCatCounts = catStats.GetCatCounts();
    fAccumWeight = catStats.GetSumCounts();
    fSumCounts = fAccumWeight;
    fNCategories = catStats.GetNCategories(true);
    fSumXi = 0.0;
    fSumLogGammaXi1 = 0.0;
    for (std::size_t k = 0; k < fvCatCounts.size(); ++k) {
        const double n = fvCatCounts[k];
        if (n > 0.0) {
            fSumXi += n * static_cast<double>(k);
            fSumLogGammaXi1 += n * MCDistFun::norvanednlgam(static_cast<double>(k) + 1.0);
        }
    }
}

bool DFCAccumStatsNegBin::GetConstrVarCoeff(int index, std::vector<double>& coeffs,
                                            double& constant) const {
    coeffs.assign(static_cast<std::size_t>(fNParameters), 0.0);
    constant = 0.0;
    if (!MCSP_ASSERT(index >= 0, "DFCAccumStats::GetConstrVarCoeff: index > 0.") ||
        !MCSP_ASSERT(index <= fNConstr - 1,
                     "DFCAccumStats::GetConstrVarCoeff: index <= fNConstr - 1.")) {
        return false;
    }
    const int k = index % 3;
    const int m = 2 * (index / 3);
    // A vector shorter than the rows it describes (the "type" entry missing) has no column.
    const auto column = static_cast<std::size_t>(k == 0 ? m : m + 1);
    if (column >= coeffs.size()) {
        return false;
    }
    coeffs[column] = k == 2 ? -1.0 : 1.0;
    constant = k == 2 ? 1.0 : 0.0;
    return true;
}

// Negative binomial counting failures before the r-th success (Johnson, Kemp and Kotz,
// "Univariate Discrete Distributions", 3rd ed., 2005, ch. 5):
//   -ln f(k) = -lnΓ(r+k) + lnΓ(r) + lnΓ(k+1) - r·ln p - k·ln(1-p),
//   ∂/∂r = ψ(r) - ψ(r+k) - ln p,  ∂/∂p = -r/p + k/(1-p),
//   ∂²/∂r² = ψ'(r) - ψ'(r+k),  ∂²/∂r∂p = -1/p,  ∂²/∂p² = r/p² + k/(1-p)².
// The "type" entry of the parameter vector is not estimated: its score and Hessian stay 0.
bool DFCAccumStatsNegBin::AddTerm(double weight, double k, bool derivatives) {
    const std::vector<double>& theta = *fpParameters;
    const double r = theta[0];
    const double p = theta[1];
    if (!(r > 0.0 && p > 0.0 && p <= 1.0) || !AllFinite({r, p}) || (p == 1.0 && k > 0.0)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    const double log1mp = k > 0.0 ? k * std::log1p(-p) : 0.0;
    fNegLogLik += weight * (-MCDistFun::norvanednlgam(r + k) + MCDistFun::norvanednlgam(r) +
                            MCDistFun::norvanednlgam(k + 1.0) - r * std::log(p) - log1mp);
    if (derivatives) {
        fvScores[0] += weight * (MCMathFun::Digamma(r) - MCMathFun::Digamma(r + k) - std::log(p));
        fvScores[1] += weight * (-r / p + (k > 0.0 ? k / (1.0 - p) : 0.0));
        fHessian.AddToElem(0, 0, weight * (MCMathFun::Trigamma(r) - MCMathFun::Trigamma(r + k)));
        fHessian.AddToElem(1, 0, -weight / p);
        fHessian.AddToElem(1, 1,
                           weight * (r / (p * p) + (k > 0.0 ? k / ((1.0 - p) * (1.0 - p)) : 0.0)));
    }
    if (!std::isfinite(fNegLogLik)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    return true;
}

int DFCAccumStatsNegBin::UpdateForRow(const std::vector<double>& values, int derivFlag) {
    const double x = GetRowValue(values);
    const double w = GetRowWeight(values);
    if (!(x >= 0.0) || x != std::round(x) || !std::isfinite(x) || w <= 0.0) {
        return RejectRow();
    }
    if (fNParameters < 2 || !AddTerm(w, x, derivFlag == 1)) {
        return RejectRow();
    }
    ++fNValidRows;
    fAccumWeight += w;
    return 0;
}

bool DFCAccumStatsNegBin::FinishComputations(int flag) {
    if (fNValidRows > 0) {
        return std::isfinite(fNegLogLik);
    }
    if (fNParameters < 2) {
        fStatus = ObjectiveFailed();
        return false;
    }
    for (std::size_t k = 0; k < fvCatCounts.size(); ++k) {
        if (fvCatCounts[k] > 0.0 && !AddTerm(fvCatCounts[k], static_cast<double>(k), flag == 1)) {
            return false;
        }
    }
    return true;
}

// Profile likelihood equation of r (Johnson, Kemp and Kotz 2005, section 5.8.2; Anscombe
// 1950): with p = r/(r + mean), ∂ln L/∂r = 0 reads
//   F(r) = Wc·ln(r/(r + mean)) - Wc·ψ(r) + Σ_k n_k·ψ(k + r) = 0.
// F tends to 0 as r → ∞; data whose variance does not exceed the mean have no finite root
// (the Poisson limit), and the root search reports that.
double DFCAccumStatsNegBin::EvaluateRootFunction(double x) {
    const double mean = fvMeans[0];
    if (!(x > 0.0) || !(mean >= 0.0)) {
        return MCMV::Missing();
    }
    const double wc = fSumCounts;
    double sum = 0.0;
    const auto nCats = static_cast<std::size_t>(fNCategories);
    for (std::size_t k = 0; k < nCats && k < fvCatCounts.size(); ++k) {
        if (fvCatCounts[k] != 0.0) {
            sum += fvCatCounts[k] * MCMathFun::Digamma(static_cast<double>(k) + x);
        }
    }
    const double f = wc * std::log(x / (x + mean)) - wc * MCMathFun::Digamma(x) + sum;
    return std::isfinite(f) ? f : MCMV::Missing();
}

bool DFCAccumStatsNegBin::SolveParameters() {
    std::vector<double>& theta = *fpParameters;
    if (theta.size() < 2) {
        return FailRootSearch();
    }
    const double root = FindRoot(theta[0]);
    if (MCMV::IsMissing(root)) {
        return FailRootSearch();
    }
    // The simulation draws r as a whole number of successes.
    const double r = std::max(1.0, std::floor(root + 0.5));
    theta[0] = r;
    theta[1] = r / (r + fvMeans[0]);
    fStatus = MCStatus();
    return true;
}

void DFCAccumStatsNegBin::Display(bool full) const {
    DFCAccumStats::Display(full);
    MCDisplay_800::DisplayFrame frame("DFCAccumStatsNegBin display start",
                                      "DFCAccumStatsNegBin display end");
    MCDisplay_800::DisplayD("fSumXi", fSumXi);
    MCDisplay_800::DisplayD("fSumLogGammaXi1", fSumLogGammaXi1);
    MCDisplay_800::DisplayI("Number of categories", fNCategories);
    MCDisplay_800::DisplayDV("Category counts", fvCatCounts);
}

// ------------------------------------------------------------------------------------------
// DFCAccumStatsWeibTwo

DFCAccumStatsWeibTwo::DFCAccumStatsWeibTwo(const DFCSettings& settings, std::vector<double>& params,
                                           const std::vector<int>& fitVars, double totalWeight,
                                           const std::vector<double>& means,
                                           const std::vector<double>& dispersions,
                                           const std::vector<double>& minimums)
    : DFCAccumStats(settings, kDistWeibull, params, fitVars, totalWeight, means, dispersions,
                    minimums) {}

void DFCAccumStatsWeibTwo::SetSortedEntries(const std::vector<DFCGoodFitEntry>* entries) {
    fpEntries = entries;
    fNEntries = entries ? static_cast<int>(entries->size()) : 0;
    fbCacheValid = false;
}

void DFCAccumStatsWeibTwo::SetData(const std::vector<DFCGoodFitEntry>* entries,
                                   const std::vector<double>* weights, double totalWeight,
                                   double sumLogXi) {
    SetSortedEntries(entries);
    SetWeights(weights);
    SetAccumWeight(totalWeight);
    SetSumLogXi(sumLogXi);
}

bool DFCAccumStatsWeibTwo::GetConstrVarCoeff(int index, std::vector<double>& coeffs,
                                             double& constant) const {
    coeffs.assign(static_cast<std::size_t>(fNParameters), 0.0);
    constant = 0.0;
    if (!MCSP_ASSERT(index >= 0, "DFCAccumStats::GetConstrVarCoeff: index > 0.") ||
        !MCSP_ASSERT(index <= fNParameters - 1,
                     "DFCAccumStats::GetConstrVarCoeff: index <= fNParameters - 1.")) {
        return false;
    }
    if (fNBaseParams > 0 && index % fNBaseParams <= 1) {
        coeffs[static_cast<std::size_t>(index)] = 1.0;
        constant = -kMinShape;
    }
    return true;
}

double DFCAccumStatsWeibTwo::EntryWeight(std::size_t i) const {
    if (!fpWeights || fpWeights->empty()) {
        return 1.0;
    }
    const std::int32_t record = (*fpEntries)[i].fRecord;
    if (record < 0 || static_cast<std::size_t>(record) >= fpWeights->size()) {
        return 0.0;
    }
    return (*fpWeights)[static_cast<std::size_t>(record)];
}

// Weibull with scale a and shape b (location 0), z = x/a, t = z^b, L = ln z:
//   -ln f(x) = -ln b + b·ln a - (b-1)·ln x + t,
//   ∂/∂a = (b/a)·(1 - t),  ∂/∂b = -1/b + L·(t - 1),
//   ∂²/∂a² = (b/a²)·((1+b)·t - 1),  ∂²/∂a∂b = (1 - t - b·t·L)/a,  ∂²/∂b² = 1/b² + t·L².
// The location entry is not estimated: its score and Hessian stay 0.
bool DFCAccumStatsWeibTwo::AddTerm(double weight, double x, bool derivatives) {
    const std::vector<double>& theta = *fpParameters;
    const double a = theta[0];
    const double b = theta[1];
    if (!(a > 0.0 && b > 0.0) || !AllFinite({a, b}) || !(x > 0.0)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    const double logZ = std::log(x / a);
    const double t = std::exp(b * logZ);
    fNegLogLik += weight * (-std::log(b) + b * std::log(a) - (b - 1.0) * std::log(x) + t);
    if (derivatives) {
        fvScores[0] += weight * (b / a) * (1.0 - t);
        fvScores[1] += weight * (-1.0 / b + logZ * (t - 1.0));
        fHessian.AddToElem(0, 0, weight * (b / (a * a)) * ((1.0 + b) * t - 1.0));
        fHessian.AddToElem(1, 0, weight * (1.0 - t - b * t * logZ) / a);
        fHessian.AddToElem(1, 1, weight * (1.0 / (b * b) + t * logZ * logZ));
    }
    if (!std::isfinite(fNegLogLik)) {
        fStatus = ObjectiveFailed();
        return false;
    }
    return true;
}

int DFCAccumStatsWeibTwo::UpdateForRow(const std::vector<double>& values, int derivFlag) {
    const double x = GetRowValue(values);
    const double w = GetRowWeight(values);
    if (!(x > 0.0) || !std::isfinite(x) || w <= 0.0) {
        return RejectRow();
    }
    if (fNParameters < 2 || !AddTerm(w, x, derivFlag == 1)) {
        return RejectRow();
    }
    ++fNValidRows;
    fAccumWeight += w;
    return 0;
}

bool DFCAccumStatsWeibTwo::FinishComputations(int flag) {
    if (fNValidRows > 0) {
        return std::isfinite(fNegLogLik);
    }
    if (fNParameters < 2 || !fpEntries) {
        fStatus = ObjectiveFailed();
        return false;
    }
    for (std::size_t i = 0; i < static_cast<std::size_t>(fNEntries); ++i) {
        const double w = EntryWeight(i);
        if (w > 0.0 && !AddTerm(w, (*fpEntries)[i].fValue, flag == 1)) {
            return false;
        }
    }
    return true;
}

void DFCAccumStatsWeibTwo::ReleaseLogCache() {
    std::vector<double>().swap(fvLogValues);
    std::vector<double>().swap(fvLogWeights);
    fbCacheValid = false;
}

bool DFCAccumStatsWeibTwo::BuildLogCache() {
    if (fbCacheValid) {
        return fbCacheUsable;
    }
    fbCacheValid = true;
    fbCacheUsable = false;
    fvLogValues.clear();
    fvLogWeights.clear();
    if (!fpEntries) {
        return false;
    }
    // Unweighted data keep no weights (every one is 1.0): the cache is 8 bytes per value.
    const bool weighted = fpWeights != nullptr && !fpWeights->empty();
    fvLogValues.reserve(static_cast<std::size_t>(fNEntries));
    if (weighted) {
        fvLogWeights.reserve(static_cast<std::size_t>(fNEntries));
    }
    fMaxLogValue = -std::numeric_limits<double>::infinity();
    for (std::size_t i = 0; i < static_cast<std::size_t>(fNEntries); ++i) {
        const double v = (*fpEntries)[i].fValue;
        const double w = EntryWeight(i);
        // A record without a weight of its own cannot take part.
        if (!(w > 0.0) || !std::isfinite(w)) {
            return false;
        }
        // v = 0 adds nothing to either sum: v^b·ln v → 0 as v → 0 for b > 0. (It does make
        // S = -∞, so the equation has no root: the two-parameter Weibull likelihood is
        // unbounded when an observation sits at the location.)
        if (!(v > 0.0) || !std::isfinite(v)) {
            continue;
        }
        const double logV = std::log(v);
        fvLogValues.push_back(logV);
        if (weighted) {
            fvLogWeights.push_back(w);
        }
        fMaxLogValue = std::max(fMaxLogValue, logV);
    }
    fbCacheUsable = !fvLogValues.empty();
    return fbCacheUsable;
}

// Likelihood equation of the Weibull shape (Cohen 1965, "Maximum likelihood estimation in the
// Weibull distribution based on complete and on censored samples", Technometrics 7, eq. 4;
// Johnson, Kotz and Balakrishnan, vol. 1, 1994, eq. 21.80): with the scale profiled out,
//   F(b) = S/W + 1/b - Σ w_i·v_i^b·ln v_i / Σ w_i·v_i^b = 0,  a = (Σ w_i·v_i^b / W)^(1/b).
// v_i^b is evaluated as exp(b·(ln v_i - ln v_max)): the common factor v_max^b cancels in the
// ratio, and no term overflows for large b or large values. F falls monotonically from +∞
// (b → 0) to S/W - ln v_max < 0 (b → ∞) unless all values are equal, so the root is unique.
// Its slope is F'(b) = -1/b² - Var_b(ln v), the variance of ln v under the weights w_i·v_i^b,
// taken about ln v_max (a shift leaves a variance unchanged and keeps the terms small).
bool DFCAccumStatsWeibTwo::EvaluateEquation(double b, double& f, double& slope, double& sumPow) {
    const double w = GetEquationWeight();
    if (!(b > 0.0) || !(w > 0.0) || !BuildLogCache()) {
        return false;
    }
    const bool weighted = !fvLogWeights.empty();
    double s0 = 0.0;
    double s1 = 0.0;
    double s2 = 0.0;
    for (std::size_t i = 0; i < fvLogValues.size(); ++i) {
        const double d = fvLogValues[i] - fMaxLogValue;
        const double term = (weighted ? fvLogWeights[i] : 1.0) * std::exp(b * d);
        s0 += term;
        s1 += term * d;
        s2 += term * d * d;
    }
    const double meanD = s1 / s0;
    f = fSumLogXi / w + 1.0 / b - (fMaxLogValue + meanD);
    slope = -1.0 / (b * b) - std::max(0.0, s2 / s0 - meanD * meanD);
    sumPow = s0;
    return std::isfinite(f) && std::isfinite(slope) && s0 > 0.0;
}

double DFCAccumStatsWeibTwo::EvaluateRootFunction(double x) {
    double f = 0.0;
    double slope = 0.0;
    double sumPow = 0.0;
    return EvaluateEquation(x, f, slope, sumPow) ? f : MCMV::Missing();
}

// The root by Newton's method kept inside a bracket (Press et al., "Numerical Recipes", 3rd
// ed., 2007, section 9.4, rtsafe): F is decreasing, so every evaluation moves one end of the
// bracket (0, ∞) of the root; a Newton step that would leave the bracket is replaced by
// bisection, or by doubling or halving while an end is still open. Newton converges in a few
// steps from the moment estimate where bisection needs about twenty passes over the data.
// It stops when |F| ≤ kRootTolerance, as the generic search does, or when the bracket can no
// longer be split, and fails where the generic search finds no bracket: beyond 2^10 times or
// below 2^-10 times the start (all values equal, where F = 1/b has no root, for one).
bool DFCAccumStatsWeibTwo::SolveParameters() {
    std::vector<double>& theta = *fpParameters;
    if (theta.size() < 2 || !(theta[1] > 0.0) || !std::isfinite(theta[1])) {
        return FailRootSearch();
    }
    constexpr int kMaxSteps = 200;
    const double reachLo = std::ldexp(theta[1], -kBracketSteps);
    const double reachHi = std::ldexp(theta[1], kBracketSteps);
    double lo = 0.0;
    double hi = std::numeric_limits<double>::infinity();
    double b = theta[1];
    double sumPow = 0.0;
    bool solved = false;
    for (int step = 0; step < kMaxSteps; ++step) {
        double f = 0.0;
        double slope = 0.0;
        if (!EvaluateEquation(b, f, slope, sumPow)) {
            break;
        }
        if (std::fabs(f) <= kRootTolerance) {
            solved = true;
            break;
        }
        (f > 0.0 ? lo : hi) = b;
        double next = b - f / slope;
        if (!(slope < 0.0) || !(next > lo && next < hi)) {
            next = std::isfinite(hi) ? (lo > 0.0 ? 0.5 * (lo + hi) : 0.5 * hi) : 2.0 * lo;
        }
        if (!(next >= reachLo && next <= reachHi)) {
            break;
        }
        if (!(next > lo && next < hi) || next == b) {
            // The bracket cannot be split any further: b is the root to the last bit.
            solved = EvaluateEquation(b, f, slope, sumPow);
            break;
        }
        b = next;
    }
    if (!solved) {
        ReleaseLogCache();
        return FailRootSearch();
    }
    // The cache is as large as the field; the goodness-of-fit tasks of every field hold their
    // Weibull at once, so each gives its memory back once solved.
    ReleaseLogCache();
    const double scale = std::exp(fMaxLogValue + std::log(sumPow / GetEquationWeight()) / b);
    if (!std::isfinite(scale) || !(scale > 0.0)) {
        return FailRootSearch();
    }
    theta[0] = scale;
    theta[1] = b;
    fStatus = MCStatus();
    return true;
}

void DFCAccumStatsWeibTwo::Display(bool full) const {
    DFCAccumStats::Display(full);
    MCDisplay_800::DisplayFrame frame("DFCAccumStatsWeibull display start",
                                      "DFCAccumStatsWeibull display end");
    MCDisplay_800::DisplayIV("Fitted Variable indices", fvFitVarIndices);
    MCDisplay_800::DisplayD("fSumLogXi", fSumLogXi);
}

} // namespace MCMCSP_800
