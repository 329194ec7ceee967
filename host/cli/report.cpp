#include "cli/report.h"

#include "data/plandictionary.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mccommon/variables.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secsettings.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <unordered_map>

namespace MCHost {

using MCCommon_800::MCMV;
using MCMCSP_800::MCHistogramData;
using MCMCSP_800::SECOutputStats;
using MCMCSP_800::SPCSettings;

namespace {

//! Entry `i` of `values`, missing when the list is shorter.
double At(const std::vector<double>& values, std::size_t i) {
    return i < values.size() ? values[i] : MCMV::Missing();
}

//! The measures of one target against each covariate, in covariate order.
std::vector<ReportInputMeasures> InputMeasures(const std::vector<std::string>& covariates,
                                               const std::vector<double>& correlations,
                                               const std::vector<double>& negative,
                                               const std::vector<double>& positive,
                                               const std::vector<double>& variance) {
    std::vector<ReportInputMeasures> measures;
    for (std::size_t k = 0; k < covariates.size(); ++k) {
        measures.push_back(ReportInputMeasures{covariates[k], At(correlations, k), At(negative, k),
                                               At(positive, k), At(variance, k)});
    }
    return measures;
}

//! The skipped counts of a target's measures, where the measure ran.
void AddSkipped(const MCMCSP_800::SECContinuousTargetInfo& info,
                std::vector<ReportInputMeasures>& measures) {
    for (std::size_t k = 0; k < measures.size(); ++k) {
        if (k < info.fvDeltaSkipped.size()) {
            measures[k].fDeltaSkipped = info.fvDeltaSkipped[k];
        }
        if (k < info.fvVarianceSkipped.size()) {
            measures[k].fVarianceSkipped = info.fvVarianceSkipped[k];
        }
    }
}

//! The first-order index of every simulated input: a covariate's on its row, each other input
//! (a categorical one) on a row of its own after them.
void AddFirstOrder(const MCMCSP_800::SECContinuousTargetInfo& info,
                   const std::vector<std::string>& predictors,
                   std::vector<ReportInputMeasures>& measures) {
    if (info.fvFirstOrder.empty()) {
        return;
    }
    std::unordered_map<std::string, std::size_t> row;
    for (std::size_t k = 0; k < measures.size(); ++k) {
        row.emplace(measures[k].fInput, k);
    }
    for (std::size_t i = 0; i < predictors.size() && i < info.fvFirstOrder.size(); ++i) {
        const auto it = row.find(predictors[i]);
        if (it != row.end()) {
            measures[it->second].fFirstOrder = info.fvFirstOrder[i];
            continue;
        }
        ReportInputMeasures m{predictors[i], MCMV::Missing(), MCMV::Missing(), MCMV::Missing(),
                              MCMV::Missing()};
        m.fFirstOrder = info.fvFirstOrder[i];
        measures.push_back(std::move(m));
    }
}

//! The label of a categorical target's category `value`, from the target's variable: a text
//! category's value is its code, a numeric category's value its number.
std::string CategoryLabel(const MCXML_800::MCVarList& vars, const std::string& target,
                          double value) {
    const MCXML_800::IMCVariable* var = vars.GetVariable(target);
    const MCXML_800::MCCatNumEncoder* enc = var ? var->GetCategorical() : nullptr;
    if (enc && !MCMV::IsMissing(value)) {
        int code = -1;
        if (enc->IsString()) {
            if (value == std::floor(value) && value >= 0.0 &&
                value < static_cast<double>(enc->GetNCategories())) {
                code = static_cast<int>(value);
            }
        } else {
            code = enc->Encode(value);
        }
        if (code >= 0) {
            return enc->GetCategoryText(code);
        }
    }
    return MCMV::IsMissing(value) ? std::string("missing") : MCCommon_800::FormatDefault(value);
}

ReportCategoricalTarget BuildCategorical(const MCMCSP_800::SECCategoricalTargetInfo& info,
                                         const SECOutputStats& stats) {
    ReportCategoricalTarget target;
    target.fName = info.fName;
    double total = 0.0;
    for (double c : info.fvCatCounts) {
        total += MCMV::IsMissing(c) ? 0.0 : c;
    }
    // Every category of the target's variable is listed, counted or not. Without category
    // values the counts run by value: entry i counts the cases whose category value is i.
    const MCXML_800::IMCVariable* var = stats.GetMCVarList()->GetVariable(info.fName);
    const std::size_t nDeclared =
        var && var->GetCategorical()
            ? static_cast<std::size_t>(var->GetCategorical()->GetNCategories())
            : 0;
    const std::size_t n =
        std::max({info.fvCategoryValues.size(), info.fvCatCounts.size(), nDeclared});
    for (std::size_t i = 0; i < n; ++i) {
        ReportCategory category;
        category.fValue =
            i < info.fvCategoryValues.size() ? info.fvCategoryValues[i] : static_cast<double>(i);
        category.fLabel = CategoryLabel(*stats.GetMCVarList(), info.fName, category.fValue);
        category.fCount = i < info.fvCatCounts.size() ? info.fvCatCounts[i] : 0.0;
        category.fShare = (total > 0.0 && !MCMV::IsMissing(category.fCount))
                              ? category.fCount / total
                              : MCMV::Missing();
        category.fMeanProbability = At(info.fvMeanProbs, i);
        target.fvCategories.push_back(std::move(category));
    }
    target.fvInputs = InputMeasures(stats.GetCovariateNames(), info.fvPearsonCorrs, {}, {}, {});
    return target;
}

ReportContinuousTarget BuildContinuous(const MCMCSP_800::SECContinuousTargetInfo& info,
                                       const SECOutputStats& stats,
                                       const std::vector<double>& percentiles) {
    ReportContinuousTarget target;
    target.fName = info.fName;
    target.fMean = info.fMean;
    target.fStdDev = info.fStdDev;
    target.fCiLower = info.fCiLower;
    target.fCiUpper = info.fCiUpper;
    target.fMinimum = info.fMinimum;
    target.fMaximum = info.fMaximum;
    const MCMCSP_800::SECQuantileSummary& summary = info.fQuantiles;
    if (summary.GetCount() > 0) {
        target.fPercentileMethod = summary.IsExact() ? "exact" : "summary";
        const double level = stats.GetSECSettings()->GetCiLevel();
        for (double p : percentiles) {
            ReportPercentile entry{p, summary.Quantile(p / 100.0)};
            summary.QuantileInterval(p / 100.0, level, entry.fLower, entry.fUpper);
            target.fvPercentiles.push_back(entry);
        }
    } else {
        target.fPercentileMethod = "histogram";
        for (double p : percentiles) {
            target.fvPercentiles.push_back(ReportPercentile{
                p, HistogramPercentile(info.fHistogram, p, info.fMinimum, info.fMaximum)});
        }
    }
    target.fBinWidth = info.fHistogram.GetBinWidth();
    target.fvBins = HistogramBins(info.fHistogram);
    target.fvInputs =
        InputMeasures(stats.GetCovariateNames(), info.fvPearsonCorrs, info.fvNegativeDelta,
                      info.fvPositiveDelta, info.fvVarianceContrib);
    AddSkipped(info, target.fvInputs);
    AddFirstOrder(info, stats.GetPredictorNames(), target.fvInputs);
    return target;
}

//! The pairs of correlated inputs, in the order of the plan's correlation variables (the order
//! of the simulated matrix), or of the covariates when the plan sets no correlations.
//! Positions are found through hashes, so N inputs cost O(N²): one step per pair.
std::vector<ReportCorrelation> BuildCorrelations(const SECOutputStats& stats) {
    constexpr std::size_t kNone = static_cast<std::size_t>(-1);
    const SPCSettings& plan = *stats.GetSPCSettings();
    const std::vector<std::string>& names =
        plan.GetCorrVarList().empty() ? stats.GetCovariateNames() : plan.GetCorrVarList();
    const std::size_t n = names.size();
    std::unordered_map<std::string, std::size_t> position;
    position.reserve(n);
    for (std::size_t i = 0; i < n; ++i) {
        position.emplace(names[i], i);
    }
    // The plan's triangle: row r holds the correlations with the variables before it.
    const std::vector<std::string>& planVars = plan.GetCorrVarList();
    const std::vector<std::vector<double>>& planRows = plan.GetCorrMatrix();
    std::vector<std::size_t> inPlan(n, kNone);
    for (std::size_t k = 0; k < planVars.size() && k < planRows.size(); ++k) {
        const auto it = position.find(planVars[k]);
        if (it != position.end()) {
            inPlan[it->second] = k;
        }
    }
    const auto planValue = [&](std::size_t i, std::size_t j) {
        const std::size_t a = inPlan[i];
        const std::size_t b = inPlan[j];
        if (a == kNone || b == kNone || a == b) {
            return MCMV::Missing();
        }
        const std::vector<double>& row = planRows[std::max(a, b)];
        return std::min(a, b) < row.size() ? row[std::min(a, b)] : MCMV::Missing();
    };
    // The correlation model's pairs by the positions of their inputs (the last one counts).
    const auto& modelPairs = stats.GetInputCorrelationPairs();
    std::unordered_map<std::uint64_t, std::size_t> modelOf;
    modelOf.reserve(modelPairs.size());
    for (std::size_t m = 0; m < modelPairs.size(); ++m) {
        const auto a = position.find(modelPairs[m].fFirst);
        const auto b = position.find(modelPairs[m].fSecond);
        if (a != position.end() && b != position.end()) {
            const std::uint64_t lo = std::min(a->second, b->second);
            const std::uint64_t hi = std::max(a->second, b->second);
            modelOf[lo * n + hi] = m;
        }
    }
    const MCMath_800::MCSymMatrix& simulated = stats.GetSimulCorr();
    const double nCases = stats.GetValidCaseCount();
    std::vector<ReportCorrelation> pairs;
    pairs.reserve(n * (n - std::min<std::size_t>(n, 1)) / 2);
    for (std::size_t i = 0; i < n; ++i) {
        for (std::size_t j = i + 1; j < n; ++j) {
            ReportCorrelation pair{names[i], names[j], MCMV::Missing(), MCMV::Missing()};
            pair.fPlan = planValue(i, j);
            if (static_cast<int>(j) < simulated.GetNRows()) {
                pair.fSimulated = simulated.GetElem(static_cast<int>(i), static_cast<int>(j));
            }
            const auto model = modelOf.find(static_cast<std::uint64_t>(i) * n + j);
            if (model != modelOf.end()) {
                const MCMCSP_800::SECInputCorrelationPair& m = modelPairs[model->second];
                pair.fNormal = m.fNormalCorr;
                pair.fLow = m.fAttainableLow;
                pair.fHigh = m.fAttainableHigh;
                pair.fbUnreachable = m.fbUnreachable;
            }
            if (!MCMV::IsMissing(pair.fPlan) && !MCMV::IsMissing(pair.fSimulated) && nCases > 1) {
                const double rho = std::clamp(pair.fPlan, -1.0, 1.0);
                const double se = (1.0 - rho * rho) / std::sqrt(nCases - 1.0);
                pair.fDeviation = std::fabs(pair.fSimulated - pair.fPlan) / std::max(se, 1e-12);
            }
            pairs.push_back(std::move(pair));
        }
    }
    return pairs;
}

//! The round width nearest to `raw` on a log scale: 1, 2, 2.5 or 5 times a power of ten. The
//! steps of that series are at most a factor 2 apart, so the number of rows stays within a
//! factor sqrt(2) of the number asked for.
double RoundWidth(double raw) {
    const double power = std::pow(10.0, std::floor(std::log10(raw)));
    double best = power;
    for (double m : {1.0, 2.0, 2.5, 5.0, 10.0}) {
        if (std::fabs(std::log(m * power / raw)) < std::fabs(std::log(best / raw))) {
            best = m * power;
        }
    }
    return best;
}

} // namespace

std::vector<HistogramBin> HistogramBins(const MCHistogramData& histogram) {
    std::vector<HistogramBin> bins;
    const double width = histogram.GetBinWidth();
    const double minimum = histogram.GetMinimum();
    auto add = [&](int index, double count, double mean) {
        if (!(count > 0.0)) {
            return;
        }
        const double lower = minimum + static_cast<double>(index) * width;
        bins.push_back(HistogramBin{lower, lower + width, count, mean});
    };
    const MCHistogramData::OutlierBinMap& outliers = histogram.GetOutlierBinMap();
    auto it = outliers.begin();
    for (; it != outliers.end() && it->first < 0; ++it) {
        add(it->first, it->second.fFreqCount, it->second.fMean);
    }
    const std::vector<double>& counts = histogram.GetBinFreqCounts();
    const std::vector<double>& means = histogram.GetBinMeans();
    for (std::size_t b = 0; b < counts.size(); ++b) {
        add(static_cast<int>(b), counts[b], At(means, b));
    }
    for (; it != outliers.end(); ++it) {
        add(it->first, it->second.fFreqCount, it->second.fMean);
    }
    return bins;
}

// Percentile of grouped data (the interpolation formula for a grouped frequency distribution,
// e.g. Hoel, "Introduction to Mathematical Statistics", 1984, section 2.3): with n the total
// count, F the count below the bin that holds rank r = p/100 * n, f that bin's count and
// [L, U) its range, the percentile is L + (r - F) / f * (U - L). It assumes the values are
// spread evenly over each bin, so it is exact to within one bin width.
double HistogramPercentile(const MCHistogramData& histogram, double percent, double minimum,
                           double maximum) {
    const std::vector<HistogramBin> bins = HistogramBins(histogram);
    double total = 0.0;
    for (const HistogramBin& b : bins) {
        total += b.fCount;
    }
    if (bins.empty() || !(total > 0.0) || MCMV::IsMissing(percent)) {
        return MCMV::Missing();
    }
    auto clamp = [&](double x) {
        if (!MCMV::IsMissing(minimum) && x < minimum) {
            x = minimum;
        }
        if (!MCMV::IsMissing(maximum) && x > maximum) {
            x = maximum;
        }
        return x;
    };
    // A histogram of one bin has no width to interpolate over: all its values are alike.
    if (histogram.GetBinWidth() <= 0.0) {
        return clamp(bins.front().fMean);
    }
    const double rank = std::clamp(percent, 0.0, 100.0) / 100.0 * total;
    double below = 0.0;
    for (const HistogramBin& b : bins) {
        if (below + b.fCount >= rank) {
            // A bin whose mean is the smallest (largest) value seen holds only that value: a
            // point mass, such as the zeros of a target that is often 0, needs no spreading.
            if (!MCMV::IsMissing(b.fMean) && ((!MCMV::IsMissing(minimum) && b.fMean <= minimum) ||
                                              (!MCMV::IsMissing(maximum) && b.fMean >= maximum))) {
                return clamp(b.fMean);
            }
            const double lower = clamp(b.fLower);
            const double upper = clamp(b.fUpper);
            return lower + (rank - below) / b.fCount * (upper - lower);
        }
        below += b.fCount;
    }
    return clamp(bins.back().fUpper);
}

std::vector<HistogramRow> GroupHistogram(const std::vector<HistogramBin>& bins, double minimum,
                                         double maximum, int nRows) {
    std::vector<HistogramRow> rows;
    if (bins.empty() || MCMV::IsMissing(minimum) || MCMV::IsMissing(maximum) || nRows < 1) {
        return rows;
    }
    double total = 0.0;
    for (const HistogramBin& b : bins) {
        total += b.fCount;
    }
    const double span = maximum - minimum;
    if (!(span > 0.0) || !std::isfinite(span)) {
        rows.push_back(HistogramRow{minimum, maximum, total});
        return rows;
    }
    const double width = RoundWidth(span / nRows);
    const double start = std::floor(minimum / width) * width;
    const auto n = static_cast<std::size_t>(std::max(1.0, std::ceil((maximum - start) / width)));
    for (std::size_t r = 0; r < n; ++r) {
        const double lower = start + static_cast<double>(r) * width;
        rows.push_back(HistogramRow{lower, lower + width, 0.0});
    }
    for (const HistogramBin& b : bins) {
        const double x = MCMV::IsMissing(b.fMean) ? b.fLower : b.fMean;
        const double r = std::floor((x - start) / width);
        const std::size_t row = r < 0.0 ? 0 : std::min(n - 1, static_cast<std::size_t>(r));
        rows[row].fCount += b.fCount;
    }
    return rows;
}

ReportIteration BuildReportIteration(const SECOutputStats& stats, int index,
                                     const std::vector<double>& percentiles) {
    ReportIteration it;
    it.fIndex = index;
    const SPCSettings& plan = *stats.GetSPCSettings();
    it.fVaryingInput = DescribeSensitivityIteration(plan, index);
    it.fSimulated = stats.GetSimCaseCount();
    it.fFiltered = stats.GetFilteredCaseCount();
    it.fValid = stats.GetValidCaseCount();
    it.fInvalid = stats.GetInvalidCaseCount();
    it.fbStopped = stats.GetStopCriteria();
    for (const auto& info : stats.GetContTargetInfo()) {
        it.fvContinuous.push_back(BuildContinuous(info, stats, percentiles));
    }
    for (const auto& info : stats.GetCateTargetInfo()) {
        it.fvCategorical.push_back(BuildCategorical(info, stats));
    }
    it.fvCorrelations = BuildCorrelations(stats);
    it.fvFactors = plan.GetCrstabsFactors();
    const auto& rows = plan.GetCrstabsMatrix();
    const auto& planProbs = plan.GetCrstabsProbs();
    const auto& simProbs = stats.GetCrstSimProbs();
    for (std::size_t r = 0; r < rows.size() && !it.fvFactors.empty(); ++r) {
        it.fvCells.push_back(
            ReportCell{rows[r], At(planProbs, r),
                       simProbs.size() == rows.size() ? simProbs[r] : MCMV::Missing()});
    }
    return it;
}

} // namespace MCHost
