// Goodness of fit of every candidate and the choice of the best fit: the chi-square step of
// the discrete covariates (DFCAlgorithm::ComputeChiSquare), the EDF pass, tasks and best-fit
// choice of the continuous ones (PerformFitGoodness, ComputeFitGoodness), the task itself and
// the numeric kernels of dfcfitgoodness.h.
#include "distribution_fitting/dfcfitgoodness.h"

#include "distribution_fitting/dfcaccumstats.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcfitdiagnostics.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"

#include <boost/math/special_functions/beta.hpp>
#include <boost/math/special_functions/gamma.hpp>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <new>
#include <stdexcept>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MultiPassRecordIter;
using MCMath_800::MCDistFun;
using MCMath_800::MCMathPolicy;
using namespace MCSPConst;

namespace {

constexpr double kMissing = MCMV::Missing();
//! ln √(2π).
constexpr double kLnSqrtTwoPi = 0.91893853320467274178;
//! Weight of the values strictly inside the fitted support below which A² and D are not
//! computed: with less there is no EDF to compare.
constexpr double kMinEdfWeight = 2.0;
//! Expected bin counts below this make the chi-square approximation doubtful (Cochran 1954).
constexpr double kMinExpected = 5.0;
//! A best fit whose p-value is below this is reported as a poor fit.
constexpr double kPoorFitLevel = 0.05;
//! Entries whose F(x) is evaluated between two looks at the cancel request, and the length
//! of the task's u and weight buffers.
constexpr std::size_t kEdfBlock = 512;

//! The continuous candidates, the ones the EDF tests serve, in type order.
constexpr std::array<DistType, 8> kEdfTypes = {kDistLognormal, kDistNormal,     kDistTriangular,
                                               kDistUniform,   kDistWeibull,    kDistGamma,
                                               kDistBeta,      kDistExponential};

//! A number from a Boost evaluation, with anything that is not finite made missing.
double Finite(double x) {
    return std::isfinite(x) ? x : kMissing;
}

// ------------------------------------------------------------------------------------------
// Chi-square helpers

//! P(χ²_df > x) = Q(df/2, x/2), the regularised upper incomplete gamma function, evaluated
//! directly rather than as 1 - P so that small p-values keep their relative accuracy. Missing
//! when df ≤ 0 or x is not a number.
double ChiSquareUpperTail(double x, double df) {
    if (!(df > 0.0) || !std::isfinite(df) || !std::isfinite(x)) {
        return kMissing;
    }
    if (x <= 0.0) {
        return 1.0;
    }
    return Finite(boost::math::gamma_q(0.5 * df, 0.5 * x, MCMathPolicy()));
}

//! The probabilities of the chi-square bins of one discrete candidate, from its row of the
//! family table. The last bin of the NegBin and the Poisson holds their upper tail P(X ≥ c),
//! which equals 1 minus the sum of the bins before it but is evaluated directly (the
//! difference would lose every digit of a small tail, or even turn negative). Binomial bins
//! above n are impossible values (probability 0).
class DFCBinProbabilities {
public:
    DFCBinProbabilities(DistType type, const std::vector<double>& params)
        : fType(type), fParams(params), fpFamily(MCSPFindDistFamily(type)) {
        fbValid = fpFamily != nullptr && fpFamily->fbDiscrete && fpFamily->IsValid(fParams);
    }

    //! P_c of bin c; `last` marks the last bin. Missing or 0 when the parameters admit no
    //! probability.
    double operator()(std::int64_t c, bool last) const {
        const auto k = static_cast<double>(c);
        if (fType == kDistBinomial) {
            // A single trial leaves no degree of freedom for the test.
            if (!fbValid || !(fParams[0] > 1.0) || k > fParams[0]) {
                return 0.0;
            }
        } else if (fType != kDistNegbinomial && fType != kDistPoisson) {
            return 0.0;
        } else if (!fbValid) {
            return kMissing;
        } else if (last) {
            return c == 0 ? 1.0 : fpFamily->fCcdf(fParams.data(), k - 1.0);
        }
        const double lnP = fpFamily->fLogDensity(fParams.data(), k);
        return MCMV::IsMissing(lnP) ? kMissing : Finite(std::exp(lnP));
    }

private:
    DistType fType;                 //!< candidate type
    std::vector<double> fParams;    //!< the candidate's parameters
    const MCSPDistFamily* fpFamily; //!< its row of the family table
    bool fbValid = false;           //!< the parameters are inside the family's domain
};

//! Pearson's statistic over pooled bins (Cochran 1954, "Some methods for strengthening the
//! common χ² tests", Biometrics 10, 417-451): adjacent bins are merged from the lowest value
//! upwards until the group's expected count reaches kMinExpected; a last group short of it joins
//! the group before it. Bins are added in order; the last closed group is held back so that the
//! short remainder can still join it.
class DFCChiSquarePooling {
public:
    void Add(double observed, double expected) {
        fOpenO += observed;
        fOpenE += expected;
        if (fOpenE >= kMinExpected) {
            Close();
        }
    }
    //! The statistic; `nGroups` receives the number of groups.
    double Finish(int& nGroups) {
        if (fOpenE > 0.0 || fOpenO > 0.0) {
            if (fbHeld) {
                fHeldO += fOpenO;
                fHeldE += fOpenE;
            } else {
                Close();
            }
        }
        if (fbHeld) {
            fStatistic += Term(fHeldO, fHeldE);
        }
        nGroups = fNGroups;
        return fStatistic;
    }

private:
    static double Term(double o, double e) { return (o - e) * (o - e) / e; }
    void Close() {
        if (fbHeld) {
            fStatistic += Term(fHeldO, fHeldE);
        }
        fHeldO = fOpenO;
        fHeldE = fOpenE;
        fbHeld = true;
        ++fNGroups;
        fOpenO = 0.0;
        fOpenE = 0.0;
    }

    double fOpenO = 0.0;     //!< observed weight of the open group
    double fOpenE = 0.0;     //!< its expected count
    double fHeldO = 0.0;     //!< observed weight of the last closed group
    double fHeldE = 0.0;     //!< its expected count
    bool fbHeld = false;     //!< a closed group is held back
    int fNGroups = 0;        //!< groups closed
    double fStatistic = 0.0; //!< Σ over the groups before the held one
};

// ------------------------------------------------------------------------------------------
// Best-fit bookkeeping

//! Makes `element` the best fit of `info`, with statistic `stat` and p-value `pValue`.
void SetBestFit(DFCOutputStats::DFCVarDistInfo& info,
                const DFCOutputStats::DFCVarDistElement& element, double stat, double pValue) {
    info.fDistBestType = element.fDistType;
    info.fDistBestName = element.fDistName;
    info.fDistBestParams = element.fDistParams;
    info.fDistBestParamNames = element.fDistParamNames;
    info.fBestFitStat = stat;
    info.fBestFitPValue = pValue;
}

//! Appends the Empirical element `empirical` to the reported elements of `info`; it becomes
//! the best distribution when there is none and the field is fitted (not correlations-only).
void AddEmpiricalElement(DFCOutputStats::DFCVarDistInfo& info,
                         const DFCOutputStats::DFCVarDistElement& empirical, bool corrOnly) {
    if (info.fDistBestType == kDistUnknown && !corrOnly) {
        info.fDistBestType = kDistEmpirical;
        info.fDistBestName = empirical.fDistName;
        info.fDistBestParams = empirical.fDistParams;
        info.fDistBestParamNames = empirical.fDistParamNames;
    }
    info.fReportedElements.push_back(empirical);
}

//! Sorts `reported` by the statistic `stat` ascending; missing statistics last, and equal or
//! missing statistics by type.
void SortReported(std::vector<DFCOutputStats::DFCVarDistElement>& reported,
                  double DFCOutputStats::DFCVarDistElement::*stat) {
    std::stable_sort(reported.begin(), reported.end(),
                     [stat](const DFCOutputStats::DFCVarDistElement& a,
                            const DFCOutputStats::DFCVarDistElement& b) {
                         const double sa = a.*stat;
                         const double sb = b.*stat;
                         const bool ma = MCMV::IsMissing(sa);
                         const bool mb = MCMV::IsMissing(sb);
                         if (ma != mb) {
                             return mb;
                         }
                         if (!ma && sa != sb) {
                             return sa < sb;
                         }
                         return a.fDistType < b.fDistType;
                     });
}

//! True for the candidates whose EDF p-value is a placeholder (no table exists for them).
bool HasNoEdfTable(DistType type) {
    return type == kDistTriangular || type == kDistBeta;
}

// ------------------------------------------------------------------------------------------
// Sorting the stored values

//! An unsigned key whose order is the order of the doubles: the sign bit flipped for
//! non-negative numbers, every bit for negative ones (-0.0 is keyed as 0.0, so that equal
//! values tie).
std::uint64_t SortKey(double x) {
    constexpr std::uint64_t kSign = std::uint64_t{1} << 63;
    const double v = x == 0.0 ? 0.0 : x;
    std::uint64_t bits = 0;
    std::memcpy(&bits, &v, sizeof bits);
    return (bits & kSign) ? ~bits : bits | kSign;
}

//! Sorts `entries` by value ascending, equal values in their present order. Least-significant
//! digit radix sort, 11 bits per digit (Knuth, TAOCP vol. 3, 5.2.5): six stable counting
//! passes, and a pass whose digit is the same for every entry is skipped (the high digits of
//! values of one sign and similar size). Linear in the number of entries, several times
//! faster than a comparison sort for the 10^5 to 10^7 values of a fit; it needs a second
//! array of the same size while it runs.
void SortEntriesByValue(std::vector<DFCGoodFitEntry>& entries) {
    constexpr int kDigitBits = 11;
    constexpr int kPasses = (64 + kDigitBits - 1) / kDigitBits;
    constexpr std::size_t kBuckets = std::size_t{1} << kDigitBits;
    const std::size_t n = entries.size();
    if (n < 2) {
        return;
    }
    std::vector<std::array<std::size_t, kBuckets>> counts(kPasses);
    for (auto& c : counts) {
        c.fill(0);
    }
    for (const DFCGoodFitEntry& e : entries) {
        const std::uint64_t key = SortKey(e.fValue);
        for (int pass = 0; pass < kPasses; ++pass) {
            ++counts[static_cast<std::size_t>(pass)][(key >> (pass * kDigitBits)) & (kBuckets - 1)];
        }
    }
    std::vector<DFCGoodFitEntry> buffer(n);
    std::vector<DFCGoodFitEntry>* from = &entries;
    std::vector<DFCGoodFitEntry>* to = &buffer;
    for (int pass = 0; pass < kPasses; ++pass) {
        std::array<std::size_t, kBuckets>& count = counts[static_cast<std::size_t>(pass)];
        const int shift = pass * kDigitBits;
        if (count[(SortKey((*from)[0].fValue) >> shift) & (kBuckets - 1)] == n) {
            continue;
        }
        std::size_t offset = 0;
        for (std::size_t& c : count) {
            const std::size_t size = c;
            c = offset;
            offset += size;
        }
        for (const DFCGoodFitEntry& e : *from) {
            (*to)[count[(SortKey(e.fValue) >> shift) & (kBuckets - 1)]++] = e;
        }
        std::swap(from, to);
    }
    if (from != &entries) {
        entries.swap(buffer);
    }
}

} // namespace

