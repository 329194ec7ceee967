#include "simulation_common/mcsphistogramdata.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "mccommon/display.h"

#include <climits>
#include <cmath>
#include <limits>
#include <optional>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;

namespace {

//! Machine epsilon of double, the scale of the cancellation-to-zero rule.
constexpr double kEpsilon = 2.220446049250313e-16;
constexpr double kMaxDouble = std::numeric_limits<double>::max();

//! floor(q) as an int, clamped to the int range (q is not NaN).
int ClampToInt(double q) {
    if (q >= static_cast<double>(INT_MAX)) {
        return INT_MAX;
    }
    if (q <= static_cast<double>(INT_MIN)) {
        return INT_MIN;
    }
    return static_cast<int>(q);
}

//! sqrt(W * m2 / (W - 1)): the frequency-weighted sample standard deviation from the
//! population second moment m2 of total weight W > 1.
double SampleStdDev(double weight, double secondMoment) {
    return std::sqrt(weight * secondMoment / (weight - 1.0));
}

} // namespace

namespace MCChartKernels {

int BinIndex(double x, double minVal, double maxVal, double width, int nBins) {
    if (nBins <= 1) {
        return 0;
    }
    // The range is half-open, [min, max). Rounding of the quotient must not carry a value across
    // either end, so which side of an end a value lies on is decided on x itself.
    if (x >= maxVal) {
        const double q = std::floor((x - minVal) / width);
        return q < nBins ? nBins : ClampToInt(q);
    }
    if (x < minVal) {
        const double q = std::floor((x - minVal) / width);
        return q >= 0.0 ? -1 : ClampToInt(q);
    }
    // Inside, the quotient is at least 0 and at most about nBins: truncation is the floor,
    // without the library call that floor is on baseline x86-64.
    const int q = static_cast<int>((x - minVal) / width);
    return q >= nBins ? nBins - 1 : q;
}

double BinWidth(int nBins, double minVal, double maxVal) {
    if (nBins < 2 || !(maxVal > minVal)) {
        return 0.0;
    }
    const double width = (maxVal - minVal) / nBins;
    return (std::isfinite(width) && width > 0.0) ? width : 0.0;
}

bool IsUsableWeight(double f, double g) {
    const double w = f * g;
    return f > 0.0 && f <= kMaxDouble && g > 0.0 && w > 0.0 && w <= kMaxDouble;
}

double StepMean(double mean, double delta) {
    const double next = mean + delta;
    return 2.0 * kEpsilon * std::fabs(mean) > std::fabs(next) ? 0.0 : next;
}

} // namespace MCChartKernels

MCHistogramData::MCHistogramData()
    : fvBinMeans(1, MCMV::Missing()), fvBinFreqCounts(1, 0.0), fvBinWeightedCounts(1, 0.0) {}

MCHistogramData::MCHistogramData(int nBins, double minVal, double maxVal, bool keepMoment)
    : fMinVal(minVal), fMaxVal(maxVal), fbKeepMoment(keepMoment) {
    MCSP_ASSERT(nBins > 1, "MCHistogramData constructor: nBins > 1");
    MCSP_ASSERT(maxVal >= minVal, "MCHistogramData constructor: maxVal >= minVal");
    fBinWidth = MCChartKernels::BinWidth(nBins, minVal, maxVal);
    fNBins = fBinWidth > 0.0 ? nBins : 1;
    const auto size = static_cast<std::size_t>(fNBins);
    fvBinMeans.assign(size, MCMV::Missing());
    fvBinFreqCounts.assign(size, 0.0);
    fvBinWeightedCounts.assign(size, 0.0);
}

// Weighted running mean and population variance, West (1979), "Updating mean and variance
// estimates: an improved method", CACM 22(9), 532-535. With W' = W + w, d = x - mean and
// delta = d * w / W':
//   mean' = mean + delta
//   m2'   = (W / W') * m2 + (W / w) * delta^2  =  (W / W') * (m2 + d * delta)
// The second form is the same quantity without dividing by w. m2 is the population variance
// (divisor W); GetStdDev turns it into the frequency-weighted sample value.
bool MCHistogramData::UpdateData(double f, double g, double x) {
    if (!MCSP_ASSERT(MCChartKernels::IsUsableWeight(f, g),
                     "MCHistogramData::UpdateData: f > 0 and g > 0") ||
        !MCSP_ASSERT(std::isfinite(x), "MCHistogramData::UpdateData: value is finite")) {
        return false;
    }
    const double w = f * g;
    const int b = MCChartKernels::BinIndex(x, fMinVal, fMaxVal, fBinWidth, fNBins);

    const double weightOld = fWeightedCount;
    fWeightedCount += w;
    fTotalWeight += f;
    fNCases += 1.0;
    const double d = x - fMean;
    const double delta = d * w / fWeightedCount;
    fMean = MCChartKernels::StepMean(fMean, delta);
    if (fbKeepMoment) {
        if (MCMV::IsMissing(fSecondMoment)) {
            fSecondMoment = 0.0;
        }
        fSecondMoment = (weightOld / fWeightedCount) * (fSecondMoment + d * delta);
    }

    if (b >= 0 && b < fNBins) {
        double& mean = fvBinMeans[static_cast<std::size_t>(b)];
        double& weighted = fvBinWeightedCounts[static_cast<std::size_t>(b)];
        if (MCMV::IsMissing(mean)) {
            mean = 0.0;
        }
        weighted += w;
        fvBinFreqCounts[static_cast<std::size_t>(b)] += f;
        mean += (w / weighted) * (x - mean);
        return true;
    }
    OutlierBin& bin = fOutlierBins[b];
    bin.fWeightedCount += w;
    bin.fFreqCount += f;
    bin.fMean += (w / bin.fWeightedCount) * (x - bin.fMean);
    return true;
}

