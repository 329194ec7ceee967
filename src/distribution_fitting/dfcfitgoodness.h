// Goodness of fit of the fitted candidate distributions: the chi-square test of the discrete
// candidates (Binomial, NegBin, Poisson), and the EDF tests of the continuous ones
// (Anderson-Darling A², Kolmogorov-Smirnov D) with their modified statistics and p-values.
//
// DFCAlgorithm::ComputeChiSquare calls ComputeChiSquareFit once per discrete candidate;
// DFCAlgorithm::ComputeFitGoodness runs one DFCFitGoodnessTask per (covariate, continuous
// candidate) on the host's threads, each reading the covariate's sorted values. The numeric
// kernels are free functions over plain arrays so that each can be checked on its own:
// FittedCdf (u = F(x)), AccumulateEdfTerms (A² and D over sorted u, block by block),
// ComputeEdfSignificance (Z*, D* and the p-values), and the p-value functions it uses.
#pragma once

#include "component/mcspcomponent.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "distribution_fitting/dfcsettings.h"
#include "mccommon/mcmv.h"
#include "mcmath/mccancelinfo.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspconst.h"
#include "simulation_common/mcspdistfamily.h"

#include <cstddef>
#include <vector>

namespace MCMCSP_800 {

struct DFCGoodFitEntry;
class DFCAccumStatsWeibTwo;

// ------------------------------------------------------------------------------------------
// Chi-square test of a discrete candidate

//! The outcome of one chi-square test. Every number that was not computed is missing.
struct DFCChiSquareResult {
    double fStatistic;        //!< Σ (O_c - E_c)²/E_c over the bins
    double fDegreesOfFreedom; //!< U - 1 - q
    double fPValue;           //!< P(χ²_df > statistic); missing when df ≤ 0
    int fNBins;               //!< B, the number of bins evaluated
    int fNLowExpected;        //!< bins whose expected count E_c is below 5
    bool fbZeroProbability;   //!< a bin had probability 0: the candidate cannot describe the
                              //!< data, and the statistic is missing
    //! The same statistic over groups of adjacent bins, each with an expected count of at least
    //! 5 (see the .cpp); missing with the unpooled one.
    double fPooledStatistic = MCCommon_800::MCMV::Missing();
    double fPooledDegreesOfFreedom = MCCommon_800::MCMV::Missing(); //!< groups - 1 - q
    double fPooledPValue = MCCommon_800::MCMV::Missing();           //!< missing when that df ≤ 0
    int fNPooledBins = 0;                                           //!< number of groups
};

//! Chi-square test of candidate `type` (Binomial, NegBin or Poisson) with `params` against
//! the weighted counts `counts` (entry c: weight of the value c) of a field with total weight
//! `totalWeight` and largest value `maximum`. Any other type has probability 0 everywhere.
DFCChiSquareResult ComputeChiSquareFit(MCSPConst::DistType type, const std::vector<double>& params,
                                       const std::vector<double>& counts, double totalWeight,
                                       double maximum);

//! Σ_c counts[c]·ln P(X = c) of count candidate `type` with `params`, over the values with a
//! positive count: the log-likelihood of a count field from its category counts. −∞ when an
//! observed value has probability 0; missing when the parameters admit no probabilities.
double ComputeCountLogLikelihood(MCSPConst::DistType type, const std::vector<double>& params,
                                 const std::vector<double>& counts);

//! The information criteria of a fit with log-likelihood `logLik`, `k` estimated parameters and
//! total weight `n`. Missing where ln L is missing; AICc also where n ≤ k + 1.
struct DFCInfoCriteria {
    double fAIC;  //!< 2k - 2·ln L (Akaike 1974)
    double fBIC;  //!< k·ln n - 2·ln L (Schwarz 1978)
    double fAICc; //!< AIC + 2k(k + 1)/(n - k - 1) (Hurvich and Tsai 1989)
};
DFCInfoCriteria ComputeInfoCriteria(double logLik, int k, double n);

//! The number of parameters of candidate `type` with `params` that the fitting estimates from
//! the data (the Weibull's location only when it is not 0, the NegBin's kind never).
int CountEstimatedParams(MCSPConst::DistType type, const std::vector<double>& params);

//! Writes ln L (or its reason when it is not finite: `logLik` −∞, +∞ or missing), k, AIC, BIC
//! and AICc into `element`, with total weight `n`.
void SetLikelihoodResults(DFCOutputStats::DFCVarDistElement& element, double logLik, double n);

// ------------------------------------------------------------------------------------------
// EDF statistics

//! The distribution function of a fitted continuous candidate, prepared once for many x.
class DFCFittedCdf {
public:
    //! F of candidate `type` (LogNormal, Normal, Triangular, Uniform, Weibull, Gamma, Beta or
    //! Exponential) with `params` in parameter-name order.
    DFCFittedCdf(MCSPConst::DistType type, const std::vector<double>& params);