// ------------------------------------------------------------------------------------------
// Chi-square test
//
// Pearson's statistic X² = Σ_c (O_c - E_c)²/E_c over the bins c = 0 .. B-1 with the observed
// weighted counts O_c and the expected counts E_c = P_c·W, compared with χ² on U - 1 - q
// degrees of freedom, q the number of estimated parameters (Pearson 1900; Cochran 1952,
// "The χ² test of goodness of fit", Ann. Math. Statist. 23, 315-345). The upper end U is n + 1
// for the Binomial and the largest value + 1 for NegBin and Poisson, and B = max(K, U) with K
// the number of observed categories. A bin of probability 0 with observations makes the
// statistic infinite: the candidate cannot describe the data and gets no statistic.

DFCChiSquareResult ComputeChiSquareFit(DistType type, const std::vector<double>& params,
                                       const std::vector<double>& counts, double totalWeight,
                                       double maximum) {
    DFCChiSquareResult result{kMissing, kMissing, kMissing, 0, 0, false};
    double upper = 1.0;
    int nEstimated = 0;
    switch (type) {
    case kDistBinomial:
        upper = (params.empty() ? kMissing : params[0]) + 1.0;
        nEstimated = 2;
        break;
    case kDistNegbinomial:
        upper = maximum + 1.0;
        nEstimated = 2;
        break;
    case kDistPoisson:
        upper = maximum + 1.0;
        nEstimated = 1;
        break;
    default:
        break;
    }
    // Bins beyond the largest int are out of reach of any count vector; the loop below ends
    // long before them, where the probabilities underflow to 0.
    const double upperBins =
        std::isfinite(upper) ? std::min(std::floor(upper + 0.5), 2147483647.0) : 1.0;
    const auto nBins = std::max<std::int64_t>(static_cast<std::int64_t>(counts.size()),
                                              static_cast<std::int64_t>(std::max(upperBins, 1.0)));
    const DFCBinProbabilities probability(type, params);
    double statistic = 0.0;
    DFCChiSquarePooling pooled;
    for (std::int64_t c = 0; c < nBins; ++c) {
        const double p = probability(c, c == nBins - 1);
        if (!(p > 0.0)) {
            result.fbZeroProbability = true;
            result.fNBins = static_cast<int>(c + 1);
            return result;
        }
        const double expected = p * totalWeight;
        if (expected < kMinExpected) {
            ++result.fNLowExpected;
        }
        const double observed = c < static_cast<std::int64_t>(counts.size())
                                    ? counts[static_cast<std::size_t>(c)]
                                    : 0.0;
        const double diff = observed - expected;
        statistic += diff * diff / expected;
        pooled.Add(observed, expected);
    }
    result.fNBins = static_cast<int>(nBins);
    result.fStatistic = Finite(statistic);
    result.fDegreesOfFreedom = upper - 1.0 - nEstimated;
    result.fPValue = ChiSquareUpperTail(result.fStatistic, result.fDegreesOfFreedom);
    if (!MCMV::IsMissing(result.fStatistic)) {
        result.fPooledStatistic = Finite(pooled.Finish(result.fNPooledBins));
        result.fPooledDegreesOfFreedom = result.fNPooledBins - 1.0 - nEstimated;
        result.fPooledPValue =
            ChiSquareUpperTail(result.fPooledStatistic, result.fPooledDegreesOfFreedom);
    }
    return result;
}

double ComputeCountLogLikelihood(DistType type, const std::vector<double>& params,
                                 const std::vector<double>& counts) {
    const MCSPDistFamily* family = MCSPFindDistFamily(type);
    if (family == nullptr || !family->fbDiscrete || !family->HasDensity(params)) {
        return kMissing;
    }
    double sum = 0.0;
    for (std::size_t c = 0; c < counts.size(); ++c) {
        if (counts[c] > 0.0) {
            const double lnP = family->fLogDensity(params.data(), static_cast<double>(c));
            if (MCMV::IsMissing(lnP)) {
                return kMissing;
            }
            sum += counts[c] * lnP;
        }
    }
    return sum;
}

// ------------------------------------------------------------------------------------------
// Likelihood and information criteria
//
// ln L = Σ w_i·ln f(x_i) with frequency weights (integer weights equal repeated rows), n = W;
// AIC = 2k - 2·ln L (Akaike 1974), BIC = k·ln n - 2·ln L (Schwarz 1978), AICc = AIC +
// 2k(k + 1)/(n - k - 1) (Hurvich and Tsai 1989), k the number of parameters estimated from the
// data. These are the definitions of fitdistrplus's gofstat and logLik as well.

DFCInfoCriteria ComputeInfoCriteria(double logLik, int k, double n) {
    DFCInfoCriteria out{kMissing, kMissing, kMissing};
    if (MCMV::IsMissing(logLik) || !std::isfinite(logLik) || !(n > 0.0)) {
        return out;
    }
    const double kd = static_cast<double>(k);
    out.fAIC = 2.0 * kd - 2.0 * logLik;
    out.fBIC = kd * std::log(n) - 2.0 * logLik;
    if (n - kd - 1.0 > 0.0) {
        out.fAICc = out.fAIC + 2.0 * kd * (kd + 1.0) / (n - kd - 1.0);
    }
    return out;
}

int CountEstimatedParams(DistType type, const std::vector<double>& params) {
    switch (type) {
    case kDistPoisson:
    case kDistExponential:
    case kDistBernoulli:
        return 1;
    case kDistTriangular:
        return 3;
    case kDistWeibull:
        return params.size() > 2 && params[2] != 0.0 ? 3 : 2;
    default:
        return 2;
    }
}

void SetLikelihoodResults(DFCOutputStats::DFCVarDistElement& element, double logLik, double n) {
    element.fNEstimatedParams = CountEstimatedParams(element.fDistType, element.fDistParams);
    element.fLogLikelihood = kMissing;
    element.fLogLikReason.clear();
    if (MCMV::IsMissing(logLik)) {
        element.fLogLikReason = "the density could not be evaluated";
    } else if (logLik == -std::numeric_limits<double>::infinity()) {
        element.fLogLikReason = "the density is 0 at a sample value";
    } else if (!std::isfinite(logLik)) {
        element.fLogLikReason = "the density is unbounded at a sample value";
    } else {
        element.fLogLikelihood = logLik;
    }
    const DFCInfoCriteria ic =
        ComputeInfoCriteria(element.fLogLikelihood, element.fNEstimatedParams, n);
    element.fAIC = ic.fAIC;
    element.fBIC = ic.fBIC;
    element.fAICc = ic.fAICc;
}

namespace {

//! Standard errors and plot points of count candidate `element` from the weighted counts of
//! its field (entry c: the weight of the value c) with total weight `totalWeight`.
void AddCountDiagnostics(DFCOutputStats::DFCVarDistElement& element,
                         const std::vector<double>& counts, double totalWeight) {
    const DistType type = element.fDistType;
    const auto logLik = [type, &counts](const std::vector<double>& p) {
        return ComputeCountLogLikelihood(type, p, counts);
    };
    // The values with a positive count, ascending.
    std::vector<double> values;
    for (std::size_t c = 0; c < counts.size(); ++c) {
        if (counts[c] > 0.0) {
            values.push_back(static_cast<double>(c));
        }
    }
    const DFCSortedSample sample{
        values.size(), [&values](std::size_t i) { return values[i]; },
        [&values, &counts](std::size_t i) { return counts[static_cast<std::size_t>(values[i])]; },
        totalWeight};
    SetFitDiagnostics(element, sample, logLik);
}

} // namespace

