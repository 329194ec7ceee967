// MCHistogramData: the histogram of one continuous quantity of a simulation (a continuous
// target, a category probability, an input being charted).
//
// Values fall into k equal-width bins over the half-open range [minimum, maximum); each bin
// keeps its weighted mean and its frequency and full-weight counts, and values whose bin index
// lies outside 0 to k - 1 go to outlier bins keyed by that index. The weighted mean of all
// values and, optionally, their weighted population variance are kept beside the bins. Every
// value comes with a frequency weight f and a regression weight g; w = f * g is its full weight.
//
// Each simulation worker fills its own accumulator on its own thread (UpdateData, once per case
// and target, so it is constant-time and allocation-free for values in range); the master merges
// the workers' accumulators in thread order (AddObjects) and hands the result to the host as a
// chart record (GenerateMCVariateData). The class is a value: copies copy everything.
//
// Values the accumulator refuses (UpdateData returns false and nothing changes): a missing or
// infinite value, and weights that are not finite and positive (f > 0, g > 0 and f * g > 0).
#pragma once

#include "mccommon/chartdata.h"
#include "mccommon/mcmv.h"
#include "mccommon/mcstatus.h"

#include <map>
#include <string>
#include <vector>

namespace MCMCSP_800 {

//! Small kernels shared by the chart accumulators.
namespace MCChartKernels {

//! Bin of `x` on an axis of `nBins` equal bins of `width` over [minVal, maxVal): 0 to nBins - 1
//! inside, negative below, nBins or more from the maximum on. With one bin every value is in
//! bin 0. Quotients beyond the int range are clamped to its ends. `x` must not be NaN.
int BinIndex(double x, double minVal, double maxVal, double width, int nBins);

//! Width of one of `nBins` bins over [minVal, maxVal], or 0 when the axis cannot be cut into
//! more than one bin (nBins < 2, an empty, reversed, NaN or infinite range).
double BinWidth(int nBins, double minVal, double maxVal);

//! True when f and g are finite and positive and so is their product.
bool IsUsableWeight(double f, double g);

//! mean + delta, or exactly 0 when that sum is lost to cancellation:
//! 2 * eps * |mean| > |mean + delta| (eps = 2.220446049250313e-16).
double StepMean(double mean, double delta);

} // namespace MCChartKernels

class MCHistogramData {
public:
    //! One outlier bin: the values whose bin index lies outside 0 to k - 1.
    struct OutlierBin {
        double fMean = 0.0;          //!< weighted mean of the values in the bin
        double fFreqCount = 0.0;     //!< sum of f
        double fWeightedCount = 0.0; //!< sum of w
    };
    using OutlierBinMap = std::map<int, OutlierBin>;

    //! One bin over [-1, 1], width 0, second moment not kept, nothing counted.
    MCHistogramData();
    //! `nBins` bins over [minVal, maxVal]. nBins > 1 and maxVal >= minVal are asserted; when
    //! the range cannot be cut (nBins < 2, minVal >= maxVal, a NaN or infinite range) there is
    //! one bin of width 0 that takes every value. `keepMoment` accumulates the variance.
    MCHistogramData(int nBins, double minVal, double maxVal, bool keepMoment);
    virtual ~MCHistogramData() = default;
    MCHistogramData(const MCHistogramData&) = default;
    MCHistogramData& operator=(const MCHistogramData&) = default;
    MCHistogramData(MCHistogramData&&) = default;
    MCHistogramData& operator=(MCHistogramData&&) = default;

    //! Adds `x` with frequency weight `f` and regression weight `g`. False, with nothing
    //! changed, for a missing or infinite `x` or weights that are not finite and positive.
    bool UpdateData(double f, double g, double x);

    //! Merges `others` into this accumulator, which then equals one accumulator that saw all
    //! their values. An empty receiver first becomes a copy of the first entry. Error 390010
    //! when a non-empty entry has another layout (bins, minimum, width, moment flag) or an
    //! entry is null; nothing is changed then.
    MCCommon_800::MCStatus AddObjects(const std::vector<const MCHistogramData*>& others);

    //! Sum of the frequency weights.
    double GetTotalWeight() const { return fTotalWeight; }
    //! Weighted mean of all values (0 before the first).
    double GetMean() const { return fMean; }
    //! sqrt(W * m2 / (W - 1)) with W the sum of full weights and m2 the second moment;
    //! missing when the moment is not kept or W <= 1.
    double GetStdDev() const;
    const OutlierBinMap& GetOutlierBinMap() const { return fOutlierBins; }

    int GetNBins() const { return fNBins; }
    double GetBinWidth() const { return fBinWidth; }
    double GetMinimum() const { return fMinVal; }
    double GetMaximum() const { return fMaxVal; }
    bool IsKeepMoment() const { return fbKeepMoment; }
    const std::vector<double>& GetBinMeans() const { return fvBinMeans; }
    const std::vector<double>& GetBinFreqCounts() const { return fvBinFreqCounts; }
    const std::vector<double>& GetBinWeightedCounts() const { return fvBinWeightedCounts; }
    //! Sum of the full weights w.
    double GetWeightedCount() const { return fWeightedCount; }
    //! Number of values accepted.
    double GetNCases() const { return fNCases; }
    //! Weighted population variance about the mean; missing when not kept or before a value.
    double GetSecondMoment() const { return fSecondMoment; }

    //! The chart record: built on the first call from the current state, then returned
    //! unchanged. Axis 0 holds the means of the bins with a positive frequency count, axis 1
    //! their frequency counts; outlier bins are not charted.
    MCXML_800::MCVariateData& GenerateMCVariateData(const std::string& name);

    //! Diagnostic print of the state through the display primitives.
    void Display() const;

private:
    //! Same bins, minimum, width and moment flag: the values of `other` can be merged.
    bool IsCompatible(const MCHistogramData& other) const;
    //! The merge proper, `others[first..]` into this; every entry is compatible and not this.
    void MergeCompatible(const std::vector<const MCHistogramData*>& others, std::size_t first);

    int fNBins = 1;                          //!< k, the number of bins
    double fBinWidth = 0.0;                  //!< (max - min) / k, 0 with one bin
    std::vector<double> fvBinMeans;          //!< weighted mean per bin, missing until used
    std::vector<double> fvBinFreqCounts;     //!< sum of f per bin
    std::vector<double> fvBinWeightedCounts; //!< sum of w per bin
    OutlierBinMap fOutlierBins;              //!< bins outside 0 to k - 1, by bin index
    double fMinVal = -1.0;                   //!< lower end of the range
    double fMaxVal = 1.0;                    //!< upper end of the range
    bool fbKeepMoment = false;               //!< true when the variance is accumulated
    double fWeightedCount = 0.0;             //!< W, the sum of w
    double fTotalWeight = 0.0;               //!< sum of f
    double fNCases = 0.0;                    //!< N, the number of values accepted
    double fMean = 0.0;                      //!< weighted mean of all values
    //! weighted population variance about the mean, missing until the first value
    double fSecondMoment = MCCommon_800::MCMV::Missing();
    MCXML_800::MCVariateData fChartData; //!< chart record, built once
};

} // namespace MCMCSP_800