    //! F(x); missing when the parameters admit no distribution function (too few, not
    //! finite, a scale that is not positive) or the library gives none.
    double operator()(double x) const;
    //! u_i = F(x_i) for `n` values in ascending order (ties get the same u), as operator()
    //! gives them to within about 1e-13 relative, far cheaper for the Gamma, the Beta, the
    //! Normal and the LogNormal:
    //! between exact values every 32 entries, F is carried from entry to entry by integrating
    //! the density (see the .cpp).
    void EvaluateSorted(const double* x, std::size_t n, double* u) const;
    //! ln f(x), the family table's log-density with the normalising constant prepared once
    //! for the Gamma, Beta, Normal and LogNormal; −∞ outside the support, missing when the
    //! parameters admit no density.
    double LogDensity(double x) const;

private:
    //! The exact F(x) (`upper` false) or 1 - F(x) (`upper` true) of a carried candidate.
    double ExactTail(double x, bool upper) const;
    //! The density f(x) of a carried candidate and its relative slope f'(x)/f(x); false
    //! outside the open support or where either is not finite.
    bool Density(double x, double& f, double& slope) const;
    //! Carries F over the entries [begin, end] of one stretch (see the .cpp); false when
    //! the carried value misses the exact one at the far end, `u` then holds only the ends.
    bool CarryStretch(const double* x, std::size_t begin, std::size_t end, double* u,
                      double* work) const;