MCStatus DFCAlgorithm::ComputeChiSquare() {
    const std::vector<DFCSettings::VarInfoElem>& covInfo = fSettings.GetCovariateInfoElems();
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        if (!fvpCatStatsCovars[ui]) {
            continue;
        }
        DFCOutputStats::DFCVarDistInfo& info = GetOutCovarVarInfo(i);
        int best = -1;
        double bestStat = kMissing;
        for (int k = 0; k < kNFitDistTypes; ++k) {
            const auto type = static_cast<DistType>(k);
            DFCOutputStats::DFCVarDistElement& element =
                info.fDistElements[static_cast<std::size_t>(k)];
            if (!covInfo[ui].IsDistAllowed(type)) {
                element.fbDistAllowed = false;
                continue;
            }
            if (!element.fbDistAllowed) {
                continue;
            }
            const DFCChiSquareResult fit = ComputeChiSquareFit(
                type, element.fDistParams, info.fCategoryCounts, fValidWeight, fvMaximums[ui]);
            for (int n = 0; n < fit.fNLowExpected; ++n) {
                fWarnings.AddWarning(MCStatus(MCSPStatus::kLowExpectedOrException, true), 0);
            }
            SetLikelihoodResults(
                element, ComputeCountLogLikelihood(type, element.fDistParams, info.fCategoryCounts),
                fValidWeight);
            if (fit.fbZeroProbability) {
                DropCovarDist(i, type, kDropZeroProbability);
                continue;
            }
            element.fChiSquareFit = fit.fStatistic;
            element.fChiSquarePValue = fit.fPValue;
            element.fChiSquarePooled = fit.fPooledStatistic;
            element.fChiSquarePooledDF = fit.fPooledDegreesOfFreedom;
            element.fChiSquarePooledPValue = fit.fPooledPValue;
            AddCountDiagnostics(element, info.fCategoryCounts, fValidWeight);
            if (MCMV::IsMissing(fit.fPValue) || fit.fPValue < fPValueThreshold) {
                DropCovarDist(i, type,
                              MCMV::IsMissing(fit.fPValue) ? kDropNoPValue : kDropBelowThreshold);
                continue;
            }
            // Strictly smaller only: of equal statistics the lower type stays.
            if (best < 0 || MCMV::IsMissing(bestStat) || bestStat > fit.fStatistic) {
                best = k;
                bestStat = fit.fStatistic;
            }
        }
        for (const DFCOutputStats::DFCVarDistElement& element : info.fDistElements) {
            if (!MCMV::IsMissing(element.fChiSquareFit)) {
                info.fReportedElements.push_back(element);
            }
        }
        const DFCOutputStats::DFCVarDistElement* bestElement =
            best >= 0 ? &info.fDistElements[static_cast<std::size_t>(best)] : nullptr;
        if (bestElement && !MCMV::IsMissing(bestElement->fChiSquareFit) &&
            !MCMV::IsMissing(bestElement->fChiSquarePValue)) {
            SetBestFit(info, *bestElement, bestElement->fChiSquareFit,
                       bestElement->fChiSquarePValue);
            if (bestElement->fChiSquarePValue < kPoorFitLevel) {
                fWarnings.AddWarning(MCStatus(MCSPStatus::kPoorBestFit, true), 0);
            }
        } else {
            fWarnings.AddWarning(MCStatus(MCSPStatus::kNoFit, true), 0);
        }
        SortReported(info.fReportedElements, &DFCOutputStats::DFCVarDistElement::fChiSquareFit);

        // A whole-valued field keeps its observed category proportions as a fallback.
        if (fvbDiscreteMark[ui]) {
            const std::vector<double>& counts = info.fCategoryCounts;
            DFCOutputStats::DFCVarDistElement empirical(kDistEmpirical, true);
            empirical.fDistParams = {0.0, static_cast<double>(counts.size()) - 1.0,
                                     MCMV::IsMissing(fvVariances[ui]) ? kMissing
                                                                      : std::sqrt(fvVariances[ui])};
            for (double count : counts) {
                empirical.fDistParams.push_back(count / fValidWeight);
            }
            AddEmpiricalElement(info, empirical, covInfo[ui].fbCorrOnly);
        }
    }
    return MCStatus();
}

// ------------------------------------------------------------------------------------------
// EDF step of the continuous covariates

void DFCAlgorithm::AddContinuousEmpirical(int covariate) {
    const auto ui = static_cast<std::size_t>(covariate);
    DFCOutputStats::DFCVarDistElement empirical(kDistEmpirical, true);
    empirical.fDistParams = {fvMinimums[ui], fvMaximums[ui],
                             MCMV::IsMissing(fvVariances[ui]) ? kMissing
                                                              : std::sqrt(fvVariances[ui])};
    if (const DFCHistogramData* histogram = fvpHistograms[ui].get()) {
        const double total = histogram->GetTotalWeight();
        for (int b = 0; b < histogram->GetNBins(); ++b) {
            empirical.fDistParams.push_back(total > 0.0 ? histogram->GetBinWeight(b) / total
                                                        : kMissing);
        }
    } else {
        // A constant field: one bin holds everything.
        empirical.fDistParams.push_back(1.0);
    }
    AddEmpiricalElement(GetOutCovarVarInfo(covariate), empirical,
                        fSettings.GetCovariateInfoElems()[ui].fbCorrOnly);
}

MCStatus DFCAlgorithm::PerformFitGoodness(MultiPassRecordIter& trainData) {
    fvGoodFitCovars.clear();
    fvvGoodFitEntries.clear();
    fvGoodFitWeights.clear();
    for (int i = 0; i < fNCovariates; ++i) {
        const DFCOutputStats::DFCVarDistInfo& info = GetOutCovarVarInfo(i);
        const bool hasEdfCandidate =
            std::any_of(kEdfTypes.begin(), kEdfTypes.end(), [&](DistType k) {
                return info.fDistElements[static_cast<std::size_t>(k)].fbDistAllowed;
            });
        if (hasEdfCandidate) {
            fvGoodFitCovars.push_back(i);
        } else if (fvbContinuous[static_cast<std::size_t>(i)]) {
            AddContinuousEmpirical(i);
        }
    }
    if (fvGoodFitCovars.empty()) {
        return MCStatus();
    }
    // One entry per valid record and listed covariate (and one weight per valid record): the
    // only part of the fit whose memory grows with the data.
    try {
        if (fNValid > std::numeric_limits<std::int32_t>::max()) {
            throw std::length_error("more valid records than entry ordinals");
        }
        const auto nValid = static_cast<std::size_t>(fNValid);
        if (fWeightVar >= 0) {
            fvGoodFitWeights.assign(nValid, 0.0);
        }
        fvvGoodFitEntries.resize(fvGoodFitCovars.size());
        for (std::vector<DFCGoodFitEntry>& entries : fvvGoodFitEntries) {
            entries.assign(nValid, DFCGoodFitEntry{0.0, 0});
        }
    } catch (const std::bad_alloc&) {
        fvvGoodFitEntries.clear();
        fvGoodFitWeights.clear();
        return MCStatus(MCSPStatus::kLowExpectedOrException, false);
    } catch (const std::length_error&) {
        fvvGoodFitEntries.clear();
        fvGoodFitWeights.clear();
        return MCStatus(MCSPStatus::kLowExpectedOrException, false);
    }
    return ComputeFitGoodness(trainData);
}

MCStatus DFCAlgorithm::StoreGoodFitValues(MultiPassRecordIter& trainData) {
    const std::size_t capacity = fvvGoodFitEntries.empty() ? 0 : fvvGoodFitEntries[0].size();
    const bool weighted = !fvGoodFitWeights.empty();
    std::int64_t ordinal = 0;
    std::size_t j = 0;
    while (trainData.HasMore()) {
        if (fCancelInfo.WillCancel()) {
            return MCStatus(MCSPStatus::kCancelled, false);
        }
        if (fNCasesLimit >= 1 && ordinal >= fNCasesLimit) {
            break;
        }
        const MCXML_800::Record* record = trainData.NextRecord();
        if (!record) {
            return MCStatus(MCSPStatus::kNoData, false);
        }
        ++ordinal;
        // A record beyond the valid ones of the descriptive passes (the data changed between
        // passes) has no slot; it is read but not kept.
        if (!GetRecordValues(*record, false) || j >= capacity) {
            continue;
        }
        if (weighted) {
            fvGoodFitWeights[j] = fWeight;
        }
        for (std::size_t li = 0; li < fvGoodFitCovars.size(); ++li) {
            fvvGoodFitEntries[li][j] =
                DFCGoodFitEntry{fvCovariateValues[static_cast<std::size_t>(fvGoodFitCovars[li])],
                                static_cast<std::int32_t>(j)};
        }
        ++j;
    }
    if (j < capacity) {
        for (std::vector<DFCGoodFitEntry>& entries : fvvGoodFitEntries) {
            entries.resize(j);
        }
    }
    return MCStatus();
}