MCStatus MCHistogramData::AddObjects(const std::vector<const MCHistogramData*>& others) {
    if (others.empty()) {
        return MCStatus();
    }
    // Merging an object into itself would read its counts while they change: such entries
    // read a copy taken before the merge.
    std::optional<MCHistogramData> selfCopy;
    std::vector<const MCHistogramData*> list(others);
    for (const MCHistogramData*& entry : list) {
        if (!MCSP_ASSERT(entry != nullptr, "MCHistogramData::AddObjects: entry is not null")) {
            return MCStatus(MCSPStatus::kMergeFailed, false);
        }
        if (entry == this) {
            if (!selfCopy) {
                selfCopy.emplace(*this);
            }
            entry = &*selfCopy;
        }
    }

    // An empty receiver takes the first entry's layout; every later entry that holds values
    // must share it. Everything is checked before anything changes.
    const std::size_t first = fNCases == 0.0 ? 1 : 0;
    const MCHistogramData& layout = first == 1 ? *list.front() : *this;
    for (std::size_t i = first; i < list.size(); ++i) {
        if (list[i]->fNCases != 0.0 && !layout.IsCompatible(*list[i])) {
            return MCStatus(MCSPStatus::kMergeFailed, false);
        }
    }
    if (first == 1) {
        *this = *list.front();
    }
    MergeCompatible(list, first);
    return MCStatus();
}

// Two-pass weighted merge. Counts are summed first; then every mean (bin or outlier bin)
// becomes the weighted mean of the parts' means,
//   mean = sum_i mean_i * W_i / sum_i W_i,
// by rescaling this object's means to their share of the new weight and adding the others'
// shares. A bin that this object had not used yet (its mean is missing) starts from 0.
//
// The overall moments are combined pairwise, Chan, Golub and LeVeque (1983), "Algorithms for
// computing the sample variance: analysis and recommendations", The American Statistician
// 37(3), 242-247, eq. 2.1, in weighted form: with d = mean_b - mean_a and W = W_a + W_b,
//   mean = mean_a + d * W_b / W
//   S    = S_a + S_b + d^2 * W_a * W_b / W        (S = W * m2, the weighted sum of squares)
// This equals the pooled form m2 = (sum_i W_i * (m2_i + mean_i^2)) / W - mean^2 exactly in
// arithmetic, but does not lose the variance to cancellation when |mean| is large against
// the spread, so the merged moments agree with one pass over all the values.
void MCHistogramData::MergeCompatible(const std::vector<const MCHistogramData*>& others,
                                      std::size_t first) {
    const std::vector<double> weightedBefore(fvBinWeightedCounts);
    std::map<int, double> outlierWeightBefore;
    for (const auto& [index, bin] : fOutlierBins) {
        outlierWeightBefore.emplace(index, bin.fWeightedCount);
    }

    // First pass: counts.
    double nCases = fNCases;
    double totalWeight = fTotalWeight;
    for (std::size_t i = first; i < others.size(); ++i) {
        const MCHistogramData& other = *others[i];
        if (other.fNCases == 0.0) {
            continue;
        }
        nCases += other.fNCases;
        totalWeight += other.fTotalWeight;
        for (std::size_t b = 0; b < fvBinFreqCounts.size(); ++b) {
            fvBinFreqCounts[b] += other.fvBinFreqCounts[b];
            fvBinWeightedCounts[b] += other.fvBinWeightedCounts[b];
        }
        for (const auto& [index, bin] : other.fOutlierBins) {
            OutlierBin& mine = fOutlierBins[index];
            mine.fFreqCount += bin.fFreqCount;
            mine.fWeightedCount += bin.fWeightedCount;
        }
    }
    if (nCases == fNCases) {
        return; // no entry held values
    }
    fNCases = nCases;
    fTotalWeight = totalWeight;

    // This object's means, rescaled to their share of the new weights.
    for (std::size_t b = 0; b < fvBinMeans.size(); ++b) {
        const double weighted = fvBinWeightedCounts[b];
        if (weighted <= 0.0) {
            continue;
        }
        const double before = weightedBefore[b];
        fvBinMeans[b] = before > 0.0 ? fvBinMeans[b] * before / weighted : 0.0;
    }
    for (auto& [index, bin] : fOutlierBins) {
        const auto found = outlierWeightBefore.find(index);
        if (found == outlierWeightBefore.end() || found->second <= 0.0) {
            bin.fMean = 0.0;
        } else if (bin.fWeightedCount > 0.0) {
            bin.fMean = bin.fMean * found->second / bin.fWeightedCount;
        }
    }

    // Second pass: the others' shares.
    for (std::size_t i = first; i < others.size(); ++i) {
        const MCHistogramData& other = *others[i];
        if (other.fNCases == 0.0) {
            continue;
        }
        for (std::size_t b = 0; b < fvBinMeans.size(); ++b) {
            const double weighted = other.fvBinWeightedCounts[b];
            if (weighted > 0.0) {
                fvBinMeans[b] += other.fvBinMeans[b] * weighted / fvBinWeightedCounts[b];
            }
        }
        for (const auto& [index, bin] : other.fOutlierBins) {
            if (bin.fWeightedCount > 0.0) {
                OutlierBin& mine = fOutlierBins[index];
                mine.fMean += bin.fMean * bin.fWeightedCount / mine.fWeightedCount;
            }
        }
    }

    // Overall moments.
    double sumSquares =
        (fbKeepMoment && !MCMV::IsMissing(fSecondMoment)) ? fWeightedCount * fSecondMoment : 0.0;
    for (std::size_t i = first; i < others.size(); ++i) {
        const MCHistogramData& other = *others[i];
        if (other.fNCases == 0.0) {
            continue;
        }
        const double weightA = fWeightedCount;
        const double weightB = other.fWeightedCount;
        const double weight = weightA + weightB;
        const double d = other.fMean - fMean;
        fMean = MCChartKernels::StepMean(fMean, d * weightB / weight);
        fWeightedCount = weight;
        if (fbKeepMoment) {
            const double otherSquares =
                MCMV::IsMissing(other.fSecondMoment) ? 0.0 : weightB * other.fSecondMoment;
            sumSquares += otherSquares + d * d * (weightA / weight) * weightB;
        }
    }
    if (fbKeepMoment) {
        fSecondMoment = sumSquares / fWeightedCount;
    }
}