    MCSPConst::DistType fType;                //!< candidate type
    const MCSPDistFamily* fpFamily = nullptr; //!< its row of the family table
    double fP0 = 0.0;                         //!< first parameter
    double fP1 = 0.0;                         //!< second parameter
    double fP2 = 0.0;                         //!< third parameter
    bool fbValid = false;                     //!< the parameters are usable
    double fLogNorm = 0.0; //!< ln Γ(α) - α·ln β (Gamma), ln B(a, b) (Beta), ln(σ·√(2π))
                           //!< (Normal, LogNormal), ln(b - a) (Uniform), -ln λ (Exponential),
                           //!< -ln(b/a) (Weibull): the constant of ln f
};

//! Running sums of the EDF statistics over sorted probabilities u_1 ≤ u_2 ≤ ..., so that they
//! can be computed block by block without holding every u.
struct DFCEdfState {
    double fCumWeight = 0.0; //!< C_(i-1), the weight of the entries already seen
    double fADSum = 0.0;     //!< Σ of the Anderson-Darling terms (Neumaier sum)
    double fADComp = 0.0;    //!< its running compensation
    double fKSMax = 0.0;     //!< largest EDF distance so far
};

//! Adds the `n` entries with probabilities `u` (ascending by value) and weights `w` (null:
//! every weight 1.0) to `state`; `totalWeight` is W. `computeAD` and `computeKS` choose the
//! statistics. See the .cpp for the formulas.
void AccumulateEdfTerms(const double* u, const double* w, std::size_t n, double totalWeight,
                        bool computeAD, bool computeKS, DFCEdfState& state);
//! A² = -W + the accumulated terms.
double FinishAndersonDarling(const DFCEdfState& state, double totalWeight);
//! A² of the whole arrays at once.
double ComputeAndersonDarling(const double* u, const double* w, std::size_t n, double totalWeight);
//! D of the whole arrays at once.
double ComputeKolmogorovSmirnov(const double* u, const double* w, std::size_t n,
                                double totalWeight);

//! The modified statistics and p-values of one candidate. Every number that was not
//! computed is missing.
struct DFCEdfSignificance {
    double fADZStar;  //!< modified A² (Z*)
    double fADPValue; //!< p-value of A²
    double fKSDStat;  //!< modified D (D*)
    double fKSPValue; //!< p-value of D
    //! Ends of the table interval in which a p-value read from critical values lies (missing
    //! when unbounded on that side, both missing for a p-value from a formula).
    double fADPLower = MCCommon_800::MCMV::Missing();
    double fADPUpper = MCCommon_800::MCMV::Missing();
    double fKSPLower = MCCommon_800::MCMV::Missing();
    double fKSPUpper = MCCommon_800::MCMV::Missing();
};

//! Z*, D* and the p-values of candidate `type` from A² `a2` and D `d` (either missing when not
//! computed) on a sample of weight `n`; `shape` is the Gamma shape (read for Gamma only).
DFCEdfSignificance ComputeEdfSignificance(MCSPConst::DistType type, double n, double a2, double d,
                                          double shape);
//! The significance level of `value` in a table of ascending critical values `criticals`
//! with their levels `levels`: the first level at or below the first critical value, the
//! last at or above the last, linear interpolation between. Missing when the tables differ in
//! length or are empty, or `value` is missing.
double LookUpSignificance(double value, const std::vector<double>& criticals,
                          const std::vector<double>& levels);
//! The levels between which `value` lies in the same tables: at or below the first critical
//! value p ≥ the first level (`upper` missing), at or above the last p ≤ the last level
//! (`lower` missing), between two critical values the two levels, at one its level twice. Both
//! missing where LookUpSignificance is.
void LookUpSignificanceBounds(double value, const std::vector<double>& criticals,
                              const std::vector<double>& levels, double& lower, double& upper);
//! p-value of Z* = A²·(1 + 0.75/n + 2.25/n²) for the Normal with estimated mean and variance.
double AndersonDarlingNormalPValue(double zStar);
//! p-value of Z* = A²·(1 + 0.6/n) for the Exponential with estimated scale.
double AndersonDarlingExponentialPValue(double zStar);
//! G(z), the limiting distribution function of A² for a fully specified distribution.
double AndersonDarlingAsymptoticCdf(double z);
//! 1 - K(x), the upper tail of the Kolmogorov distribution K of √n·D.
double KolmogorovPValue(double x);

// ------------------------------------------------------------------------------------------
//! The EDF test of one continuous candidate of one covariate: for Weibull first the
//! maximum-likelihood estimate (through the caller's accumulator), then u = F(x) over the
//! covariate's sorted values, A² and D, the modified statistics and p-values, written into the
//! candidate's result element. Created by DFCAlgorithm::ComputeFitGoodness, run on a host
//! thread; it reads the shared sorted entries and weights and writes only its own element.
class DFCFitGoodnessTask : public MCThread_800::IMCThreadTask {
public:
    //! Candidate `type` of covariate `covariate`, whose result record is `info` and element
    //! `element`. `entries` are the covariate's values sorted ascending, `weights` the weight
    //! of each valid record by ordinal (null without a frequency weight), `totalWeight` W.
    //! `weibull` (Weibull only, else null) is the caller's accumulator over the same entries.
    //! `runCancel` (may be null) is the algorithm's cancel record, read besides the task's own.
    //! Everything is borrowed and must outlive the task.
    DFCFitGoodnessTask(int covariate, MCSPConst::DistType type, const DFCSettings& settings,
                       const MCXML_800::MCVarList& variables, DFCOutputStats& outputStats,
                       DFCOutputStats::DFCVarDistInfo& info,
                       DFCOutputStats::DFCVarDistElement& element,
                       const std::vector<DFCGoodFitEntry>& entries,
                       const std::vector<double>* weights, double totalWeight,
                       DFCAccumStatsWeibTwo* weibull, const MCMath_800::MCCancelInfo* runCancel);
    ~DFCFitGoodnessTask() override = default;
    DFCFitGoodnessTask(const DFCFitGoodnessTask&) = delete;
    DFCFitGoodnessTask& operator=(const DFCFitGoodnessTask&) = delete;