MCStatus DFCAlgorithm::ComputeFitGoodness(MultiPassRecordIter& trainData) {
    MCStatus status = StoreGoodFitValues(trainData);
    if (status.IsError()) {
        return status;
    }
    const std::vector<int>& covariates = fSettings.GetCovariates();
    const std::vector<double>* weights = fvGoodFitWeights.empty() ? nullptr : &fvGoodFitWeights;
    std::vector<std::unique_ptr<DFCAccumStatsWeibTwo>> weibulls;
    std::vector<std::unique_ptr<DFCFitGoodnessTask>> tasks;
    for (std::size_t li = 0; li < fvGoodFitCovars.size(); ++li) {
        const int i = fvGoodFitCovars[li];
        const auto ui = static_cast<std::size_t>(i);
        std::vector<DFCGoodFitEntry>& entries = fvvGoodFitEntries[li];
        // Ascending by value, equal values by record (the entries are stored in record order
        // and the sort is stable): the order depends on nothing but the data.
        SortEntriesByValue(entries);
        DFCOutputStats::DFCVarDistInfo& info = GetOutCovarVarInfo(i);
        for (DistType type : kEdfTypes) {
            DFCOutputStats::DFCVarDistElement& element =
                info.fDistElements[static_cast<std::size_t>(type)];
            if (!element.fbDistAllowed) {
                continue;
            }
            DFCAccumStatsWeibTwo* weibull = nullptr;
            if (type == kDistWeibull) {
                weibulls.push_back(std::make_unique<DFCAccumStatsWeibTwo>(
                    fSettings, element.fDistParams, std::vector<int>{covariates[ui]}, fValidWeight,
                    std::vector<double>{fvMeans[ui]}, std::vector<double>{fvVariances[ui]},
                    std::vector<double>{fvMinimums[ui]}));
                weibull = weibulls.back().get();
                weibull->SetData(&entries, weights, fValidWeight, fvSumLogX[ui]);
            }
            tasks.push_back(std::make_unique<DFCFitGoodnessTask>(
                i, type, fSettings, *fpVarList, fOutputStats, info, element, entries, weights,
                fValidWeight, weibull, &fCancelInfo));
        }
    }

    if (!tasks.empty()) {
        std::vector<MCThread_800::IMCThreadTask*> taskList;
        for (const auto& task : tasks) {
            taskList.push_back(task.get());
        }
        const int nThreads = std::max(1, std::min(static_cast<int>(tasks.size()), fMaxThreadNum));
        std::unique_ptr<MCThread_800::IMCThreadGroup> group =
            fpThreadFactory ? fpThreadFactory->CreateThreadGroup(nThreads) : nullptr;
        if (group) {
            group->Run(taskList);
        } else {
            // Without a thread factory the tasks run here, one after the other.
            for (MCThread_800::IMCThreadTask* task : taskList) {
                task->RunTask();
            }
        }
    }
    bool cancelled = fCancelInfo.WillCancel();
    for (const auto& task : tasks) {
        cancelled = cancelled || task->IsCancelled();
    }
    if (cancelled) {
        return MCStatus(MCSPStatus::kCancelled, false);
    }

    for (const auto& task : tasks) {
        if (!task->GetStatus().IsOK()) {
            fWarnings.AddWarning(task->GetStatus(), 0);
        }
        fWarnings.AddWarnings(task->GetWarnings());
        // A task drops its element directly; the allowed mask follows.
        if (!GetOutCovarDistInfo(task->GetCovariate(), task->GetDistType()).fbDistAllowed) {
            fvAllowedMask[static_cast<std::size_t>(task->GetCovariate())] &=
                static_cast<std::uint16_t>(~(1u << task->GetDistType()));
        }
    }
    for (int i : fvGoodFitCovars) {
        ChooseEdfBestFit(i);
    }
    return MCStatus();
}

void DFCAlgorithm::ChooseEdfBestFit(int covariate) {
    const auto ui = static_cast<std::size_t>(covariate);
    DFCOutputStats::DFCVarDistInfo& info = GetOutCovarVarInfo(covariate);
    const bool byAD = fGFType == kAndersonDarling;
    const auto statOf = [byAD](const DFCOutputStats::DFCVarDistElement& e) {
        return byAD ? e.fADFit : e.fKSFit;
    };
    const auto pValueOf = [byAD](const DFCOutputStats::DFCVarDistElement& e) {
        return byAD ? e.fADPValue : e.fKSPValue;
    };

    int best = -1;
    double bestStat = kMissing;
    int bestAD = -1;
    int bestKS = -1;
    for (DistType type : kEdfTypes) {
        DFCOutputStats::DFCVarDistElement& element =
            info.fDistElements[static_cast<std::size_t>(type)];
        if (!element.fbDistAllowed) {
            continue;
        }
        const double stat = statOf(element);
        const double pValue = pValueOf(element);
        if (MCMV::IsMissing(pValue) || pValue < fPValueThreshold) {
            DropCovarDist(covariate, type,
                          MCMV::IsMissing(pValue) ? kDropNoPValue : kDropBelowThreshold);
        } else if (best < 0 || MCMV::IsMissing(bestStat) || bestStat > stat) {
            // Strictly smaller only: of equal statistics the lower type stays.
            best = type;
            bestStat = stat;
        }
        if (element.fbDistAllowed) {
            if (fbComputeAD && !MCMV::IsMissing(element.fADPValue) &&
                (bestAD < 0 ||
                 element.fADFit < info.fDistElements[static_cast<std::size_t>(bestAD)].fADFit)) {
                bestAD = type;
            }
            if (fbComputeKS && !MCMV::IsMissing(element.fKSPValue) &&
                (bestKS < 0 ||
                 element.fKSFit < info.fDistElements[static_cast<std::size_t>(bestKS)].fKSFit)) {
                bestKS = type;
            }
        }
        if (!MCMV::IsMissing(element.fADFit) || !MCMV::IsMissing(element.fKSFit)) {
            info.fReportedElements.push_back(element);
        }
    }
    SortReported(info.fReportedElements, byAD ? &DFCOutputStats::DFCVarDistElement::fADFit
                                              : &DFCOutputStats::DFCVarDistElement::fKSFit);

    const DFCOutputStats::DFCVarDistElement* bestElement =
        best >= 0 ? &info.fDistElements[static_cast<std::size_t>(best)] : nullptr;
    if (bestElement && !MCMV::IsMissing(statOf(*bestElement)) &&
        !MCMV::IsMissing(pValueOf(*bestElement))) {
        const double pValue = pValueOf(*bestElement);
        SetBestFit(info, *bestElement, statOf(*bestElement), pValue);
        if (HasNoEdfTable(bestElement->fDistType)) {
            info.fBestFitPValue = kMissing;
        } else if (pValue < kPoorFitLevel) {
            fWarnings.AddWarning(MCStatus(MCSPStatus::kPoorBestFit, true), 0);
        }
    } else {
        fWarnings.AddWarning(MCStatus(MCSPStatus::kNoFit, true), 0);
    }
    if (fbComputeAD) {
        info.fDistBestADType = bestAD >= 0 ? static_cast<DistType>(bestAD) : kDistUnknown;
    }
    if (fbComputeKS) {
        info.fDistBestKSType = bestKS >= 0 ? static_cast<DistType>(bestKS) : kDistUnknown;
    }
    if (fvbContinuous[ui]) {
        AddContinuousEmpirical(covariate);
    }
    // Triangular and Beta have no table of their EDF statistics: their p-value of 1.0 only
    // kept them among the candidates, and is no p-value to report, neither in the element nor
    // in its reported copy.
    const auto clearPlaceholders = [](DFCOutputStats::DFCVarDistElement& e) {
        if (HasNoEdfTable(e.fDistType)) {
            e.fADPValue = kMissing;
            e.fKSPValue = kMissing;
        }
    };
    clearPlaceholders(info.fDistElements[kDistTriangular]);
    clearPlaceholders(info.fDistElements[kDistBeta]);
    for (DFCOutputStats::DFCVarDistElement& e : info.fReportedElements) {
        clearPlaceholders(e);
    }
}

// ------------------------------------------------------------------------------------------
// The fitted distribution functions: the family table's F (Boost.Math), with the density and
// its slope of the carried candidates below.

DFCFittedCdf::DFCFittedCdf(DistType type, const std::vector<double>& params) : fType(type) {
    fpFamily = MCSPFindDistFamily(type);
    if (fpFamily == nullptr || fpFamily->fbDiscrete || params.size() < fpFamily->fNParams ||
        !fpFamily->fHasDensity(params.data())) {
        return;
    }
    fP0 = params[0];
    fP1 = fpFamily->fNParams > 1 ? params[1] : 0.0;
    fP2 = fpFamily->fNParams > 2 ? params[2] : 0.0;
    fbValid = true;
    if (type == kDistGamma) {
        fLogNorm = boost::math::lgamma(fP0, MCMathPolicy()) - fP0 * std::log(fP1);
    } else if (type == kDistNormal || type == kDistLognormal) {
        fLogNorm = std::log(fP1) + kLnSqrtTwoPi;
    } else if (type == kDistUniform) {
        fLogNorm = std::log(fP1 - fP0);
    } else if (type == kDistExponential) {
        fLogNorm = -std::log(fP0);
    } else if (type == kDistWeibull) {
        fLogNorm = -std::log(fP1 / fP0);
    } else if (type == kDistBeta) {
        const double beta = boost::math::beta(fP0, fP1, MCMathPolicy());
        fLogNorm = beta > 0.0 && std::isfinite(beta)
                       ? std::log(beta)
                       : std::lgamma(fP0) + std::lgamma(fP1) - std::lgamma(fP0 + fP1);
    }
}