bool MCHistogramData::IsCompatible(const MCHistogramData& other) const {
    return fNBins == other.fNBins && fMinVal == other.fMinVal && fBinWidth == other.fBinWidth &&
           fbKeepMoment == other.fbKeepMoment;
}

double MCHistogramData::GetStdDev() const {
    if (!fbKeepMoment || !(fWeightedCount > 1.0) || MCMV::IsMissing(fSecondMoment)) {
        return MCMV::Missing();
    }
    return SampleStdDev(fWeightedCount, fSecondMoment);
}

MCXML_800::MCVariateData& MCHistogramData::GenerateMCVariateData(const std::string& name) {
    if (fChartData.HasCounts()) {
        return fChartData;
    }
    MCXML_800::MCVariateData record;
    record.fCounts.push_back(MCXML_800::MCXMLCounts{fTotalWeight});

    MCXML_800::MCXMLCoordinates observed;
    observed.fKind = MCXML_800::MCXMLCoordinates::kValues;
    if (!name.empty()) {
        observed.fLabel = "observed";
        observed.fVarName = name;
    }
    MCXML_800::MCXMLCoordinates frequency;
    frequency.fKind = MCXML_800::MCXMLCoordinates::kValues;
    frequency.fLabel = "frequency";
    for (std::size_t b = 0; b < fvBinFreqCounts.size(); ++b) {
        if (fvBinFreqCounts[b] > 0.0) {
            observed.fValues.push_back(fvBinMeans[b]);
            frequency.fValues.push_back(fvBinFreqCounts[b]);
        }
    }
    record.fCoordinates.push_back(std::move(observed));
    record.fCoordinates.push_back(std::move(frequency));

    record.fStatistics.emplace_back("mean", fMean);
    if (fbKeepMoment) {
        const bool defined = fWeightedCount > 1.0 && !MCMV::IsMissing(fSecondMoment);
        record.fStatistics.emplace_back(
            "stdDeviation", defined ? SampleStdDev(fWeightedCount, fSecondMoment) : 0.0);
    }
    record.fMarker = 0.0;
    fChartData = std::move(record);
    return fChartData;
}

void MCHistogramData::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCHistogramData display start", "MCHistogramData display end");
    DisplayI("The number of bins", fNBins);
    DisplayD("The length of a bin", fBinWidth);
    DisplayDV("The means of each bin", fvBinMeans);
    DisplayDV("N cases of each bin considering frequency weight only", fvBinFreqCounts);
    DisplayDV("The weighted (both frequency and regression weight) N cases", fvBinWeightedCounts);
    DisplayD("Minimum value from constructor", fMinVal);
    DisplayD("Maximum value from constructor", fMaxVal);
    DisplayD("Weighted number of cases including both weights", fWeightedCount);
    DisplayD("Total frequency weight", fTotalWeight);
    DisplayD("The total unweighted number of cases", fNCases);
    DisplayD("The mean of all cases", fMean);
    DisplayD("The second moment around mean", fSecondMoment);
}

} // namespace MCMCSP_800