    //! Weibull estimate, EDF statistics, p-values and log-likelihood into the element. A
    //! failed Weibull estimate, a missing F(x) or fewer than two values strictly inside the
    //! fitted support drop the element with status 390004 (warning).
    void RunTask() override;

    int GetCovariate() const { return fCovariate; }
    MCSPConst::DistType GetDistType() const { return fDistType; }
    //! Success, warning 390004 when the candidate was dropped, or 1 when cancelled.
    MCStatus GetStatus() const { return fStatus; }
    //! The task's own warnings (the failed Weibull estimate).
    const MCWarnings& GetWarnings() const { return fWarnings; }
    //! True when the task stopped for a cancel request.
    bool IsCancelled() const { return fbCancelled; }

private:
    //! u, A², D, Z*, D*, the p-values and ln L; the status of the computation.
    MCStatus ComputeEdfStatistics();
    //! Standard errors and Q-Q and P-P points of the candidate (dfcfitdiagnostics.h).
    MCStatus AddDiagnostics();
    //! The sorted entries [first, last) strictly inside the fitted support and their weight.
    void FindInterior(std::size_t& first, std::size_t& last, double& weight) const;
    //! The frequency weight of `entry` (weighted runs only).
    double WeightOf(const DFCGoodFitEntry& entry) const;
    //! True when the task's or the run's cancel record reports a pending cancel.
    bool PollCancel();

    int fCovariate;                                //!< covariate position
    MCSPConst::DistType fDistType;                 //!< candidate type
    const DFCSettings* fpSettings;                 //!< the run's settings, not owned
    const MCXML_800::MCVarList* fpVarList;         //!< the host's variables, not owned
    DFCOutputStats* fpOutputStats;                 //!< the run's results, not owned
    MCSPConst::GoodFitType fGFType;                //!< configured statistic
    bool fbInteractiveMode;                        //!< both statistics wanted
    bool fbComputeAD;                              //!< A² computed
    bool fbComputeKS;                              //!< D computed
    DFCOutputStats::DFCVarDistInfo* fpInfo;        //!< the covariate's record, not owned
    DFCOutputStats::DFCVarDistElement* fpElement;  //!< the candidate's element, not owned
    std::size_t fNEntries;                         //!< number of sorted entries
    double fTotalWeight;                           //!< W
    DFCAccumStatsWeibTwo* fpWeibull;               //!< Weibull accumulator, caller's
    const std::vector<DFCGoodFitEntry>* fpEntries; //!< sorted entries, not owned
    const std::vector<double>* fpWeights;          //!< weights by ordinal, null for none
    double fADFit;                                 //!< A²
    double fADZStar;                               //!< Z*
    double fADPValue;                              //!< p-value of A²
    double fKSFit;                                 //!< D
    double fKSDStat;                               //!< D*
    double fKSPValue;                              //!< p-value of D
    MCMath_800::MCCancelInfo fCancelInfo;          //!< over the settings' cancel query
    const MCMath_800::MCCancelInfo* fpRunCancel;   //!< the algorithm's, may be null
    bool fbCancelled = false;                      //!< stopped by a cancel request
    MCStatus fStatus;                              //!< outcome of the task
    MCWarnings fWarnings;                          //!< the task's own warnings
};

} // namespace MCMCSP_800