// The closed forms below are the fast forms of the family table's F for the candidates that
// are evaluated at every value (no carry): the table's Boost distributions check their
// parameters at every call, which the fit, with parameters checked once, need not pay for.
// Gamma and Beta go to the table. LogNormal (a = geometric mean, b = sd of ln x): Φ(ln(x/a)/b)
// for x > 0. Normal: Φ((x-μ)/σ). Triangular (min a, max b, mode c): (x-a)²/((b-a)(c-a)) on
// [a, c), 1 - (b-x)²/((b-a)(b-c)) on [c, b]. Uniform: (x-a)/(b-a). Weibull (scale a, shape b,
// location c): 1 - exp(-((x-c)/a)^b) for x > c. Exponential (rate λ): 1 - exp(-λx). Each is 0
// below and 1 above its support; 1 - exp(-t) is evaluated as -expm1(-t), exact for small t.
double DFCFittedCdf::operator()(double x) const {
    if (!fbValid || MCMV::IsMissing(x)) {
        return kMissing;
    }
    switch (fType) {
    case kDistLognormal:
        return x > 0.0 ? MCDistFun::CdfStdNorm(std::log(x / fP0) / fP1) : 0.0;
    case kDistNormal:
        return MCDistFun::CdfNorm(x, fP0, fP1);
    case kDistTriangular: {
        const double a = fP0;
        const double b = fP1;
        const double c = fP2;
        if (x <= a) {
            return 0.0;
        }
        if (x >= b) {
            return 1.0;
        }
        return x < c ? (x - a) * (x - a) / ((b - a) * (c - a))
                     : 1.0 - (b - x) * (b - x) / ((b - a) * (b - c));
    }
    case kDistUniform:
        return x < fP0 ? 0.0 : (x > fP1 ? 1.0 : (x - fP0) / (fP1 - fP0));
    case kDistWeibull:
        return x > fP2 ? -std::expm1(-std::pow((x - fP2) / fP0, fP1)) : 0.0;
    case kDistExponential:
        return x >= 0.0 ? -std::expm1(-x * fP0) : 0.0;
    default: {
        const double p[3] = {fP0, fP1, fP2};
        return fpFamily->fCdf(p, x);
    }
    }
}

double DFCFittedCdf::LogDensity(double x) const {
    if (!fbValid || MCMV::IsMissing(x)) {
        return kMissing;
    }
    constexpr double kInf = std::numeric_limits<double>::infinity();
    // The family table's formulas (mcspdistfamily.cpp) with fLogNorm taken out of the loop;
    // (a - 1)·ln x is 0 for a = 1, also at x = 0.
    const auto xLogY = [](double a, double y) { return a == 0.0 ? 0.0 : a * std::log(y); };
    switch (fType) {
    case kDistGamma:
        return x >= 0.0 ? xLogY(fP0 - 1.0, x) - fP1 * x - fLogNorm : -kInf;
    case kDistBeta:
        return x >= 0.0 && x <= 1.0
                   ? xLogY(fP0 - 1.0, x) + (fP1 == 1.0 ? 0.0 : (fP1 - 1.0) * std::log1p(-x)) -
                         fLogNorm
                   : -kInf;
    case kDistNormal: {
        const double t = (x - fP0) / fP1;
        return -0.5 * t * t - fLogNorm;
    }
    case kDistLognormal: {
        if (!(x > 0.0)) {
            return -kInf;
        }
        const double t = std::log(x / fP0) / fP1;
        return -0.5 * t * t - std::log(x) - fLogNorm;
    }
    case kDistUniform:
        return x >= fP0 && x <= fP1 ? -fLogNorm : -kInf;
    case kDistExponential:
        return x >= 0.0 ? -fLogNorm - fP0 * x : -kInf;
    case kDistWeibull: {
        // ln(b/a) + (b - 1)·ln w - w^b with w = (x - c)/a; the ends through the table.
        const double w = (x - fP2) / fP0;
        if (!(w > 0.0) || !std::isfinite(w)) {
            break;
        }
        const double lnW = std::log(w);
        return -fLogNorm + (fP1 - 1.0) * lnW - std::exp(fP1 * lnW);
    }
    default:
        break;
    }
    const double p[3] = {fP0, fP1, fP2};
    return fpFamily->fLogDensity(p, x);
}

// ------------------------------------------------------------------------------------------
// F over sorted values
//
// The distribution functions (Boost's incomplete gamma and beta, 100 to 400 ns a value; the
// normal integral, 20 to 30 ns with the LogNormal's logarithm) dominate the EDF tests of a
// large field, yet neighbouring sorted values are close. So F is computed exactly only at every
// kStretch-th value and carried in between by integrating the density f from one value to the next
// with the corrected trapezoid rule
//   ∫_x0^x1 f = h/2·(f0 + f1) + h²/12·(f0' - f1') - h⁵/720·f⁽⁴⁾(ξ),   h = x1 - x0,
// (the integral of the cubic Hermite interpolant; Davis and Rabinowitz, "Methods of Numerical
// Integration", 2nd ed., 1984, section 2.9), with f' = f·(d ln f/dx), one exp and one or two
// logarithms a value. Below the median F is carried upwards from the stretch's lower end;
// above it 1 - F is carried downwards from the upper end, so that each tail keeps its
// relative accuracy. A stretch is accepted only when every step is short against the
// density's own scale (h·|d ln f/dx| ≤ kMaxStepSlope, where the rule's error is below 1e-8 of
// the step's own increment) and the carried value meets the exact one at the stretch's far
// end within kCarryTolerance relative; otherwise (a stretch that crosses the median, an
// outlier's long gap, a density that cannot be evaluated, a pole at 0) every value of the
// stretch is evaluated exactly.

namespace {
//! Values between two exact evaluations.
constexpr std::size_t kStretch = 64;
//! Shorter stretches are evaluated exactly.
constexpr std::size_t kMinStretch = 8;
//! Largest h·|f'/f| of a carried step.
constexpr double kMaxStepSlope = 0.02;
//! Largest relative gap between the carried and the exact value at a stretch's far end.
constexpr double kCarryTolerance = 1e-13;
} // namespace

double DFCFittedCdf::ExactTail(double x, bool upper) const {
    const double p[3] = {fP0, fP1, fP2};
    return upper ? fpFamily->fCcdf(p, x) : fpFamily->fCdf(p, x);
}

bool DFCFittedCdf::Density(double x, double& f, double& slope) const {
    constexpr double kInvRootTwoPi = 0.398942280401432677939946059934;
    switch (fType) {
    case kDistGamma:
        // Shape α, rate β: ln f = (α-1)·ln x - βx - (ln Γ(α) - α·ln β).
        if (!(x > 0.0)) {
            return false;
        }
        f = std::exp((fP0 - 1.0) * std::log(x) - fP1 * x - fLogNorm);
        slope = (fP0 - 1.0) / x - fP1;
        break;
    case kDistBeta:
        // ln f = (a-1)·ln x + (b-1)·ln(1-x) - ln B(a, b).
        if (!(x > 0.0 && x < 1.0)) {
            return false;
        }
        f = std::exp((fP0 - 1.0) * std::log(x) + (fP1 - 1.0) * std::log1p(-x) - fLogNorm);
        slope = (fP0 - 1.0) / x - (fP1 - 1.0) / (1.0 - x);
        break;
    case kDistNormal: {
        // z = (x - μ)/σ: f = φ(z)/σ, d ln f/dx = -z/σ.
        const double z = (x - fP0) / fP1;
        f = kInvRootTwoPi * std::exp(-0.5 * z * z) / fP1;
        slope = -z / fP1;
        break;
    }
    case kDistLognormal: {
        // z = ln(x/a)/b: f = φ(z)/(x·b), d ln f/dx = -(z/b + 1)/x.
        if (!(x > 0.0)) {
            return false;
        }
        const double z = std::log(x / fP0) / fP1;
        f = kInvRootTwoPi * std::exp(-0.5 * z * z) / (x * fP1);
        slope = -(z / fP1 + 1.0) / x;
        break;
    }
    default:
        return false;
    }
    return std::isfinite(f) && f > 0.0 && std::isfinite(slope);
}

bool DFCFittedCdf::CarryStretch(const double* x, std::size_t begin, std::size_t end, double* u,
                                double* work) const {
    // The exact ends decide the direction: both below the median carry F up, both above
    // carry 1 - F down.
    const double lowBegin = ExactTail(x[begin], false);
    if (MCMV::IsMissing(lowBegin)) {
        return false;
    }
    bool up = lowBegin <= 0.5;
    double from = lowBegin;
    double to = 0.0;
    if (up) {
        to = ExactTail(x[end], false);
        if (MCMV::IsMissing(to) || to > 0.5) {
            return false;
        }
    } else {
        from = ExactTail(x[end], true);
        to = ExactTail(x[begin], true);
        if (MCMV::IsMissing(from) || MCMV::IsMissing(to)) {
            return false;
        }
    }
    if (!(from > 0.0 && to > 0.0)) {
        return false;
    }
    double* f = work;
    double* slope = work + kStretch + kMinStretch + 1;
    for (std::size_t j = begin; j <= end; ++j) {
        if (!Density(x[j], f[j - begin], slope[j - begin])) {
            return false;
        }
    }
    // The increment between entries j and j + 1.
    const auto step = [&](std::size_t j, double& increment) {
        const std::size_t k = j - begin;
        const double h = x[j + 1] - x[j];
        if (h * std::max(std::fabs(slope[k]), std::fabs(slope[k + 1])) > kMaxStepSlope) {
            return false;
        }
        increment = 0.5 * h * (f[k] + f[k + 1]) +
                    h * h / 12.0 * (f[k] * slope[k] - f[k + 1] * slope[k + 1]);
        return true;
    };
    double carried = from;
    double increment = 0.0;
    if (up) {
        u[begin] = from;
        for (std::size_t j = begin; j < end; ++j) {
            if (!step(j, increment)) {
                return false;
            }
            carried += increment;
            u[j + 1] = carried;
        }
        u[end] = to;
    } else {
        u[end] = 1.0 - from;
        for (std::size_t j = end; j > begin; --j) {
            if (!step(j - 1, increment)) {
                return false;
            }
            carried += increment;
            u[j - 1] = 1.0 - carried;
        }
        u[begin] = 1.0 - to;
    }
    return std::fabs(carried - to) <= kCarryTolerance * to;
}

void DFCFittedCdf::EvaluateSorted(const double* x, std::size_t n, double* u) const {
    const bool carry = fbValid && (fType == kDistGamma || fType == kDistBeta ||
                                   fType == kDistNormal || fType == kDistLognormal);
    std::array<double, 2 * (kStretch + kMinStretch + 1)> work{};
    std::size_t begin = 0;
    while (begin < n) {
        std::size_t end = std::min(begin + kStretch, n - 1);
        if (n - 1 - end < kMinStretch) {
            end = n - 1; // a short remainder joins this stretch
        }
        const bool carried =
            carry && end - begin >= kMinStretch && CarryStretch(x, begin, end, u, work.data());
        if (!carried) {
            for (std::size_t j = begin; j <= end; ++j) {
                u[j] = (*this)(x[j]);
            }
        }
        begin = end + 1;
    }
    // Tied values share F(x), whichever way each was reached.
    for (std::size_t j = 1; j < n; ++j) {
        if (x[j] == x[j - 1]) {
            u[j] = u[j - 1];
        }
    }
}

// ------------------------------------------------------------------------------------------
// A² and D with frequency weights
//
// Over the values sorted ascending, x_1 ≤ ... ≤ x_N with weights w_i, W = Σ w_i, the running
// weight C_i = w_1 + ... + w_i and u_i = F(x_i), the weighted EDF is F_N(x) = C_i/W on
// [x_i, x_(i+1)). Integrating the Anderson-Darling quadratic W·∫(F_N - F)²/(F(1-F)) dF piece
// by piece gives
//   A² = -W + Σ_i w_i·[((2·C_(i-1) + w_i)/W)·(ln(1-u_i) - ln u_i) - 2·ln(1-u_i)],
// which for unit weights is Stephens' form -n - (1/n)·Σ (2i-1)·[ln u_i + ln(1 - u_(n+1-i))]
// (Stephens 1974, "EDF statistics for goodness of fit and some comparisons", JASA 69,
// 730-737). Since w_i·(2·C_(i-1) + w_i) = C_i² - C_(i-1)², tied values merge exactly into one
// value of their summed weight, so integer weights equal repeated rows. An entry with u_i at 0
// or 1 (the fitted support ends there) would add an infinite term; it only advances C.
// The terms are added with a compensated sum (Neumaier 1974; each rounding error taken exactly
// by Knuth's TwoSum): A² is a difference of two numbers of size W, and compensation keeps its
// absolute error near eps·W instead of N·eps·W.
//
// Kolmogorov-Smirnov: D = max_i max(|u_i - C_i/W|, |u_i - C_(i-1)/W|), the largest distance
// between F and the EDF just after and just before each jump. (C_i - 1)/W in place of
// C_(i-1)/W, seen in some unweighted code, is right only for unit weights.

void AccumulateEdfTerms(const double* u, const double* w, std::size_t n, double totalWeight,
                        bool computeAD, bool computeKS, DFCEdfState& state) {
    double cum = state.fCumWeight;
    double sum = state.fADSum;
    double comp = state.fADComp;
    double dmax = state.fKSMax;
    const double invW = 1.0 / totalWeight;
    for (std::size_t i = 0; i < n; ++i) {
        const double wi = w ? w[i] : 1.0;
        const double ui = u[i];
        const double next = cum + wi;
        if (computeAD && ui > 0.0 && ui < 1.0) {
            const double log1mu = std::log1p(-ui);
            const double term =
                wi * (((cum + next) * invW) * (log1mu - std::log(ui)) - 2.0 * log1mu);
            // Knuth's TwoSum: the exact rounding error of sum + term, without a branch on
            // which is larger.
            const double t = sum + term;
            const double z = t - sum;
            comp += (sum - (t - z)) + (term - z);
            sum = t;
        }
        if (computeKS) {
            dmax = std::max({dmax, std::fabs(ui - next * invW), std::fabs(ui - cum * invW)});
        }
        cum = next;
    }
    state.fCumWeight = cum;
    state.fADSum = sum;
    state.fADComp = comp;
    state.fKSMax = dmax;
}

double FinishAndersonDarling(const DFCEdfState& state, double totalWeight) {
    // One more compensated step: add -W.
    const double sum = state.fADSum;
    const double t = sum - totalWeight;
    const double comp = state.fADComp + (std::fabs(sum) >= totalWeight ? (sum - t) - totalWeight
                                                                       : (-totalWeight - t) + sum);
    return Finite(t + comp);
}

double ComputeAndersonDarling(const double* u, const double* w, std::size_t n, double totalWeight) {
    DFCEdfState state;
    AccumulateEdfTerms(u, w, n, totalWeight, true, false, state);
    return FinishAndersonDarling(state, totalWeight);
}

double ComputeKolmogorovSmirnov(const double* u, const double* w, std::size_t n,
                                double totalWeight) {
    DFCEdfState state;
    AccumulateEdfTerms(u, w, n, totalWeight, false, true, state);
    return Finite(state.fKSMax);
}

// ------------------------------------------------------------------------------------------
// Significance of A² and D
//
// With parameters estimated from the data the null distributions of A² and D depend on the
// family (and for the Gamma on the shape), not on the parameter values. The modified
// statistics Z* and D* make the upper-tail points nearly independent of n; the p-values come
// from the formulas and critical-value tables of D'Agostino and Stephens (eds.),
// "Goodness-of-Fit Techniques" (1986), chapter 4 (Stephens): Normal and LogNormal (case 3,
// Z* = A²·(1 + 0.75/n + 2.25/n²), D* = D·(√n - 0.01 + 0.85/√n)); Exponential (Z* = A²·(1 +
// 0.6/n), D* = (D - 0.2/n)·(√n + 0.26 + 0.5/√n)); Weibull (Z* = (1 + 0.2/√n)·A², D* = √n·D);
// Gamma (A² by the shape's table, D* = (√n + 0.3/√n)·D). The Uniform has nothing estimated
// beyond its extremes and is referred to the limiting distributions of A² (Marsaglia and
// Marsaglia 2004) and of √n·D (Kolmogorov 1933). Triangular and Beta have no table: their
// p-value 1.0 is a placeholder that keeps them among the candidates. n is the total weight W.

double LookUpSignificance(double value, const std::vector<double>& criticals,
                          const std::vector<double>& levels) {
    if (criticals.size() != levels.size() || criticals.empty() || MCMV::IsMissing(value)) {
        return kMissing;
    }
    if (value <= criticals.front()) {
        return levels.front();
    }
    if (value >= criticals.back()) {
        return levels.back();
    }
    for (std::size_t j = 1; j < criticals.size(); ++j) {
        if (value == criticals[j]) {
            return levels[j];
        }
        if (value < criticals[j]) {
            const double t = (value - criticals[j - 1]) / (criticals[j] - criticals[j - 1]);
            return levels[j - 1] + t * (levels[j] - levels[j - 1]);
        }
    }
    return levels.back();
}

// A table gives the significance only at its levels: a statistic between two critical values
// has a p-value between their levels, one beyond the table's ends a p-value beyond the first
// or last level. LookUpSignificance's interpolated value keeps its role in the best-fit
// choice; these bounds are what the table actually says.
void LookUpSignificanceBounds(double value, const std::vector<double>& criticals,
                              const std::vector<double>& levels, double& lower, double& upper) {
    lower = kMissing;
    upper = kMissing;
    if (criticals.size() != levels.size() || criticals.empty() || MCMV::IsMissing(value)) {
        return;
    }
    if (value <= criticals.front()) {
        lower = levels.front();
        return;
    }
    if (value >= criticals.back()) {
        upper = levels.back();
        return;
    }
    for (std::size_t j = 1; j < criticals.size(); ++j) {
        if (value == criticals[j]) {
            lower = upper = levels[j];
            return;
        }
        if (value < criticals[j]) {
            lower = std::min(levels[j - 1], levels[j]);
            upper = std::max(levels[j - 1], levels[j]);
            return;
        }
    }
}

// D'Agostino and Stephens (1986), table 4.9: the p-value of Z* for the Normal with mean and
// variance estimated, four exponential-quadratic pieces in Z*.
double AndersonDarlingNormalPValue(double z) {
    if (MCMV::IsMissing(z)) {
        return kMissing;
    }
    if (z <= 0.2) {
        return 1.0 - std::exp(-13.436 + 101.14 * z - 223.73 * z * z);
    }
    if (z <= 0.34) {
        return 1.0 - std::exp(-8.318 + 42.796 * z - 59.938 * z * z);
    }
    if (z <= 0.6) {
        return std::exp(0.9177 - 4.279 * z - 1.38 * z * z);
    }
    if (z <= 153.467) {
        return std::exp(1.2937 - 5.709 * z + 0.0186 * z * z);
    }
    return 0.0;
}

// The same form for the Exponential with its scale estimated (Stephens, in D'Agostino and
// Stephens 1986, section 4.9).
double AndersonDarlingExponentialPValue(double z) {
    if (MCMV::IsMissing(z)) {
        return kMissing;
    }
    if (z <= 0.26) {
        return 1.0 - std::exp(-12.2204 + 67.459 * z - 110.3 * z * z);
    }
    if (z <= 0.51) {
        return 1.0 - std::exp(-6.1327 + 20.218 * z - 18.663 * z * z);
    }
    if (z <= 0.95) {
        return std::exp(0.9209 - 3.353 * z + 0.3 * z * z);
    }
    if (z <= 10.03) {
        return std::exp(0.731 - 3.009 * z + 0.15 * z * z);
    }
    return 0.0;
}

// Marsaglia and Marsaglia (2004), "Evaluating the Anderson-Darling distribution", J. Stat.
// Software 9(2), function adinf: the limiting distribution function of A², within 2e-5 of the
// series of Anderson and Darling (1954) (measured at 40 digits for 0.3 ≤ z ≤ 6). G(z) = 0 for
// z ≤ 0: A² is not negative in the limit, so a non-positive A² is the best possible fit.
double AndersonDarlingAsymptoticCdf(double z) {
    if (MCMV::IsMissing(z)) {
        return kMissing;
    }
    if (z <= 0.0) {
        return 0.0;
    }
    if (z < 2.0) {
        return std::exp(-1.2337141 / z) / std::sqrt(z) *
               (2.00012 +
                (0.247105 - (0.0649821 - (0.0347962 - (0.011672 - 0.00168691 * z) * z) * z) * z) *
                    z);
    }
    return std::exp(-std::exp(
        1.0776 - (2.30695 - (0.43424 - (0.082433 - (0.008056 - 0.0003146 * z) * z) * z) * z) * z));
}

// Kolmogorov (1933): K(x) = Σ_(k=-∞..∞) (-1)^k·exp(-2k²x²), so 1 - K(x) = 2·Σ_(k≥1)
// (-1)^(k-1)·exp(-2k²x²), summed directly (no cancellation against 1). That series needs
// about 1/x terms; below x = 1 the Jacobi theta transformation
// K(x) = (√(2π)/x)·Σ_(k≥1) exp(-(2k-1)²π²/(8x²)) converges in a few terms instead. Both
// are summed until the terms no longer change the sum.
double KolmogorovPValue(double x) {
    if (MCMV::IsMissing(x)) {
        return kMissing;
    }
    if (x <= 0.0) {
        return 1.0;
    }
    constexpr double kPi = 3.14159265358979323846;
    if (x < 1.0) {
        const double f = -kPi * kPi / (8.0 * x * x);
        double sum = 0.0;
        for (int k = 1; k < 100; ++k) {
            const double odd = 2.0 * k - 1.0;
            const double term = std::exp(f * odd * odd);
            sum += term;
            if (term <= 1e-17 * sum) {
                break;
            }
        }
        return 1.0 - std::sqrt(2.0 * kPi) / x * sum;
    }
    double sum = 0.0;
    double sign = 1.0;
    for (int k = 1; k < 100; ++k) {
        const double term = std::exp(-2.0 * k * k * x * x);
        sum += sign * term;
        if (term <= 1e-17 * sum) {
            break;
        }
        sign = -sign;
    }
    return std::min(1.0, 2.0 * sum);
}

DFCEdfSignificance ComputeEdfSignificance(DistType type, double n, double a2, double d,
                                          double shape) {
    DFCEdfSignificance out;
    out.fADZStar = out.fADPValue = out.fKSDStat = out.fKSPValue = kMissing;
    const bool hasAD = !MCMV::IsMissing(a2);
    const bool hasKS = !MCMV::IsMissing(d);
    const double rootN = std::sqrt(n);
    switch (type) {
    case kDistLognormal:
    case kDistNormal: {
        static const std::vector<double> kCrit = {0.775, 0.819, 0.895, 0.995, 1.035};
        static const std::vector<double> kLevels = {0.15, 0.10, 0.05, 0.025, 0.01};
        if (hasAD) {
            out.fADZStar = a2 * (1.0 + 0.75 / n + 2.25 / (n * n));
            out.fADPValue = AndersonDarlingNormalPValue(out.fADZStar);
        }
        if (hasKS) {
            out.fKSDStat = d * (rootN - 0.01 + 0.85 / rootN);
            out.fKSPValue = LookUpSignificance(out.fKSDStat, kCrit, kLevels);
            LookUpSignificanceBounds(out.fKSDStat, kCrit, kLevels, out.fKSPLower, out.fKSPUpper);
        }
        break;
    }
    case kDistTriangular:
    case kDistBeta:
        if (hasAD) {
            out.fADPValue = 1.0;
        }
        if (hasKS) {
            out.fKSPValue = 1.0;
        }
        break;
    case kDistUniform:
        if (hasAD) {
            out.fADZStar = a2;
            out.fADPValue = 1.0 - AndersonDarlingAsymptoticCdf(a2);
        }
        if (hasKS) {
            out.fKSDStat = rootN * d;
            out.fKSPValue = KolmogorovPValue(out.fKSDStat);
        }
        break;
    case kDistWeibull: {
        static const std::vector<double> kADCrit = {0.474, 0.637, 0.757, 0.877, 1.038};
        static const std::vector<double> kADLevels = {0.25, 0.10, 0.05, 0.025, 0.01};
        static const std::vector<double> kKSCrit = {1.372, 1.477, 1.557, 1.671};
        static const std::vector<double> kKSLevels = {0.10, 0.05, 0.025, 0.01};
        if (hasAD) {
            out.fADZStar = (1.0 + 0.2 / rootN) * a2;
            out.fADPValue = LookUpSignificance(out.fADZStar, kADCrit, kADLevels);
            LookUpSignificanceBounds(out.fADZStar, kADCrit, kADLevels, out.fADPLower,
                                     out.fADPUpper);
        }
        if (hasKS) {
            out.fKSDStat = rootN * d;
            out.fKSPValue = LookUpSignificance(out.fKSDStat, kKSCrit, kKSLevels);
            LookUpSignificanceBounds(out.fKSDStat, kKSCrit, kKSLevels, out.fKSPLower,
                                     out.fKSPUpper);
        }
        break;
    }
    case kDistGamma: {
        static const std::vector<double> kADLevels = {0.25, 0.10, 0.05, 0.025, 0.01, 0.005};
        static const std::vector<double> kADCritSmall = {0.486, 0.657, 0.786, 0.917, 1.092, 1.227};
        static const std::vector<double> kADCritMid = {0.473, 0.637, 0.759, 0.883, 1.048, 1.173};
        static const std::vector<double> kADCritLarge = {0.470, 0.631, 0.752, 0.873, 1.035, 1.159};
        static const std::vector<double> kKSCrit = {0.74,  0.78, 0.80,  0.858,
                                                    0.928, 0.99, 1.069, 1.13};
        static const std::vector<double> kKSLevels = {0.25, 0.20,  0.15, 0.10,
                                                      0.05, 0.025, 0.01, 0.005};
        if (hasAD && !MCMV::IsMissing(shape)) {
            const std::vector<double>& crit =
                shape <= 1.0 ? kADCritSmall : (shape <= 8.0 ? kADCritMid : kADCritLarge);
            out.fADPValue = LookUpSignificance(a2, crit, kADLevels);
            LookUpSignificanceBounds(a2, crit, kADLevels, out.fADPLower, out.fADPUpper);
        }
        if (hasKS) {
            out.fKSDStat = (rootN + 0.3 / rootN) * d;
            out.fKSPValue = LookUpSignificance(out.fKSDStat, kKSCrit, kKSLevels);
            LookUpSignificanceBounds(out.fKSDStat, kKSCrit, kKSLevels, out.fKSPLower,
                                     out.fKSPUpper);
        }
        break;
    }
    case kDistExponential: {
        static const std::vector<double> kCrit = {0.926, 0.995, 1.094, 1.184, 1.298};
        static const std::vector<double> kLevels = {0.15, 0.10, 0.05, 0.025, 0.01};
        if (hasAD) {
            out.fADZStar = a2 * (1.0 + 0.6 / n);
            out.fADPValue = AndersonDarlingExponentialPValue(out.fADZStar);
        }
        if (hasKS) {
            out.fKSDStat = (d - 0.2 / n) * (rootN + 0.26 + 0.5 / rootN);
            out.fKSPValue = LookUpSignificance(out.fKSDStat, kCrit, kLevels);
            LookUpSignificanceBounds(out.fKSDStat, kCrit, kLevels, out.fKSPLower, out.fKSPUpper);
        }
        break;
    }
    default:
        break;
    }
    out.fADZStar = Finite(out.fADZStar);
    out.fADPValue = Finite(out.fADPValue);
    out.fKSDStat = Finite(out.fKSDStat);
    out.fKSPValue = Finite(out.fKSPValue);
    return out;
}

// ------------------------------------------------------------------------------------------
// The task

DFCFitGoodnessTask::DFCFitGoodnessTask(
    int covariate, DistType type, const DFCSettings& settings,
    const MCXML_800::MCVarList& variables, DFCOutputStats& outputStats,
    DFCOutputStats::DFCVarDistInfo& info, DFCOutputStats::DFCVarDistElement& element,
    const std::vector<DFCGoodFitEntry>& entries, const std::vector<double>* weights,
    double totalWeight, DFCAccumStatsWeibTwo* weibull, const MCMath_800::MCCancelInfo* runCancel)
    : fCovariate(covariate), fDistType(type), fpSettings(&settings), fpVarList(&variables),
      fpOutputStats(&outputStats), fGFType(settings.GetGFType()),
      fbInteractiveMode(settings.GetInteractiveMode()),
      fbComputeAD(fGFType == kAndersonDarling || fbInteractiveMode),
      fbComputeKS(fGFType == kKolmogorovSmirnov || fbInteractiveMode), fpInfo(&info),
      fpElement(&element), fNEntries(entries.size()), fTotalWeight(totalWeight), fpWeibull(weibull),
      fpEntries(&entries), fpWeights(weights && !weights->empty() ? weights : nullptr),
      fADFit(kMissing), fADZStar(kMissing), fADPValue(kMissing), fKSFit(kMissing),
      fKSDStat(kMissing), fKSPValue(kMissing), fCancelInfo(settings.GetCancelPointer()),
      fpRunCancel(runCancel) {}

bool DFCFitGoodnessTask::PollCancel() {
    const bool cancel = fCancelInfo.WillCancel() || (fpRunCancel && fpRunCancel->IsCancel());
    fbCancelled = fbCancelled || cancel;
    return cancel;
}

void DFCFitGoodnessTask::RunTask() {
    fStatus = MCStatus();
    if (fDistType == kDistWeibull) {
        const bool solved = fpWeibull && fpWeibull->SolveParameters();
        fStatus = fpWeibull ? fpWeibull->GetStatus() : MCStatus();
        if (!solved || fStatus.IsError()) {
            fpElement->fbDistAllowed = false;
            fpElement->fDropReason = kDropFailedSearch;
            fStatus = MCStatus(MCSPStatus::kDistDropped, true);
            fWarnings.AddWarning(fStatus, 0);
            return;
        }
    }
    fStatus = ComputeEdfStatistics();
}

// Values at an end of the fitted support (the Uniform's and the Triangular's extremes, which
// are the sample's; a 0 of an Exponential or a two-parameter Weibull) have F = 0 or 1 and an
// infinite A² term. Skipping only their terms while counting their weight in W left A² biased
// low, negative even (a Uniform on 8 values: -0.6; three values repeated hundreds of times
// under a Triangular: -999.6). Instead A² and D are computed over the values strictly inside
// the support, with W their weight. For the Uniform this is the textbook treatment: given the
// sample extremes the n - 2 interior values are independent and uniform between them
// (D'Agostino and Stephens 1986, section 4.4), so they are tested as a fully specified
// Uniform. For the others it is a conditional test of the same kind. The sorted entries put
// those values at the two ends, found by bisection; the log-likelihood, which needs every
// value, is summed in the same pass as F.

void DFCFitGoodnessTask::FindInterior(std::size_t& first, std::size_t& last, double& weight) const {
    const std::vector<DFCGoodFitEntry>& entries = *fpEntries;
    const std::vector<double>& params = fpElement->fDistParams;
    first = 0;
    last = fNEntries;
    weight = fTotalWeight;
    const MCSPDistFamily* family = MCSPFindDistFamily(fDistType);
    if (family == nullptr || !family->IsValid(params)) {
        return;
    }
    double lo = kMissing;
    double hi = kMissing;
    family->fSupport(params.data(), lo, hi);
    const auto begin = entries.begin();
    if (!MCMV::IsMissing(lo)) {
        first = static_cast<std::size_t>(
            std::partition_point(begin, entries.end(),
                                 [lo](const DFCGoodFitEntry& e) { return e.fValue <= lo; }) -
            begin);
    }
    if (!MCMV::IsMissing(hi)) {
        last = static_cast<std::size_t>(
            std::partition_point(begin + static_cast<std::ptrdiff_t>(first), entries.end(),
                                 [hi](const DFCGoodFitEntry& e) { return e.fValue < hi; }) -
            begin);
    }
    if (first == 0 && last == fNEntries) {
        return;
    }
    double excluded = 0.0;
    if (fpWeights) {
        for (std::size_t k = 0; k < first; ++k) {
            excluded += WeightOf(entries[k]);
        }
        for (std::size_t k = last; k < fNEntries; ++k) {
            excluded += WeightOf(entries[k]);
        }
    }
    weight = fpWeights ? fTotalWeight - excluded : static_cast<double>(last - first);
}

double DFCFitGoodnessTask::WeightOf(const DFCGoodFitEntry& entry) const {
    const auto record = static_cast<std::size_t>(entry.fRecord);
    return record < fpWeights->size() ? (*fpWeights)[record] : 0.0;
}

MCStatus DFCFitGoodnessTask::ComputeEdfStatistics() {
    const DFCFittedCdf cdf(fDistType, fpElement->fDistParams);
    const std::vector<DFCGoodFitEntry>& entries = *fpEntries;
    std::size_t first = 0;
    std::size_t last = 0;
    double edfWeight = 0.0;
    FindInterior(first, last, edfWeight);
    std::array<double, kEdfBlock> x{};
    std::array<double, kEdfBlock> u{};
    std::array<double, kEdfBlock> w{};
    DFCEdfState state;
    double lastX = kMissing;
    double lastU = kMissing;
    double lastLnF = kMissing;
    double llSum = 0.0;     // Σ w·ln f, Neumaier-compensated as A² is
    double llComp = 0.0;    // its compensation
    double llSpecial = 0.0; // the first ln f that is not finite, 0 while there is none
    for (std::size_t start = 0; start < fNEntries; start += kEdfBlock) {
        if (PollCancel()) {
            return MCStatus(MCSPStatus::kCancelled, false);
        }
        const std::size_t m = std::min(kEdfBlock, fNEntries - start);
        for (std::size_t j = 0; j < m; ++j) {
            const DFCGoodFitEntry& entry = entries[start + j];
            x[j] = entry.fValue;
            w[j] = fpWeights ? WeightOf(entry) : 1.0;
        }
        cdf.EvaluateSorted(x.data(), m, u.data());
        for (std::size_t j = 0; j < m; ++j) {
            // Tied values share F(x) and ln f(x), across blocks too.
            if (x[j] == lastX) {
                u[j] = lastU;
            } else {
                if (MCMV::IsMissing(u[j]) && start + j >= first && start + j < last) {
                    fpElement->fbDistAllowed = false;
                    fpElement->fDropReason = kDropNoDistributionFunction;
                    return MCStatus(MCSPStatus::kDistDropped, true);
                }
                lastLnF = cdf.LogDensity(x[j]);
            }
            lastX = x[j];
            lastU = u[j];
            if (!std::isfinite(lastLnF)) {
                llSpecial = llSpecial == 0.0 ? lastLnF : llSpecial;
                continue;
            }
            const double term = w[j] * lastLnF;
            const double t = llSum + term;
            llComp += std::fabs(llSum) >= std::fabs(term) ? (llSum - t) + term : (term - t) + llSum;
            llSum = t;
        }
        const std::size_t b = std::max(start, first);
        const std::size_t e = std::min(start + m, last);
        if (b < e) {
            AccumulateEdfTerms(u.data() + (b - start), fpWeights ? w.data() + (b - start) : nullptr,
                               e - b, edfWeight, fbComputeAD, fbComputeKS, state);
        }
    }
    SetLikelihoodResults(*fpElement, llSpecial == 0.0 ? llSum + llComp : llSpecial, fTotalWeight);
    fpElement->fEdfWeight = edfWeight;
    if (!(edfWeight >= kMinEdfWeight)) {
        fpElement->fbDistAllowed = false;
        fpElement->fDropReason = kDropTooFewValues;
        return MCStatus(MCSPStatus::kDistDropped, true);
    }
    if (fbComputeAD) {
        fADFit = FinishAndersonDarling(state, edfWeight);
    }
    if (fbComputeKS) {
        fKSFit = Finite(state.fKSMax);
    }
    const std::vector<double>& params = fpElement->fDistParams;
    const DFCEdfSignificance sig = ComputeEdfSignificance(fDistType, edfWeight, fADFit, fKSFit,
                                                          params.empty() ? kMissing : params[0]);
    fADZStar = sig.fADZStar;
    fADPValue = sig.fADPValue;
    fKSDStat = sig.fKSDStat;
    fKSPValue = sig.fKSPValue;
    fpElement->fADFit = fADFit;
    fpElement->fADZStar = fADZStar;
    fpElement->fADPValue = fADPValue;
    fpElement->fKSFit = fKSFit;
    fpElement->fKSDStat = fKSDStat;
    fpElement->fKSPValue = fKSPValue;
    fpElement->fADPValueLower = sig.fADPLower;
    fpElement->fADPValueUpper = sig.fADPUpper;
    fpElement->fKSPValueLower = sig.fKSPLower;
    fpElement->fKSPValueUpper = sig.fKSPUpper;
    return AddDiagnostics();
}

MCStatus DFCFitGoodnessTask::AddDiagnostics() {
    const std::vector<DFCGoodFitEntry>& entries = *fpEntries;
    const auto weight = [this, &entries](std::size_t i) {
        return fpWeights ? WeightOf(entries[i]) : 1.0;
    };
    const MCSPDistFamily* family = MCSPFindDistFamily(fDistType);
    // Σ w·ln f(x) at other parameters, for the observed information; a cancel request ends
    // the sum with a missing value.
    const auto logLik = [&](const std::vector<double>& p) {
        if (!family || PollCancel()) {
            return kMissing;
        }
        long double sum = 0.0L;
        double lastX = kMissing;
        double lnF = 0.0;
        for (std::size_t i = 0; i < fNEntries; ++i) {
            const double x = entries[i].fValue;
            if (i == 0 || x != lastX) {
                lnF = family->fLogDensity(p.data(), x);
                lastX = x;
            }
            sum += static_cast<long double>(weight(i)) * lnF;
        }
        return static_cast<double>(sum);
    };
    const DFCSortedSample sample{fNEntries, [&entries](std::size_t i) { return entries[i].fValue; },
                                 weight, fTotalWeight};
    SetFitDiagnostics(*fpElement, sample, logLik);
    if (fbCancelled) {
        return MCStatus(MCSPStatus::kCancelled, false);
    }
    return MCStatus();
}

} // namespace MCMCSP_800
